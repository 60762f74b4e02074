/// A close whose storage fails on the way, and the same close when the cause is gone: it gives the stream that would
/// have been.
#include <algorithm>
#include <cstdint>
#include <sstream>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/rows.h"
#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/layout.hpp"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace test;

constexpr uint16_t kGroup = 60102;
constexpr uint16_t kValue = 60110;
constexpr uint32_t kRefusal = 0x90000777; // no code of the library
constexpr uint64_t kPage = 64;

/// How a storage fails. All but `full` is over after one call.
enum class Fault : uint8_t
{
  refused,   ///< a call is refused
  full,      ///< this write and all behind it are refused until there is room
  cutOff,    ///< a write takes some bytes and then fails
  cutShort,  ///< a write takes some bytes and says so
  elsewhere, ///< a seek lands in another place
  lost       ///< the cursor cannot be told
};

struct NamedFault : Row
{
  Fault fault;
};

constexpr NamedFault kFaults[] = {
    {"Refused", Fault::refused},
    {"Full", Fault::full},
    {"CutOff", Fault::cutOff},
    {"CutShort", Fault::cutShort},
    {"Elsewhere", Fault::elsewhere},
    {"Lost", Fault::lost},
};

class FaultyStorage : public VectorStorage
{
public:
  using VectorStorage::VectorStorage;

  /// Breaks the nth call that `fault` is about, from now on.
  void breakAt(Fault fault, uint64_t nth)
  {
    fault_ = fault;
    left_ = nth;
    met_ = false;
  }
  void mend() { left_ = 0; }
  /// Whether it came to the call that was to fail.
  [[nodiscard]] bool met() const { return met_; }

  uint32_t seek(uint64_t offset, uint64_t hint) override
  {
    if (isHit(Fault::refused))
    {
      return kRefusal;
    }
    return VectorStorage::seek(isHit(Fault::elsewhere) ? offset + 1 : offset, hint);
  }

  uint32_t getPosition(uint64_t* pPosition) override
  {
    return isHit(Fault::lost) ? kRefusal : VectorStorage::getPosition(pPosition);
  }

  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool zeroCopy,
                bool backward) override
  {
    *pRead = 0;
    if (isHit(Fault::refused))
    {
      return kRefusal;
    }
    return VectorStorage::read(wanted, ppData, bufSize, pRead, zeroCopy, backward);
  }

  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override
  {
    *pWritten = 0;
    if (isHit(Fault::refused) || isHit(Fault::full))
    {
      return kRefusal;
    }
    const bool cutOff = isHit(Fault::cutOff);
    const uint64_t length = cutOff || isHit(Fault::cutShort) ? size / 2 : size;
    const uint32_t rc = VectorStorage::write(pData, length, pWritten);
    return cutOff ? kRefusal : rc;
  }

private:
  bool isHit(Fault fault)
  {
    if (fault != fault_ || left_ == 0 || --left_ != 0)
    {
      return false;
    }
    met_ = true;
    left_ = fault == Fault::full ? 1 : 0;
    return true;
  }

  Fault fault_{};
  uint64_t left_ = 0;
  bool met_ = false;
};

/// A group, where it is, and what is below it.
struct Closing
{
  Form form;
  Element group;
  uint64_t lead;     ///< bytes of an element that is before the group, under a root; 0: the group is the root
  uint64_t children; ///< elements of 8 bytes
};

std::string describe(const Closing& row)
{
  std::ostringstream text;
  text << row.form << ", ring of " << row.form.ringBytes << ", group of size " << row.group.size() << ", type "
       << row.group.type() << ", info " << layout::infoOf(row.group.header) << ", behind " << row.lead
       << " bytes, with " << row.children << " children";
  return text.str();
}

/// A stream whose next step is to close the group.
class OpenStream
{
public:
  explicit OpenStream(const Closing& row)
      : storage(row.form.pageBytes), handle_(storage, TAV_OPT_WRITE, row.form)
  {
    if (row.lead != 0)
    {
      add(layout::is64(row.group.header) ? group64(kRoot, TAV_TYPE_HEADER64, 0, 0) : group32(kRoot));
      add(binary(kValue, Bytes(row.lead, 0xAA), layout::is64(row.group.header)));
    }
    add(row.group);
    for (uint64_t i = 0; i < row.children; ++i)
    {
      add(u64(kValue, 0x0101010101010101 * (i + 1), layout::hasChildren64(row.group.header)));
    }
  }

  TAVHandle* operator->() { return handle_.get(); }
  uint32_t close() { return tavCloseHeader(0, handle_.get()); }
  /// Closes what is still open, and gives the bytes when all of them have left the ring.
  Bytes finish()
  {
    while (handle_->pHdrStack->count != 0) check(close(), "tavCloseHeader");
    check(handle_->pCircularBuf->reset(), "reset");
    return {storage.bytes.begin(), storage.bytes.begin() + static_cast<ptrdiff_t>(handle_->streamBytes)};
  }

private:
  void add(Element node)
  {
    TAVHeaderData data = node.data();
    check(tavAddElement(0, handle_.get(), &data), "tavAddElement");
  }

public:
  FaultyStorage storage;

private:
  Handle handle_;
};

