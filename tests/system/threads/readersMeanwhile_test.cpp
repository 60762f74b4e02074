/// One writer records into a file, and readers open it at any moment: closed groups are final.
#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "tav/tav.hpp"
#include "tools/host/host.h"

namespace
{

constexpr unsigned kReaders = 3;
constexpr uint32_t kValues = 20;

std::chrono::milliseconds lasting()
{
  const char* const wanted = std::getenv("TAV_MEANWHILE_MS"); // a minute: meanwhile.sh
  return std::chrono::milliseconds(wanted != nullptr ? std::strtoll(wanted, nullptr, 10) : 1500);
}

/// What the threads share.
struct Shared
{
  std::string path;
  std::atomic<uint32_t> flushed{0}; ///< roots that the system has
  std::atomic<bool> isOver{false};
};

void record(Shared& shared)
{
  constexpr auto round = std::chrono::milliseconds(1500);
  constexpr uint32_t most = 3000; // a reader walks all of them
  const auto end = std::chrono::steady_clock::now() + std::min(round, lasting());
  tav::Writer writer(shared.path, {.append = true}, {.ringBytes = 2U << 20U});
  for (uint32_t i = 0; i == 0 || (std::chrono::steady_clock::now() < end && i < most); ++i)
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = i % 2 == 0});
    tav::Group host = root.group(TAV_ELM_CMN_HOST);
    for (uint32_t value = 0; value < kValues; ++value)
    {
      host.add(TAV_ELM_CMN_CPU_ONLINE, i);
      host.add(TAV_ELM_CMN_HOST_NAME, std::string(1 + (i + value) % 700, 'x'));
    }
    host.close();
    if (i % 5 == 0)
    {
      writer.flush();
    }
    root.close();
    if (i % 3 == 0)
    {
      writer.flush();
      shared.flushed.store(i + 1);
    }
  }
  writer.finish();
  shared.isOver.store(true);
}

/// Walks what there is once. The first `due` roots are closed, whole and in their order; behind them is what is
/// just being written, which may end anywhere. How many of the first ones there are.
uint32_t walk(const Shared& shared, uint32_t due)
{
  const tav::Reader reader(shared.path, {.ringBytes = 2U << 20U, .access = tav::Access::ring});
  uint32_t roots = 0;
  std::error_code ec;
  for (const tav::Node& root : reader.roots(ec))
  {
    uint32_t values = 0;
    std::error_code below;
    EXPECT_TRUE(roots >= due || !root.isOpen());
    for (const tav::Node& node : root.descendants(below))
    {
      const bool isValue = node.elm() == TAV_ELM_CMN_CPU_ONLINE && node.size() == sizeof(uint32_t);
      std::error_code unread;
      const uint32_t value = isValue ? node.as<uint32_t>(unread) : roots;
      EXPECT_TRUE(roots >= due || value == roots) << value << " in root " << roots;
      values += isValue ? 1 : 0;
    }
    if (roots >= due || testing::Test::HasFailure())
    {
      continue;
    }
    EXPECT_FALSE(below) << below.message();
    EXPECT_EQ(values, kValues) << "of root " << roots;
    ++roots;
  }
  return roots;
}

void read(const Shared& shared, std::atomic<uint64_t>& walks)
{
  bool isLast = false;
  while (!isLast && !testing::Test::HasFailure())
  {
    isLast = shared.isOver.load();
    const uint32_t due = shared.flushed.load();
    if (due == 0)
    {
      continue;
    }
    EXPECT_GE(walk(shared, due), due);
    ++walks;
  }
}

/// One file from its first root to its last.
uint64_t runRound()
{
  Shared shared;
  shared.path = tav::host::textOf(std::filesystem::temp_directory_path() /
                                  ("tav-meanwhile-" + std::to_string(tav::host::processId())));
  std::filesystem::remove(shared.path);
  std::atomic<uint64_t> walks{0};
  std::vector<std::thread> readers;
  for (unsigned i = 0; i < kReaders; ++i)
  {
    readers.emplace_back([&] { read(shared, walks); });
  }
  record(shared);
  for (std::thread& reader : readers)
  {
    reader.join();
  }
  EXPECT_GE(walks.load(), kReaders);
  std::filesystem::remove(shared.path);
  return walks.load();
}

} // namespace

TEST(ReadersMeanwhile, SeeClosedGroupsWholeAndAllThatWasFlushed)
{
  const auto end = std::chrono::steady_clock::now() + lasting();
  uint64_t walks = 0;
  uint64_t files = 0;
  do
  {
    walks += runRound();
    ++files;
  } while (std::chrono::steady_clock::now() < end && !HasFailure());
  std::printf("%llu files, %llu walks through them\n", static_cast<unsigned long long>(files),
              static_cast<unsigned long long>(walks));
}
