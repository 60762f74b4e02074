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

/// What a parameter object holds behind its version.
struct Fields
{
  const TAVSideStorage* storage = nullptr;
  uint64_t options = 1;
  uint64_t ringBytes = 0xA00000;
  uint64_t auxSize = 0x20000;
  uint8_t byteOrder = 0;
  uint8_t alignMode = 0;
};

void expectFields(const TAVInitParam& param, const Fields& fields)
{
  EXPECT_EQ(param.version, 0x09050000U);
  EXPECT_EQ(param.pSideStorage, fields.storage);
  EXPECT_EQ(param.options, fields.options);
  EXPECT_EQ(param.circularBufSize, fields.ringBytes);
  EXPECT_EQ(param.auxSize, fields.auxSize);
  EXPECT_EQ(param.byteOrder, fields.byteOrder);
  EXPECT_EQ(param.alignMode, fields.alignMode);
}

TEST(InitParam, HasDefaults)
{
  expectFields(TAVInitParam(), {});
}

TEST(InitParam, TakesStorageAndOptions)
{
  std::array<uint8_t, 8> block{};
  TAVSSMemory storage(block.data(), block.size());
  expectFields(TAVInitParam(&storage, 0x12), {.storage = &storage, .options = 0x12});
}

TEST(InitParam, TakesEveryField)
{
  std::array<uint8_t, 8> block{};
  TAVSSMemory storage(block.data(), block.size());
  expectFields(TAVInitParam(&storage, 4, 0x1111, 0x2222, 3, 1), {&storage, 4, 0x1111, 0x2222, 3, 1});
}

TEST(InitParam, GivesTheVersionThatItHolds)
{
  TAVInitParam param;
  EXPECT_EQ(param.getVersion(), 0x09050000U);
  param.version = 7;
  EXPECT_EQ(param.getVersion(), 7U);
}

/// The trace of an object that is made, asked for its version, and goes.
template<class Param>
void expectLife(uint32_t made, uint32_t asked, uint32_t gone)
{
  TraceLog trace;
  {
    const Param param;
    param.getVersion();
    EXPECT_THAT(trace.dump(made, 100).items, ElementsAre(bytesOf(param)));
  }
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, made, 0}, Step{KOR_TRACE_VAR, made, 100},
                                         Step{KOR_TRACE_EXIT, made, 0}, Step{KOR_TRACE_ENTRY, asked, 0},
                                         Step{KOR_TRACE_VAR, asked, 100}, Step{KOR_TRACE_EXIT, asked, 0},
                                         Step{KOR_TRACE_ENTRY, gone, 0}, Step{KOR_TRACE_EXIT, gone, 0}));
  EXPECT_THAT(trace.dump(asked, 100).items, ElementsAre(bytesOf(TAV_STRUCT_VERSION)));
  for (const Record& record : trace.records())
  {
    EXPECT_EQ(record.code, 0U);
  }
}

TEST(InitParamTrace, ShowsItsLife)
{
  expectLife<TAVInitParam>(0x88A0001, 0x88A0003, 0x88A0002);
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
  expectLife<TAVResetParam>(0x88A0004, 0x88A0006, 0x88A0005);
}

} // namespace
