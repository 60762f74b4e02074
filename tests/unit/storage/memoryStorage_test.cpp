#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <memory>
#include <new>
#include <string_view>

#include "support/failingNew.h"
#include "support/traceLog.h"
#include "tav/tav.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr uint64_t kSize = 10;

/// Ten bytes "0123456789" that a storage wraps. They lie in a heap block of their own.
class MemoryStorage : public testing::Test
{
protected:
  MemoryStorage() { std::memcpy(block.get(), "0123456789", kSize); }

  [[nodiscard]] std::string_view content() const { return {reinterpret_cast<const char*>(block.get()), kSize}; }

  /// Reads with copying.
  uint32_t read(uint64_t wanted, char* to, uint64_t room, uint64_t* pLength)
  {
    void* data = to;
    return storage.read(wanted, &data, room, pLength, false, false);
  }

  std::unique_ptr<uint8_t[]> block{new uint8_t[kSize]};
  TAVSSMemory storage{block.get(), kSize};
  uint64_t length = 0xAAAA;
};

TEST_F(MemoryStorage, WrapsABlockWithoutOwningIt)
{
  EXPECT_EQ(storage.kind, 2U);
  EXPECT_EQ(storage.attributes, 0xE3U);
  EXPECT_EQ(storage.ioUnit, 0x10000U);
  EXPECT_EQ(storage.status, 0U);
  EXPECT_EQ(storage.pBuffer, block.get());
  EXPECT_EQ(storage.bufferSize, kSize);
  EXPECT_EQ(storage.ownsBuffer, 0U);
  EXPECT_EQ(storage.position, 0U);
  EXPECT_TRUE(storage.hasAttributes(0xC0));
}

TEST_F(MemoryStorage, LeavesAWrappedBlockAlone)
{
  const int64_t before = allocations::live();
  {
    const TAVSSMemory other(block.get(), kSize);
  }
  EXPECT_EQ(allocations::live(), before);
  EXPECT_EQ(content(), "0123456789");
}

TEST_F(MemoryStorage, WrapsWhateverItIsGiven)
{
  const TAVSSMemory storageOfNothing(nullptr, 77);
  EXPECT_EQ(storageOfNothing.status, 0U);
  EXPECT_EQ(storageOfNothing.pBuffer, nullptr);
  EXPECT_EQ(storageOfNothing.bufferSize, 77U);
}

TEST_F(MemoryStorage, SeeksToEveryByte)
{
  for (const uint64_t offset : {uint64_t{9}, uint64_t{0}, uint64_t{5}})
  {
    EXPECT_EQ(storage.seek(offset, 0xFFFF), TAV_RC_OK);
    EXPECT_EQ(storage.position, offset);
  }
}

TEST_F(MemoryStorage, RefusesToSeekToItsEnd)
{
  ASSERT_EQ(storage.seek(3, 1), TAV_RC_OK);
  TraceLog trace;
  EXPECT_EQ(storage.seek(10, 1), TAV_RC_BAD_PARAM);
  EXPECT_EQ(storage.seek(~uint64_t{0}, 1), TAV_RC_BAD_PARAM);
  const Failure expected{probe::ssMemorySeek, 10, TAV_RC_BAD_PARAM};
  EXPECT_THAT(trace.failures(), ElementsAre(expected, expected));
  EXPECT_EQ(storage.position, 3U);
}

TEST_F(MemoryStorage, GivesPositionAndSize)
{
  ASSERT_EQ(storage.seek(4, 0), TAV_RC_OK);
  uint64_t position = 0;
  uint64_t size = 0;
  EXPECT_EQ(storage.getPosition(&position), TAV_RC_OK);
  EXPECT_EQ(storage.getTotalSize(&size), TAV_RC_OK);
  EXPECT_EQ(position, 4U);
  EXPECT_EQ(size, 10U);
}

