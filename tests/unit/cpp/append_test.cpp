/// Writers that go on behind the last stream of a file.
#include <algorithm>
#include <fstream>

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;

namespace
{

constexpr tav::FileOptions kAppend{.append = true};
constexpr tav::FileOptions kResume{.append = true, .openRoot = tav::OpenRoot::resume};
constexpr tav::FileOptions kRefuse{.append = true, .openRoot = tav::OpenRoot::refuse};

Bytes contentOf(const std::filesystem::path& path)
{
  Bytes bytes(std::filesystem::file_size(path));
  std::ifstream in(path, std::ios::binary);
  in.read(reinterpret_cast<char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
  return bytes;
}

void store(const std::filesystem::path& path, const Bytes& bytes)
{
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

struct Written
{
  tav::StreamOptions options;
  bool pairs;
};

std::string nameOf(const testing::TestParamInfo<Written>& form)
{
  const tav::StreamOptions& options = form.param.options;
  return std::string(options.byteOrder == tav::ByteOrder::native ? "Native" : "Swapped") +
         (options.root == tav::Width::bits64 ? "64" : "32") + (options.align8 ? "Aligned" : "") +
         (form.param.pairs ? "Pairs" : "");
}

std::vector<Written> forms()
{
  std::vector<Written> all;
  for (const auto order : {tav::ByteOrder::native, tav::ByteOrder::swapped})
  {
    for (const bool align : {false, true})
    {
      constexpr uint64_t ring = 2U << 20U;
      all.push_back({{.byteOrder = order, .align8 = align, .ringBytes = ring}, false});
      all.push_back({{.byteOrder = order, .align8 = align, .ringBytes = ring}, true});
      all.push_back({{.byteOrder = order, .align8 = align, .root = tav::Width::bits32, .ringBytes = ring}, false});
    }
  }
  return all;
}

/// P: byte order x alignment x (64-bit, 64-bit with pairs, 32-bit)
class LayerAppend : public testing::TestWithParam<Written>
{
protected:
  [[nodiscard]] const tav::StreamOptions& options() const
  {
    return GetParam().options;
  }

  [[nodiscard]] tav::GroupOptions group() const
  {
    return {.eyeSize = GetParam().pairs};
  }
  [[nodiscard]] tav::NodeOptions element() const
  {
    return {.eyeSize = GetParam().pairs};
  }

  /// What is below a root that counts from `first`.
  void fill(tav::Group& root, uint32_t first, uint32_t count) const
  {
    for (uint32_t i = 0; i < count; ++i)
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST, group());
      host.add(TAV_ELM_CMN_HOST_NAME, std::string(1 + i % 7, 'a'), element());
      host.add(TAV_ELM_CMN_CPU_ONLINE, first + i, element());
    }
  }

  void put(tav::Writer& writer, uint32_t first, uint32_t count) const
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, group());
    fill(root, first, count);
    root.close();
  }

  void writeFile(uint32_t first, uint32_t count) const
  {
    tav::Writer writer(file_.path, {.overwrite = true, .inPlace = true}, options());
    put(writer, first, count);
    writer.finish();
  }

  /// The numbers in the file, root by root.
  [[nodiscard]] std::vector<std::vector<uint32_t>> numbers() const
  {
    std::vector<std::vector<uint32_t>> all;
    const tav::Reader reader(file_.path, options());
    for (const tav::Node& root : reader.roots())
    {
      all.emplace_back();
      for (const tav::Node& node : root.descendants())
      {
        if (node.elm() == TAV_ELM_CMN_CPU_ONLINE)
        {
          all.back().push_back(node.as<uint32_t>());
        }
      }
    }
    return all;
  }

  /// A file that a killed writer leaves: `count` hosts, the last one open as the root is, and the first `size` bytes of
  /// it all.
  [[nodiscard]] Bytes openStream(uint32_t count) const
  {
    tav::Writer writer(options());
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, group());
    fill(root, 0, count);
    tav::Group last = root.group(TAV_ELM_CMN_HOST, group());
    last.add(TAV_ELM_CMN_CPU_ONLINE, 77U, element());
    return bytesOf(writer.bytes());
  }

  const TemporaryPath file_;
};

