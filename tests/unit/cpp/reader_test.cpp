#include <array>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <vector>

#include "cpp/layer.h"

using namespace test;

namespace
{

/// system { host { hostName "ada", cpuOnline 8 }, host { hostName "bob", os { osName "x" } }, hostName "loose" }
Bytes sample(const tav::StreamOptions& options = {}, bool pairs = true)
{
  tav::Writer writer(options);
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = pairs});
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST, {.eyeSize = pairs, .infoKey = 5});
      host.add(TAV_ELM_CMN_HOST_NAME, "ada", {.eyeSize = pairs});
      host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8}, {.eyeSize = pairs});
    }
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST, {.eyeSize = pairs});
      host.add(TAV_ELM_CMN_HOST_NAME, "bob", {.eyeSize = pairs});
      tav::Group os = host.group(TAV_ELM_CMN_OS, {.eyeSize = pairs});
      os.add(TAV_ELM_CMN_OS_NAME, "x", {.eyeSize = pairs});
    }
    system.add(TAV_ELM_CMN_HOST_NAME, "loose", {.eyeSize = pairs});
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

std::string tagsOf(auto&& range)
{
  std::string tags;
  for (const tav::Node& node : range)
  {
    tags += std::string(node.tag()) + " ";
  }
  return tags;
}

std::string printed(const tav::Reader& reader, const tav::PrintOptions& options, const tav::Node& node)
{
  CaughtStream stream;
  std::error_code ec;
  const uint64_t characters = reader.print(stream.get(), node, options, ec);
  EXPECT_FALSE(ec) << ec.message();
  const std::string result = stream.text();
  EXPECT_EQ(characters, result.size());
  return result;
}

} // namespace

namespace
{

enum class From : uint8_t
{
  memory,
  ring,
  mapped
};

struct Opening
{
  From from;
  tav::StreamOptions options;
};

std::string nameOf(const Opening& opening)
{
  const std::string from = opening.from == From::memory ? "Direct" : opening.from == From::ring ? "Buffered"
                                                                                                : "Mapped";
  return from + (opening.options.byteOrder == tav::ByteOrder::swapped ? "Swapped" : "") +
         (opening.options.align8 ? "Aligned" : "");
}

} // namespace

/// Walks give the same in memory, through a ring and from a mapped file, in every form.
class LayerReader : public ::testing::TestWithParam<Opening>
{
protected:
  [[nodiscard]] tav::Reader open()
  {
    tav::StreamOptions options = GetParam().options;
    switch (GetParam().from)
    {
    case From::ring: return tav::Reader(storage, options);
    case From::mapped: options.access = tav::Access::mapped; return tav::Reader(file.path(), options);
    default: return tav::Reader(spanOf(stream), options);
    }
  }

  const Bytes stream = sample(GetParam().options);
  const StreamFile file{stream};
  VectorStorage storage{0x1000, stream, VectorStorage::kReadOnly};
  const tav::Reader reader = open();
};

TEST_P(LayerReader, RootIsTheFirstNode)
{
  const tav::Node root = reader.root();
  EXPECT_EQ(root.offset(), 0U);
  EXPECT_EQ(root.elm(), TAV_ELM_CMN_SYSTEM);
  EXPECT_EQ(root.name(), "TAV_ELM_CMN_SYSTEM");
  EXPECT_EQ(root.tag(), "system");
  EXPECT_TRUE(root.isGroup());
  EXPECT_FALSE(root.isOpen());
  EXPECT_EQ(root.width(), tav::Width::bits64);
}

TEST_P(LayerReader, ChildrenAreOneLevel)
{
  EXPECT_EQ(tagsOf(reader.root().children()), "host host hostName ");
}

TEST_P(LayerReader, EndElementsAreShownWhenAskedFor)
{
  uint16_t last = 0;
  for (const tav::Node& child : reader.root().children(tav::EndElements::show))
  {
    last = child.elm();
  }
  EXPECT_EQ(last, TAV_ELM_CMN_END_HDR_EYE_SIZE);
}

TEST_P(LayerReader, DescendantsAreAllOnceInStreamOrder)
{
  EXPECT_EQ(tagsOf(reader.root().descendants()), "host hostName cpuOnline host hostName os osName hostName ");
}

TEST_P(LayerReader, DescendantsKnowTheirDepth)
{
  std::string depths;
  auto range = reader.root().descendants();
  for ([[maybe_unused]] const tav::Node& node : range)
  {
    depths += std::to_string(range.depth());
  }
  EXPECT_EQ(depths, "12212231");
}

TEST_P(LayerReader, SiblingsAreTheNodesBehind)
{
  const tav::Node first = *reader.path("system/host");
  EXPECT_EQ(tagsOf(first.siblings()), "host hostName ");
}

TEST_P(LayerReader, NextLeadsThroughAGroupAndEndsWithIt)
{
  std::string tags;
  for (std::optional<tav::Node> node = reader.path("system/*"); node; node = node->next())
  {
    tags += std::string(node->tag()) + " ";
  }
  EXPECT_EQ(tags, "host host hostName ");
}

