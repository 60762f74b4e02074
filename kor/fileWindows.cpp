#include <climits>
#include <memory>
#include <string>

#include "kor/port.h"
#include "kor/wideText.h"
#include "kor/windows.h"

namespace tav::kor
{
namespace
{
/// The code of a failed transfer: access was granted when the file was opened, for the other direction.
uint32_t transferCodeOf(DWORD error)
{
  return error == ERROR_ACCESS_DENIED ? KOR_RC_WRONG_ACCESS : codeOfSystemError(error);
}

HANDLE handleOf(intptr_t file)
{
  return reinterpret_cast<HANDLE>(file);
}

bool isFolder(const std::wstring& path)
{
  const DWORD attributes = GetFileAttributesW(path.c_str());
  return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
}

uint32_t openFailure(const std::wstring& path, DWORD error)
{
  // Opening a folder is refused as if a right were missing.
  return error == ERROR_ACCESS_DENIED && isFolder(path) ? KOR_RC_IS_FOLDER : codeOfSystemError(error);
}

HANDLE createFile(const std::wstring& path, const OpenMode& mode)
{
  const DWORD access = (mode.read ? GENERIC_READ : 0) | (mode.write ? GENERIC_WRITE : 0);
  const DWORD sharing = FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE;
  const DWORD existing = mode.create ? OPEN_ALWAYS : OPEN_EXISTING;
  const DWORD disposition = mode.exclusive ? CREATE_NEW : existing;
  return CreateFileW(path.c_str(), access, sharing, nullptr, disposition, FILE_ATTRIBUTE_NORMAL, nullptr);
}

/// What is locked: one byte that no file has. Here a lock keeps others from reading what it covers, and readers of a
/// file that is written need none. It meets the locks of all bytes that came before it.
OVERLAPPED lockedPlace()
{
  OVERLAPPED place{};
  place.Offset = ULONG_MAX - 1;
  place.OffsetHigh = LONG_MAX;
  return place;
}

DWORD transferSize(std::size_t length)
{
  return length < ULONG_MAX ? static_cast<DWORD>(length) : ULONG_MAX;
}
} // namespace

uint32_t openNative(const char* pPath, const OpenMode& mode, intptr_t& file)
{
  std::wstring path;
  const DWORD error = widen(pPath, path);
  if (error != ERROR_SUCCESS)
  {
    return codeOfSystemError(error);
  }

  const HANDLE opened = createFile(path, mode);
  if (opened == INVALID_HANDLE_VALUE)
  {
    return openFailure(path, GetLastError());
  }

  // Emptied here and not by the disposition, which would refuse a hidden file.
  if (mode.truncate && GetFileType(opened) == FILE_TYPE_DISK && !SetEndOfFile(opened))
  {
    const uint32_t code = codeOfSystemError(GetLastError());
    CloseHandle(opened);
    return code;
  }
  file = reinterpret_cast<intptr_t>(opened);
  return TAV_RC_OK;
}

uint32_t closeNative(intptr_t file)
{
  return CloseHandle(handleOf(file)) ? TAV_RC_OK : codeOfSystemError(GetLastError());
}

uint32_t readSome(intptr_t file, void* bytes, std::size_t length, std::size_t& done)
{
  DWORD count = 0;
  if (!ReadFile(handleOf(file), bytes, transferSize(length), &count, nullptr))
  {
    const DWORD error = GetLastError();
    // A pipe ends with its last writer.
    if (error != ERROR_HANDLE_EOF && error != ERROR_BROKEN_PIPE)
    {
      return transferCodeOf(error);
    }
    count = 0;
  }
  done = count;
  return TAV_RC_OK;
}

uint32_t writeSome(intptr_t file, const void* bytes, std::size_t length, std::size_t& done)
{
  DWORD count = 0;
  if (!WriteFile(handleOf(file), bytes, transferSize(length), &count, nullptr))
  {
    return transferCodeOf(GetLastError());
  }
  done = count;
  return count == 0 ? KOR_RC_IO_ERROR : TAV_RC_OK;
}

uint32_t seekNative(intptr_t file, int64_t offset, uint64_t& position)
{
  // A pipe or a console accepts a position and ignores it.
  if (GetFileType(handleOf(file)) != FILE_TYPE_DISK)
  {
    return KOR_RC_NOT_SEEKABLE;
  }
  LARGE_INTEGER wanted{};
  LARGE_INTEGER landed{};
  wanted.QuadPart = offset;
  if (!SetFilePointerEx(handleOf(file), wanted, &landed, FILE_BEGIN))
  {
    return codeOfSystemError(GetLastError());
  }
  position = static_cast<uint64_t>(landed.QuadPart);
  return TAV_RC_OK;
}

bool moveBack(intptr_t file, int64_t distance)
{
  LARGE_INTEGER by{};
  by.QuadPart = -distance;
  return GetFileType(handleOf(file)) == FILE_TYPE_DISK &&
         SetFilePointerEx(handleOf(file), by, nullptr, FILE_CURRENT) != 0;
}

uint32_t lockNative(intptr_t file, bool exclusive, bool wait, bool held)
{
  // Locks of one handle add up here and would wait for each other.
  if (held)
  {
    const uint32_t code = unlockNative(file);
    if (code != TAV_RC_OK)
    {
      return code;
    }
  }
  OVERLAPPED place = lockedPlace();
  const DWORD flags = (exclusive ? LOCKFILE_EXCLUSIVE_LOCK : 0) | (wait ? 0 : LOCKFILE_FAIL_IMMEDIATELY);
  return LockFileEx(handleOf(file), flags, 0, 1, 0, &place) ? TAV_RC_OK : codeOfSystemError(GetLastError());
}

uint32_t unlockNative(intptr_t file)
{
  OVERLAPPED place = lockedPlace();
  return UnlockFileEx(handleOf(file), 0, 1, 0, &place) ? TAV_RC_OK : codeOfSystemError(GetLastError());
}

uint32_t sizeNative(intptr_t file, uint64_t& size)
{
  if (GetFileType(handleOf(file)) != FILE_TYPE_DISK)
  {
    return KOR_RC_NOT_SEEKABLE;
  }
  LARGE_INTEGER bytes{};
  if (!GetFileSizeEx(handleOf(file), &bytes))
  {
    return codeOfSystemError(GetLastError());
  }
  size = static_cast<uint64_t>(bytes.QuadPart);
  return TAV_RC_OK;
}

uint32_t setSizeNative(intptr_t file, int64_t size)
{
  FILE_END_OF_FILE_INFO end{};
  end.EndOfFile.QuadPart = size;
  return SetFileInformationByHandle(handleOf(file), FileEndOfFileInfo, &end, sizeof end)
             ? TAV_RC_OK
             : codeOfSystemError(GetLastError());
}

uint32_t syncNative(intptr_t file)
{
  return FlushFileBuffers(handleOf(file)) ? TAV_RC_OK : codeOfSystemError(GetLastError());
}

uint32_t syncDataNative(intptr_t file)
{
  return syncNative(file);
}

uint32_t syncFolderNative(const char* /*pPath*/)
{
  return TAV_RC_OK; // the file system's log has the names
}

uint32_t copyRightsNative(intptr_t /*from*/, intptr_t /*to*/)
{
  return TAV_RC_OK;
}

bool isAtNative(intptr_t file, const char* pPath)
{
  std::wstring path;
  if (widen(pPath, path) != ERROR_SUCCESS)
  {
    return false;
  }
  const DWORD sharing = FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE;
  const HANDLE other = CreateFileW(path.c_str(), 0, sharing, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (other == INVALID_HANDLE_VALUE)
  {
    return false;
  }
  BY_HANDLE_FILE_INFORMATION open{};
  BY_HANDLE_FILE_INFORMATION there{};
  const bool known = GetFileInformationByHandle(handleOf(file), &open) && GetFileInformationByHandle(other, &there);
  CloseHandle(other);
  return known && open.dwVolumeSerialNumber == there.dwVolumeSerialNumber &&
         open.nFileIndexHigh == there.nFileIndexHigh && open.nFileIndexLow == there.nFileIndexLow;
}

uint32_t findDataNative(intptr_t file, uint64_t offset, uint64_t& found)
{
  found = offset;
  BY_HANDLE_FILE_INFORMATION there{};
  LARGE_INTEGER size{};
  if (!GetFileInformationByHandle(handleOf(file), &there) ||
      (there.dwFileAttributes & FILE_ATTRIBUTE_SPARSE_FILE) == 0 || !GetFileSizeEx(handleOf(file), &size) ||
      offset >= static_cast<uint64_t>(size.QuadPart))
  {
    return TAV_RC_OK;
  }
  FILE_ALLOCATED_RANGE_BUFFER asked{};
  asked.FileOffset.QuadPart = static_cast<LONGLONG>(offset);
  asked.Length.QuadPart = size.QuadPart - asked.FileOffset.QuadPart;
  FILE_ALLOCATED_RANGE_BUFFER first{};
  DWORD got = 0;
  const bool known = DeviceIoControl(handleOf(file), FSCTL_QUERY_ALLOCATED_RANGES, &asked, sizeof asked, &first,
                                     sizeof first, &got, nullptr) != 0 ||
                     GetLastError() == ERROR_MORE_DATA;
  if (!known)
  {
    return TAV_RC_OK;
  }
  const uint64_t data = static_cast<uint64_t>(got == 0 ? size.QuadPart : first.FileOffset.QuadPart);
  if (data > offset) // a range that the offset lies in may be told from its start on
  {
    found = data;
  }
  return TAV_RC_OK;
}

uint32_t mapNative(intptr_t file, void*& bytes, uint64_t& size)
{
  LARGE_INTEGER length{};
  if (GetFileType(handleOf(file)) != FILE_TYPE_DISK)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  if (!GetFileSizeEx(handleOf(file), &length))
  {
    return codeOfSystemError(GetLastError());
  }
  if (length.QuadPart <= 0)
  {
    return TAV_RC_NOT_SUPPORTED;
  }
  if (static_cast<uint64_t>(length.QuadPart) > SIZE_MAX)
  {
    return TAV_RC_NO_MEMORY;
  }
  const HANDLE section = CreateFileMappingW(handleOf(file), nullptr, PAGE_READONLY, 0, 0, nullptr);
  if (section == nullptr)
  {
    return transferCodeOf(GetLastError());
  }
  void* const mapped = MapViewOfFile(section, FILE_MAP_READ, 0, 0, static_cast<SIZE_T>(length.QuadPart));
  const DWORD error = mapped == nullptr ? GetLastError() : ERROR_SUCCESS;
  CloseHandle(section); // the view holds it
  if (mapped == nullptr)
  {
    return transferCodeOf(error);
  }
  bytes = mapped;
  size = static_cast<uint64_t>(length.QuadPart);
  return TAV_RC_OK;
}

void unmapNative(void* bytes, uint64_t /*size*/)
{
  UnmapViewOfFile(bytes);
}

void readAheadNative(void* /*bytes*/, uint64_t /*size*/)
{
  // The system finds out by itself.
}

bool isDeviceNative(const char* pPath)
{
  std::wstring path;
  if (widen(pPath, path) != ERROR_SUCCESS)
  {
    return false;
  }
  const DWORD sharing = FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE;
  const HANDLE there = CreateFileW(path.c_str(), 0, sharing, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (there == INVALID_HANDLE_VALUE)
  {
    return false; // nothing, or a folder, which opens with a flag alone
  }
  const DWORD type = GetFileType(there);
  CloseHandle(there);
  return type != FILE_TYPE_DISK;
}

uint32_t listFolderNative(const char* pPath, KORFileNameVisit visit, void* context)
{
  struct Close
  {
    using pointer = HANDLE;
    void operator()(HANDLE search) const { FindClose(search); }
  };
  std::wstring pattern;
  const DWORD unread = widen(pPath, pattern);
  if (unread != ERROR_SUCCESS)
  {
    return codeOfSystemError(unread);
  }
  pattern += L"\\*";
  WIN32_FIND_DATAW found{};
  const HANDLE first = FindFirstFileW(pattern.c_str(), &found);
  if (first == INVALID_HANDLE_VALUE)
  {
    return codeOfSystemError(GetLastError());
  }
  const std::unique_ptr<HANDLE, Close> search(first);
  do
  {
    const std::string name = narrow(found.cFileName);
    if (name != "." && name != "..")
    {
      visit(name.c_str(), context);
    }
  } while (FindNextFileW(search.get(), &found));
  const DWORD end = GetLastError();
  return end == ERROR_NO_MORE_FILES ? TAV_RC_OK : codeOfSystemError(end);
}

const bool kOpenFileHoldsName = true;

uint32_t renameNative(const char* pFrom, const char* pTo)
{
  std::wstring from;
  std::wstring to;
  DWORD error = widen(pFrom, from);
  if (error == ERROR_SUCCESS)
  {
    error = widen(pTo, to);
  }
  if (error == ERROR_SUCCESS && !MoveFileExW(from.c_str(), to.c_str(), MOVEFILE_REPLACE_EXISTING))
    error = GetLastError();
  return error == ERROR_SUCCESS ? TAV_RC_OK : codeOfSystemError(error);
}
} // namespace tav::kor
