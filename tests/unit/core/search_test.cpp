/// Looking for an element without the operations: how far the nodes of a level are passed, and where that ends.
#include <cstring>
#include <vector>

#include <gtest/gtest.h>

#include "core/plainNodes.h"
#include "support/reading.h"
#include "support/streams.h"

namespace
{

using namespace test;
using namespace tav::core;

constexpr uint16_t kRoot = 1000;
constexpr uint16_t kOther = 1001;
constexpr uint16_t kWanted = 1002;
constexpr uint64_t kFirst = 16; ///< the first child's offset
constexpr uint64_t kBlock = 512;

/// A root with nodes of 20 bytes, and a group among them, in a block that goes on behind them.
class FastSearch : public testing::Test
{
protected:
  FastSearch()
  {
    StreamWriter writer;
    writer.add(group64(kRoot));
    writer.add(u32(kOther, 1));
    writer.add(group64(kOther));
    writer.add(u32(kOther, 2));
    writer.close();
    writer.add(u32(kOther, 3));
    writer.add(u32(kWanted, 4));
    writer.close();
    bytes_ = writer.bytes();
    bytes_.resize(kBlock);
    handle_.options = TAV_OPT_READ | TAV_OPT_DIRECT;
    handle_.pDirectData = bytes_.data();
    handle_.directDataSize = bytes_.size();
  }

  [[nodiscard]] TAVHeader headerAt(uint64_t offset) const
  {
    TAVHeader header{};
    std::memcpy(&header.hdr64, bytes_.data() + offset, sizeof header.hdr64);
    header.hdrType = TAV_HDR_64;
    header.nodeOffset = offset;
    return header;
  }
  [[nodiscard]] TAVHeader root() const { return headerAt(0); }
  [[nodiscard]] BlockBytes<HostForm> block() const { return BlockBytes<HostForm>(handle_); }
  [[nodiscard]] BlockLevel level() const { return {block(), levelBelowClosed(nodeOf(root())).end}; }

  template<class Word>
  void put(uint64_t offset, Word word)
  {
    std::memcpy(bytes_.data() + offset, &word, sizeof word);
  }

  /// Where passOthers ends from the first child on, and the last node that it has passed.
  struct Passed
  {
    uint64_t last;
    uint64_t end;

    bool operator==(const Passed&) const = default;
  };
  static constexpr uint64_t kNone = ~uint64_t{0};

  Passed passed(bool overGroups)
  {
    const BlockLevel places = level();
    uint8_t* spot = places.at(kFirst);
    const uint8_t* const last = passOthers(places, spot, kWanted, overGroups);
    const uint64_t at = last == nullptr ? kNone : static_cast<uint64_t>(last - places.base);
    return {at, static_cast<uint64_t>(spot - places.base)};
  }

  /// The offset of the child that findChild hands out, or none.
  uint64_t found(uint16_t elm)
  {
    Untouched out;
    const bool isFound = findChild(block(), handle_, root(), elm, out.data);
    EXPECT_EQ(out.isUntouched(), !isFound);
    return isFound ? out.data.header.nodeOffset : kNone;
  }

  static constexpr uint64_t kGroup = kFirst + 20;
  static constexpr uint64_t kThird = kGroup + 16 + 20;
  static constexpr uint64_t kLast = kThird + 20;

