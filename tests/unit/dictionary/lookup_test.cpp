#include "dictionary/dictionary.h"

#include <span>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "dictionary/expectedNames.h"
#include "dictionary/listedElements.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;

using ::testing::StrEq;

class IdWithoutEntry : public ::testing::TestWithParam<IdSpan>
{
};

TEST_P(IdWithoutEntry, IsAnUnknownElementInBothLookups)
{
  for (uint32_t id = GetParam().first; id <= GetParam().last; ++id)
  {
    const auto wanted = static_cast<uint16_t>(id);
    ASSERT_THAT(elementEnumName(wanted), StrEq("Unknown Element")) << id;
    ASSERT_THAT(elementTagName(wanted), StrEq("Unknown Element")) << id;
    ASSERT_EQ(findElement(wanted), nullptr) << id;
  }
}

std::string spanName(const ::testing::TestParamInfo<IdSpan>& span)
{
  return std::to_string(span.param.first) + "to" + std::to_string(span.param.last);
}

INSTANTIATE_TEST_SUITE_P(Gaps, IdWithoutEntry, ::testing::ValuesIn(kIdsWithoutEntry), spanName);

TEST(ElementLookup, AnswersEveryIdOutsideTheGaps)
{
  std::vector<bool> gap(65536, false);
  for (const IdSpan span : kIdsWithoutEntry)
  {
    for (size_t id = span.first; id <= span.last; ++id)
    {
      gap[id] = true;
    }
  }
  uint32_t answered = 0;
  for (uint32_t id = 0; id <= 65535; ++id)
  {
    const TAVElementEntry* entry = findElement(static_cast<uint16_t>(id));
    EXPECT_EQ(entry == nullptr, gap[id]) << id;
    answered += entry != nullptr ? 1 : 0;
  }
  EXPECT_EQ(answered, 2401U); // one less than there are entries: two of them have id 20
}

TEST(ElementLookup, AgreesWithTheListForAllIds)
{
  for (uint32_t id = 0; id <= 65535; ++id)
  {
    const auto wanted = static_cast<uint16_t>(id);
    const ListedElement* listed = firstListed(wanted);
    const std::string_view name = elementEnumName(wanted);
    ASSERT_EQ(name, listed != nullptr ? listed->enumName : "Unknown Element") << id;
    ASSERT_EQ(elementTagName(wanted), listed != nullptr ? listed->tagName : "Unknown Element") << id;
  }
}

TEST(ElementLookup, FindsTheEntryOfTheId)
{
  const TAVElementEntry* entry = findElement(60102);
  ASSERT_NE(entry, nullptr);
  EXPECT_EQ(entry->id, 60102U);
  EXPECT_THAT(enumNameOf(*entry), StrEq("TAV_ELM_CMN_HOST"));
  EXPECT_THAT(tagNameOf(*entry), StrEq("host"));
}

TEST(ElementLookup, GivesIdTwentyToTheDocumentRoot)
{
  EXPECT_EQ(findElement(20), elementDirectory()[1].pEntries);
  EXPECT_THAT(elementEnumName(20), StrEq("TAV_ELM_CMN_DOC_ROOT"));
  EXPECT_THAT(elementTagName(20), StrEq("docRoot"));
}

TEST(ElementLookup, KeepsASecondEntryForIdTwentyThatItNeverGives)
{
  const TAVElementEntry& hidden = elementDirectory()[4].pEntries[19];
  EXPECT_EQ(hidden.id, 20U);
  EXPECT_THAT(enumNameOf(hidden), StrEq("SQLM_ELM_COLLECTED"));
  EXPECT_THAT(tagNameOf(hidden), StrEq("collected"));
}

TEST(ElementLookup, ShowsThePlaceholderOfAnUnusedId)
{
  EXPECT_THAT(elementEnumName(250), StrEq("INVALID_ELEMENT"));
  EXPECT_THAT(elementTagName(250), StrEq("invalid_element"));
}

