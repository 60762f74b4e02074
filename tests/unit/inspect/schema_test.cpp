#include <algorithm>
#include <map>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

std::vector<SchemaEntry> entriesOf(const Schema& schema, PathStyle style = PathStyle::whole)
{
  std::vector<SchemaEntry> entries;
  schema.each(style, [&](const SchemaEntry& entry) { entries.push_back(entry); });
  return entries;
}

void add(Schema& schema, const Bytes& bytes, const tav::inspect::Form& form)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  schema.add(source, form);
}

/// How often each path is there, from a walk of its own.
std::map<std::string, uint64_t> countsOf(const Bytes& bytes, const tav::inspect::Form& form)
{
  std::map<std::string, uint64_t> counts;
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, form);
  std::vector<std::string> way;
  for (Event event; walker.next(event);)
  {
    if (event.what == What::nodeBegin && !tav::layout::isEndElement(event.node.elm()))
    {
      way.resize(static_cast<size_t>(event.depth));
      way.push_back((way.empty() ? "/" : way.back() + "/") + elementText(event.node.elm()));
      ++counts[way.back()];
    }
  }
  return counts;
}

} // namespace

class SchemaOfAForm : public testing::TestWithParam<std::tuple<bool, bool>>
{
};

INSTANTIATE_TEST_SUITE_P(Forms, SchemaOfAForm, testing::Combine(testing::Bool(), testing::Bool()));

TEST_P(SchemaOfAForm, CountsThePathsOfSeveralStreams)
{
  const auto [swap, align] = GetParam();
  const tav::inspect::Form form{.swapped = swap, .root64 = true, .aligned = align};
  std::map<std::string, uint64_t> expected;
  Schema schema;
  for (uint64_t seed = 1; seed < 20; ++seed)
  {
    const Bytes bytes = test::namedStream(seed, swap, align);
    for (const auto& [path, count] : countsOf(bytes, form))
    {
      expected[path] += count;
    }
    add(schema, bytes, form);
  }
  std::map<std::string, uint64_t> found;
  for (const SchemaEntry& entry : entriesOf(schema))
  {
    EXPECT_TRUE(found.emplace(entry.path, entry.count).second) << entry.path;
  }
  EXPECT_EQ(found, expected);
  EXPECT_EQ(schema.paths(), expected.size());
}

TEST(Schema, HasAPathThroughAGroupWithTheIdOfAnEndElement)
{
  Schema schema;
  add(schema, test::streamWithGroupNamedAsAnEnd(1), {});
  std::vector<std::string> paths;
  for (const SchemaEntry& entry : entriesOf(schema))
  {
    paths.push_back(entry.path);
  }
  EXPECT_THAT(paths, testing::ElementsAre("/system", "/system/endHdrEyeSize", "/system/endHdrEyeSize/cpuOnline",
                                          "/system/cpuOnline"));
}

TEST(Schema, ShowsEveryEventToWhoeverWantsToSeeIt)
{
  const Bytes bytes = test::namedStream(7);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, {});
  uint64_t events = 0;
  for (Event event; walker.next(event);)
  {
    ++events;
  }
  uint64_t seen = 0;
  Schema schema;
  schema.add(source, {}, [&](const Walker&, const Event&) { ++seen; });
  EXPECT_EQ(seen, events);
}

TEST(Schema, ShortensPathsOfManySteps)
{
  tav::Writer writer;
  {
    std::vector<tav::Group> groups;
    groups.push_back(writer.group(TAV_ELM_CMN_SYSTEM));
    for (int i = 0; i < 40; ++i)
    {
      groups.push_back(groups.back().group(TAV_ELM_CMN_HOST));
    }
    groups.back().add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{1});
    while (!groups.empty())
    {
      groups.pop_back(); // the innermost is closed first
    }
  }
  writer.finish();
  const auto view = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(view.data());
  Schema schema;
  add(schema, {first, first + view.size()}, {});
  const std::string whole = entriesOf(schema).back().path;
  EXPECT_EQ(std::count(whole.begin(), whole.end(), '/'), 42);
  const std::string brief = entriesOf(schema, PathStyle::brief).back().path;
  EXPECT_THAT(brief, testing::StartsWith("/system/host/"));
  EXPECT_THAT(brief, testing::HasSubstr("/\xE2\x80\xA6/"));
  EXPECT_THAT(brief, testing::EndsWith("/host/cpuOnline"));
  EXPECT_LT(std::count(brief.begin(), brief.end(), '/'), 42);
  std::string last;
  const auto keep = [&](const SchemaEntry& entry) { last = entry.path; };
  schema.each(PathStyle::whole, keep, 10);
  EXPECT_EQ(last, "/**/cpuOnline");
}

TEST(SchemaOfValues, MixesNumbersOfAllWidths)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, uint8_t{200});
    root.add(TAV_ELM_CMN_CPU_ONLINE, int64_t{-3});
    root.add(TAV_ELM_CMN_CPU_ONLINE, int32_t{-4});
    root.add(TAV_ELM_CMN_CPU_ONLINE, ~uint64_t{0});
    root.add(TAV_ELM_CMN_CPU_ONLINE, "many");
  }
  writer.finish();
  const auto view = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(view.data());
  Schema schema;
  add(schema, {first, first + view.size()}, {});
  const SchemaEntry entry = entriesOf(schema).at(1);
  EXPECT_EQ(entry.least, "-4");
  EXPECT_EQ(entry.leastType, TAV_TYPE_SINT32);
  EXPECT_EQ(entry.greatest, "18446744073709551615");
  EXPECT_EQ(entry.greatestType, TAV_TYPE_UINT64);
  EXPECT_EQ(entry.distinct, 1U);
  EXPECT_FALSE(entry.more);
  EXPECT_THAT(entry.types, testing::ElementsAre(TAV_TYPE_ASCII_STRING, TAV_TYPE_UINT8, TAV_TYPE_SINT32, TAV_TYPE_UINT64,
                                                TAV_TYPE_SINT64));
}

TEST(SchemaOfValues, GivesUpCountingTextsAtItsBound)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (const char* const name : {"a", "b", "a", "c", "b"})
    {
      root.add(TAV_ELM_CMN_HOST_NAME, name);
    }
  }
  writer.finish();
  const auto view = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(view.data());
  for (const uint64_t most : std::vector<uint64_t>{2, 3, 4})
  {
    Schema schema({.mostTexts = most});
    add(schema, {first, first + view.size()}, {});
    const SchemaEntry entry = entriesOf(schema).at(1);
    EXPECT_EQ(entry.distinct, std::min<uint64_t>(most, 3));
    EXPECT_EQ(entry.more, most == 2);
  }
}
