#include <atomic>
#include <chrono>
#include <filesystem>
#include <list>
#include <numeric>
#include <string>
#include <thread>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/document/follower.h"
#include "inspect/growing.h"
#include "inspect/streams.h"
#include "tav/inspect/document.hpp"

using namespace tav::inspect;
using namespace std::chrono_literals;
using test::Bytes;
using test::number;
using test::numbers;
using test::openHeader;
using test::part;
using test::sizeBytes;
using testing::ElementsAre;
using testing::IsEmpty;

namespace
{

/// A file that is written piece by piece, and a follower that is asked after each.
class Follow : public testing::Test
{
protected:
  void append(const Bytes& bytes, const std::filesystem::path& path) { test::append(path, bytes); }
  void append(const Bytes& bytes) { append(bytes, file_.path); }
  void patch(uint64_t offset, const Bytes& bytes) { test::patch(file_.path, offset, bytes); }

  /// What is new: elements, with the value of those that are Uint32.
  std::vector<std::string> news()
  {
    told_.clear();
    follower_.goOn();
    return told_;
  }

  const test::TemporaryPath file_;
  const test::TemporaryPath other_;
  std::vector<std::string> told_;
  tav::inspect::StopSource stop_;
  const std::function<void(const tav::Node&)> onNode_ = [this](const tav::Node& node) {
    std::string text(node.tag());
    if (node.type() == TAV_TYPE_UINT32)
    {
      text += ' ' + std::to_string(node.as<uint32_t>());
    }
    told_.push_back(text);
  };
  Follower follower_{tav::FilePath(file_.path).text(), DocumentOptions{}, onNode_, stop_.get_token()};
};

} // namespace

TEST_F(Follow, TellsTheSameWhenAskedForAFewNodesAtATime)
{
  const auto inSteps = [&](uint64_t most) {
    told_.clear();
    append(numbers({1, 2, 3}));
    append(numbers({4}));
    FollowTold told;
    told.node = [&](const Arrival& arrival) { told_.push_back(pathText(arrival)); };
    told.rootEnd = [&](const Arrival& arrival) { told_.push_back("end of " + pathText(arrival)); };
    told.caughtUp = [&] { told_.emplace_back("all"); };
    Following following(tav::FilePath(file_.path).text(), told);
    uint64_t looks = 0;
    while (following.look(most) == most)
    {
      EXPECT_LT(++looks, 100U);
    }
    std::filesystem::resize_file(file_.path, 0); // and another stream in its place
    EXPECT_EQ(following.look(most), 0U);
    append(numbers({7, 8}));
    while (following.look(most) == most)
    {
      EXPECT_LT(++looks, 100U);
    }
    std::erase(told_, "all");
    std::filesystem::remove(file_.path);
    return told_;
  };
  const std::vector<std::string> atOnce = inSteps(100);
  EXPECT_EQ(atOnce.size(), 12U);
  for (const uint64_t most : {1U, 2U, 3U, 5U})
  {
    EXPECT_EQ(inSteps(most), atOnce) << most;
  }
}

TEST_F(Follow, TellsOfRootsBehindAnEmptyOne)
{
  append(numbers({}));
  EXPECT_THAT(news(), ElementsAre("system"));
  append(numbers({1}));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 1"));
  append(numbers({}));
  append(numbers({}));
  append(Bytes(40, 0));
  append(numbers({2}));
  EXPECT_THAT(news(), ElementsAre("system", "system", "system", "cpuOnline 2"));
  append(numbers({}));
  append(numbers({3, 4, 5, 6, 7}, true, TAV_ELM_CMN_HOST));
  EXPECT_THAT(news(),
              ElementsAre("system", "host", "cpuOnline 3", "cpuOnline 4", "cpuOnline 5", "cpuOnline 6", "cpuOnline 7"));
}

TEST_F(Follow, TellsOfRootsAsTheyCome)
{
  EXPECT_THAT(news(), IsEmpty()) << "there is no file yet";
  append({});
  EXPECT_THAT(news(), IsEmpty());
  append(numbers({1, 2, 3}));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 1", "cpuOnline 2", "cpuOnline 3"));
  EXPECT_THAT(news(), IsEmpty());
  append(Bytes(100, 0));
  EXPECT_THAT(news(), IsEmpty());
  append(numbers({4}));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 4"));
  append(numbers({5, 6, 7, 8, 9}, true, TAV_ELM_CMN_HOST));
  EXPECT_THAT(news(), ElementsAre("host", "cpuOnline 5", "cpuOnline 6", "cpuOnline 7", "cpuOnline 8", "cpuOnline 9"));
}

