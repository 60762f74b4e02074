/// Values of every type that a node is given, and those that it refuses.
#include <optional>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

struct Edited
{
  const char* node;  ///< type and value in the document
  const char* given; ///< the new value
  const char* told;  ///< as plain text, or what it is refused with
};

struct Layout
{
  bool swapped;
  bool root64;
  bool aligned;
};

Bytes streamOf(const std::string& node, const Layout& layout)
{
  const bool big = test::kBigEndianHost != layout.swapped;
  return test::bytesOfJson(std::string(R"({"form": {"byteOrder": ")") + (big ? "big" : "little") +
                           R"(", "root": )" + (layout.root64 ? "64" : "32") + R"(, "aligned": )" +
                           (layout.aligned ? "true" : "false") +
                           R"(}, "nodes": [{"element": "system", "children": [{"id": 1, )" + node +
                           R"(}, {"id": 2, "type": "Uint32", "value": 7}]}]})");
}

std::string valueAt(const Bytes& bytes, const Form& form, const char* path)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  PathSearch search(source, form, pathOf(path));
  Event event;
  return search.next(event) ? plainText(source, form, event.node, 4096).value_or("(too long)") : "(not there)";
}

class EditValues : public testing::TestWithParam<Layout>
{
protected:
  /// What the node has afterwards, or what it is refused with.
  std::string edited(const Edited& one, const EditOptions& options = {})
  {
    const Bytes bytes = streamOf(one.node, GetParam());
    ByteSource source("x", std::span<const uint8_t>(bytes));
    const std::vector<Assignment> assignments{{pathOf("/system/#1"), one.given}};
    try
    {
      Editor editor(source, form, assignments, options);
      test::Made made;
      editor.writeNew(made.file());
      const Bytes after = made.bytes();
      EXPECT_EQ(test::defects(after, form), test::defects(bytes, form));
      EXPECT_EQ(valueAt(after, form, "/system/#2"), "7") << "what is behind it stays";
      return valueAt(after, form, "/system/#1");
    }
    catch (const Error& error)
    {
      return error.problem().sentence;
    }
  }

  Form form{.swapped = GetParam().swapped, .root64 = GetParam().root64, .aligned = GetParam().aligned};
};

} // namespace

INSTANTIATE_TEST_SUITE_P(Forms, EditValues,
                         testing::Values(Layout{false, true, false}, Layout{true, true, true},
                                         Layout{false, false, false}, Layout{true, false, true}));

TEST_P(EditValues, AreTakenAsPlainTextShowsThem)
{
  const std::vector<Edited> cases{
      {R"("type": "Uint64 array", "value": [1, 2])", "[3 4 5]", "[3 4 5]"},
      {R"("type": "Uint64 array", "value": [1, 2])", "18446744073709551615, 1", "[18446744073709551615 1]"},
      {R"("type": "Uint64 array", "value": [1, 2])", " 6 ", "[6]"},
      {R"("type": "Uint64 array", "value": [1, 2])", "[]", "[]"},
      {R"("type": "Byte", "bytes": "00")", "ff", "ff"},
      {R"("type": "binary", "bytes": "0011")", "00FFaa", "00ffaa"},
      {R"("type": "binary", "bytes": "0011")", "", ""},
      {R"("type": "Uint8", "value": 1)", "255", "255"},
      {R"("type": "Sint8", "value": 1)", "-128", "-128"},
      {R"("type": "Sint64", "value": 1)", "-9223372036854775808", "-9223372036854775808"},
      {R"("type": "Uint128", "value": 1)", "340282366920938463463374607431768211455",
       "340282366920938463463374607431768211455"},
      {R"("type": "Sint128", "value": 1)", "-170141183460469231731687303715884105728",
       "-170141183460469231731687303715884105728"},
      {R"("type": "UTC Timestamp", "value": "2024-02-29T10:30:00.123456+01:00")", "1970-01-01T00:00:00.5Z",
       "1970-01-01T00:00:00.500000+00:00"},
      {R"("type": "ASCII String", "value": "ada")", "a \x7F", "a \x7F"},
      {R"("type": "UTF8 String", "value": "ada")", "gr\xC3\xBC\xC3\x9F", "gr\xC3\xBC\xC3\x9F"},
      {R"("type": "UTF8 String", "codePage": 1252, "value": "ada")", "eva", "eva"},
  };
  for (const Edited& one : cases)
  {
    EXPECT_EQ(edited(one), one.told) << one.node << " " << one.given;
  }
}

