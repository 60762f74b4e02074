// What a check says where a rule's example says something else, in both byte orders.
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"

using namespace tav::inspect;
using test::ByteRows;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::StartsWith;

namespace
{

constexpr uint16_t kNumber = TAV_ELM_CMN_CPU_ONLINE;
constexpr uint16_t kGroup = TAV_ELM_CMN_SYSTEM;
constexpr uint64_t kMostNested = 4000;

class CheckSentences : public testing::TestWithParam<bool>
{
protected:
  /// "0x10 size-type: has 5 bytes ..." for each finding, notes as well.
  std::vector<std::string> told(const ByteRows& stream, bool root64 = true, bool aligned = false)
  {
    ByteSource source("x", std::span<const uint8_t>(stream.bytes));
    std::vector<std::string> list;
    CheckOptions options;
    options.wanted = [](RuleId) { return true; };
    options.style = PathStyle::brief; // whole ones of deep nests are long
    options.sink = [&](const Finding& found) {
      list.push_back(hexOffset(found.offset) + " " + std::string(ruleOf(found.rule).id) + ": " + found.sentence);
    };
    check(source, {.swapped = GetParam(), .root64 = root64, .aligned = aligned}, options);
    return list;
  }

  static ByteRows& number(ByteRows& to) { return to.h64(4, 0, TAV_TYPE_UINT32, kNumber).number(7, 4); }

  ByteRows rows{GetParam()};
};

} // namespace

INSTANTIATE_TEST_SUITE_P(Swapped, CheckSentences, testing::Bool());

TEST_P(CheckSentences, CountWhatIsNotClosedTooDeepToBeTold)
{
  for (const auto& [below, said] : std::vector<std::pair<uint64_t, const char*>>{
           {0, "was never closed"},
           {1, "was never closed, nor was 1 group in it"},
           {2, "was never closed, nor were 2 groups in it"}})
  {
    ByteRows nest(GetParam());
    for (uint64_t i = 0; i <= kMostNested + below; ++i)
    {
      nest.h32(0xFFFFFFFF, TAV_TYPE_HEADER32, kGroup);
    }
    const std::vector<std::string> list = told(nest, false);
    EXPECT_THAT(list, Contains(hexOffset(kMostNested * 8) + " group-open: " + said)) << below;
    EXPECT_EQ(list.size(), kMostNested + 2) << "one for each group up to there, and that it is too deep";
  }
}

TEST_P(CheckSentences, CountThemBelowAGroupThatIsClosed)
{
  for (const auto& [below, said] : std::vector<std::pair<uint64_t, const char*>>{
           {1, "1 group in it was never closed"}, {3, "3 groups in it were never closed"}})
  {
    ByteRows nest(GetParam());
    for (uint64_t i = 0; i < kMostNested; ++i)
    {
      nest.h32((kMostNested - i + below) * 8, TAV_TYPE_HEADER32, kGroup);
    }
    nest.h32(below * 8, TAV_TYPE_HEADER32, kGroup);
    for (uint64_t i = 0; i < below; ++i)
    {
      nest.h32(0xFFFFFFFF, TAV_TYPE_HEADER32, kGroup);
    }
    EXPECT_THAT(told(nest, false), Contains(hexOffset(kMostNested * 8) + " group-open: " + said)) << below;
  }
}

TEST_P(CheckSentences, OfASizeGiveTheTypeAndTheBytes)
{
  rows.h64(16 + 1 + 20, 0, TAV_TYPE_HEADER64, kGroup).h64(1, 0, TAV_TYPE_UINT32, kNumber).number(7, 1);
  number(rows);
  EXPECT_THAT(told(rows), ElementsAre("0x10 size-type: has 1 byte, which does not suit its type, Uint32"));
}

TEST_P(CheckSentences, OfAGroupWithAnEndElementElsewhereGiveBothEnds)
{
  // 0 and too much: the end element ends both at 0x44.
  for (const uint64_t size : std::vector<uint64_t>{0, 500})
  {
    ByteRows group(GetParam());
    group.h64(size, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, kGroup);
    number(group).end64(20 + 32);
    const std::string said = size == 0 ? "its size is 0, but its end element ends at 0x44"
                                       : "says that it ends at 0x204, but its end element ends at 0x44";
    EXPECT_THAT(told(group), ElementsAre("0x0 group-size: " + said)) << size;
  }
}