INSTANTIATE_TEST_SUITE_P(Forms, LayerAppend, testing::ValuesIn(forms()), nameOf);

using Numbers = std::vector<std::vector<uint32_t>>;

} // namespace

TEST_P(LayerAppend, GoesOnBehindTheLastStreamWithoutItsZeros)
{
  writeFile(1, 2);
  for (uint32_t i = 0; i < 3; ++i)
  {
    tav::Writer writer(file_.path, kAppend);
    put(writer, 10 * (i + 1), 1);
    put(writer, 10 * (i + 1) + 5, 1);
    writer.finish();
    EXPECT_EQ(std::filesystem::file_size(file_.path), writer.size());
  }
  EXPECT_EQ(numbers(), (Numbers{{1, 2}, {10}, {15}, {20}, {25}, {30}, {35}}));
}

TEST_P(LayerAppend, GivesTheBytesOfStreamsThatStandBesideEachOther)
{
  Bytes expected;
  for (uint32_t i = 0; i < 3; ++i)
  {
    tav::Writer alone(options());
    put(alone, i, 3);
    const Bytes bytes = bytesOf(alone.bytes());
    expected.insert(expected.end(), bytes.begin(), bytes.end());
    tav::Writer writer(file_.path, kAppend, options());
    put(writer, i, 3);
    writer.finish();
  }
  EXPECT_EQ(contentOf(file_.path), expected);
}

TEST_P(LayerAppend, BeginsAnewWhereThereIsNoFileOrAnEmptyOne)
{
  for (const bool empty : {false, true})
  {
    std::filesystem::remove(file_.path);
    if (empty)
    {
      store(file_.path, {});
    }
    tav::Writer writer(file_.path, kAppend, options());
    put(writer, 4, 1);
    writer.finish();
    EXPECT_EQ(numbers(), (Numbers{{4}}));
  }
}

TEST_P(LayerAppend, ClosesWhatAKilledWriterLeftWhereverItWasCut)
{
  const Bytes all = openStream(3);
  tav::Writer whole(options());
  put(whole, 0, 1);
  const Bytes before = bytesOf(whole.bytes());
  for (size_t size = 1; size <= all.size(); size += size + 40 < all.size() ? 5 : 1)
  {
    for (const size_t zeros : std::initializer_list<size_t>{0, 1, 5000})
    {
      if (zeros != 0 && size != all.size())
      {
        continue; // a cut page is the last one
      }
      Bytes bytes = before;
      bytes.insert(bytes.end(), all.begin(), all.begin() + static_cast<std::ptrdiff_t>(size));
      bytes.resize(bytes.size() + zeros);
      store(file_.path, bytes);
      SCOPED_TRACE(std::to_string(size) + " of " + std::to_string(all.size()) + " bytes, " + std::to_string(zeros));
      tav::Writer writer(file_.path, kAppend, options());
      put(writer, 100, 1);
      writer.finish();
      const Numbers found = numbers();
      ASSERT_EQ(found.front(), std::vector<uint32_t>{0});
      ASSERT_EQ(found.back(), std::vector<uint32_t>{100});
      ASSERT_LE(found.size(), 3U);
      if (size == all.size())
      {
        ASSERT_EQ(found[1], (std::vector<uint32_t>{0, 1, 2, 77}));
      }
      std::error_code ec;
      tav::Reader reader(file_.path, options());
      for (const tav::Node& root : reader.roots(ec))
      {
        EXPECT_FALSE(root.isOpen());
      }
      EXPECT_FALSE(ec) << ec.message();
    }
  }
}

