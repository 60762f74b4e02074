// The borders of a comparison: how near numbers are, many children, deep groups, and what is left out.
#include <cmath>
#include <limits>
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
using testing::IsEmpty;

namespace
{

using Changes = std::vector<Difference>;

Changes changes(const Bytes& a, const Form& formA, const Bytes& b, const Form& formB, const DiffOptions& options = {},
                const std::optional<Path>& path = {})
{
  ByteSource first("a", std::span<const uint8_t>(a));
  ByteSource second("b", std::span<const uint8_t>(b));
  Changes list;
  const bool isDifferent = diff({first, formA, path}, {second, formB, path}, options,
                                [&](const Difference& one) { list.push_back(one); });
  EXPECT_EQ(isDifferent, !list.empty());
  return list;
}

std::vector<std::string> sentences(const Changes& list)
{
  std::vector<std::string> all;
  for (const Difference& one : list)
  {
    all.push_back(one.sentence);
  }
  return all;
}

Bytes valueOf(const std::string& type, const std::string& value)
{
  return bytesOfJson(R"([{"element": "system", "children": [{"id": 1, "type": ")" + type + R"(", "value": )" + value +
                     "}]}]");
}

bool isNear(const std::string& type, const std::string& a, const std::string& b, const Tolerance& tolerance)
{
  DiffOptions options;
  options.tolerance = tolerance;
  return changes(valueOf(type, a), {}, valueOf(type, b), {}, options).empty();
}

std::string repeated(const char* text, size_t count)
{
  std::string all;
  for (size_t i = 0; i < count; ++i)
  {
    all += text;
  }
  return all;
}

} // namespace

TEST(DiffEdges, NumbersOfEveryTypeAreNearUpToTheirTolerance)
{
  for (const char* const type : {"Uint8", "Sint8", "Uint16", "Sint16", "Uint32", "Sint32", "Uint64", "Sint64"})
  {
    EXPECT_TRUE(isNear(type, "100", "103", {.amount = 3})) << type;
    EXPECT_FALSE(isNear(type, "100", "103", {.amount = 2.5})) << type;
    EXPECT_TRUE(isNear(type, "97", "100", {.amount = 3, .percent = true})) << type;
    EXPECT_FALSE(isNear(type, "96", "100", {.amount = 3, .percent = true})) << type;
    EXPECT_FALSE(isNear(type, "100", "101", {})) << type;
  }
}

TEST(DiffEdges, NumbersOfDifferentSignsAreAsFarApartAsTheirSum)
{
  for (const char* const type : {"Sint8", "Sint16", "Sint32", "Sint64"})
  {
    EXPECT_TRUE(isNear(type, "-2", "3", {.amount = 5})) << type;
    EXPECT_FALSE(isNear(type, "-2", "3", {.amount = 4})) << type;
    EXPECT_TRUE(isNear(type, "-2", "-3", {.amount = 1})) << type;
    EXPECT_TRUE(isNear(type, "0", "-1", {.amount = 1})) << type;
  }
  EXPECT_TRUE(isNear("Sint64", "-9223372036854775808", "9223372036854775807", {.amount = std::ldexp(1.0, 64)}));
  EXPECT_FALSE(isNear("Sint64", "-9223372036854775808", "9223372036854775807", {.amount = std::ldexp(1.0, 63)}));
}

TEST(DiffEdges, WhatIsNoNumberIsNeverNear)
{
  const double all = std::numeric_limits<double>::infinity();
  EXPECT_FALSE(isNear("ASCII String", "\"7\"", "\"8\"", {.amount = all}));
  EXPECT_FALSE(isNear("Uint128", "7", "8", {.amount = all}));
  EXPECT_FALSE(isNear("Byte", "7", "8", {.amount = all}));
  DiffOptions options;
  options.tolerance.amount = all;
  const Bytes a = bytesOfJson(R"([{"element": "system", "children": [{"id": 1, "type": "Uint32", "bytes": "0102"}]}])");
  const Bytes b = bytesOfJson(R"([{"element": "system", "children": [{"id": 1, "type": "Uint32", "bytes": "0103"}]}])");
  EXPECT_THAT(sentences(changes(a, {}, b, {}, options)), ElementsAre("Uint32  0102 -> 0103")) << "of a wrong size";
}

