#include "dictionary/dictionary.h"

#include <algorithm>
#include <iterator>
#include <set>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "dictionary/expectedNames.h"
#include "dictionary/listedElements.h"
#include "tav/elements.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;

using ::testing::StrEq;

std::span<const TAVElementEntry> entriesOf(const TAVElementRange& range)
{
  return {range.pEntries, range.count};
}

std::span<const TAVElementRange> directory()
{
  return {elementDirectory(), kElementRangeCount};
}

uint64_t fingerprint(const TAVElementRange& range)
{
  uint64_t hash = 0xcbf29ce484222325;
  for (const TAVElementEntry& entry : entriesOf(range))
  {
    const std::string line = std::to_string(entry.id) + '|' + enumNameOf(entry) + '|' + tagNameOf(entry) + '\n';
    for (const char character : line)
    {
      hash = (hash ^ static_cast<unsigned char>(character)) * 0x100000001b3;
    }
  }
  return hash;
}

bool isPlaceholderId(uint64_t id)
{
  return std::any_of(std::begin(kPlaceholders), std::end(kPlaceholders),
                     [id](IdSpan span) { return id >= span.first && id <= span.last; });
}

bool isException(uint64_t id)
{
  return std::any_of(std::begin(kExceptions), std::end(kExceptions),
                     [id](const ExpectedNames& names) { return names.id == id; });
}

std::string lowerCase(std::string_view text)
{
  std::string lower(text);
  for (char& character : lower)
  {
    if (character >= 'A' && character <= 'Z')
    {
      character = static_cast<char>(character - 'A' + 'a');
    }
  }
  return lower;
}

class DirectoryRange : public ::testing::TestWithParam<size_t>
{
protected:
  const TAVElementRange& range() const { return elementDirectory()[GetParam()]; }
  const ExpectedRange& expected() const { return kExpectedRanges[GetParam()]; }
};

TEST_P(DirectoryRange, IsDense)
{
  EXPECT_NE(range().dense, 0);
}

TEST_P(DirectoryRange, BeginsAtItsFirstIdWithItsCount)
{
  EXPECT_EQ(range().firstId, expected().firstId);
  EXPECT_EQ(range().count, expected().count);
}

TEST_P(DirectoryRange, HoldsConsecutiveIdsToItsLast)
{
  for (size_t k = 0; k < range().count; ++k)
  {
    ASSERT_EQ(range().pEntries[k].id, expected().firstId + k);
  }
  EXPECT_EQ(entriesOf(range()).back().id, expected().lastId);
}

TEST_P(DirectoryRange, BeginsAndEndsWithItsNames)
{
  EXPECT_THAT(enumNameOf(entriesOf(range()).front()), StrEq(expected().firstName));
  EXPECT_THAT(enumNameOf(entriesOf(range()).back()), StrEq(expected().lastName));
}

TEST_P(DirectoryRange, HoldsTheNamesThatItAlwaysHeld)
{
  EXPECT_EQ(fingerprint(range()), expected().fingerprint);
}

TEST_P(DirectoryRange, HoldsWhatTheListAnnounces)
{
  const ListedRange& listed = kListedRanges[GetParam()];
  EXPECT_EQ(listed.firstId, range().firstId);
  EXPECT_EQ(listed.count, range().count);
  EXPECT_EQ(listedCounts().at(GetParam()), listed.count);
}

INSTANTIATE_TEST_SUITE_P(All, DirectoryRange, ::testing::Range(size_t{0}, kElementRangeCount));

class CommonElement : public ::testing::TestWithParam<ExpectedNames>
{
};

TEST_P(CommonElement, HasItsTwoNames)
{
  EXPECT_THAT(elementEnumName(GetParam().id), StrEq(GetParam().enumName));
  EXPECT_THAT(elementTagName(GetParam().id), StrEq(GetParam().tagName));
}

std::string testName(const ::testing::TestParamInfo<ExpectedNames>& info)
{
  return std::to_string(info.param.id);
}

INSTANTIATE_TEST_SUITE_P(All, CommonElement, ::testing::ValuesIn(kCommonElements), testName);

class ExceptionToTheNamingRule : public ::testing::TestWithParam<ExpectedNames>
{
};

