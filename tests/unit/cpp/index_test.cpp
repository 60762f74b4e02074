#include <algorithm>
#include <map>
#include <memory>
#include <random>
#include <span>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "cpp/layer.h"
#include "support/damage.h"
#include "support/layerOptions.h"
#include "support/randomTree.h"

using namespace test;

namespace
{

/// A system with three hosts, of which each has a name and two processors.
Bytes threeHosts(const tav::StreamOptions& options = {})
{
  tav::Writer writer(options);
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (const char* const name : {"ada", "bob", "eve"})
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST, {.eyeSize = true});
      host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{1});
      host.add(TAV_ELM_CMN_HOST_NAME, name);
      host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{2});
    }
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

std::vector<uint64_t> offsetsOf(const std::vector<tav::Node>& nodes)
{
  std::vector<uint64_t> offsets;
  for (const tav::Node& node : nodes)
  {
    offsets.push_back(node.offset());
  }
  return offsets;
}

/// The same look-ups by the index and by its node.
void expectSame(const tav::Index& index, const tav::Node& start, const std::string& path)
{
  EXPECT_EQ(offsetsOf(index.findAll(path)), offsetsOf(start.all(path))) << path;
  const auto [found, wanted] = std::pair(index.find(path), start.path(path));
  ASSERT_EQ(found.has_value(), wanted.has_value()) << path;
  EXPECT_EQ(found ? found->offset() : 0, wanted ? wanted->offset() : 0) << path;
}

TEST(LayerIndex, FindsWhatAPathFinds)
{
  const Bytes bytes = threeHosts();
  const tav::Reader reader(spanOf(bytes));
  const tav::Node root = reader.root();
  const tav::Index index(root);
  EXPECT_EQ(index.size(), 12U);
  EXPECT_EQ(index.find("host[2]/hostName")->as<std::string>(), "bob");
  EXPECT_EQ(index.find(tav::Path("host[3]/60111[2]"))->offset(), root.path("host[3]/60111[2]")->offset());
  for (const char* const path : {"host", "/host/hostName", "host/*", "*[2]/*[3]", "host/hostName[2]", "host[4]",
                                 "hostName", "*/*", "host[2]/*[2]", "host/hostName/host", "7", "#65001"})
  {
    expectSame(index, root, path);
  }
}

TEST(LayerIndex, IsCopiedWithAllThatItHolds)
{
  const Bytes bytes = threeHosts();
  const tav::Reader reader(spanOf(bytes));
  const tav::Node root = reader.root();
  auto index = std::make_unique<tav::Index>(root);
  const tav::Index copy = *index;
  index.reset();
  for (const char* const path : {"host", "host[2]/hostName", "//cpuOnline", "host/memFree"})
  {
    expectSame(copy, root, path);
  }
}

TEST(LayerIndex, FindsByAWalkWhatItDoesNotHold)
{
  const Bytes bytes = threeHosts();
  const tav::Reader reader(spanOf(bytes));
  const tav::Node root = reader.root();
  const tav::Index index(root);
  const tav::Node host = *index.find("host[2]");
  const tav::Index ofHost(host);
  for (const char* const path : {".", "/", "/system/host", "//host", "/system//hostName", "host[hostName='bob']",
                                 "host/..", "host[last()]", "host[-1]/hostName", "host[position() > 1]", "host[2][1]",
                                 "host[2][2]", "host/hostName | host/60111", "host/65000", "host/#65000[1]",
                                 "host//65000", ".//.", ".//..", "host[60111 = 2]", "host/*[@type='Uint32'][2]",
                                 "host[1 + 1]"})
  {
    expectSame(index, root, path);
    expectSame(ofHost, host, path);
  }
  EXPECT_EQ(index.find("host[hostName='eve']/60111[2]")->as<uint32_t>(), 2U);
  EXPECT_EQ(index.findAll("host/65000").size() + index.findAll("host/65001").size(), 3U);
  EXPECT_EQ(ofHost.find("../host/hostName")->as<std::string_view>(), "ada");
}

