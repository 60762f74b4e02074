/// After sync() every node added before comes back, whatever a file system made of what was written since: any of those
/// writes may be missing, whole or in sectors, and come in any order.
#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <random>
#include <set>

#include <gmock/gmock.h>

#include "crash/loggedFile.h"
#include "tav/inspect.hpp"
#include "tav/tav.hpp"
#include "tools/host/host.h"

namespace
{

using crash::Kind;
using crash::Operation;
using Image = std::vector<uint8_t>;

constexpr uint64_t kSector = 512;

uint64_t imagesWanted()
{
  const char* const wanted = std::getenv("TAV_CRASH_IMAGES"); // tens of thousands on demand
  return wanted != nullptr ? std::strtoull(wanted, nullptr, 10) : 400;
}

std::string pathFor(const std::string& name)
{
  const std::string path = tav::host::textOf(std::filesystem::temp_directory_path()) + "/tav-crash-" +
                           std::to_string(tav::host::processId()) + "-" + name;
  std::filesystem::remove(path); // a process of this number may have been killed, and left it
  return path;
}

/// What a program has to rely on from a place in the log on.
struct Promise
{
  size_t at;      ///< operations that were done when sync() returned
  uint32_t nodes; ///< that had been added
};

struct Recording
{
  std::vector<Operation> log;
  std::vector<Promise> promises;
  tav::StreamOptions options;
};

/// How a stream is recorded.
struct Style
{
  uint64_t page; ///< of the ring; 0: a file as the layer opens it
  bool pairs;
  bool align;
  bool narrow;
  unsigned sessions; ///< writers one after another, each of them destroyed at any moment
};

/// Adds numbered nodes in groups of all depths, and syncs now and then.
class Recorded
{
public:
  Recorded(const Style& style, uint64_t seed)
      : style_(style), random_(seed), path_(pathFor(std::to_string(seed)))
  {
    recording_.options = {.align8 = style.align,
                          .root = style.narrow ? tav::Width::bits32 : tav::Width::bits64,
                          .ringBytes = style.page != 0 ? style.page * (2 + below(4)) : uint64_t{3} << 20U};
    { // there before it is watched
      KORHFile file;
      KORFileOpenParam param;
      param.pPath = path_.c_str();
      param.options = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_TRUNCATE;
      file.open(&param);
    }
    crash::watch(path_);
    for (unsigned session = 0; session < style.sessions; ++session)
    {
      record();
    }
    recording_.log = crash::log();
    crash::watch({});
    std::filesystem::remove(path_);
  }

  [[nodiscard]] const Recording& recording() const
  {
    return recording_;
  }

private:
  uint64_t below(uint64_t limit)
  {
    return random_() % limit;
  }

  void record()
  {
    if (style_.page == 0)
    {
      tav::Writer writer(path_, {.append = true}, recording_.options);
      fill(writer);
      return;
    }
    KORFileOpenParam param;
    param.pPath = path_.c_str();
    param.options = KOR_FILE_UPDATE;
    uint32_t rc = TAV_RC_OK;
    TAVSSFile storage(&param, &rc);
    storage.ioUnit = style_.page;
    tav::Writer writer(storage, recording_.options);
    fill(writer);
  }

  void fill(tav::Writer& writer)
  {
    const uint64_t roots = 1 + below(4);
    for (uint64_t i = 0; i < roots; ++i)
    {
      tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = style_.pairs});
      fill(writer, root, 0);
      if (i + 1 == roots && below(2) == 0)
      {
        return; // killed with an open root
      }
    }
    if (below(2) == 0)
    {
      writer.finish();
    }
  }

  void fill(tav::Writer& writer, tav::Group& group, int depth)
  {
    for (uint64_t left = 2 + below(12); left != 0; --left)
    {
      if (depth < 3 && below(4) == 0)
      {
        tav::Group inner = group.group(TAV_ELM_CMN_HOST, {.eyeSize = style_.pairs});
        fill(writer, inner, depth + 1);
      }
      else
      {
        const std::string text(below(below(8) == 0 ? 900 : 40), 'x');
        group.add(TAV_ELM_CMN_HOST_NAME, text + std::to_string(added_++), {.eyeSize = style_.pairs});
      }
      if (below(9) == 0)
      {
        writer.sync();
        recording_.promises.push_back({crash::log().size(), added_});
      }
    }
  }

  Style style_;
  std::mt19937_64 random_;
  std::string path_;
  uint32_t added_ = 0;
  Recording recording_;
};

