/// Recorders: files that change, sync and go on.
#include <fstream>

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;
using std::chrono::hours;
using std::chrono::nanoseconds;

namespace
{

class LayerRecorder : public testing::Test
{
protected:
  void SetUp() override
  {
    std::filesystem::create_directory(folder_.path);
  }
  void TearDown() override
  {
    std::filesystem::remove_all(folder_.path);
  }

  static void add(tav::Recorder& recorder, uint32_t number, size_t bytes = 0)
  {
    tav::Group root = recorder.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, number);
    root.add(TAV_ELM_CMN_HOST_NAME, std::string(bytes, 'x'));
    root.close();
  }

  [[nodiscard]] std::vector<uint32_t> numbersIn(const std::string& name) const
  {
    std::vector<uint32_t> numbers;
    const tav::Reader reader(folder_.path / name);
    for (const tav::Node& root : reader.roots())
    {
      for (const tav::Node& node : root.children())
      {
        if (node.elm() == TAV_ELM_CMN_CPU_ONLINE)
        {
          numbers.push_back(node.as<uint32_t>());
        }
      }
    }
    return numbers;
  }

  [[nodiscard]] std::vector<std::string> names() const
  {
    std::vector<std::string> all;
    for (const auto& entry : std::filesystem::directory_iterator(folder_.path))
    {
      all.push_back(entry.path().filename().string());
    }
    std::sort(all.begin(), all.end());
    return all;
  }

  void put(const std::string& name, const std::string& text) const
  {
    std::ofstream(folder_.path / name, std::ios::binary) << text;
  }

  const TemporaryPath folder_;
  const std::filesystem::path path = folder_.path / "day-%n.tav";
  using Names = std::vector<std::string>;
  using Numbers = std::vector<uint32_t>;
};

} // namespace

TEST_F(LayerRecorder, ChangesTheFileBetweenRootsWhenItHasItsSize)
{
  tav::Recorder recorder(path, {.maxBytes = 1000});
  for (uint32_t i = 0; i < 5; ++i)
  {
    add(recorder, i, 500);
  }
  EXPECT_EQ(recorder.path().text(), (folder_.path / "day-3.tav").string());
  recorder.finish();
  EXPECT_EQ(names(), (Names{"day-1.tav", "day-2.tav", "day-3.tav"}));
  EXPECT_EQ(numbersIn("day-1.tav"), (Numbers{0, 1}));
  EXPECT_EQ(numbersIn("day-2.tav"), (Numbers{2, 3}));
  EXPECT_EQ(numbersIn("day-3.tav"), (Numbers{4}));
}

TEST_F(LayerRecorder, ChangesTheFileByItsAge)
{
  tav::Recorder recorder(path, {.maxAge = nanoseconds(1)});
  add(recorder, 1);
  add(recorder, 2);
  recorder.finish();
  EXPECT_EQ(names(), (Names{"day-1.tav", "day-2.tav"}));
  tav::Recorder other(path, {.maxAge = hours(24)});
  add(other, 3);
  other.finish();
  EXPECT_EQ(numbersIn("day-2.tav"), (Numbers{2, 3})) << "it goes on in the last one";
}

TEST_F(LayerRecorder, KeepsTheLastFilesAndNothingElseIsRemoved)
{
  put("day-.tav", "");
  put("day-07.tav", "");
  put("day-7.tav.old", "");
  put("other-1.tav", "");
  tav::Recorder recorder(path, {.maxBytes = 1, .keep = 3});
  for (uint32_t i = 1; i <= 12; ++i)
  {
    add(recorder, i);
    EXPECT_LE(names().size(), 4U + 3U);
  }
  recorder.finish();
  EXPECT_EQ(names(), (Names{"day-.tav", "day-07.tav", "day-10.tav", "day-11.tav", "day-12.tav", "day-7.tav.old",
                            "other-1.tav"}));
  EXPECT_EQ(numbersIn("day-12.tav"), (Numbers{12}));
}

TEST_F(LayerRecorder, GoesOnInTheLastFileAfterACrash)
{
  {
    tav::Recorder killed(path, {.maxBytes = 1000, .syncEvery = nanoseconds(0)});
    add(killed, 1);
    tav::Group open = killed.group(TAV_ELM_CMN_SYSTEM);
    open.add(TAV_ELM_CMN_CPU_ONLINE, 2U);
    killed.sync();
    std::filesystem::copy_file(folder_.path / "day-1.tav", folder_.path / "day-9.tav");
  }
  tav::Recorder recorder(path, {.maxBytes = 1000});
  EXPECT_EQ(recorder.path().text(), (folder_.path / "day-9.tav").string());
  add(recorder, 3, 1000);
  add(recorder, 4);
  recorder.finish();
  EXPECT_EQ(numbersIn("day-9.tav"), (Numbers{1, 2, 3}));
  EXPECT_EQ(numbersIn("day-10.tav"), (Numbers{4}));
}

TEST_F(LayerRecorder, LeavesALastFileThatCannotBeGoneOnWith)
{
  put("day-4.tav", "this is no stream, and long enough for a header");
  tav::Recorder recorder(path);
  EXPECT_EQ(recorder.path().text(), (folder_.path / "day-5.tav").string());
  add(recorder, 1);
  recorder.finish();
  tav::Recorder narrow(path, {}, {.root = tav::Width::bits32});
  EXPECT_EQ(narrow.path().text(), (folder_.path / "day-6.tav").string()) << "of another form";
  EXPECT_EQ(numbersIn("day-5.tav"), (Numbers{1}));
}

