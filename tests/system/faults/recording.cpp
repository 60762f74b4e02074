/// A recorder goes on in a file, changes files and removes old ones, and each call of the system fails once, in turn.
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <system_error>
#include <vector>

#include <gtest/gtest.h>

#include "kor/testFiles.h"
#include "scenarios.h"
#include "steps.h"
#include "tav/tav.hpp"

namespace
{

using namespace faults;

constexpr uint32_t kBefore = 3;
constexpr uint32_t kRoots = 12;
constexpr uint64_t kKept = 3;

uint32_t codeOf(const std::error_code& ec)
{
  return static_cast<uint32_t>(ec.value());
}

/// Records whole roots. What fails is done once more; behind a sync that failed the next file begins instead, so that
/// the root's bytes are tried no further.
void record(Steps& steps, const std::string& path, const tav::RecorderOptions& options, uint32_t from, uint32_t to)
{
  std::unique_ptr<tav::Recorder> recorder;
  std::error_code ec;
  const auto done = [&ec] { return codeOf(ec); };
  steps.call("open", [&] {
    recorder.reset(); // the lock of the first attempt
    recorder = std::make_unique<tav::Recorder>(path, options, tav::StreamOptions{.ringBytes = 16384}, ec);
    return done();
  });
  for (uint32_t i = from; i < to && !testing::Test::HasFailure(); ++i)
  {
    std::unique_ptr<tav::Group> root;
    steps.call("group", [&] {
      root = std::make_unique<tav::Group>(recorder->group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true}, ec));
      return done();
    });
    for (uint32_t part = 0; part < 6 && root->isOpen(); ++part)
    {
      steps.call("add", [&] {
        part == 0 ? root->add(TAV_ELM_CMN_CPU_ONLINE, i, ec)
                  : root->add(TAV_ELM_CMN_HOST_NAME, std::string(1500, 'a'), ec);
        return done();
      });
    }
    steps.call("close", [&] {
      if (root->isOpen())
      {
        root->close(ec);
        return done();
      }
      recorder->sync(ec);
      const bool isDoubtful = failingCalls()->kind == Kind::sync || failingCalls()->kind == Kind::open;
      return isDoubtful ? TAV_RC_OK : done();
    });
  }
  steps.call("finish", [&] {
    recorder->finish(ec);
    return done();
  });
}

/// The numbers in a folder's files, one file after the other; `files`: how many there are.
std::vector<uint32_t> numbersIn(const TestFolder& folder, uint64_t& files)
{
  std::vector<uint32_t> all;
  files = 0;
  constexpr int most = 40;
  for (int file = 1; file < most; ++file)
  {
    const std::string path = folder / ("x-" + std::to_string(file) + ".tav");
    if (!std::filesystem::exists(path) || std::filesystem::is_empty(path))
    {
      continue; // one that was made, and could not be opened further
    }
    ++files;
    const tav::Reader reader{tav::FilePath(path)};
    for (const tav::Node& root : reader.roots())
    {
      EXPECT_FALSE(root.isOpen());
      tav::ChildRange children = root.children();
      all.push_back((*children.begin()).as<uint32_t>());
    }
  }
  return all;
}

class RecordingWhileACallFails : public testing::TestWithParam<Kind>
{
};

} // namespace

TEST_P(RecordingWhileACallFails, LosesNothingAndGoesOn)
{
  ASSERT_NE(std::getenv("FAULTS_PRELOADED"), nullptr) << "run by ctest, which preloads the failing calls";
  Calls& calls = *failingCalls();
  const bool removes = GetParam() == Kind::remove;
  const tav::RecorderOptions options{
      .maxBytes = 14'000, .keep = removes ? kKept : 0, .syncEvery = std::chrono::nanoseconds(0)};
  uint64_t told = 0;
  uint64_t count = 1;
  for (uint64_t nth = 0; nth <= count && !HasFailure(); ++nth)
  {
    SCOPED_TRACE("call " + std::to_string(nth) + " of " + std::to_string(count));
    const TestFolder folder;
    const std::string path = folder / "x-%n.tav";
    calls = Calls{};
    Steps healthy(false);
    record(healthy, path, options, 0, kBefore);
    calls.kind = GetParam();
    calls.nth = nth; // 0: none fails
    calls.error = EIO;
    Steps steps;
    record(steps, path, options, kBefore, kRoots);
    const bool happened = calls.happened;
    count = nth == 0 ? calls.counts[static_cast<unsigned>(GetParam())] : count;
    calls = Calls{};
    EXPECT_EQ(happened, nth != 0);
    told += steps.failures.size();
    uint64_t files = 0;
    const std::vector<uint32_t> found = numbersIn(folder, files);
    const std::string where = steps.faultIn != nullptr ? steps.faultIn : "none";
    // What the last change of files could not remove would go at the next one.
    EXPECT_EQ(files <= kKept + (nth != 0 && nth == count ? 1 : 0), removes) << "the fault was in " << where;
    std::vector<uint32_t> expected;
    for (uint32_t i = removes ? kRoots - static_cast<uint32_t>(found.size()) : 0; i < kRoots; ++i)
    {
      expected.push_back(i);
    }
    EXPECT_EQ(found, expected) << "the fault was in " << where;
  }
  std::printf("%llu failures were told in %llu runs\n", static_cast<unsigned long long>(told),
              static_cast<unsigned long long>(count + 1));
  EXPECT_GT(told, 0U);
}

INSTANTIATE_TEST_SUITE_P(Calls, RecordingWhileACallFails,
                         testing::Values(Kind::open, Kind::close, Kind::read, Kind::write, Kind::seek, Kind::stat,
                                         Kind::lock, Kind::sync, Kind::resize, Kind::remove),
                         [](const auto& one) { return kKindNames[static_cast<unsigned>(one.param)]; });
