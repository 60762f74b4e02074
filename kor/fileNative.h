/// @file fileNative.h
/// What each platform supplies to KORHFile. Handles are open and arguments are checked already; every operation
/// returns a code, made from the system's error by the one table of each platform.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tav/kor.h"

namespace tav::kor
{
inline constexpr intptr_t kNoFile = -1;

/// How a file is opened, with the mode bits resolved.
struct OpenMode
{
  bool read;
  bool write;
  bool create;
  bool truncate;
  bool exclusive;
  uint32_t permissions;
};

/// Opens `pPath` (UTF-8); `file` is set on success only. A folder is refused.
uint32_t openNative(const char* pPath, const OpenMode& mode, intptr_t& file);

/// Closes `file`, which is gone afterwards also when a failure is reported.
uint32_t closeNative(intptr_t file);

/// Reads up to `length` bytes by one transfer; `done` is 0 at the end of the file.
uint32_t readSome(intptr_t file, void* bytes, std::size_t length, std::size_t& done);

/// Writes up to `length` bytes by one transfer; `done` is not 0 on success.
uint32_t writeSome(intptr_t file, const void* bytes, std::size_t length, std::size_t& done);

uint32_t seekNative(intptr_t file, int64_t offset, uint64_t& position);

/// Moves the position back by a distance; false where the file has none, or refuses.
bool moveBack(intptr_t file, int64_t distance);

/// `held`: the file holds a lock already, which the new one replaces; a refusal leaves it without any.
uint32_t lockNative(intptr_t file, bool exclusive, bool wait, bool held);
uint32_t unlockNative(intptr_t file);

uint32_t sizeNative(intptr_t file, uint64_t& size);
uint32_t setSizeNative(intptr_t file, int64_t size);
uint32_t syncNative(intptr_t file);
uint32_t syncDataNative(intptr_t file);
uint32_t syncFolderNative(const char* pPath);
uint32_t copyRightsNative(intptr_t from, intptr_t to);
bool isAtNative(intptr_t file, const char* pPath);

/// As KORHFile::findData: `found` is `offset` where the system does not tell.
uint32_t findDataNative(intptr_t file, uint64_t offset, uint64_t& found);

/// Maps the whole of a regular file that is not empty for reading; TAV_RC_NOT_SUPPORTED for others.
uint32_t mapNative(intptr_t file, void*& bytes, uint64_t& size);
void unmapNative(void* bytes, uint64_t size);
/// Tells the system that a mapping is read from its start to its end.
void readAheadNative(void* bytes, uint64_t size);

/// Whether a path leads to something that is no file and no folder.
bool isDeviceNative(const char* pPath);

/// Whether a file keeps its name from being given to another one for as long as it is open.
extern const bool kOpenFileHoldsName;
/// Calls `visit` with the name of each entry of a folder but "." and "..". What it throws is passed on.
uint32_t listFolderNative(const char* pPath, KORFileNameVisit visit, void* context);
/// Renames a file, over one that is there.
uint32_t renameNative(const char* pFrom, const char* pTo);
} // namespace tav::kor
