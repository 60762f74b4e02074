/// @file file.hpp
/// Files as readers and writers open them: locks, and results that take a file's place when they are complete.
#pragma once

#include <chrono>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <new>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

#include "tav/cpp/error.hpp"
#include "tav/tav.h"

namespace tav
{

/// What becomes of a root that a killed writer left open, when another writer appends to its file.
enum class OpenRoot : uint8_t
{
  close,  ///< it is closed behind its last whole node
  resume, ///< it is gone on with: Writer::resumed
  refuse  ///< TAV_RC_NOT_SUPPORTED, and the file stays as it is
};

/// How a file is written.
struct FileOptions
{
  bool overwrite = false; ///< replace an existing file instead of refusing it; it stays as it is until finish()
  bool inPlace = false;   ///< with overwrite: empty the file and write into it, whatever becomes of the writer
  bool lock = true;       ///< refuse a file that another writer has locked, and lock it; false where there are no locks
  bool append = false;    ///< go on behind the last stream of an existing file; begin a new one where there is none
  /// With append: a root that was never closed.
  OpenRoot openRoot = OpenRoot::close;
};

namespace detail
{

/// What came of opening a file, and a sentence where the code alone does not tell.
struct FileOutcome
{
  uint32_t code = TAV_RC_OK;
  std::string sentence{};
};

/// A file's name in UTF-8, as it is opened and as messages show it.
inline std::string fileText(const std::filesystem::path& path)
{
  const std::u8string name = path.u8string(); // string() throws where a locale lacks a letter
  return std::string(name.begin(), name.end());
}

inline uint32_t openFile(const std::filesystem::path& path, uint64_t options, std::unique_ptr<TAVSSFile>& storage,
                         uint32_t permissions = 0666)
{
  const std::string name = fileText(path);
  KORFileOpenParam param;
  param.pPath = name.c_str();
  param.options = options;
  param.permissions = permissions;
  uint32_t rc = TAV_RC_OK;
  storage.reset(new (std::nothrow) TAVSSFile(&param, &rc));
  return storage != nullptr ? rc : TAV_RC_NO_MEMORY;
}

/// What there is to say when a file could not be opened.
inline Told tellFile(const std::filesystem::path& path, const FileOutcome& outcome)
{
  return {fileText(path), outcome.sentence};
}

/// Whether a path leads to something that is no file: a device, a pipe.
inline bool isDevice(const std::filesystem::path& path) noexcept
{
  std::error_code error;
  const std::filesystem::file_status status = std::filesystem::status(path, error);
  return !error && std::filesystem::exists(status) && !std::filesystem::is_regular_file(status) &&
         !std::filesystem::is_directory(status);
}

/// Opens a file and takes its lock before anything in it changes. A file that lost its path to another one while the
/// lock was waited for is not the one that was meant.
inline FileOutcome openLocked(const std::filesystem::path& path, uint64_t options, bool lock,
                              std::unique_ptr<TAVSSFile>& storage)
{
  constexpr int attempts = 100;
  const std::string name = fileText(path);
  for (int attempt = 0; attempt < attempts; ++attempt)
  {
    const uint32_t opened = openFile(path, options, storage);
    if (opened != TAV_RC_OK || !lock || isDevice(path))
    {
      return {opened};
    }
    const uint32_t locked = storage->lock(0);
    if (locked == TAV_RC_OK && storage->pFile->isAt(name.c_str()))
    {
      return {};
    }
    storage.reset();
    if (locked == KOR_RC_LOCKED)
    {
      return {locked, "another writer has the file"};
    }
    if (locked != TAV_RC_OK)
    {
      return {locked, "the file cannot be locked here; with FileOptions::lock = false it is written without"};
    }
  }
  return {KOR_RC_BUSY, "the file is replaced again and again"};
}

/// A path with the symbolic links at its end followed, also one that leads to nothing yet. False for a link into the
/// system's own folders (/dev/stdout is one): what is behind it is written to, and not replaced.
inline bool followLinks(std::filesystem::path& path)
{
  constexpr int mostLinks = 40;
  std::error_code error;
  path = std::filesystem::absolute(path, error);
  for (int i = 0; i < mostLinks && std::filesystem::is_symlink(path, error); ++i)
  {
    const std::string name = fileText(path);
    if (name.starts_with("/proc/") || name.starts_with("/dev/"))
    {
      return false;
    }
    path = path.parent_path() / std::filesystem::read_symlink(path, error);
  }
  return true;
}

/// A file that is written beside another one, whose place it takes when it is complete. Without that it is removed.
class Replacement
{
public:
  Replacement() = default;
  Replacement(const Replacement&) = delete;
  Replacement& operator=(const Replacement&) = delete;
  ~Replacement()
  {
    if (!temporary_.empty())
    {
      std::error_code ignored;
      std::filesystem::remove(temporary_, ignored);
    }
  }

