// Parts of a file, one after another, are the file: what is found in them is what one walk finds.
#include <algorithm>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/writtenDown.h"
#include "tav/inspect/streamWalk.hpp"

using namespace tav::inspect;
using test::Bytes;

namespace
{

/// What one walk over the whole file gives out.
std::vector<std::string> inOneWalk(ByteSource& source, const tav::inspect::Form& form, Streams streams)
{
  std::vector<std::string> events;
  Event event;
  if (streams == Streams::oneForm)
  {
    Walker walker(source, form);
    while (walker.next(event))
    {
      events.push_back(test::writtenDown(event));
    }
    return events;
  }
  StreamWalk walk(source, form, [](const PassedOver&) {});
  while (walk.next(event))
  {
    events.push_back(test::writtenDown(event));
  }
  return events;
}

/// What walks through the parts give out, as engines elsewhere put it together. `again`: parts that were mended.
std::vector<std::string> inParts(ByteSource& source, std::vector<Part> parts, Streams streams, size_t* again = nullptr)
{
  std::vector<std::vector<std::string>> events(parts.size());
  std::vector<PartEnd> ends(parts.size());
  const auto walk = [&](size_t i) {
    events[i].clear();
    const Part sent = partOf(numbersOf(parts[i]));
    const auto seen = [&](const Walker&, const Event& event) { events[i].push_back(test::writtenDown(event)); };
    ends[i] = walkPart(source, sent, seen, streams);
  };
  for (size_t i = parts.size(); i-- > 0;)
  {
    walk(i);
  }
  size_t mended = 0;
  while (const auto i = mendParts(parts, ends))
  {
    walk(*i);
    ++mended;
  }
  if (again != nullptr)
  {
    *again = mended;
  }
  std::vector<std::string> all;
  for (const auto& part : events)
  {
    all.insert(all.end(), part.begin(), part.end());
  }
  return all;
}

void expectEqual(const Bytes& bytes, uint64_t target)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const auto parts = plan(source, {.targetBytes = target});
  EXPECT_EQ(inParts(source, parts, Streams::everyForm), inOneWalk(source, parts.front().form, Streams::everyForm));
  for (const bool swapped : {false, true})
  {
    const tav::inspect::Form form{.swapped = swapped};
    EXPECT_EQ(inParts(source, plan(source, form, {.targetBytes = target}), Streams::oneForm),
              inOneWalk(source, form, Streams::oneForm));
  }
}

/// Lots of small children of one root, as producers make them.
Bytes flatStream(unsigned count, bool pairs, bool swap = false, bool align = false)
{
  tav::Writer writer({.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native, .align8 = align});
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = pairs});
    for (unsigned i = 0; i < count; ++i)
    {
      i % 3 == 0 ? root.add(TAV_ELM_CMN_HOST_NAME, std::string(1 + i % 23, 'a'), {.eyeSize = pairs})
                 : root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{i}, {.eyeSize = pairs});
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  return {first, first + writer.bytes().size()};
}

} // namespace