TEST_F(Follow, TellsOfTheChildrenOfAGroupThatIsStillOpen)
{
  append(openHeader(TAV_ELM_CMN_SYSTEM));
  append(number(1));
  append(number(2));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 1", "cpuOnline 2"));
  append(openHeader(TAV_ELM_CMN_HOST));
  append(part(number(3), 0, 18));
  EXPECT_THAT(news(), ElementsAre("host")) << "the number is not whole";
  append(part(number(3), 18, 20));
  EXPECT_THAT(news(), ElementsAre("cpuOnline 3"));
  // The host is closed, and what is behind it is a child of the system.
  patch(16 + 20 + 20, sizeBytes(20));
  append(number(4));
  EXPECT_THAT(news(), ElementsAre("cpuOnline 4"));
  patch(0, sizeBytes(20 + 20 + 36 + 20));
  append(numbers({5}));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 5"));
}

TEST_F(Follow, WaitsForWhatIsNotWrittenYet)
{
  append(openHeader(TAV_ELM_CMN_SYSTEM));
  append(number(1));
  append(number(2));
  append(Bytes(4096, 0)); // a page that is not filled
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 1", "cpuOnline 2"));
  patch(16 + 40, number(3));
  EXPECT_THAT(news(), ElementsAre("cpuOnline 3"));
  EXPECT_THAT(news(), IsEmpty());
}

TEST_F(Follow, CutAnywhereItTellsTheSameInTheEnd)
{
  const Bytes bytes = numbers({1, 2, 3});
  for (size_t cut = 0; cut <= bytes.size(); ++cut)
  {
    SCOPED_TRACE(cut);
    std::filesystem::remove(file_.path);
    Follower follower(tav::FilePath(file_.path).text(), {.form = {.swapped = false}}, onNode_, stop_.get_token());
    append(part(bytes, 0, cut));
    told_.clear();
    follower.goOn();
    append(part(bytes, cut, bytes.size()));
    follower.goOn();
    EXPECT_THAT(told_, ElementsAre("system", "cpuOnline 1", "cpuOnline 2", "cpuOnline 3"));
  }
}

TEST_F(Follow, GoesOverToAFileThatTakesThePlace)
{
  append(numbers({1, 2}));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 1", "cpuOnline 2"));
  append(numbers({3}));
  std::filesystem::rename(file_.path, other_.path);
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 3"));
  append(numbers({4}), other_.path);
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 4")) << "nothing else has come yet";
  append(numbers({5}), other_.path);
  append(numbers({6, 7}));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 5", "system", "cpuOnline 6", "cpuOnline 7"));
}

TEST_F(Follow, BeginsAnewInAFileThatWasEmptied)
{
  append(numbers({1, 2, 3}));
  EXPECT_THAT(news(), testing::SizeIs(4));
  std::filesystem::resize_file(file_.path, 0);
  EXPECT_THAT(news(), IsEmpty());
  append(numbers({4, 5}));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 4", "cpuOnline 5"));
  std::filesystem::resize_file(file_.path, 0);
  append(numbers({6, 7, 8, 9}, false, TAV_ELM_CMN_HOST));
  EXPECT_THAT(news(), ElementsAre("host", "cpuOnline 6", "cpuOnline 7", "cpuOnline 8", "cpuOnline 9"));
}

TEST_F(Follow, FollowsAGroupThatWasTakenBack)
{
  append(openHeader(TAV_ELM_CMN_SYSTEM));
  append(number(1));
  append(openHeader(TAV_ELM_CMN_HOST));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 1", "host"));
  patch(16 + 20, number(2));
  append(part(number(2), 16, 20));
  patch(16 + 20, number(2));
  EXPECT_THAT(news(), ElementsAre("cpuOnline 2"));
}

TEST_F(Follow, EndsWhereDamageEndsAGroup)
{
  Bytes bytes = numbers({1, 2, 3});
  bytes[16 + 20] = 0xFF; // the size of the second number
  bytes[16 + 21] = 0xFF;
  append(numbers({0, 0, 0}));
  append(bytes);
  append(numbers({4}));
  EXPECT_THAT(news(), ElementsAre("system", "cpuOnline 0", "cpuOnline 0", "cpuOnline 0", "system", "cpuOnline 1",
                                  "system", "cpuOnline 4"));
}