/// Makes what a disk can hold when the machine stops behind some operation of a log.
class Crash
{
public:
  Crash(const Recording& recording, uint64_t seed)
      : recording_(recording), random_(seed)
  {
  }

  /// Stops behind `count` operations. `all`: all of them are on the disk, the last one perhaps in part; else what was
  /// not synced is there or not, sector by sector.
  Image stop(size_t count, bool all)
  {
    const auto begin = recording_.log.begin();
    size_t synced = count;
    while (synced != 0 && begin[static_cast<std::ptrdiff_t>(synced) - 1].kind != Kind::sync)
    {
      --synced;
    }
    Image image;
    for (size_t i = 0; i < count; ++i)
    {
      const bool whole = i < synced || (all && i + 1 < count);
      apply(image, begin[static_cast<std::ptrdiff_t>(i)], whole, all);
    }
    return image;
  }

private:
  /// How much of an operation is there: all, a random part at the end of a log, or random sectors.
  void apply(Image& image, const Operation& operation, bool whole, bool torn)
  {
    if (operation.kind == Kind::resize)
    {
      if (whole || random_() % 2 == 0)
      {
        image.resize(static_cast<size_t>(operation.offset));
      }
      return;
    }
    if (operation.kind != Kind::write)
    {
      return;
    }
    const uint64_t end = operation.offset + operation.bytes.size();
    const uint64_t chance = random_() % 5; // of four: how many sectors are there
    const uint64_t stop = torn ? operation.offset + random_() % (operation.bytes.size() + 1) : end;
    for (uint64_t from = operation.offset; from < end;)
    {
      const uint64_t to = std::min(end, (from / kSector + 1) * kSector);
      const bool isThere = whole || (torn ? to <= stop : random_() % 4 < chance);
      if (isThere)
      {
        image.resize(std::max<size_t>(image.size(), static_cast<size_t>(to)));
        std::copy_n(operation.bytes.begin() + static_cast<std::ptrdiff_t>(from - operation.offset), to - from,
                    image.begin() + static_cast<std::ptrdiff_t>(from));
      }
      from = to;
    }
  }

  const Recording& recording_;
  std::mt19937_64 random_;
};

/// The numbers of the nodes that a sound stream holds.
std::set<uint32_t> numbersIn(std::span<const uint8_t> bytes, const tav::StreamOptions& options)
{
  std::set<uint32_t> numbers;
  const tav::Reader reader(std::as_bytes(bytes), options);
  for (const tav::Node& root : reader.roots())
  {
    for (const tav::Node& node : root.descendants())
    {
      if (node.elm() == TAV_ELM_CMN_HOST_NAME && node.type() == TAV_TYPE_ASCII_STRING)
      {
        const auto text = node.as<std::string_view>();
        const size_t digits = std::min(text.find_first_not_of('x'), text.size());
        const std::string number(text.substr(digits));
        numbers.insert(static_cast<uint32_t>(std::strtoul(number.c_str(), nullptr, 10)));
      }
    }
  }
  return numbers;
}

std::set<uint32_t> recovered(const Image& image, const tav::StreamOptions& options)
{
  tav::inspect::ByteSource source("image", image);
  tav::inspect::Form form;
  form.root64 = options.root == tav::Width::bits64;
  form.aligned = options.align8;
  const std::unique_ptr<tav::inspect::Scratch> scratch = tav::inspect::makeScratch();
  tav::inspect::PatchFile out(scratch->file());
  tav::inspect::recover(source, form, out);
  Image made(static_cast<size_t>(out.length()));
  out.read(0, made);
  return numbersIn(made, options);
}

