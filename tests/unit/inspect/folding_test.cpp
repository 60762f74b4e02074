#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

/// The nodes that are shown, and "N@depth" for those that are not.
std::vector<std::string> folded(const Bytes& bytes, uint64_t shown)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, {});
  std::vector<std::string> lines;
  Folding folding(
      [&](const Folded& run) { lines.push_back(std::to_string(run.count) + "@" + std::to_string(run.depth)); }, shown);
  for (Event event; walker.next(event);)
  {
    if (folding.shows(event) && event.what == What::nodeBegin && !isEndPiece(event))
    {
      lines.push_back(elementText(event.node.elm()));
    }
  }
  folding.finish();
  return lines;
}

Bytes hosts(size_t count, size_t values)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    for (size_t i = 0; i < count; ++i)
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST, {.eyeSize = true});
      for (size_t j = 0; j < values; ++j)
      {
        host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
      }
    }
    root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
  }
  writer.finish();
  const auto view = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(view.data());
  return {first, first + view.size()};
}

} // namespace

TEST(Folds, TellsOfARunBeforeWhatFollows)
{
  EXPECT_THAT(folded(hosts(5, 2), 1), testing::ElementsAre("system", "host", "cpuOnline", "1@2", "4@1", "cpuOnline"));
  EXPECT_THAT(folded(hosts(2, 1), 2),
              testing::ElementsAre("system", "host", "cpuOnline", "host", "cpuOnline", "cpuOnline"));
}

TEST(Folds, LeavesNothingOutThatItDoesNotTellOf)
{
  for (uint64_t seed = 1; seed < 60; ++seed)
  {
    const Bytes bytes = test::namedStream(seed);
    const auto whole = folded(bytes, ~uint64_t{0});
    ByteSource source("x", std::span<const uint8_t>(bytes));
    Walker walker(source, {});
    size_t nodes = 0;
    for (Event event; walker.next(event);)
    {
      nodes += event.what == What::nodeBegin && !isEndPiece(event) ? 1 : 0;
    }
    EXPECT_EQ(whole.size(), nodes);
    const auto few = folded(bytes, 1);
    EXPECT_LE(few.size(), nodes);
    for (const std::string& line : few)
    {
      EXPECT_TRUE(line.find('@') != std::string::npos || std::find(whole.begin(), whole.end(), line) != whole.end());
    }
  }
}

TEST(Folds, HideNoDamageAndBeginAnewBehindIt)
{
  test::ByteRows rows;
  const auto add = [&](size_t count) {
    for (size_t i = 0; i < count; ++i)
    {
      rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(8, 4);
    }
  };
  rows.h64(4 * 20 + 100 + 3 * 20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  add(4);
  rows.fill(100, 0xFF);
  add(3);
  ByteSource source("x", std::span<const uint8_t>(rows.bytes));
  Walker walker(source, {});
  std::vector<std::string> lines;
  Folding folding([&](const Folded& run) { lines.push_back(std::to_string(run.count) + " hidden"); }, 1);
  for (Event event; walker.next(event);)
  {
    const bool shown = folding.shows(event);
    if (event.what == What::damaged)
    {
      EXPECT_TRUE(shown);
      lines.emplace_back("damaged");
    }
    else if (shown && event.what == What::nodeBegin)
    {
      lines.push_back(elementText(event.node.elm()));
    }
  }
  folding.finish();
  EXPECT_THAT(lines, testing::ElementsAre("system", "cpuOnline", "3 hidden", "damaged", "cpuOnline", "2 hidden"));
}