TEST_F(Follow, TellsWhatAWriterWritesWhileItWrites)
{
  constexpr uint32_t roots = 60;
  constexpr uint32_t first = 100; // the numbers before are there when it begins
  std::atomic<uint32_t> newest{0};
  std::atomic<uint32_t> last{UINT32_MAX};
  append(numbers({1, 2, 3}));
  const Document document(file_.path);
  std::list<test::TemporaryPath> away; // Windows keeps a file from being replaced that somebody has open
  std::thread writer([&] {
    const auto deadline = std::chrono::steady_clock::now() + 10min; // ends what hangs
    const auto waitFor = [&](uint32_t number) {
      while (newest < number && std::chrono::steady_clock::now() < deadline)
      {
        std::this_thread::sleep_for(1ms);
      }
    };
    uint32_t next = first;
    // What comes before its first look is there when it begins, however many roots that are.
    while (newest == 0 && std::chrono::steady_clock::now() < deadline)
    {
      append(numbers({next++}));
      std::this_thread::sleep_for(1ms);
    }
    uint32_t firstOfFile = next;
    const uint32_t end = next + roots;
    last = end - 1;
    for (; next < end; ++next)
    {
      append(numbers({next}));
      if ((end - next) % 20 == 10)
      {
        waitFor(firstOfFile); // of a file that it never saw it would tell nothing
        std::filesystem::rename(file_.path, away.emplace_back().path);
        firstOfFile = next + 1;
      }
    }
  });
  std::vector<uint32_t> seen;
  tav::inspect::StopSource stop;
  const FollowEnd end = document.follow(
      [&](const tav::Node& node) {
        if (node.type() == TAV_TYPE_UINT32)
        {
          seen.push_back(node.as<uint32_t>());
          newest = seen.back();
        }
        if (newest == last)
        {
          stop.request_stop();
        }
      },
      {.stop = stop.get_token(), .timeout = 10min, .existing = false});
  writer.join();
  EXPECT_EQ(end, FollowEnd::stopped);
  ASSERT_GE(seen.size(), roots);
  EXPECT_GE(seen.front(), first);
  std::vector<uint32_t> expected(seen.size());
  std::iota(expected.begin(), expected.end(), seen.front());
  EXPECT_EQ(seen, expected);
}

/// A ring's file is longer than what is written yet, and its writes do not hold back who reads meanwhile.
TEST_F(Follow, TellsNoNodeOfWhichAPartIsWritten)
{
  constexpr uint64_t count = 20000;
  constexpr uint64_t each = 2; // nodes between two writes
  std::vector<uint64_t> told;
  Follower follower(
      tav::FilePath(file_.path).text(), {},
      [&](const tav::Node& node) {
        if (!node.isGroup())
        {
          told.push_back(node.type() == TAV_TYPE_UINT64 ? ~node.as<uint64_t>() : UINT64_MAX);
        }
      },
      tav::inspect::StopToken());
  std::thread writer([&] {
    tav::Writer stream(file_.path);
    tav::Group system = stream.group(TAV_ELM_CMN_SYSTEM);
    for (uint64_t i = 0; i < count; ++i)
    {
      system.add(TAV_ELM_CMN_MEM_FREE, ~i);
      if (i % each == each - 1)
      {
        stream.flush();
      }
    }
    system.close();
    stream.finish();
  });
  const auto deadline = std::chrono::steady_clock::now() + 10min; // ends what hangs
  while (told.size() < count && std::chrono::steady_clock::now() < deadline)
  {
    follower.goOn();
  }
  writer.join();
  std::vector<uint64_t> expected(count);
  std::iota(expected.begin(), expected.end(), uint64_t{0});
  EXPECT_EQ(told, expected);
}

TEST_F(Follow, EndsWhenNothingComes)
{
  append(numbers({1, 2, 3}));
  const Document document(file_.path);
  EXPECT_EQ(document.follow(onNode_, {.timeout = 50ms}), FollowEnd::timedOut);
  EXPECT_THAT(told_, testing::SizeIs(4));
  tav::inspect::StopSource stopped;
  stopped.request_stop();
  EXPECT_EQ(document.follow(onNode_, {.stop = stopped.get_token()}), FollowEnd::stopped);
}

TEST_F(Follow, NeedsAPath)
{
  const Bytes bytes = numbers({1, 2, 3});
  const Document document(test::spanOf(bytes));
  EXPECT_EQ(test::thrownBy([&] { static_cast<void>(document.follow(onNode_)); }), TAV_RC_NOT_SUPPORTED);
}