TEST_P(LayerAppend, ClosesTheOnlyRootBeforeTheZerosBehindIt)
{
  Bytes bytes = openStream(2);
  bytes.resize(bytes.size() + 5000);
  store(file_.path, bytes);
  tav::Writer writer(file_.path, kAppend, options());
  put(writer, 100, 1);
  writer.finish();
  EXPECT_EQ(numbers(), (Numbers{{0, 1, 77}, {100}}));
}

TEST_P(LayerAppend, KeepsEachNodeThatIsWhole)
{
  const Bytes all = openStream(3);
  size_t most = 0;
  for (size_t size = 32; size <= all.size(); size += size + 40 < all.size() ? 5 : 1)
  {
    store(file_.path, Bytes(all.begin(), all.begin() + static_cast<std::ptrdiff_t>(size)));
    tav::Writer writer(file_.path, kAppend, options());
    writer.finish();
    const Numbers found = numbers();
    ASSERT_EQ(found.size(), 1U);
    EXPECT_GE(found[0].size(), most) << size;
    most = found[0].size();
    for (size_t i = 0; i < most; ++i)
    {
      EXPECT_EQ(found[0][i], i == 3 ? 77 : i);
    }
  }
  EXPECT_EQ(most, 4U);
}

TEST_P(LayerAppend, DropsARootOfWhichNothingButTheHeaderIsWhole)
{
  tav::Writer whole(options());
  put(whole, 1, 2);
  tav::Writer known(options());
  put(known, 10, 3);
  known.finish();
  tav::Writer open(options());
  const tav::Group root = open.group(TAV_ELM_CMN_SYSTEM, group());
  const Bytes before = bytesOf(whole.bytes());
  const size_t header = options().root == tav::Width::bits64 ? 16 : 8;
  for (const Bytes& from : {bytesOf(known.bytes()), bytesOf(open.bytes())}) // with its size, and without
  {
    for (size_t size = 1; size <= std::min(from.size(), header + header - 1); ++size)
    {
      SCOPED_TRACE(size);
      Bytes bytes = before;
      bytes.insert(bytes.end(), from.begin(), from.begin() + static_cast<std::ptrdiff_t>(size));
      store(file_.path, bytes);
      tav::Writer writer(file_.path, kAppend, options());
      put(writer, 60, 1);
      writer.finish();
      ASSERT_EQ(numbers(), (Numbers{{1, 2}, {60}}));
    }
    store(file_.path, Bytes(from.begin(), from.begin() + static_cast<std::ptrdiff_t>(header)));
    tav::Writer writer(file_.path, kAppend, options());
    put(writer, 60, 1);
    writer.finish();
    EXPECT_EQ(numbers(), (Numbers{{60}})) << "it was the only one";
  }
}

TEST_P(LayerAppend, ResumesTheRootThatAKilledWriterLeft)
{
  store(file_.path, openStream(2));
  tav::Writer writer(file_.path, kResume, options());
  {
    tav::Group root = writer.resumed();
    ASSERT_TRUE(root.isOpen());
    EXPECT_FALSE(writer.resumed().isOpen()) << "there is one";
    fill(root, 50, 2);
    root.close();
  }
  put(writer, 60, 1);
  writer.finish();
  EXPECT_EQ(numbers(), (Numbers{{0, 1, 77, 50, 51}, {60}}));
}