TEST_F(MemoryStorage, NeedsARoomForPositionAndSize)
{
  TraceLog trace;
  EXPECT_EQ(storage.getPosition(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(storage.getTotalSize(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::ssMemoryGetPosition, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::ssMemoryGetTotalSize, 10, TAV_RC_BAD_PARAM}));
}

TEST_F(MemoryStorage, ReadsACopyAndMovesOn)
{
  std::array<char, 4> to{};
  EXPECT_EQ(read(4, to.data(), 4, &length), TAV_RC_OK);
  EXPECT_EQ(std::string_view(to.data(), 4), "0123");
  EXPECT_EQ(length, 4U);
  EXPECT_EQ(storage.position, 4U);
  EXPECT_EQ(read(4, to.data(), 4, &length), TAV_RC_OK);
  EXPECT_EQ(std::string_view(to.data(), 4), "4567");
}

TEST_F(MemoryStorage, ReadsOnlyTheRest)
{
  ASSERT_EQ(storage.seek(8, 0), TAV_RC_OK);
  std::array<char, 4> to{'x', 'x', 'x', 'x'};
  EXPECT_EQ(read(4, to.data(), 4, &length), TAV_RC_OK);
  EXPECT_EQ(std::string_view(to.data(), 4), "89xx");
  EXPECT_EQ(length, 2U);
  EXPECT_EQ(storage.position, 10U);

  TraceLog trace;
  length = 0xAAAA;
  EXPECT_EQ(read(4, to.data(), 4, &length), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::ssMemoryRead, 110, TAV_RC_END_OF_STORAGE}));
  EXPECT_EQ(length, 0xAAAAU);
  EXPECT_EQ(storage.position, 10U);
}

TEST_F(MemoryStorage, CopiesNoMoreThanTheBufferHolds)
{
  std::array<char, 4> to{'x', 'x', 'x', 'x'};
  EXPECT_EQ(read(8, to.data(), 3, &length), TAV_RC_OK);
  EXPECT_EQ(std::string_view(to.data(), 4), "012x");
  EXPECT_EQ(length, 3U);
  EXPECT_EQ(storage.position, 3U);
}

TEST_F(MemoryStorage, PointsIntoTheBlockWithoutCopying)
{
  ASSERT_EQ(storage.seek(6, 0), TAV_RC_OK);
  void* data = nullptr;
  EXPECT_EQ(storage.read(100, &data, 0, &length, true, false), TAV_RC_OK);
  EXPECT_EQ(data, block.get() + 6);
  EXPECT_EQ(length, 4U);
  EXPECT_EQ(storage.position, 10U);
}

TEST_F(MemoryStorage, ReadsForwardAlsoWhenAskedForTheBytesBefore)
{
  ASSERT_EQ(storage.seek(5, 0), TAV_RC_OK);
  std::array<char, 3> to{};
  void* data = to.data();
  EXPECT_EQ(storage.read(3, &data, 3, &length, false, true), TAV_RC_OK);
  EXPECT_EQ(std::string_view(to.data(), 3), "567");
  EXPECT_EQ(storage.position, 8U);
}

