/// The library's own look-up of names, held against the dictionary for programs.
#include "layer/elementNames.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <map>
#include <optional>
#include <string_view>
#include <vector>

#include "tav/dictionary.hpp"
#include "tav/path/names.hpp"

namespace
{

using tav::dictionary::Entry;

TEST(ElementNames, AreThoseOfTheDictionaryAtEveryId)
{
  for (uint32_t id = 0; id <= 65535; ++id)
  {
    const auto elm = static_cast<uint16_t>(id);
    ASSERT_EQ(tav::detail::elementTag(elm), tav::dictionary::tagOf(elm)) << id;
    ASSERT_EQ(tav::detail::elementName(elm), tav::dictionary::nameOf(elm)) << id;
  }
}

TEST(ElementNames, EveryNameOfAnEntryLeadsToItsId)
{
  for (const Entry& entry : tav::dictionary::entries())
  {
    if (!tav::detail::paths::isElementName(entry.name))
    {
      continue;
    }
    for (const std::string_view name : tav::detail::paths::namesOf(entry.tag, entry.name))
    {
      const std::vector<uint16_t> ids = tav::detail::idsNamed(name);
      ASSERT_TRUE(std::binary_search(ids.begin(), ids.end(), entry.id)) << name;
    }
  }
}

/// All names, each with the ids that bear it, found by a look at every entry.
std::map<std::string_view, std::vector<uint16_t>> idsByName()
{
  std::map<std::string_view, std::vector<uint16_t>> ids;
  for (const Entry& entry : tav::dictionary::entries())
  {
    if (tav::detail::paths::isElementName(entry.name))
    {
      for (const std::string_view name : tav::detail::paths::namesOf(entry.tag, entry.name))
      {
        ids[name].push_back(entry.id);
      }
    }
  }
  for (auto& [name, found] : ids)
  {
    tav::detail::paths::putInOrder(found);
  }
  return ids;
}

TEST(ElementNames, NameLeadsToAllThatBearItAndToNothingElse)
{
  for (const auto& named : idsByName())
  {
    const std::string_view name = named.first;
    const std::vector<uint16_t>& ids = named.second;
    ASSERT_EQ(tav::detail::idsNamed(name), ids) << name;
    const std::optional<uint16_t> only = tav::detail::onlyTagged(name);
    const auto bears = [name](const Entry& entry) {
      return entry.tag == name || tav::detail::paths::withoutBlanks(entry.tag) == name;
    };
    const auto& all = tav::dictionary::entries();
    const bool isTag = ids.size() == 1 && std::any_of(all.begin(), all.end(), bears);
    ASSERT_EQ(only, isTag ? std::optional(ids.front()) : std::nullopt) << name;
  }
  for (const std::string_view name : {"", " ", "hostNam", "hostname", "host Name", "SQLM_ELM_", "SQLM_", "TAV_"})
  {
    ASSERT_EQ(tav::detail::idsNamed(name), std::vector<uint16_t>()) << name;
    ASSERT_EQ(tav::detail::onlyTagged(name), std::nullopt) << name;
  }
}

TEST(ElementNames, NoPlaceholderHasAName)
{
  EXPECT_EQ(tav::detail::idsNamed("INVALID_ELEMENT"), std::vector<uint16_t>());
  EXPECT_EQ(tav::detail::idsNamed("invalid_element"), std::vector<uint16_t>());
  EXPECT_EQ(tav::detail::nearestTag("invalid_elemen"), std::string_view());
}

} // namespace