TEST(LayerIndex, FindsAtAnyLevelInStreamOrderEachOnce)
{
  // The same id on several levels, inside of each other and before and behind what is deeper.
  tav::Writer writer;
  {
    tav::Group root = writer.group(1);
    tav::Group outer = root.group(2);
    outer.add(3, uint8_t{1});
    {
      tav::Group inner = outer.group(2);
      inner.add(4, uint8_t{2});
      tav::Group innermost = inner.group(2);
      innermost.add(3, uint8_t{3});
    }
    outer.add(3, uint8_t{4});
    outer.close();
    root.add(3, uint8_t{5});
  }
  writer.finish();
  const tav::Reader reader(std::as_const(writer).bytes());
  const tav::Node root = reader.root();
  const tav::Index index(root);
  EXPECT_EQ(index.findAll(".//3").size(), 4U);
  EXPECT_EQ(index.find(".//3")->as<uint8_t>(), 1);
  EXPECT_EQ(index.findAll(".//2//3").size(), 3U);
  EXPECT_EQ(index.find(".//2//2//3")->as<uint8_t>(), 3);
  EXPECT_EQ(index.find("2//3[2]")->next(), std::nullopt);
  for (const char* const path : {".//3", ".//2", ".//*", "**", "**/2", "2/**", ".//2//3", ".//2//2//3", "2//3[2]",
                                 ".//*[2]", ".//2/*[1]", ".//2//*//3", "*//2", "*/*//3[1]", ".//1", ".//3/3"})
  {
    expectSame(index, root, path);
  }
}

TEST(LayerIndex, TakesPathsOfAnyLength)
{
  tav::Writer writer;
  {
    std::vector<tav::Group> open;
    open.push_back(writer.group(1));
    for (int i = 0; i < 200; ++i)
    {
      open.push_back(open.back().group(1));
    }
    open.back().add(2, uint8_t{7});
    while (!open.empty())
    {
      open.pop_back();
    }
  }
  writer.finish();
  const tav::Reader reader(std::as_const(writer).bytes());
  const tav::Index index(reader.root());
  std::string path;
  for (int steps = 1; steps <= 200; ++steps)
  {
    path += "1/";
    expectSame(index, reader.root(), path + "*");
  }
  EXPECT_EQ(index.find(path + "2")->as<uint8_t>(), 7);
}

/// Behind an element that ends a group, and is a group itself, nothing is found: as with the walk.
TEST(LayerIndex, LeavesOutWhatIsBelowAnEndElement)
{
  tav::Writer writer({.byteOrder = kLowFirst});
  {
    tav::Group root = writer.group(1);
    tav::Group group = root.group(2);
    group.add(3, uint8_t{1});
    group.close();
    tav::Group other = root.group(4);
    other.add(3, uint8_t{2});
  }
  writer.finish();
  Bytes bytes = bytesOf(std::as_const(writer).bytes());
  const tav::Reader reader(spanOf(bytes), {.byteOrder = kLowFirst});
  const uint64_t offset = reader.path("1/4")->offset();
  bytes[offset + 14] = TAV_ELM_CMN_END_HDR_MARKER & 0xFFU;
  bytes[offset + 15] = TAV_ELM_CMN_END_HDR_MARKER >> 8U;
  const tav::Node root = reader.root();
  ASSERT_EQ(root.all("#65000").size() + root.all("#65001").size(), 1U);
  const tav::Index index(root);
  EXPECT_EQ(index.size(), 2U);
  for (const char* const path : {"3", "*", "*/3", ".//3", "2/3", "4/3", "#65000", "#65001", "#65000/3", "#65001/3"})
  {
    expectSame(index, root, path);
  }
}

TEST(LayerIndex, GivesNodesThatKnowTheirGroup)
{
  const Bytes bytes = threeHosts();
  const tav::Reader reader(spanOf(bytes));
  const tav::Index index(reader.root());
  EXPECT_EQ(index.find("host/60111")->next()->as<std::string_view>(), "ada");
  EXPECT_EQ(index.find("host[2]")->next()->path("hostName")->as<std::string_view>(), "eve");
}

TEST(LayerIndex, TellsWhatIsNoPath)
{
  const Bytes bytes = threeHosts();
  const tav::Reader reader(spanOf(bytes));
  const tav::Index index(reader.root());
  EXPECT_EQ(thrownBy([&] { static_cast<void>(index.find("host//x")); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(index.find("", ec)); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(index.findAll("nobody", ec)); }), TAV_RC_BAD_PARAM);
}

TEST(LayerIndex, OfANodeWithoutChildrenFindsNothing)
{
  const Bytes bytes = threeHosts();
  const tav::Reader reader(spanOf(bytes));
  const tav::Index index(*reader.root().path("host/hostName"));
  EXPECT_EQ(index.size(), 0U);
  EXPECT_FALSE(index.find("host"));
  EXPECT_TRUE(index.findAll("*").empty());
}

