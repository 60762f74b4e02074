#include <cstdlib>

#include "kor/systemError.h"
#include "kor/wideText.h"
#include "kor/windows.h"
#include "tav/kor.h"
#include "tools/host/host.h"

namespace tav::host
{
using kor::codeOfSystemError;
using kor::widen;

namespace
{
/// Puts the bytes of a file on the disk.
uint32_t synced(const std::wstring& path)
{
  const HANDLE file = CreateFileW(path.c_str(), GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE,
                                  nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (file == INVALID_HANDLE_VALUE)
  {
    return codeOfSystemError(GetLastError());
  }
  const DWORD error = FlushFileBuffers(file) != 0 ? ERROR_SUCCESS : GetLastError();
  CloseHandle(file);
  return error == ERROR_SUCCESS ? TAV_RC_OK : codeOfSystemError(error);
}
} // namespace

bool removeFile(const std::string& path)
{
  std::wstring wide;
  return widen(path.c_str(), wide) == ERROR_SUCCESS && DeleteFileW(wide.c_str()) != 0;
}

std::optional<int> ownFile(const std::string& /*path*/)
{
  return std::nullopt; // open files have no names here
}

std::filesystem::path targetOf(const std::string& path)
{
  std::error_code error;
  const std::filesystem::path whole = std::filesystem::weakly_canonical(pathOf(path), error);
  return error ? pathOf(path) : whole;
}

FILE* openStream(const std::string& path, const char* mode, uint32_t& code)
{
  std::wstring wide;
  std::wstring wideMode;
  DWORD error = widen(path.c_str(), wide);
  if (error == ERROR_SUCCESS)
  {
    error = widen(mode, wideMode);
  }
  FILE* const stream = error == ERROR_SUCCESS ? _wfopen(wide.c_str(), wideMode.c_str()) : nullptr;
  if (stream == nullptr && error == ERROR_SUCCESS)
  {
    error = _doserrno;
  }
  code = stream != nullptr ? TAV_RC_OK : codeOfSystemError(error);
  return stream;
}

uint32_t moveIntoPlace(const std::string& from, const std::string& to, bool replace)
{
  std::wstring wideFrom;
  std::wstring wideTo;
  for (const auto& [text, wide] : {std::pair{&from, &wideFrom}, std::pair{&to, &wideTo}})
  {
    const DWORD error = widen(text->c_str(), *wide);
    if (error != ERROR_SUCCESS)
    {
      return codeOfSystemError(error);
    }
  }
  if (const uint32_t code = synced(wideFrom); code != TAV_RC_OK)
  {
    return code;
  }
  const DWORD flags = MOVEFILE_WRITE_THROUGH | (replace ? MOVEFILE_REPLACE_EXISTING : 0);
  return MoveFileExW(wideFrom.c_str(), wideTo.c_str(), flags) != 0 ? TAV_RC_OK : codeOfSystemError(GetLastError());
}
} // namespace tav::host