std::string missing(const std::set<uint32_t>& found, uint32_t due)
{
  std::string text;
  for (uint32_t i = 0; i < due; ++i)
  {
    text += found.contains(i) ? "" : " " + std::to_string(i);
  }
  return text;
}

std::vector<Style> styles()
{
  return {{0, true, false, false, 3},    // as the layer opens files
          {0, false, true, false, 2},    //
          {0, false, false, true, 2},    //
          {512, true, false, false, 1},  // with pages that come and go
          {512, false, false, false, 1}, //
          {4096, true, true, false, 1},  //
          {64, false, false, true, 1},   //
          {4096, false, false, false, 1}};
}

} // namespace

TEST(Sync, WaitsForTheFileAndOnceForItsFolder)
{
  const std::string path = pathFor("folder");
  tav::Writer writer(path);
  crash::watch(path);
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  const auto kinds = [] {
    std::vector<Kind> all;
    for (const Operation& operation : crash::log())
    {
      all.push_back(operation.kind);
    }
    return all;
  };
  writer.flush();
  EXPECT_EQ(kinds(), (std::vector<Kind>{Kind::write}));
  writer.sync();
  EXPECT_EQ(kinds(), (std::vector<Kind>{Kind::write, Kind::sync, Kind::syncFolder}));
  root.add(TAV_ELM_CMN_HOST_NAME, "ada");
  writer.sync();
  EXPECT_EQ(kinds(),
            (std::vector<Kind>{Kind::write, Kind::sync, Kind::syncFolder, Kind::write, Kind::sync}));
  root.close();
  writer.finish();
  crash::watch({});
  std::filesystem::remove(path);
}

TEST(Sync, ThatFailedMakesAllLaterOnesFail)
{
  const std::string path = pathFor("failed");
  tav::Writer writer(path);
  crash::watch(path);
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  crash::failNextSync();
  for (int i = 0; i < 3; ++i)
  {
    std::error_code ec;
    writer.sync(ec);
    EXPECT_EQ(tav::codeOf(ec), KOR_RC_IO_ERROR) << i;
  }
  try
  {
    writer.sync();
    ADD_FAILURE();
  }
  catch (const std::system_error& error)
  {
    EXPECT_THAT(error.what(), testing::HasSubstr("what was written since the last successful sync may be lost"));
  }
  root.close();
  writer.finish();
  crash::watch({});
  std::filesystem::remove(path);
}

TEST(Sync, BringsBackEveryNodeFromBeforeWhateverBecameOfLaterWrites)
{
  const uint64_t wanted = imagesWanted();
  uint64_t images = 0;
  uint64_t promised = 0;
  for (uint64_t seed = 1; images < wanted; ++seed)
  {
    const std::vector<Style> ways = styles();
    const Recorded made(ways[seed % ways.size()], seed);
    const Recording& recording = made.recording();
    Crash crash(recording, seed * 7919);
    const size_t operations = recording.log.size();
    const size_t step = wanted < 10000 ? 1 + operations / 12 : 1;
    for (size_t count = 1; count <= operations && images < wanted; count += step)
    {
      uint32_t due = 0;
      for (const Promise& promise : recording.promises)
      {
        due = promise.at <= count ? promise.nodes : due;
      }
      for (const bool all : {true, false, false})
      {
        const Image image = crash.stop(count, all);
        const std::set<uint32_t> found = recovered(image, recording.options);
        ++images;
        promised += due;
        ASSERT_EQ(missing(found, due), "") << "seed " << seed << ", " << count << " of " << operations
                                           << " operations, " << due << " nodes due, " << image.size() << " bytes";
      }
    }
  }
  std::printf("%llu crash images, %llu nodes due in all\n", static_cast<unsigned long long>(images),
              static_cast<unsigned long long>(promised));
  EXPECT_GT(promised, images) << "most images hold something";
}
