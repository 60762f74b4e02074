/// @file file.hpp
/// Files as readers and writers open them: locks, and results that take a file's place when they are complete.
#pragma once

#include <cstdint>
#include <ctime>
#include <new>
#include <string>
#include <string_view>
#include <utility>

#include "tav/cpp/error.hpp"
#include "tav/cpp/filePath.hpp"
#include "tav/cpp/owner.hpp"
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

inline uint32_t openFile(const FilePath& path, uint64_t options, Owner<TAVSSFile>& storage, uint32_t permissions = 0666)
{
  KORFileOpenParam param;
  param.pPath = path.c_str();
  param.options = options;
  param.permissions = permissions;
  uint32_t rc = TAV_RC_OK;
  storage.reset(new (std::nothrow) TAVSSFile(&param, &rc));
  return storage != nullptr ? rc : TAV_RC_NO_MEMORY;
}

/// What there is to say when a file could not be opened.
inline Told tellFile(const FilePath& path, const FileOutcome& outcome)
{
  return {path.text(), outcome.sentence};
}

/// Opens a file and takes its lock before anything in it changes. A file that lost its path to another one while the
/// lock was waited for is not the one that was meant.
inline FileOutcome openLocked(const FilePath& path, uint64_t options, bool lock, Owner<TAVSSFile>& storage)
{
  constexpr int attempts = 100;
  for (int attempt = 0; attempt < attempts; ++attempt)
  {
    const uint32_t opened = openFile(path, options, storage);
    if (opened != TAV_RC_OK || !lock || korIsDevice(path.c_str()))
    {
      return {opened};
    }
    const uint32_t locked = storage->lock(0);
    if (locked == TAV_RC_OK && storage->pFile->isAt(path.c_str()))
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

/// The absolute path of a file, the symbolic links at its end followed.
struct FileTarget
{
  std::string path;
  uint64_t nameAt = 0; ///< where the name behind the last folder starts
};

/// As korFollowLinks.
inline uint32_t followLinks(const FilePath& path, FileTarget& target)
{
  constexpr size_t usual = 4096;
  constexpr size_t most = usual << 8U;
  uint32_t rc = TAV_RC_NO_MEMORY;
  for (size_t room = usual; rc == TAV_RC_NO_MEMORY && room <= most; room *= 4)
  {
    target.path.resize(room);
    rc = korFollowLinks(path.c_str(), target.path.data(), room, &target.nameAt);
  }
  target.path.resize(rc == TAV_RC_OK ? target.path.find('\0') : 0);
  return rc;
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
      korRemoveFile(temporary_.c_str());
    }
  }

  /// Locks the file at `target`, when there is one, and opens `storage` beside it: for nobody else to read, until it
  /// gets the rights of the file that it replaces.
  FileOutcome open(const FileTarget& target, bool lock, Owner<TAVSSFile>& storage)
  {
    target_ = target.path;
    lock_ = lock;
    FileOutcome held = hold();
    if (held.code != TAV_RC_OK)
    {
      return held;
    }
    constexpr int attempts = 100;
    constexpr uint64_t fresh = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_EXCLUSIVE;
    uint32_t rc = KOR_RC_FILE_EXISTS;
    for (int attempt = 0; attempt < attempts && rc == KOR_RC_FILE_EXISTS; ++attempt)
    {
      std::string beside = target.path.substr(0, static_cast<size_t>(target.nameAt)) + nameOf(attempt);
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
    KORHFile none;
    const uint32_t rc = (former_ != nullptr ? *former_->pFile : none).replaceBy(temporary_.c_str(), target_.c_str());
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

  /// Short, so that it fits where the name that is replaced does. Nobody else has it in all likelihood: the object's
  /// place says the threads of a process apart, the thread's number the processes.
  [[nodiscard]] std::string nameOf(int attempt) const
  {
    constexpr uint64_t spread = 0x9E3779B97F4A7C15U;
    uint64_t number = static_cast<uint64_t>(std::time(nullptr)) + static_cast<uint64_t>(attempt);
    number = number * spread ^ static_cast<uint64_t>(std::clock());
    number = number * spread ^ korThreadID();
    number = number * spread ^ static_cast<uint64_t>(reinterpret_cast<uintptr_t>(this));
    std::string name = ".tav-";
    for (int digit = 0; digit < 16; ++digit, number >>= 4U)
    {
      name += "0123456789abcdef"[number & 0xFU];
    }
    return name;
  }

  std::string target_;
  std::string temporary_; ///< empty: nothing to remove
  Owner<TAVSSFile> former_;
  bool lock_ = true;
};

/// Opens a file for a stream of its own. `replacement` is set when the file at the path stays until the stream is
/// complete.
inline FileOutcome openForWriting(const FilePath& path, const FileOptions& options, Owner<TAVSSFile>& storage,
                                  Owner<Replacement>& replacement)
{
  constexpr uint64_t made = KOR_FILE_UPDATE | KOR_FILE_CREATE;
  if (!options.overwrite)
  {
    FileOutcome fresh = openLocked(path, made | KOR_FILE_EXCLUSIVE, options.lock, storage);
    if (!fresh.sentence.empty() && fresh.code != KOR_RC_LOCKED && fresh.code != KOR_RC_BUSY)
    {
      korRemoveFile(path.c_str()); // it was made, and cannot be locked
    }
    return fresh;
  }
  FileTarget target;
  const uint32_t followed = options.inPlace ? TAV_RC_NOT_SUPPORTED : followLinks(path, target);
  if (followed != TAV_RC_OK && followed != TAV_RC_NOT_SUPPORTED)
  {
    return {followed};
  }
  if (followed == TAV_RC_OK && !korIsDevice(target.path.c_str()))
  {
    replacement.reset(new Replacement);
    return replacement->open(target, options.lock, storage);
  }
  const FileOutcome opened = openLocked(path, made, options.lock, storage);
  const bool emptied = opened.code == TAV_RC_OK && !korIsDevice(path.c_str());
  return emptied ? FileOutcome{storage->pFile->setSize(0)} : opened;
}

} // namespace detail

} // namespace tav
