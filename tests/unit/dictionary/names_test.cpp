#include "tav/dictionary.hpp"

#include <algorithm>
#include <optional>
#include <set>
#include <string>
#include <string_view>

#include <gtest/gtest.h>

#include "dictionary/dictionary.h"
#include "tav/elements.h"

namespace
{

using namespace tav;
using namespace tav::inside;

using dictionary::Entry;

/// The lowest id with a name among all entries, found without the sorted names.
std::optional<uint16_t> lowestIdOf(std::string_view name)
{
  std::optional<uint16_t> lowest;
  for (const Entry& entry : dictionary::entries())
  {
    const bool hit = entry.constant == name || entry.name == name || entry.tag == name;
    if (hit && (!lowest || entry.id < *lowest))
    {
      lowest = entry.id;
    }
  }
  return lowest;
}

TEST(ElementNames, AreThoseOfTheLibraryForAllIds)
{
  for (uint32_t id = 0; id <= 65535; ++id)
  {
    const auto wanted = static_cast<uint16_t>(id);
    const TAVElementEntry* entry = findElement(wanted);
    ASSERT_EQ(dictionary::nameOf(wanted), entry != nullptr ? std::string(enumNameOf(*entry)) : "") << id;
    ASSERT_EQ(dictionary::tagOf(wanted), entry != nullptr ? tagNameOf(*entry) : "") << id;
  }
}

TEST(ElementNames, ListTheEntriesOfTheLibraryInItsOrder)
{
  auto next = dictionary::entries().begin();
  for (size_t i = 0; i < kElementRangeCount; ++i)
  {
    const TAVElementRange& range = elementDirectory()[i];
    for (size_t k = 0; k < range.count; ++k, ++next)
    {
      ASSERT_NE(next, dictionary::entries().end());
      EXPECT_EQ(next->id, range.pEntries[k].id);
      EXPECT_EQ(next->name, std::string_view(enumNameOf(range.pEntries[k])));
      EXPECT_EQ(next->tag, tagNameOf(range.pEntries[k]));
    }
  }
  EXPECT_EQ(next, dictionary::entries().end());
}

TEST(ElementNames, EndWithANul)
{
  for (const Entry& entry : dictionary::entries())
  {
    EXPECT_EQ(std::string_view(entry.name.data()), entry.name);
    EXPECT_EQ(std::string_view(entry.tag.data()), entry.tag);
    EXPECT_EQ(std::string_view(entry.constant.data()), entry.constant);
  }
}

TEST(ElementNames, AreKnownToTheCompiler)
{
  static_assert(dictionary::tagOf(TAV_ELM_CMN_HOST) == "host");
  static_assert(dictionary::nameOf(60000).empty());
  EXPECT_EQ(dictionary::entries().size(), 2402U);
}

TEST(IdOfName, IsTheLowestIdForEveryNameOfEveryEntry)
{
  for (const Entry& entry : dictionary::entries())
  {
    ASSERT_EQ(dictionary::idOf(entry.name), lowestIdOf(entry.name)) << entry.name;
    ASSERT_EQ(dictionary::idOf(entry.tag), lowestIdOf(entry.tag)) << entry.tag;
    ASSERT_EQ(dictionary::idOf(entry.constant), lowestIdOf(entry.constant)) << entry.constant;
  }
}

TEST(IdOfName, TakesAnEnumName)
{
  EXPECT_EQ(dictionary::idOf("TAV_ELM_CMN_HOST"), 60102);
}

TEST(IdOfName, TakesATag)
{
  EXPECT_EQ(dictionary::idOf("host"), 60102);
}

TEST(IdOfName, TakesAConstantWhoseEnumNameHasBlanks)
{
  EXPECT_EQ(dictionary::idOf("SQLM_ELM_SS"), 46036);
  EXPECT_EQ(dictionary::idOf(" SQLM_ELM_SS"), 46036);
  EXPECT_EQ(dictionary::idOf("SQLM_ELM_MAX_PARTITION"), 46190);
}

TEST(IdOfName, IsTheLowestOfASharedTag)
{
  EXPECT_EQ(dictionary::idOf("member"), 1006);
  EXPECT_EQ(dictionary::idOf("event_startpipeblock"), 133);
  EXPECT_EQ(dictionary::idOf("apphdl"), 45002);
}

TEST(IdOfName, IsTwentyForBothElementsWithThatId)
{
  EXPECT_EQ(dictionary::idOf("docRoot"), 20);
  EXPECT_EQ(dictionary::idOf("SQLM_ELM_COLLECTED"), 20);
}

class NameOfNoElement : public ::testing::TestWithParam<std::string_view>
{
};

TEST_P(NameOfNoElement, HasNoId)
{
  EXPECT_EQ(dictionary::idOf(GetParam()), std::nullopt);
}

INSTANTIATE_TEST_SUITE_P(Some, NameOfNoElement,
                         ::testing::Values("", " ", "Unknown Element", "HOST", "hos", "hosts", "host ", "zzz",
                                           std::string_view("host\0", 5)));

} // namespace
