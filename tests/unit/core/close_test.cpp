/// Closing a group by the fast way, without the operation that follows it.
#include <array>
#include <cstring>

#include <gtest/gtest.h>

#include "core/close.h"
#include "support/elements.h"

namespace
{

using namespace test;
using namespace tav::core;

/// A handle that writes into a block of 64 bytes, with one open group.
class FastClose : public testing::Test
{
protected:
  FastClose()
      : bytes_(64, 0xEE)
  {
    stack_.count = 1;
    handle_.options = TAV_OPT_WRITE | TAV_OPT_DIRECT;
    handle_.pDirectData = bytes_.data();
    handle_.directDataSize = bytes_.size();
    handle_.pHdrStack = &stack_;
    handle_.streamBytes = 50;
    open(TAV_HDR_64, 8);
  }

  void open(uint16_t hdrType, uint64_t offset)
  {
    TAVHeader& group = stack_.pEntries[0];
    group = {};
    if (hdrType == TAV_HDR_64)
    {
      group.hdr64 = {TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, 1000};
    }
    else
    {
      group.hdr32 = {~uint32_t{0}, TAV_TYPE_HEADER32, 1000};
    }
    group.hdrType = hdrType;
    group.nodeOffset = offset;
  }

  template<class Form>
  uint32_t close()
  {
    return closeGroup<BlockBytes<Form>>(handle_);
  }

  void expectNotHere()
  {
    const Bytes before = bytes_;
    const uint32_t count = stack_.count;
    EXPECT_EQ(close<AnyForm>(), kNotHere);
    EXPECT_EQ(bytes_, before);
    EXPECT_EQ(stack_.count, count);
  }

  template<class Word>
  [[nodiscard]] Word at(size_t offset) const
  {
    Word word = 0;
    std::memcpy(&word, bytes_.data() + offset, sizeof word);
    return word;
  }

  Bytes bytes_;
  TAVHdrStack stack_;
  TAVHandle handle_{};
};

TEST_F(FastClose, WritesTheSizeOfWhatIsBehindTheHeader)
{
  ASSERT_EQ(close<HostForm>(), TAV_RC_OK);
  EXPECT_EQ(stack_.count, 0U);
  EXPECT_EQ(stack_.pEntries[0].hdr64.size, 50U - 8 - 16);
  EXPECT_EQ(at<uint64_t>(8), 50U - 8 - 16);
  EXPECT_EQ(at<uint8_t>(7), 0xEE);
  EXPECT_EQ(at<uint8_t>(16), 0xEE) << "nothing but the size";
}

TEST_F(FastClose, WritesANarrowSize)
{
  open(TAV_HDR_32, 8);
  ASSERT_EQ(close<AnyForm>(), TAV_RC_OK);
  EXPECT_EQ(stack_.pEntries[0].hdr32.size, 50U - 8 - 8);
  EXPECT_EQ(at<uint32_t>(8), 50U - 8 - 8);
  EXPECT_EQ(at<uint8_t>(7), 0xEE);
  EXPECT_EQ(at<uint8_t>(12), 0xEE);
}

TEST_F(FastClose, WritesInTheOtherByteOrder)
{
  handle_.swapBytes = 1;
  ASSERT_EQ(close<AnyForm>(), TAV_RC_OK);
  EXPECT_EQ(at<uint64_t>(8), tav::kor::byteswap64(50 - 8 - 16));
  EXPECT_EQ(stack_.pEntries[0].hdr64.size, 50U - 8 - 16) << "the stack's own is the host's";
  std::array<uint8_t, 8> size{};
  EXPECT_EQ(encodeGroupSize(0x01020304, false, true, size.data()), 4U);
  EXPECT_EQ(encodeGroupSize(0x0102030405060708, true, true, size.data()), 8U);
  EXPECT_EQ(encodeGroupSize(7, false, false, size.data()), 4U);
  EXPECT_EQ(encodeGroupSize(7, true, false, size.data()), 8U);
}

/// The size has a place as long as one byte of the block is behind it.
TEST_F(FastClose, NeedsAPlaceForTheSizeAlone)
{
  handle_.streamBytes = 80;
  open(TAV_HDR_64, 55);
  EXPECT_EQ(close<AnyForm>(), TAV_RC_OK);
  stack_.count = 1;
  open(TAV_HDR_64, 56);
  expectNotHere();
  open(TAV_HDR_32, 59);
  EXPECT_EQ(close<AnyForm>(), TAV_RC_OK);
  stack_.count = 1;
  open(TAV_HDR_32, 60);
  expectNotHere();
}

TEST_F(FastClose, LeavesWhatItCannotDoToTheOperation)
{
  stack_.pEntries[0].hdr64.info = TAV_INFO_EYE_SIZE;
  expectNotHere();
  open(77, 8);
  expectNotHere();
  open(TAV_HDR_64, 8);
  handle_.options = TAV_OPT_READ | TAV_OPT_DIRECT;
  expectNotHere();
  handle_.options = TAV_OPT_WRITE;
  expectNotHere();
  handle_.options = TAV_OPT_WRITE | TAV_OPT_DIRECT;
  stack_.count = 0;
  expectNotHere();
  stack_.count = 1;
  handle_.pHdrStack = nullptr;
  EXPECT_EQ(close<AnyForm>(), kNotHere);
}

} // namespace