TEST_P(CheckSentences, OfAnEndElementGiveWhatItIsInstead)
{
  struct Row
  {
    uint64_t size;
    uint32_t info;
    uint16_t type;
    const char* said;
  };
  for (const Row& row : std::vector<Row>{{15, 0, TAV_TYPE_BINARY, "15 bytes, type 101, info 0x0"},
                                         {1, 0, TAV_TYPE_BINARY, "1 byte, type 101, info 0x0"},
                                         {16, 0x100, TAV_TYPE_BINARY, "16 bytes, type 101, info 0x100"},
                                         {16, 0, TAV_TYPE_UINT128, "16 bytes, type 103, info 0x0"}})
  {
    ByteRows group(GetParam());
    group.h64(20 + 16 + row.size, 0, TAV_TYPE_HEADER64, kGroup);
    number(group).h64(row.size, row.info, row.type, TAV_ELM_CMN_END_HDR_EYE_SIZE).fill(row.size);
    EXPECT_THAT(told(group), Contains("0x24 end-form: an end element of " + std::string(row.said) +
                                      " instead of 16 bytes, type 101, info 0"))
        << row.said;
  }
}

TEST_P(CheckSentences, OfAPairNameTheOtherByteOrderButBehindAString)
{
  const auto made = [&](uint16_t type) {
    ByteRows group(GetParam());
    group.h64(16 + 4 + 16, 0, TAV_TYPE_HEADER64, kGroup).h64(4, TAV_INFO_EYE_SIZE, type, kNumber).fill(4, 'a');
    ByteRows other(!GetParam());
    return group.data(other.pair(20).bytes);
  };
  EXPECT_THAT(told(made(TAV_TYPE_ASCII_STRING)), IsEmpty());
  EXPECT_THAT(told(made(TAV_TYPE_UINT32)),
              ElementsAre("0x24 pair-order: the eye/size pair is in the other byte order"));
}

TEST_P(CheckSentences, OfAPairGiveItsDistanceAndTheRightOne)
{
  rows.h64(16 + 4 + 16, 0, TAV_TYPE_HEADER64, kGroup).h64(4, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT32, kNumber);
  rows.number(7, 4).pair(21);
  EXPECT_THAT(told(rows), ElementsAre("0x24 pair-distance: the distance of the eye/size pair is 21 instead of 20"));
}

TEST_P(CheckSentences, OfAPaddingGiveWhatIsMissing)
{
  // Headers of 32 bits announce nothing; 4, 5 and 7 bytes of a payload lack as many as eight have more.
  for (const uint64_t size : std::vector<uint64_t>{4, 5, 7})
  {
    ByteRows group(GetParam());
    group.h32(8 + size, TAV_TYPE_HEADER32, kGroup).h32(size, TAV_TYPE_BINARY, kNumber).fill(size, 1);
    const std::string said = size == 7 ? "1 byte of padding is not there"
                                       : std::to_string(8 - size) + " bytes of padding are not there";
    EXPECT_THAT(told(group, false, true), ElementsAre(hexOffset(16 + size) + " padding-missing: " + said));
  }
}

TEST_P(CheckSentences, OfPaddingFlagsSayWhichOfTheTwoIsOdd)
{
  rows.h64(16 + 8, 0, TAV_TYPE_HEADER64, kGroup).h64(8, TAV_INFO_ALIGNED8, TAV_TYPE_UINT64, kNumber).fill(8);
  EXPECT_THAT(told(rows), ElementsAre("0x10 align-flag: announces padding, in a stream that is not padded"));
  EXPECT_THAT(told(rows, true, true),
              ElementsAre("0x0 align-flag: does not announce padding, in a stream that is padded"));
}

