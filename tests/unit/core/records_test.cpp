/// Records whose members are read and written by code that is compiled into programs: where they stand is part of the
/// binary interface, as the exported names are. Moving one is a new TAV_ABI_VERSION.
#include <cstddef>

#include <gtest/gtest.h>

#include "tav/tav.h"

namespace
{

static_assert(offsetof(TAVHeader64, size) == 0 && offsetof(TAVHeader64, info) == 8);
static_assert(offsetof(TAVHeader64, type) == 12 && offsetof(TAVHeader64, elm) == 14);
static_assert(offsetof(TAVHeader32, size) == 0 && offsetof(TAVHeader32, type) == 4 && offsetof(TAVHeader32, elm) == 6);

static_assert(offsetof(TAVHeader, hdr64) == 0 && offsetof(TAVHeader, hdr32) == 0);
static_assert(offsetof(TAVHeader, hdrType) == 16 && offsetof(TAVHeader, nodeOffset) == 24 && sizeof(TAVHeader) == 32);
static_assert(offsetof(TAVHeaderData, header) == 0 && offsetof(TAVHeaderData, pDataBuf) == 32);
static_assert(offsetof(TAVHeaderData, dataBufSize) == 40 && offsetof(TAVHeaderData, dataBufOffset) == 48);
static_assert(sizeof(TAVHeaderData) == 56);

static_assert(offsetof(TAVHandle, curOffset) == 16 && offsetof(TAVHandle, pDirectData) == 24);
static_assert(offsetof(TAVHandle, directDataSize) == 32 && offsetof(TAVHandle, streamBytes) == 40);

// Programs that count on these offsets without a compiler are 64-bit ones; in 32 bits pointers are narrower.
constexpr bool kWide = sizeof(void*) == 8;
static_assert(offsetof(TAVHandle, pCircularBuf) == 48 && offsetof(TAVHandle, pSideStorage) == 48 + sizeof(void*));
static_assert(offsetof(TAVHandle, pHdrStack) == 48 + 2 * sizeof(void*));
static_assert(!kWide || (offsetof(TAVHandle, options) == 72 && offsetof(TAVHandle, alignMode) == 80));
static_assert(offsetof(TAVHandle, swapBytes) == offsetof(TAVHandle, alignMode) + 1);

static_assert(offsetof(TAVHdrStack, pEntries) == 0 && offsetof(TAVHdrStack, capacity) == sizeof(void*));
static_assert(offsetof(TAVHdrStack, count) == sizeof(void*) + 4);

static_assert(offsetof(KORTraceCB, enable) == 12);

/// The ring has private members, too, so that the compiler need not promise its offsets; they are what they are.
TEST(Records, OfTheRingStandWhereProgramsReadThem)
{
  alignas(TAVCircularBuf) static const std::byte room[sizeof(TAVCircularBuf)]{};
  const auto& ring = *reinterpret_cast<const TAVCircularBuf*>(room); // only for its addresses
  const auto at = [&](const auto& member) { return reinterpret_cast<const std::byte*>(&member) - room; };
  EXPECT_EQ(at(ring.pRing), 8);
  EXPECT_EQ(at(ring.ringSize), 16);
  EXPECT_EQ(at(ring.head), 24);
  EXPECT_EQ(at(ring.tail), 32);
  EXPECT_EQ(at(ring.headOffset), 40);
  EXPECT_EQ(at(ring.pageSize), 48);
  EXPECT_EQ(at(ring.pageCount), 56);
  EXPECT_EQ(at(ring.pPageFlags), 64);
  EXPECT_EQ(at(ring.storageWritable), 80);
  EXPECT_EQ(at(ring.empty), 81);
}

} // namespace
