/// Payloads that change while their node is written: they lie in the stream's own block, in the node's descriptor or in
/// the handle.
#include <cstdint>
#include <string>

#include <gtest/gtest.h>

#include "support/rows.h"
#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint64_t kRegion = 160;
constexpr uint64_t kPayload = 24;

struct Overlap : Row
{
  Form form;
  bool wide;
};

class OverlappingPayload : public ::testing::TestWithParam<Overlap>
{
protected:
  /// The region after an element was appended whose payload begins `from` bytes into it.
  static Bytes written(uint64_t from)
  {
    StreamWriter writer(GetParam().form);
    uint8_t* const block = writer.handle()->pDirectData;
    const bool wide = GetParam().wide;
    writer.add(wide ? group64(TAV_ELM_CMN_SYSTEM) : group64(TAV_ELM_CMN_SYSTEM, TAV_TYPE_HEADER32));
    for (uint64_t i = writer.length(); i < kRegion; ++i) block[i] = static_cast<uint8_t>(i * 7);
    TAVHeaderData node{wide ? header64(kPayload, TAV_TYPE_UINT64_ARRAY, 60001)
                            : header32(kPayload, TAV_TYPE_UINT64_ARRAY, 60001),
                       block + from, kPayload, 0};
    EXPECT_EQ(tavAddElement(0, writer.handle(), &node), TAV_RC_OK);
    return {block, block + kRegion};
  }
};

TEST_P(OverlappingPayload, ComesOutTheSameWhetherOrNotItIsTraced)
{
  for (uint64_t from = 0; from + kPayload <= kRegion; ++from)
  {
    const Bytes fast = written(from);
    const TraceLog trace;
    EXPECT_EQ(fast, written(from)) << "payload at " << from;
  }
}

INSTANTIATE_TEST_SUITE_P(Forms, OverlappingPayload,
                         ::testing::Values(Overlap{"NativeWide", {}, true}, Overlap{"NativeNarrow", {}, false},
                                           Overlap{"SwappedWide", {.swap = true}, true},
                                           Overlap{"SwappedNarrow", {.swap = true}, false},
                                           Overlap{"SwappedAlignedWide", {.swap = true, .align = true}, true},
                                           Overlap{"AlignedWide", {.align = true}, true}),
                         kRowName);

struct OwnNumber : Row
{
  Form form;
  uint32_t info;
};

/// Elements whose payload is a number that the append itself moves.
class OwnNumberAsPayload : public ::testing::TestWithParam<OwnNumber>
{
protected:
  OwnNumberAsPayload()
      : writer_(GetParam().form)
  {
    writer_.add(group64(TAV_ELM_CMN_SYSTEM));
    node_.header = header64(sizeof(uint64_t), TAV_TYPE_BINARY, 60001, GetParam().info);
    node_.header.nodeOffset = kBefore;
    node_.dataBufSize = sizeof(uint64_t);
  }

  /// The payload that an append wrote.
  Bytes appended(void* payload)
  {
    node_.pDataBuf = static_cast<uint8_t*>(payload);
    const uint64_t at = writer_.length() + 16;
    EXPECT_EQ(tavAddElement(0, writer_.handle(), &node_), TAV_RC_OK);
    const Bytes all = writer_.bytes();
    return {all.begin() + static_cast<ptrdiff_t>(at), all.begin() + static_cast<ptrdiff_t>(at + 8)};
  }

  static constexpr uint64_t kBefore = 0x1122334455667788;
  StreamWriter writer_;
  TAVHeaderData node_{};
};

TEST_P(OwnNumberAsPayload, IsTheNodesOffsetAsTheCallerLeftIt)
{
  EXPECT_EQ(appended(&node_.header.nodeOffset), bytesOfValue(kBefore));
  EXPECT_EQ(node_.header.nodeOffset, 16U);
}

TEST_P(OwnNumberAsPayload, IsTheWriteOffsetBeforeTheNode)
{
  EXPECT_EQ(appended(&writer_.handle()->streamBytes), bytesOfValue(uint64_t{16}));
}

TEST_P(OwnNumberAsPayload, OfManyBytesIsTheWholeDescriptorAsTheCallerLeftIt)
{
  node_.header.hdr64.size = sizeof node_;
  node_.dataBufSize = sizeof node_;
  node_.pDataBuf = reinterpret_cast<uint8_t*>(&node_);
  if (GetParam().form.align)
  {
    node_.header.hdr64.info |= TAV_INFO_ALIGNED8; // the one change that is made before
  }
  const Bytes before(node_.pDataBuf, node_.pDataBuf + sizeof node_);
  ASSERT_EQ(tavAddElement(0, writer_.handle(), &node_), TAV_RC_OK);
  const Bytes all = writer_.bytes();
  EXPECT_EQ(Bytes(all.begin() + 32, all.begin() + 32 + sizeof node_), before);
}

INSTANTIATE_TEST_SUITE_P(
    Forms, OwnNumberAsPayload,
    ::testing::Values(
        OwnNumber{"Block", {}, 0}, OwnNumber{"BlockWithAPair", {}, TAV_INFO_EYE_SIZE},
        OwnNumber{"AlignedBlock", {.align = true}, 0},
        OwnNumber{"Ring", {.buffered = true, .pageBytes = 4096, .ringBytes = 8192}, 0},
        OwnNumber{"RingWithAPair", {.buffered = true, .pageBytes = 4096, .ringBytes = 8192}, TAV_INFO_EYE_SIZE}),
    kRowName);

} // namespace
