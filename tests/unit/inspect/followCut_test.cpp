/// Files that are cut while they are followed: at each step of the storage, so that no timing is left to chance.
#include <algorithm>
#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/document/follower.h"
#include "inspect/growing.h"
#include "support/traceLog.h"
#include "tav/inspect/value.hpp"

using namespace tav::inspect;
using test::Bytes;
using testing::ElementsAre;

namespace
{

/// Does something once, at one of the steps that file storages make: sizes that are asked for, places, reads.
class AtStep
{
public:
  AtStep(uint64_t step, std::function<void()> act)
      : left_(step), act_(std::move(act)) {}

  bool hasCome() const { return hasCome_; }

private:
  void see(const KORTraceRecord& record)
  {
    const bool isStep = record.probe == tav::probe::ssFileGetTotalSize || record.probe == tav::probe::ssFileSeek ||
                        record.probe == tav::probe::ssFileRead;
    if (isStep && record.kind == KOR_TRACE_ENTRY && !hasCome_ && left_-- == 0)
    {
      hasCome_ = true;
      act_();
    }
  }

  uint64_t left_;
  std::function<void()> act_;
  bool hasCome_ = false;
  test::TraceTap tap_{[this](const KORTraceRecord& record) { see(record); }};
};

/// What asks for the nodes, and how their bytes are read.
enum class Face : uint8_t
{
  nodes,    ///< Document::follow: by the exact reader
  arrivals, ///< each node when it comes, out of the source that comes with it
  roots     ///< each root when it has ended, by a walk over that source
};

struct Case
{
  Face face;
  uint64_t zeros; ///< behind the last stream
};

void PrintTo(const Case& value, std::ostream* out)
{
  constexpr const char* names[] = {"nodes", "arrivals", "roots"};
  *out << names[static_cast<size_t>(value.face)] << ' ' << value.zeros;
}

constexpr uint64_t kPage = ByteSource::kPage;
const std::string kGroup = "group";
const std::string kShortened = "shortened";
const std::string kDamage = "damage";

class FollowCut : public testing::TestWithParam<Case>
{
protected:
  using Texts = std::vector<std::string>;

  void write(const Bytes& bytes)
  {
    std::filesystem::remove(file_.path);
    test::append(file_.path, bytes);
  }
  void cut(uint64_t size) { std::filesystem::resize_file(file_.path, size); }

  std::unique_ptr<Follower> follower()
  {
    told_.clear();
    const std::string path = tav::FilePath(file_.path).text();
    const DocumentOptions options{.form = {.swapped = false}};
    if (GetParam().face == Face::nodes)
    {
      return std::make_unique<Follower>(path, options, onNode_, StopToken());
    }
    FollowTold told;
    told.damage = [this](const PassedOver&) { told_.push_back(kDamage); };
    told.change = [this](FileChange change) {
      told_.push_back(change == FileChange::shortened ? kShortened : "changed");
    };
    (GetParam().face == Face::arrivals ? told.node : told.rootEnd) = [this](const Arrival& arrival) { take(arrival); };
    return std::make_unique<Follower>(path, options, told, StopToken());
  }

  void take(const Arrival& arrival)
  {
    if (GetParam().face == Face::arrivals)
    {
      told_.push_back(textOf(arrival.source, arrival.form, arrival.node));
      return;
    }
    Walker walker(arrival.source, arrival.form, {.offset = arrival.node.offset(), .wide = arrival.node.is64()});
    for (Event event; walker.next(event) && (event.what != What::nodeEnd || event.depth != 0);)
    {
      if (event.what == What::nodeBegin)
      {
        told_.push_back(textOf(arrival.source, arrival.form, event.node));
      }
    }
  }

  static std::string textOf(ByteSource& source, const Form& form, const tav::inspect::Node& node)
  {
    return node.isGroup() ? kGroup : plainText(source, form, node, 100).value_or("none");
  }

  /// Follows a file that something happens to at each step in turn, and asks again when that is over, before and
  /// after `rest`. `expect` sees what was told in the end.
  void atEachStep(const Bytes& content, const std::function<void()>& act, const std::function<void()>& rest,
                  const std::function<void()>& expect)
  {
    bool hasCome = true;
    for (uint64_t step = 0; hasCome; ++step)
    {
      SCOPED_TRACE(step);
      write(content);
      const auto follower = this->follower();
      {
        const AtStep at(step, act);
        ASSERT_NO_THROW(follower->goOn());
        hasCome = at.hasCome();
      }
      if (!hasCome)
      {
        act();
      }
      ASSERT_NO_THROW(follower->goOn());
      rest();
      ASSERT_NO_THROW(follower->goOn());
      expect();
    }
  }

  /// What was told since the file was said to have been cut. Who is told of nodes alone is not told of that: there the
  /// first number of the file says it.
  Texts lastTold() const
  {
    const bool saysSo = GetParam().face != Face::nodes;
    const auto last = std::find(told_.rbegin(), told_.rend(), saysSo ? kShortened : "1");
    const auto from = last == told_.rend() ? told_.begin() : last.base() - (saysSo ? 0 : 2);
    return {from, told_.end()};
  }

