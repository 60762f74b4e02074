// Rows of nodes against a walk that takes every node by itself.
#include <algorithm>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/streams.h"
#include "tav/inspect/nodeColumns.hpp"
#include "tav/inspect/streamWalk.hpp"

using namespace tav::inspect;
using test::Bytes;

namespace
{

/// A row as a line.
std::string line(int64_t parent, uint64_t offset, uint64_t size, uint64_t depth, unsigned elm, unsigned type,
                 const std::string& path)
{
  std::string text;
  for (const uint64_t number : {static_cast<uint64_t>(parent), offset, size, depth, uint64_t{elm}, uint64_t{type}})
  {
    text += std::to_string(number) + ' ';
  }
  return text + path;
}

struct RowsSeen
{
  std::vector<std::string> rows{};
  std::vector<std::string> damage{};
};

RowsSeen byWalker(const Bytes& bytes, const tav::inspect::Form& form)
{
  RowsSeen seen;
  ByteSource source("x", std::span<const uint8_t>(bytes));
  StreamWalk walk(source, form,
                  [&](const PassedOver& passed) { seen.damage.push_back(hexOffset(passed.offset) + passed.sentence); });
  std::map<uint64_t, int64_t> rowOf;
  for (Event event; walk.next(event);)
  {
    if (event.what == What::nodeBegin && !isEndPiece(event))
    {
      const tav::inspect::Node& node = event.node;
      const int64_t parent = node.parentOffset == kNoOffset ? NodeColumns::kNoParent : rowOf.at(node.parentOffset);
      rowOf[node.offset()] = static_cast<int64_t>(seen.rows.size());
      seen.rows.push_back(line(parent, node.offset(), node.size(), event.depth, node.elm(), node.type(),
                               walk.walker().path(event)));
    }
  }
  return seen;
}

std::unique_ptr<ByteSource> sourceOf(const Bytes& bytes, bool inMemory)
{
  if (inMemory)
  {
    return std::make_unique<ByteSource>("x", std::span<const uint8_t>(bytes));
  }
  auto storage = std::make_unique<TAVSSMemory>(const_cast<uint8_t*>(bytes.data()), bytes.size());
  return std::make_unique<ByteSource>("x", std::move(storage)); // read in pages, as a file
}

/// `rows`: so many at a time.
RowsSeen byReader(const Bytes& bytes, const tav::inspect::Form& form, bool paths, size_t rows)
{
  RowsSeen seen;
  const auto source = sourceOf(bytes, rows != 7);
  const auto told = [&](const PassedOver& passed) {
    seen.damage.push_back(hexOffset(passed.offset) + passed.sentence);
  };
  NodeReader reader(*source, form, {.onDamage = OnDamage::skip, .paths = paths, .passedOver = told});
  for (NodeColumns columns; reader.next(columns, rows); columns.clear())
  {
    for (size_t i = 0; i < columns.count(); ++i)
    {
      seen.rows.push_back(line(columns.parent[i], columns.offset[i], columns.size[i], columns.depth[i], columns.id[i],
                               columns.type[i], std::string(paths ? columns.paths[i] : "")));
    }
  }
  return seen;
}

void expectEqual(const Bytes& bytes, const tav::inspect::Form& form)
{
  RowsSeen expected = byWalker(bytes, form);
  for (const size_t rows : {size_t{1}, size_t{7}, NodeReader::kBatch})
  {
    const RowsSeen found = byReader(bytes, form, true, rows);
    ASSERT_EQ(found.rows, expected.rows);
    ASSERT_EQ(found.damage, expected.damage);
  }
  for (std::string& row : expected.rows)
  {
    row.resize(row.rfind(' ') + 1);
  }
  ASSERT_EQ(byReader(bytes, form, false, 3).rows, expected.rows);
}

/// A group of many rows, whose first third is of one size and whose rest is of another.
Bytes unevenStream(size_t first, size_t rest)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (size_t i = 0; i < 90'000; ++i)
    {
      system.add(TAV_ELM_CMN_HOST_NAME, std::string(i < 30'000 ? first : rest, 'a'));
    }
  }
  writer.finish();
  const auto* const begin = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  return {begin, begin + writer.bytes().size()};
}

} // namespace

TEST(NodeRows, AreTheNodesOfAWalkOverRandomTrees)
{
  for (uint64_t seed = 1; seed <= 60; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed, {.depth = 6, .width = 12});
    const Bytes bytes = test::bytesOfTree(tree);
    ByteSource source("x", std::span<const uint8_t>(bytes));
    const tav::inspect::Form form = recognise(source).form;
    expectEqual(bytes, form);
    expectEqual(test::damaged(bytes, seed), form);
    expectEqual(test::damaged(test::damaged(bytes, seed + 100), seed), form);
    // Whose names come again among siblings and below them.
    const Bytes named = test::namedStream(seed);
    expectEqual(named, {});
    expectEqual(test::damaged(named, seed), {});
  }
}