TEST_P(EditValues, AreRefusedWithWhatTheTypeTakes)
{
  const std::vector<Edited> cases{
      {R"("type": "Uint64 array", "value": [1])", "[1 x]",
       R"("[1 x]" is no value for Uint64 array: whole numbers are, as [1 2 3])"},
      {R"("type": "Uint64 array", "value": [1])", "18446744073709551616",
       R"("18446744073709551616" is no value for Uint64 array: whole numbers are, as [1 2 3])"},
      {R"("type": "Uint64 array", "value": [1])", "1x",
       R"("1x" is no value for Uint64 array: whole numbers are, as [1 2 3])"},
      {R"("type": "Byte", "bytes": "00")", "0011", R"("0011" is no value for Byte: two hexadecimal digits are)"},
      {R"("type": "Byte", "bytes": "00")", "", R"("" is no value for Byte: two hexadecimal digits are)"},
      {R"("type": "binary", "bytes": "00")", "0g",
       R"("0g" is no value for Binary: hexadecimal bytes are, as 00ff)"},
      {R"("type": "ASCII String", "value": "a")", "\xC3\xBC",
       "\"\xC3\xBC\" is no value for ASCII String, which ends at 127; a UTF8 String takes it"},
      {R"("type": "UTF8 String", "value": "a")", "\xFF",
       R"("\xff" is no value for UTF8 String: it is no UTF-8)"},
      {R"("type": "Uint8", "value": 1)", "256", R"("256" is no value for Uint8: whole numbers from 0 to 255 are)"},
  };
  for (const Edited& one : cases)
  {
    EXPECT_EQ(edited(one), one.told) << one.node << " " << one.given;
  }
}

TEST_P(EditValues, ChangeTheTypeWhereItIsAskedFor)
{
  EXPECT_EQ(edited({R"("type": "Uint32", "value": 1)", "ada", ""}, {.type = TAV_TYPE_ASCII_STRING}), "ada");
  EXPECT_EQ(edited({R"("type": "ASCII String", "value": "ada")", "-1", ""}, {.type = TAV_TYPE_SINT16}), "-1");
}

TEST_P(EditValues, KeepTheTwoBytesBehindATextAndTheCodePageBeforeIt)
{
  const Bytes bytes = streamOf(R"("type": "UTF8 String", "codePage": 1252, "value": "ada", "extra": "abcd")",
                               GetParam());
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const std::vector<Assignment> assignments{{pathOf("/system/#1"), "\xFC\xFF"}}; // which is no UTF-8
  uint64_t last = 0;
  uint64_t seen = 0;
  Editor editor(source, form, assignments, {.seen = [&](const Walker&, const Event&) { ++seen; }});
  EXPECT_GT(seen, 0U);
  test::Made made;
  editor.writeNew(made.file(), [&](uint64_t offset) {
    EXPECT_GE(offset, last);
    last = offset;
  });
  EXPECT_GT(last, 0U);
  const Bytes after = made.bytes();
  ByteSource again("y", std::span<const uint8_t>(after));
  PathSearch search(again, form, pathOf("/system/#1"));
  Event event;
  ASSERT_TRUE(search.next(event));
  EXPECT_EQ(event.node.size(), 4U);
  std::vector<uint8_t> payload(4);
  again.read(event.node.payloadOffset(), payload);
  const bool big = test::kBigEndianHost != form.swapped;
  EXPECT_THAT(payload, testing::ElementsAre(big ? 0x04 : 0xE4, big ? 0xE4 : 0x04, 0xFC, 0xFF));
  EXPECT_EQ(attributeText(again, form, event.node, tav::detail::paths::Attribute::extra), "abcd");
  EXPECT_EQ(valueAt(after, form, "/system/#2"), "7");
}

TEST_P(EditValues, AreKeptWithTheirPaddingWhereTheSizeStays)
{
  const Bytes bytes = streamOf(R"("type": "ASCII String", "value": "ada")", GetParam());
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const std::vector<Assignment> assignments{{pathOf("/system/#1"), "eva"}};
  Editor editor(source, form, assignments);
  editor.requireSameSizes();
  test::Made made;
  editor.writeNew(made.file());
  const Bytes after = made.bytes();
  ASSERT_EQ(after.size(), bytes.size());
  size_t different = 0;
  for (size_t i = 0; i < bytes.size(); ++i)
  {
    different += bytes[i] != after[i] ? 1 : 0;
  }
  EXPECT_EQ(different, 2U) << "of ada and eva";
}