TEST(DiffEdges, TheSameValuesInTheOtherFormAreNoDifference)
{
  const std::string values = R"({"id": 1, "type": "Uint16", "value": 513}, {"id": 2, "type": "Sint64", "value": -7},
      {"id": 3, "type": "Uint128", "value": 18446744073709551617},
      {"id": 4, "type": "UTC Timestamp", "value": "2024-02-29T10:30:00.123456+01:00"},
      {"id": 5, "type": "UTF8 String", "value": "gr\u00fc\u00df"},
      {"id": 6, "type": "Uint64 array", "value": [1, 2, 3]},
      {"id": 7, "type": "Binary", "bytes": "010203"}, {"id": 8, "type": "Byte", "value": 7},
      {"id": 9, "type": "ASCII String", "value": ""}, {"id": 10, "type": 999, "bytes": "0102"})";
  const auto inForm = [&](bool swap, bool wide, bool aligned) {
    const bool big = swap != test::kBigEndianHost;
    return bytesOfJson(R"({"form": {"byteOrder": ")" + std::string(big ? "big" : "little") + R"(", "root": )" +
                       (wide ? "64" : "32") + R"(, "aligned": )" + (aligned ? "true" : "false") +
                       R"(}, "nodes": [{"element": "system", "children": [)" + values + "]}]}");
  };
  const Bytes plain = inForm(false, true, false);
  for (const bool swap : {false, true})
  {
    for (const bool wide : {false, true})
    {
      for (const bool aligned : {false, true})
      {
        const Form form{.swapped = swap, .root64 = wide, .aligned = aligned};
        EXPECT_THAT(sentences(changes(plain, {}, inForm(swap, wide, aligned), form)), IsEmpty())
            << swap << wide << aligned;
      }
    }
  }
}

TEST(DiffEdges, TooManyChildrenForATableArePairedInTheirOrder)
{
  // 2,100 x 2,100 cells are more than are looked through for the longest common part.
  const auto numbers = [](int first, int count) {
    std::string list;
    for (int i = 0; i < count; ++i)
    {
      list += (list.empty() ? "" : ",") + std::to_string(first + i);
    }
    return bytesOfJson(R"({"system": {"cpuOnline": [)" + list + "]}}");
  };
  EXPECT_EQ(changes(numbers(0, 2100), {}, numbers(1, 2100), {}).size(), 2100U) << "each with the one at its place";
  EXPECT_EQ(changes(numbers(0, 1000), {}, numbers(1, 1000), {}).size(), 2U) << "the first is gone, the last is new";
  EXPECT_EQ(changes(numbers(0, 2100), {}, numbers(0, 2101), {}).size(), 1U) << "what is equal needs no table";
}

TEST(DiffEdges, DeepNodesAreNamedByTheirOffsets)
{
  const auto nest = [](size_t depth, const char* value) {
    return bytesOfJson(repeated(R"({"system":)", depth) + R"({"cpuOnline": )" + value + "}" + repeated("}", depth));
  };
  Changes list = changes(nest(63, "7"), {}, nest(63, "8"), {});
  ASSERT_EQ(list.size(), 1U);
  EXPECT_EQ(list[0].before->path, repeated("/system", 63) + "/cpuOnline");
  list = changes(nest(64, "7"), {}, nest(64, "8"), {});
  ASSERT_EQ(list.size(), 1U);
  EXPECT_EQ(list[0].before->path, "/**/cpuOnline[@0x400]");
  EXPECT_EQ(list[0].before->offset, 0x400U);
}

TEST(DiffEdges, DeepNodesBelowAPathAreNamedByTheirOffsetsToo)
{
  const auto nest = [](size_t depth, const char* value) {
    return bytesOfJson(repeated(R"({"system":)", depth) + R"({"host": {"cpuOnline": )" + value + "}}" +
                       repeated("}", depth));
  };
  Changes list = changes(nest(3, "7"), {}, nest(3, "8"), {}, {}, Path("**/host"));
  ASSERT_EQ(list.size(), 1U);
  EXPECT_EQ(list[0].before->path, "/system/system/system/host/cpuOnline");
  list = changes(nest(80, "7"), {}, nest(80, "8"), {}, {}, Path("**/host"));
  ASSERT_EQ(list.size(), 1U);
  EXPECT_EQ(list[0].before->path, "/**/cpuOnline[@0x510]");
}

