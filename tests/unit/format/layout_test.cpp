/// The rules of the layout that hold for headers nobody writes, and for the element that ends a group.
#include <gtest/gtest.h>

#include "tav/layout.hpp"

namespace
{

using namespace tav::layout;

TEST(Layout, AHeaderOfNoKnownFormCountsAsA32BitOneEverywhere)
{
  for (const uint16_t hdrType : {uint16_t{0}, TAV_HDR_32, uint16_t{3}, uint16_t{0xFFFF}})
  {
    TAVHeader header{};
    header.hdr32 = {4, TAV_TYPE_UINT32, 1000};
    header.hdrType = hdrType;
    EXPECT_FALSE(is64(header)) << hdrType;
    EXPECT_EQ(headerLength(hdrType), kHeaderSize32) << hdrType;
    EXPECT_EQ(sizeOf(header), 4U) << hdrType;
    std::array<uint8_t, kHeaderSize64> bytes{};
    EXPECT_EQ(encodeHeader(header, false, bytes.data()), kHeaderSize32) << hdrType;
  }
  EXPECT_EQ(headerLength(TAV_HDR_64), kHeaderSize64);
}

TEST(Layout, AnEndElementSaysWhetherItsStreamIsPadded)
{
  for (const bool aligned : {false, true})
  {
    const TAVHeader wide = endElement(true, aligned);
    EXPECT_TRUE(is64(wide));
    EXPECT_EQ(sizeOf(wide), kEyeSizeLength);
    EXPECT_EQ(infoOf(wide), aligned ? TAV_INFO_ALIGNED8 : 0U);
    EXPECT_EQ(elmOf(wide), TAV_ELM_CMN_END_HDR_EYE_SIZE);
    const TAVHeader narrow = endElement(false, aligned);
    EXPECT_EQ(narrow.hdrType, TAV_HDR_32);
    EXPECT_EQ(sizeOf(narrow), kEyeSizeLength);
    EXPECT_EQ(typeOf(narrow), TAV_TYPE_BINARY);
  }
}

} // namespace
