/// Every allocation and every call of the system fails once, in turn, in whole lives of streams. The code that arrives
/// is the right one, the same call works on the healthy system, the result is what it would have been, and nothing is
/// left in memory.
#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <iterator>
#include <set>
#include <unistd.h>

#include <gmock/gmock.h>

#include "kor/testFiles.h"
#include "scenarios.h"

namespace
{

using namespace faults;

/// A fault, and the code that is to arrive.
struct Fault
{
  const char* name;
  Kind kind;
  int error;
  uint32_t code;
};

constexpr uint32_t kUnseen = TAV_RC_OK;

constexpr Fault kFaults[] = {
    {"NoMemory", Kind::malloc, ENOMEM, TAV_RC_NO_MEMORY},
    {"OpenRefused", Kind::open, EACCES, KOR_RC_NO_PERMISSION},
    {"OpenWithoutDescriptors", Kind::open, EMFILE, KOR_RC_TOO_MANY_FILES},
    {"OpenFailsInNoKnownWay", Kind::open, EPROTO, KOR_RC_OS_ERROR},
    {"OpenInterrupted", Kind::open, EINTR, kUnseen},
    {"StatFails", Kind::stat, EIO, KOR_RC_IO_ERROR},
    {"ReadFails", Kind::read, EIO, KOR_RC_IO_ERROR},
    {"ReadFailsHalfway", Kind::read, kHalfway, KOR_RC_IO_ERROR},
    {"ReadInterrupted", Kind::read, EINTR, kUnseen},
    {"ReadShort", Kind::read, kShort, kUnseen},
    {"WriteFails", Kind::write, EIO, KOR_RC_IO_ERROR},
    {"WriteFailsHalfway", Kind::write, kHalfway, KOR_RC_IO_ERROR},
    {"WriteWithoutSpace", Kind::write, ENOSPC, KOR_RC_NO_SPACE},
    {"WriteBeyondQuota", Kind::write, EDQUOT, KOR_RC_NO_SPACE},
    {"WriteTooLarge", Kind::write, EFBIG, KOR_RC_FILE_TOO_LARGE},
    {"WriteInterrupted", Kind::write, EINTR, kUnseen},
    {"WriteShort", Kind::write, kShort, kUnseen},
    {"SeekFails", Kind::seek, ESPIPE, KOR_RC_NOT_SEEKABLE},
    {"LockRefused", Kind::lock, EWOULDBLOCK, KOR_RC_LOCKED},
    {"CloseFails", Kind::close, EIO, KOR_RC_IO_ERROR},
    {"SyncFails", Kind::sync, EIO, KOR_RC_IO_ERROR},
    {"SyncInterrupted", Kind::sync, EINTR, kUnseen},
    {"SyncIsNotPossible", Kind::sync, EINVAL, kUnseen}, // some file systems have none for folders
};

const Scenario kScenarios[] = {
    {"WriteFile", faults::writeFile},
    {"WriteMemory", writeMemory},
    {"NestDeeply", nestDeeply},
    {"ResetHandle", resetHandle},
    {"ReadFile", faults::readFile},
    {"ReadMemory", readMemory},
    {"FollowPaths", faults::followPaths},
    {"AskDevice", askDevice},
};

/// What a step answers to a fault where that is not the code of the call that failed. Each of them is met: a row that
/// is not needed any more is a failure, too.
struct OtherAnswer
{
  const char* step;
  Kind kind;
  uint32_t code;
};

constexpr OtherAnswer kOtherAnswers[] = {
    // A page that cannot be fetched is not needed when all that is written there can go straight to the storage. Else
    // the write is one outside the cached range, also where the page that had to make room could not be written.
    {"add", Kind::read, kUnseen},
    {"add", Kind::read, TAV_RC_BAD_PARAM},
    {"add", Kind::seek, kUnseen},
    {"add", Kind::seek, TAV_RC_BAD_PARAM},
    {"stream", Kind::read, TAV_RC_BAD_PARAM},
    {"close", Kind::read, kUnseen},
    {"close", Kind::read, TAV_RC_BAD_PARAM},
    {"close", Kind::seek, TAV_RC_BAD_PARAM},
    {"close", Kind::write, TAV_RC_BAD_PARAM},
    // A ring of fewer pages.
    {"init", Kind::malloc, kUnseen},
    // Without a header stack there is a code for that; one without entries gets them with its first entry.
    {"init", Kind::malloc, TAV_RC_NO_HDR_STACK},
    {"validate", Kind::malloc, kUnseen},
    {"validate", Kind::malloc, TAV_RC_NO_HDR_STACK},
    {"contain", Kind::malloc, kUnseen},
    {"contain", Kind::malloc, TAV_RC_NO_HDR_STACK},
    {"print", Kind::malloc, kUnseen},
    {"print", Kind::malloc, TAV_RC_NO_HDR_STACK},
    {"find", Kind::malloc, kUnseen},
    {"find", Kind::malloc, TAV_RC_NO_HDR_STACK},
    {"path", Kind::malloc, kUnseen}, // its stacks are members
    // A search ends where its walk fails.
    {"find", Kind::read, TAV_RC_NOT_FOUND},
    {"find", Kind::seek, TAV_RC_NOT_FOUND},
    {"index", Kind::read, TAV_RC_NOT_FOUND},
    {"index", Kind::seek, TAV_RC_NOT_FOUND},
    // The first node is bounded by the storage's size, which counts as 0 when it is not to be had.
    {"child", Kind::stat, TAV_RC_NO_MORE_CHILDREN},
    // A folder was only read.
    {"sync", Kind::close, kUnseen},
    // A destructor has no code.
    {"destroy", Kind::close, kUnseen},
};

struct Life
{
  Calls calls{};
  std::string result{};
  std::vector<Failure> failures{};
  std::string faultIn{};
  int64_t left = 0; ///< blocks
};

Life live(const Scenario& scenario, const std::string& path, Kind kind = Kind::malloc, uint64_t nth = 0, int error = 0)
{
  Life life;
  life.result.reserve(4096);
  life.failures.reserve(8);
  life.faultIn.reserve(64);
  const int64_t before = failingCallsLiveBlocks();
  Calls& calls = *failingCalls();
  calls = Calls{};
  calls.kind = kind;
  calls.nth = nth;
  calls.error = error;
  {
    Steps steps;
    life.result.assign(scenario.run(steps, path));
    life.failures.assign(steps.failures.begin(), steps.failures.end());
    life.faultIn.assign(steps.faultIn != nullptr ? steps.faultIn : "");
    life.calls = calls;
    calls = Calls{};
  }
  life.left = failingCallsLiveBlocks() - before;
  return life;
}

class EveryCallFailsOnce : public testing::TestWithParam<Fault>
{
protected:
  void SetUp() override
  {
    ASSERT_NE(std::getenv("FAULTS_PRELOADED"), nullptr) << "run by ctest, which preloads the failing calls";
  }