TEST_P(ExceptionToTheNamingRule, KeepsItsTwoNames)
{
  std::string enumName(elementEnumName(GetParam().id));
  if (GetParam().id == kTrackedNameId)
  {
    enumName = enumName.substr(0, enumName.find(' '));
  }
  EXPECT_EQ(enumName, GetParam().enumName);
  EXPECT_THAT(elementTagName(GetParam().id), StrEq(GetParam().tagName));
}

INSTANTIATE_TEST_SUITE_P(All, ExceptionToTheNamingRule, ::testing::ValuesIn(kExceptions), testName);

TEST(ElementTable, Holds2402EntriesInTenRanges)
{
  uint64_t total = 0;
  for (const TAVElementRange& range : directory())
  {
    total += range.count;
  }
  EXPECT_EQ(total, 2402U);
  EXPECT_EQ(directory().size(), std::size(kExpectedRanges));
}

TEST(ElementTable, HoldsTheListInItsOrder)
{
  const ListedElement* listed = std::begin(kListedElements);
  for (const TAVElementRange& range : directory())
  {
    for (const TAVElementEntry& entry : entriesOf(range))
    {
      ASSERT_NE(listed, std::end(kListedElements));
      EXPECT_EQ(entry.id, listed->id);
      EXPECT_EQ(std::string_view(enumNameOf(entry)), listed->enumName);
      EXPECT_EQ(tagNameOf(entry), listed->tagName);
      ++listed;
    }
  }
  EXPECT_EQ(listed, std::end(kListedElements));
}

TEST(ElementTable, IsClosedByAnAllZeroRecord)
{
  const TAVElementRange& last = elementDirectory()[kElementRangeCount];
  EXPECT_EQ(last.dense, 0);
  EXPECT_EQ(last.firstId, 0);
  EXPECT_EQ(last.count, 0U);
  EXPECT_EQ(last.pEntries, nullptr);
}

TEST(ElementTable, HasPlaceholdersAtTheUnusedIdsOnly)
{
  uint64_t placeholders = 0;
  for (const TAVElementRange& range : directory())
  {
    for (const TAVElementEntry& entry : entriesOf(range))
    {
      const bool placeholder = std::string_view(enumNameOf(entry)) == "INVALID_ELEMENT";
      EXPECT_EQ(placeholder, isPlaceholderId(entry.id)) << entry.id;
      EXPECT_EQ(placeholder, std::string_view(tagNameOf(entry)) == "invalid_element") << entry.id;
      placeholders += placeholder ? 1 : 0;
    }
  }
  EXPECT_EQ(placeholders, 154U);
}

TEST(ElementTable, DerivesEveryOtherMonitorTagFromTheEnumName)
{
  constexpr std::string_view kPrefix = "SQLM_ELM_";
  uint64_t derived = 0;
  for (const TAVElementRange& range : directory().subspan(4))
  {
    for (const TAVElementEntry& entry : entriesOf(range))
    {
      if (isException(entry.id) || isPlaceholderId(entry.id))
      {
        continue;
      }
      const std::string name(enumNameOf(entry));
      ASSERT_TRUE(name.starts_with(kPrefix)) << entry.id;
      EXPECT_EQ(tagNameOf(entry), lowerCase(name.substr(kPrefix.size()))) << entry.id;
      ++derived;
    }
  }
  EXPECT_EQ(derived, 2362 - 154 - std::size(kExceptions));
}

TEST(ElementTable, HasNoExceptionThatFollowsTheNamingRule)
{
  for (const ExpectedNames& names : kExceptions)
  {
    EXPECT_NE("SQLM_ELM_" + lowerCase(names.tagName), "SQLM_ELM_" + lowerCase(names.enumName).substr(9)) << names.id;
  }
}

TEST(ElementTable, HasEveryEnumNameOnceButThePlaceholders)
{
  std::multiset<std::string> names;
  for (const TAVElementRange& range : directory())
  {
    for (const TAVElementEntry& entry : entriesOf(range))
    {
      names.emplace(enumNameOf(entry));
    }
  }
  EXPECT_EQ(names.count("INVALID_ELEMENT"), 154U);
  names.erase("INVALID_ELEMENT");
  for (const std::string& name : names)
  {
    EXPECT_EQ(names.count(name), 1U) << name;
  }
}

