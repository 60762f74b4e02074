/// @file recorder.hpp
/// Recording for weeks: roots one after another, in files that change.
#pragma once

#include <charconv>
#include <concepts>
#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "tav/cpp/writer.hpp"

namespace tav
{

/// A length of time. Any std::chrono::duration makes one, of which a program that has one knows the header; the longest
/// that there is, some 292 years, stands for all longer ones.
class Interval
{
public:
  constexpr Interval() noexcept = default;
  template<class Duration>
  requires requires(const Duration& length)
  {
    length.count();
    Duration::period::num;
    Duration::period::den;
  }
  // NOLINTNEXTLINE(google-explicit-constructor): times are given as they are at hand
  constexpr Interval(const Duration& length) noexcept
  {
    constexpr double most = 9.2e18; // 63 bits
    using Period = typename Duration::period;
    const double about = static_cast<double>(length.count()) * 1e9 * static_cast<double>(Period::num) /
                         static_cast<double>(Period::den);
    const bool isLong = !(about < most);
    nanoseconds_ = isLong ? std::numeric_limits<int64_t>::max() : static_cast<int64_t>(about);
  }

  [[nodiscard]] constexpr int64_t nanoseconds() const noexcept
  {
    return nanoseconds_;
  }

private:
  int64_t nanoseconds_ = 0;
};

/// When a recorder changes files, and what it does for those that it has written.
struct RecorderOptions
{
  uint64_t maxBytes = 0; ///< a file that has as many takes no further root; 0: any number
  uint64_t keep = 0;     ///< files that stay, the newest ones; older ones are removed. 0: all
  Interval maxAge{};     ///< a file that was opened so long ago takes no further root; 0: any time
  /// Syncs when a root is closed and the last sync was so long ago, and within a root that takes longer when something
  /// is added to it; 0: whenever a root is closed. Unset: never by itself.
  std::optional<Interval> syncEvery{};
};

namespace detail
{

/// The files that a recorder's path stands for: "day-%n.tav" for day-1.tav, day-2.tav, and so on.
class NumberedFiles
{
public:
  explicit NumberedFiles(const FilePath& path)
      : path_(path)
  {
    const std::string& text = path.text();
    // NOLINTNEXTLINE(performance-faster-string-find): of one character on this system, of two on Windows
    const size_t folder = text.find_last_of(KOR_PATH_SEPARATORS);
    folder_ = text.substr(0, folder == std::string::npos ? 0 : folder + 1);
    const std::string name = text.substr(folder_.size());
    const size_t at = name.find("%n");
    isNumbered_ = at != std::string::npos;
    before_ = name.substr(0, at);
    behind_ = isNumbered_ ? name.substr(at + 2) : "";
  }

  [[nodiscard]] bool isNumbered() const noexcept
  {
    return isNumbered_;
  }
  [[nodiscard]] FilePath at(uint64_t number) const
  {
    return isNumbered_ ? FilePath(folder_ + before_ + std::to_string(number) + behind_) : path_;
  }

  /// The numbers of the files that are there, in rising order.
  uint32_t list(std::vector<uint64_t>& numbers) const
  {
    numbers.clear();
    Listing listing{*this, numbers};
    return korListFolder(folder_.empty() ? "." : folder_.c_str(), &NumberedFiles::take, &listing);
  }

  /// Removes all files but the last ones. Goes on over one that cannot be removed.
  uint32_t removeAllBut(uint64_t count) const
  {
    std::vector<uint64_t> numbers;
    uint32_t rc = list(numbers);
    for (size_t i = 0; i + count < numbers.size(); ++i)
    {
      const uint32_t removed = korRemoveFile(at(numbers[i]).c_str());
      rc = removed == TAV_RC_OK || removed == KOR_RC_NO_SUCH_FILE ? rc : removed;
    }
    return rc;
  }

private:
  struct Listing
  {
    const NumberedFiles& files;
    std::vector<uint64_t>& numbers;
  };