TEST_F(MemoryStorage, ReadChecksItsArgumentsInTheirOrder)
{
  TAVSSMemory none(block.get(), 0);
  void* null = nullptr;
  TraceLog trace;
  EXPECT_EQ(none.read(1, nullptr, 1, &length, false, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(none.read(1, &null, 1, nullptr, false, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(none.read(1, &null, 1, &length, false, false), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(length, 0xAAAAU);
  EXPECT_EQ(storage.read(4, &null, 1, &length, false, false), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::ssMemoryRead, 120, TAV_RC_BAD_PARAM},
                                            Failure{probe::ssMemoryRead, 120, TAV_RC_BAD_PARAM},
                                            Failure{probe::ssMemoryRead, 110, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::ssMemoryRead, 90, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(storage.position, 0U);
  EXPECT_EQ(length, 4U); // what there would have been
  EXPECT_EQ(null, nullptr);
}

TEST_F(MemoryStorage, ReadClosesItsTraceUnderTheFilesProbe)
{
  std::array<char, 4> to{};
  TraceLog trace;
  ASSERT_EQ(read(4, to.data(), 3, &length), TAV_RC_OK);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A005D, 0}, Step{KOR_TRACE_VAR, 0x88A005D, 0},
                                         Step{KOR_TRACE_VAR, 0x88A006C, 100}, Step{KOR_TRACE_EXIT, 0x88A005D, 0}));
  EXPECT_THAT(trace.dump(0x88A006C, 100).items, ElementsAre(bytesOf(uint64_t{3}), bytesOf(uint64_t{3})));
}

TEST_F(MemoryStorage, WritesAndMovesOn)
{
  ASSERT_EQ(storage.seek(2, 0), TAV_RC_OK);
  EXPECT_EQ(storage.write("abc", 3, &length), TAV_RC_OK);
  EXPECT_EQ(length, 3U);
  EXPECT_EQ(storage.position, 5U);
  EXPECT_EQ(content(), "01abc56789");
}

TEST_F(MemoryStorage, WritesUpToItsEnd)
{
  ASSERT_EQ(storage.seek(7, 0), TAV_RC_OK);
  EXPECT_EQ(storage.write("abc", 3, &length), TAV_RC_OK);
  EXPECT_EQ(storage.position, 10U);
  EXPECT_EQ(content(), "0123456abc");
  EXPECT_EQ(storage.write("d", 1, &length), TAV_RC_END_OF_STORAGE);
}

TEST_F(MemoryStorage, WritesNothingWhenOneByteWouldNotFit)
{
  ASSERT_EQ(storage.seek(7, 0), TAV_RC_OK);
  TraceLog trace;
  EXPECT_EQ(storage.write("abcd", 4, &length), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(storage.write("abcd", ~uint64_t{0}, &length), TAV_RC_END_OF_STORAGE);
  const Failure expected{probe::ssMemoryWrite, 50, TAV_RC_END_OF_STORAGE};
  EXPECT_THAT(trace.failures(), ElementsAre(expected, expected));
  EXPECT_EQ(content(), "0123456789");
  EXPECT_EQ(storage.position, 7U);
  EXPECT_EQ(length, 0xAAAAU);
}

TEST_F(MemoryStorage, WritesNoBytesToo)
{
  EXPECT_EQ(storage.write("", 0, &length), TAV_RC_OK);
  EXPECT_EQ(length, 0U);
  EXPECT_EQ(storage.position, 0U);
}

TEST_F(MemoryStorage, WriteChecksItsArgumentsInTheirOrder)
{
  TAVSSMemory none(block.get(), 0);
  TraceLog trace;
  EXPECT_EQ(none.write(nullptr, 1, &length), TAV_RC_BAD_PARAM);
  EXPECT_EQ(none.write("a", 1, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(none.write("a", 1, &length), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::ssMemoryWrite, 120, TAV_RC_BAD_PARAM},
                                            Failure{probe::ssMemoryWrite, 120, TAV_RC_BAD_PARAM},
                                            Failure{probe::ssMemoryWrite, 110, TAV_RC_END_OF_STORAGE}));
}

TEST_F(MemoryStorage, WriteTracesArgumentsAndResult)
{
  const void* const data = "ab";
  uint64_t* const pLength = &length;
  TraceLog trace;
  ASSERT_EQ(storage.write(data, 2, pLength), TAV_RC_OK);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0061, 0}, Step{KOR_TRACE_VAR, 0x88A0061, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0061, 100}, Step{KOR_TRACE_EXIT, 0x88A0061, 0}));
  EXPECT_THAT(trace.dump(0x88A0061, 0).items, ElementsAre(bytesOf(data), bytesOf(uint64_t{2}), bytesOf(pLength)));
  EXPECT_THAT(trace.dump(0x88A0061, 100).items, ElementsAre(bytesOf(uint64_t{2}), bytesOf(uint64_t{2})));
}

TEST_F(MemoryStorage, OffersItsBlock)
{
  ASSERT_EQ(storage.seek(5, 0), TAV_RC_OK);
  void* data = nullptr;
  uint64_t size = 0;
  EXPECT_EQ(storage.getMemory(&data, &size), TAV_RC_OK);
  EXPECT_EQ(data, block.get());
  EXPECT_EQ(size, kSize);
  EXPECT_EQ(storage.position, 5U);
}

TEST_F(MemoryStorage, NeedsRoomForBlockAndSize)
{
  void* data = &length;
  uint64_t size = 5;
  TraceLog trace;
  EXPECT_EQ(storage.getMemory(nullptr, &size), TAV_RC_BAD_PARAM);
  EXPECT_EQ(storage.getMemory(&data, nullptr), TAV_RC_BAD_PARAM);
  const Failure expected{probe::ssMemoryGetMemory, 110, TAV_RC_BAD_PARAM};
  EXPECT_THAT(trace.failures(), ElementsAre(expected, expected));
  EXPECT_EQ(data, &length);
  EXPECT_EQ(size, 5U);
}

TEST_F(MemoryStorage, CannotBeLocked)
{
  EXPECT_EQ(storage.lock(0), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(storage.lock(1), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(storage.unlock(), TAV_RC_NOT_SUPPORTED);
}

TEST_F(MemoryStorage, TracesEachOperationUnderItsOwnProbe)
{
  uint64_t number = 0;
  void* data = nullptr;
  TraceLog trace;
  storage.seek(1, 1);
  storage.getPosition(&number);
  storage.getTotalSize(&number);
  storage.getMemory(&data, &number);
  storage.lock(0);
  storage.unlock();
  std::vector<uint32_t> entered;
  for (const Step& step : trace.steps())
  {
    if (step.kind == KOR_TRACE_ENTRY)
    {
      entered.push_back(step.probe);
    }
  }
  EXPECT_THAT(entered, ElementsAre(0x88A005E, 0x88A0057, 0x88A005B, 0x88A0055, 0x88A005C, 0x88A0060));
}

TEST(MemoryStorageOfNoBytes, HasNothingToGiveOrTake)
{
  uint32_t rc = 1;
  TAVSSMemory storage(0, &rc);
  ASSERT_EQ(rc, TAV_RC_OK);
  char byte = 'x';
  void* data = &byte;
  uint64_t length = 0;
  EXPECT_EQ(storage.read(0, &data, 1, &length, false, false), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(storage.read(1, &data, 1, &length, true, false), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(storage.write(&byte, 0, &length), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(storage.write(&byte, 1, &length), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(storage.seek(0, 0), TAV_RC_BAD_PARAM);
  EXPECT_EQ(storage.bufferSize, 0U);
}

TEST(OwnedMemoryStorage, AllocatesItsBlockAndFreesIt)
{
  const int64_t before = allocations::live();
  {
    uint32_t rc = 1;
    TAVSSMemory storage(100, &rc);
    EXPECT_EQ(allocations::live(), before + 1);
    EXPECT_EQ(rc, TAV_RC_OK);
    EXPECT_EQ(storage.status, TAV_RC_OK);
    EXPECT_EQ(storage.kind, 2U);
    EXPECT_EQ(storage.attributes, 0xE3U);
    EXPECT_NE(storage.pBuffer, nullptr);
    EXPECT_EQ(storage.bufferSize, 100U);
    EXPECT_EQ(storage.ownsBuffer, 1U);
    EXPECT_EQ(storage.position, 0U);
    std::memset(storage.pBuffer, 1, 100);
  }
  EXPECT_EQ(allocations::live(), before);
}

TEST(OwnedMemoryStorage, NeedsNoRoomForItsCode)
{
  const TAVSSMemory storage(8, nullptr);
  EXPECT_EQ(storage.status, TAV_RC_OK);
  EXPECT_EQ(storage.bufferSize, 8U);
}

TEST(OwnedMemoryStorage, KeepsTheCodeOfAnAllocationThatFailed)
{
  const int64_t before = allocations::live();
  for (const uint64_t size : {uint64_t{100}, ~uint64_t{0}})
  {
    const allocations::FailNth fail(1);
    uint32_t rc = 1;
    const TAVSSMemory storage(size, &rc);
    EXPECT_EQ(rc, TAV_RC_NO_MEMORY);
    EXPECT_EQ(storage.getStatus(), TAV_RC_NO_MEMORY);
    EXPECT_EQ(storage.pBuffer, nullptr);
    EXPECT_EQ(storage.bufferSize, 0U);
    EXPECT_EQ(storage.ownsBuffer, 0U);
  }
  EXPECT_EQ(allocations::live(), before);
}

TEST(OwnedMemoryStorage, KeepsABlockThatWasTakenFromIt)
{
  const int64_t before = allocations::live();
  void* taken = nullptr;
  {
    uint32_t rc = 1;
    TAVSSMemory storage(8, &rc);
    taken = storage.pBuffer;
    storage.ownsBuffer = 0;
  }
  EXPECT_EQ(allocations::live(), before + 1);
  korMemFree(&taken, 0, 0, nullptr, 0);
}

TEST(MemoryStorageTrace, ShowsItsLife)
{
  std::array<uint8_t, 4> block{};
  TraceLog trace;
  {
    const TAVSSMemory storage(block.data(), block.size());
  }
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0044, 0}, Step{KOR_TRACE_VAR, 0x88A0044, 0},
                                         Step{KOR_TRACE_EXIT, 0x88A0044, 0}, Step{KOR_TRACE_ENTRY, 0x88A0053, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0053, 0}, Step{KOR_TRACE_VAR, 0x88A0053, 100},
                                         Step{KOR_TRACE_EXIT, 0x88A0053, 0}, Step{KOR_TRACE_ENTRY, 0x88A0054, 0},
                                         Step{KOR_TRACE_EXIT, 0x88A0054, 0}, Step{KOR_TRACE_ENTRY, 0x88A0045, 0},
                                         Step{KOR_TRACE_EXIT, 0x88A0045, 0}));
  EXPECT_THAT(trace.failures(), IsEmpty());
  EXPECT_THAT(trace.dump(0x88A0053, 100).items, ElementsAre(bytesOf(block.data()), bytesOf(uint64_t{4})));
}

TEST(MemoryStorageTrace, ShowsTheBlockThatItAllocated)
{
  TraceLog trace;
  uint32_t rc = 1;
  const TAVSSMemory storage(8, &rc);
  EXPECT_THAT(trace.dump(0x88A0053, 100).items, ElementsAre(bytesOf(storage.pBuffer), bytesOf(uint64_t{8})));
}

TEST(MemoryStorageTrace, ShowsWhereASeekLanded)
{
  std::array<uint8_t, 4> block{};
  TAVSSMemory storage(block.data(), block.size());
  TraceLog trace;
  EXPECT_EQ(storage.seek(4, 0), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.dump(probe::ssMemorySeek, 100).items, IsEmpty());
  EXPECT_EQ(storage.seek(3, 0), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::ssMemorySeek, 100).items, ElementsAre(bytesOf(uint64_t{3})));
}

TEST(MemoryStorageTrace, ShowsAnAllocationThatFailed)
{
  TraceLog trace;
  const allocations::FailNth fail(1);
  uint32_t rc = 1;
  uint32_t* const pRc = &rc;
  const TAVSSMemory storage(100, pRc);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::ssMemory, 10, TAV_RC_NO_MEMORY}));
  EXPECT_THAT(trace.dump(probe::ssMemory, 0).items, ElementsAre(bytesOf(uint64_t{100}), bytesOf(pRc)));
  EXPECT_EQ(trace.recordsOf(probe::ssMemory).back().code, TAV_RC_NO_MEMORY);
}

TEST(MemoryStorageEnd, MarksTheObject)
{
  alignas(TAVSSMemory) std::array<unsigned char, sizeof(TAVSSMemory)> room{};
  std::array<uint8_t, 4> block{};
  auto* const storage = new (room.data()) TAVSSMemory(block.data(), block.size());
  const auto statusAt = reinterpret_cast<unsigned char*>(&storage->status) - room.data();
  storage->~TAVSSMemory();
  uint32_t status = 0;
  std::memcpy(&status, room.data() + statusAt, sizeof status);
  EXPECT_EQ(status, 0x90000598U);
}

} // namespace