TEST_P(LayerReader, RootHasNoSibling)
{
  EXPECT_FALSE(reader.root().next());
  EXPECT_EQ(tagsOf(reader.root().siblings()), "");
}

TEST_P(LayerReader, PreviousLeadsBackByThePairs)
{
  const tav::Node last = *reader.path("system/hostName");
  const std::optional<tav::Node> second = last.previous();
  ASSERT_TRUE(second);
  EXPECT_EQ(second->offset(), reader.path("system/host[2]")->offset());
  const std::optional<tav::Node> first = second->previous();
  ASSERT_TRUE(first);
  EXPECT_EQ(first->infoKey(), 5);
  EXPECT_FALSE(first->previous()) << "the header of the group stands there";
}

TEST_P(LayerReader, PreviousNodeIsStillInItsGroup)
{
  const tav::Node last = *reader.path("system/hostName");
  EXPECT_EQ(last.previous()->next()->offset(), last.offset());
}

TEST_P(LayerReader, NodeEndsBehindAnOffset)
{
  const tav::Node ada = *reader.path("system/host/hostName");
  const std::optional<tav::Node> found = reader.endingAfter(ada.offset() + 5);
  if (GetParam().options.align8)
  {
    EXPECT_FALSE(found) << "a pair does not count the padding before it";
    return;
  }
  ASSERT_TRUE(found);
  EXPECT_EQ(found->offset(), ada.offset());
  EXPECT_EQ(found->as<std::string>(), "ada");
}

TEST_P(LayerReader, NothingEndsBehindTheStream)
{
  EXPECT_FALSE(reader.endingAfter(stream.size() - 8));
}

TEST_P(LayerReader, NodeCanBeReadAtItsOffset)
{
  const tav::Node name = *reader.path("system/host[2]/hostName");
  EXPECT_EQ(reader.at(name.offset()).as<std::string>(), "bob");
}

TEST_P(LayerReader, NodeOfNoKnownGroupHasNoSiblingsToTell)
{
  const tav::Node name = reader.at(reader.path("system/host/hostName")->offset());
  EXPECT_EQ(thrownBy([&] { static_cast<void>(name.next()); }), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(name.next(ec)); }), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { EXPECT_EQ(tagsOf(name.siblings(ec)), ""); }), TAV_RC_NOT_SUPPORTED);
}

TEST_P(LayerReader, ElementsHaveNoChildren)
{
  const tav::Node name = *reader.path("system/hostName");
  EXPECT_EQ(tagsOf(name.children()), "");
  EXPECT_EQ(tagsOf(name.descendants()), "");
}

TEST_P(LayerReader, NodesKeptPastOthersStillGiveTheirValues)
{
  std::vector<tav::Node> nodes;
  for (const tav::Node& node : reader.root().descendants())
  {
    nodes.push_back(node);
  }
  EXPECT_EQ(nodes[1].as<std::string>(), "ada");
  EXPECT_EQ(nodes[4].as<std::string_view>(), "bob");
  EXPECT_EQ(nodes[2].as<uint32_t>(), 8U);
  EXPECT_EQ(nodes[1].payload().size(), 3U);
}

TEST_P(LayerReader, CopyNeedsNoReader)
{
  std::optional<tav::OwnedNode> copy;
  {
    VectorStorage short_lived(0x1000, stream, VectorStorage::kReadOnly);
    const tav::Reader other(short_lived, GetParam().options);
    copy = other.path("system/host/cpuOnline")->copy();
  }
  EXPECT_EQ(copy->as<uint32_t>(), 8U);
  EXPECT_EQ(copy->asNumber<int64_t>(), 8);
  EXPECT_EQ(copy->tag(), "cpuOnline");
  EXPECT_EQ(copy->payload().size(), 4U);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(copy->as<uint16_t>()); }), TAV_RC_NOT_SUPPORTED);
}

TEST_P(LayerReader, ValidStreamIsFoundValid)
{
  EXPECT_NO_THROW(reader.validate());
  EXPECT_EQ(givenBy([&](std::error_code& ec) { reader.validate(ec); }), TAV_RC_OK);
}

TEST_P(LayerReader, PrintsWhatThePlainOperationPrints)
{
  EXPECT_EQ(printed(reader, {.bare = true}, *reader.path("system/host[2]/os/osName")), "x");
  EXPECT_NE(printed(reader, {}, reader.root()).find("TAV_ELM_CMN_CPU_ONLINE"), std::string::npos);
  EXPECT_EQ(printed(reader, {.headers = true, .subtree = false}, reader.root()).find("TAV_ELM_CMN_CPU_ONLINE"),
            std::string::npos);
  EXPECT_NE(printed(reader, {.xml = true}, reader.root()).find("<cpuOnline>"), std::string::npos);
}

TEST_P(LayerReader, PlainOperationsCanBeUsedBeside)
{
  const tav::Node name = *reader.path("system/host/hostName");
  TAVHeaderData data{};
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &data), TAV_RC_OK);
  EXPECT_EQ(name.as<std::string>(), "ada");
}

