// An index that several threads make answers as the one that a single walk makes.
#include <algorithm>
#include <initializer_list>
#include <span>
#include <string>
#include <system_error>
#include <vector>

#include <gtest/gtest.h>

#include "inspect/streams.h"
#include "support/layerOptions.h"
#include "support/vectorStorage.h"

using tav::inspect::indexOf;
using test::Bytes;

namespace
{

constexpr unsigned kThreads = 3;

std::span<const std::byte> spanOf(const Bytes& bytes)
{
  return std::as_bytes(std::span(bytes));
}

std::vector<uint64_t> offsetsOf(const tav::Index& index, const std::string& path)
{
  std::error_code ec;
  std::vector<uint64_t> offsets{};
  for (const tav::Node& node : index.findAll(path, ec))
  {
    offsets.push_back(node.offset());
  }
  offsets.push_back(static_cast<uint64_t>(ec.value()));
  return offsets;
}

void expectSame(const tav::Node& start, uint64_t partBytes, const std::string& what)
{
  std::error_code walked;
  std::error_code shared;
  const tav::Index one(start, walked);
  const tav::Index several = indexOf(start, {.threads = kThreads, .partBytes = partBytes}, shared);
  EXPECT_EQ(shared, walked) << what;
  EXPECT_EQ(several.size(), one.size()) << what;
  EXPECT_EQ(several.memory(), one.memory()) << what;
  for (const char* const path : {".//*", "*", "*/*", "*[2]//*[3]", "host/hostName", ".//host[2]", "*//60111"})
  {
    EXPECT_EQ(offsetsOf(several, path), offsetsOf(one, path)) << what << ": " << path;
  }
}

/// For the root and for each of its groups.
void expectSameOf(const Bytes& bytes, const tav::StreamOptions& options, const std::string& what)
{
  const tav::Reader reader(spanOf(bytes), options);
  std::error_code ec;
  const tav::Node root = reader.root(ec);
  if (ec)
  {
    return;
  }
  for (const uint64_t partBytes : std::initializer_list<uint64_t>{1, 40, 300})
  {
    expectSame(root, partBytes, what + ", parts of " + std::to_string(partBytes));
    for (const tav::Node& child : root.children(ec))
    {
      expectSame(child, partBytes, what + ", below " + std::to_string(child.offset()));
    }
  }
}

TEST(IndexOf, IsThatOfOneWalkForRandomTrees)
{
  for (uint64_t seed = 1; seed <= 60; ++seed)
  {
    const test::Tree tree = test::randomTree(seed, {.depth = 6, .width = 9});
    expectSameOf(test::bytesOfTree(tree), test::layerOptions(tree.form), "seed " + std::to_string(seed));
  }
}

TEST(IndexOf, IsThatOfOneWalkUntilDamage)
{
  for (uint64_t seed = 1; seed <= 120; ++seed)
  {
    const test::Tree tree = test::randomTree(seed, {.depth = 5, .width = 9});
    expectSameOf(test::damaged(test::bytesOfTree(tree), seed), test::layerOptions(tree.form),
                 "seed " + std::to_string(seed));
  }
}

/// A group of small children.
void addMany(tav::Group& group, unsigned count)
{
  for (unsigned i = 0; i < count; ++i)
  {
    group.add(TAV_ELM_CMN_CPU_ONLINE, i);
    group.add(TAV_ELM_CMN_HOST_NAME, i % 3 == 0 ? "ada" : "bo");
  }
}

/// Small children, and among them a payload much longer than a part that looks like more of them.
std::vector<std::byte> forged(uint64_t stray)
{
  tav::Writer inner;
  {
    tav::Group group = inner.group(TAV_ELM_CMN_SYSTEM);
    addMany(group, 4000);
  }
  inner.finish();
  std::vector<std::byte> looks(stray, std::byte{7});
  looks.insert(looks.end(), inner.bytes().begin() + 16, inner.bytes().end()); // without the group's header
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    addMany(root, 600);
    root.add(TAV_ELM_CMN_HOST_NAME, std::span<const std::byte>(looks));
    addMany(root, 600);
  }
  writer.finish();
  return {writer.bytes().begin(), writer.bytes().end()};
}

TEST(IndexOf, FindsOutSeamsThatStandInAPayload)
{
  constexpr uint64_t part = 2000;
  for (const uint64_t stray : std::initializer_list<uint64_t>{0, 1, 5, 8})
  {
    const std::vector<std::byte> bytes = forged(stray);
    const uint64_t payload = 16 + 600 * (16 + 4 + 16) + 200 * 3 + 400 * 2 + 16;
    const uint64_t end = bytes.size() - (payload - 16);
    tav::inspect::ByteSource source("x", std::span(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size()));
    const std::vector<tav::inspect::Part> parts = plan(source, tav::inspect::Form{}, {.targetBytes = part});
    EXPECT_TRUE(std::any_of(parts.begin(), parts.end(), [&](const tav::inspect::Part& one) {
      return one.offset > payload && one.offset < end;
    })) << "nothing was forged";
    const tav::Reader reader(bytes);
    expectSame(reader.root(), part, "stray " + std::to_string(stray));
  }
}

TEST(IndexOf, CutsALongGroupAndManyGroups)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint32_t i = 0; i < 200'000; ++i)
    {
      root.add(static_cast<uint16_t>(1000 + i % 70), i);
    }
    for (uint32_t i = 0; i < 40'000; ++i)
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_HOST_NAME, std::to_string(i));
      host.add(TAV_ELM_CMN_CPU_ONLINE, i);
    }
  }
  writer.finish();
  const tav::Reader reader(writer.bytes());
  const tav::Index index = indexOf(reader.root(), {.threads = kThreads});
  EXPECT_EQ(index.size(), 320'000U);
  EXPECT_EQ(index.find("host[39999]/hostName")->as<std::string>(), "39998");
  EXPECT_EQ(index.find("#1069[2800]")->as<uint32_t>(), 195'999U);
  expectSame(reader.root(), 0, "long");
}

TEST(IndexOf, ThrowsWhatAnIndexThrows)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint32_t i = 0; i < 100; ++i)
    {
      root.add(TAV_ELM_CMN_CPU_ONLINE, i);
    }
  }
  writer.finish();
  std::vector<std::byte> bytes(writer.bytes().begin(), writer.bytes().end());
  bytes[16 + 90 * 20 + 1] = std::byte{0xFF}; // the size of a node
  const tav::Reader reader(bytes);
  const auto told = [](const auto& make) {
    try
    {
      make();
    }
    catch (const std::system_error& error)
    {
      return std::string(error.what());
    }
    return std::string();
  };
  const tav::Node root = reader.root();
  EXPECT_NE(told([&] { const tav::Index index(root); }), "");
  EXPECT_EQ(told([&] { (void)indexOf(root, {.threads = kThreads, .partBytes = 100}); }),
            told([&] { const tav::Index index(root); }));
}

TEST(IndexOf, OfAFileThroughARingIsMadeByOneThread)
{
  const test::Tree tree = test::randomTree(3, {.depth = 5, .width = 9});
  const Bytes bytes = test::bytesOfTree(tree);
  tav::StreamOptions options = test::layerOptions(tree.form);
  options.ringBytes = 256;
  test::VectorStorage storage(64, bytes, test::VectorStorage::kReadOnly);
  const tav::Reader reader(storage, options);
  expectSame(reader.root(), 40, "ring");
}

} // namespace
