#include "tools/shell/input.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <vector>

#include "kor/host.h"
#include "tools/shell/report.h"
#include "tools/shell/temporary.h"

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

/// A copy of what is read from a pipe, under a name until it is opened again.
class Spool
{
public:
  Spool()
  {
    const kor::HeldInterrupts held;
    path_ = openTemporary(file_, kor::processId());
    kor::removeOnInterrupt(path_);
  }

  ~Spool() { remove(); }
  Spool(const Spool&) = delete;
  Spool& operator=(const Spool&) = delete;

  const std::string& path() const { return path_; }

  void fill(PipeReader& reader)
  {
    std::vector<uint8_t> buffer(kPiece);
    while (const size_t count = reader.read(buffer))
    {
      KORFileWriteParam param;
      param.pData = buffer.data();
      param.length = count;
      uint64_t done = 0;
      if (const uint32_t code = file_.write(&param, &done); code != TAV_RC_OK)
      {
        failAt(path_, code);
      }
    }
    file_.close();
  }

  /// Where an open file can be removed it is gone from now on, however the program ends.
  void remove()
  {
    if (!path_.empty() && kor::removeFile(path_))
    {
      path_.clear();
      kor::removeOnInterrupt({});
    }
  }

private:
  KORHFile file_{};
  std::string path_{};
};

std::unique_ptr<ByteSource> openSpooled(const std::string& name, const std::string& path, uint64_t ringBytes)
{
  PipeReader reader(name, path);
  const auto spool = std::make_shared<Spool>();
  spool->fill(reader);
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
  return std::make_unique<ByteSource>(name, std::move(storage), ringBytes, spool);
}

} // namespace

std::unique_ptr<ByteSource> openSource(const std::string& path, uint64_t ringBytes)
{
  if (path == "-")
  {
    return openSpooled("standard input", path, ringBytes);
  }
  std::error_code error;
  const auto kind = std::filesystem::status(kor::pathOf(path), error).type();
  const bool pipe = !error && kind != std::filesystem::file_type::regular &&
                    kind != std::filesystem::file_type::directory && kind != std::filesystem::file_type::not_found;
  return pipe ? openSpooled(path, path, ringBytes) : ByteSource::open(path, ringBytes);
}

namespace
{

/// A text that is read by the standard library's streams, which standard input is one of.
class FileText final : public TextSource
{
public:
  explicit FileText(const std::string& path)
      : TextSource(path == "-" ? "standard input" : path), file_(path == "-" ? stdin : kor::openStream(path, "rb"))
  {
    require(file_ != nullptr);
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
    require(count != 0 || std::ferror(file_) == 0);
    return count;
  }

private:
  void require(bool holds) const
  {
    if (!holds)
    {
      throw Error(Problem{.file = name(), .sentence = std::strerror(errno)});
    }
  }

  std::FILE* file_;
};

} // namespace

std::unique_ptr<TextSource> openText(const std::string& path)
{
  return std::make_unique<FileText>(path);
}

} // namespace tav::tool
