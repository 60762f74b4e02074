// Which nodes of two streams stand for each other, and what is said where they differ.
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;
using test::bytesOfJson;
using testing::ElementsAre;

namespace
{

/// {"system": ...} with these children.
Bytes systemOf(const std::string& children)
{
  return bytesOfJson("{\"system\": {" + children + "}}");
}

/// One line for each difference: "- /system/cpuOnline 7", "+ ...", "! path 7 -> 8".
std::vector<std::string> linesOf(const Bytes& a, const Bytes& b, const DiffOptions& options = {},
                                 const std::optional<Path>& pathA = {}, const std::optional<Path>& pathB = {})
{
  ByteSource first("a", std::span<const uint8_t>(a));
  ByteSource second("b", std::span<const uint8_t>(b));
  std::vector<std::string> lines;
  const bool isDifferent = diff({first, {}, pathA}, {second, {}, pathB}, options, [&](const Difference& one) {
    const auto sideText = [](const DiffSide& side) { return side.path + " " + side.value.value_or(side.type); };
    switch (one.change)
    {
    case Change::removed: lines.push_back("- " + sideText(*one.before)); break;
    case Change::added: lines.push_back("+ " + sideText(*one.after)); break;
    default: lines.push_back("! " + sideText(*one.before) + " -> " + one.after->value.value_or(one.after->type));
    }
  });
  EXPECT_EQ(isDifferent, !lines.empty());
  return lines;
}

std::string processors(const std::vector<int>& numbers)
{
  std::string text;
  for (const int number : numbers)
  {
    text += (text.empty() ? "" : ", ") + std::to_string(number);
  }
  return "\"cpuOnline\": [" + text + "]";
}

} // namespace

TEST(DiffPairs, WhatIsInsertedOrRemovedAmongEqualsIsToldAlone)
{
  const Bytes five = systemOf(processors({1, 2, 3, 4, 5}));
  EXPECT_THAT(linesOf(five, systemOf(processors({1, 2, 9, 3, 4, 5}))), ElementsAre("+ /system/cpuOnline[3] 9"));
  EXPECT_THAT(linesOf(five, systemOf(processors({2, 3, 4, 5}))), ElementsAre("- /system/cpuOnline 1"));
  EXPECT_THAT(linesOf(five, systemOf(processors({1, 2, 3, 4}))), ElementsAre("- /system/cpuOnline[5] 5"));
}

TEST(DiffPairs, BetweenWhatIsEqualTheRestIsComparedInOrder)
{
  EXPECT_THAT(linesOf(systemOf(processors({7, 1, 8, 2, 9})), systemOf(processors({5, 1, 6, 6, 2, 4}))),
              ElementsAre("! /system/cpuOnline 7 -> 5", "! /system/cpuOnline[3] 8 -> 6",
                          "! /system/cpuOnline[5] 9 -> 4",
                          "+ /system/cpuOnline[4] 6"));
}

TEST(DiffPairs, TheLongestCommonPartIsFoundBetweenDifferentEnds)
{
  EXPECT_THAT(linesOf(systemOf(processors({10, 1, 2, 3, 20})), systemOf(processors({30, 40, 1, 2, 3, 50}))),
              ElementsAre("! /system/cpuOnline 10 -> 30", "! /system/cpuOnline[5] 20 -> 50",
                          "+ /system/cpuOnline[2] 40"));
}

TEST(DiffPairs, GroupsAreMatchedByTheirKeysWhateverTheirOrder)
{
  const auto host = [](const std::string& name, int number) {
    return R"({"hostName": ")" + name + R"(", "cpuOnline": )" + std::to_string(number) + "}";
  };
  const auto hosts = [](const std::string& list) { return systemOf("\"host\": [" + list + "]"); };
  const Bytes a = hosts(host("ada", 1) + ", " + host("bob", 2) + ", " + host("cyd", 3));
  const Bytes b = hosts(host("cyd", 3) + ", " + host("ada", 1) + ", " + host("bob", 4));
  EXPECT_THAT(linesOf(a, b), ElementsAre("! /system/host[2]/cpuOnline 2 -> 4"));
  EXPECT_THAT(linesOf(a, hosts(host("cyd", 3) + ", " + host("ada", 1))), ElementsAre("- /system/host[2] group"));
  // By other keys, the same groups stand for others.
  DiffOptions options;
  options.keys = {TAV_ELM_CMN_CPU_ONLINE};
  EXPECT_THAT(linesOf(a, hosts(host("ada", 3) + ", " + host("bob", 2) + ", " + host("cyd", 1)), options),
              testing::UnorderedElementsAre("! /system/host/hostName \"ada\" -> \"cyd\"",
                                            "! /system/host[3]/hostName \"cyd\" -> \"ada\""));
}

