/// Recorders while somebody sets the time of day: ages are counted by a clock that does not jump.
#include <ctime>
#include <sys/syscall.h>
#include <unistd.h>

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;
using std::chrono::hours;

namespace
{

time_t dayJump = 0;    ///< seconds that the time of day is off by
time_t steadyJump = 0; ///< seconds that have passed on the clock that does not jump

} // namespace

/// Stands in front of the system's.
extern "C" int clock_gettime(clockid_t clock, timespec* time) noexcept
{
  const long result = syscall(SYS_clock_gettime, clock, time);
  if (result == 0 && clock == CLOCK_REALTIME)
  {
    time->tv_sec += dayJump;
  }
  if (result == 0 && clock == CLOCK_MONOTONIC)
  {
    time->tv_sec += steadyJump;
  }
  return static_cast<int>(result);
}

namespace
{

constexpr time_t kHour = 3600;
constexpr time_t kTenYears = 10 * 365 * 24 * kHour;

class LayerRecorderClock : public testing::Test
{
protected:
  void SetUp() override
  {
    std::filesystem::create_directory(folder_.path);
  }
  void TearDown() override
  {
    dayJump = 0;
    steadyJump = 0;
    std::filesystem::remove_all(folder_.path);
  }

  static void add(tav::Recorder& recorder)
  {
    tav::Group root = recorder.group(TAV_ELM_CMN_SYSTEM);
    root.add(SQLM_ELM_ATTR_TIMESTAMP, std::chrono::system_clock::now());
    root.close();
  }

  [[nodiscard]] uint64_t bytesOnDevice() const
  {
    return std::filesystem::file_size(folder_.path / "day-1.tav");
  }
  [[nodiscard]] bool hasSecondFile() const
  {
    return std::filesystem::exists(folder_.path / "day-2.tav");
  }

  const TemporaryPath folder_;
  const std::filesystem::path path_ = folder_.path / "day-%n.tav";
};

} // namespace

TEST_F(LayerRecorderClock, ATimeOfDayThatJumpsChangesNoFileAndSyncsNothing)
{
  tav::Recorder recorder(path_, {.maxAge = hours(1), .syncEvery = hours(1)});
  for (const time_t jump : {time_t{0}, kTenYears, -kTenYears, time_t{0}})
  {
    dayJump = jump;
    add(recorder);
    EXPECT_FALSE(hasSecondFile()) << jump;
    EXPECT_EQ(bytesOnDevice(), 0U) << jump;
  }
  recorder.finish();
  const tav::Reader reader(folder_.path / "day-1.tav");
  std::vector<std::chrono::system_clock::time_point> times;
  for (const tav::Node& root : reader.roots())
  {
    tav::ChildRange children = root.children();
    times.push_back((*children.begin()).as<std::chrono::system_clock::time_point>());
  }
  ASSERT_EQ(times.size(), 4U);
  EXPECT_GT(times[1] - times[0], hours(24 * 365 * 9)) << "what is recorded is the time of day as it was set";
  EXPECT_GT(times[1] - times[2], hours(24 * 365 * 18));
}

TEST_F(LayerRecorderClock, ATimeOfDayThatStandsStillKeepsNothingFromBeingDone)
{
  tav::Recorder recorder(path_, {.maxAge = hours(3), .syncEvery = hours(1)});
  add(recorder);
  EXPECT_EQ(bytesOnDevice(), 0U);
  for (const time_t jump : {kTenYears, -kTenYears})
  {
    dayJump = jump;
    const uint64_t before = bytesOnDevice();
    steadyJump += kHour;
    add(recorder);
    EXPECT_GT(bytesOnDevice(), before) << "an hour has passed";
  }
  steadyJump += kHour;
  EXPECT_FALSE(hasSecondFile());
  add(recorder);
  EXPECT_TRUE(hasSecondFile()) << "three hours have passed";
  recorder.finish();
}
