/// Disks that run full at every place of a writer's life, that get space again, and that take their permission back.
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <iterator>
#include <map>
#include <memory>
#include <string>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "kor/testFiles.h"
#include "support/streams.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint64_t kPage = 4096;
constexpr uint64_t kPages = 3;

/// Where files of limited size live.
class Disk
{
public:
  virtual ~Disk() = default;
  [[nodiscard]] virtual std::string path() const = 0;
  virtual void allow(uint64_t bytes) = 0;
  virtual void allowAll() = 0;
  [[nodiscard]] virtual uint32_t code() const = 0; ///< of a write for which there is no room
};

/// A limit on the size of every file of this process.
class SizeLimit : public Disk
{
public:
  SizeLimit()
  {
    std::signal(SIGXFSZ, SIG_IGN);
    getrlimit(RLIMIT_FSIZE, &before_);
  }
  ~SizeLimit() override
  {
    allowAll();
    std::signal(SIGXFSZ, SIG_DFL);
  }
  [[nodiscard]] std::string path() const override { return folder_ / "x.tav"; }
  void allow(uint64_t bytes) override { set(bytes); }
  void allowAll() override { set(before_.rlim_cur); }
  [[nodiscard]] uint32_t code() const override { return KOR_RC_FILE_TOO_LARGE; }

private:
  void set(uint64_t bytes)
  {
    rlimit limit = before_;
    limit.rlim_cur = bytes;
    if (setrlimit(RLIMIT_FSIZE, &limit) != 0)
    {
      throw std::runtime_error("no limit");
    }
  }

  TestFolder folder_;
  rlimit before_{};
};

/// A file system of its own in memory. Its size counts in pages of the system.
class SmallDisk : public Disk
{
public:
  SmallDisk()
  {
    mounted_ = mount("tmpfs", folder_.path().c_str(), "tmpfs", 0, "size=4096k") == 0;
  }
  ~SmallDisk() override
  {
    if (mounted_)
    {
      umount2(folder_.path().c_str(), MNT_DETACH);
    }
  }
  [[nodiscard]] bool isMounted() const { return mounted_; }
  [[nodiscard]] std::string path() const override { return folder_ / "x.tav"; }
  void allow(uint64_t bytes) override { resize(std::max<uint64_t>(bytes, 4096)); }
  void allowAll() override { resize(4096 * 1024); }
  [[nodiscard]] uint32_t code() const override { return KOR_RC_NO_SPACE; }

private:
  void resize(uint64_t bytes)
  {
    const std::string options = "size=" + std::to_string(bytes);
    if (mount("tmpfs", folder_.path().c_str(), "tmpfs", MS_REMOUNT, options.c_str()) != 0)
      throw std::runtime_error("no new size");
  }

  TestFolder folder_;
  bool mounted_ = false;
};