TEST(DiffPairs, OfAGroupThatOnlyOneSideHasAllNodesAreToldOnRequest)
{
  const Bytes a = systemOf("");
  const Bytes b = systemOf(R"("host": {"hostName": "ada"})");
  EXPECT_THAT(linesOf(a, b), ElementsAre("+ /system/host group"));
  DiffOptions options;
  options.contents = true;
  EXPECT_THAT(linesOf(a, b, options), ElementsAre("+ /system/host group", "+ /system/host/hostName \"ada\""));
  EXPECT_THAT(linesOf(b, a, options), ElementsAre("- /system/host group", "- /system/host/hostName \"ada\""));
}

TEST(DiffPairs, TwoNodesThatPathsLeadToAreComparedWhateverTheirNames)
{
  const Bytes a = systemOf(R"("host": {"cpuOnline": 1}, )" + processors({2}));
  const Bytes b = bytesOfJson(R"({"docRoot": {"cpuOnline": 5}})");
  EXPECT_THAT(linesOf(a, b, {}, Path("/system/host"), Path("/docRoot")),
              testing::Contains(testing::HasSubstr("/cpuOnline 1 -> 5")));
  EXPECT_THAT(linesOf(a, a, {}, Path("/system/host/cpuOnline"), Path("/system/cpuOnline")),
              ElementsAre(testing::HasSubstr("1 -> 2")));
  try
  {
    linesOf(a, b, {}, Path("/system/host"), Path("/docRoot/host"));
    FAIL() << "a path that leads nowhere is an error";
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.trouble(), Trouble::notFound);
    EXPECT_EQ(error.problem().file, "b");
  }
}

TEST(DiffPairs, WhatIsInAGroupWithTheIdOfAnEndElementIsCompared)
{
  EXPECT_THAT(linesOf(test::streamWithGroupNamedAsAnEnd(1), test::streamWithGroupNamedAsAnEnd(7)),
              ElementsAre("! /system/endHdrEyeSize/cpuOnline 1 -> 7"));
}

TEST(DiffPairs, DamagedBytesAreComparedAsBytes)
{
  const auto withBytes = [](uint8_t value, uint64_t count) {
    ByteRows rows;
    rows.h64(20 + count, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4).fill(count, value);
    return rows.bytes;
  };
  EXPECT_TRUE(linesOf(withBytes(0x5A, 40), withBytes(0x5A, 40)).empty());
  const std::vector<std::string> lines = linesOf(withBytes(0x5A, 40), withBytes(0x5B, 40));
  ASSERT_EQ(lines.size(), 1U);
  EXPECT_THAT(lines[0], testing::StartsWith("! /system 5a5a5a"));
  EXPECT_THAT(lines[0], testing::HasSubstr(" ... -> 5b5b"));
}

TEST(DiffPairs, OtherTypesAndInfoOfANodeAreDifferences)
{
  const auto sentences = [](const std::string& before, const std::string& after) {
    const Bytes a = bytesOfJson(R"([{"element": "system", "children": [{"id": 1, )" + before + "}]}]");
    const Bytes b = bytesOfJson(R"([{"element": "system", "children": [{"id": 1, )" + after + "}]}]");
    ByteSource first("a", std::span<const uint8_t>(a));
    ByteSource second("b", std::span<const uint8_t>(b));
    std::vector<std::string> list;
    diff({first, {}, {}}, {second, {}, {}}, {}, [&](const Difference& one) { list.push_back(one.sentence); });
    return list;
  };
  EXPECT_THAT(sentences(R"("type": "Uint32", "value": 7)", R"("type": "Sint32", "value": 7)"),
              ElementsAre("Uint32  7 -> Sint32  7"));
  EXPECT_THAT(sentences(R"("type": "Uint32", "info": 256, "value": 7)", R"("type": "Uint32", "info": 0, "value": 8)"),
              ElementsAre("info  0x100 -> 0x0", "Uint32  7 -> 8"));
  EXPECT_THAT(sentences(R"("type": "Uint32", "info": 256, "value": 7)", R"("type": "Uint32", "info": 256, "value": 7)"),
              ElementsAre());
}

TEST(DiffPairs, ALongTextIsShownWithItsFirstBytes)
{
  const Bytes a = systemOf(R"("hostName": ")" + std::string(100, 'a') + '"');
  const Bytes b = systemOf(R"("hostName": ")" + std::string(100, 'b') + '"');
  DiffOptions options;
  options.mostValue = 18;
  EXPECT_THAT(linesOf(a, b, options),
              ElementsAre(R"(! /system/hostName "aaaaaaaaaaaaaaaaaa" ... -> "bbbbbbbbbbbbbbbbbb" ...)"));
}
