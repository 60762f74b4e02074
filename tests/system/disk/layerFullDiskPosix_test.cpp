/// The C++ layer says that a disk is full, whatever it was doing.
#include <csignal>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <string>
#include <sys/resource.h>

#include "kor/testFiles.h"
#include "tav/tav.hpp"

namespace
{

constexpr uint64_t kPage = 4096;

/// Until it ends no file of this process can grow beyond a size.
class SizeLimit
{
public:
  explicit SizeLimit(uint64_t bytes)
  {
    std::signal(SIGXFSZ, SIG_IGN);
    getrlimit(RLIMIT_FSIZE, &before_);
    rlimit limit = before_;
    limit.rlim_cur = bytes;
    if (setrlimit(RLIMIT_FSIZE, &limit) != 0)
    {
      throw std::runtime_error("no limit");
    }
  }
  ~SizeLimit()
  {
    setrlimit(RLIMIT_FSIZE, &before_);
    std::signal(SIGXFSZ, SIG_DFL);
  }
  SizeLimit(const SizeLimit&) = delete;
  SizeLimit& operator=(const SizeLimit&) = delete;

private:
  rlimit before_{};
};

/// Groups of small elements, until the first failure; every one is given to `failed`, and then tried again with room.
template<class Failed>
uint64_t writeWithRoomFor(uint64_t room, uint64_t elements, TAVSideStorage& storage, const Failed& failed)
{
  uint64_t failures = 0;
  auto limit = std::make_unique<SizeLimit>(room);
  tav::Writer writer(storage, {.ringBytes = 3 * kPage});
  const auto tried = [&](const auto& operation) {
    std::error_code ec;
    operation(ec);
    if (!ec)
    {
      return;
    }
    ++failures;
    failed(ec);
    limit.reset();
    operation(ec);
    EXPECT_FALSE(ec) << "with room: " << ec.message();
  };
  std::unique_ptr<tav::Group> root;
  tried([&](std::error_code& ec) {
    root = std::make_unique<tav::Group>(writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true}, ec));
  });
  for (uint64_t i = 0; i < elements; ++i)
  {
    tried([&](std::error_code& ec) { root->add(TAV_ELM_CMN_HOST_NAME, std::string(i % 300, 'x'), ec); });
  }
  tried([&](std::error_code& ec) { root->close(ec); });
  tried([&](std::error_code& ec) { writer.finish(ec); });
  return failures;
}

TEST(LayerOnAFullDisk, SaysSoWhereverTheDiskIsFull)
{
  const TestFolder folder;
  const std::string path = folder / "x.tav";
  uint64_t failures = 0;
  for (uint64_t room = 0; room < 60 * kPage; room += 509)
  {
    SCOPED_TRACE("room for " + std::to_string(room) + " bytes");
    KORFileOpenParam param;
    param.pPath = path.c_str();
    param.options = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_TRUNCATE;
    uint32_t rc = TAV_RC_OK;
    TAVSSFile storage(&param, &rc);
    ASSERT_EQ(rc, TAV_RC_OK);
    storage.ioUnit = kPage;
    failures += writeWithRoomFor(room, 2000, storage, [](const std::error_code& ec) {
      EXPECT_EQ(tav::codeOf(ec), KOR_RC_FILE_TOO_LARGE) << ec.message();
    });
  }
  EXPECT_GT(failures, 400U);
}

TEST(LayerOnAFullDisk, NamesTheCauseInTheMessage)
{
  const TestFolder folder;
  const SizeLimit limit(2U << 20U);
  tav::Writer writer(std::filesystem::path(folder / "x.tav"), {}, {.ringBytes = 2U << 20U});
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  std::string said;
  try
  {
    for (int i = 0; i < 100'000; ++i) root.add(TAV_ELM_CMN_HOST_NAME, std::string(100, 'x'));
  }
  catch (const std::system_error& error)
  {
    said = error.what();
  }
  EXPECT_EQ(said,
            "adding hostName (60103): KOR_RC_FILE_TOO_LARGE: the file would grow beyond the size that is allowed");
}

TEST(LayerOnAFullDisk, LeavesTheFileThatItWasToReplace)
{
  const TestFolder folder;
  const std::filesystem::path path = folder / "x.tav";
  {
    tav::Writer writer(path);
    writer.group(TAV_ELM_CMN_SYSTEM).add(TAV_ELM_CMN_HOST_NAME, "old");
    writer.finish();
  }
  {
    const SizeLimit limit(1000);
    tav::Writer writer(path, {.overwrite = true});
    writer.group(TAV_ELM_CMN_SYSTEM).add(TAV_ELM_CMN_HOST_NAME, "new");
    std::error_code ec;
    writer.finish(ec);
    EXPECT_EQ(tav::codeOf(ec), KOR_RC_FILE_TOO_LARGE) << ec.message();
  }
  const tav::Reader reader(path);
  EXPECT_EQ(reader.path("/system/hostName").value().as<std::string>(), "old");
  using Iterator = std::filesystem::directory_iterator;
  EXPECT_EQ(std::distance(Iterator(folder.path()), Iterator()), 1);
}

TEST(LayerOnAFullDisk, ARecorderTellsItAtTheCallThatMeetsItAndLosesNothing)
{
  const TestFolder folder;
  tav::Recorder recorder(folder / "x-%n.tav", {.maxBytes = 3U << 20U, .syncEvery = std::chrono::nanoseconds(0)},
                         {.ringBytes = 2U << 20U});
  auto limit = std::make_unique<SizeLimit>(uint64_t{5} << 19U);
  uint64_t failures = 0;
  constexpr uint32_t roots = 60;
  for (uint32_t i = 0; i < roots; ++i)
  {
    tav::Group root = recorder.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, i);
    root.add(TAV_ELM_CMN_HOST_NAME, std::string(100'000, 'x'));
    std::error_code ec;
    root.close(ec);
    EXPECT_FALSE(root.isOpen()) << "it is closed; what failed is to put it on the device";
    if (ec)
    {
      ++failures;
      EXPECT_EQ(tav::codeOf(ec), KOR_RC_FILE_TOO_LARGE) << ec.message();
      limit.reset();
      recorder.sync();
    }
  }
  recorder.finish();
  EXPECT_EQ(failures, 1U);
  uint32_t next = 0;
  for (int file = 1; file <= 2; ++file)
  {
    const tav::Reader reader(folder / ("x-" + std::to_string(file) + ".tav"));
    for (const tav::Node& root : reader.roots())
    {
      tav::ChildRange children = root.children();
      EXPECT_EQ((*children.begin()).as<uint32_t>(), next++);
    }
  }
  EXPECT_EQ(next, roots);
}

} // namespace
