// Why bytes are no node, in the words of the walk over them, and the texts that need no walk.
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"

using namespace tav::inspect;
using test::ByteRows;

namespace
{

class DamageReasons : public testing::TestWithParam<bool>
{
protected:
  /// The first reason of a walk, with the code's name.
  std::string reasonIn(const ByteRows& rows, bool root64 = true)
  {
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    Walker walker(source, {.swapped = GetParam(), .root64 = root64});
    for (Event event; walker.next(event);)
    {
      if (event.what == What::damaged)
      {
        return event.reason + " " + std::string(korCodeName(event.code));
      }
    }
    return "(sound)";
  }

  /// A root with a node that is none between two that are.
  std::string between(uint64_t size, uint16_t type, uint64_t payload)
  {
    ByteRows rows(GetParam());
    rows.h64(20 + 16 + payload + 20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(7, 4);
    rows.h64(size, 0, type, 40001).fill(payload, 0xEE);
    rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(7, 4);
    return reasonIn(rows);
  }
};

} // namespace

INSTANTIATE_TEST_SUITE_P(Swapped, DamageReasons, testing::Bool());

TEST_P(DamageReasons, TellOfSizesAndTypes)
{
  EXPECT_EQ(between(0, 0, 6), "zeros where a node should begin TAV_RC_BAD_HDR_TYPE");
  EXPECT_EQ(between(1, 999, 6), "no node: type 999 is unknown, and no node follows TAV_RC_BAD_HDR_TYPE");
  EXPECT_EQ(between(3, TAV_TYPE_UINT32, 6),
            "no node: a size of 3 does not suit type 55, and no node follows TAV_RC_BAD_HDR_TYPE");
  EXPECT_EQ(between(~uint64_t{0}, TAV_TYPE_UINT32, 6), "no node: its size is all ones TAV_RC_OUTSIDE_PARENT");
  EXPECT_EQ(between(27, TAV_TYPE_UINT32, 6),
            "no node: it would end 1 byte past the end of the file TAV_RC_OUTSIDE_PARENT");
  EXPECT_EQ(between(1000, TAV_TYPE_UINT32, 6),
            "no node: it would end 974 bytes past the end of the file TAV_RC_OUTSIDE_PARENT");
}

TEST_P(DamageReasons, TellOfTheGroupAroundWhereTheFileGoesOn)
{
  ByteRows rows(GetParam());
  rows.h64(16 + 4, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM).h64(6, 0, TAV_TYPE_BINARY, 40001).fill(4, 0xEE);
  rows.h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(7, 4);
  EXPECT_EQ(reasonIn(rows), "no node: it would end 2 bytes past its parent TAV_RC_OUTSIDE_PARENT");
}

TEST_P(DamageReasons, TellOfHeadersThatAreCut)
{
  for (const uint64_t left : std::vector<uint64_t>{1, 2, 15})
  {
    ByteRows rows(GetParam());
    rows.h64(20 + left, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(7, 4).fill(left, 0xEE);
    EXPECT_EQ(reasonIn(rows), (left == 1 ? "1 byte is" : std::to_string(left) + " bytes are") +
                                  " too few for a node's header TAV_RC_NO_MEMORY");
  }
}

TEST(FormTexts, NameAllThreeOfAForm)
{
  for (const bool swapped : {false, true})
  {
    const std::string order = swapped != test::kBigEndianHost ? "big-endian" : "little-endian";
    EXPECT_EQ(orderText({.swapped = swapped}), order);
    EXPECT_EQ(formText({.swapped = swapped}), order + ", 64-bit root header, not padded");
    EXPECT_EQ(formText({.swapped = swapped, .root64 = false, .aligned = true}),
              order + ", 32-bit root header, padded to 8");
    EXPECT_EQ(otherStreamText({.swapped = swapped, .root64 = false}),
              "a stream in another form seems to begin: " + order + ", 32-bit root header");
    EXPECT_EQ(otherStreamText({.swapped = swapped}),
              "a stream in another form seems to begin: " + order + ", 64-bit root header");
  }
}

TEST(TextsForTerminals, HaveNoneOfTheCharactersThatTurnTheDirection)
{
  struct Row
  {
    const char* character;
    const char* shown;
  };
  for (const Row& row : std::vector<Row>{{"\xE2\x80\xA9", "\xE2\x80\xA9"},
                                         {"\xE2\x80\xAA", R"(\xe2\x80\xaa)"},
                                         {"\xE2\x80\xAE", R"(\xe2\x80\xae)"},
                                         {"\xE2\x80\xAF", "\xE2\x80\xAF"},
                                         {"\xE2\x81\xA5", "\xE2\x81\xA5"},
                                         {"\xE2\x81\xA6", R"(\xe2\x81\xa6)"},
                                         {"\xE2\x81\xA9", R"(\xe2\x81\xa9)"},
                                         {"\xE2\x81\xAA", "\xE2\x81\xAA"},
                                         {"\xE2\x82\xAC", "\xE2\x82\xAC"},
                                         {"\xE3\x80\xAE", "\xE3\x80\xAE"},
                                         {"\xC2\x9F", R"(\xc2\x9f)"},
                                         {"\xC2\xA0", "\xC2\xA0"},
                                         {"\xC3\x9F", "\xC3\x9F"},
                                         {"\xF0\x9F\x99\x82", "\xF0\x9F\x99\x82"},
                                         {"\x1F", R"(\x1f)"},
                                         {"\x7F", R"(\x7f)"},
                                         {"\x80", R"(\x80)"},
                                         {"\a\b\t\n\v\f\r", R"(\a\b\t\n\v\f\r)"}})
  {
    EXPECT_EQ(forTerminal(row.character), row.shown);
    EXPECT_EQ(quoted(row.character), '"' + std::string(row.shown) + '"');
  }
}

TEST(TextsForTerminals, AreCutToTheirColumnsWithDots)
{
  const std::vector<std::string> cuts{"", ".", "..", "...", "a...", "abcde"};
  for (size_t columns = 0; columns < cuts.size(); ++columns)
  {
    EXPECT_EQ(cutToWidth("abcde", columns), cuts[columns]) << columns;
  }
  EXPECT_EQ(cutToWidth("", 0), "");
}