TEST_P(LayerAppend, TakesBackTheRootThatItHasResumed)
{
  writeFile(1, 2);
  const Bytes before = contentOf(file_.path);
  for (const bool goesOn : {false, true})
  {
    SCOPED_TRACE(goesOn);
    store(file_.path, before);
    {
      auto killed = std::make_unique<tav::Writer>(file_.path, kAppend, options());
      tav::Group open = killed->group(TAV_ELM_CMN_SYSTEM, group());
      fill(open, 10, 3);
      killed.reset(); // before the group, which nobody closes then
    }
    tav::Writer writer(file_.path, kResume, options());
    tav::Group root = writer.resumed();
    ASSERT_TRUE(root.isOpen());
    fill(root, 20, 3);
    root.abandon();
    writer.flush();
    {
      const tav::Reader meanwhile(file_.path, options());
      std::vector<bool> open;
      for (const tav::Node& there : meanwhile.roots())
      {
        open.push_back(there.isOpen());
      }
      EXPECT_EQ(open, (std::vector<bool>{false, true})) << "whoever reads meanwhile sees no root that is closed";
    }
    if (goesOn)
    {
      put(writer, 60, 1);
    }
    writer.finish();
    EXPECT_EQ(std::filesystem::file_size(file_.path), writer.size());
    EXPECT_EQ(numbers(), goesOn ? (Numbers{{1, 2}, {60}}) : (Numbers{{1, 2}}));
  }
}

TEST_P(LayerAppend, NothingIsLeftOfALastRootThatWasTakenBack)
{
  for (const tav::FileOptions& how : {tav::FileOptions{}, kAppend, tav::FileOptions{.overwrite = true},
                                      tav::FileOptions{.overwrite = true, .inPlace = true}})
  {
    for (const uint32_t hosts : {1U, 4000U})
    {
      for (const bool goesOn : {false, true})
      {
        SCOPED_TRACE(std::to_string(hosts) + (goesOn ? " hosts, and another root" : " hosts"));
        std::filesystem::remove(file_.path);
        tav::Writer writer(file_.path, how, options());
        put(writer, 1, 2);
        tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, group());
        fill(root, 10, hosts);
        writer.flush();
        root.abandon();
        if (goesOn)
        {
          put(writer, 30, 1);
        }
        writer.finish();
        EXPECT_EQ(numbers(), goesOn ? (Numbers{{1, 2}, {30}}) : (Numbers{{1, 2}}));
        EXPECT_EQ(std::filesystem::file_size(file_.path), writer.size());
        tav::Writer next(file_.path, kAppend, options());
        put(next, 40, 1);
        next.finish();
        EXPECT_EQ(numbers().back(), std::vector<uint32_t>{40});
      }
    }
  }
}

TEST_P(LayerAppend, ClosesARootThatNobodyGoesOnWith)
{
  store(file_.path, openStream(2));
  {
    tav::Writer writer(file_.path, kResume, options());
    put(writer, 60, 1);
    EXPECT_FALSE(writer.resumed().isOpen());
    writer.finish();
  }
  EXPECT_EQ(numbers(), (Numbers{{0, 1, 77}, {60}}));
  tav::Writer writer(file_.path, kResume, options());
  EXPECT_FALSE(writer.resumed().isOpen()) << "nothing was left open";
}

TEST_P(LayerAppend, SetsASizeThatCouldNotBeWrittenAndLosesNoRootBehindIt)
{
  if (!GetParam().pairs)
  {
    return; // without an end element such a root is an open one
  }
  for (const uint32_t rootsBehind : {0U, 2U})
  {
    SCOPED_TRACE(rootsBehind);
    tav::Writer before(options());
    put(before, 0, 3);
    for (uint32_t i = 0; i < rootsBehind; ++i)
    {
      put(before, 10 * (i + 1), 2);
    }
    before.finish();
    const Bytes sound = bytesOf(before.bytes());
    Bytes bytes = sound;
    std::fill_n(bytes.begin(), 8, uint8_t{0xFF}); // the size of the first root
    store(file_.path, bytes);
    tav::Writer writer(file_.path, {.append = true}, options());
    put(writer, 60, 1);
    writer.finish();
    const Bytes after = contentOf(file_.path);
    ASSERT_GT(after.size(), sound.size());
    EXPECT_EQ(Bytes(after.begin(), after.begin() + static_cast<ptrdiff_t>(sound.size())),
              rootsBehind == 0 ? sound : bytes);
  }
}