std::string contentOf(const std::string& path)
{
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

/// What a script does at a place.
enum class Act : uint8_t
{
  open,
  add,
  addSmall,
  close,
  reset
};

/// The steps of one stream: groups of elements, some far larger than a page, closed when their headers have long left
/// the ring; a reset between them. No group is opened with an unknown size: it would get its end element even when its
/// size could not be written, and the element's code would be the answer of the close.
std::vector<Act> script()
{
  std::vector<Act> acts{Act::open};
  for (int group = 0; group < 4; ++group)
  {
    acts.push_back(Act::open);
    for (int i = 0; i < 6; ++i) acts.push_back(group < 2 ? Act::add : Act::addSmall);
    acts.push_back(Act::close);
    acts.push_back(Act::reset);
  }
  acts.push_back(Act::close);
  acts.push_back(Act::reset);
  return acts;
}

class Script
{
public:
  explicit Script(TAVSideStorage& storage, const Form& form)
      : handle_(storage, TAV_OPT_WRITE, form) {}

  uint32_t act(Act act)
  {
    switch (act)
    {
    case Act::open: return append(group64(TAV_ELM_CMN_HOST, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE, 0), 0);
    case Act::add: return append(binary(7, Bytes(100 + added_ * 977 % 9000, static_cast<uint8_t>(added_))), 1);
    case Act::addSmall: return append(binary(8, Bytes(100 + added_ * 7 % 300, static_cast<uint8_t>(added_))), 1);
    case Act::close: return tavCloseHeader(0, handle_.get());
    default: return handle_->pCircularBuf != nullptr ? handle_->pCircularBuf->reset() : TAV_RC_OK;
    }
  }
  TAVHandle* handle() { return handle_.get(); }

private:
  uint32_t append(Element node, uint64_t counts)
  {
    TAVHeaderData data = node.data();
    const uint64_t before = handle_->streamBytes;
    const uint32_t rc = tavAddElement(0, handle_.get(), &data);
    added_ += rc == TAV_RC_OK ? counts : 0;
    EXPECT_TRUE(rc == TAV_RC_OK || handle_->streamBytes == before) << "the write offset stays where it was";
    return rc;
  }

  Handle handle_;
  uint64_t added_ = 0;
};

std::string expectedStream()
{
  Bytes block(0x40000);
  TAVSSMemory memory(block.data(), block.size());
  Script direct(memory, {});
  for (const Act act : script()) check(direct.act(act), "direct");
  return {block.begin(), block.begin() + static_cast<ptrdiff_t>(direct.handle()->streamBytes)};
}

/// One life of a stream on a disk with so much room.
class Life
{
public:
  Life(Disk& disk, uint64_t room)
      : disk_(disk), path_(disk.path())
  {
    KORFileOpenParam param;
    param.pPath = path_.c_str();
    param.options = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_TRUNCATE;
    uint32_t rc = TAV_RC_OK;
    storage_ = std::make_unique<TAVSSFile>(&param, &rc);
    check(rc, "open");
    storage_->ioUnit = kPage;
    disk.allow(room);
  }
  ~Life()
  {
    disk_.allowAll();
    script_.reset();
    storage_.reset();
    std::remove(path_.c_str());
  }
  Life(const Life&) = delete;
  Life& operator=(const Life&) = delete;

  /// Until the disk is full: the act that met that, and its code. Everything is done when there is none.
  bool untilFull(Act& act, uint32_t& code)
  {
    Form form;
    form.buffered = true;
    form.ringBytes = kPages * kPage;
    script_ = std::make_unique<Script>(*storage_, form);
    for (; at_ < acts_.size(); ++at_)
    {
      act = acts_[at_];
      code = script_->act(act);
      if (code != TAV_RC_OK)
      {
        return true;
      }
      if (act == Act::reset)
      {
        stored_ = length();
      }
    }
    return false;
  }

  /// The act that failed, again, and all that follow.
  void goOn()
  {
    disk_.allowAll();
    for (; at_ < acts_.size(); ++at_)
    {
      const uint32_t rc = script_->act(acts_[at_]);
      ASSERT_EQ(rc, TAV_RC_OK) << "act " << at_ << " after the disk had room again: " << korCodeName(rc);
    }
  }

  /// The handle and the storage go while the disk is full.
  void end()
  {
    script_.reset();
    storage_.reset();
  }

  [[nodiscard]] std::string content() const { return contentOf(path_); }
  [[nodiscard]] uint64_t length() const { return script_->handle()->streamBytes; }
  /// The stream's length at the last reset that worked.
  [[nodiscard]] uint64_t stored() const { return stored_; }

private:
  Disk& disk_;
  std::string path_;
  std::unique_ptr<TAVSSFile> storage_;
  std::unique_ptr<Script> script_;
  std::vector<Act> acts_ = script();
  size_t at_ = 0;
  uint64_t stored_ = 0;
};

/// Every place where a disk can run full, in steps.
void fillUp(Disk& disk, uint64_t step)
{
  const std::string expected = expectedStream();
  std::map<Act, uint64_t> met;
  for (uint64_t room = 0; room < expected.size() + kPage; room += step)
  {
    SCOPED_TRACE("room for " + std::to_string(room) + " bytes");
    Life life(disk, room);
    Act act{};
    uint32_t code = TAV_RC_OK;
    if (!life.untilFull(act, code))
    {
      continue;
    }
    ++met[act];
    // A small write whose page cannot be made room for is refused as one outside the cached range.
    ASSERT_THAT(code, testing::AnyOf(disk.code(), TAV_RC_BAD_PARAM)) << korCodeName(code);
    life.goOn();
    ASSERT_EQ(life.length(), expected.size());
    ASSERT_EQ(life.content().substr(0, expected.size()), expected) << "nothing is lost, nothing is there twice";
  }
  EXPECT_GT(met[Act::add], 0U);
  EXPECT_GT(met[Act::close], 0U);
  EXPECT_GT(met[Act::reset], 0U);
  std::printf("ran full %llu times adding, %llu opening, %llu closing, %llu resetting\n",
              static_cast<unsigned long long>(met[Act::add]), static_cast<unsigned long long>(met[Act::open]),
              static_cast<unsigned long long>(met[Act::close]), static_cast<unsigned long long>(met[Act::reset]));
}

TEST(FullDisk, OfAFileSizeLimitIsReportedAndTheStreamGoesOnWhenThereIsRoom)
{
  SizeLimit disk;
  fillUp(disk, 509); // no divisor of a page: full in the middle of pages, too
}

TEST(FullDisk, OfASmallFileSystemIsReportedAndTheStreamGoesOnWhenThereIsRoom)
{
  SmallDisk disk;
  if (!disk.isMounted())
  {
    GTEST_SKIP() << "mounting is not allowed here";
  }
  fillUp(disk, 4096);
}

TEST(FullDisk, ThatStaysFullKeepsWhatWasStored)
{
  const std::string expected = expectedStream();
  SizeLimit disk;
  uint64_t most = 0;
  for (uint64_t room = kPage; room < expected.size(); room += 2 * kPage)
  {
    uint64_t stored = 0;
    {
      Life life(disk, room);
      Act act{};
      uint32_t code = TAV_RC_OK;
      ASSERT_TRUE(life.untilFull(act, code));
      stored = life.stored();
      life.end();
      const std::string content = life.content();
      EXPECT_LE(content.size(), room);
      ASSERT_GE(content.size(), stored);
      // The root is still open: its size is the one thing that was to be written there.
      const uint64_t from = std::min<uint64_t>(stored, sizeof(uint64_t));
      EXPECT_EQ(content.substr(from, stored - from), expected.substr(from, stored - from)) << "room for " << room;
    }
    most = std::max(most, stored);
  }
  EXPECT_GT(most, expected.size() / 4) << "much was stored before the disk was full";
}

#if defined(SYS_memfd_create) && defined(F_ADD_SEALS) && defined(F_SEAL_WRITE)
TEST(WithdrawnPermission, IsReportedByTheNextWriteAndLeavesWhatIsStored)
{
  const int file = static_cast<int>(syscall(SYS_memfd_create, "withdrawn", 2U /* seals are allowed */));
  if (file < 0)
  {
    GTEST_SKIP() << "no file in memory";
  }
  const std::string path = "/proc/self/fd/" + std::to_string(file);
  KORFileOpenParam param;
  param.pPath = path.c_str();
  param.options = KOR_FILE_UPDATE;
  uint32_t rc = TAV_RC_OK;
  {
    TAVSSFile storage(&param, &rc);
    ASSERT_EQ(rc, TAV_RC_OK);
    Form form;
    form.buffered = true;
    form.ringBytes = 2 * storage.ioUnit;
    Script script(storage, form);
    ASSERT_EQ(script.act(Act::open), TAV_RC_OK);
    ASSERT_EQ(script.act(Act::add), TAV_RC_OK);
    ASSERT_EQ(script.act(Act::reset), TAV_RC_OK);
    const std::string before = contentOf(path);
    ASSERT_EQ(fcntl(file, F_ADD_SEALS, F_SEAL_WRITE), 0);
    ASSERT_EQ(script.act(Act::addSmall), TAV_RC_OK) << "into the ring";
    EXPECT_EQ(script.act(Act::reset), KOR_RC_NO_PERMISSION);
    EXPECT_EQ(script.act(Act::reset), KOR_RC_NO_PERMISSION) << "the page is kept, and tried again";
    EXPECT_EQ(contentOf(path), before);
  }
  close(file);
}
#endif

/// Gives up what root may do for as long as it lives.
class Nobody
{
public:
  Nobody()
      : before_(geteuid())
  {
    if (before_ == 0 && seteuid(65534) != 0)
    {
      throw std::runtime_error("root stays root");
    }
  }
  ~Nobody()
  {
    if (before_ == 0 && seteuid(0) != 0)
    {
      std::abort();
    }
  }
  Nobody(const Nobody&) = delete;
  Nobody& operator=(const Nobody&) = delete;

private:
  uid_t before_;
};

TEST(WithdrawnPermission, OfAFolderRefusesANewFileByName)
{
  TestFolder folder;
  const std::string path = folder / "x.tav";
  KORFileOpenParam param;
  param.pPath = path.c_str();
  param.options = KOR_FILE_UPDATE | KOR_FILE_CREATE;
  ASSERT_EQ(chmod(folder.path().c_str(), 0555), 0);
  uint32_t rc = TAV_RC_OK;
  {
    const Nobody nobody;
    const TAVSSFile storage(&param, &rc);
  }
  EXPECT_EQ(rc, KOR_RC_NO_PERMISSION);
  chmod(folder.path().c_str(), 0700);
}

} // namespace
