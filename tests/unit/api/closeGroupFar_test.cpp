/// Closing a group of a file whose header has left the ring: its size is written by itself, and the ring stays where it
/// is.
#include <algorithm>
#include <cstdint>
#include <tuple>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

constexpr uint64_t kPage = 4096;
constexpr uint16_t kGroup = 60100;
constexpr size_t kBlobBytes = 1000;

class CloseFarHeader : public testing::TestWithParam<std::tuple<bool, bool>>
{
protected:
  CloseFarHeader()
      : writer_(form())
  {
    storage().kind = TAV_STORAGE_FILE;
  }
  static Form form()
  {
    const auto [swap, align] = GetParam();
    return {.buffered = true, .swap = swap, .align = align, .pageBytes = kPage, .ringBytes = 2 * kPage};
  }

  void addBlobs(size_t count, StreamWriter& to)
  {
    for (size_t i = 0; i < count; ++i)
    {
      to.add(binary(kBlob, Bytes(kBlobBytes, static_cast<uint8_t>(i + 1))));
    }
  }
  /// A stream of groups of three pages each, every other one with an end element.
  void addGroups(size_t count, StreamWriter& to)
  {
    to.add(group64(kRoot));
    for (size_t i = 0; i < count; ++i)
    {
      to.add(group64(kGroup, TAV_TYPE_HEADER64, i % 2 == 0 ? 0 : TAV_INFO_EYE_SIZE));
      addBlobs(12, to);
      to.close();
    }
    to.close();
  }

  VectorStorage& storage() { return writer_.vectorStorage(); }

  StreamWriter writer_;
};
INSTANTIATE_TEST_SUITE_P(Forms, CloseFarHeader, testing::Combine(testing::Bool(), testing::Bool()),
                         [](const auto& form) {
                           return std::string(std::get<0>(form.param) ? "Swapped" : "Native") +
                                  (std::get<1>(form.param) ? "Aligned" : "Packed");
                         });

TEST_P(CloseFarHeader, WritesWhatTheRingHasAndThenTheSizeAlone)
{
  writer_.add(group64(kRoot));
  addBlobs(40, writer_);
  const uint64_t reads = storage().reads;
  const uint64_t written = storage().bytesWritten;
  writer_.close();
  EXPECT_EQ(storage().reads, reads);
  EXPECT_LE(storage().bytesWritten, written + 2 * kPage + sizeof(uint64_t));
  EXPECT_EQ(storage().position, sizeof(uint64_t));
  EXPECT_EQ(writer_.handle()->pHdrStack->count, 0U);
}

TEST_P(CloseFarHeader, LeavesNoSizeOfBytesThatNeverCame)
{
  StreamWriter direct({.swap = writer_.form().swap, .align = writer_.form().align});
  for (StreamWriter* const writer : {&writer_, &direct})
  {
    writer->add(group64(kRoot));
    addBlobs(40, *writer);
    writer->close();
  }
  const Bytes whole = direct.bytes();
  const Bytes killed = storage().bytes; // nothing more came
  ASSERT_GE(killed.size(), whole.size());
  EXPECT_TRUE(std::equal(whole.begin(), whole.end(), killed.begin()));
}

TEST_P(CloseFarHeader, WritesAStreamOnce)
{
  constexpr size_t groups = 50;
  addGroups(groups, writer_);
  EXPECT_EQ(writer_.handle()->pCircularBuf->reset(), TAV_RC_OK);
  const uint64_t length = writer_.length();
  EXPECT_EQ(storage().bytesRead, 0U);
  // The page in which a group ends comes as far as it goes, too.
  EXPECT_LE(storage().bytesWritten, length + (groups + 2) * kPage);
  EXPECT_LE(storage().bytes.size(), length + 2 * kPage);
}

TEST_P(CloseFarHeader, GivesTheStreamThatTheRingWouldGive)
{
  addGroups(50, writer_);
  StreamWriter traced(form());
  traced.vectorStorage().kind = TAV_STORAGE_FILE;
  {
    const TraceLog trace; // with a trace on, the ring does it, and leaves its records
    addGroups(50, traced);
  }
  EXPECT_GT(traced.vectorStorage().bytesRead, 0U);
  EXPECT_EQ(writer_.bytes(), traced.bytes());
  const Bytes& file = storage().bytes;
  EXPECT_TRUE(std::all_of(file.begin() + static_cast<ptrdiff_t>(writer_.length()), file.end(),
                          [](uint8_t byte) { return byte == 0; }));
}

TEST_P(CloseFarHeader, BringsThePageOfManyHeadersBackOnce)
{
  constexpr size_t deep = 200; // headers that share a page
  for (size_t i = 0; i < deep; ++i)
  {
    writer_.add(group64(kGroup));
  }
  addBlobs(40, writer_);
  const uint64_t calls = storage().calls();
  for (size_t i = 0; i < deep; ++i)
  {
    writer_.close();
  }
  EXPECT_LT(storage().calls() - calls, deep);
}

TEST_P(CloseFarHeader, BringsThePageBackWhereTheStorageIsNoFile)
{
  storage().kind = 0;
  writer_.add(group64(kRoot));
  addBlobs(40, writer_);
  writer_.close();
  EXPECT_TRUE(writer_.handle()->pCircularBuf->isCached(0));
}

TEST_P(CloseFarHeader, LeavesItToTheRingWhatTheStorageRefuses)
{
  writer_.add(group64(kRoot));
  addBlobs(40, writer_);
  storage().failAt(1, kStorageCode); // the seek to the header, once
  EXPECT_EQ(tavCloseHeader(0, writer_.handle()), TAV_RC_OK);
  StreamWriter direct({.swap = writer_.form().swap, .align = writer_.form().align});
  direct.add(group64(kRoot));
  addBlobs(40, direct);
  direct.close();
  EXPECT_EQ(writer_.bytes(), direct.bytes());
}

} // namespace
