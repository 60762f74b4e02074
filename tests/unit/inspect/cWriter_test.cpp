#include <string>
#include <string_view>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/cHandles.h"

using namespace test;
using testing::HasSubstr;
using testing::StrEq;

TEST(C, WritesAsTheLayerDoes)
{
  for (const bool swap : {false, true})
  {
    const bool isLittle = swap == test::kBigEndianHost;
    const tav_form form{isLittle ? uint8_t{1} : uint8_t{2}, 64, 2};
    CWriter made(&form);
    tav::Writer writer({.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native, .align8 = true});
    {
      tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true, .infoKey = 5});
      system.add(TAV_ELM_CMN_HOST_NAME, "ada");
      system.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
      {
        tav::Group gone = system.group(TAV_ELM_CMN_HOST);
        gone.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{9});
        gone.abandon();
      }
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_CPU_ONLINE, int64_t{-1});
    }
    writer.finish();
    EXPECT_EQ(tav_begin(made.writer, TAV_ELM_CMN_SYSTEM, TAV_INFO_EYE_SIZE | 5), TAV_RC_OK);
    EXPECT_EQ(tav_add_text(made.writer, TAV_ELM_CMN_HOST_NAME, "ada", 3), TAV_RC_OK);
    EXPECT_EQ(tav_add_u32(made.writer, TAV_ELM_CMN_CPU_ONLINE, 8), TAV_RC_OK);
    EXPECT_EQ(tav_begin(made.writer, TAV_ELM_CMN_HOST, 0), TAV_RC_OK);
    EXPECT_EQ(tav_add_u32(made.writer, TAV_ELM_CMN_CPU_ONLINE, 9), TAV_RC_OK);
    EXPECT_EQ(tav_abandon(made.writer), TAV_RC_OK);
    EXPECT_EQ(tav_begin(made.writer, TAV_ELM_CMN_HOST, 0), TAV_RC_OK);
    EXPECT_EQ(tav_add_i64(made.writer, TAV_ELM_CMN_CPU_ONLINE, -1), TAV_RC_OK);
    EXPECT_EQ(tav_end(made.writer), TAV_RC_OK);
    EXPECT_EQ(tav_end(made.writer), TAV_RC_OK);
    EXPECT_EQ(made.finish(), test::bytesOf(writer.bytes()));
  }
}

