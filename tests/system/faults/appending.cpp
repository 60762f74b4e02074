/// A writer goes on in a file that a killed one left, and each call of the system fails once, in turn.
#include <cerrno>
#include <cstdlib>
#include <fstream>
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

constexpr uint32_t kBefore = 5;
constexpr uint32_t kAdded = 40;

/// A file with a root that is whole, and one that was left open.
void prepare(const std::string& path)
{
  tav::Writer writer;
  for (const bool isLast : {false, true})
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    for (uint32_t i = 0; i < kBefore; ++i) root.add(TAV_ELM_CMN_CPU_ONLINE, i);
    if (!isLast)
    {
      continue;
    }
    const auto bytes = writer.bytes();
    std::ofstream(path, std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
  }
}

uint32_t codeOf(const std::error_code& ec)
{
  return static_cast<uint32_t>(ec.value());
}

/// Everything that a writer does that goes on: what fails is done once more.
void goOn(Steps& steps, const std::string& path, tav::OpenRoot openRoot)
{
  std::unique_ptr<tav::Writer> writer;
  std::error_code ec;
  const auto done = [&ec] { return codeOf(ec); };
  steps.call("open", [&] {
    writer.reset(); // the lock of the first attempt
    const tav::StreamOptions options{.ringBytes = 16384};
    writer = std::make_unique<tav::Writer>(path, tav::FileOptions{.append = true, .openRoot = openRoot}, options, ec);
    return done();
  });
  auto root = std::make_unique<tav::Group>(writer->resumed());
  if (!root->isOpen())
  {
    steps.call("group", [&] {
      root = std::make_unique<tav::Group>(writer->group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true}, ec));
      return done();
    });
  }
  for (uint32_t i = 0; i < kAdded; ++i)
  {
    steps.call("add", [&] {
      root->add(TAV_ELM_CMN_CPU_ONLINE, kBefore + i, ec);
      return done();
    });
    steps.call("pad", [&] {
      root->add(TAV_ELM_CMN_HOST_NAME, std::string(1500, 'a'), ec); // over many pages
      return done();
    });
  }
  steps.call("flush", [&] {
    writer->flush(ec);
    return done();
  });
  steps.call("close", [&] {
    root->close(ec);
    return done();
  });
  steps.call("finish", [&] {
    writer->finish(ec);
    return done();
  });
}

std::vector<uint32_t> numbersIn(const std::string& path)
{
  std::vector<uint32_t> all;
  const tav::Reader reader{tav::FilePath(path)};
  for (const tav::Node& root : reader.roots())
  {
    for (const tav::Node& node : root.children())
    {
      if (node.elm() == TAV_ELM_CMN_CPU_ONLINE)
      {
        all.push_back(node.as<uint32_t>());
      }
    }
  }
  return all;
}

std::vector<uint32_t> expected()
{
  std::vector<uint32_t> all;
  for (uint32_t i = 0; i < kBefore; ++i) all.push_back(i);
  for (uint32_t i = 0; i < kBefore + kAdded; ++i) all.push_back(i);
  return all;
}

class AppendingWhileACallFails : public testing::TestWithParam<Kind>
{
};

} // namespace

TEST_P(AppendingWhileACallFails, LosesNothingAndWorksAtTheSecondAttempt)
{
  ASSERT_NE(std::getenv("FAULTS_PRELOADED"), nullptr) << "run by ctest, which preloads the failing calls";
  TestFolder folder;
  const std::string path = folder / "appended.tav";
  Calls& calls = *failingCalls();
  uint64_t told = 0;
  for (const tav::OpenRoot openRoot : {tav::OpenRoot::close, tav::OpenRoot::resume})
  {
    uint64_t count = 1;
    for (uint64_t nth = 0; nth <= count && !HasFailure(); ++nth)
    {
      SCOPED_TRACE("call " + std::to_string(nth) + " of " + std::to_string(count));
      prepare(path);
      calls = Calls{};
      calls.kind = GetParam();
      calls.nth = nth; // 0: none fails
      calls.error = EIO;
      Steps steps;
      goOn(steps, path, openRoot);
      const bool happened = calls.happened;
      count = nth == 0 ? calls.counts[static_cast<unsigned>(GetParam())] : count;
      calls = Calls{};
      EXPECT_EQ(happened, nth != 0);
      EXPECT_LE(steps.failures.size(), 1U);
      told += steps.failures.size();
      EXPECT_EQ(numbersIn(path), expected())
          << "the fault was in " << (steps.faultIn != nullptr ? steps.faultIn : "none");
    }
  }
  std::printf("%llu failures were told\n", static_cast<unsigned long long>(told));
  EXPECT_GT(told, 0U);
}

INSTANTIATE_TEST_SUITE_P(Calls, AppendingWhileACallFails,
                         testing::Values(Kind::open, Kind::close, Kind::read, Kind::write, Kind::seek, Kind::stat,
                                         Kind::lock, Kind::resize),
                         [](const auto& one) { return kKindNames[static_cast<unsigned>(one.param)]; });
