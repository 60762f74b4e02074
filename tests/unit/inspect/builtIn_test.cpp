// The built-in dictionary as the inspection library walks over it, beside the list that programs have.
#include <cstddef>

#include <gtest/gtest.h>

#include "inspect/dictionary/builtIn.h"

using namespace tav;

TEST(BuiltIn, AreTheEntriesThatProgramsHave)
{
  size_t place = 0;
  inspect::forEachBuiltIn([&place](const inspect::BuiltIn& entry) {
    ASSERT_LT(place, dictionary::entries().size());
    const dictionary::Entry& expected = dictionary::entries()[place++];
    EXPECT_EQ(entry.id, expected.id);
    EXPECT_EQ(entry.name, expected.name);
    EXPECT_EQ(entry.tag, expected.tag);
    EXPECT_EQ(detail::paths::constantOf(entry.name), expected.constant);
    EXPECT_EQ(entry.isElement(), detail::paths::isElementName(expected.name));
  });
  EXPECT_EQ(place, dictionary::entries().size());
}

TEST(BuiltIn, AnIdAnswersAsTheListDoes)
{
  for (uint32_t id = 0; id <= 0xFFFF; ++id)
  {
    const auto elm = static_cast<uint16_t>(id);
    EXPECT_EQ(inspect::builtInTag(elm), dictionary::tagOf(elm));
    EXPECT_EQ(inspect::builtInName(elm), dictionary::nameOf(elm));
    const bool listed = !dictionary::nameOf(elm).empty() && dictionary::nameOf(elm) != "INVALID_ELEMENT";
    EXPECT_EQ(inspect::isBuiltIn(elm), listed);
  }
}
