/// What finding the siblings of open groups reads, and what is remembered from one step to the next.
#include <cstdint>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "support/failingNew.h"
#include "support/hostileFamilies.h"
#include "support/plainSteps.h"
#include "support/reading.h"
#include "support/streams.h"

namespace
{

using namespace test;

const HostileFamily& familyOf(const std::string& name)
{
  for (const HostileFamily& family : hostileFamilies())
  {
    if (name == family.name)
    {
      return family;
    }
  }
  throw std::runtime_error("no such family: " + name);
}

Form ringOf(uint64_t pages)
{
  Form form;
  form.buffered = true;
  form.pageBytes = 0x1000;
  form.ringBytes = pages * form.pageBytes;
  return form;
}

class RingReads : public testing::TestWithParam<uint64_t>
{
protected:
  static constexpr uint64_t kLength = 0x40000;

  /// Bytes that validating a member of a family reads from the storage, for each byte of it.
  uint64_t timesRead(const char* family)
  {
    StreamReader reader(hostileStream(familyOf(family), kLength, false), ringOf(GetParam()));
    TAVHeader root = headerAt(reader.handle(), 0);
    tavValidateHierarchy(0, reader.handle(), &root);
    return reader.vectorStorage().bytesRead / kLength;
  }
};

TEST_P(RingReads, PairsThatLeadFarBackDoNotMoveTheRing)
{
  EXPECT_LE(timesRead("pairsToTheStart"), 4U);
  EXPECT_LE(timesRead("pairsToTheStartOfThree"), 4U);
}

TEST_P(RingReads, GroupsInEachOtherAreScannedTogether)
{
  EXPECT_LE(timesRead("nestedAroundFiller"), 24U);
}

INSTANTIATE_TEST_SUITE_P(Pages, RingReads, testing::Values(1, 2, 10));

/// Steps from group to group through open groups in each other: root, and two groups whose ends are behind them.
class Remembered : public testing::TestWithParam<bool>
{
protected:
  Remembered()
  {
    HostileRows rows(0x1000, false);
    rows.open(1);
    rows.open(2);
    rows.open(3);
    rows.marker();
    rows.endOf(32);
    behindInner = rows.at();
    rows.marker();
    endOfOuter = rows.at() + 16;
    rows.endOf(16);
    behindOuter = rows.at();
    rows.marker().fill(32);
    bytes = rows.bytes;
    form = ringOf(1);
    form.buffered = GetParam();
  }

  Bytes bytes;
  Form form;
  uint64_t behindInner = 0;
  uint64_t endOfOuter = 0;
  uint64_t behindOuter = 0;
  TAVHeader root = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 1);
  TAVHeader outer = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 2, TAV_INFO_EYE_SIZE, 16);
  TAVHeader inner = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 3, TAV_INFO_EYE_SIZE, 32);
};

TEST_P(Remembered, StepsAnswerTheSameAgain)
{
  StreamReader reader(bytes, form);
  TAVHeaderData out{};
  for (int times = 0; times < 2; ++times)
  {
    ASSERT_EQ(tavGetNextChild(0, reader.handle(), &outer, &inner, &out), TAV_RC_OK);
    EXPECT_EQ(out.header.nodeOffset, behindInner);
    ASSERT_EQ(tavGetNextChild(0, reader.handle(), &root, &outer, &out), TAV_RC_OK);
    EXPECT_EQ(out.header.nodeOffset, behindOuter);
  }
}

TEST_P(Remembered, WithoutMemoryTheAnswerIsTheSame)
{
  StreamReader reader(bytes, form);
  TAVHeaderData out{};
  for (uint64_t nth = 1; nth < 16; ++nth)
  {
    const allocations::FailNth fails(nth);
    TAVHeaderData first{};
    EXPECT_EQ(tavGetNextChild(0, reader.handle(), nullptr, nullptr, &first), TAV_RC_OK) << "forgets";
    EXPECT_EQ(tavGetNextChild(0, reader.handle(), &outer, &inner, &out), TAV_RC_OK) << nth;
    EXPECT_EQ(out.header.nodeOffset, behindInner);
    EXPECT_EQ(tavGetNextChild(0, reader.handle(), &root, &outer, &out), TAV_RC_OK);
    EXPECT_EQ(out.header.nodeOffset, behindOuter);
  }
}

TEST_P(Remembered, AWalkEndsAsStepsDoWhereNoNodeIsReadableBehindAPair)
{
  bytes.resize(behindOuter);
  for (int i = 0; i < 3; ++i) // eye catchers, and nodes that go on behind the stream
  {
    const Bytes more = ByteRows().h64(0x10000, 0, TAV_TYPE_BINARY, 7).pair(8).bytes;
    bytes.insert(bytes.end(), more.begin(), more.end());
  }
  StreamReader reader(bytes, form);
  TAVHeaderData out{};
  ASSERT_EQ(tavGetNextChild(0, reader.handle(), &root, &outer, &out), TAV_RC_NOT_FOUND);
  EXPECT_EQ(tavValidateHierarchy(0, reader.handle(), &root), TAV_RC_NOT_FOUND);
  EXPECT_EQ(tavGetNextChild(0, reader.handle(), &root, &outer, &out), TAV_RC_NOT_FOUND);
}

INSTANTIATE_TEST_SUITE_P(Access, Remembered, testing::Bool(),
                         [](const auto& access) { return access.param ? "Buffered" : "Direct"; });

class ChangingMemory : public Remembered
{
protected:
  void put(uint64_t at, const Bytes& more)
  {
    std::copy(more.begin(), more.end(), block_.begin() + static_cast<ptrdiff_t>(at));
  }
  uint32_t next(TAVHeader* parent, TAVHeader* reference)
  {
    return tavGetNextChild(0, handle_.get(), parent, reference, &out);
  }

  TAVHeaderData out{};

private:
  Bytes block_ = bytes;
  TAVSSMemory memory_{block_.data(), block_.size()};
  Handle handle_{memory_, TAV_OPT_READ, form};
};

TEST_P(ChangingMemory, APairThatIsThereNoLongerIsNotTaken)
{
  ASSERT_EQ(next(&root, &outer), TAV_RC_OK);
  put(endOfOuter, Bytes(8));
  EXPECT_EQ(next(&root, &outer), TAV_RC_NOT_FOUND);
}

TEST_P(ChangingMemory, APairThatComesLaterIsFound)
{
  const auto first = bytes.begin() + static_cast<ptrdiff_t>(endOfOuter);
  const Bytes pair(first, first + 16);
  put(endOfOuter, Bytes(16));
  ASSERT_EQ(next(&root, &outer), TAV_RC_NOT_FOUND);
  put(endOfOuter, pair);
  ASSERT_EQ(next(&root, &outer), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, behindOuter);
}

TEST_P(ChangingMemory, AWalkThatBeginsAnewKnowsNothingFromBefore)
{
  ASSERT_EQ(next(&root, &outer), TAV_RC_OK);
  put(48, ByteRows().pair(48 - 16).bytes); // an earlier pair of the outer group
  EXPECT_EQ(next(nullptr, nullptr), TAV_RC_OK);
  ASSERT_EQ(next(&root, &outer), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, 64U);
}

INSTANTIATE_TEST_SUITE_P(Direct, ChangingMemory, testing::Values(false));

} // namespace