TEST_P(LayerReader, MovedReaderKeepsItsNodes)
{
  VectorStorage own(0x1000, stream, VectorStorage::kReadOnly);
  tav::Reader first(own, GetParam().options);
  const tav::Node name = *first.path("system/host/hostName");
  const tav::Reader moved = std::move(first);
  EXPECT_EQ(name.as<std::string>(), "ada");
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(first.root(ec)); }), TAV_RC_BAD_PARAM); // NOLINT
  EXPECT_EQ(thrownBy([&] { first.validate(); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { first.print(nullptr, name); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(first.handle(), nullptr);
}

INSTANTIATE_TEST_SUITE_P(
    Forms, LayerReader,
    ::testing::Values(Opening{From::memory, {}}, Opening{From::ring, {.ringBytes = 0x2000}}, Opening{From::mapped, {}},
                      Opening{From::memory, {.byteOrder = tav::ByteOrder::swapped}},
                      Opening{From::ring, {.byteOrder = tav::ByteOrder::swapped, .ringBytes = 0x2000}},
                      Opening{From::mapped, {.byteOrder = tav::ByteOrder::swapped}},
                      Opening{From::memory, {.align8 = true}},
                      Opening{From::ring, {.align8 = true, .ringBytes = 0x2000}},
                      Opening{From::mapped, {.align8 = true}}),
    [](const auto& row) { return nameOf(row.param); });

TEST(LayerRanges, AreInputRangesAndViews)
{
#if defined(__cpp_lib_ranges) || _LIBCPP_VERSION >= 14000 // which says it has none while some are missing
  static_assert(std::ranges::input_range<tav::ChildRange> && std::ranges::view<tav::ChildRange>);
  static_assert(std::ranges::input_range<tav::DescendantRange> && std::ranges::view<tav::DescendantRange>);
  static_assert(std::ranges::contiguous_range<tav::PayloadView>);
#endif
  const Bytes stream = sample();
  const tav::Reader reader(spanOf(stream));
  uint64_t groups = 0;
  for (const tav::Node& node : reader.root().descendants())
  {
    groups += node.isGroup() ? 1 : 0;
  }
  EXPECT_EQ(groups, 3U);
}

TEST(LayerRanges, WithoutPairsNothingLeadsBack)
{
  const Bytes stream = sample({}, false);
  const tav::Reader reader(spanOf(stream));
  EXPECT_FALSE(reader.path("system/hostName")->previous());
  EXPECT_FALSE(reader.endingAfter(0));
}

TEST(LayerReaderOpening, EmptyStreamHasNoRoot)
{
  const tav::Writer writer;
  const tav::Reader reader(writer.bytes());
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.root()); }), TAV_RC_NO_MORE_CHILDREN);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(reader.path("system", ec)); }),
            TAV_RC_NO_MORE_CHILDREN);
}

TEST(LayerReaderOpening, ReaderThatCouldNotOpenAnswersErrors)
{
  const TemporaryPath missing;
  std::error_code ec;
  const tav::Reader reader(missing.path, {}, ec);
  EXPECT_EQ(ec, std::errc::no_such_file_or_directory);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.root()); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.at(0)); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.endingAfter(0)); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.path("system")); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.all("system")); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { reader.validate(); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& error) { reader.print(nullptr, {}, error); }), TAV_RC_BAD_PARAM);
}

TEST(LayerReaderOpening, NodeOfAnotherReaderIsNotPrinted)
{
  const Bytes stream = sample();
  const tav::Reader reader(spanOf(stream));
  const tav::Reader other(spanOf(stream));
  EXPECT_EQ(thrownBy([&] { reader.print(nullptr, other.root()); }), TAV_RC_BAD_PARAM);
}

TEST(LayerNode, NodeOfNoStreamAnswersErrors)
{
  const tav::Node node;
  EXPECT_EQ(tagsOf(node.children()), "");
  EXPECT_EQ(tagsOf(node.descendants()), "");
  EXPECT_EQ(thrownBy([&] { static_cast<void>(node.payload()); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(node.as<uint8_t>()); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(node.previous()); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(node.next()); }), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(thrownBy([&] { static_cast<void>(node.copy()); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(node.copy(ec)); }), TAV_RC_BAD_PARAM);
  EXPECT_FALSE(node.path("host"));
}

TEST(LayerReader, LeavesItsRingWhereItIsWhenAGroupHasNoMoreNodes)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    system.group(TAV_ELM_CMN_HOST).add(TAV_ELM_CMN_HOST_NAME, std::string(500, 'a'));
  }
  writer.finish();
  constexpr uint64_t page = 8;
  VectorStorage storage(page, bytesOf(writer.bytes()), VectorStorage::kReadOnly);
  tav::Reader reader(storage, {.ringBytes = page});
  const tav::Node root = reader.root();
  auto children = root.children();
  auto host = children.begin();
  ASSERT_EQ(host->elm(), TAV_ELM_CMN_HOST);
  const TAVHandle* const handle = reader.handle(); // steps are calls from here on
  const uint64_t before = handle->pCircularBuf->headOffset;
  EXPECT_EQ(++host, children.end());
  EXPECT_EQ(handle->pCircularBuf->headOffset, before);
  EXPECT_EQ(handle->pCircularBuf->empty, 0);
}