TEST(ElementLookup, HasNoEntryJustBelowTheDocumentElements)
{
  EXPECT_THAT(elementTagName(60000), StrEq("Unknown Element"));
  EXPECT_THAT(elementTagName(60001), StrEq("docRootProdId"));
}

TEST(ElementLookup, EndsTheLargestRangeAtItsLastId)
{
  EXPECT_THAT(elementEnumName(46280), StrEq("SQLM_ELM_DBM_CFG_MEM_FCM_PARALLELISM_INT"));
  EXPECT_THAT(elementTagName(46280), StrEq("dbm_cfg_mem_fcm_parallelism_int"));
  EXPECT_THAT(elementTagName(46281), StrEq("Unknown Element"));
}

/// A range made for the test, with `count` ids that rise in uneven steps, the last of them the highest id.
class MadeRange
{
public:
  MadeRange(size_t count, bool dense)
  {
    for (size_t k = 0; k < count; ++k)
    {
      const auto id = static_cast<uint16_t>(dense ? 500 + k : k + 1 == count ? 65535
                                                                             : 7 + k * k * 3);
      // What is beside the id in its slot does not count.
      entries_.push_back({id, (0xABCDEF ^ k) & 0xFFFFFF, (0xFEDCBA ^ k) & 0xFFFFFF});
    }
    const auto first = static_cast<uint16_t>(count == 0 ? 7 : entries_.front().id);
    range_ = {static_cast<uint8_t>(dense ? 1 : 0), first, count, entries_.data()};
  }

  const TAVElementRange& range() const { return range_; }

  const TAVElementEntry* walkTo(uint16_t id) const
  {
    for (const TAVElementEntry& entry : entries_)
    {
      if (static_cast<uint16_t>(entry.id) == id)
      {
        return &entry;
      }
    }
    return nullptr;
  }

private:
  std::vector<TAVElementEntry> entries_;
  TAVElementRange range_{};
};

class RangeOfLength : public ::testing::TestWithParam<std::tuple<size_t, bool>>
{
};

TEST_P(RangeOfLength, GivesTheSameEntriesAsAWalk)
{
  const MadeRange made(std::get<0>(GetParam()), std::get<1>(GetParam()));
  for (uint32_t id = 0; id <= 65535; ++id)
  {
    const auto wanted = static_cast<uint16_t>(id);
    ASSERT_EQ(findInRange(made.range(), wanted), made.walkTo(wanted)) << id;
  }
}

std::string lengthName(const ::testing::TestParamInfo<std::tuple<size_t, bool>>& length)
{
  return (std::get<1>(length.param) ? "dense" : "sparse") + std::to_string(std::get<0>(length.param));
}

INSTANTIATE_TEST_SUITE_P(DenseAndNot, RangeOfLength,
                         ::testing::Combine(::testing::Values(0, 1, 2, 3, 4, 5, 8, 31, 64, 100), ::testing::Bool()),
                         lengthName);

TEST(SparseRange, FindsAllEntriesOfTheTableBySearchToo)
{
  for (size_t i = 0; i < kElementRangeCount; ++i)
  {
    TAVElementRange sparse = elementDirectory()[i];
    sparse.dense = 0;
    for (uint32_t id = 0; id <= 65535; ++id)
    {
      const auto wanted = static_cast<uint16_t>(id);
      ASSERT_EQ(findInRange(sparse, wanted), findInRange(elementDirectory()[i], wanted)) << id;
    }
  }
}

TEST(PlacesOfATag, AreThoseOfTheTagWithoutTheBlanksAroundIt)
{
  const auto places = [](std::string_view tag) {
    const std::span<const uint16_t> found = placesTagged(tag);
    return std::vector<uint16_t>(found.begin(), found.end());
  };
  for (const char* const tag : {"host", "eff_stmt_text", "no such tag"})
  {
    const std::string text(tag);
    EXPECT_EQ(places("  " + text + " "), places(text)) << tag;
  }
  EXPECT_EQ(places("   "), places(""));
  EXPECT_FALSE(places("eff_stmt_text").empty());
}

} // namespace