TEST(LayerIndex, SaysWhenAnotherNodeStandsThereNow)
{
  Bytes bytes = threeHosts({.byteOrder = kLowFirst});
  const tav::Reader reader(spanOf(bytes), {.byteOrder = kLowFirst});
  const tav::Index index(reader.root());
  const uint64_t offset = index.find("host[2]/hostName")->offset();
  bytes[offset + 14] ^= 1; // of its id
  EXPECT_EQ(thrownBy([&] { static_cast<void>(index.find("host[2]/hostName")); }), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { EXPECT_TRUE(index.findAll("host/hostName", ec).empty()); }),
            TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(index.find("host[3]/hostName")->as<std::string>(), "eve");
}

TEST(LayerIndex, TakesThirtyTwoBytesANodeAtTheMost)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(1);
    for (uint16_t i = 0; i < 2000; ++i)
    {
      tav::Group group = root.group(i % 3);
      for (uint16_t k = 0; k < 20; ++k)
      {
        group.add(1000 - k, k);
      }
    }
  }
  writer.finish();
  const tav::Reader reader(std::as_const(writer).bytes());
  const tav::Index index(reader.root());
  EXPECT_EQ(index.size(), 42000U);
  EXPECT_LE(index.memory(), 32 * index.size());
  EXPECT_EQ(index.find("2[600]/990")->as<uint16_t>(), 10);
  EXPECT_EQ(index.findAll("2/990").size(), 666U);
}

TEST(LayerIndex, FindsChildrenWhateverOrderTheirIdsAreIn)
{
  const std::vector<uint16_t> orders[] = {{7},
                                          {5, 6, 7, 8},
                                          {8, 7, 6, 5},
                                          {5, 6, 8, 9},
                                          {5, 6, 7, 7},
                                          {5, 5, 6, 7},
                                          {5, 7, 7, 8},
                                          {1, 2, 64999},
                                          {64998, 64999},
                                          {65533, 65534, 65535}};
  tav::Writer writer;
  {
    tav::Group root = writer.group(1);
    for (const std::vector<uint16_t>& ids : orders)
    {
      tav::Group group = root.group(2);
      for (const uint16_t id : ids)
      {
        group.add(id, id);
      }
    }
    root.group(2).close(); // without a child
  }
  writer.finish();
  const tav::Reader reader(std::as_const(writer).bytes());
  const tav::Index index(reader.root());
  for (size_t i = 1; i <= std::size(orders) + 1; ++i)
  {
    for (const int id : {0, 1, 4, 5, 6, 7, 8, 9, 64997, 64998, 64999, 65002, 65532, 65533, 65534, 65535})
    {
      const std::string path = "#2[" + std::to_string(i) + "]/#" + std::to_string(id);
      expectSame(index, reader.root(), path);
      expectSame(index, reader.root(), path + "[1]");
      expectSame(index, reader.root(), path + "[2]");
    }
  }
}

/// Calls `see(path)` for the ids and places that lead to each node, without the elements that end groups.
template<class See>
void eachPath(const TreeNode& node, const std::string& path, const See& see)
{
  std::map<uint16_t, size_t> places;
  for (const TreeNode& child : node.children)
  {
    if (!child.ending)
    {
      const std::string own = path + "#" + std::to_string(child.elm) + "[" + std::to_string(++places[child.elm]) + "]";
      see(own, child);
      eachPath(child, own + "/", see);
    }
  }
}

TEST(LayerIndex, FindsEveryNodeOfRandomTrees)
{
  for (uint64_t seed = 1; seed <= 200; ++seed)
  {
    const Tree tree = randomTree(seed, {.width = 8, .forget = false});
    const Bytes bytes = bytesOfTree(tree);
    const tav::StreamOptions options = layerOptions(tree.form, 256);
    VectorStorage storage(64, bytes, VectorStorage::kReadOnly);
    const tav::Reader reader = seed % 2 == 0 ? tav::Reader(spanOf(bytes), options) : tav::Reader(storage, options);
    const tav::Index index(reader.root());
    size_t count = 0;
    eachPath(tree.root, "", [&](const std::string& path, const TreeNode& node) {
      const std::optional<tav::Node> found = index.find(path);
      ASSERT_TRUE(found) << seed << ": " << path;
      EXPECT_EQ(found->offset(), node.offset) << seed << ": " << path;
      ++count;
    });
    EXPECT_EQ(index.size(), count) << seed;
    const std::string some = "#" + std::to_string(tree.root.children.empty() ? 1 : tree.root.children.front().elm);
    for (const std::string& path : std::initializer_list<std::string>{".//" + some, "*/" + some, "*[2]//*",
                                                                      some + "//*[2]", "*//" + some + "[1]",
                                                                      some + "[last()]", "**", "..//" + some,
                                                                      "/*/" + some + "[2]"})
    {
      expectSame(index, reader.root(), path);
    }
  }
}

