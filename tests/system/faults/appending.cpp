/// A writer goes on in a file that a killed one left, and each call of the system fails once, in turn.
#include <cerrno>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <optional>
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

/// A file that a killed writer left, and the form of its streams.
struct Left
{
  const char* name;
  tav::Width root;
  uint32_t filler;    ///< bytes of the first and the last element of a root: searches look at files piece by piece
  bool leavesOneOpen; ///< behind a root that is whole
  size_t zeros;       ///< at the end
};

/// Roots of numbers, and zeros behind them.
void prepare(const std::string& path, const Left& left)
{
  const bool pairs = left.root == tav::Width::bits64;
  tav::Writer writer(tav::StreamOptions{.root = left.root});
  const auto fill = [&](tav::Group& root) {
    const auto addFiller = [&] {
      if (left.filler != 0)
      {
        root.add(TAV_ELM_CMN_HOST_NAME, std::string(left.filler, 'a'), {.eyeSize = pairs});
      }
    };
    addFiller();
    for (uint32_t i = 0; i < kBefore; ++i) root.add(TAV_ELM_CMN_CPU_ONLINE, i);
    addFiller();
  };
  tav::Group whole = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = pairs});
  fill(whole);
  whole.close();
  std::optional<tav::Group> open;
  if (left.leavesOneOpen)
  {
    open.emplace(writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = pairs}));
    fill(*open);
  }
  const auto bytes = writer.bytes();
  std::ofstream file(path, std::ios::binary);
  file.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
  file << std::string(left.zeros, '\0');
}

uint32_t codeOf(const std::error_code& ec)
{
  return static_cast<uint32_t>(ec.value());
}

/// Everything that a writer does that goes on: what fails is done once more.
void goOn(Steps& steps, const std::string& path, const Left& left, tav::OpenRoot openRoot)
{
  std::unique_ptr<tav::Writer> writer;
  std::error_code ec;
  const auto done = [&ec] { return codeOf(ec); };
  steps.call("open", [&] {
    writer.reset(); // the lock of the first attempt
    const tav::StreamOptions options{.root = left.root, .ringBytes = 16384};
    writer = std::make_unique<tav::Writer>(path, tav::FileOptions{.append = true, .openRoot = openRoot}, options, ec);
    return done();
  });
  auto root = std::make_unique<tav::Group>(writer->resumed());
  if (!root->isOpen())
  {
    steps.call("group", [&] {
      const tav::GroupOptions form{.eyeSize = left.root == tav::Width::bits64};
      root = std::make_unique<tav::Group>(writer->group(TAV_ELM_CMN_SYSTEM, form, ec));
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

std::vector<uint32_t> numbersIn(const std::string& path, tav::Width root)
{
  std::vector<uint32_t> all;
  const tav::Reader reader(tav::FilePath(path), tav::StreamOptions{.root = root});
  for (const tav::Node& one : reader.roots())
  {
    for (const tav::Node& node : one.children())
    {
      if (node.elm() == TAV_ELM_CMN_CPU_ONLINE)
      {
        all.push_back(node.as<uint32_t>());
      }
    }
  }
  return all;
}

std::vector<uint32_t> expected(const Left& left)
{
  std::vector<uint32_t> all;
  for (uint32_t i = 0; i < kBefore; ++i) all.push_back(i);
  for (uint32_t i = left.leavesOneOpen ? 0 : kBefore; i < kBefore + kAdded; ++i) all.push_back(i);
  return all;
}

class AppendingWhileACallFails : public testing::TestWithParam<Kind>
{
protected:
  /// Lets each call fail once, in turn; how many failures the steps told.
  uint64_t failEach(const Left& left, tav::OpenRoot openRoot)
  {
    TestFolder folder;
    const std::string path = folder / "appended.tav";
    Calls& calls = *failingCalls();
    uint64_t told = 0;
    uint64_t count = 1;
    for (uint64_t nth = 0; nth <= count && !HasFailure(); ++nth)
    {
      SCOPED_TRACE(left.name + (", call " + std::to_string(nth)) + " of " + std::to_string(count));
      prepare(path, left);
      calls = Calls{};
      calls.kind = GetParam();
      calls.nth = nth; // 0: none fails
      calls.error = EIO;
      Steps steps;
      goOn(steps, path, left, openRoot);
      const bool happened = calls.happened;
      count = nth == 0 ? calls.counts[static_cast<unsigned>(GetParam())] : count;
      calls = Calls{};
      EXPECT_EQ(happened, nth != 0);
      EXPECT_LE(steps.failures.size(), 1U);
      told += steps.failures.size();
      EXPECT_EQ(numbersIn(path, left.root), expected(left))
          << "the fault was in " << (steps.faultIn != nullptr ? steps.faultIn : "none");
    }
    return told;
  }
};

} // namespace

TEST_P(AppendingWhileACallFails, LosesNothingAndWorksAtTheSecondAttempt)
{
  ASSERT_NE(std::getenv("FAULTS_PRELOADED"), nullptr) << "run by ctest, which preloads the failing calls";
  constexpr Left kSmall{"a root left open", tav::Width::bits64, 0, true, 0};
  constexpr Left kLarge{"roots of many pieces", tav::Width::bits64, 50000, true, 0};
  constexpr Left kNarrow{"32-bit headers and many zeros", tav::Width::bits32, 50000, false, 50000};
  uint64_t told = 0;
  for (const Left& left : {kSmall, kLarge, kNarrow})
  {
    for (const tav::OpenRoot openRoot : {tav::OpenRoot::close, tav::OpenRoot::resume})
    {
      told += failEach(left, openRoot);
    }
  }
  std::printf("%llu failures were told\n", static_cast<unsigned long long>(told));
  EXPECT_GT(told, 0U);
}

INSTANTIATE_TEST_SUITE_P(Calls, AppendingWhileACallFails,
                         testing::Values(Kind::open, Kind::close, Kind::read, Kind::write, Kind::seek, Kind::stat,
                                         Kind::lock, Kind::resize),
                         [](const auto& one) { return kKindNames[static_cast<unsigned>(one.param)]; });