TEST(DiffEdges, DamagedBytesInDeepGroupsNameTheGroupByItsOffset)
{
  const auto nest = [](uint64_t depth, uint8_t bytes) {
    ByteRows rows;
    for (uint64_t i = 0; i < depth; ++i)
    {
      rows.h64((depth - i - 1) * 16 + 40, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    }
    return rows.fill(40, bytes).bytes;
  };
  Changes list = changes(nest(2, 0x5A), {}, nest(2, 0x5B), {});
  ASSERT_EQ(list.size(), 1U);
  EXPECT_EQ(list[0].before->path, "/system/system");
  EXPECT_EQ(list[0].before->type, "damaged");
  list = changes(nest(70, 0x5A), {}, nest(70, 0x5B), {});
  ASSERT_EQ(list.size(), 1U);
  EXPECT_EQ(list[0].before->path, "/**/system[@0x450]");
}

TEST(DiffEdges, DamagedBytesOutsideOfAllGroupsAreAtTheTop)
{
  const auto noise = [](uint8_t bytes) { return ByteRows().fill(20, bytes).bytes; };
  const Changes list = changes(noise(0x5A), {}, noise(0x5B), {});
  ASSERT_EQ(list.size(), 1U);
  EXPECT_EQ(list[0].before->path, "/");
  EXPECT_EQ(*list[0].before->value, repeated("5a", 20));
  EXPECT_EQ(*list[0].after->value, repeated("5b", 20));
}

TEST(DiffEdges, IgnoredGroupsAreLeftOutWithAllBelowThem)
{
  const Bytes a = bytesOfJson(R"({"system": {"host": {"hostName": "ada", "cpuOnline": 1}, "cpuOnline": 1}})");
  const Bytes b = bytesOfJson(R"({"system": {"host": {"hostName": "bob"}, "cpuOnline": 2}})");
  DiffOptions options;
  EXPECT_EQ(changes(a, {}, b, {}, options).size(), 3U);
  options.ignored = {Path("/system/host")};
  EXPECT_THAT(sentences(changes(a, {}, b, {}, options)), ElementsAre("Uint32  1 -> 2"));
  options.ignored.emplace_back("/system/cpuOnline");
  EXPECT_THAT(changes(a, {}, b, {}, options), IsEmpty());
  options.ignored = {Path("/system")};
  EXPECT_THAT(changes(a, {}, b, {}, options), IsEmpty());
}

TEST(DiffEdges, NoValuesAreShownWhereNoneAreWanted)
{
  DiffOptions options;
  options.mostValue = 0;
  const Changes list = changes(valueOf("Uint32", "7"), {}, valueOf("Uint32", "8"), {}, options);
  ASSERT_EQ(list.size(), 1U);
  EXPECT_FALSE(list[0].before->value);
  EXPECT_FALSE(list[0].after->value);
  EXPECT_EQ(list[0].sentence, "Uint32  7 -> 8");
}

TEST(DiffEdges, EveryEventOfBothStreamsIsToldTheFirstOneFirst)
{
  const Bytes a = bytesOfJson(R"({"system": {"cpuOnline": [1, 2]}})");
  const Bytes b = bytesOfJson(R"({"system": {"cpuOnline": 1}})");
  DiffOptions options;
  std::string seen;
  options.seen = [&](ByteSource& source, const Walker&, const Event& event) {
    seen += event.what == What::nodeBegin ? source.name() : "";
  };
  EXPECT_THAT(sentences(changes(a, {}, b, {}, options)), ElementsAre("Uint32  2"));
  EXPECT_EQ(seen, "aaabb");
}

TEST(DiffEdges, LongValuesDifferInTheirLastByte)
{
  // More than the 64 KiB that are compared at a time, in either byte order.
  const std::string text(200'000, 'a');
  EXPECT_EQ(changes(valueOf("ASCII String", '"' + text + "a\""), {}, valueOf("ASCII String", '"' + text + "b\""), {})
                .size(),
            1U);
  EXPECT_THAT(changes(valueOf("ASCII String", '"' + text + "a\""), {}, valueOf("ASCII String", '"' + text + "a\""), {}),
              IsEmpty());
}

TEST(DiffEdges, AGroupAndAValueOfOneNameAreTwoNodes)
{
  const Bytes a = bytesOfJson(R"({"system": {"host": {"cpuOnline": 1}}})");
  const Bytes b = bytesOfJson(R"({"system": {"host": 1}})");
  EXPECT_THAT(sentences(changes(a, {}, b, {})), ElementsAre("group of 1 node", "Uint32  1"));
}

TEST(DiffEdges, AStreamIsComparedWithNothing)
{
  const Bytes a = bytesOfJson(R"({"system": {"cpuOnline": [1, 2]}})");
  EXPECT_THAT(sentences(changes(a, {}, {}, {})), ElementsAre("group of 2 nodes"));
  EXPECT_THAT(sentences(changes({}, {}, a, {})), ElementsAre("group of 2 nodes"));
  EXPECT_THAT(changes({}, {}, {}, {}), IsEmpty());
}