TEST(LayerIndex, HoldsWhatComesBeforeDamage)
{
  for (uint64_t seed = 1; seed <= 300; ++seed)
  {
    const Tree tree = randomTree(seed, {.width = 8});
    Bytes bytes = bytesOfTree(tree);
    Damage damage(bytes, seed);
    seed % 2 == 0 ? damage.flipBits() : damage.setBytes();
    const tav::Reader reader(spanOf(bytes), layerOptions(tree.form));
    std::error_code ec;
    const tav::Node root = reader.root(ec);
    if (ec)
    {
      continue;
    }
    size_t count = 0;
    std::error_code walked;
    tav::DescendantRange nodes = root.descendants(walked, tav::EndElements::show);
    for (const tav::Node& node : nodes)
    {
      const bool isEnd = tav::layout::isEndElement(node.elm());
      count += isEnd ? 0 : 1;
      isEnd ? nodes.skip() : void(); // which damage can have made a group
    }
    const tav::Index index(root, ec);
    EXPECT_EQ(ec, walked) << seed;
    EXPECT_EQ(index.size(), count) << seed;
    std::error_code ignored;
    static_cast<void>(index.findAll("*/*", ignored));
  }
}

/// Places where a walk might stand, few of which it comes by.
struct AnySeams
{
  AnySeams(const Bytes& bytes, const std::vector<uint64_t>& nodes, uint64_t seed)
  {
    std::mt19937_64 random(seed);
    const auto place = [&]() {
      const uint64_t any = random();
      return any % 3 != 0 ? nodes[random() % nodes.size()] : random() % (bytes.size() + 9);
    };
    for (uint64_t i = 1 + random() % 6; i != 0; --i)
    {
      std::vector<uint64_t> groups(1, random() % 4 != 0 ? nodes.front() : place());
      for (uint64_t levels = random() % 4; levels != 0; --levels)
      {
        groups.push_back(place());
      }
      around.push_back(std::move(groups));
      offsets.push_back(place());
    }
    std::sort(offsets.begin(), offsets.end());
    for (size_t i = 0; i < offsets.size(); ++i)
    {
      seams.push_back({around[i], offsets[i]});
    }
  }

  std::vector<std::vector<uint64_t>> around{};
  std::vector<uint64_t> offsets{};
  std::vector<tav::detail::IndexSeam> seams{};
};

TEST(LayerIndex, IsTheSameWhereverPartsOfItsWalkAreToldToBegin)
{
  for (uint64_t seed = 1; seed <= 400; ++seed)
  {
    const Tree tree = randomTree(seed, {.width = 8});
    Bytes bytes = bytesOfTree(tree);
    if (seed % 4 == 0)
    {
      Damage(bytes, seed).flipBits();
    }
    const tav::Reader reader(spanOf(bytes), layerOptions(tree.form));
    std::error_code ec;
    const tav::Node root = reader.root(ec);
    if (ec)
    {
      continue;
    }
    const tav::Index whole(root, ec);
    std::error_code ignored;
    std::vector<uint64_t> nodes = offsetsOf(whole.findAll(".//*", ignored));
    nodes.insert(nodes.begin(), root.offset());
    const AnySeams any(bytes, nodes, seed);
    std::error_code cut;
    const tav::Index parts(root, tav::detail::IndexWork{any.seams}, cut);
    EXPECT_EQ(cut, ec) << seed;
    EXPECT_EQ(parts.size(), whole.size()) << seed;
    for (const char* const path : {".//*", "*/*", "*[2]//*[1]"})
    {
      EXPECT_EQ(offsetsOf(parts.findAll(path, ignored)), offsetsOf(whole.findAll(path, ignored))) << seed << path;
    }
  }
}

} // namespace
