/// Payloads that lie in the stream's own block, where the node is going to be written.
#include <cstdint>
#include <string>

#include <gtest/gtest.h>

#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint64_t kRegion = 160;
constexpr uint64_t kPayload = 24;

struct Overlap
{
  const char* name;
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
    const Bytes silent = written(from);
    const TraceLog trace;
    EXPECT_EQ(silent, written(from)) << "payload at " << from;
  }
}

INSTANTIATE_TEST_SUITE_P(Forms, OverlappingPayload,
                         ::testing::Values(Overlap{"NativeWide", {}, true}, Overlap{"NativeNarrow", {}, false},
                                           Overlap{"SwappedWide", {.swap = true}, true},
                                           Overlap{"SwappedNarrow", {.swap = true}, false},
                                           Overlap{"SwappedAlignedWide", {.swap = true, .align = true}, true},
                                           Overlap{"AlignedWide", {.align = true}, true}),
                         [](const auto& one) { return std::string(one.param.name); });

} // namespace
