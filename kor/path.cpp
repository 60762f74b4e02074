#include <cstring>
#include <filesystem>
#include <new>
#include <string>
#include <string_view>

#include "kor/port.h"
#include "tav/kor.h"

namespace tav::kor
{
namespace
{
namespace fs = std::filesystem;

fs::path pathOf(const char* pUtf8)
{
  const std::string_view text(pUtf8);
  return {std::u8string(text.begin(), text.end())};
}

std::string textOf(const fs::path& path)
{
  const std::u8string utf8 = path.u8string();
  return {utf8.begin(), utf8.end()};
}

constexpr int kMostLinks = 40; // as many as the system itself follows

/// Whether a path lies in a folder in which the system shows its own things.
bool isOfTheSystem(const fs::path& path)
{
  const std::string name = textOf(path);
  return name.starts_with("/proc/") || name.starts_with("/dev/");
}

uint32_t followLinks(fs::path& path)
{
  std::error_code error;
  path = fs::absolute(path, error);
  if (error)
  {
    return codeOfSystemError(error.value());
  }
  for (int i = 0; i < kMostLinks && fs::is_symlink(path, error); ++i)
  {
    if (isOfTheSystem(path))
    {
      return TAV_RC_NOT_SUPPORTED;
    }
    path = path.parent_path() / fs::read_symlink(path, error);
  }
  return TAV_RC_OK;
}

uint32_t targetOf(const char* pPath, char* pTarget, uint64_t targetSize, uint64_t* pNameAt)
{
  fs::path path = pathOf(pPath);
  const uint32_t rc = followLinks(path);
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  const std::string text = textOf(path);
  if (text.size() >= targetSize)
  {
    return TAV_RC_NO_MEMORY;
  }
  std::memcpy(pTarget, text.c_str(), text.size() + 1);
  *pNameAt = text.size() - textOf(path.filename()).size();
  return TAV_RC_OK;
}

/// Runs an operation on paths, whose only exceptions are those of the memory and, on Windows, of names that are no
/// text.
template<class Operation>
uint32_t guarded(const Operation& operation)
{
  try
  {
    return operation();
  }
  catch (const std::bad_alloc&)
  {
    return TAV_RC_NO_MEMORY;
  }
  catch (const std::exception&)
  {
    return KOR_RC_BAD_NAME;
  }
}
} // namespace
} // namespace tav::kor

bool korIsDevice(const char* pPath)
{
  return pPath != nullptr && tav::kor::isDeviceNative(pPath);
}

uint32_t korFollowLinks(const char* pPath, char* pTarget, uint64_t targetSize, uint64_t* pNameAt)
{
  using namespace tav::kor;
  if (pPath == nullptr || pTarget == nullptr || pNameAt == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded([&] { return targetOf(pPath, pTarget, targetSize, pNameAt); });
}

uint32_t korRemoveFile(const char* pPath)
{
  using namespace tav::kor;
  if (pPath == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded([&] {
    std::error_code error;
    const bool removed = fs::remove(pathOf(pPath), error);
    return error ? codeOfSystemError(error.value()) : removed ? TAV_RC_OK
                                                              : KOR_RC_NO_SUCH_FILE;
  });
}

uint32_t korListFolder(const char* pPath, KORFileNameVisit visit, void* context)
{
  using namespace tav::kor;
  if (pPath == nullptr || visit == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded([&] { return listFolderNative(pPath, visit, context); });
}
