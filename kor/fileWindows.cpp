#include <climits>
#include <new>
#include <string>

#define WIN32_LEAN_AND_MEAN
#if !defined(NOMINMAX)
#define NOMINMAX
#endif
#include <windows.h>

#include "kor/fileNative.h"

namespace tav::kor
{
namespace
{
struct ErrorCode
{
  DWORD error;
  uint32_t code;
};

constexpr DWORD kDiskQuotaExceeded = 1295; // not every set of headers has it

constexpr ErrorCode kErrorCodes[] = {
    {ERROR_FILE_NOT_FOUND, KOR_RC_NO_SUCH_FILE},
    {ERROR_PATH_NOT_FOUND, KOR_RC_NO_SUCH_FILE},
    {ERROR_INVALID_DRIVE, KOR_RC_NO_SUCH_FILE},
    {ERROR_BAD_NETPATH, KOR_RC_NO_SUCH_FILE},
    {ERROR_BAD_NET_NAME, KOR_RC_NO_SUCH_FILE},
    {ERROR_DIRECTORY, KOR_RC_NOT_A_FOLDER},
    {ERROR_FILE_EXISTS, KOR_RC_FILE_EXISTS},
    {ERROR_ALREADY_EXISTS, KOR_RC_FILE_EXISTS},
    {ERROR_ACCESS_DENIED, KOR_RC_NO_PERMISSION},
    {ERROR_NETWORK_ACCESS_DENIED, KOR_RC_NO_PERMISSION},
    {ERROR_PRIVILEGE_NOT_HELD, KOR_RC_NO_PERMISSION},
    {ERROR_WRITE_PROTECT, KOR_RC_READ_ONLY},
    {ERROR_INVALID_NAME, KOR_RC_BAD_NAME},
    {ERROR_BAD_PATHNAME, KOR_RC_BAD_NAME},
    {ERROR_FILENAME_EXCED_RANGE, KOR_RC_BAD_NAME},
    {ERROR_NO_UNICODE_TRANSLATION, KOR_RC_BAD_NAME},
    {ERROR_CANT_RESOLVE_FILENAME, KOR_RC_BAD_NAME},
    {ERROR_TOO_MANY_OPEN_FILES, KOR_RC_TOO_MANY_FILES},
    {ERROR_NO_SYSTEM_RESOURCES, KOR_RC_TOO_MANY_FILES},
    {ERROR_DISK_FULL, KOR_RC_NO_SPACE},
    {ERROR_HANDLE_DISK_FULL, KOR_RC_NO_SPACE},
    {kDiskQuotaExceeded, KOR_RC_NO_SPACE},
    {ERROR_NOT_ENOUGH_QUOTA, KOR_RC_NO_SPACE},
    {ERROR_FILE_TOO_LARGE, KOR_RC_FILE_TOO_LARGE},
    {ERROR_LOCK_VIOLATION, KOR_RC_LOCKED},
    {ERROR_IO_PENDING, KOR_RC_LOCKED}, // handles are synchronous: only a lock answers so
    {ERROR_NOT_LOCKED, KOR_RC_NOT_LOCKED},
    {ERROR_SHARING_VIOLATION, KOR_RC_BUSY},
    {ERROR_BUSY, KOR_RC_BUSY},
    {ERROR_DELETE_PENDING, KOR_RC_BUSY},
    {ERROR_USER_MAPPED_FILE, KOR_RC_BUSY},
    {ERROR_SEEK_ON_DEVICE, KOR_RC_NOT_SEEKABLE},
    {ERROR_INVALID_FUNCTION, TAV_RC_NOT_SUPPORTED},
    {ERROR_NOT_SUPPORTED, TAV_RC_NOT_SUPPORTED},
    {ERROR_INVALID_HANDLE, KOR_RC_NOT_OPEN},
    {ERROR_NOT_ENOUGH_MEMORY, TAV_RC_NO_MEMORY},
    {ERROR_OUTOFMEMORY, TAV_RC_NO_MEMORY},
    {ERROR_NOACCESS, TAV_RC_BAD_PARAM},
    {ERROR_IO_DEVICE, KOR_RC_IO_ERROR},
    {ERROR_READ_FAULT, KOR_RC_IO_ERROR},
    {ERROR_WRITE_FAULT, KOR_RC_IO_ERROR},
    {ERROR_GEN_FAILURE, KOR_RC_IO_ERROR},
    {ERROR_CRC, KOR_RC_IO_ERROR},
    {ERROR_SEEK, KOR_RC_IO_ERROR},
    {ERROR_SECTOR_NOT_FOUND, KOR_RC_IO_ERROR},
    {ERROR_NOT_READY, KOR_RC_IO_ERROR},
    {ERROR_BROKEN_PIPE, KOR_RC_IO_ERROR},
    {ERROR_NO_DATA, KOR_RC_IO_ERROR},
    {ERROR_NETNAME_DELETED, KOR_RC_IO_ERROR},
    {ERROR_UNEXP_NET_ERR, KOR_RC_IO_ERROR},
    {ERROR_DEVICE_REMOVED, KOR_RC_IO_ERROR},
    {ERROR_FILE_CORRUPT, KOR_RC_IO_ERROR},
    {ERROR_DISK_CORRUPT, KOR_RC_IO_ERROR},
};

uint32_t codeOf(DWORD error)
{
  for (const ErrorCode& known : kErrorCodes)
    if (known.error == error) return known.code;
  return KOR_RC_OS_ERROR;
}

/// The code of a failed transfer: access was granted when the file was opened, for the other direction.
uint32_t transferCodeOf(DWORD error)
{
  return error == ERROR_ACCESS_DENIED ? KOR_RC_WRONG_ACCESS : codeOf(error);
}

HANDLE handleOf(intptr_t file)
{
  return reinterpret_cast<HANDLE>(file);
}

/// The system call's UTF-16 form of a UTF-8 path.
uint32_t widen(const char* pPath, std::wstring& wide)
{
  const int units = MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, pPath, -1, nullptr, 0);
  if (units <= 0) return codeOf(GetLastError());
  try
  {
    wide.resize(static_cast<std::size_t>(units));
  }
  catch (const std::bad_alloc&)
  {
    return TAV_RC_NO_MEMORY;
  }
  if (MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, pPath, -1, wide.data(), units) <= 0)
    return codeOf(GetLastError());
  return TAV_RC_OK;
}

