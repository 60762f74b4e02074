#include "dictionary/dictionary.h"

#include <iterator>
#include <string>
#include <string_view>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "dictionary/expectedNames.h"
#include "dictionary/namingRule.h"

namespace
{

using namespace tav;
using namespace tav::inside;

using ::testing::StrEq;

TEST(EnumName, IsTheTextItWasMadeOf)
{
  const EnumName name(" a text ");
  EXPECT_EQ(std::string_view(name), " a text ");
  EXPECT_THAT(name.c_str(), StrEq(" a text "));
}

TEST(EnumName, FollowsFromATagByPrefixAndCapitals)
{
  const EnumName name = EnumName::fromTag("az_09 {`");
  EXPECT_EQ(std::string_view(name), "SQLM_ELM_AZ_09 {`");
  EXPECT_THAT(name.c_str(), StrEq("SQLM_ELM_AZ_09 {`"));
}

TEST(EnumName, IsCutWhereItsRoomEnds)
{
  const std::string longest(EnumName::kRoom - 1, 'x');
  EXPECT_EQ(std::string_view(EnumName(longest)), longest);
  EXPECT_EQ(std::string_view(EnumName(longest + 'y')), longest);
  EXPECT_EQ(std::string_view(EnumName::fromTag(longest.c_str())),
            "SQLM_ELM_" + std::string(EnumName::kRoom - 1 - 9, 'X'));
}

TEST(NamingRule, HoldsForThePrefixAndTheTagInCapitals)
{
  EXPECT_TRUE(followsFromTag("SQLM_ELM_AGENT_ID2", "agent_id2"));
}

struct Departure
{
  std::string_view enumName;
  std::string_view tagName;
};

class NamingRuleDeparture : public ::testing::TestWithParam<Departure>
{
};

TEST_P(NamingRuleDeparture, IsSeen)
{
  EXPECT_FALSE(followsFromTag(GetParam().enumName, GetParam().tagName));
}

INSTANTIATE_TEST_SUITE_P(Some, NamingRuleDeparture,
                         ::testing::Values(Departure{"SQLM_EML_AGENT", "agent"}, Departure{"SQLM_ELM_AGENT", "agenT "},
                                           Departure{"SQLM_ELM_AGENT", "agens"}, Departure{" SQLM_ELM_AGENT", "agent"},
                                           Departure{"SQLM_ELM_AGENT ", "agent"}, Departure{"SQLM_ELM_agent", "agent"},
                                           Departure{"", ""}, Departure{"AGENT", "agent"}));

TEST(NamingRule, SparesTheTableAllEnumNamesButTheExceptions)
{
  size_t spared = 0;
  for (size_t i = 0; i < kElementRangeCount; ++i)
  {
    const TAVElementRange& range = elementDirectory()[i];
    for (size_t k = 0; k < range.count; ++k)
    {
      spared += range.pEntries[k].enumNamePlace == range.pEntries[k].tagNamePlace ? 1 : 0;
    }
  }
  EXPECT_EQ(spared, 2362 - 154 - std::size(test::kExceptions)); // of the monitor's elements; 154 are placeholders
}

} // namespace