TEST(Plan, CutsALongGroupOfSmallChildrenWithoutGoingThroughIt)
{
  for (const bool pairs : {false, true})
  {
    SCOPED_TRACE(pairs);
    const Bytes bytes = flatStream(200'000, pairs);
    auto storage = std::make_unique<TAVSSMemory>(const_cast<uint8_t*>(bytes.data()), bytes.size());
    ByteSource source("x", std::move(storage)); // not known to be memory: what is read is counted
    const auto parts = plan(source, tav::inspect::Form{}, {.targetBytes = bytes.size() / 8});
    EXPECT_EQ(parts.size(), 8U);
    uint64_t at = 0;
    for (const Part& part : parts)
    {
      EXPECT_EQ(part.offset, at);
      at = part.end();
      EXPECT_NEAR(static_cast<double>(part.size), static_cast<double>(bytes.size()) / 8, 4096);
    }
    EXPECT_EQ(at, bytes.size());
    EXPECT_EQ(parts.front().firstChild, 0U);
    EXPECT_TRUE(parts.back().guessed);
    EXPECT_EQ(parts.back().firstChild, std::nullopt);
    ASSERT_EQ(parts.back().around.size(), 1U);
    EXPECT_EQ(parts.back().around[0].offset, 0U);
    size_t again = 0;
    EXPECT_EQ(inParts(source, parts, Streams::oneForm, &again), inOneWalk(source, {}, Streams::oneForm));
    EXPECT_EQ(again, 0U);
  }
}

TEST(Plan, CutsByTheSizesOfLargeChildrenAndCountsThem)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (unsigned i = 0; i < 40; ++i)
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_HOST_NAME, std::string(10'000, 'a'));
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  const Bytes bytes(first, first + writer.bytes().size());
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const auto parts = plan(source, {.targetBytes = 100'000});
  ASSERT_EQ(parts.size(), 4U);
  const uint64_t each = 16 + 16 + 10'000;
  for (size_t i = 1; i < parts.size(); ++i)
  {
    EXPECT_FALSE(parts[i].guessed);
    EXPECT_EQ(parts[i].firstChild, (parts[i].offset - 16) / each);
    EXPECT_EQ((parts[i].offset - 16) % each, 0U);
  }
}

TEST(Plan, MakesNoMorePartsThanAsked)
{
  const Bytes bytes = flatStream(50'000, false);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  for (const size_t most : {1U, 2U, 3U, 7U, 100U})
  {
    EXPECT_LE(plan(source, {.targetBytes = 1000, .maxParts = most}).size(), most);
  }
  EXPECT_EQ(plan(source, {.targetBytes = 1000, .maxParts = 1}).size(), 1U);
}

TEST(Plan, OfAnEmptyFileAndOfOneThatIsNoStreamIsOnePart)
{
  const Bytes text(100'000, 'x');
  for (const Bytes& bytes : {Bytes{}, text})
  {
    ByteSource source("x", std::span<const uint8_t>(bytes));
    const auto parts = plan(source, {.targetBytes = 100});
    ASSERT_EQ(parts.size(), 1U);
    EXPECT_EQ(parts[0].offset, 0U);
    EXPECT_EQ(parts[0].size, bytes.size());
  }
}

TEST(Plan, PartsOfRandomTreesAreTheTree)
{
  for (uint64_t seed = 0; seed < 50; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes tree = test::bytesOfTree(test::randomTree(seed, {.depth = 6, .width = 12}));
    const Bytes named = test::namedStream(seed, seed % 2 == 1, seed % 3 == 0);
    for (const uint64_t target : {16U, 200U})
    {
      SCOPED_TRACE(target);
      expectEqual(tree, target);
      expectEqual(named, target);
      expectEqual(test::damaged(tree, seed), target);
      expectEqual(test::damaged(named, seed), target);
    }
  }
}

TEST(Plan, PartsOfLongGroupsAreTheGroupAlsoWhereItIsDamaged)
{
  for (uint64_t seed = 0; seed < 24; ++seed)
  {
    SCOPED_TRACE(seed);
    Bytes bytes = flatStream(600, seed % 2 == 1, seed % 3 == 1, seed % 5 == 1);
    for (uint64_t damages = 0; damages < seed % 4; ++damages)
    {
      bytes = test::damaged(bytes, seed * 4 + damages);
    }
    for (const uint64_t target : {300U, 3000U})
    {
      expectEqual(bytes, target);
    }
  }
}

TEST(Plan, PartsOfSeveralStreamsInMixedFormsAreTheFile)
{
  for (uint64_t seed = 0; seed < 16; ++seed)
  {
    SCOPED_TRACE(seed);
    Bytes bytes;
    for (uint64_t i = 0; i < 6; ++i)
    {
      const Bytes one = i % 3 == 2 ? flatStream(300, false, (seed >> i) % 2 == 1)
                                   : test::namedStream(seed * 8 + i, (seed >> i) % 2 == 1, (seed >> i) % 4 > 1);
      bytes.insert(bytes.end(), one.begin(), one.end());
      bytes.insert(bytes.end(), (seed + i) % 3 == 0 ? 64 : 0, uint8_t{0});
    }
    for (const uint64_t target : {60U, 1000U})
    {
      expectEqual(bytes, target);
    }
  }
}

TEST(Plan, FindsOutASeamThatIsForgedInAPayload)
{
  // A payload that holds what its siblings look like, and is much longer than a part.
  const Bytes inner = flatStream(3000, false);
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (unsigned i = 0; i < 600; ++i)
    {
      root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{i});
      root.add(TAV_ELM_CMN_HOST_NAME, "ada");
    }
    root.add(TAV_ELM_CMN_HOST_NAME, std::as_bytes(std::span(inner).subspan(16)));
    for (unsigned i = 0; i < 2000; ++i)
    {
      root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{i});
      root.add(TAV_ELM_CMN_HOST_NAME, "ada");
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  const Bytes bytes(first, first + writer.bytes().size());
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const auto parts = plan(source, {.targetBytes = 8000});
  const uint64_t payload = 16 + 600 * (16 + 4 + 16 + 3) + 16;
  const auto isForged = [&](const Part& part) {
    return part.offset > payload && part.offset < payload + inner.size() - 16;
  };
  EXPECT_TRUE(std::any_of(parts.begin(), parts.end(), isForged));
  size_t again = 0;
  EXPECT_EQ(inParts(source, parts, Streams::everyForm, &again), inOneWalk(source, {}, Streams::everyForm));
  EXPECT_GT(again, 0U);
}

TEST(Plan, RefusesNumbersAndPartsThatAreNone)
{
  const Bytes bytes = flatStream(100, false);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  EXPECT_THROW((void)partOf(std::vector<uint64_t>{1, 2, 3}), Error);
  EXPECT_THROW((void)partOf(std::vector<uint64_t>{1, 2, 0x100, 0, 0}), Error);
  EXPECT_THROW((void)partOf(std::vector<uint64_t>{2, ~uint64_t{0} - 1, 0, 0, 0}), Error);
  const Part whole = plan(source).front();
  Part part = whole;
  part.size = bytes.size() + 1;
  EXPECT_THROW(PartWalk(source, part), Error);
  part = whole;
  part.offset = 100;
  part.size = 10;
  part.around = {{.offset = 16, .end = bytes.size()}}; // a data element
  EXPECT_THROW(PartWalk(source, part), Error);
  part.around = {{.offset = 0, .end = bytes.size() + 1}};
  EXPECT_THROW(PartWalk(source, part), Error);
  part.around = {{.offset = 0, .end = 99}};
  EXPECT_THROW(PartWalk(source, part), Error);
  part.around = {{.offset = ~uint64_t{0} - 3, .end = bytes.size()}};
  EXPECT_THROW(PartWalk(source, part), Error);
  part.streamOffset = 200;
  part.around.clear();
  EXPECT_THROW(PartWalk(source, part), Error);
}

TEST(Plan, ANumberedPartIsThePart)
{
  const Bytes bytes = flatStream(3000, true);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  for (const Part& part : plan(source, {.targetBytes = 1000}))
  {
    const std::vector<uint64_t> numbers = numbersOf(part);
    EXPECT_TRUE(isSeam(part, partOf(numbers)));
    EXPECT_EQ(numbersOf(partOf(numbers)), numbers);
  }
}
