#include "tools/output.h"

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <utility>

#include "kor/host.h"
#include "tools/report.h"

namespace tav::tool
{

namespace
{

constexpr size_t kBuffer = size_t{64} * 1024;

/// Whether the path leads to something that is no file: a device, a pipe.
bool isSpecial(const std::string& path)
{
  std::error_code error;
  const auto status = std::filesystem::status(kor::pathOf(path), error);
  return !error && std::filesystem::exists(status) && !std::filesystem::is_regular_file(status);
}

} // namespace

void checkWritable(const std::string& path, bool force)
{
  std::error_code error;
  if (path == "-" || force)
  {
    return;
  }
  if (std::filesystem::is_directory(kor::pathOf(path), error))
  {
    failAt(path, KOR_RC_IS_FOLDER);
  }
  if (std::filesystem::is_regular_file(kor::pathOf(path), error))
  {
    failAt(path, KOR_RC_FILE_EXISTS, "--force replaces it");
  }
}

Output::Output(std::string path, bool force)
    : path_(std::move(path)), force_(force), standard_(path_ == "-")
{
  if (!standard_)
  {
    checkWritable(path_, force);
    openFile(force);
  }
}

void Output::openFile(bool)
{
  const bool special = isSpecial(path_);
  for (unsigned attempt = 0;; ++attempt)
  {
    const std::string name =
        special ? path_ : path_ + ".tav-" + std::to_string(kor::processId()) + "-" + std::to_string(attempt);
    KORFileOpenParam param;
    param.pPath = name.c_str();
    param.options = special ? KOR_FILE_WRITE : KOR_FILE_WRITE | KOR_FILE_CREATE | KOR_FILE_EXCLUSIVE;
    const uint32_t code = file_.open(&param);
    if (code == TAV_RC_OK)
    {
      temporary_ = special ? std::string() : name;
      kor::removeOnInterrupt(temporary_);
      return;
    }
    if (code != KOR_RC_FILE_EXISTS || attempt == 1000)
    {
      failAt(path_, code);
    }
  }
}

Output::~Output()
{
  if (standard_)
  {
    // What was printed before a failure is still worth reading; a second failure has nobody to tell.
    std::fwrite(buffer_.data(), 1, buffer_.size(), stdout);
    std::fflush(stdout);
    return;
  }
  file_.close();
  if (!temporary_.empty())
  {
    kor::removeFile(temporary_);
    kor::removeOnInterrupt({});
  }
}

void Output::writeOut(const char* bytes, size_t count)
{
  if (count == 0)
  {
    return;
  }
  if (!standard_)
  {
    KORFileWriteParam param;
    param.pData = bytes;
    param.length = count;
    uint64_t done = 0;
    if (const uint32_t code = file_.write(&param, &done); code != TAV_RC_OK)
    {
      failAt(path_, code);
    }
    return;
  }
  errno = 0;
  if (std::fwrite(bytes, 1, count, stdout) != count || std::fflush(stdout) != 0)
  {
    const int error = errno;
    buffer_.clear();
    if (error == EPIPE)
    {
      throw ClosedPipe{};
    }
    failAt("standard output", error == ENOSPC ? KOR_RC_NO_SPACE : KOR_RC_IO_ERROR);
  }
}

void Output::write(std::string_view text)
{
  written_ += text.size();
  if (buffer_.size() + text.size() > kBuffer)
  {
    flush();
  }
  if (text.size() > kBuffer)
  {
    writeOut(text.data(), text.size());
    return;
  }
  buffer_ += text;
}

void Output::write(std::span<const uint8_t> bytes)
{
  write(std::string_view(reinterpret_cast<const char*>(bytes.data()), bytes.size()));
}

void Output::flush()
{
  // Taken out first: what failed once is not written again when the object goes.
  const std::string pending = std::exchange(buffer_, {});
  writeOut(pending.data(), pending.size());
}

void Output::commit()
{
  flush();
  if (standard_)
  {
    return;
  }
  if (const uint32_t code = file_.close(); code != TAV_RC_OK)
  {
    failAt(path_, code);
  }
  if (temporary_.empty())
  {
    return;
  }
  if (const uint32_t code = kor::moveIntoPlace(temporary_, path_, force_); code != TAV_RC_OK)
  {
    failAt(path_, code, code == KOR_RC_FILE_EXISTS ? "--force replaces it" : "");
  }
  temporary_.clear();
  kor::removeOnInterrupt({});
}

} // namespace tav::tool
