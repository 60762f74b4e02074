#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>

#include "support/traceLog.h"
#include "tav/tav.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ElementsAre;

std::string baseOf(const TAVSideStorage& storage)
{
  return bytesOf(storage);
}

TEST(InitParam, HasDefaults)
{
  const TAVInitParam param;
  EXPECT_EQ(param.version, 0x09050000U);
  EXPECT_EQ(param.pSideStorage, nullptr);
  EXPECT_EQ(param.options, 1U);
  EXPECT_EQ(param.circularBufSize, 0xA00000U);
  EXPECT_EQ(param.auxSize, 0x20000U);
  EXPECT_EQ(param.byteOrder, 0U);
  EXPECT_EQ(param.alignMode, 0U);
}

TEST(InitParam, TakesStorageAndOptions)
{
  std::array<uint8_t, 8> block{};
  TAVSSMemory storage(block.data(), block.size());
  const TAVInitParam param(&storage, 0x12);
  EXPECT_EQ(param.version, 0x09050000U);
  EXPECT_EQ(param.pSideStorage, &storage);
  EXPECT_EQ(param.options, 0x12U);
  EXPECT_EQ(param.circularBufSize, 0xA00000U);
  EXPECT_EQ(param.auxSize, 0x20000U);
  EXPECT_EQ(param.byteOrder, 0U);
  EXPECT_EQ(param.alignMode, 0U);
}

TEST(InitParam, TakesEveryField)
{
  std::array<uint8_t, 8> block{};
  TAVSSMemory storage(block.data(), block.size());
  const TAVInitParam param(&storage, 4, 0x1111, 0x2222, 3, 1);
  EXPECT_EQ(param.version, 0x09050000U);
  EXPECT_EQ(param.pSideStorage, &storage);
  EXPECT_EQ(param.options, 4U);
  EXPECT_EQ(param.circularBufSize, 0x1111U);
  EXPECT_EQ(param.auxSize, 0x2222U);
  EXPECT_EQ(param.byteOrder, 3U);
  EXPECT_EQ(param.alignMode, 1U);
}

TEST(InitParam, GivesTheVersionThatItHolds)
{
  TAVInitParam param;
  EXPECT_EQ(param.getVersion(), 0x09050000U);
  param.version = 7;
  EXPECT_EQ(param.getVersion(), 7U);
}

TEST(InitParamTrace, ShowsItsLife)
{
  TraceLog trace;
  {
    const TAVInitParam param;
    param.getVersion();
    EXPECT_THAT(trace.dump(0x88A0001, 100).items, ElementsAre(bytesOf(param)));
  }
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0001, 0}, Step{KOR_TRACE_VAR, 0x88A0001, 100},
                                         Step{KOR_TRACE_EXIT, 0x88A0001, 0}, Step{KOR_TRACE_ENTRY, 0x88A0003, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0003, 100}, Step{KOR_TRACE_EXIT, 0x88A0003, 0},
                                         Step{KOR_TRACE_ENTRY, 0x88A0002, 0}, Step{KOR_TRACE_EXIT, 0x88A0002, 0}));
  EXPECT_THAT(trace.dump(0x88A0003, 100).items, ElementsAre(bytesOf(TAV_STRUCT_VERSION)));
  for (const Record& record : trace.records())
  {
    EXPECT_EQ(record.code, 0U);
  }
}

TEST(InitParamTrace, ShowsStorageAndOptions)
{
  TAVSSMemory storage(nullptr, 0);
  TraceLog trace;
  const TAVInitParam param(&storage, 0x11);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0001, 0}, Step{KOR_TRACE_VAR, 0x88A0001, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0001, 100}, Step{KOR_TRACE_EXIT, 0x88A0001, 0}));
  EXPECT_THAT(trace.dump(0x88A0001, 100).items, ElementsAre(bytesOf(param)));
  EXPECT_THAT(trace.dump(0x88A0001, 0).items,
              ElementsAre("Side storage object and options", baseOf(storage), bytesOf(uint64_t{0x11})));
}

TEST(InitParamTrace, ShowsEveryField)
{
  TAVSSMemory storage(nullptr, 0);
  TraceLog trace;
  const TAVInitParam param(&storage, 2, 0x30, 0x40, 3, 1);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0001, 0}, Step{KOR_TRACE_VAR, 0x88A0001, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0001, 1}, Step{KOR_TRACE_VAR, 0x88A0001, 2},
                                         Step{KOR_TRACE_VAR, 0x88A0001, 100}, Step{KOR_TRACE_EXIT, 0x88A0001, 0}));
  EXPECT_THAT(trace.dump(0x88A0001, 100).items, ElementsAre(bytesOf(param)));
  EXPECT_THAT(trace.dump(0x88A0001, 0).items,
              ElementsAre(bytesOf(uint64_t{2}), bytesOf(uint64_t{0x30}), bytesOf(uint64_t{0x40})));
  EXPECT_THAT(trace.dump(0x88A0001, 1).items,
              ElementsAre("Side storage object", bytesOf(uint8_t{3}), bytesOf(uint8_t{1})));
  EXPECT_THAT(trace.dump(0x88A0001, 2).items, ElementsAre(baseOf(storage)));
}

TEST(InitParamTrace, TakesNoStorage)
{
  TraceLog trace;
  const TAVInitParam first(nullptr, 1);
  const TAVInitParam second(nullptr, 1, 2, 3, 4, 5);
  EXPECT_EQ(first.pSideStorage, nullptr);
  EXPECT_EQ(second.pSideStorage, nullptr);
  EXPECT_THAT(trace.dump(0x88A0001, 0).items, ElementsAre("Side storage object and options", "", bytesOf(uint64_t{1})));
}

TEST(ResetParam, HasDefaultsAndAVersion)
{
  TAVResetParam param;
  EXPECT_EQ(param.version, 0x09050000U);
  EXPECT_EQ(param.options, 0U);
  EXPECT_EQ(param.getVersion(), 0x09050000U);
  param.version = 8;
  EXPECT_EQ(param.getVersion(), 8U);
}

TEST(ResetParam, TracesItsLife)
{
  TraceLog trace;
  {
    const TAVResetParam param;
    param.getVersion();
    EXPECT_THAT(trace.dump(0x88A0004, 100).items, ElementsAre(bytesOf(param)));
  }
  EXPECT_THAT(trace.dump(0x88A0006, 100).items, ElementsAre(bytesOf(TAV_STRUCT_VERSION)));
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0004, 0}, Step{KOR_TRACE_VAR, 0x88A0004, 100},
                                         Step{KOR_TRACE_EXIT, 0x88A0004, 0}, Step{KOR_TRACE_ENTRY, 0x88A0006, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0006, 100}, Step{KOR_TRACE_EXIT, 0x88A0006, 0},
                                         Step{KOR_TRACE_ENTRY, 0x88A0005, 0}, Step{KOR_TRACE_EXIT, 0x88A0005, 0}));
}

} // namespace
