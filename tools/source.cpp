#include "tools/source.h"

#include <algorithm>
#include <cstdio>
#include <filesystem>

#include "kor/host.h"
#include "tools/report.h"

namespace tav::tool
{

namespace
{

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
  Problem problem{name};
  problem.sentence = "more than " + byteText(limit) + " come from it";
  problem.hint = "--spool-limit sets how much is copied to a temporary file, 0 for no limit";
  throw Failure(kTrouble, problem);
}

/// What stands in a storage from an offset on, for reading.
class StorageWindow : public TAVSideStorage
{
public:
  StorageWindow(TAVSideStorage& whole, uint64_t from)
      : TAVSideStorage(0, whole.attributes & (TAV_ATTR_READ_FORWARD | TAV_ATTR_SEEK)), whole_(whole), from_(from)
  {
    ioUnit = whole.ioUnit;
  }

  uint32_t seek(uint64_t offset, uint64_t hint) override { return whole_.seek(from_ + offset, hint); }
  uint32_t getPosition(uint64_t* position) override { return without(whole_.getPosition(position), position); }
  uint32_t getTotalSize(uint64_t* size) override { return without(whole_.getTotalSize(size), size); }
  uint32_t read(uint64_t wanted, void** data, uint64_t room, uint64_t* done, bool zeroCopy, bool backward) override
  {
    return backward ? TAV_RC_NOT_SUPPORTED : whole_.read(wanted, data, room, done, zeroCopy, false);
  }
  uint32_t write(const void*, uint64_t, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t getMemory(void**, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t lock(uint32_t mode) override { return whole_.lock(mode); }
  uint32_t unlock() override { return whole_.unlock(); }

private:
  uint32_t without(uint32_t code, uint64_t* place) const
  {
    *place -= code == TAV_RC_OK ? from_ : 0;
    return code;
  }

  TAVSideStorage& whole_;
  uint64_t from_;
};

/// Copies a pipe to a temporary file and returns its path.
std::string spool(const std::string& name, const std::string& path, uint64_t limit)
{
  PipeReader reader(name, path);
  KORHFile file;
  std::string temporary;
  {
    const kor::HeldInterrupts held;
    temporary = openTemporary(file);
    kor::removeOnInterrupt(temporary);
  }
  std::vector<uint8_t> buffer(ByteSource::kLongRead);
  uint64_t total = 0;
  try
  {
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
      if (const uint32_t code = file.write(&param, &done); code != TAV_RC_OK)
      {
        failAt(temporary, code, "it holds what " + name + " has given so far; set TMPDIR to a folder with more room");
      }
    }
  }
  catch (...)
  {
    kor::removeFile(temporary);
    kor::keepOnInterrupt(temporary);
    throw;
  }
  return temporary;
}

} // namespace

std::string openTemporary(KORHFile& file)
{
  std::error_code error;
  const auto folder = std::filesystem::temp_directory_path(error);
  if (error)
  {
    throw Failure("there is no folder for temporary files", "set TMPDIR to a folder that can be written");
  }
  for (unsigned attempt = 0;; ++attempt)
  {
    std::string path =
        kor::textOf(folder / ("tav-" + std::to_string(kor::processId()) + "-" + std::to_string(attempt)));
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

ByteSource::ByteSource(std::string name, std::string path, const SourceLimits& limits, uint64_t from)
    : name_(std::move(name)), from_(from), maxPages_(static_cast<size_t>(std::max<uint64_t>(2, limits.ring / kPage)))
{
  std::error_code error;
  const auto kind = std::filesystem::status(kor::pathOf(path), error).type();
  if (kind == std::filesystem::file_type::directory)
  {
    failAt(name_, KOR_RC_IS_FOLDER);
  }
  const bool regular = path != "-" && (error || kind == std::filesystem::file_type::regular ||
                                       kind == std::filesystem::file_type::not_found);
  const bool known = regular && kind == std::filesystem::file_type::regular;
  const uint64_t told = known ? std::filesystem::file_size(kor::pathOf(path), error) : 0;
  if (!regular || (known && !error && tellsWrongSize(name_, path, told)))
  {
    path = temporary_ = spool(name_, path, limits.spool);
  }
  KORFileOpenParam param;
  param.pPath = path.c_str();
  param.options = KOR_FILE_READ;
  uint32_t code = TAV_RC_OK;
  file_ = std::make_unique<TAVSSFile>(&param, &code);
  if (!temporary_.empty())
  {
    // Where an open file can be removed it is gone from now on, however the program ends.
    if (kor::removeFile(temporary_))
    {
      kor::keepOnInterrupt(temporary_);
      temporary_.clear();
    }
  }
  if (code == TAV_RC_OK)
  {
    code = file_->getTotalSize(&size_);
  }
  if (code != TAV_RC_OK)
  {
    failAt(name_, code);
  }
  if (from_ != 0)
  {
    startAt();
  }
}

void ByteSource::startAt()
{
  if (from_ >= size_)
  {
    Problem problem{name_, from_};
    problem.sentence = "--from: lies behind the end of the file";
    throw Failure(kTrouble, problem);
  }
  name_ += " from " + hexOffset(from_);
  size_ -= from_;
  window_ = std::make_unique<StorageWindow>(*file_, from_);
}

ByteSource::~ByteSource()
{
  if (!temporary_.empty())
  {
    file_.reset();
    kor::removeFile(temporary_);
    kor::keepOnInterrupt(temporary_);
  }
}

std::unique_ptr<ByteSource> ByteSource::open(const std::string& path, const SourceLimits& limits, uint64_t from)
{
  return std::unique_ptr<ByteSource>(new ByteSource(path == "-" ? "standard input" : path, path, limits, from));
}

ByteSource::Page& ByteSource::slotFor(uint64_t number)
{
  size_t place = pages_.size();
  if (place < maxPages_)
  {
    pages_.emplace_back();
  }
  else
  {
    const auto oldest =
        std::min_element(pages_.begin(), pages_.end(), [](const Page& a, const Page& b) { return a.used < b.used; });
    place = static_cast<size_t>(oldest - pages_.begin());
    places_.erase(oldest->number);
  }
  places_[number] = place;
  pages_[place].number = number;
  return pages_[place];
}

void ByteSource::fetch(uint64_t number, uint64_t count)
{
  const uint64_t offset = number * kPage;
  const uint64_t wanted = std::min(count * kPage, size_ - offset);
  buffer_.resize(static_cast<size_t>(wanted));
  void* target = buffer_.data();
  uint64_t done = 0;
  uint32_t code = file_->seek(from_ + offset, 1);
  if (code == TAV_RC_OK)
  {
    code = file_->read(wanted, &target, wanted, &done, false, false);
  }
  ++readCalls_;
  bytesRead_ += done;
  if (code != TAV_RC_OK && code != TAV_RC_END_OF_STORAGE)
  {
    failAt(name_, code);
  }
  if (done < wanted)
  {
    failAt(name_, TAV_RC_END_OF_STORAGE, "the file became shorter while it was read");
  }
  for (uint64_t at = 0; at < wanted; at += kPage)
  {
    if (places_.contains(number + at / kPage))
    {
      continue;
    }
    Page& slot = slotFor(number + at / kPage);
    slot.used = ++clock_;
    const auto first = buffer_.begin() + static_cast<ptrdiff_t>(at);
    slot.bytes.assign(first, first + static_cast<ptrdiff_t>(std::min(kPage, wanted - at)));
  }
}

const ByteSource::Page& ByteSource::page(uint64_t number)
{
  auto found = places_.find(number);
  if (found == places_.end())
  {
    run_ = number == expected_ ? run_ + 1 : 0;
    // A single look reads one page; who goes straight on gets more at once, up to a quarter of what may be kept.
    const uint64_t ahead = std::min({run_ + 1, kLongRead / kPage, uint64_t{maxPages_} / 4 + 1});
    fetch(number, ahead);
    expected_ = number + ahead;
    if (run_ != 0 && told_)
    {
      told_(number * kPage);
    }
    found = places_.find(number);
  }
  Page& result = pages_[found->second];
  result.used = ++clock_;
  return result;
}

std::span<const uint8_t> ByteSource::view(uint64_t offset)
{
  if (offset >= size_)
  {
    return {};
  }
  const Page& found = page(offset / kPage);
  return std::span<const uint8_t>(found.bytes).subspan(static_cast<size_t>(offset % kPage));
}

size_t ByteSource::read(uint64_t offset, std::span<uint8_t> to)
{
  size_t done = 0;
  while (done < to.size())
  {
    const auto piece = view(offset + done);
    if (piece.empty())
    {
      break;
    }
    const size_t count = std::min(piece.size(), to.size() - done);
    std::copy_n(piece.begin(), count, to.begin() + static_cast<ptrdiff_t>(done));
    done += count;
  }
  return done;
}

} // namespace tav::tool