TEST_P(LayerAppend, RefusesAnOpenRootWhereThatIsAsked)
{
  const Bytes before = openStream(2);
  store(file_.path, before);
  EXPECT_EQ(thrownBy([&] { tav::Writer writer(file_.path, kRefuse, options()); }), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { tav::Writer writer(file_.path, kRefuse, options(), ec); }),
            TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(contentOf(file_.path), before);
}

TEST_P(LayerAppend, RefusesAnotherFormAndLeavesTheFileAsItIs)
{
  writeFile(1, 5);
  const Bytes before = contentOf(file_.path);
  for (const Written& other : forms())
  {
    const bool same = other.options.byteOrder == options().byteOrder && other.options.align8 == options().align8 &&
                      other.options.root == options().root;
    if (!same)
    {
      const auto open = [&] { tav::Writer writer(file_.path, kAppend, other.options); };
      EXPECT_EQ(thrownBy(open), TAV_RC_BAD_OPTIONS);
      EXPECT_THAT(messageOf(open), testing::HasSubstr("; the options say "));
      ASSERT_TRUE(contentOf(file_.path) == before);
    }
  }
}

TEST_P(LayerAppend, RefusesADamagedEndAndLeavesTheFileAsItIs)
{
  writeFile(1, 5);
  uint64_t end = 0;
  {
    tav::Writer writer(file_.path, kAppend);
    put(writer, 1, 5);
    end = writer.size();
    writer.finish();
  }
  Bytes bytes = contentOf(file_.path);
  ASSERT_EQ(bytes.size(), end);
  bytes.insert(bytes.end(), {9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9});
  store(file_.path, bytes);
  const auto open = [&] { tav::Writer writer(file_.path, kAppend); };
  EXPECT_EQ(thrownBy(open), TAV_RC_OUTSIDE_PARENT);
  EXPECT_THAT(messageOf(open), testing::HasSubstr("tav recover"));
  EXPECT_EQ(contentOf(file_.path), bytes);
}

TEST_P(LayerAppend, RefusesASizeThatIsWrongInTheMiddleInsteadOfDroppingWhatIsBehind)
{
  tav::Writer open(options());
  tav::Group root = open.group(TAV_ELM_CMN_SYSTEM, group());
  for (uint32_t i = 0; i < 30; ++i)
  {
    root.add(TAV_ELM_CMN_CPU_ONLINE, i, element());
  }
  Bytes bytes = bytesOf(open.bytes());
  const size_t header = options().root == tav::Width::bits64 ? 16 : 8;
  const size_t width = header / 2; // of the size, which comes first
  const bool lowFirst = (options().byteOrder == tav::ByteOrder::native) != kBigEndianHost;
  bytes[header + (lowFirst ? width - 2 : 1)] = 0x10; // of the first number: more than the file has
  store(file_.path, bytes);
  const auto append = [&] { tav::Writer writer(file_.path, kAppend, options()); };
  EXPECT_EQ(thrownBy(append), TAV_RC_OUTSIDE_PARENT);
  EXPECT_THAT(messageOf(append), testing::HasSubstr("a size that is wrong"));
  EXPECT_EQ(contentOf(file_.path), bytes);
}

TEST(LayerAppendTo, AFileWhoseLastRootCannotBeGoneOnWithIsRefusedAndStaysAsItIs)
{
  constexpr uint64_t huge = uint64_t{1} << 30U;
  constexpr size_t tooMuch = (size_t{16} << 20U) + 1;
  ByteRows open;
  open.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  ByteRows larger(open); // than the group that it is in
  larger.h64(40, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST).h64(60, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_HOST_NAME).fill(7, 9);
  ByteRows cut(open); // of which more is there than a killed writer leaves
  cut.h64(huge, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_HOST_NAME).fill(tooMuch, 9);
  ByteRows deep(open);
  for (int i = 0; i < 4001; ++i)
  {
    deep.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  }
  deep.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(7, 4);
  const std::vector<std::pair<Bytes, const char*>> files = {{larger.bytes, "no node of its group"},
                                                            {cut.bytes, "too large to be dropped"},
                                                            {deep.bytes, "more open groups than can be"}};
  for (const auto& [bytes, sentence] : files)
  {
    const TemporaryPath file;
    store(file.path, bytes);
    const auto append = [&] { tav::Writer writer(file.path, kAppend); };
    EXPECT_EQ(thrownBy(append), TAV_RC_OUTSIDE_PARENT) << sentence;
    EXPECT_THAT(messageOf(append), testing::HasSubstr(sentence));
    EXPECT_TRUE(contentOf(file.path) == bytes) << sentence;
  }
}

