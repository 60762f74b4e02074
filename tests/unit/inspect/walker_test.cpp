#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"
#include "support/writtenDown.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

/// Walks to the end and checks that the pieces follow one another without gap or overlap and that nodes nest.
std::vector<Event> walked(const Bytes& bytes, const tav::inspect::Form& form)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, form);
  std::vector<Event> events;
  std::vector<uint64_t> open;
  uint64_t position = 0;
  Walker other(source, form);
  Event event;
  Event same;
  while (walker.next(event))
  {
    EXPECT_TRUE(other.goOn(same));
    EXPECT_EQ(test::writtenDown(same), test::writtenDown(event));
    EXPECT_EQ(event.offset, position);
    position += event.what == What::nodeEnd ? 0 : event.length;
    if (event.what == What::nodeBegin)
    {
      open.push_back(event.node.offset());
    }
    else if (event.what == What::nodeEnd)
    {
      EXPECT_FALSE(open.empty());
      EXPECT_EQ(event.node.offset(), open.back());
      open.pop_back();
    }
    events.push_back(event);
  }
  EXPECT_FALSE(other.goOn(same));
  EXPECT_EQ(position, bytes.size());
  EXPECT_TRUE(open.empty());
  return events;
}

} // namespace

TEST(Walker, HandsOutEveryNodeOfASoundStreamOnce)
{
  for (uint64_t seed = 0; seed < 400; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed, {.forget = false});
    std::vector<const test::TreeNode*> nodes;
    test::listNodes(tree.root, nodes);
    size_t next = 0;
    for (const Event& event : walked(test::bytesOfTree(tree), test::readForm(tree.form)))
    {
      ASSERT_NE(event.what, What::damaged) << event.reason;
      if (event.what != What::nodeBegin)
      {
        continue;
      }
      ASSERT_LT(next, nodes.size());
      EXPECT_EQ(event.node.offset(), nodes[next]->offset);
      EXPECT_EQ(event.node.elm(), nodes[next]->elm);
      EXPECT_EQ(event.node.type(), nodes[next]->type);
      EXPECT_EQ(event.node.size(), nodes[next]->size);
      ++next;
    }
    EXPECT_EQ(next, nodes.size());
  }
}

TEST(Walker, AccountsForEveryByteOfADamagedStream)
{
  size_t damages = 0;
  for (uint64_t seed = 0; seed < 2000; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed);
    const auto events = walked(test::damaged(test::bytesOfTree(tree), seed), test::readForm(tree.form));
    for (const Event& event : events)
    {
      damages += event.what == What::damaged ? 1 : 0;
      EXPECT_TRUE(event.what != What::damaged || !event.reason.empty());
    }
  }
  EXPECT_GT(damages, 500U);
}

TEST(Walker, GoesOnBehindThePairOfANodeThatHasLostItsHeader)
{
  for (const bool swap : {false, true})
  {
    const auto number = [](test::ByteRows& rows) {
      rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4);
    };
    test::ByteRows rows(swap);
    rows.h64(20 + 36 + 20 + 20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    number(rows);
    const uint64_t lost = rows.at();
    rows.fill(16 + 4, 0xFF).pair(20);
    const uint64_t behind = rows.at();
    number(rows);
    number(rows);
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    Walker walker(source, {.swapped = swap});
    std::vector<uint64_t> nodes;
    std::vector<std::pair<uint64_t, uint64_t>> damaged;
    for (Event event; walker.next(event);)
    {
      if (event.what == What::nodeBegin)
      {
        nodes.push_back(event.offset);
      }
      else if (event.what == What::damaged)
      {
        damaged.emplace_back(event.offset, event.length);
      }
    }
    EXPECT_THAT(nodes, testing::ElementsAre(0, 16, behind, behind + 20));
    EXPECT_THAT(damaged, testing::ElementsAre(std::pair(lost, behind - lost)));
  }
}

TEST(Walker, GoesOnAtANodeOfExactlyItsTypesSizeAlsoWhereDamageFollows)
{
  for (const bool swap : {false, true})
  {
    test::ByteRows rows(swap);
    rows.h64(30 + 20 + 30, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM).fill(30, 0xFF);
    rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4).fill(30, 0xFF);
    ByteSource source("x", std::span<const uint8_t>(rows.bytes));
    Walker walker(source, {.swapped = swap});
    std::vector<uint64_t> nodes;
    for (Event event; walker.next(event);)
    {
      if (event.what == What::nodeBegin)
      {
        nodes.push_back(event.offset);
      }
    }
    EXPECT_THAT(nodes, testing::ElementsAre(0, 16 + 30));
  }
}

TEST(Walker, SkipsTheChildrenOfAGroupWhoseEndIsKnown)
{
  test::ByteRows rows;
  rows.h64(16 + 4 + 16 + 20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  rows.h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE);
  rows.number(8, 4);
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE);
  rows.number(9, 4);
  const Bytes& bytes = rows.bytes;
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, {.swapped = false});
  Event event;
  ASSERT_TRUE(walker.next(event));
  ASSERT_TRUE(walker.next(event));
  ASSERT_EQ(event.node.elm(), TAV_ELM_CMN_HOST);
  EXPECT_EQ(walker.path(event), "/system/host");
  ASSERT_TRUE(walker.skip());
  ASSERT_TRUE(walker.next(event));
  EXPECT_EQ(event.what, What::skipped);
  EXPECT_EQ(event.length, 20U);
  ASSERT_TRUE(walker.next(event));
  EXPECT_EQ(event.what, What::nodeEnd);
  EXPECT_FALSE(walker.skip()); // not behind a group's header
}

