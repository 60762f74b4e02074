/// The C interface where memory is short, and with forms of which only a part is given.
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/cHandles.h"
#include "support/failingNew.h"

using namespace test;
using testing::HasSubstr;
using testing::StrEq;

namespace
{

/// What a call answers while nothing can be allocated.
template<class Call>
uint32_t starved(Call&& call)
{
  const allocations::AllFail short_;
  return call();
}

} // namespace

TEST(CMemory, ThatIsShortKeepsHandlesFromBeingMade)
{
  const Bytes bytes = valuesOf();
  auto* reader = reinterpret_cast<tav_reader*>(1);
  EXPECT_EQ(starved([&] { return tav_open_memory(bytes.data(), bytes.size(), &kNative, &reader); }), TAV_RC_NO_MEMORY);
  EXPECT_EQ(reader, nullptr);
  auto* writer = reinterpret_cast<tav_writer*>(1);
  EXPECT_EQ(starved([&] { return tav_create_memory(&kNative, &writer); }), TAV_RC_NO_MEMORY);
  EXPECT_EQ(writer, nullptr);
  uint16_t elm = 7;
  EXPECT_EQ(starved([&] { return tav_id("cpuOnline", &elm); }), TAV_RC_NO_MEMORY);
  EXPECT_EQ(elm, 7U);
}

TEST(CMemory, ThatIsShortEndsASearchAndTheNextOneWorks)
{
  const Bytes bytes = valuesOf();
  const CReader reader = openMemory(bytes);
  tav_node node{};
  EXPECT_EQ(starved([&] { return tav_find(reader.get(), nullptr, "/system/cpuOnline", &node); }), TAV_RC_NO_MEMORY);
  EXPECT_EQ(tav_find(reader.get(), nullptr, "/system/cpuOnline", &node), TAV_RC_OK);
  uint64_t number = 0;
  EXPECT_EQ(starved([&] { return tav_get_u64(reader.get(), &node, &number); }), TAV_RC_OK) << "a number needs none";
  EXPECT_EQ(number, 7U);
}

TEST(CMemory, ThatIsShortLeavesAMessageThatSaysSo)
{
  const Bytes bytes = valuesOf();
  const CReader reader = openMemory(bytes);
  const tav_node text = found(reader, "/system/hostName");
  uint64_t number = 0;
  ASSERT_EQ(tav_get_u64(reader.get(), &text, &number), TAV_RC_NOT_SUPPORTED);
  const char* message = nullptr;
  starved([&] {
    message = tav_last_message(reader.get());
    return uint32_t{0};
  });
  EXPECT_THAT(message, StrEq(tav_message(TAV_RC_NO_MEMORY)));
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("the value cannot be read so")) << "it is still there";

  CWriter made(&kNative);
  ASSERT_EQ(tav_end(made.writer), TAV_RC_NOT_FOUND);
  starved([&] {
    message = tav_writer_message(made.writer);
    return uint32_t{0};
  });
  EXPECT_THAT(message, StrEq(tav_message(TAV_RC_NO_MEMORY)));
  EXPECT_THAT(tav_writer_message(made.writer), HasSubstr("no group is open"));
}