TEST(NodeRows, AreThereForAGroupWithTheIdOfAnEndElement)
{
  const Bytes bytes = test::streamWithGroupNamedAsAnEnd(1);
  const std::vector<std::string> rows = byWalker(bytes, {}).rows;
  ASSERT_EQ(rows.size(), 4U);
  EXPECT_THAT(rows[2], testing::StartsWith("1 ")) << "the group's row";
  EXPECT_THAT(rows[2], testing::EndsWith(" /system/endHdrEyeSize/cpuOnline"));
  expectEqual(bytes, {});
  expectEqual(test::damaged(bytes, 3), {});
}

TEST(NodeRows, AreNamedByTheirOffsetsAmongMoreIdsThanAreCounted)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint16_t i = 0; i < 900; ++i)
    {
      system.add(tav::ElementId{static_cast<uint16_t>(36000 + i % 300)}, i);
    }
    system.group(tav::ElementId{36299}).add(TAV_ELM_CMN_CPU_ONLINE, 1);
  }
  writer.finish();
  const Bytes bytes = test::bytesOf(writer.bytes());
  const RowsSeen rows = byWalker(bytes, {});
  EXPECT_EQ(std::count_if(rows.rows.begin(), rows.rows.end(),
                          [](const std::string& row) { return row.find("[@0x") != std::string::npos; }),
            (300 - 256) * 3 + 2);
  expectEqual(bytes, {});
}

TEST(NodeRows, AreThoseBeforeTheDamageWhenReadingStops)
{
  for (uint64_t seed = 1; seed <= 30; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = test::damaged(test::bytesOfTree(test::randomTree(seed, {.depth = 5, .width = 9})), seed);
    ByteSource source("x", std::span<const uint8_t>(bytes));
    const tav::inspect::Form form = recognise(source).form;
    const RowsSeen expected = byWalker(bytes, form);
    NodeReader reader(source, form);
    NodeColumns columns;
    while (reader.next(columns, 5))
    {
    }
    ASSERT_EQ(reader.stopped().has_value(), !expected.damage.empty());
    ASSERT_LE(columns.count(), expected.rows.size());
    ASSERT_TRUE(reader.stopped() || columns.count() == expected.rows.size());
  }
}