bool isFolder(const std::wstring& path)
{
  const DWORD attributes = GetFileAttributesW(path.c_str());
  return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
}

uint32_t openFailure(const std::wstring& path, DWORD error)
{
  // Opening a folder is refused as if a right were missing.
  return error == ERROR_ACCESS_DENIED && isFolder(path) ? KOR_RC_IS_FOLDER : codeOf(error);
}

HANDLE createFile(const std::wstring& path, const OpenMode& mode)
{
  const DWORD access = (mode.read ? GENERIC_READ : 0) | (mode.write ? GENERIC_WRITE : 0);
  const DWORD sharing = FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE;
  const DWORD existing = mode.create ? OPEN_ALWAYS : OPEN_EXISTING;
  const DWORD disposition = mode.exclusive ? CREATE_NEW : existing;
  return CreateFileW(path.c_str(), access, sharing, nullptr, disposition, FILE_ATTRIBUTE_NORMAL, nullptr);
}

DWORD transferSize(std::size_t length)
{
  return length < ULONG_MAX ? static_cast<DWORD>(length) : ULONG_MAX;
}
} // namespace

uint32_t openNative(const char* pPath, const OpenMode& mode, intptr_t& file)
{
  std::wstring path;
  const uint32_t widened = widen(pPath, path);
  if (widened != TAV_RC_OK) return widened;

  const HANDLE opened = createFile(path, mode);
  if (opened == INVALID_HANDLE_VALUE) return openFailure(path, GetLastError());

  // Emptied here and not by the disposition, which would refuse a hidden file.
  if (mode.truncate && GetFileType(opened) == FILE_TYPE_DISK && !SetEndOfFile(opened))
  {
    const uint32_t code = codeOf(GetLastError());
    CloseHandle(opened);
    return code;
  }
  file = reinterpret_cast<intptr_t>(opened);
  return TAV_RC_OK;
}

uint32_t closeNative(intptr_t file)
{
  return CloseHandle(handleOf(file)) ? TAV_RC_OK : codeOf(GetLastError());
}

uint32_t readSome(intptr_t file, void* bytes, std::size_t length, std::size_t& done)
{
  DWORD count = 0;
  if (!ReadFile(handleOf(file), bytes, transferSize(length), &count, nullptr))
  {
    const DWORD error = GetLastError();
    // A pipe ends with its last writer.
    if (error != ERROR_HANDLE_EOF && error != ERROR_BROKEN_PIPE) return transferCodeOf(error);
    count = 0;
  }
  done = count;
  return TAV_RC_OK;
}

uint32_t writeSome(intptr_t file, const void* bytes, std::size_t length, std::size_t& done)
{
  DWORD count = 0;
  if (!WriteFile(handleOf(file), bytes, transferSize(length), &count, nullptr)) return transferCodeOf(GetLastError());
  done = count;
  return count == 0 ? KOR_RC_IO_ERROR : TAV_RC_OK;
}

uint32_t seekNative(intptr_t file, int64_t offset, uint64_t& position)
{
  // A pipe or a console accepts a position and ignores it.
  if (GetFileType(handleOf(file)) != FILE_TYPE_DISK) return KOR_RC_NOT_SEEKABLE;
  LARGE_INTEGER wanted{};
  LARGE_INTEGER landed{};
  wanted.QuadPart = offset;
  if (!SetFilePointerEx(handleOf(file), wanted, &landed, FILE_BEGIN)) return codeOf(GetLastError());
  position = static_cast<uint64_t>(landed.QuadPart);
  return TAV_RC_OK;
}

uint32_t lockNative(intptr_t file, bool exclusive, bool wait, bool held)
{
  // Locks of one handle add up here and would wait for each other.
  if (held)
  {
    const uint32_t code = unlockNative(file);
    if (code != TAV_RC_OK) return code;
  }
  OVERLAPPED start{};
  const DWORD flags = (exclusive ? LOCKFILE_EXCLUSIVE_LOCK : 0) | (wait ? 0 : LOCKFILE_FAIL_IMMEDIATELY);
  return LockFileEx(handleOf(file), flags, 0, ULONG_MAX, ULONG_MAX, &start) ? TAV_RC_OK : codeOf(GetLastError());
}

uint32_t unlockNative(intptr_t file)
{
  OVERLAPPED start{};
  return UnlockFileEx(handleOf(file), 0, ULONG_MAX, ULONG_MAX, &start) ? TAV_RC_OK : codeOf(GetLastError());
}

uint32_t sizeNative(intptr_t file, uint64_t& size)
{
  if (GetFileType(handleOf(file)) != FILE_TYPE_DISK) return KOR_RC_NOT_SEEKABLE;
  LARGE_INTEGER bytes{};
  if (!GetFileSizeEx(handleOf(file), &bytes)) return codeOf(GetLastError());
  size = static_cast<uint64_t>(bytes.QuadPart);
  return TAV_RC_OK;
}
} // namespace tav::kor