  void expectRight(const Life& life, const Life& healthy, const Fault& fault)
  {
    ASSERT_TRUE(life.calls.happened);
    EXPECT_EQ(life.result, healthy.result) << "after a second attempt";
    EXPECT_EQ(life.left, healthy.left) << "blocks left";
    EXPECT_LE(life.failures.size(), 1U) << "one fault, one failure";
    const bool silent = life.failures.empty();
    silent_ += silent ? 1 : 0;
    const uint32_t code = silent ? kUnseen : life.failures.front().code;
    EXPECT_TRUE(silent || life.failures.front().step == life.faultIn) << "told by another step";
    if (code == fault.code)
    {
      return;
    }
    const auto answers = [&](const OtherAnswer& one) {
      return one.step == life.faultIn && one.kind == fault.kind && one.code == code;
    };
    const auto* const row = std::find_if(std::begin(kOtherAnswers), std::end(kOtherAnswers), answers);
    ASSERT_TRUE(fault.code != kUnseen && row != std::end(kOtherAnswers)) << "answered with " << korCodeName(code);
    met_.insert(row);
  }

  /// Every other answer to this kind of fault was given.
  void expectAllMet(const Fault& fault) const
  {
    for (const OtherAnswer& row : kOtherAnswers)
    {
      EXPECT_TRUE(fault.code == kUnseen || row.kind != fault.kind || met_.contains(&row))
          << row.step << " never answers with " << korCodeName(row.code);
    }
  }

  TestFolder folder_;
  std::set<const OtherAnswer*> met_;
  uint64_t silent_ = 0;
};

TEST_P(EveryCallFailsOnce, AndTheSecondAttemptWorks)
{
  const Fault& fault = GetParam();
  uint64_t met = 0;
  for (const Scenario& scenario : kScenarios)
  {
    const std::string path = folder_ / scenario.name;
    live(scenario, path); // what the system keeps after a first time is not counted
    const Life healthy = live(scenario, path);
    ASSERT_TRUE(healthy.failures.empty()) << scenario << ": " << healthy.failures.front().step;
    uint64_t count = healthy.calls.counts[static_cast<unsigned>(fault.kind)];
    if (fault.error == kHalfway && count != 0)
    {
      --count; // the one behind fails
    }
    for (uint64_t nth = 1; nth <= count && !HasFailure(); ++nth)
    {
      const Life life = live(scenario, path, fault.kind, nth, fault.error);
      SCOPED_TRACE(std::string(scenario.name) + ", " + kKindNames[static_cast<unsigned>(fault.kind)] + " " +
                   std::to_string(nth) + " of " + std::to_string(count) + ", in " + life.faultIn);
      expectRight(life, healthy, fault);
      ++met;
    }
  }
  EXPECT_GT(met, 0U) << "the scenarios make such calls";
  expectAllMet(fault);
  RecordProperty("faults", static_cast<int>(met));
  std::printf("%llu faults, %llu of them without a word\n", static_cast<unsigned long long>(met),
              static_cast<unsigned long long>(silent_));
}

std::vector<Fault> faultsHere()
{
  std::vector<Fault> faults;
  for (const Fault& fault : kFaults)
  {
#if defined(FAULTS_WITHOUT_MALLOC)
    if (fault.kind == Kind::malloc)
    {
      continue; // the sanitizer's
    }
#endif
    faults.push_back(fault);
  }
  return faults;
}

INSTANTIATE_TEST_SUITE_P(Calls, EveryCallFailsOnce, testing::ValuesIn(faultsHere()),
                         [](const auto& one) { return std::string(one.param.name); });

} // namespace
