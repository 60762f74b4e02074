// The matcher and the search under it against the plain form of both: byte by byte.
#include <algorithm>
#include <array>
#include <cstdint>
#include <memory>
#include <ostream>
#include <random>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "format/eyeMatcher.h"
#include "format/eyeSearch.h"

namespace
{

using namespace tav;
using namespace tav::inside;

using Bytes = std::vector<uint8_t>;

constexpr EyeBytes kEyes[] = {kNativeEye, kReversedEye};

/// Bytes in a heap block of their own size, so that the address sanitizer sees every look outside.
class ExactBlock
{
public:
  explicit ExactBlock(const Bytes& bytes)
      : bytes_(new uint8_t[bytes.size()]), size_(bytes.size())
  {
    std::copy(bytes.begin(), bytes.end(), bytes_.get());
  }
  [[nodiscard]] const uint8_t* begin() const { return bytes_.get(); }
  [[nodiscard]] const uint8_t* end() const { return bytes_.get() + size_; }

private:
  std::unique_ptr<uint8_t[]> bytes_;
  size_t size_;
};

/// The rule itself: two counters, and a byte that breaks a match is not tried again.
class PlainMatcher
{
public:
  const uint8_t* scan(const uint8_t* at, const uint8_t* end)
  {
    for (; at != end && counters_[0] != 8 && counters_[1] != 8; ++at)
    {
      for (size_t order = 0; order < 2; ++order)
      {
        size_t& counter = counters_[order];
        counter = *at == kEyes[order][counter] ? counter + 1 : 0;
      }
    }
    return at;
  }
  [[nodiscard]] bool found() const { return counters_[0] == 8 || counters_[1] == 8; }
  [[nodiscard]] bool isReversed() const { return counters_[0] != 8; }

private:
  std::array<size_t, 2> counters_{};
};

/// Where a scan over pieces stopped, and what it had found by then.
struct Outcome
{
  ptrdiff_t stop;
  bool found;
  bool reversed;
  bool operator==(const Outcome&) const = default;
};

std::ostream& operator<<(std::ostream& out, const Outcome& outcome)
{
  return out << "at " << outcome.stop << (outcome.found ? ", found" : ", not found")
             << (outcome.reversed ? ", reversed" : "");
}

/// Scans [start, end) in pieces that end at `cuts`, which rise.
template<class Matcher>
Outcome scanPieces(const uint8_t* start, const uint8_t* end, const std::vector<ptrdiff_t>& cuts)
{
  Matcher matcher;
  const uint8_t* at = start;
  for (const ptrdiff_t cut : cuts)
  {
    if (!matcher.found() && start + cut <= end)
    {
      at = matcher.scan(at, start + cut);
    }
  }
  at = matcher.scan(at, end);
  return {at - start, matcher.found(), matcher.found() && matcher.isReversed()};
}

void expectSame(const uint8_t* start, const uint8_t* end, const std::vector<ptrdiff_t>& cuts)
{
  ASSERT_EQ(scanPieces<EyeMatcher>(start, end, cuts), scanPieces<PlainMatcher>(start, end, cuts))
      << end - start << " bytes, first cut " << (cuts.empty() ? -1 : cuts[0]) << ", bytes "
      << ::testing::PrintToString(Bytes(start, end));
}

/// Pieces of eye catchers and of what looks like them.
class Maker
{
public:
  explicit Maker(uint64_t seed)
      : random_(seed) {}

  uint64_t below(uint64_t limit) { return random_() % limit; }

  Bytes make(uint64_t size, uint64_t kind)
  {
    Bytes bytes;
    while (bytes.size() < size)
    {
      kind == 0 ? addFragment(bytes) : bytes.push_back(kind == 1 ? eyeByte() : static_cast<uint8_t>(random_()));
    }
    bytes.resize(size);
    return bytes;
  }

private:
  uint8_t eyeByte() { return kNativeEye[below(8)]; }

  void addFragment(Bytes& bytes)
  {
    const EyeBytes& eye = kEyes[below(2)];
    const auto length = static_cast<ptrdiff_t>(1 + below(8));
    switch (below(6))
    {
    case 0: // a beginning
      bytes.insert(bytes.end(), eye.begin(), eye.begin() + length);
      break;
    case 1: // an end
      bytes.insert(bytes.end(), eye.end() - length, eye.end());
      break;
    case 2: // a run of a first byte
      bytes.insert(bytes.end(), static_cast<size_t>(length), eye[0]);
      break;
    case 3: // a whole one behind a first byte: often missed
      bytes.push_back(eye[0]);
      bytes.insert(bytes.end(), eye.begin(), eye.end());
      break;
    case 4: // the middle
      bytes.insert(bytes.end(), eye.begin() + 3, eye.begin() + 5);
      break;
    default:
      bytes.insert(bytes.end(), below(40), static_cast<uint8_t>(random_()));
    }
  }

