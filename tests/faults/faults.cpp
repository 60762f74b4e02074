/// Every allocation and every call of the system fails once, in turn, in whole lives of streams. The code that arrives
/// is the right one, the same call works on the healthy system, the result is what it would have been, and nothing is
/// left in memory.
#include <cerrno>
#include <cstdlib>
#include <map>
#include <set>
#include <unistd.h>

#include <gmock/gmock.h>

#include "kor/testFiles.h"
#include "scenarios.h"

namespace
{

using namespace faults;

constexpr const char* kKindNames[kKinds] = {"malloc", "open", "close", "read", "write", "seek", "stat", "lock"};

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
    {"OpenInterrupted", Kind::open, EINTR, kUnseen},
    {"StatFails", Kind::stat, EIO, KOR_RC_IO_ERROR},
    {"ReadFails", Kind::read, EIO, KOR_RC_IO_ERROR},
    {"ReadInterrupted", Kind::read, EINTR, kUnseen},
    {"ReadShort", Kind::read, kShort, kUnseen},
    {"WriteFails", Kind::write, EIO, KOR_RC_IO_ERROR},
    {"WriteWithoutSpace", Kind::write, ENOSPC, KOR_RC_NO_SPACE},
    {"WriteBeyondQuota", Kind::write, EDQUOT, KOR_RC_NO_SPACE},
    {"WriteTooLarge", Kind::write, EFBIG, KOR_RC_FILE_TOO_LARGE},
    {"WriteInterrupted", Kind::write, EINTR, kUnseen},
    {"WriteShort", Kind::write, kShort, kUnseen},
    {"SeekFails", Kind::seek, ESPIPE, KOR_RC_NOT_SEEKABLE},
    {"LockRefused", Kind::lock, EWOULDBLOCK, KOR_RC_LOCKED},
    {"CloseFails", Kind::close, EIO, KOR_RC_IO_ERROR},
};

const Scenario kScenarios[] = {
    {"WriteFile", faults::writeFile},
    {"WriteMemory", writeMemory},
    {"NestDeeply", nestDeeply},
    {"ResetHandle", resetHandle},
    {"ReadFile", faults::readFile},
    {"ReadMemory", readMemory},
};

/// Steps that have no way to report a fault, or that need not: each is told in the operation's documentation.
bool mayBeSilent(const std::string& step, Kind kind)
{
  // A page that cannot be fetched is not needed when all that is written there can go straight to the storage.
  const std::set<Kind> fetch{Kind::read, Kind::seek};
  const std::map<std::string, std::set<Kind>> silent{
      {"add", fetch},
      {"stream", fetch},
      {"close", fetch},
      {"update", fetch},
      {"init", {Kind::malloc}},     // a ring of fewer pages
      {"validate", {Kind::malloc}}, // a header stack is allocated again by its first entry
      {"contain", {Kind::malloc}},
      {"print", {Kind::malloc}},
      {"find", {Kind::malloc}},
      {"destroy", {Kind::close}},                  // a destructor
      {"term", {Kind::write, Kind::seek}},         // reset() before it tells
      {"reset handle", {Kind::write, Kind::seek}}, // likewise
      // Searches the level again.
      {"path", {Kind::malloc, Kind::read, Kind::seek}},
  };
  const auto found = silent.find(step);
  return found != silent.end() && found->second.contains(kind);
}

/// Whether a step may answer a fault with another code than the one of the call that failed.
bool mayAnswer(const Failure& failure, const Fault& fault)
{
  if (failure.code == fault.code) return true;
  const std::string step = failure.step;
  if (fault.kind == Kind::malloc && failure.code == TAV_RC_NO_HDR_STACK) return true;
  // The first node is bounded by the storage's size, which counts as 0 when it is not to be had.
  if (step == "child" && fault.kind == Kind::stat) return failure.code == TAV_RC_NO_MORE_CHILDREN;
  // A search ends where its walk fails. A write whose page could not be fetched is one outside the cached range.
  if (step == "find" || step == "path" || step == "index") return failure.code == TAV_RC_NOT_FOUND;
  return failure.code == TAV_RC_BAD_PARAM && (step == "add" || step == "stream" || step == "close" || step == "update");
}

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
    EXPECT_TRUE(!silent || fault.code == kUnseen || mayBeSilent(life.faultIn, fault.kind)) << "unnoticed";
    for (const Failure& failure : life.failures)
    {
      EXPECT_EQ(failure.step, life.faultIn);
      EXPECT_TRUE(fault.code != kUnseen && mayAnswer(failure, fault)) << korCodeName(failure.code);
    }
  }

  TestFolder folder_;
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
    const uint64_t count = healthy.calls.counts[static_cast<unsigned>(fault.kind)];
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
    if (fault.kind == Kind::malloc) continue; // the sanitizer's
#endif
    faults.push_back(fault);
  }
  return faults;
}

INSTANTIATE_TEST_SUITE_P(Calls, EveryCallFailsOnce, testing::ValuesIn(faultsHere()),
                         [](const auto& one) { return std::string(one.param.name); });

} // namespace