TEST(CForms, AreGivenInPart)
{
  const uint8_t own = kNative.byte_order;
  const auto other = static_cast<uint8_t>(3 - own);
  for (const tav_form& given : {tav_form{0, 0, 0}, tav_form{other, 0, 0}, tav_form{own, 0, 0}, tav_form{0, 32, 0},
                                tav_form{0, 64, 0}, tav_form{0, 0, 1}, tav_form{0, 0, 2}, tav_form{other, 32, 2}})
  {
    CWriter made(&given);
    ASSERT_EQ(tav_begin(made.writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
    for (uint32_t i = 0; i < 20; ++i)
    {
      // Of an odd length, so that padding can be told.
      ASSERT_EQ(tav_add_text(made.writer, TAV_ELM_CMN_HOST_NAME, "ada", 3), TAV_RC_OK);
      ASSERT_EQ(tav_add_u32(made.writer, TAV_ELM_CMN_CPU_ONLINE, i), TAV_RC_OK);
    }
    ASSERT_EQ(tav_end(made.writer), TAV_RC_OK);
    const Bytes bytes = made.finish();
    const tav_form written{given.byte_order == 0 ? own : given.byte_order,
                           given.root_bits == 0 ? uint8_t{64} : given.root_bits,
                           given.aligned == 0 ? uint8_t{1} : given.aligned};
    for (const tav_form* const told : std::vector<const tav_form*>{nullptr, &given, &written})
    {
      const CReader reader = openMemory(bytes, told);
      tav_form found{};
      EXPECT_EQ(tav_form_of(reader.get(), &found), TAV_RC_OK);
      EXPECT_EQ(found.byte_order, written.byte_order);
      EXPECT_EQ(found.root_bits, written.root_bits);
      EXPECT_EQ(found.aligned, written.aligned);
    }
  }
}

TEST(CForms, OfAFileThatIsGoneOnWithAreTakenFromItUnlessOneIsGiven)
{
  const TemporaryPath file;
  const std::string path = tav::FilePath(file.path).text();
  const auto other = static_cast<uint8_t>(3 - kNative.byte_order);
  const auto write = [&](const tav_form* form, uint32_t flags) {
    tav_writer* writer = nullptr;
    uint32_t rc = tav_create_file(path.c_str(), form, flags, &writer);
    if (rc == TAV_RC_OK)
    {
      EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
      for (uint32_t i = 0; i < 8; ++i)
      {
        EXPECT_EQ(tav_add_u32(writer, TAV_ELM_CMN_CPU_ONLINE, i), TAV_RC_OK);
      }
      EXPECT_EQ(tav_end(writer), TAV_RC_OK);
      EXPECT_EQ(tav_flush(writer), TAV_RC_OK);
      EXPECT_EQ(tav_sync(writer), TAV_RC_OK);
      rc = tav_finish(&writer, nullptr, nullptr);
    }
    return rc;
  };
  const auto orders = [&] {
    const CReader reader = openFile(file.path);
    tav_form found{};
    EXPECT_EQ(tav_form_of(reader.get(), &found), TAV_RC_OK);
    return found.byte_order;
  };
  const tav_form swapped{other, 0, 0};
  const tav_form nothing{0, 0, 0};
  ASSERT_EQ(write(&swapped, 0), TAV_RC_OK);
  EXPECT_EQ(write(&nothing, TAV_CREATE_APPEND), TAV_RC_OK);
  EXPECT_EQ(orders(), other);
  EXPECT_EQ(write(nullptr, TAV_CREATE_OVERWRITE), TAV_RC_OK);
  EXPECT_EQ(orders(), kNative.byte_order);
  tav_writer* writer = nullptr;
  EXPECT_EQ(tav_create_file(path.c_str(), nullptr, TAV_CREATE_APPEND | TAV_CREATE_OVERWRITE, &writer),
            TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(tav_create_file(nullptr, nullptr, 0, &writer), TAV_RC_BAD_PARAM);
}

TEST(CWriting, OfNothingGivesNoBytesThatCanBeLetGoOf)
{
  CWriter made(&kNative);
  EXPECT_EQ(made.finish(), Bytes());
  tav_writer* none = nullptr;
  const void* bytes = nullptr;
  size_t size = 0;
  EXPECT_EQ(tav_finish(&none, &bytes, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_finish(nullptr, &bytes, &size), TAV_RC_BAD_PARAM);
  tav_discard(nullptr);
  tav_discard(&none);
  tav_free(nullptr);
  EXPECT_THAT(tav_writer_message(nullptr), StrEq(""));
}

TEST(CWriting, AsksForAPlaceOfWhatItMadeAndGoesOnAfterwards)
{
  CWriter made(&kNative);
  ASSERT_EQ(tav_begin(made.writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  ASSERT_EQ(tav_flush(made.writer), TAV_RC_OK) << "in memory there is nothing to do";
  ASSERT_EQ(tav_sync(made.writer), TAV_RC_OK);
  ASSERT_EQ(tav_end(made.writer), TAV_RC_OK);
  const void* bytes = nullptr;
  size_t size = 0;
  EXPECT_EQ(tav_finish(&made.writer, nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tav_finish(&made.writer, &bytes, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(tav_writer_message(made.writer), HasSubstr("an argument is null"));
  EXPECT_EQ(made.finish().size(), 16U);
}

TEST(CValues, AreRefusedInAnotherTypeThanTheyHave)
{
  const Bytes bytes = valuesOf();
  const CReader reader = openMemory(bytes);
  uint64_t number = 0;
  int64_t whole = 0;
  const char* text = nullptr;
  const void* data = nullptr;
  size_t size = 0;
  const tav_node group = found(reader, "/system/host");
  const tav_node value = found(reader, "/system/cpuOnline");
  const tav_node name = found(reader, "/system/hostName");
  EXPECT_EQ(tav_get_bytes(reader.get(), &group, &data, &size), TAV_RC_NOT_SUPPORTED);
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("/system/host: the value cannot be read so"));
  EXPECT_EQ(tav_get_text(reader.get(), &value, &text, &size), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(tav_get_time(reader.get(), &value, &whole), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(tav_get_u64(reader.get(), &name, &number), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(tav_get_i64(reader.get(), &name, &whole), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(tav_get_u128(reader.get(), &name, &number, &number), TAV_RC_NOT_SUPPORTED);
}