Form ringOf(uint64_t pages, bool swap = false, bool align = false)
{
  return {.buffered = true, .swap = swap, .align = align, .pageBytes = kPage, .ringBytes = pages * kPage};
}

TEST(CloseOnAFullDisk, OfAGroupWithAPairIsRefusedUntilThereIsRoomAgain)
{
  for (const uint64_t children : {17U, 18U})
  {
    const Closing row{ringOf(4), group64(kRoot, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE, 0), 0, children};
    OpenStream stream(row);
    stream.storage.breakAt(Fault::full, 1);
    const uint64_t before = stream->streamBytes;
    EXPECT_NE(stream.close(), TAV_RC_OK) << children << " children";
    EXPECT_EQ(stream->pHdrStack->count, 1U);
    EXPECT_EQ(stream->streamBytes, before);
    stream.storage.mend();
    EXPECT_EQ(stream.close(), TAV_RC_OK) << children << " children";
    EXPECT_EQ(toHex(stream.finish()), toHex(OpenStream(row).finish()));
  }
}

/// The stream of a group of unknown size whose size could not be written: its header is what it was, and an end element
/// is there whether or not one was asked for.
Bytes endedStream(const Closing& row)
{
  Closing paired = row;
  paired.group.header.hdr64.info |= TAV_INFO_EYE_SIZE;
  OpenStream stream(paired);
  TAVHeader header = row.group.header;
  const uint64_t at = stream->pHdrStack->top()->nodeOffset;
  Bytes bytes = stream.finish();
  header.hdr64.info |= row.form.align ? TAV_INFO_ALIGNED8 : 0;
  layout::encodeHeader(header, row.form.swap, bytes.data() + at);
  return bytes;
}

/// Closes with one fault; false when the fault was not met.
bool closeWith(const Closing& row, Fault fault, uint64_t nth, const Bytes& expected)
{
  OpenStream stream(row);
  const uint64_t length = stream->streamBytes;
  const uint32_t open = stream->pHdrStack->count;
  stream.storage.breakAt(fault, nth);
  const uint32_t rc = stream.close();
  const bool met = stream.storage.met();
  stream.storage.mend();
  if (rc != TAV_RC_OK)
  {
    EXPECT_EQ(stream->pHdrStack->count, open) << "the group stays open";
    EXPECT_EQ(stream->streamBytes, length) << "the write offset stays where it was";
    EXPECT_EQ(stream.close(), TAV_RC_OK) << "the cause is gone";
  }
  EXPECT_EQ(stream->pHdrStack->count, open - 1);
  const Bytes bytes = stream.finish();
  const bool ended = met && rc == TAV_RC_OK && row.group.size() == TAV_SIZE_UNKNOWN && bytes != expected;
  EXPECT_EQ(toHex(bytes), toHex(ended ? endedStream(row) : expected));
  return met;
}

/// Every group that a fault meets on its way to be closed.
std::vector<Element> groupsFor(Fault fault)
{
  std::vector<Element> groups{group64(kGroup, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE, 0),
                              group64(kGroup, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE, 5),
                              group64(kGroup, TAV_TYPE_HEADER32, TAV_INFO_EYE_SIZE, 0),
                              group64(kGroup, TAV_TYPE_HEADER64, 0, 0), group32(kGroup)};
  // Of an unknown size that was written in part nothing is left to go by.
  if (fault != Fault::cutOff && fault != Fault::cutShort)
  {
    groups.push_back(group64(kGroup, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE, TAV_SIZE_UNKNOWN));
    groups.push_back(group64(kGroup, TAV_TYPE_HEADER64, 0, TAV_SIZE_UNKNOWN));
  }
  return groups;
}

/// Closes with the fault at each call in turn, and counts them.
uint64_t closeWithEach(const Closing& row, Fault fault)
{
  const Bytes expected = OpenStream(row).finish();
  uint64_t nth = 1;
  while (!::testing::Test::HasFailure() && closeWith(row, fault, nth, expected))
  {
    ++nth;
  }
  EXPECT_FALSE(::testing::Test::HasFailure()) << describe(row) << ", at call " << nth;
  return nth - 1;
}

class CloseOverAFaultyStorage : public ::testing::TestWithParam<NamedFault>
{
};

TEST_P(CloseOverAFaultyStorage, IsWholeOrIsRefusedAndCanBeTakenAgain)
{
  uint64_t met = 0;
  for (const Element& group : groupsFor(GetParam().fault))
  {
    for (const uint64_t pages : {1U, 2U, 4U})
    {
      for (const uint64_t lead : {0U, 8U, 28U}) // 28: the size is on two pages
      {
        for (const uint64_t children : {0U, 1U, 2U, 5U, 6U, 11U, 17U, 18U, 23U})
        {
          met += closeWithEach({ringOf(pages), group, lead, children}, GetParam().fault);
          met += closeWithEach({ringOf(pages, true, true), group, lead, children}, GetParam().fault);
          ASSERT_FALSE(HasFailure());
        }
      }
    }
  }
  EXPECT_GT(met, 300U);
}

INSTANTIATE_TEST_SUITE_P(Faults, CloseOverAFaultyStorage, ::testing::ValuesIn(kFaults),
                         kRowName);

} // namespace