TEST(LayerAppendTo, AFileThatIsNoStreamIsRefusedAndStaysAsItIs)
{
  const TemporaryPath file;
  const std::string text = "This is a text, and no stream at all. It is long enough for a header.";
  const std::vector<Bytes> contents{Bytes(text.begin(), text.end()), Bytes(5000, 0), Bytes{1}, Bytes(100, 0xFF)};
  for (const Bytes& bytes : contents)
  {
    store(file.path, bytes);
    EXPECT_EQ(thrownBy([&] { tav::Writer writer(file.path, kAppend); }), TAV_RC_NOT_FOUND);
    EXPECT_EQ(thrownBy([&] { tav::Writer writer(file.path, kAppend, {.root = tav::Width::bits32}); }),
              TAV_RC_NOT_FOUND);
    EXPECT_EQ(contentOf(file.path), bytes);
  }
}

TEST(LayerAppendTo, AFormThatCannotBeToldIsRefusedWithASentence)
{
  const TemporaryPath file;
  const tav::StreamOptions narrow{.root = tav::Width::bits32};
  {
    tav::Writer writer(file.path, kAppend, narrow);
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    root.add(TAV_ELM_CMN_CPU_ONLINE, uint64_t{8}); // padded or not, it is the same
    root.close();
    writer.finish();
  }
  const Bytes before = contentOf(file.path);
  const auto open = [&] { tav::Writer writer(file.path, kAppend); };
  EXPECT_EQ(thrownBy(open), TAV_RC_BAD_OPTIONS);
  EXPECT_THAT(messageOf(open), testing::HasSubstr("32-bit root header, not padded or "));
  EXPECT_EQ(contentOf(file.path), before);
  tav::Writer told(file.path, kAppend, narrow);
  told.group(TAV_ELM_CMN_SYSTEM).close();
  told.finish();
}

TEST(LayerAppendTo, AFileThatAnotherWriterHasIsRefused)
{
  const TemporaryPath file;
  tav::Writer first(file.path, kAppend);
  EXPECT_EQ(thrownBy([&] { tav::Writer second(file.path, kAppend); }), KOR_RC_LOCKED);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { tav::Writer second(file.path, kAppend, ec); }), KOR_RC_LOCKED);
  first.group(TAV_ELM_CMN_SYSTEM).close();
  first.finish();
  EXPECT_EQ(thrownBy([&] { tav::Writer second(file.path, kAppend); }), TAV_RC_OK);
}

TEST(LayerAppendTo, OverwritingExcludesIt)
{
  const TemporaryPath file;
  EXPECT_EQ(thrownBy([&] { tav::Writer w(file.path, {.overwrite = true, .append = true}); }), TAV_RC_BAD_OPTIONS);
  EXPECT_FALSE(std::filesystem::exists(file.path));
}

TEST(LayerAppendTo, AWriterThatIsMovedGoesOn)
{
  const TemporaryPath file;
  tav::Writer first(file.path, kAppend);
  tav::Writer moved(std::move(first));
  moved.group(TAV_ELM_CMN_SYSTEM).close();
  moved.finish();
  EXPECT_EQ(std::filesystem::file_size(file.path), 16U);
}