TEST_P(CheckSentences, OfACutFileTellTheOutermostGroupAlone)
{
  // Three groups that all end where the file did before it was cut; the innermost claims more than the one around it.
  rows.h64(36 + 100, 0, TAV_TYPE_HEADER64, kGroup).h64(20 + 100, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  number(rows);
  EXPECT_THAT(told(rows), ElementsAre("0x0 past-file: ends 100 bytes past the end of the file"));
  ByteRows more(GetParam());
  more.h64(36 + 100, 0, TAV_TYPE_HEADER64, kGroup).h64(21 + 100, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  number(more);
  EXPECT_THAT(told(more), ElementsAre("0x10 past-parent: ends 1 byte past its parent",
                                      "0x0 past-file: ends 100 bytes past the end of the file"));
}

TEST_P(CheckSentences, OfAGroupThatGoesPastASoundOneTellHowFar)
{
  rows.h64(36, 0, TAV_TYPE_HEADER64, kGroup).h64(21, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  number(rows).h64(20, 0, TAV_TYPE_HEADER64, kGroup);
  number(rows);
  EXPECT_THAT(told(rows), ElementsAre("0x10 past-parent: ends 1 byte past its parent"));
}

TEST_P(CheckSentences, OfDamageTellWhatTheHeaderThereSays)
{
  const auto made = [&](uint64_t size, uint16_t type, uint16_t elm) {
    ByteRows group(GetParam());
    group.h64(20 + 16 + 6 + 20, 0, TAV_TYPE_HEADER64, kGroup);
    number(group).h64(size, 0, type, elm).fill(6, 0xEE);
    number(group);
    return told(group);
  };
  EXPECT_THAT(made(5000, TAV_TYPE_UINT32, kNumber),
              ElementsAre("0x24 past-file: ends 4974 bytes past the end of the file"));
  EXPECT_THAT(made(3, 999, kNumber), ElementsAre("0x24 type-unknown: type 999 is unknown"));
  EXPECT_THAT(made(5, TAV_TYPE_UINT32, kNumber),
              ElementsAre("0x24 size-type: has 5 bytes, which does not suit its type, Uint32"));
  EXPECT_THAT(made(5, TAV_TYPE_UINT32, 40001), ElementsAre(StartsWith("0x24 damaged: 22 bytes damaged: no node: ")));
}

TEST_P(CheckSentences, OfChildrenThatEndEarlyNameTheGroup)
{
  rows.h64(20 + 16 + 20 + 5, 0, TAV_TYPE_HEADER64, kGroup).h64(25, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  number(rows).fill(5, 0x11);
  number(rows);
  EXPECT_THAT(told(rows), ElementsAre("0x10 group-size: its children end 5 bytes before it does"));
}

TEST_P(CheckSentences, OfBytesBehindTheStreamCountThem)
{
  rows.h64(20, 0, TAV_TYPE_HEADER64, kGroup);
  number(rows).fill(1, 0xFF);
  EXPECT_THAT(told(rows), ElementsAre("0x24 behind-stream: 1 byte behind the stream that are no node"));
}

TEST_P(CheckSentences, OfTextsTellEachKindOfOddByteOnceAndWhere)
{
  rows.h64(16 + 10 + 16 + 8, 0, TAV_TYPE_HEADER64, kGroup).h64(10, 0, TAV_TYPE_UTF8_STRING, kNumber).number(1208, 2);
  rows.data({'a', 0, 0, 0xC3, 'b', 0xFF, 'c', 0xE2});
  rows.h64(8, 0, TAV_TYPE_ASCII_STRING, kNumber).data({0x80, 0, 'a', 'b', 0x81, 0, 'c', 'd'});
  EXPECT_THAT(told(rows), ElementsAre("0x25 utf8-invalid: the string holds bytes that are no UTF-8",
                                      "0x23 string-nul: the string holds a NUL",
                                      "0x3b string-nul: the string holds a NUL",
                                      "0x3a string-high: the ASCII string holds a character beyond 127"));
}

TEST_P(CheckSentences, OfTextsFindTheFirstByteOfEveryKindThatIsNoUtf8)
{
  struct Row
  {
    test::Bytes bytes;
    bool isText;
  };
  const std::vector<Row> cases{{{0xC2, 0x80}, true},
                               {{0xC1, 0x80}, false},
                               {{0xE0, 0xA0, 0x80}, true},
                               {{0xE0, 0x9F, 0x80}, false},
                               {{0xED, 0x9F, 0xBF}, true},
                               {{0xED, 0xA0, 0x80}, false},
                               {{0xF0, 0x90, 0x80, 0x80}, true},
                               {{0xF0, 0x8F, 0x80, 0x80}, false},
                               {{0xF4, 0x8F, 0xBF, 0xBF}, true},
                               {{0xF4, 0x90, 0x80, 0x80}, false},
                               {{0xF5, 0x80, 0x80, 0x80}, false},
                               {{0x80}, false},
                               {{0xF0, 0x9F, 0x99}, false}};
  for (const Row& row : cases)
  {
    const uint64_t size = 2 + 3 + row.bytes.size();
    ByteRows group(GetParam());
    group.h64(16 + size, 0, TAV_TYPE_HEADER64, kGroup).h64(size, 0, TAV_TYPE_UTF8_STRING, kNumber);
    group.number(1208, 2).fill(3, 'a').data(row.bytes);
    std::vector<std::string> expected;
    if (!row.isText)
    {
      expected.emplace_back("0x25 utf8-invalid: the string holds bytes that are no UTF-8");
    }
    EXPECT_EQ(told(group), expected);
  }
}

TEST_P(CheckSentences, AreLeftOutOfWhatNobodyAskedFor)
{
  rows.h64(16 + 4, 0, TAV_TYPE_HEADER64, kGroup).h64(4, 0, TAV_TYPE_ASCII_STRING, kNumber).data({0, 0x80, 'a', 'b'});
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  uint64_t found = 0;
  CheckOptions options;
  options.sink = [&](const Finding&) { ++found; };
  const CheckTotals totals = check(source, {.swapped = GetParam()}, options);
  EXPECT_EQ(found, 0U) << "these are notes";
  EXPECT_EQ(totals.nodes, 2U);
  EXPECT_EQ(check(source, {.swapped = GetParam()}, {}).nodes, 2U) << "nobody listens";
}