  /// Locks the file at `target`, when there is one, and opens `storage` beside it: for nobody else to read, until it
  /// gets the rights of the file that it replaces.
  FileOutcome open(const std::filesystem::path& target, bool lock, std::unique_ptr<TAVSSFile>& storage)
  {
    target_ = target;
    lock_ = lock;
    const FileOutcome held = hold();
    if (held.code != TAV_RC_OK)
    {
      return held;
    }
    constexpr int attempts = 100;
    constexpr uint64_t fresh = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_EXCLUSIVE;
    uint32_t rc = KOR_RC_FILE_EXISTS;
    for (int attempt = 0; attempt < attempts && rc == KOR_RC_FILE_EXISTS; ++attempt)
    {
      std::filesystem::path beside = target.parent_path() / nextName();
      rc = openFile(beside, fresh, storage, former_ != nullptr ? 0600 : 0666);
      if (rc == TAV_RC_OK)
      {
        temporary_ = std::move(beside);
      }
    }
    return {rc, rc == TAV_RC_OK ? "" : "a file beside it cannot be made; FileOptions::inPlace needs none"};
  }

  /// Everything is written: makes sure of it, and gives the file its rights. It is open still.
  uint32_t prepare(TAVSSFile& storage)
  {
    if (const FileOutcome held = former_ == nullptr ? hold() : FileOutcome{}; held.code != TAV_RC_OK)
    {
      return held.code; // one that has come since
    }
    const uint32_t rc = storage.pFile->sync();
    return rc == TAV_RC_OK && former_ != nullptr ? storage.pFile->copyRights(*former_->pFile) : rc;
  }

  /// The file, closed by now, takes the place.
  uint32_t commit()
  {
    const std::string from = fileText(temporary_);
    const std::string to = fileText(target_);
    KORHFile none;
    const uint32_t rc = (former_ != nullptr ? *former_->pFile : none).replaceBy(from.c_str(), to.c_str());
    if (rc == TAV_RC_OK)
    {
      temporary_.clear();
    }
    return rc;
  }

private:
  FileOutcome hold()
  {
    const FileOutcome held = openLocked(target_, KOR_FILE_UPDATE, lock_, former_);
    if (held.code != TAV_RC_OK)
    {
      former_.reset();
    }
    return held.code == KOR_RC_NO_SUCH_FILE ? FileOutcome{} : held;
  }

  /// Short, so that it fits where the name that is replaced does.
  static std::string nextName()
  {
    const auto now = std::chrono::steady_clock::now().time_since_epoch().count();
    uint64_t number = static_cast<uint64_t>(now) * 0x9E3779B97F4A7C15U ^ korThreadID();
    std::string name = ".tav-";
    for (int digit = 0; digit < 16; ++digit, number >>= 4U)
    {
      name += "0123456789abcdef"[number & 0xFU];
    }
    return name;
  }

  std::filesystem::path target_;
  std::filesystem::path temporary_; ///< empty: nothing to remove
  std::unique_ptr<TAVSSFile> former_;
  bool lock_ = true;
};

/// Opens a file for a stream of its own. `replacement` is set when the file at the path stays until the stream is
/// complete.
inline FileOutcome openForWriting(const std::filesystem::path& path, const FileOptions& options,
                                  std::unique_ptr<TAVSSFile>& storage, std::unique_ptr<Replacement>& replacement)
{
  constexpr uint64_t made = KOR_FILE_UPDATE | KOR_FILE_CREATE;
  if (!options.overwrite)
  {
    const FileOutcome fresh = openLocked(path, made | KOR_FILE_EXCLUSIVE, options.lock, storage);
    if (!fresh.sentence.empty() && fresh.code != KOR_RC_LOCKED && fresh.code != KOR_RC_BUSY)
    {
      std::error_code ignored;
      std::filesystem::remove(path, ignored); // it was made, and cannot be locked
    }
    return fresh;
  }
  std::filesystem::path target = path;
  const bool replaces = followLinks(target) && !options.inPlace && !isDevice(target);
  if (replaces)
  {
    replacement = std::make_unique<Replacement>();
    return replacement->open(target, options.lock, storage);
  }
  const FileOutcome opened = openLocked(path, made, options.lock, storage);
  const bool emptied = opened.code == TAV_RC_OK && !isDevice(path);
  return emptied ? FileOutcome{storage->pFile->setSize(0)} : opened;
}

} // namespace detail

} // namespace tav
