#include "tav/inspect/scratch.hpp"

#include <filesystem>
#include <random>
#include <utility>

#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

namespace
{

std::string textOf(const std::filesystem::path& path)
{
  const std::u8string utf8 = path.u8string();
  return {utf8.begin(), utf8.end()};
}

class TemporaryFile final : public Scratch
{
public:
  TemporaryFile()
      : path_(openTemporary(file_, std::random_device()()))
  {
    std::error_code error;
    if (std::filesystem::remove(pathOf(path_), error) && !error)
    {
      path_.clear();
    }
  }

  ~TemporaryFile() override
  {
    file_.close();
    if (!path_.empty())
    {
      std::error_code error;
      std::filesystem::remove(pathOf(path_), error);
    }
  }

  TemporaryFile(const TemporaryFile&) = delete;
  TemporaryFile& operator=(const TemporaryFile&) = delete;

  KORHFile& file() override { return file_; }

private:
  static std::filesystem::path pathOf(const std::string& utf8) { return {std::u8string(utf8.begin(), utf8.end())}; }

  KORHFile file_{};
  std::string path_; ///< empty: the file has no name any more
};

} // namespace

std::string openTemporary(KORHFile& file, uint64_t number)
{
  std::error_code error;
  const auto folder = std::filesystem::temp_directory_path(error);
  if (error)
  {
    throw Error("there is no folder for temporary files", "set TMPDIR to a folder that can be written");
  }
  for (unsigned attempt = 0;; ++attempt)
  {
    std::string path = textOf(folder / ("tav-" + std::to_string(number) + "-" + std::to_string(attempt)));
    KORFileOpenParam param;
    param.pPath = path.c_str();
    param.options = KOR_FILE_UPDATE | KOR_FILE_CREATE | KOR_FILE_EXCLUSIVE;
    param.permissions = 0600;
    const uint32_t code = file.open(&param);
    if (code == TAV_RC_OK)
    {
      return path;
    }
    if (code != KOR_RC_FILE_EXISTS || attempt == 1000)
    {
      failAt(path, code, "a temporary file is needed; set TMPDIR to a folder that can be written");
    }
  }
}

std::unique_ptr<Scratch> makeScratch()
{
  return std::make_unique<TemporaryFile>();
}

} // namespace tav::inspect