  Bytes bytes_;
  TAVHandle handle_{};
};

TEST_F(FastSearch, PassesAllThatAreOthers)
{
  EXPECT_EQ(passed(true), (Passed{kThird, kLast}));
  EXPECT_EQ(passed(false), (Passed{kFirst, kGroup})) << "a group has to be looked at";
}

TEST_F(FastSearch, PassesAGroupOf32BitChildrenToo)
{
  put(kGroup + offsetof(TAVHeader64, type), TAV_TYPE_HEADER32);
  EXPECT_EQ(passed(true), (Passed{kThird, kLast}));
  EXPECT_EQ(passed(false), (Passed{kFirst, kGroup}));
}

TEST_F(FastSearch, PassesDataOfTheLeastTypeWithoutGroups)
{
  put(kFirst + offsetof(TAVHeader64, type), uint16_t{TAV_TYPE_HEADER64 + 1});
  EXPECT_EQ(passed(false), (Passed{kFirst, kGroup}));
}

TEST_F(FastSearch, PassesNothingWhereTheFirstIsWanted)
{
  put(kFirst + offsetof(TAVHeader64, elm), kWanted);
  EXPECT_EQ(passed(true), (Passed{kNone, kFirst}));
}

TEST_F(FastSearch, StopsAtWhatIsNoNode)
{
  put(kThird + offsetof(TAVHeader64, type), uint16_t{0});
  EXPECT_EQ(passed(true), (Passed{kGroup, kThird}));
}

TEST_F(FastSearch, StopsAtANodeWhoseSiblingIsNotRightBehind)
{
  for (const uint32_t info : {TAV_INFO_ALIGNED8, TAV_INFO_EYE_SIZE})
  {
    put(kThird + offsetof(TAVHeader64, info), info);
    EXPECT_EQ(passed(true), (Passed{kGroup, kThird}));
  }
  put(kThird + offsetof(TAVHeader64, info), uint32_t{0});
  put(kThird + offsetof(TAVHeader64, elm), TAV_ELM_CMN_END_HDR_MARKER);
  EXPECT_EQ(passed(true), (Passed{kGroup, kThird}));
}

TEST_F(FastSearch, StopsAtANodeThatIsNotWholeInTheBlock)
{
  put(kThird, kBlock - kThird - 16); // up to the block's last byte
  EXPECT_EQ(passed(true).last, kThird);
  put(kThird, kBlock - kThird - 15);
  EXPECT_EQ(passed(true), (Passed{kGroup, kThird}));
}

TEST_F(FastSearch, AsksOfEachWhatVisitSays)
{
  const BlockLevel places = level();
  uint8_t* spot = places.at(kFirst);
  std::vector<uint64_t> seen;
  const auto isOther = [](const NodeFound<true>&) { return true; };
  const auto visit = [&](const NodeFound<true>& node) {
    seen.push_back(node.offset());
    return seen.size() < 3;
  };
  const uint8_t* const last = passNodes(places, spot, 0, isOther, visit);
  EXPECT_EQ(seen, (std::vector<uint64_t>{kFirst, kGroup, kThird}));
  EXPECT_EQ(last, places.base + kGroup);
  EXPECT_EQ(spot, places.base + kThird);
}

TEST_F(FastSearch, FindsAChildWhereverItIs)
{
  EXPECT_EQ(found(kWanted), kLast);
  put(kFirst + offsetof(TAVHeader64, elm), kWanted);
  EXPECT_EQ(found(kWanted), kFirst);
  EXPECT_EQ(found(kOther), kGroup);
}

TEST_F(FastSearch, FindsAGroupAndWhatHasNoData)
{
  put(kGroup + offsetof(TAVHeader64, elm), kWanted);
  EXPECT_EQ(found(kWanted), kGroup);
  put(kGroup + offsetof(TAVHeader64, elm), kOther);
  put(kLast, uint64_t{0});
  EXPECT_EQ(found(kWanted), kLast);
}

/// A group is found though its content is not there; its header is all that is handed out.
TEST_F(FastSearch, FindsAGroupWhoseContentIsNotThere)
{
  put(kLast + offsetof(TAVHeader64, type), TAV_TYPE_HEADER64);
  put(kLast, uint64_t{5000});
  EXPECT_EQ(found(kWanted), kLast);
  put(kLast + offsetof(TAVHeader64, type), TAV_TYPE_HEADER32);
  EXPECT_EQ(found(kWanted), kLast);
}

TEST_F(FastSearch, SaysNothingOfAChildThatNeedsACloserLook)
{
  EXPECT_EQ(found(kWanted + 1), kNone) << "the level's end";
  put(kLast, kBlock - kLast - 16);
  EXPECT_EQ(found(kWanted), kLast) << "up to the block's last byte";
  put(kLast, kBlock - kLast - 15);
  EXPECT_EQ(found(kWanted), kNone) << "not all of it is there";
  put(kLast, uint64_t{4});
  put(kLast + offsetof(TAVHeader64, type), uint16_t{0});
  EXPECT_EQ(found(kWanted), kNone) << "no node";
  put(kLast + offsetof(TAVHeader64, type), TAV_TYPE_UINT32);
  put(kLast + offsetof(TAVHeader64, info), TAV_INFO_EYE_SIZE);
  EXPECT_EQ(found(kWanted), kNone) << "a pair";
  put(kLast + offsetof(TAVHeader64, info), uint32_t{0});
  put(kThird + offsetof(TAVHeader64, info), TAV_INFO_EYE_SIZE);
  EXPECT_EQ(found(kWanted), kNone) << "a pair before it";
}

TEST_F(FastSearch, SaysNothingBelowAGroupOfAnotherKind)
{
  TAVHeader parent = root();
  Untouched out;
  parent.hdr64.type = TAV_TYPE_HEADER32;
  EXPECT_FALSE(findChild(block(), handle_, parent, kWanted, out.data));
  parent = root();
  parent.hdr64.size = TAV_SIZE_UNKNOWN; // where it ends passes 64 bits
  EXPECT_FALSE(findChild(block(), handle_, parent, kWanted, out.data));
  EXPECT_TRUE(out.isUntouched());
}

/// The nodes that walks of the library pass in one go.
class Plain : public FastSearch
{
protected:
  /// The offset of the last node that is passed behind one, or from the level's start.
  uint64_t behindOf(bool first, Node node)
  {
    const PlainNodes plain(handle_, levelBelowClosed(nodeOf(root())));
    const auto pass = [](const BlockLevel& places, uint8_t*& spot) { return passOthers(places, spot, kWanted, true); };
    const bool any = plain.behind(first, node, pass);
    if (any)
    {
      const TAVHeader there = headerAt(node.offset());
      EXPECT_TRUE(node.wide());
      EXPECT_EQ(node.elm(), there.hdr64.elm);
      EXPECT_EQ(node.size(), there.hdr64.size);
    }
    return any ? node.offset() : kNone;
  }
};

TEST_F(Plain, NodesArePassedFromTheStartOrBehindOne)
{
  const Node third = nodeOf(headerAt(kThird));
  EXPECT_EQ(behindOf(true, Node{}), kThird);
  EXPECT_EQ(behindOf(false, nodeOf(headerAt(kFirst))), kThird);
  EXPECT_EQ(behindOf(false, third), kNone) << "the wanted one is behind it";
}

TEST_F(Plain, NodesAreNotPassedBehindOneOfAnotherForm)
{
  Node node = nodeOf(headerAt(kFirst));
  node.is64 = false;
  EXPECT_EQ(behindOf(false, node), kNone);
}

TEST_F(Plain, NodesAreThoseOfAStreamInHostOrder)
{
  const auto passesAny = [&](const Level& one) {
    Node node{};
    const auto pass = [](const BlockLevel& places, uint8_t*& spot) { return passOthers(places, spot, kWanted, true); };
    return PlainNodes(handle_, one).behind(true, node, pass);
  };
  const Level level = levelBelowClosed(nodeOf(root()));
  EXPECT_TRUE(passesAny(level));
  EXPECT_FALSE(passesAny({level.start, level.end, false, true})) << "of narrow children";
  EXPECT_FALSE(passesAny({level.start, level.end, true, false})) << "past 64 bits";
  handle_.swapBytes = 1;
  EXPECT_FALSE(passesAny(level));
  handle_.swapBytes = 0;
  handle_.alignMode = 1;
  EXPECT_FALSE(passesAny(level));
  handle_.alignMode = 0;
}

} // namespace