  static void take(const char* name, void* context)
  {
    auto& [files, numbers] = *static_cast<Listing*>(context);
    uint64_t number = 0;
    if (files.numberOf(name, number))
    {
      auto place = numbers.end(); // few files, and most systems list them as they were made
      while (place != numbers.begin() && *(place - 1) > number) --place;
      numbers.insert(place, number);
    }
  }

  bool numberOf(std::string_view name, uint64_t& number) const noexcept
  {
    if (name.size() <= before_.size() + behind_.size() || !name.starts_with(before_) || !name.ends_with(behind_))
    {
      return false;
    }
    name = name.substr(before_.size(), name.size() - before_.size() - behind_.size());
    const auto [end, failure] = std::from_chars(name.data(), name.data() + name.size(), number);
    return failure == std::errc() && end == name.data() + name.size() && name.front() != '0';
  }

  FilePath path_;
  std::string folder_; ///< with the separator at its end; empty: the working folder
  std::string before_;
  std::string behind_;
  bool isNumbered_ = false;
};

/// A recorder's files and times; at one place as long as it lives, since its writer's groups ask it.
// NOLINTNEXTLINE(cppcoreguidelines-virtual-class-destructor): it is final, and nobody owns it by its base
class Recording final : public Watch
{
public:
  Recording(const FilePath& path, const RecorderOptions& options, const StreamOptions& stream)
      : files_(path), options_(options), stream_(stream)
  {
  }

  /// Opens the last file that is there, to go on in it, or the first one.
  FileOutcome open()
  {
    const bool changes = options_.maxBytes != 0 || options_.maxAge.nanoseconds() != 0 || options_.keep != 0;
    if (!files_.isNumbered() && changes)
    {
      return {TAV_RC_BAD_PARAM, "the file's name needs a %n, where the number of each file comes"};
    }
    std::vector<uint64_t> numbers;
    if (const uint32_t rc = files_.isNumbered() ? files_.list(numbers) : TAV_RC_OK; rc != TAV_RC_OK)
    {
      return {rc};
    }
    number_ = numbers.empty() ? 1 : numbers.back();
    FileOutcome outcome = openFile({.append = true});
    const bool isLeft = outcome.code == TAV_RC_NOT_FOUND || outcome.code == TAV_RC_BAD_OPTIONS ||
                        outcome.code == TAV_RC_OUTSIDE_PARENT;
    return isLeft && files_.isNumbered() ? openNext() : outcome;
  }

  /// What is before a root: another file, when this one has had its time or has its size.
  FileOutcome prepare()
  {
    if (isFinished_)
    {
      return {TAV_RC_BAD_PARAM, "the recording is finished"};
    }
    FileOutcome outcome;
    if (writer_ && (isDue() || hasVanished()))
    {
      outcome = endFile();
    }
    if (outcome.code == TAV_RC_OK && !writer_)
    {
      outcome = files_.isNumbered() ? openNext() : openFile({.append = true});
    }
    opened_ = korSteadyTime();
    return outcome;
  }

  FileOutcome finish()
  {
    FileOutcome outcome = writer_ ? endFile() : FileOutcome{};
    isFinished_ = outcome.code == TAV_RC_OK;
    return outcome;
  }

  uint32_t syncNow() noexcept
  {
    const uint32_t rc = writer_ ? writer_->makeDurable() : TAV_RC_BAD_PARAM;
    synced_ = rc == TAV_RC_OK ? korSteadyTime() : synced_;
    return rc;
  }

  uint32_t beforeAdding() noexcept override
  {
    const int64_t last = synced_ > opened_ ? synced_ : opened_;
    const bool looks = options_.syncEvery && options_.syncEvery->nanoseconds() > 0;
    return looks && korSteadyTime() - last >= options_.syncEvery->nanoseconds() ? syncNow() : TAV_RC_OK;
  }
  uint32_t afterRoot() noexcept override
  {
    return options_.syncEvery && korSteadyTime() - synced_ >= options_.syncEvery->nanoseconds() ? syncNow() : TAV_RC_OK;
  }

