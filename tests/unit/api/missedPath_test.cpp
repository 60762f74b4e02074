// A search of a path that is not there, which never returns: in a process of its own.
#include <cstdlib>
#include <memory>
#include <vector>

#include <gtest/gtest.h>

#include "support/failingNew.h"
#include "support/reading.h"
#include "support/streams.h"
#include "tav/probes.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ExitedWithCode;

using Path = std::vector<TAVPathEntry>;

/// Watches a search go round and leaves the process after so many rounds, without asking how long they take.
struct Rounds
{
  static constexpr int kGoesRound = 42;
  static constexpr int kWrongLevel = 43;
  static constexpr int kMemoryGrows = 44;
  static constexpr uint32_t kMany = 20000;
  static constexpr uint32_t kSettled = 10000; // the stack has long refused to grow

  uint32_t count = 0;
  int64_t settled = 0;

  static void sink(void* context, const KORTraceRecord* record)
  {
    auto& rounds = *static_cast<Rounds*>(context);
    if (record->probe != probe::findLogicalGroup || record->kind != KOR_TRACE_VAR || record->point != 100)
    {
      return;
    }
    if (*static_cast<const uint32_t*>(record->pItems[0].pData) != 0)
    {
      std::_Exit(kWrongLevel);
    }
    ++rounds.count;
    if (rounds.count == kSettled)
    {
      rounds.settled = allocations::live();
    }
    if (rounds.count == kMany)
    {
      std::_Exit(allocations::live() == rounds.settled ? kGoesRound : kMemoryGrows);
    }
  }
};

class MissedPath : public testing::TestWithParam<Form>
{
protected:
  MissedPath()
      : writer(GetParam()) { root = writer.add(group64(1000)).nodeOffset; }

  void read()
  {
    writer.close();
    reader = std::make_unique<StreamReader>(writer.bytes(), GetParam());
    parent = headerAt(reader->handle(), root);
  }

  /// Does not return when the search is as it should be.
  void searchForever(const Path& path)
  {
    Rounds rounds;
    TAVFindLogicalGroupParam param{};
    param.pPath = path.data();
    param.pathCount = static_cast<uint32_t>(path.size());
    TAVHeaderData out{};
    korTraceStart(&Rounds::sink, &rounds);
    static_cast<void>(tavFindLogicalGroup(0, reader->handle(), &parent, &param, &out));
    korTraceStop();
  }

  StreamWriter writer;
  std::unique_ptr<StreamReader> reader;
  uint64_t root = 0;
  TAVHeader parent{};
};
INSTANTIATE_TEST_SUITE_P(Forms, MissedPath, testing::Values(Form{}, Form{.buffered = true}), kFormName);

TEST_P(MissedPath, WithoutAMatchForItsFirstEntryTheSearchGoesRound)
{
  writer.add(group64(11));
  writer.close();
  writer.add(u32(12, 1));
  read();
  EXPECT_EXIT(searchForever({{0, 10}, {0, 20}}), ExitedWithCode(Rounds::kGoesRound), "");
}

TEST_P(MissedPath, ADataElementIsNoMatchForItsFirstEntry)
{
  writer.add(u32(10, 1));
  writer.add(u32(11, 2));
  read();
  EXPECT_EXIT(searchForever({{0, 10}}), ExitedWithCode(Rounds::kGoesRound), "");
}

TEST_P(MissedPath, NorDoesAnEmptyParentOrABrokenWalkReturn)
{
  read();
  EXPECT_EXIT(searchForever({{0, 10}}), ExitedWithCode(Rounds::kGoesRound), "");
  parent.hdr64.size = 100; // nothing can be read there
  EXPECT_EXIT(searchForever({{0, 10}}), ExitedWithCode(Rounds::kGoesRound), "");
}

} // namespace
