#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <cstring>
#include <new>

#include "support/traceLog.h"
#include "tav/tav.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ElementsAre;

/// The least that derives from the base.
class Bare : public TAVSideStorage
{
public:
  Bare() = default;
  Bare(uint32_t storageKind, uint64_t attributeBits)
      : TAVSideStorage(storageKind, attributeBits)
  {
  }

  uint32_t seek(uint64_t, uint64_t) override { return 100; }
  uint32_t getPosition(uint64_t*) override { return 101; }
  uint32_t getTotalSize(uint64_t*) override { return 102; }
  uint32_t read(uint64_t, void**, uint64_t, uint64_t*, bool, bool) override { return 103; }
  uint32_t write(const void*, uint64_t, uint64_t*) override { return 104; }
  uint32_t getMemory(void**, uint64_t*) override { return 105; }
  uint32_t lock(uint32_t) override { return 106; }
  uint32_t unlock() override { return 107; }
};

void expectFresh(const Bare& storage, uint32_t kind, uint64_t attributes)
{
  EXPECT_EQ(storage.kind, kind);
  EXPECT_EQ(storage.attributes, attributes);
  EXPECT_EQ(storage.ioUnit, 0x10000U);
  EXPECT_EQ(storage.status, 0U);
}

TEST(SideStorage, BeginsUsableWithoutAttributes)
{
  expectFresh(Bare(), 0, 0);
}

TEST(SideStorage, TakesKindAndAttributes)
{
  expectFresh(Bare(9, 0x123456789AB), 9, 0x123456789AB);
}

TEST(SideStorage, HasTheAttributesOfAMaskWhenAllAreThere)
{
  const Bare storage(0, 0x43);
  EXPECT_TRUE(storage.hasAttributes(0));
  EXPECT_TRUE(storage.hasAttributes(0x1));
  EXPECT_TRUE(storage.hasAttributes(0x43));
  EXPECT_FALSE(storage.hasAttributes(0x4));
  EXPECT_FALSE(storage.hasAttributes(0xC0));
  EXPECT_FALSE(storage.hasAttributes(0x47));
}

TEST(SideStorage, GivesItsStatus)
{
  Bare storage;
  EXPECT_EQ(storage.getStatus(), 0U);
  storage.status = 0x90000031;
  EXPECT_EQ(storage.getStatus(), 0x90000031U);
}

/// Where a virtual operation is in the table: its member pointer begins with the slot's offset, which some platforms
/// mark by adding 1.
template<class Operation>
uint64_t slotOf(Operation operation)
{
  std::array<uintptr_t, 2> words{};
  static_assert(sizeof operation == sizeof words);
  std::memcpy(words.data(), &operation, sizeof words);
  return words[0] / sizeof(uintptr_t);
}

TEST(SideStorage, ItsOperationsStandInTheirSlots)
{
  EXPECT_EQ(slotOf(&TAVSideStorage::seek), 0U);
  EXPECT_EQ(slotOf(&TAVSideStorage::getPosition), 1U);
  EXPECT_EQ(slotOf(&TAVSideStorage::getTotalSize), 2U);
  EXPECT_EQ(slotOf(&TAVSideStorage::read), 3U);
  EXPECT_EQ(slotOf(&TAVSideStorage::write), 4U);
  EXPECT_EQ(slotOf(&TAVSideStorage::getMemory), 5U);
  EXPECT_EQ(slotOf(&TAVSideStorage::lock), 6U);
  EXPECT_EQ(slotOf(&TAVSideStorage::unlock), 7U);
}

TEST(SideStorage, IsMarkedWhenItIsDestroyed)
{
  alignas(Bare) std::array<unsigned char, sizeof(Bare)> room{};
  auto* const storage = new (room.data()) Bare(0, 0xC0);
  const auto at = reinterpret_cast<unsigned char*>(&storage->status) - room.data();
  // Called through a pointer that the compiler cannot see through: it would take the bytes for gone afterwards.
  void (*volatile destroy)(TAVSideStorage&) = [](TAVSideStorage& ended) { ended.~TAVSideStorage(); };
  destroy(*storage);
  uint32_t status = 0;
  std::memcpy(&status, room.data() + at, sizeof status);
  EXPECT_EQ(status, 0x90000598U);
}

TEST(SideStorageTrace, ShowsItsLife)
{
  TraceLog trace;
  {
    const Bare first;
    const Bare second(1, 2);
  }
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0044, 0}, Step{KOR_TRACE_VAR, 0x88A0044, 0},
                                         Step{KOR_TRACE_EXIT, 0x88A0044, 0}, Step{KOR_TRACE_ENTRY, 0x88A0044, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0044, 0}, Step{KOR_TRACE_EXIT, 0x88A0044, 0},
                                         Step{KOR_TRACE_ENTRY, 0x88A0045, 0}, Step{KOR_TRACE_EXIT, 0x88A0045, 0},
                                         Step{KOR_TRACE_ENTRY, 0x88A0045, 0}, Step{KOR_TRACE_EXIT, 0x88A0045, 0}));
  EXPECT_THAT(trace.recordsOf(0x88A0044)[4].items, ElementsAre(bytesOf(uint32_t{1}), bytesOf(uint64_t{2})));
}

TEST(SideStorageTrace, ShowsItsAccessors)
{
  const Bare storage;
  TraceLog trace;
  storage.getStatus();
  storage.hasAttributes(0xC0);
  EXPECT_THAT(trace.steps(), ElementsAre(Step{KOR_TRACE_ENTRY, 0x88A0047, 0}, Step{KOR_TRACE_VAR, 0x88A0047, 100},
                                         Step{KOR_TRACE_EXIT, 0x88A0047, 0}, Step{KOR_TRACE_ENTRY, 0x88A0050, 0},
                                         Step{KOR_TRACE_VAR, 0x88A0050, 0}, Step{KOR_TRACE_VAR, 0x88A0050, 100},
                                         Step{KOR_TRACE_EXIT, 0x88A0050, 0}));
  EXPECT_THAT(trace.dump(0x88A0047, 100).items, ElementsAre(bytesOf(uint32_t{0})));
  EXPECT_THAT(trace.dump(0x88A0050, 0).items, ElementsAre(bytesOf(uint64_t{0xC0})));
  EXPECT_THAT(trace.dump(0x88A0050, 100).items, ElementsAre(bytesOf(false)));
}

} // namespace