TEST(Walker, BeginsAtAnyNode)
{
  size_t nodes = 0;
  for (uint64_t seed = 0; seed < 30; ++seed)
  {
    const Bytes bytes = test::namedStream(seed);
    for (const Event& whole : walked(bytes, {}))
    {
      if (whole.what != What::nodeBegin)
      {
        continue;
      }
      ++nodes;
      ByteSource source("x", std::span<const uint8_t>(bytes));
      Walker walker(source, {}, {.offset = whole.offset, .wide = true});
      Event event;
      ASSERT_TRUE(walker.next(event));
      EXPECT_EQ(event.node.offset(), whole.offset);
      EXPECT_EQ(event.node.elm(), whole.node.elm());
      EXPECT_EQ(event.node.size(), whole.node.size());
    }
  }
  EXPECT_GT(nodes, 200U);
}

TEST(Walker, GivesUpLookingWhenItsBudgetIsUsedUp)
{
  Bytes bytes(1'000'000, 0x5A);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, {}, {.budget = 1000});
  Event event;
  What last = What::nodeBegin;
  while (walker.next(event))
  {
    last = event.what;
  }
  EXPECT_EQ(last, What::unread);
  EXPECT_LT(walker.spent(), 100'000U);
}

TEST(Recognise, FindsTheFormOfSoundStreams)
{
  size_t streams = 0;
  for (uint64_t seed = 0; seed < 400; ++seed)
  {
    const test::Tree tree = test::randomTree(seed, {.depth = 4, .width = 6, .payload = 30, .forget = false});
    const Bytes bytes = test::bytesOfTree(tree);
    std::vector<const test::TreeNode*> nodes;
    test::listNodes(tree.root, nodes);
    if (nodes.size() < 20)
    {
      continue; // of a few bytes more than one reading can be right
    }
    ++streams;
    SCOPED_TRACE(seed);
    ByteSource source("x", std::span<const uint8_t>(bytes));
    const Recognition found = recognise(source);
    EXPECT_TRUE(found.isStream);
    EXPECT_EQ(found.form.swapped, tree.form.swap);
    EXPECT_EQ(found.form.root64, !tree.form.root32);
    EXPECT_FALSE(found.because.empty());
  }
  EXPECT_GT(streams, 50U);
}

TEST(Recognise, TellsWhereAStreamInAnotherFormBegins)
{
  Bytes bytes = test::namedStream(1);
  const size_t second = bytes.size();
  const Bytes other = test::namedStream(2, true);
  bytes.insert(bytes.end(), other.begin(), other.end());
  ByteSource source("x", std::span<const uint8_t>(bytes));
  size_t told = 0;
  for (const Reason& reason : recognise(source).because)
  {
    EXPECT_EQ(reason.other.value_or(second), second);
    told += reason.other ? 1 : 0;
  }
  EXPECT_EQ(told, 1U);
}

TEST(Walker, GoesOnAsBeforeBehindChildrenThatWereSkipped)
{
  for (uint64_t seed = 0; seed < 100; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed);
    const Bytes bytes = test::bytesOfTree(tree);
    ByteSource source("x", std::span<const uint8_t>(bytes));
    Walker one(source, test::readForm(tree.form));
    Walker other(source, test::readForm(tree.form));
    Event event;
    Event same;
    while (one.next(event))
    {
      ASSERT_TRUE(other.goOn(same));
      ASSERT_EQ(test::writtenDown(same), test::writtenDown(event));
      if (event.what == What::nodeBegin && event.depth % 2 == 1)
      {
        ASSERT_EQ(one.skip(), other.skip());
      }
    }
    EXPECT_FALSE(other.goOn(same));
  }
}

TEST(DamageWatch, TellsOfAStreamInAnotherForm)
{
  Bytes bytes = test::namedStream(1);
  const size_t second = bytes.size();
  const Bytes other = test::namedStream(2, true);
  bytes.insert(bytes.end(), other.begin(), other.end());
  ByteSource source("x", std::span<const uint8_t>(bytes));
  std::vector<PassedOver> passed;
  Walker walker(source, {});
  DamageWatch watch(source, {}, [&](PassedOver one) { passed.push_back(std::move(one)); });
  for (Event event; walker.next(event);)
  {
    watch.see(walker, event);
  }
  ASSERT_FALSE(passed.empty());
  EXPECT_EQ(passed[0].offset, second);
  EXPECT_TRUE(passed[0].otherStream);
}

TEST(Locate, SaysThatTheBytesCanBeShownWhereNoNodeBegins)
{
  const Bytes bytes = test::namedStream(1);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, {});
  Event event;
  try
  {
    goToOffset(source, walker, event, 3);
    FAIL() << "no node begins there";
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.problem().remedy, Remedy::showBytes);
    EXPECT_EQ(error.problem().offset, 3U);
    EXPECT_EQ(error.problem().hint, "the node before it begins at 0x0: /system");
  }
}

TEST(Recognise, TakesWhatIsGiven)
{
  const test::Tree tree = test::randomTree(5, {.forget = false});
  const Bytes bytes = test::bytesOfTree(tree);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const Recognition found = recognise(source, {.swapped = !tree.form.swap, .root64 = true, .aligned = true});
  EXPECT_EQ(found.form.swapped, !tree.form.swap);
  EXPECT_TRUE(found.form.root64);
  EXPECT_TRUE(found.form.aligned);
}

TEST(Recognise, FindsNothingInNoise)
{
  std::mt19937 random(1);
  Bytes bytes(5000);
  for (uint8_t& byte : bytes)
  {
    byte = static_cast<uint8_t>(random());
  }
  ByteSource source("x", std::span<const uint8_t>(bytes));
  EXPECT_FALSE(recognise(source).isStream);
}
