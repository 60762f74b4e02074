#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

bool differ(const Bytes& a, const tav::inspect::Form& formA, const Bytes& b, const tav::inspect::Form& formB)
{
  ByteSource first("a", std::span<const uint8_t>(a));
  ByteSource second("b", std::span<const uint8_t>(b));
  return diff({first, formA}, {second, formB}, {}, [](const Difference& difference) {
    ADD_FAILURE() << (difference.before ? difference.before->path : difference.after->path) << "  "
                  << difference.sentence;
  });
}

Bytes empties(size_t count, bool wide)
{
  tav::Writer writer({.root = wide ? tav::Width::bits64 : tav::Width::bits32});
  for (size_t i = 0; i < count; ++i)
  {
    const tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  }
  writer.finish();
  const auto view = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(view.data());
  return {first, first + view.size()};
}

} // namespace

class CollectInAForm : public testing::TestWithParam<std::tuple<bool, bool, bool>>
{
};

INSTANTIATE_TEST_SUITE_P(Forms, CollectInAForm, testing::Combine(testing::Bool(), testing::Bool(), testing::Bool()));

TEST_P(CollectInAForm, KeepsNodesAndValues)
{
  const auto [swap, align, wide] = GetParam();
  const tav::inspect::Form form{.swapped = swap, .root64 = wide, .aligned = align};
  for (uint64_t seed = 1; seed < 40; ++seed)
  {
    const bool otherSwap = seed % 2 == 0;
    const bool otherAlign = seed % 3 == 0;
    const Bytes bytes = test::namedStream(seed, otherSwap, otherAlign);
    const tav::inspect::Form own{.swapped = otherSwap, .root64 = true, .aligned = otherAlign};
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Made made;
    Collector collector(made.file(), {.form = {.swapped = swap, .root64 = wide, .aligned = align}});
    collector.add(source, own);
    collector.finish();
    EXPECT_EQ(collector.roots(), 1U);
    EXPECT_FALSE(differ(bytes, own, made.bytes(), form)) << seed;
  }
}

TEST(Collect, TakesTheFormOfTheFirstSource)
{
  const Bytes first = test::namedStream(3, true, true);
  const Bytes second = test::namedStream(4);
  ByteSource a("a", std::span<const uint8_t>(first));
  ByteSource b("b", std::span<const uint8_t>(second));
  test::Made made;
  Collector collector(made.file());
  collector.add(a, {.swapped = true, .root64 = true, .aligned = true});
  const uint64_t behind = made.file().length();
  collector.add(b, {});
  collector.finish();
  const Bytes all = made.bytes();
  EXPECT_EQ(Bytes(all.begin(), all.begin() + static_cast<ptrdiff_t>(behind)), first);
  EXPECT_FALSE(differ(second, {}, {all.begin() + static_cast<ptrdiff_t>(behind), all.end()},
                      {.swapped = true, .root64 = true, .aligned = true}));
}

TEST(Collect, GivesAnEmptyRootAnEndElementWhereAnotherFollows)
{
  const Bytes one = empties(1, true);
  ByteSource source("x", std::span<const uint8_t>(one));
  test::Made made;
  Collector collector(made.file());
  collector.add(source, {});
  collector.add(source, {});
  collector.finish();
  const Bytes bytes = made.bytes();
  EXPECT_EQ(bytes.size(), 16U + 32U + 16U);
  ByteSource again("y", std::span<const uint8_t>(bytes));
  Walker walker(again, {});
  uint64_t roots = 0;
  for (Event event; walker.next(event);)
  {
    roots += event.what == What::nodeBegin && event.depth == 0 ? 1 : 0;
  }
  EXPECT_EQ(roots, 2U);
}

TEST(Collect, RefusesAnEmptyNarrowRootBeforeAnother)
{
  const Bytes one = empties(1, false);
  ByteSource source("x", std::span<const uint8_t>(one));
  test::Made made;
  Collector collector(made.file());
  collector.add(source, {.root64 = false});
  EXPECT_THROW(collector.add(source, {.root64 = false}), Error);
}

namespace
{

/// What a collector takes from where a path leads in a system of two hosts, one of them in another; nodes and bytes.
std::pair<uint64_t, Bytes> foundBy(const std::string& path)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    system.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{1});
    for (const uint32_t number : {2U, 3U})
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_CPU_ONLINE, number);
      host.group(TAV_ELM_CMN_HOST).add(TAV_ELM_CMN_HOST_NAME, "ada");
    }
  }
  writer.finish();
  const auto view = writer.bytes();
  ByteSource source("x", std::span(reinterpret_cast<const uint8_t*>(view.data()), view.size()));
  test::Made made;
  Collector collector(made.file());
  uint64_t seen = 0;
  collector.addFound(source, {}, Path(path), [&](const Walker&, const Event&) { ++seen; });
  collector.finish();
  EXPECT_GT(seen, 10U);
  return {collector.nodes(), made.bytes()};
}

} // namespace

TEST(CollectFound, TakesTheOutermostOfNestedGroups)
{
  const auto [nodes, bytes] = foundBy("**/host");
  EXPECT_EQ(nodes, 8U); // two hosts, each with a number, a host and its name
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, {});
  std::vector<std::string> roots;
  for (Event event; walker.next(event);)
  {
    if (event.what == What::nodeBegin && event.depth == 0)
    {
      roots.push_back(walker.path(event));
    }
  }
  EXPECT_THAT(roots, testing::ElementsAre("/host", "/host[2]"));
}

TEST(CollectFound, TakesOneOfSeveral)
{
  const auto [nodes, bytes] = foundBy("/system/host[2]");
  EXPECT_EQ(nodes, 4U);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Walker walker(source, {});
  for (Event event; walker.next(event);)
  {
    if (event.what == What::nodeBegin && event.node.elm() == TAV_ELM_CMN_CPU_ONLINE)
    {
      EXPECT_EQ(walker.path(event), "/host/cpuOnline");
      EXPECT_EQ(valueText(source, {}, event.node, 16), "3");
    }
  }
}

TEST(CollectFound, RefusesWhatIsNoGroupAndWhatIsNotThere)
{
  try
  {
    foundBy("/system/host[2]/cpuOnline");
    FAIL() << "a value cannot stand for itself";
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.problem().path, "/system/host[2]/cpuOnline");
    EXPECT_THAT(error.problem().sentence, testing::StartsWith("is no group"));
  }
  try
  {
    foundBy("/system/host[3]");
    FAIL() << "there are two";
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.trouble(), Trouble::notFound);
  }
}

TEST(Collect, KeepsAGroupWithTheIdOfAnEndElement)
{
  const Bytes bytes = test::streamWithGroupNamedAsAnEnd(1);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  test::Made made;
  Collector collector(made.file(), {});
  collector.add(source, {});
  collector.finish();
  EXPECT_EQ(made.bytes(), bytes);
}
