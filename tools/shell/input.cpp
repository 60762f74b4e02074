#include "tools/shell/input.h"

#include <cstdio>
#include <filesystem>
#include <vector>

#include "tav/inspect.hpp"
#include "tools/host/host.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

constexpr size_t kPiece = size_t{1024} * 1024;

/// Gives pieces of standard input, or of a pipe with a name.
class PipeReader
{
public:
  PipeReader(const std::string& name, const std::string& path)
      : name_(name)
  {
    if (path == "-")
    {
      return;
    }
    KORFileOpenParam param;
    param.pPath = path.c_str();
    param.options = KOR_FILE_READ;
    if (const uint32_t code = file_.open(&param); code != TAV_RC_OK)
    {
      failAt(name, code);
    }
    named_ = true;
  }

  size_t read(std::vector<uint8_t>& buffer)
  {
    if (!named_)
    {
      const size_t count = std::fread(buffer.data(), 1, buffer.size(), stdin);
      if (count == 0 && std::ferror(stdin) != 0)
      {
        failAt(name_, KOR_RC_IO_ERROR);
      }
      return count;
    }
    KORFileReadParam param;
    param.length = buffer.size();
    uint64_t count = 0;
    const uint32_t code = file_.read(&param, buffer.data(), &count);
    if (code != TAV_RC_OK && code != TAV_RC_END_OF_STORAGE)
    {
      failAt(name_, code);
    }
    return static_cast<size_t>(count);
  }

private:
  const std::string& name_;
  KORHFile file_{};
  bool named_ = false;
};

/// Whether a file has other bytes than its size says. Files that the system makes while they are read, as those of
/// /proc, have the size 0 or that of a page; larger ones are believed.
bool tellsWrongSize(const std::string& name, const std::string& path, uint64_t size)
{
  constexpr uint64_t mostDoubted = uint64_t{64} * 1024;
  if (size > mostDoubted)
  {
    return false;
  }
  std::vector<uint8_t> bytes(static_cast<size_t>(size) + 1);
  return PipeReader(name, path).read(bytes) != size;
}

[[noreturn]] void failAtLimit(const std::string& name, uint64_t limit)
{
  Problem problem{.file = name};
  problem.sentence = "more than " + byteText(limit) + " come from it";
  problem.hint = "--spool-limit sets how much is copied to a temporary file, 0 for no limit";
  throw Error(problem);
}

/// A copy of what is read from a pipe, under a name until it is opened again.
class Spool
{
public:
  Spool()
  {
    const host::HeldInterrupts held;
    path_ = openTemporary(file_, host::processId());
    host::removeOnInterrupt(path_);
  }

  ~Spool() { remove(); }
  Spool(const Spool&) = delete;
  Spool& operator=(const Spool&) = delete;

  const std::string& path() const { return path_; }

  void fill(const std::string& name, const std::string& path, uint64_t limit)
  {
    PipeReader reader(name, path);
    std::vector<uint8_t> buffer(kPiece);
    uint64_t total = 0;
    while (const size_t count = reader.read(buffer))
    {
      total += count;
      if (limit != 0 && total > limit)
      {
        failAtLimit(name, limit);
      }
      KORFileWriteParam param;
      param.pData = buffer.data();
      param.length = count;
      uint64_t done = 0;
      if (const uint32_t code = file_.write(&param, &done); code != TAV_RC_OK)
      {
        failAt(path_, code, "it holds what " + name + " has given so far; set TMPDIR to a folder with more room");
      }
    }
    file_.close();
  }

  /// Where an open file can be removed it is gone from now on, however the program ends.
  void remove()
  {
    if (!path_.empty() && host::removeFile(path_))
    {
      host::keepOnInterrupt(path_);
      path_.clear();
    }
  }

private:
  KORHFile file_{};
  std::string path_{};
};

std::unique_ptr<ByteSource> openSpooled(const std::string& name, const std::string& path, const InputLimits& limits,
                                        uint64_t from)
{
  const auto spool = std::make_shared<Spool>();
  spool->fill(name, path, limits.spool);
  KORFileOpenParam param;
  param.pPath = spool->path().c_str();
  param.options = KOR_FILE_READ;
  uint32_t code = TAV_RC_OK;
  auto storage = std::make_unique<TAVSSFile>(&param, &code);
  if (code != TAV_RC_OK)
  {
    failAt(name, code);
  }
  spool->remove();
  return std::make_unique<ByteSource>(name, std::move(storage), limits.ring, from, spool);
}

} // namespace

std::unique_ptr<ByteSource> openSource(const std::string& path, const InputLimits& limits, uint64_t from)
{
  if (path == "-")
  {
    return openSpooled("standard input", path, limits, from);
  }
  using Kind = std::filesystem::file_type;
  std::error_code error;
  const Kind kind = std::filesystem::status(host::pathOf(path), error).type();
  const bool regular = kind == Kind::regular && !error;
  const bool pipe = !error && kind != Kind::regular && kind != Kind::directory && kind != Kind::not_found;
  const uint64_t told = regular ? std::filesystem::file_size(host::pathOf(path), error) : 0;
  if (pipe || (regular && !error && tellsWrongSize(path, path, told)))
  {
    return openSpooled(path, path, limits, from);
  }
  return ByteSource::open(path, limits.ring, from);
}

namespace
{

/// A text that is read by the standard library's streams, which standard input is one of.
class FileText final : public TextSource
{
public:
  explicit FileText(const std::string& path)
      : TextSource(path == "-" ? "standard input" : path)
  {
    uint32_t code = TAV_RC_OK;
    file_ = path == "-" ? stdin : host::openStream(path, "rb", code);
    if (file_ == nullptr)
    {
      failAt(name(), code);
    }
  }

  ~FileText() override
  {
    if (file_ != stdin)
    {
      std::fclose(file_);
    }
  }

  FileText(const FileText&) = delete;
  FileText& operator=(const FileText&) = delete;

protected:
  size_t fetch(std::span<char> to) override
  {
    const size_t count = std::fread(to.data(), 1, to.size(), file_);
    if (count == 0 && std::ferror(file_) != 0)
    {
      failAt(name(), KOR_RC_IO_ERROR);
    }
    return count;
  }

private:
  std::FILE* file_ = nullptr;
};

} // namespace

std::unique_ptr<TextSource> openText(const std::string& path)
{
  return std::make_unique<FileText>(path);
}

} // namespace tav::tool