  std::mt19937_64 random_;
};

std::vector<ptrdiff_t> randomCuts(Maker& maker, uint64_t size)
{
  std::vector<ptrdiff_t> cuts(maker.below(4));
  for (ptrdiff_t& cut : cuts)
  {
    cut = static_cast<ptrdiff_t>(maker.below(size + 1));
  }
  std::sort(cuts.begin(), cuts.end());
  return cuts;
}

TEST(EyeMatcher, AgreesWithThePlainOneOverFragmentsOfEyeCatchers)
{
  uint64_t hits = 0;
  for (uint64_t seed = 1; seed <= 20000 && !::testing::Test::HasFatalFailure(); ++seed)
  {
    Maker maker(seed);
    const ExactBlock block(maker.make(maker.below(seed % 50 == 0 ? 2000 : 100), seed % 3));
    const auto start = static_cast<ptrdiff_t>(maker.below(static_cast<uint64_t>(block.end() - block.begin()) + 1));
    const std::vector<ptrdiff_t> cuts = randomCuts(maker, static_cast<uint64_t>(block.end() - block.begin() - start));
    expectSame(block.begin() + start, block.end(), cuts);
    hits += scanPieces<PlainMatcher>(block.begin() + start, block.end(), cuts).found ? 1 : 0;
  }
  EXPECT_GT(hits, 1000U); // or the fragments prove little
}

TEST(EyeMatcher, AgreesWithThePlainOneThatGoesOnBehindEveryMatch)
{
  for (uint64_t seed = 1; seed <= 300 && !::testing::Test::HasFatalFailure(); ++seed)
  {
    Maker maker(seed);
    const ExactBlock block(maker.make(1500, 0));
    for (const uint8_t* at = block.begin(); at != block.end();)
    {
      expectSame(at, block.end(), {});
      at += std::max<ptrdiff_t>(1, scanPieces<PlainMatcher>(at, block.end(), {}).stop);
    }
  }
}

TEST(EyeMatcher, AgreesWithThePlainOneAboutEveryShortRowOfEyeBytes)
{
  // All rows of four choices: both first bytes, a whole eye catcher of either order.
  const Bytes parts[] = {{kNativeEye[0]},
                         {kReversedEye[0]},
                         {kNativeEye.begin(), kNativeEye.end()},
                         {kReversedEye.begin(), kReversedEye.end()}};
  for (unsigned row = 0; row < 4096; ++row)
  {
    Bytes bytes;
    for (unsigned place = 0; place < 6; ++place)
    {
      const Bytes& part = parts[(row >> (2 * place)) & 3U];
      bytes.insert(bytes.end(), part.begin(), part.end());
    }
    const ExactBlock block(bytes);
    ASSERT_NO_FATAL_FAILURE(expectSame(block.begin(), block.end(), {}));
    ASSERT_NO_FATAL_FAILURE(expectSame(block.begin(), block.end(), {static_cast<ptrdiff_t>(row % bytes.size())}));
  }
}

TEST(EyeMatcher, CarriesAMatchOverEveryCut)
{
  for (const EyeBytes& eye : kEyes)
  {
    Bytes bytes(5, 0x33);
    bytes.insert(bytes.end(), eye.begin(), eye.end());
    const ExactBlock block(bytes);
    for (ptrdiff_t cut = 0; cut <= 13; ++cut)
    {
      EXPECT_EQ(scanPieces<EyeMatcher>(block.begin(), block.end(), {cut}),
                (Outcome{13, true, eye != kNativeEye}))
          << cut;
    }
  }
}

TEST(EyeMatcher, MissesAnEyeCatcherBehindItsOwnFirstByteWhereverItStands)
{
  for (const EyeBytes& eye : kEyes)
  {
    for (ptrdiff_t before = 0; before < 1100; ++before)
    {
      Bytes bytes(static_cast<size_t>(before), 0x33);
      bytes.push_back(eye[0]);
      bytes.insert(bytes.end(), eye.begin(), eye.end());
      bytes.insert(bytes.end(), eye.begin(), eye.end());
      const ExactBlock block(bytes);
      ASSERT_EQ(scanPieces<EyeMatcher>(block.begin(), block.end(), {}),
                (Outcome{before + 17, true, eye != kNativeEye}))
          << before;
    }
  }
}

TEST(EyeMatcher, DoesNotMoveOnceItHasFound)
{
  EyeMatcher matcher;
  const ExactBlock block(Bytes(kNativeEye.begin(), kNativeEye.end()));
  EXPECT_EQ(matcher.scan(block.begin(), block.end()), block.end());
  EXPECT_EQ(matcher.scan(block.begin(), block.end()), block.begin());
}

using Search = const uint8_t* (*)(const uint8_t*, const uint8_t*);

/// The search in each of its forms.
class EyeSearch : public ::testing::TestWithParam<Search>
{
protected:
  static ptrdiff_t find(const ExactBlock& block, ptrdiff_t start = 0)
  {
    return GetParam()(block.begin() + start, block.end()) - block.begin();
  }
};

TEST_P(EyeSearch, FindsAnEyeCatcherAtEveryPlaceOfEveryLength)
{
  for (const EyeBytes& eye : kEyes)
  {
    for (ptrdiff_t before = 0; before < 600; ++before)
    {
      for (const size_t behind : {0U, 1U, 7U, 8U, 31U, 32U, 33U, 505U, 530U, 1100U})
      {
        Bytes bytes(static_cast<size_t>(before), 0x33);
        bytes.insert(bytes.end(), eye.begin(), eye.end());
        bytes.resize(bytes.size() + behind, 0x33);
        ASSERT_EQ(find(ExactBlock(bytes)), before) << behind << " bytes behind";
      }
    }
  }
}

TEST_P(EyeSearch, StartsAtEveryAddress)
{
  Bytes bytes(700, 0x33);
  std::copy(kReversedEye.begin(), kReversedEye.end(), bytes.end() - 8);
  const ExactBlock block(bytes);
  for (ptrdiff_t start = 0; start <= 692; ++start)
  {
    ASSERT_EQ(find(block, start), 692) << start;
  }
  EXPECT_EQ(find(block, 693), 700);
}

TEST_P(EyeSearch, FindsTheFirstOfSeveral)
{
  for (ptrdiff_t distance = 8; distance < 600; ++distance)
  {
    Bytes bytes(1300, 0x33);
    std::copy(kNativeEye.begin(), kNativeEye.end(), bytes.begin() + 20 + distance);
    std::copy(kReversedEye.begin(), kReversedEye.end(), bytes.begin() + 20);
    ASSERT_EQ(find(ExactBlock(bytes)), 20) << distance;
  }
}

TEST_P(EyeSearch, PassesWhatDiffersInOneByte)
{
  for (const EyeBytes& eye : kEyes)
  {
    for (size_t place = 0; place < 8; ++place)
    {
      for (const ptrdiff_t before : {0, 1, 40, 600})
      {
        Bytes bytes(1300, 0x33);
        std::copy(eye.begin(), eye.end(), bytes.begin() + before);
        bytes[static_cast<size_t>(before) + place] ^= 1;
        ASSERT_EQ(find(ExactBlock(bytes)), 1300) << "byte " << place << " behind " << before;
      }
    }
  }
}

TEST_P(EyeSearch, FindsNothingInLessThanAnEyeCatcher)
{
  for (size_t length = 0; length < 8; ++length)
  {
    EXPECT_EQ(find(ExactBlock(Bytes(kNativeEye.begin(), kNativeEye.begin() + static_cast<ptrdiff_t>(length)))),
              static_cast<ptrdiff_t>(length));
  }
}

TEST_P(EyeSearch, AgreesWithAPlainSearchOverFragments)
{
  for (uint64_t seed = 1; seed <= 2000; ++seed)
  {
    Maker maker(seed);
    const Bytes bytes = maker.make(maker.below(1500), seed % 3);
    const auto native = std::search(bytes.begin(), bytes.end(), kNativeEye.begin(), kNativeEye.end());
    const auto reversed = std::search(bytes.begin(), bytes.end(), kReversedEye.begin(), kReversedEye.end());
    ASSERT_EQ(find(ExactBlock(bytes)), std::min(native, reversed) - bytes.begin()) << seed;
  }
}

INSTANTIATE_TEST_SUITE_P(With, EyeSearch, ::testing::Values(Search{findEye}, Search{findEyeOnAnyProcessor}),
                         [](const auto& form) { return form.index == 0 ? "WhatTheProcessorHas" : "WhatAllHave"; });

} // namespace