  std::optional<Writer>& writer() noexcept
  {
    return writer_;
  }
  [[nodiscard]] FilePath path() const
  {
    return files_.at(number_);
  }

private:
  [[nodiscard]] bool isDue() const noexcept
  {
    const bool isFull = options_.maxBytes != 0 && writer_->size() >= options_.maxBytes;
    const bool isOld = options_.maxAge.nanoseconds() != 0 && korSteadyTime() - begun_ >= options_.maxAge.nanoseconds();
    const bool isOver = writer_->state_->handle == nullptr || writer_->durable_.hasFailed();
    return writer_->size() != 0 && files_.isNumbered() && (isFull || isOld || isOver);
  }

  /// Whether somebody has removed the file, renamed it, or put another one in its place: what is written into it now
  /// would not be found.
  [[nodiscard]] bool hasVanished() const
  {
    const Owner<TAVSideStorage>& file = writer_->state_->owned;
    return file != nullptr && !static_cast<TAVSSFile&>(*file).pFile->isAt(path().c_str());
  }

  FileOutcome openFile(const FileOptions& options)
  {
    std::error_code ec;
    FileOutcome outcome;
    writer_ = Writer(Writer::Unopened::state);
    outcome = writer_->openPath(path(), options, &stream_);
    if (outcome.code != TAV_RC_OK)
    {
      writer_.reset();
      return outcome;
    }
    writer_->state_->watch = options_.syncEvery ? this : nullptr;
    writer_->state_->settle();
    begun_ = synced_ = korSteadyTime();
    return outcome;
  }

  /// The file behind this one. Older ones go when it is there.
  FileOutcome openNext()
  {
    const uint64_t before = number_;
    FileOutcome outcome{KOR_RC_FILE_EXISTS};
    const int attempts = files_.isNumbered() ? 100 : 1;
    for (int attempt = 0; attempt < attempts && outcome.code == KOR_RC_FILE_EXISTS; ++attempt)
    {
      ++number_;
      outcome = openFile({});
      if (outcome.code == KOR_RC_FILE_EXISTS && files_.isNumbered())
      {
        outcome.code = passOver();
      }
    }
    if (outcome.code != TAV_RC_OK)
    {
      number_ = before;
      return outcome;
    }
    const uint32_t rc = options_.keep != 0 ? files_.removeAllBut(options_.keep) : TAV_RC_OK;
    return {rc, rc == TAV_RC_OK ? "" : "older files cannot be removed; the recording can go on"};
  }

  /// Another file has come where the next one was to be, or an attempt that failed has left it: the next one goes
  /// behind all that are there.
  uint32_t passOver()
  {
    std::vector<uint64_t> numbers;
    const uint32_t rc = files_.list(numbers);
    number_ = numbers.empty() || numbers.back() < number_ ? number_ : numbers.back();
    return rc == TAV_RC_OK ? KOR_RC_FILE_EXISTS : rc;
  }

  FileOutcome endFile()
  {
    const bool isEnded = writer_->state_->handle == nullptr; // closing the file failed, which is told once
    const bool syncs = options_.syncEvery && !isEnded && !writer_->durable_.hasFailed();
    uint32_t rc = syncs ? syncNow() : TAV_RC_OK;
    rc = rc == TAV_RC_OK ? writer_->end() : rc;
    if (rc != TAV_RC_OK)
    {
      return {rc, writer_->state_->refusal(0)};
    }
    writer_.reset();
    return {};
  }