TEST(NodeRows, AreAllThereWhereTheyAreOfOtherSizesThanThoseBefore)
{
  const std::vector<std::pair<size_t, size_t>> sizes = {{1, 60}, {60, 1}};
  for (const auto& [first, rest] : sizes)
  {
    const Bytes bytes = unevenStream(first, rest);
    ByteSource source("x", std::span<const uint8_t>(bytes));
    const RowsSeen expected = byWalker(bytes, tav::inspect::Form{});
    for (const size_t rows : {size_t{1000}, NodeReader::kBatch})
    {
      NodeReader reader(source, tav::inspect::Form{}, {.paths = true});
      NodeColumns columns;
      while (reader.next(columns, rows))
      {
      }
      ASSERT_EQ(columns.count(), expected.rows.size());
      for (size_t i = 0; i < columns.count(); ++i)
      {
        ASSERT_EQ(line(columns.parent[i], columns.offset[i], columns.size[i], columns.depth[i], columns.id[i],
                       columns.type[i], std::string(columns.paths[i])),
                  expected.rows[i]);
      }
      EXPECT_EQ(columns.rest(30'000).size, first);
      EXPECT_EQ(columns.rest(30'001).size, rest);
    }
  }
}

/// Of paths, so much text is handed out at once; what the exact steps have begun then is read by the walker.
TEST(NodeRows, HaveTheirPathsBehindAsMuchTextAsIsHandedOutAtOnce)
{
  constexpr size_t kDeep = 60;
  constexpr size_t kGroups = 40'000; // and over 500 characters each
  tav::Writer writer;
  {
    std::vector<tav::Group> around;
    around.push_back(writer.group(TAV_ELM_CMN_SYSTEM));
    for (size_t i = 1; i < kDeep; ++i)
    {
      around.push_back(around.back().group(TAV_ELM_CMN_SYSTEM));
    }
    for (size_t i = 0; i < kGroups; ++i)
    {
      const tav::Group empty = around.back().group(TAV_ELM_CMN_HOST);
    }
    while (!around.empty()) around.pop_back();
  }
  writer.finish();
  const Bytes bytes = test::bytesOf(writer.bytes());
  const RowsSeen expected = byWalker(bytes, {});
  ASSERT_GT(expected.rows.back().size() * kGroups, size_t{16} << 20U);
  const RowsSeen found = byReader(bytes, {}, true, bytes.size());
  ASSERT_EQ(found.rows.size(), expected.rows.size());
  ASSERT_TRUE(found.rows == expected.rows) << "their lines are too long to be shown";
}

TEST(NodeRows, KeepTheMemoryThatTheyPointToUntilTheyAreCleared)
{
  const auto memory = std::make_shared<int>(7);
  NodeColumns columns;
  columns.keep(memory);
  columns.keep(memory);
  EXPECT_EQ(memory.use_count(), 3);
  columns.cut(0);
  EXPECT_EQ(memory.use_count(), 3);
  columns.clear();
  EXPECT_EQ(memory.use_count(), 1);
}

TEST(NodeRows, AreAsManyAsOneAdds)
{
  constexpr uint64_t kRows = 20'000;
  NodeColumns columns;
  for (uint64_t i = 0; i < kRows; ++i)
  {
    const auto key = static_cast<uint16_t>(i % 5);
    columns.add({.offset = 16 * i, .size = i % 7, .depth = i % 3, .elm = TAV_ELM_CMN_HOST, .key = key},
                static_cast<int64_t>(i) - 1);
  }
  ASSERT_EQ(columns.count(), kRows);
  for (uint64_t i = 0; i < kRows; ++i)
  {
    ASSERT_EQ(columns.offset[i], 16 * i);
    ASSERT_EQ(columns.size[i], i % 7);
    ASSERT_EQ(columns.depth[i], i % 3);
    ASSERT_EQ(columns.id[i], TAV_ELM_CMN_HOST);
    ASSERT_EQ(columns.key[i], i % 5);
    ASSERT_EQ(columns.parent[i], static_cast<int64_t>(i) - 1);
  }
}

TEST(NodeRows, HaveTheirValuesInTheColumnOfTheirKind)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    system.add(TAV_ELM_CMN_CPU_ONLINE, int32_t{-7});
    system.add(TAV_ELM_CMN_HOST_NAME, "ada");
    system.add(TAV_ELM_CMN_CPU_SPEED, tav::Uint128{.high = 1, .low = 2});
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  ByteSource source("x", std::span(first, writer.bytes().size()));
  NodeReader reader(source, tav::inspect::Form{});
  NodeColumns columns;
  ASSERT_TRUE(reader.next(columns));
  ASSERT_EQ(columns.count(), 4U);
  EXPECT_EQ(columns.kind[0], ValueKind::none);
  EXPECT_EQ(columns.kind[1], ValueKind::number);
  EXPECT_EQ(static_cast<int64_t>(columns.number[1]), -7);
  EXPECT_EQ(columns.kind[2], ValueKind::text);
  EXPECT_EQ(std::string(reinterpret_cast<const char*>(columns.rest(2).bytes), columns.rest(2).length()), "ada");
  EXPECT_EQ(columns.kind[3], ValueKind::wide);
  EXPECT_EQ(columns.parent[3], 0);
}

TEST(NodeRows, TellHowFarTheyAreAndEndWithWhatThatThrows)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint64_t i = 0; i < 10'000; ++i)
    {
      tav::Group below = system.group(TAV_ELM_CMN_HOST);
      below.add(TAV_ELM_CMN_CPU_ONLINE, i);
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  ByteSource source("x", std::span(first, writer.bytes().size()));
  std::vector<uint64_t> told;
  NodeColumns columns;
  NodeReader reader(source, tav::inspect::Form{});
  reader.tellProgress([&](uint64_t offset) { told.push_back(offset); });
  while (reader.next(columns))
  {
  }
  EXPECT_EQ(columns.count(), 20'001U);
  EXPECT_GE(told.size(), 4U); // all some thousand rows, though they come together at once
  EXPECT_LE(told.size(), 10U);
  EXPECT_TRUE(std::is_sorted(told.begin(), told.end()));
  EXPECT_LT(told.back(), writer.bytes().size());

  struct Enough
  {
  };
  NodeReader ended(source, tav::inspect::Form{});
  ended.tellProgress([&](uint64_t offset) {
    if (offset > told.back() / 2)
    {
      throw Enough{};
    }
  });
  EXPECT_THROW(ended.next(columns), Enough);
}
