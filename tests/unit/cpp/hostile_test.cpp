#include <memory>
#include <random>
#include <vector>

#include "cpp/layer.h"

using namespace test;

// Whatever the bytes are, in memory, mapped or behind a ring: walks end, nothing outside the block is read (the block
// ends with its last byte, and the address sanitizer watches), and failures are codes of the library.

namespace
{

Bytes sample()
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    for (uint8_t i = 0; i < 4; ++i)
    {
      const auto children = i % 2 == 0 ? tav::Width::bits32 : tav::Width::bits64;
      tav::Group host = root.group(TAV_ELM_CMN_HOST, {.children = children, .eyeSize = i != 1});
      host.add(TAV_ELM_CMN_HOST_NAME, "ada", {.eyeSize = true});
      host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
      tav::Group os = host.group(TAV_ELM_CMN_OS, {.eyeSize = true});
      os.add(TAV_ELM_CMN_OS_NAME, tav::Utf8{"x"});
    }
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

/// Sums up what a node says, so that every byte of its payload is read.
uint64_t look(const tav::Node& node)
{
  std::error_code ec;
  uint64_t sum = node.as<std::string>(ec).size() + node.asNumber<uint64_t>(ec) + node.tag().size();
  for (const std::byte byte : node.payload(ec))
  {
    sum += static_cast<uint8_t>(byte);
  }
  return sum;
}

/// Visits everything that can be visited; returns how many nodes that were.
uint64_t visitAll(const tav::Reader& reader, uint64_t size)
{
  uint64_t visits = 0;
  std::error_code ec;
  const tav::Node root = reader.root(ec);
  if (ec)
  {
    return 0;
  }
  for (const tav::Node& node : root.descendants(ec, tav::EndElements::show))
  {
    static_cast<void>(look(node));
    EXPECT_LE(++visits, size / 8);
    uint64_t back = 0;
    for (auto previous = node.previous(ec); previous; previous = previous->previous(ec))
    {
      static_cast<void>(look(*previous));
      EXPECT_LE(++back, size / 8);
    }
  }
  for (const tav::Node& child : root.children(ec))
  {
    EXPECT_LE(child.offset(), size);
  }
  static_cast<void>(reader.all("*/*/*", ec));
  static_cast<void>(reader.endingAfter(size / 2, ec));
  return visits;
}

void visitEveryWay(const Bytes& stream)
{
  const auto exact = std::make_unique<std::byte[]>(stream.size()); // ends with the block
  std::copy_n(std::as_bytes(std::span(stream)).begin(), stream.size(), exact.get());
  const tav::Reader direct(std::span<const std::byte>(exact.get(), stream.size()));
  const uint64_t visits = visitAll(direct, stream.size());
  const StreamFile file(stream);
  if (mapsFiles())
  {
    EXPECT_EQ(visitAll(tav::Reader(file.path(), {.access = tav::Access::mapped}), stream.size()), visits);
  }
  VectorStorage storage(0x1000, stream, VectorStorage::kReadOnly);
  const tav::Reader buffered(storage, {.ringBytes = 0x1000});
  visitAll(buffered, stream.size());
}

/// Of the first element's header, behind the root's.
constexpr size_t kHighByteOfSize = 16 + (kBigEndianHost ? 0 : 7);

} // namespace

TEST(LayerHostile, SoundStreamIsVisitedWhole)
{
  const Bytes stream = sample();
  const tav::Reader reader(spanOf(stream));
  EXPECT_EQ(visitAll(reader, stream.size()), 26U) << "20 nodes and 6 end elements";
}

TEST(LayerHostile, EveryTruncationEnds)
{
  const Bytes stream = sample();
  for (size_t length = 1; length < stream.size(); ++length)
  {
    visitEveryWay(Bytes(stream.begin(), stream.begin() + static_cast<ptrdiff_t>(length)));
  }
}

TEST(LayerHostile, EveryByteSetToExtremesEnds)
{
  const Bytes stream = sample();
  for (size_t at = 0; at < stream.size(); ++at)
  {
    for (const uint8_t value : {uint8_t{0}, uint8_t{1}, uint8_t{2}, uint8_t{0x7F}, uint8_t{0xFF}})
    {
      Bytes damaged = stream;
      damaged[at] = value;
      visitEveryWay(damaged);
    }
  }
}