TEST(C, RefusesWrongStepsOfAWriter)
{
  CWriter made;
  tav_writer* const writer = made.writer;
  EXPECT_EQ(tav_end(writer), TAV_RC_NOT_FOUND);
  EXPECT_THAT(tav_writer_message(writer), HasSubstr("no group is open"));
  EXPECT_EQ(tav_abandon(writer), TAV_RC_NOT_FOUND);
  EXPECT_EQ(tav_add_u32(writer, 1, 1), TAV_RC_NOT_FOUND);
  ASSERT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  EXPECT_THAT(tav_writer_message(writer), StrEq(""));
  const void* bytes = nullptr;
  size_t size = 0;
  EXPECT_EQ(tav_finish(&made.writer, &bytes, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(made.writer, writer);
  EXPECT_THAT(tav_writer_message(writer), HasSubstr("open"));
  EXPECT_EQ(tav_add_text(writer, 1, nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_bytes(writer, 1, nullptr, 0), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_time(writer, 1, -1), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(tav_flush(writer), TAV_RC_OK);
  EXPECT_EQ(tav_sync(writer), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  EXPECT_EQ(tav_finish(&made.writer, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_finish(&made.writer, &bytes, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(made.finish().size(), 16U);
  EXPECT_EQ(tav_finish(&made.writer, &bytes, &size), TAV_RC_BAD_PARAM);
}

TEST(C, RefusesTextThatIsNoUtf8AndAddsNothing)
{
  CWriter made;
  tav_writer* const writer = made.writer;
  ASSERT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  const std::string_view refused[] = {
      "\xFF", "\x80", "\xE4rger", "abcdefgh\xE4", // a byte of another code page, at the beginning and at the end
      "\xC3", "\xE2\x82", "\xF0\x9F\x98",         // a character that is cut
      "\xC0\x80", "\xC1\xBF", "\xE0\x9F\xBF",     // longer than it has to be
      "\xED\xA0\x80", "\xF4\x90\x80\x80"};        // half of a pair, and beyond the last character
  for (const std::string_view text : refused)
  {
    EXPECT_EQ(tav_add_text(writer, TAV_ELM_CMN_HOST_NAME, text.data(), text.size()), TAV_RC_BAD_PARAM);
    EXPECT_THAT(tav_writer_message(writer), HasSubstr("UTF-8"));
  }
  EXPECT_EQ(tav_add_text(writer, TAV_ELM_CMN_HOST_NAME, "\xE4", 0), TAV_RC_OK) << "as many bytes as were said";
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  EXPECT_EQ(made.finish().size(), 16U + 16U);
}

TEST(C, RefusesAWriterThatIsNone)
{
  tav_writer* none = nullptr;
  const void* bytes = nullptr;
  size_t size = 0;
  EXPECT_EQ(tav_create_memory(nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_create_file("x", nullptr, 0, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_create_file(nullptr, nullptr, 0, &none), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_create_file("x", nullptr, 3, &none), TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(tav_create_file("x", nullptr, 4, &none), TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(tav_begin(nullptr, 1, 0), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_end(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_abandon(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_u32(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_u64(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_i32(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_i64(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_u128(nullptr, 1, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_text(nullptr, 1, "a", 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_text(nullptr, 1, nullptr, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_bytes(nullptr, 1, "a", 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_time(nullptr, 1, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_add_time(nullptr, 1, -1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_flush(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_sync(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(tav_writer_message(nullptr), StrEq(""));
  EXPECT_EQ(tav_finish(nullptr, &bytes, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_finish(&none, &bytes, &size), TAV_RC_BAD_PARAM);
  tav_discard(nullptr);
  tav_discard(&none);
  tav_free(nullptr);
}

TEST(C, KeepsAFileThatIsNotToBeOverwritten)
{
  const test::TemporaryPath file;
  writeFile(file.path, {1, 2, 3});
  const std::string path = tav::FilePath(file.path).text();
  tav_writer* writer = nullptr;
  EXPECT_EQ(tav_create_file(path.c_str(), nullptr, 0, &writer), KOR_RC_FILE_EXISTS);
  EXPECT_EQ(writer, nullptr);
  ASSERT_EQ(tav_create_file(path.c_str(), nullptr, TAV_CREATE_OVERWRITE, &writer), TAV_RC_OK);
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  tav_discard(&writer);
  EXPECT_EQ(writer, nullptr);
  EXPECT_EQ(std::filesystem::file_size(file.path), 3U);
  ASSERT_EQ(tav_create_file(path.c_str(), nullptr, TAV_CREATE_OVERWRITE, &writer), TAV_RC_OK);
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  const void* bytes = &path;
  size_t size = 1;
  EXPECT_EQ(tav_finish(&writer, &bytes, &size), TAV_RC_OK);
  EXPECT_EQ(bytes, nullptr);
  EXPECT_EQ(size, 0U);
  EXPECT_NE(openFile(file.path), nullptr);
}

TEST(C, GoesOnInAFileInTheFormThatItHas)
{
  const test::TemporaryPath file;
  const std::string path = tav::FilePath(file.path).text();
  const tav_form narrow{test::kBigEndianHost ? uint8_t{1} : uint8_t{2}, 32, 1};
  tav_writer* writer = nullptr;
  for (const tav_form* const form : {&narrow, static_cast<const tav_form*>(nullptr), &narrow})
  {
    ASSERT_EQ(tav_create_file(path.c_str(), form, TAV_CREATE_APPEND, &writer), TAV_RC_OK);
    EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
    EXPECT_EQ(tav_add_u32(writer, TAV_ELM_CMN_CPU_ONLINE, 8), TAV_RC_OK);
    EXPECT_EQ(tav_flush(writer), TAV_RC_OK) << tav_writer_message(writer);
    EXPECT_EQ(tav_sync(writer), TAV_RC_OK) << tav_writer_message(writer);
    EXPECT_EQ(tav_end(writer), TAV_RC_OK);
    ASSERT_EQ(tav_finish(&writer, nullptr, nullptr), TAV_RC_OK);
  }
  const auto written = std::filesystem::file_size(file.path);
  EXPECT_EQ(tav_create_file(path.c_str(), &kNative, TAV_CREATE_APPEND, &writer), TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(std::filesystem::file_size(file.path), written);

  const CReader reader = openFile(file.path, &narrow);
  tav_node root{};
  unsigned roots = 0;
  for (const tav_node* last = nullptr; tav_next_root(reader.get(), last, &root) == TAV_RC_OK; last = &root) ++roots;
  EXPECT_EQ(roots, 3U);
}