  const test::TemporaryPath file_;
  Texts told_;
  const std::function<void(const tav::Node&)> onNode_ = [this](const tav::Node& node) {
    told_.push_back(node.isGroup() ? kGroup : std::to_string(node.as<uint32_t>()));
  };
};

Bytes operator+(Bytes bytes, const Bytes& more)
{
  bytes.insert(bytes.end(), more.begin(), more.end());
  return bytes;
}

/// A root with a group for each number, longer than many pages.
Bytes series(uint32_t first, uint32_t count)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint32_t i = 0; i < count; ++i)
    {
      system.group(TAV_ELM_CMN_HOST).add(TAV_ELM_CMN_CPU_ONLINE, first + i);
    }
  }
  writer.finish();
  return test::bytesOf(writer.bytes());
}

INSTANTIATE_TEST_SUITE_P(FacesAndZeros, FollowCut,
                         testing::ValuesIn([] {
                           std::vector<Case> cases;
                           for (const Face face : {Face::nodes, Face::arrivals, Face::roots})
                           {
                             for (const uint64_t zeros : {uint64_t{8}, uint64_t{4100}, 5 * kPage + 7, 70 * kPage})
                             {
                               cases.push_back({face, zeros});
                             }
                           }
                           return cases;
                         }()));

} // namespace

TEST_P(FollowCut, AnAppendingWriterDropsTheZerosAtTheEnd)
{
  const Bytes streams = test::numbers({1, 2, 3}) + test::numbers({4, 5});
  atEachStep(
      streams + Bytes(GetParam().zeros, 0), [&] { cut(streams.size()); },
      [this] { test::append(file_.path, test::numbers({6})); },
      [this] { EXPECT_THAT(told_, ElementsAre(kGroup, "1", "2", "3", kGroup, "4", "5", kGroup, "6")); });
}

TEST_P(FollowCut, AnAppendingWriterDropsTheZerosAndGoesOn)
{
  constexpr uint32_t count = 3000;
  const Bytes streams = test::numbers({1, 2, 3});
  const Bytes more = series(100, count);
  Texts expected{kGroup, "1", "2", "3", kGroup};
  for (uint32_t i = 0; i < count; ++i)
  {
    expected.insert(expected.end(), {kGroup, std::to_string(100 + i)});
  }
  atEachStep(
      streams + Bytes(GetParam().zeros, 0),
      [&] {
        cut(streams.size());
        test::append(file_.path, more);
      },
      [] {}, [&] { EXPECT_TRUE(told_ == expected) << told_.size() << " of " << expected.size(); });
}

TEST_P(FollowCut, AnOpenRootLosesTheZerosBehindItsLastNode)
{
  const Bytes open = test::openHeader(TAV_ELM_CMN_SYSTEM) + test::number(1) + test::number(2);
  atEachStep(
      open + Bytes(GetParam().zeros, 0), [&] { cut(open.size()); },
      [&] {
        test::append(file_.path, test::number(3));
        test::patch(file_.path, 0, test::sizeBytes(60));
      },
      [this] { EXPECT_THAT(told_, ElementsAre(kGroup, "1", "2", "3")); });
}

TEST_P(FollowCut, WhatWasToldIsCutAndComesBack)
{
  const Bytes first = test::numbers({1, 2, 3});
  const Bytes streams = first + test::numbers({4, 5});
  for (const size_t size : {size_t{0}, size_t{5}, first.size() / 2, first.size(), streams.size() - 2})
  {
    SCOPED_TRACE(size);
    atEachStep(
        streams + Bytes(GetParam().zeros, 0), [&] { cut(size); },
        [&] { test::append(file_.path, test::part(streams, size, streams.size())); },
        [this] {
          EXPECT_THAT(lastTold(), ElementsAre(kGroup, "1", "2", "3", kGroup, "4", "5"));
          EXPECT_THAT(told_, testing::Not(testing::Contains(kDamage)));
        });
  }
}

TEST_P(FollowCut, AWriterGoesOnOverTheZerosAndClosesTheRoot)
{
  const Bytes open = test::openHeader(TAV_ELM_CMN_SYSTEM) + test::number(1) + test::number(2);
  const Bytes more = test::number(3) + test::number(4);
  for (const bool isFirst : {true, false})
  {
    SCOPED_TRACE(isFirst);
    const Bytes before = isFirst ? Bytes() : test::numbers({9});
    const auto close = [&] { test::patch(file_.path, before.size(), test::sizeBytes(80)); };
    const Texts root{kGroup, "1", "2", "3", "4", kGroup, "5"};
    Texts expected = isFirst ? Texts() : Texts{kGroup, "9"};
    expected.insert(expected.end(), root.begin(), root.end());
    atEachStep(
        before + open + Bytes(GetParam().zeros, 0),
        [&] {
          test::patch(file_.path, before.size() + open.size(), more);
          close();
          test::patch(file_.path, before.size() + open.size() + more.size(), test::numbers({5}));
        },
        [] {}, [&] { EXPECT_EQ(told_, expected); });
    atEachStep(
        before + open + Bytes(GetParam().zeros, 0),
        [&] { test::patch(file_.path, before.size() + open.size(), more); },
        [&] {
          close();
          test::patch(file_.path, before.size() + open.size() + more.size(), test::numbers({5}));
        },
        [&] { EXPECT_EQ(told_, expected); });
  }
}