TEST(LayerHostile, RandomDamageEnds)
{
  std::mt19937 random(20240607);
  const Bytes stream = sample();
  for (int round = 0; round < 500; ++round)
  {
    Bytes damaged = stream;
    for (unsigned i = 0; i < 1 + random() % 8; ++i)
    {
      damaged[random() % damaged.size()] = static_cast<uint8_t>(random());
    }
    visitEveryWay(damaged);
  }
}

TEST(LayerHostile, GroupOfA32BitHeaderWithAHugeSizeHasNoPayload)
{
  // Over memory a 32-bit header of type 2 comes with a payload pointer, and its size is not checked against the block.
  const Bytes stream = ByteRows().h64(8, 0, TAV_TYPE_HEADER32, TAV_ELM_CMN_SYSTEM).h32(0x7FFFFFFF, 2, 9).bytes;
  const tav::Reader reader(spanOf(stream));
  const tav::Node node = reader.at(16, tav::Width::bits32);
  EXPECT_TRUE(node.isGroup());
  EXPECT_TRUE(node.payload().empty());
  const tav::OwnedNode copy = node.copy();
  EXPECT_TRUE(copy.payload().empty());
}

TEST(LayerHostile, OpenGroupsThatLeadBackEndTheWalk)
{
  // Two open groups that end at the same pair: the sibling of the inner one would be found before itself.
  ByteRows rows;
  rows.h64(TAV_SIZE_UNKNOWN, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  rows.h64(TAV_SIZE_UNKNOWN, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  rows.h64(0, 0, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME);
  rows.end64(48 - 16 + 16).end64(32).end64(200);
  visitEveryWay(rows.bytes);
}

TEST(LayerHostile, PathThroughOpenGroupsThatOverlapIsNotSearchedOverAndOver)
{
  // What follows each group is its second child and its sibling: there are 2^40 ways.
  ByteRows rows;
  std::string path;
  for (int i = 0; i < 80; ++i)
  {
    rows.h64(TAV_SIZE_UNKNOWN, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST)
        .h64(16, 0, TAV_TYPE_BINARY, 7)
        .pair(32);
    path += i % 2 == 0 ? "/#" + std::to_string(TAV_ELM_CMN_HOST) : "";
  }
  rows.h64(0, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER);
  const tav::Reader reader(spanOf(rows.bytes));
  std::error_code ec;
  EXPECT_TRUE(reader.root().all(path + "/8", ec).empty());
  EXPECT_EQ(tav::codeOf(ec), TAV_RC_OUTSIDE_PARENT);
}

TEST(LayerHostile, ErrorCodeTellsWhyAWalkEnded)
{
  Bytes stream = sample();
  stream[kHighByteOfSize] = 0x7F; // the first host's size leads far past the stream
  const tav::Reader reader(spanOf(stream));
  EXPECT_EQ(thrownBy([&] {
              for ([[maybe_unused]] const tav::Node& node : reader.root().children())
              {
              }
            }),
            TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(givenBy([&](std::error_code& ec) {
              uint64_t visits = 0;
              for ([[maybe_unused]] const tav::Node& node : reader.root().children(ec))
              {
                ++visits;
              }
              EXPECT_EQ(visits, 1U);
            }),
            TAV_RC_OUTSIDE_PARENT);
  EXPECT_NE(thrownBy([&] { reader.validate(); }), TAV_RC_OK);
  EXPECT_NE(givenBy([&](std::error_code& ec) { reader.validate(ec); }), TAV_RC_OK);
}

TEST(LayerHostile, ThrowingWalkIsOverAfterwards)
{
  Bytes stream = sample();
  stream[kHighByteOfSize] = 0x7F;
  const tav::Reader reader(spanOf(stream));
  auto range = reader.root().descendants();
  uint64_t visits = 0;
  EXPECT_EQ(thrownBy([&] {
              for ([[maybe_unused]] const tav::Node& node : range)
              {
                ++visits;
              }
            }),
            TAV_RC_OUTSIDE_PARENT);
  EXPECT_TRUE(range.begin() == range.end());
}
