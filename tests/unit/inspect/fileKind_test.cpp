// What files are that are no streams, by their first bytes.
#include <string>
#include <string_view>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"
#include "tav/inspect/fileKind.hpp"

using namespace tav::inspect;
using namespace std::string_view_literals;
using test::Bytes;

namespace
{

Bytes bytesOf(std::string_view text)
{
  return {text.begin(), text.end()};
}

std::string kindOf(const Bytes& bytes)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const auto kind = fileKindOf(source);
  return kind ? std::string(kind->name) : "";
}

std::string kindOf(std::string_view text)
{
  return kindOf(bytesOf(text));
}

} // namespace

TEST(FileKinds, AreToldByAllBytesThatTheyBeginWith)
{
  struct Row
  {
    std::string_view bytes;
    const char* name;
  };
  for (const Row& row : std::vector<Row>{{"\x1F\x8B\x08"sv, "gzip"},
                                         {"PK\x03\x04"sv, "zip"},
                                         {"PK\x05\x06"sv, "zip"},
                                         {"PK\x07\x08"sv, "zip"},
                                         {"\x28\xB5\x2F\xFD"sv, "zstd"},
                                         {"\x7F\x45LF"sv, "elf"},
                                         {"SQLite format 3\0"sv, "sqlite"},
                                         {"PAR1"sv, "parquet"},
                                         {"\xFF\xFE<\0"sv, "xml"},
                                         {"\xFE\xFF\0<"sv, "xml"}})
  {
    EXPECT_EQ(kindOf(row.bytes), row.name);
    EXPECT_EQ(kindOf(std::string(row.bytes) + "\x01\x80 and more"), row.name) << "whatever follows";
    const std::string cut(row.bytes.substr(0, row.bytes.size() - 1));
    EXPECT_NE(kindOf(cut + "\x01"), row.name) << "all of them count";
  }
}

TEST(FileKinds, OfTextsAreToldByTheirFirstTwoCharacters)
{
  const std::vector<std::string_view> json{R"({"a": 1})", "{}", "{ }", " \t\r\n\f{ \"a\": 1}", "{", "{\n",
                                           "\xEF\xBB\xBF{}", "[]", "[ [", "[{", "[\"", "[-1]", "[0]", "[9]",
                                           "[true]", "[false]", "[null]"};
  for (const std::string_view text : json)
  {
    EXPECT_EQ(kindOf(text), "json") << text;
  }
  for (const std::string_view text : {"<tav/>"sv, "<T/>"sv, "<?xml?>"sv, "<!-- -->"sv, "\xEF\xBB\xBF<a>"sv, "< a>"sv,
                                      "<z"sv, "<Z"sv})
  {
    EXPECT_EQ(kindOf(text), "xml") << text;
  }
  for (const std::string_view text : {"{a}"sv, "[a]"sv, "[/"sv, "[:"sv, "["sv, "<1>"sv, "<"sv, "<{"sv, "<@"sv,
                                      "<["sv, "<`"sv, "hello"sv, " "sv, "\xEF\xBB\xBF"sv, "gr\xC3\xBC\xC3\x9F"sv,
                                      "a\tb\nc\rd\fe"sv})
  {
    EXPECT_EQ(kindOf(text), "text") << text;
  }
}

TEST(FileKinds, OfBytesThatAreNoTextAreNotTold)
{
  EXPECT_EQ(kindOf(""), "");
  for (int c = 0; c < 0x100; ++c)
  {
    const char byte = static_cast<char>(c);
    const bool isText = c == '\t' || c == '\n' || c == '\r' || c == '\f' || (c >= 0x20 && c < 0x7F);
    EXPECT_EQ(kindOf(std::string{'a', byte, 'b'}), isText ? "text" : "") << c;
  }
}

TEST(FileKinds, OfLongTextsAreToldAlsoWhereACharacterIsCut)
{
  for (const std::string_view character : {"\xC3\xBC"sv, "\xE2\x82\xAC"sv, "\xF0\x9F\x99\x82"sv})
  {
    for (size_t shift = 0; shift < 4; ++shift)
    {
      std::string text(shift, 'a');
      while (text.size() < 100'000)
      {
        text += character;
      }
      EXPECT_EQ(kindOf(text), "text");
      EXPECT_EQ(kindOf(text + '\0'), "text") << "what is behind the first bytes is not looked at";
    }
  }
}

TEST(FileKinds, OfAStreamAreNotLookedForWhereItsRootIsOne)
{
  // The size of a root can be any bytes: here those that a file of another kind begins with.
  for (const bool isNamed : {false, true})
  {
    test::ByteRows rows(test::kBigEndianHost);
    rows.h32(0x00088B1F, TAV_TYPE_HEADER32, isNamed ? TAV_ELM_CMN_SYSTEM : 40001).fill(0x00088B1F, 0);
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    Recognition found;
    found.form = {.swapped = test::kBigEndianHost, .root64 = false};
    found.isStream = true;
    EXPECT_EQ(otherKindOf(source, found).has_value(), !isNamed);
    found.isStream = false;
    EXPECT_EQ(otherKindOf(source, found)->name, "gzip");
    rows.bytes.resize(1000);
    ByteSource cut("x", std::span<const uint8_t>(rows.bytes));
    found.isStream = true;
    EXPECT_EQ(otherKindOf(cut, found)->name, "gzip") << "the file has no room for the group";
  }
}
