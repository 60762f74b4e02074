/// Files that are removed, renamed or replaced while they are written and read. Where an open file holds its name, as
/// on Windows, that cannot happen.
#include <fstream>

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;

namespace
{

/// What somebody does to a file.
enum class Fate : uint8_t
{
  removed,
  renamed,
  replaced
};

class LayerVanished : public testing::TestWithParam<Fate>
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

  static void put(tav::Writer& writer, uint32_t number)
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, number);
    root.close();
  }
  static void put(tav::Recorder& recorder, uint32_t number)
  {
    tav::Group root = recorder.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, number);
    root.close();
  }
  static void write(const std::filesystem::path& path, uint32_t number)
  {
    tav::Writer writer(path);
    put(writer, number);
    writer.finish();
  }

  /// What the parameter says becomes of the file; of one that is replaced, the other one has the number 99.
  void vanish(const std::filesystem::path& path) const
  {
    if (GetParam() == Fate::removed)
    {
      std::filesystem::remove(path);
      return;
    }
    std::filesystem::rename(path, moved_);
    if (GetParam() == Fate::replaced)
    {
      write(path, 99);
    }
  }

  static std::vector<uint32_t> numbersIn(const tav::Reader& reader)
  {
    std::vector<uint32_t> numbers;
    for (const tav::Node& root : reader.roots())
    {
      tav::ChildRange children = root.children();
      numbers.push_back((*children.begin()).as<uint32_t>());
    }
    return numbers;
  }
  static std::vector<uint32_t> numbersIn(const std::filesystem::path& path)
  {
    return std::filesystem::exists(path) ? numbersIn(tav::Reader(path)) : std::vector<uint32_t>{};
  }

  using Numbers = std::vector<uint32_t>;
  [[nodiscard]] Numbers whereMoved(const Numbers& numbers) const
  {
    return GetParam() == Fate::removed ? Numbers{} : numbers;
  }
  [[nodiscard]] Numbers inPlace() const
  {
    return GetParam() == Fate::replaced ? Numbers{99} : Numbers{};
  }

  const TemporaryPath folder_;
  const std::filesystem::path path_ = folder_.path / "x-1.tav";
  const std::filesystem::path moved_ = folder_.path / "moved.tav";
};

std::string nameOf(const testing::TestParamInfo<Fate>& fate)
{
  constexpr const char* names[] = {"removed", "renamed", "replaced"};
  return names[static_cast<unsigned>(fate.param)];
}

INSTANTIATE_TEST_SUITE_P(Fates, LayerVanished, testing::Values(Fate::removed, Fate::renamed, Fate::replaced), nameOf);

} // namespace

TEST_P(LayerVanished, AWriterGoesOnInTheFileThatItHas)
{
  for (const bool append : {false, true})
  {
    tav::Writer writer(path_, {.append = append});
    put(writer, 1);
    writer.sync();
    vanish(path_);
    put(writer, 2);
    writer.sync();
    writer.finish();
    EXPECT_EQ(numbersIn(moved_), whereMoved({1, 2}));
    EXPECT_EQ(numbersIn(path_), inPlace()) << "it is left alone";
    std::filesystem::remove(moved_);
    std::filesystem::remove(path_);
  }
}

TEST_P(LayerVanished, AWriterThatReplacesTakesThePlaceAllTheSame)
{
  write(path_, 1);
  tav::Writer writer(path_, {.overwrite = true});
  put(writer, 2);
  vanish(path_);
  writer.finish();
  EXPECT_EQ(numbersIn(path_), (Numbers{2}));
  EXPECT_EQ(numbersIn(moved_), whereMoved({1}));
}

TEST_P(LayerVanished, ARecorderBeginsTheNextFileWithTheNextRoot)
{
  tav::Recorder recorder(folder_.path / "x-%n.tav", {.syncEvery = std::chrono::hours(1)});
  put(recorder, 1);
  {
    tav::Group root = recorder.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, 2U);
    vanish(path_);
    root.close(); // the root is with its file
  }
  put(recorder, 3);
  put(recorder, 4);
  recorder.finish();
  EXPECT_EQ(numbersIn(moved_), whereMoved({1, 2}));
  EXPECT_EQ(numbersIn(path_), inPlace());
  EXPECT_EQ(numbersIn(folder_.path / "x-2.tav"), (Numbers{3, 4}));
}

TEST_P(LayerVanished, ARecorderOfOneFileMakesItAnewOrGoesOnInTheOneThatIsThere)
{
  tav::Recorder recorder(path_);
  put(recorder, 1);
  vanish(path_);
  put(recorder, 2);
  recorder.finish();
  EXPECT_EQ(numbersIn(moved_), whereMoved({1}));
  Numbers expected = inPlace();
  expected.push_back(2);
  EXPECT_EQ(numbersIn(path_), expected);
}

TEST_P(LayerVanished, ARecorderTellsThatItsFolderIsGone)
{
  tav::Recorder recorder(folder_.path / "x-%n.tav");
  put(recorder, 1);
  std::filesystem::remove_all(folder_.path);
  EXPECT_EQ(thrownBy([&] { put(recorder, 2); }), KOR_RC_NO_SUCH_FILE);
  EXPECT_EQ(thrownBy([&] { put(recorder, 2); }), KOR_RC_NO_SUCH_FILE);
  std::filesystem::create_directory(folder_.path);
  put(recorder, 3);
  recorder.finish();
  EXPECT_EQ(numbersIn(folder_.path / "x-2.tav"), (Numbers{3})) << "it goes on when there is one again";
}

TEST_P(LayerVanished, AReaderReadsTheFileThatItHas)
{
  for (const tav::Access access : {tav::Access::mapped, tav::Access::ring})
  {
    write(path_, 1);
    const tav::Reader reader(path_, {.access = access});
    vanish(path_);
    EXPECT_EQ(numbersIn(reader), (Numbers{1}));
    EXPECT_EQ(numbersIn(path_), inPlace());
    std::filesystem::remove(moved_);
    std::filesystem::remove(path_);
  }
}
