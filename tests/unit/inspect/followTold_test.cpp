/// All that whoever follows a file is told of: nodes with their paths, ends of roots, damage, what becomes of the file.
#include <algorithm>
#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/document/follower.h"
#include "inspect/streams.h"
#include "support/byteRows.h"

using namespace tav::inspect;
using test::Bytes;
using testing::ElementsAre;
using testing::IsEmpty;

namespace
{

const char* nameOf(FileChange change)
{
  switch (change)
  {
  case FileChange::missing: return "missing";
  case FileChange::appeared: return "appeared";
  case FileChange::replaced: return "replaced";
  default: return "shortened";
  }
}

class FollowTelling : public testing::TestWithParam<bool>
{
protected:
  bool swap = GetParam();
  const test::TemporaryPath file;
  const test::TemporaryPath other;
  std::vector<std::string> said{};
  const FollowTold told{
      .node = [this](const Arrival& one) { said.push_back(pathText(one) + (one.node.has(kOpen) ? " open" : "")); },
      .rootEnd = [this](const Arrival& one) { said.push_back("end of " + pathText(one, PathStyle::brief)); },
      .damage = [this](const PassedOver& one) { said.push_back(one.path + ": " + one.sentence); },
      .change = [this](FileChange change) { said.emplace_back(nameOf(change)); },
      .caughtUp = [this] { said.emplace_back("caught up"); }};
  Follower follower{tav::FilePath(file.path).text(), DocumentOptions{}, told, {}};

  std::vector<std::string> news()
  {
    said.clear();
    follower.goOn();
    return said;
  }

  void append(const Bytes& bytes)
  {
    std::ofstream(file.path, std::ios::binary | std::ios::app)
        .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
  }

  Bytes numbers(uint32_t count, uint16_t root = TAV_ELM_CMN_SYSTEM) const
  {
    tav::Writer writer({.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native});
    {
      tav::Group system = writer.group(root);
      for (uint32_t i = 0; i < count; ++i)
      {
        system.add(TAV_ELM_CMN_CPU_ONLINE, i);
      }
    }
    writer.finish();
    return test::bytesOf(writer.bytes());
  }

  /// The header of a group as a writer leaves it while the group is open.
  Bytes openHeader(uint16_t elm) const
  {
    test::ByteRows rows(swap);
    rows.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, elm);
    return rows.bytes;
  }
};

} // namespace

INSTANTIATE_TEST_SUITE_P(ByteOrders, FollowTelling, testing::Bool());

TEST_P(FollowTelling, NamesNodesByTheirPathsAndRootsByTheirEnds)
{
  EXPECT_THAT(news(), ElementsAre("missing"));
  EXPECT_THAT(news(), IsEmpty()) << "it is said once";
  append(numbers(2));
  EXPECT_THAT(news(), ElementsAre("appeared", "/system", "/system/cpuOnline", "/system/cpuOnline[2]",
                                  "end of /system"));
  append(numbers(1));
  EXPECT_THAT(news(), ElementsAre("/system[2]", "/system[2]/cpuOnline", "end of /system[2]"));
}

TEST_P(FollowTelling, EndsARootThatAFileWasLeftWith)
{
  append(openHeader(TAV_ELM_CMN_SYSTEM));
  append(openHeader(TAV_ELM_CMN_HOST));
  EXPECT_THAT(news(), ElementsAre("/system open", "/system/host open"));
  std::filesystem::rename(file.path, other.path);
  append(numbers(1));
  EXPECT_THAT(news(), ElementsAre("end of /system", "replaced", "/system", "/system/cpuOnline", "end of /system"));
}

TEST_P(FollowTelling, SaysThatAFileWasMadeShorter)
{
  append(numbers(2));
  EXPECT_THAT(news(), testing::SizeIs(4));
  std::filesystem::resize_file(file.path, 0);
  append(numbers(1, TAV_ELM_CMN_HOST));
  EXPECT_THAT(news(), ElementsAre("shortened", "/host", "/host/cpuOnline", "end of /host"));
}

TEST_P(FollowTelling, SaysWhatDamageItPassesOver)
{
  Bytes bytes = numbers(3);
  const size_t second = 16 + 20; // its size
  std::fill(bytes.begin() + static_cast<ptrdiff_t>(second), bytes.begin() + static_cast<ptrdiff_t>(second) + 8, 0x77);
  append(bytes);
  append(numbers(1));
  EXPECT_THAT(news(), ElementsAre("/system", "/system/cpuOnline",
                                  "/system: passed over 40 bytes: a node's data is larger than the bytes at hand",
                                  "end of /system", "/system[2]", "/system[2]/cpuOnline", "end of /system[2]"));
}

TEST_P(FollowTelling, PassesOverWhatIsNoRootBetweenRoots)
{
  append(numbers(1));
  append(Bytes(100, 0x77));
  append(numbers(2));
  EXPECT_THAT(news(), ElementsAre("/system", "/system/cpuOnline", "end of /system",
                                  "/: passed over 100 bytes: no node: it would end 8608480567731123947 bytes past the "
                                  "end of the file",
                                  "/system[2]", "/system[2]/cpuOnline", "/system[2]/cpuOnline[2]",
                                  "end of /system[2]"));
}

TEST_P(FollowTelling, GoesOnWhereARootWasBegunAgain)
{
  append(openHeader(TAV_ELM_CMN_SYSTEM));
  EXPECT_THAT(news(), ElementsAre("/system open"));
  std::filesystem::resize_file(file.path, 0);
  append(openHeader(TAV_ELM_CMN_HOST));
  EXPECT_THAT(news(), ElementsAre("shortened", "/host open"));
}

TEST_P(FollowTelling, IsToldThatAllThatIsThereWasTold)
{
  append(numbers(1));
  const std::string path = tav::FilePath(file.path).text();
  EXPECT_EQ(follow(path, told, {}, {.timeout = std::chrono::milliseconds(1)}), FollowEnd::timedOut);
  ASSERT_GE(said.size(), 4U);
  EXPECT_THAT(std::vector<std::string>(said.begin(), said.begin() + 4),
              ElementsAre("/system", "/system/cpuOnline", "end of /system", "caught up"));
  said.clear();
  EXPECT_EQ(follow(path, told, {}, {.timeout = std::chrono::milliseconds(1), .existing = false}), FollowEnd::timedOut);
  EXPECT_THAT(said, testing::Each("caught up"));
}

TEST_P(FollowTelling, RefusesToBeginWithinAFile)
{
  append(numbers(1));
  const std::string path = tav::FilePath(file.path).text();
  EXPECT_EQ(test::thrownBy([&] { static_cast<void>(follow(path, told, {.from = 16})); }), TAV_RC_NOT_SUPPORTED);
  EXPECT_THAT(said, IsEmpty());
}