TEST_F(LayerRecorder, IsRefusedWhileAnotherRecordsThere)
{
  tav::Recorder first(path);
  EXPECT_EQ(thrownBy([&] { tav::Recorder second(path); }), KOR_RC_LOCKED);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { tav::Recorder second(path, {}, {}, ec); }), KOR_RC_LOCKED);
}

TEST_F(LayerRecorder, WithoutANumberInItsNameHasOneFile)
{
  const std::filesystem::path one = folder_.path / "one.tav";
  EXPECT_EQ(thrownBy([&] { tav::Recorder recorder(one, {.maxBytes = 1}); }), TAV_RC_BAD_PARAM);
  for (uint32_t i = 0; i < 2; ++i)
  {
    tav::Recorder recorder(one, {.syncEvery = hours(1)});
    add(recorder, i);
    recorder.finish();
  }
  EXPECT_EQ(numbersIn("one.tav"), (Numbers{0, 1}));
}

TEST_F(LayerRecorder, SyncsWhenARootIsClosed)
{
  tav::Recorder recorder(path, {.syncEvery = nanoseconds(0)});
  for (uint32_t i = 0; i < 3; ++i)
  {
    add(recorder, i);
    EXPECT_EQ(numbersIn("day-1.tav").size(), i + 1) << "another process sees it";
  }
  tav::Recorder never(folder_.path / "never-%n.tav", {.syncEvery = hours(1)});
  add(never, 1);
  EXPECT_EQ(std::filesystem::file_size(folder_.path / "never-1.tav"), 0U);
  never.finish();
  EXPECT_EQ(numbersIn("never-1.tav"), (Numbers{1}));
}

TEST_F(LayerRecorder, SyncsWithinARootThatTakesLonger)
{
  tav::Recorder recorder(path, {.syncEvery = nanoseconds(1)});
  tav::Group root = recorder.group(TAV_ELM_CMN_SYSTEM);
  root.add(TAV_ELM_CMN_CPU_ONLINE, 1U);
  root.add(TAV_ELM_CMN_CPU_ONLINE, 2U); // before it is added, all else goes to the device
  EXPECT_GT(std::filesystem::file_size(folder_.path / "day-1.tav"), 0U);
  root.close();
  recorder.finish();
  EXPECT_EQ(numbersIn("day-1.tav"), (Numbers{1, 2}));
}

TEST_F(LayerRecorder, IsFinishedOnceAndTakesNothingMore)
{
  tav::Recorder recorder(path);
  {
    tav::Group open = recorder.group(TAV_ELM_CMN_SYSTEM);
    EXPECT_EQ(thrownBy([&] { recorder.finish(); }), TAV_RC_BAD_PARAM) << "a group is open";
    EXPECT_EQ(thrownBy([&] { recorder.group(TAV_ELM_CMN_SYSTEM).close(); }), TAV_RC_BAD_PARAM);
  }
  recorder.finish();
  EXPECT_EQ(thrownBy([&] { recorder.finish(); }), TAV_RC_OK);
  EXPECT_EQ(thrownBy([&] { add(recorder, 1); }), TAV_RC_BAD_PARAM);
  std::error_code ec;
  EXPECT_FALSE(recorder.group(TAV_ELM_CMN_SYSTEM, {}, ec).isOpen());
  EXPECT_EQ(tav::codeOf(ec), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { recorder.sync(); }), TAV_RC_BAD_PARAM);
}

TEST_F(LayerRecorder, ThatIsMovedGoesOn)
{
  tav::Recorder first(path, {.syncEvery = nanoseconds(0)});
  add(first, 1);
  tav::Recorder second(std::move(first));
  add(second, 2);
  second.finish();
  EXPECT_EQ(numbersIn("day-1.tav"), (Numbers{1, 2}));
  EXPECT_EQ(thrownBy([&] { add(first, 1); }), TAV_RC_BAD_PARAM); // NOLINT(bugprone-use-after-move)
}

TEST_F(LayerRecorder, PassesOverANumberThatIsTaken)
{
  tav::Recorder recorder(path, {.maxBytes = 1});
  add(recorder, 1);
  put("day-2.tav", "");
  put("day-40.tav", "somebody's");
  add(recorder, 2);
  recorder.finish();
  EXPECT_EQ(names(), (Names{"day-1.tav", "day-2.tav", "day-40.tav", "day-41.tav"}));
  EXPECT_EQ(numbersIn("day-41.tav"), (Numbers{2}));
}

TEST_F(LayerRecorder, HasTwinsThatThrowNothing)
{
  tav::Recorder recorder(path);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { recorder.flush(ec); }), TAV_RC_OK);
  add(recorder, 1);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { recorder.sync(ec); }), TAV_RC_OK);
  EXPECT_EQ(numbersIn("day-1.tav"), (Numbers{1}));
  recorder.finish();
  EXPECT_EQ(givenBy([&](std::error_code& ec) { recorder.sync(ec); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { recorder.flush(ec); }), TAV_RC_BAD_PARAM);
}

TEST_F(LayerRecorder, TellsAFolderThatIsNotThere)
{
  EXPECT_EQ(thrownBy([&] { tav::Recorder recorder(folder_.path / "none" / "day-%n.tav"); }), KOR_RC_NO_SUCH_FILE);
}
