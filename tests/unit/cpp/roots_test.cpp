/// The roots of several streams that stand one behind another.
#include <fstream>
#include <random>

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;

namespace
{

struct Case
{
  tav::ByteOrder order;
  tav::Width root;
  bool file;
};

/// P: byte order x root header x (memory, file)
class LayerRoots : public testing::TestWithParam<Case>
{
protected:
  [[nodiscard]] tav::StreamOptions options() const
  {
    return {.byteOrder = GetParam().order, .root = GetParam().root};
  }

  /// A stream whose root has elements of `payload` bytes in all: sizes with zeros at either end among them.
  [[nodiscard]] Bytes stream(size_t payload, uint16_t elm = TAV_ELM_CMN_SYSTEM) const
  {
    tav::Writer writer(options());
    tav::Group root = writer.group(elm);
    if (payload != 0)
    {
      const std::vector<std::byte> bytes(payload);
      root.add(TAV_ELM_CMN_HOST, std::span(bytes));
    }
    root.close();
    return bytesOf(writer.bytes());
  }

  void add(const Bytes& bytes, size_t zeros = 0)
  {
    content_.insert(content_.end(), bytes.begin(), bytes.end());
    content_.resize(content_.size() + zeros);
  }

  [[nodiscard]] tav::Reader reader()
  {
    if (!GetParam().file)
    {
      return tav::Reader(spanOf(content_), options());
    }
    std::ofstream out(file_.path, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(content_.data()), static_cast<std::streamsize>(content_.size()));
    out.close();
    return tav::Reader(file_.path, options());
  }

  [[nodiscard]] std::vector<uint64_t> offsets()
  {
    std::vector<uint64_t> all;
    const tav::Reader read = reader();
    for (const tav::Node& root : read.roots())
    {
      all.push_back(root.offset());
      EXPECT_EQ(root.elm(), all.size() == 1 ? first_ : TAV_ELM_CMN_SYSTEM);
    }
    return all;
  }

  Bytes content_;
  uint16_t first_ = TAV_ELM_CMN_SYSTEM; ///< the first root's id
  const TemporaryPath file_;
};

INSTANTIATE_TEST_SUITE_P(Forms, LayerRoots,
                         testing::Values(Case{tav::ByteOrder::native, tav::Width::bits64, false},
                                         Case{tav::ByteOrder::native, tav::Width::bits32, true},
                                         Case{tav::ByteOrder::native, tav::Width::bits64, true},
                                         Case{tav::ByteOrder::swapped, tav::Width::bits64, false},
                                         Case{tav::ByteOrder::swapped, tav::Width::bits64, true},
                                         Case{tav::ByteOrder::swapped, tav::Width::bits32, false}));

} // namespace

TEST_P(LayerRoots, OfOneStreamAreItsRoot)
{
  add(stream(3));
  EXPECT_EQ(offsets(), std::vector<uint64_t>{0});
  add({}, 4096);
  EXPECT_EQ(offsets(), std::vector<uint64_t>{0}) << "the zeros of its last page";
}

TEST_P(LayerRoots, OfNothingAreNone)
{
  EXPECT_TRUE(offsets().empty());
  add({}, 100);
  EXPECT_TRUE(offsets().empty());
}

TEST_P(LayerRoots, FollowEachOtherWithAnyNumberOfZerosBetween)
{
  const std::vector<size_t> payloads{1, 0, 2, 240, 256, 65536, 131074 - 16, 131074 - 8, 0, 512};
  for (const size_t zeros : std::initializer_list<size_t>{0, 1, 2, 3, 4, 6, 7, 8, 12, 13, 16, 100, 5000})
  {
    SCOPED_TRACE(zeros);
    content_.clear();
    std::vector<uint64_t> expected;
    for (const size_t payload : payloads)
    {
      expected.push_back(content_.size());
      add(stream(payload), zeros);
    }
    EXPECT_EQ(offsets(), expected);
  }
}

TEST_P(LayerRoots, OfAnySizesFollowEachOtherWithAnyFewZerosBetween)
{
  std::mt19937 random(20'261'123);
  constexpr int kRounds = 60;
  for (int round = 0; round < kRounds; ++round)
  {
    SCOPED_TRACE(round);
    content_.clear();
    std::vector<uint64_t> expected;
    for (int i = 0; i < 4; ++i)
    {
      expected.push_back(content_.size());
      const auto bits = random() % 18;
      const size_t payload = random() % (size_t{1} << bits);
      add(stream(payload), random() % 20);
    }
    EXPECT_EQ(offsets(), expected);
  }
}

/// Ids that are the types of groups: two bytes further on, such a root and the zeros behind it read as an empty group.
TEST_P(LayerRoots, BeginWhereTheirIdIsNotMadeOfZeros)
{
  for (const uint16_t id : {TAV_TYPE_HEADER32, TAV_TYPE_HEADER64})
  {
    for (size_t zeros = 0; zeros < 20; ++zeros)
    {
      SCOPED_TRACE(zeros);
      content_.clear();
      first_ = id;
      add(stream(0, id), zeros);
      const uint64_t second = content_.size();
      add(stream(3));
      EXPECT_EQ(offsets(), (std::vector<uint64_t>{0, second}));
    }
  }
}

TEST_P(LayerRoots, AreWalkedAndReadAsTheFirstIs)
{
  add(stream(3), 50);
  const uint64_t second = content_.size();
  add(stream(5));
  const tav::Reader read = reader();
  std::vector<uint64_t> sizes;
  for (const tav::Node& root : read.roots())
  {
    for (const tav::Node& child : root.children())
    {
      sizes.push_back(child.payload().size());
    }
    EXPECT_EQ(root.next(), std::nullopt) << "a root stands alone";
  }
  EXPECT_EQ(sizes, (std::vector<uint64_t>{3, 5}));
  EXPECT_EQ(read.at(second, GetParam().root).elm(), TAV_ELM_CMN_SYSTEM);
}

TEST_P(LayerRoots, EndWithAFailureWhereSomethingElseStands)
{
  add(stream(3), 20);
  add(Bytes(40, 0x77));
  const tav::Reader read = reader();
  std::error_code ec;
  size_t count = 0;
  for (const tav::Node& root : read.roots(ec))
  {
    count += root.isGroup() ? 1 : 0;
  }
  EXPECT_EQ(count, 1U);
  EXPECT_EQ(tav::codeOf(ec), TAV_RC_BAD_CHILD_HDR);
  EXPECT_EQ(thrownBy([&] {
              for (const tav::Node& root : read.roots())
              {
                count += root.isGroup() ? 1 : 0;
              }
            }),
            TAV_RC_BAD_CHILD_HDR);
}

TEST_P(LayerRoots, EndWithOneThatWasNeverClosed)
{
  add(stream(3));
  tav::Writer writer(options());
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  root.add(TAV_ELM_CMN_HOST_NAME, "ada");
  const uint64_t second = content_.size();
  add(bytesOf(writer.bytes()));
  add(stream(3));
  EXPECT_EQ(offsets(), (std::vector<uint64_t>{0, second}));
}

TEST(LayerRootsOf, AMovedReaderAreRefused)
{
  const Bytes none;
  tav::Reader reader(spanOf(none));
  const tav::Reader taken(std::move(reader));
  EXPECT_EQ(givenBy([&](std::error_code& ec) {
              for (const tav::Node& root : reader.roots(ec)) // NOLINT(bugprone-use-after-move)
              {
                ADD_FAILURE() << root.offset();
              }
            }),
            TAV_RC_BAD_PARAM);
}
