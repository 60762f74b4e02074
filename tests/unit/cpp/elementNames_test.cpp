/// The library's own look-up of names, held against the dictionary for programs.
#include "layer/elementNames.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
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
    if (!tav::detail::paths::isElement(entry))
    {
      continue;
    }
    for (const std::string_view name : tav::detail::paths::namesOf(entry))
    {
      const std::vector<uint16_t> ids = tav::detail::idsNamed(name);
      ASSERT_TRUE(std::binary_search(ids.begin(), ids.end(), entry.id)) << name;
    }
  }
}

TEST(ElementNames, NoPlaceholderHasAName)
{
  EXPECT_EQ(tav::detail::idsNamed("INVALID_ELEMENT"), std::vector<uint16_t>());
  EXPECT_EQ(tav::detail::idsNamed("invalid_element"), std::vector<uint16_t>());
  EXPECT_EQ(tav::detail::nearestTag("invalid_elemen"), std::string_view());
}

} // namespace
