/// Words of headers and of handles: how a step gets at them says the same as their members do.
#include <algorithm>
#include <array>
#include <cstring>
#include <numeric>
#include <vector>

#include <gtest/gtest.h>

#include "core/word.h"
#include "support/streams.h"
#include "tav/core/copySmall.hpp"
#include "tav/core/fastWay.hpp"

namespace
{

using namespace test;
using namespace tav::layout;
using tav::core::HeaderWords;
using tav::core::LibraryWay;
using tav::core::PlainWay;

/// P: how a step is compiled
template<class Way>
class Ways : public testing::Test
{
};
using AllWays = testing::Types<LibraryWay, PlainWay>;
TYPED_TEST_SUITE(Ways, AllWays);

/// How a handle was opened stands in the first 16 bits of its options, and what it may do here in the others.
TYPED_TEST(Ways, KnowAStreamInHostOrderByItsHandle)
{
  constexpr uint64_t kDirect = TAV_OPT_DIRECT;
  static_assert(kDirect > 0xFFFF);
  TAVHandle handle{};
  for (const uint64_t mode : {0U, 1U, 0x8000U, 0xFFFFU})
  {
    handle.options = mode;
    EXPECT_TRUE(TypeParam::isHostWith(handle, 0)) << mode;
    EXPECT_FALSE(TypeParam::isHostWith(handle, kDirect)) << mode;
    handle.options = mode | kDirect;
    EXPECT_TRUE(TypeParam::isHostWith(handle, kDirect)) << mode;
    EXPECT_FALSE(TypeParam::isHostWith(handle, 0)) << mode;
  }
}

TYPED_TEST(Ways, SeeEachOptionBeyondTheFirstAndEachFlag)
{
  constexpr int kKnown = 48; // options above these are not told apart on every machine
  for (int bit = 16; bit < kKnown; ++bit)
  {
    TAVHandle handle{};
    handle.options = uint64_t{1} << bit;
    EXPECT_FALSE(TypeParam::isHostWith(handle, 0)) << bit;
    EXPECT_TRUE(TypeParam::isHostWith(handle, handle.options)) << bit;
  }
  TAVHandle swapped{};
  swapped.swapBytes = 1;
  EXPECT_FALSE(TypeParam::isHostWith(swapped, 0));
  TAVHandle aligned{};
  aligned.alignMode = 1;
  EXPECT_FALSE(TypeParam::isHostWith(aligned, 0));
}

template<class Way>
void expectCopies()
{
  const TAVHeader64 wide{0x0102030405060708, 0x11121314, 0x2122, 0x3132};
  const TAVHeader32 narrow{0x41424344, 0x5152, 0x6162};
  std::array<uint8_t, 24> bytes{};
  std::memcpy(bytes.data() + 1, &wide, sizeof wide);
  TAVHeader header{};
  Way::template copyHeader<true>(header, bytes.data() + 1);
  EXPECT_EQ(std::memcmp(&header.hdr64, &wide, sizeof wide), 0);
  std::memcpy(bytes.data() + 1, &narrow, sizeof narrow);
  Way::template copyHeader<false>(header, bytes.data() + 1);
  EXPECT_EQ(std::memcmp(&header.hdr32, &narrow, sizeof narrow), 0);
}

TYPED_TEST(Ways, CopyAHeaderFromAnyPlace)
{
  expectCopies<TypeParam>();
}

TEST(FastWays, AreOpenToAProgramThatHasNeverTraced)
{
  EXPECT_EQ(g_pWTCB, nullptr) << "nothing here has traced";
  EXPECT_TRUE(tav::core::hasNeverTraced());
  KORTraceCB* const before = g_pWTCB;
  KORTraceCB block{};
  g_pWTCB = &block;
  EXPECT_FALSE(tav::core::hasNeverTraced());
  g_pWTCB = before;
}

TEST(Words, LoadTheFieldsOfAHeader)
{
  TAVHeader header{};
  header.hdr64 = {0x0102030405060708, 0x11121314, 0x2122, 0x3132};
  const HeaderFields wide = LibraryWay::loadFields<true>(header);
  EXPECT_EQ(wide.size, 0x0102030405060708U);
  EXPECT_EQ(wide.info, 0x11121314U);
  EXPECT_EQ(wide.type, 0x2122);
  EXPECT_EQ(wide.elm, 0x3132);
  header.hdr32 = {0x41424344, 0x5152, 0x6162};
  const HeaderFields narrow = LibraryWay::loadFields<false>(header);
  EXPECT_EQ(narrow.size, 0x41424344U);
  EXPECT_EQ(narrow.info, 0U);
  EXPECT_EQ(narrow.type, 0x5152);
  EXPECT_EQ(narrow.elm, 0x6162);
}

/// P: the other byte order
class WordsOfHeaders : public testing::TestWithParam<bool>
{
protected:
  /// The header's bytes, with one before and some behind that stay.
  template<bool Wide>
  static std::vector<uint8_t> stored(const HeaderFields& fields)
  {
    std::vector<uint8_t> bytes(1 + (Wide ? kHeaderSize64 : kHeaderSize32) + 8, 0xAA);
    HeaderWords<Wide>(fields, GetParam()).template store<LibraryWay>(bytes.data() + 1);
    return bytes;
  }

  /// The bytes of fields in the machine's order, or turned.
  template<class... Words>
  static std::vector<uint8_t> expected(Words... words)
  {
    std::vector<uint8_t> bytes{0xAA};
    const auto add = [&bytes](auto word) {
      std::array<uint8_t, sizeof word> own{};
      std::memcpy(own.data(), &word, sizeof word);
      if (GetParam())
      {
        std::reverse(own.begin(), own.end());
      }
      bytes.insert(bytes.end(), own.begin(), own.end());
    };
    (add(words), ...);
    bytes.insert(bytes.end(), 8, 0xAA);
    return bytes;
  }
};

INSTANTIATE_TEST_SUITE_P(Order, WordsOfHeaders, testing::Bool());

TEST_P(WordsOfHeaders, StoreAllFieldsAndNothingElse)
{
  const HeaderFields fields{0x0102030405060708, 0x91929394, 0xA1A2, 0xB1B2};
  EXPECT_EQ(stored<true>(fields), expected(fields.size, fields.info, fields.type, fields.elm));
  const HeaderFields narrow{0xC1C2C3C4, 0, 0xA1A2, 0xB1B2};
  EXPECT_EQ(stored<false>(narrow), expected(static_cast<uint32_t>(narrow.size), narrow.type, narrow.elm));
}

/// Every length up to twice what is copied without a call, apart and overlapping either way.
TEST(CopySmall, CopiesAsMemmoveDoes)
{
  constexpr size_t kLongest = 2 * tav::core::kLongestSmall;
  for (size_t length = 0; length <= kLongest; ++length)
  {
    for (const size_t to : {size_t{0}, size_t{1}, size_t{7}, size_t{16}, size_t{17}, size_t{31}, 2 * kLongest})
    {
      constexpr size_t kFrom = 16;
      std::vector<uint8_t> bytes(3 * kLongest + kFrom);
      std::iota(bytes.begin(), bytes.end(), uint8_t{1});
      std::vector<uint8_t> wanted = bytes;
      std::memmove(wanted.data() + to, wanted.data() + kFrom, length);
      tav::core::copySmall(bytes.data() + to, bytes.data() + kFrom, length);
      EXPECT_EQ(bytes, wanted) << length << " bytes to " << to;
    }
  }
}

} // namespace
