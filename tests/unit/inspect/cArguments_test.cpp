#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/cHandles.h"

using namespace test;
using testing::HasSubstr;
using testing::StrEq;

TEST(C, RefusesBadArguments)
{
  const Bytes bytes = valuesOf();
  const CReader reader = openMemory(bytes);
  const CReader other = openMemory(bytes);
  tav_node root{};
  ASSERT_EQ(tav_next_root(reader.get(), nullptr, &root), TAV_RC_OK);
  tav_node foreign{};
  ASSERT_EQ(tav_next_root(other.get(), nullptr, &foreign), TAV_RC_OK);
  tav_node zero{};
  tav_node out{};
  uint64_t number = 0;
  int64_t whole = 0;
  const char* text = nullptr;
  const void* data = nullptr;
  size_t size = 1;
  char room = 0;
  const auto visit = [](const tav_node*, void*) { return 0; };
  for (const tav_node* const bad : {static_cast<const tav_node*>(nullptr), const_cast<const tav_node*>(&foreign),
                                    const_cast<const tav_node*>(&zero)})
  {
    EXPECT_EQ(tav_first_child(reader.get(), bad, &out), TAV_RC_BAD_PARAM);
    EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("TAV_RC_BAD_PARAM"));
    EXPECT_EQ(tav_next_sibling(reader.get(), bad, &out), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_u64(reader.get(), bad, &number), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_i64(reader.get(), bad, &whole), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_u128(reader.get(), bad, &number, &number), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_time(reader.get(), bad, &whole), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_text(reader.get(), bad, &text, &size), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_get_bytes(reader.get(), bad, &data, &size), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_read(reader.get(), bad, 0, &room, &size), TAV_RC_BAD_PARAM);
    if (bad != nullptr)
    {
      EXPECT_EQ(tav_next_root(reader.get(), bad, &out), TAV_RC_BAD_PARAM);
      EXPECT_EQ(tav_find(reader.get(), bad, "cpuOnline", &out), TAV_RC_BAD_PARAM);
      EXPECT_EQ(tav_find_each(reader.get(), bad, "cpuOnline", visit, nullptr), TAV_RC_BAD_PARAM);
    }
  }
  EXPECT_EQ(tav_next_root(nullptr, nullptr, &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_next_root(reader.get(), nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_first_child(nullptr, &root, &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_first_child(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_next_sibling(nullptr, &root, &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_next_sibling(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find(nullptr, nullptr, "/", &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find(reader.get(), nullptr, nullptr, &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find(reader.get(), nullptr, "/", nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find(reader.get(), nullptr, "/hosst", &out), TAV_RC_BAD_PARAM);
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("hosst"));
  EXPECT_EQ(tav_find(reader.get(), nullptr, "a[", &out), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find_each(nullptr, nullptr, "/", visit, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find_each(reader.get(), nullptr, nullptr, visit, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_find_each(reader.get(), nullptr, "/", nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u64(nullptr, &root, &number), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u64(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_i64(nullptr, &root, &whole), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_i64(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u128(nullptr, &root, &number, &number), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u128(reader.get(), &root, nullptr, &number), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_u128(reader.get(), &root, &number, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_time(nullptr, &root, &whole), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_time(reader.get(), &root, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_text(nullptr, &root, &text, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_text(reader.get(), &root, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_text(reader.get(), &root, &text, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_bytes(nullptr, &root, &data, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_bytes(reader.get(), &root, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_get_bytes(reader.get(), &root, &data, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_read(nullptr, &root, 0, &room, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_read(reader.get(), &root, 0, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_read(reader.get(), &root, 0, &room, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_form_of(nullptr, nullptr), TAV_RC_BAD_PARAM);
  tav_form form{};
  EXPECT_EQ(tav_form_of(nullptr, &form), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_form_of(reader.get(), nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(tav_last_message(nullptr), StrEq(""));
  tav_close(nullptr);
}

TEST(C, RefusesToOpenWhatIsNoStream)
{
  const Bytes bytes = valuesOf();
  auto* const before = reinterpret_cast<tav_reader*>(1);
  tav_reader* reader = before;
  EXPECT_EQ(tav_open_memory(nullptr, 5, nullptr, &reader), TAV_RC_BAD_PARAM);
  EXPECT_EQ(reader, nullptr);
  EXPECT_EQ(tav_open_memory(bytes.data(), bytes.size(), nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_open_file(nullptr, nullptr, &reader), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_open_file("x", nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_open_memory(bytes.data(), 0, nullptr, &reader), TAV_RC_NOT_FOUND);
  for (const tav_form& bad : {tav_form{3, 0, 0}, tav_form{0, 16, 0}, tav_form{0, 0, 3}})
  {
    reader = before;
    EXPECT_EQ(tav_open_memory(bytes.data(), bytes.size(), &bad, &reader), TAV_RC_BAD_PARAM);
    EXPECT_EQ(reader, nullptr);
    tav_writer* writer = nullptr;
    EXPECT_EQ(tav_create_memory(&bad, &writer), TAV_RC_BAD_PARAM);
    EXPECT_EQ(tav_create_file("x", &bad, 0, &writer), TAV_RC_BAD_PARAM);
  }
  const test::TemporaryPath file;
  EXPECT_EQ(tav_open_file(tav::FilePath(file.path).text().c_str(), nullptr, &reader), KOR_RC_NO_SUCH_FILE);
}