  NumberedFiles files_;
  RecorderOptions options_;
  StreamOptions stream_;
  std::optional<Writer> writer_;
  uint64_t number_ = 1;
  int64_t begun_ = 0;  ///< when the file was opened
  int64_t opened_ = 0; ///< the last root
  int64_t synced_ = 0;
  bool isFinished_ = false;
};

} // namespace detail

/// Records roots one after another into files that change between them, and goes on in the last one after a crash. In a
/// path like "day-%n.tav" %n is the number of the file; without it there is one file, which grows. A last file that
/// cannot be gone on with, being damaged or of another form, stays as it is, and the next number begins; so it does
/// behind a sync that failed, after which nothing is sure of the file, and when the file was removed, renamed or
/// replaced meanwhile, which is looked at before each root; without a %n the file is made anew then. It has no thread:
/// times are looked at by the calls, and by those of its groups. A failure comes up at the call that meets it. Used by
/// one thread at a time. Move-only.
class Recorder
{
public:
  explicit Recorder(const FilePath& path, const RecorderOptions& options = {},
                    const StreamOptions& stream = {})
      : recording_(new detail::Recording(path, options, stream))
  {
    const detail::FileOutcome outcome = recording_->open();
    detail::demand(outcome.code, "recording into", [&] { return detail::tellFile(path, outcome); });
  }
  Recorder(const FilePath& path, const RecorderOptions& options, const StreamOptions& stream,
           std::error_code& ec)
      : recording_(new detail::Recording(path, options, stream))
  {
    detail::report(recording_->open().code, ec);
  }
  Recorder(Recorder&&) noexcept = default;
  Recorder& operator=(Recorder&&) noexcept = default;

  /// Opens a root, in another file when it is time for one.
  Group group(ElementId elm, const GroupOptions& options = {}) &
  {
    const detail::FileOutcome outcome = prepare();
    detail::demand(outcome.code, "recording into", [&] { return detail::tellFile(path(), outcome); });
    return recording_->writer()->group(elm, options);
  }
  Group group(ElementId elm, const GroupOptions& options, std::error_code& ec) &
  {
    const uint32_t rc = prepare().code;
    detail::report(rc, ec);
    Writer none;
    return rc == TAV_RC_OK ? recording_->writer()->group(elm, options, ec) : none.resumed();
  }
  Group group(ElementId, const GroupOptions& = {}) && = delete;
  Group group(ElementId, const GroupOptions&, std::error_code&) && = delete;

  /// As Writer::flush and Writer::sync.
  void flush()
  {
    current("flushing a recording").flush();
  }
  void flush(std::error_code& ec) noexcept
  {
    report(ec, [&ec](Writer& writer) { writer.flush(ec); });
  }
  void sync()
  {
    current("syncing a recording").sync();
  }
  void sync(std::error_code& ec) noexcept
  {
    report(ec, [&ec](Writer& writer) { writer.sync(ec); });
  }

  /// Ends the recording, of which syncEvery syncs the last bytes. TAV_RC_BAD_PARAM while a group is open.
  void finish()
  {
    const detail::FileOutcome outcome = recording_ ? recording_->finish() : detail::FileOutcome{TAV_RC_BAD_PARAM};
    detail::demand(outcome.code, "finishing", [&] { return detail::tellFile(path(), outcome); });
  }
  void finish(std::error_code& ec)
  {
    detail::report(recording_ ? recording_->finish().code : TAV_RC_BAD_PARAM, ec);
  }

  /// The file that the last root went to, or the next one does.
  [[nodiscard]] FilePath path() const
  {
    return recording_ ? recording_->path() : FilePath("");
  }

private:
  detail::FileOutcome prepare()
  {
    return recording_ ? recording_->prepare() : detail::FileOutcome{TAV_RC_BAD_PARAM, "the recorder was moved from"};
  }
  Writer& current(const char* what)
  {
    detail::demand(recording_ && recording_->writer() ? TAV_RC_OK : TAV_RC_BAD_PARAM, what);
    return *recording_->writer();
  }
  template<class Push>
  void report(std::error_code& ec, const Push& push) noexcept
  {
    const bool isOpen = recording_ && recording_->writer();
    isOpen ? push(*recording_->writer()) : detail::report(TAV_RC_BAD_PARAM, ec);
  }

  detail::Owner<detail::Recording> recording_;
};

} // namespace tav