TEST(ElementTable, KeepsTheBlankBeforeTheScanSharingNames)
{
  for (uint16_t id = 46035; id <= 46063; ++id)
  {
    const bool expected = id >= 46036 && id <= 46062;
    EXPECT_EQ(std::string_view(elementEnumName(id)).starts_with(' '), expected) << id;
  }
}

TEST(ElementTable, KeepsTheBlanksAndTheCommentBehindOneName)
{
  const std::string_view name = elementEnumName(kTrackedNameId);
  const std::string start = "SQLM_ELM_MAX_PARTITION" + std::string(35, ' ');
  ASSERT_TRUE(name.starts_with(start));
  const std::string_view comment = name.substr(start.size());
  EXPECT_EQ(comment.size(), 15U);
  EXPECT_TRUE(comment.starts_with("/*"));
  EXPECT_TRUE(comment.ends_with("*/"));
  EXPECT_EQ(comment.substr(2).find("*/"), 11U);
}

TEST(ElementTable, KeepsTwoNamesWithAMisspelledPrefix)
{
  EXPECT_THAT(elementEnumName(46145), StrEq("SQLM_EML_FMP_EXEC_HIST_ROUTINE_ID"));
  EXPECT_THAT(elementEnumName(46146), StrEq("SQLM_EML_FMP_EXEC_HIST_TIMESTAMP"));
}

TEST(ElementTable, KeepsTheBlankBehindOneTag)
{
  EXPECT_THAT(elementTagName(991), StrEq("eff_stmt_text "));
}

TEST(ElementTable, KeepsSharedTags)
{
  struct Shared
  {
    uint16_t first, second;
    const char* tag;
  };
  constexpr Shared kShared[] = {{134, 135, "event_startpipeblock"},
                                {46009, 46010, "collect_request_metrics"},
                                {46035, 46270, "apphdl"},
                                {1006, 1023, "member"}};
  for (const Shared& shared : kShared)
  {
    EXPECT_THAT(elementTagName(shared.first), StrEq(shared.tag));
    EXPECT_THAT(elementTagName(shared.second), StrEq(shared.tag));
  }
}

TEST(ElementConstants, HaveTheIdsOfTheirElements)
{
  EXPECT_EQ(TAV_ELM_CMN_END_HDR_MARKER, 65000);
  EXPECT_EQ(TAV_ELM_CMN_END_HDR_EYE_SIZE, 65001);
  EXPECT_EQ(TAV_ELM_CMN_EYE_SIZE, 65002);
  EXPECT_EQ(TAV_ELM_CMN_DOC_ROOT_PROD_ID, 60001);
  EXPECT_EQ(TAV_ELM_CMN_HOST, 60102);
  EXPECT_EQ(SQLM_ELM_QN5, 1);
  EXPECT_EQ(SQLM_MIN_TIME_STAMP, 200);
  EXPECT_EQ(SQLM_ELM_SS, 46036);
  EXPECT_EQ(SQLM_EML_FMP_EXEC_HIST_ROUTINE_ID, 46145);
  EXPECT_EQ(SQLM_ELM_MAX_PARTITION, kTrackedNameId);
  EXPECT_EQ(SQLM_ELM_DBM_CFG_MEM_FCM_PARALLELISM_INT, 46280);
  EXPECT_EQ(SQLM_ELM_CONTROL_MSG_TEXT, 55325);
}

TEST(ElementConstants, AreTheEnumNamesWithoutBlanksAndComment)
{
  for (const ListedElement& element : kListedElements)
  {
    if (element.constant.empty())
    {
      continue;
    }
    const size_t start = element.enumName.find_first_not_of(' ');
    const size_t end = element.enumName.find(' ', start);
    EXPECT_EQ(element.constant, element.enumName.substr(start, end - start));
  }
}

TEST(ElementConstants, Have16Bits)
{
  EXPECT_TRUE((std::is_same_v<decltype(TAV_ELM_CMN_HOST), const uint16_t>));
}

TEST(ElementConstants, NameIdTwentyTwice)
{
  EXPECT_EQ(TAV_ELM_CMN_DOC_ROOT, 20);
  EXPECT_EQ(SQLM_ELM_COLLECTED, 20);
}

} // namespace
