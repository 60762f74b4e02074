#include "tools/build_file.h"

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "kor/host.h"
#include "tools/report.h"
#include "tools/source.h"

namespace tav::tool
{

namespace
{

constexpr size_t kBuffer = size_t{256} * 1024;

void require(uint32_t code)
{
  if (code != TAV_RC_OK)
  {
    Problem problem;
    problem.sentence = "the output cannot be written: " + std::string(codeSentence(code));
    problem.code = code;
    throw Failure(kTrouble, problem);
  }
}

} // namespace

PatchFile::PatchFile()
{
  openOwn();
}

PatchFile::PatchFile(Output& out)
    : out_(&out)
{
  if (out.temporaryPath().empty())
  {
    openOwn();
    return;
  }
  KORFileOpenParam param;
  param.pPath = out.temporaryPath().c_str();
  param.options = KOR_FILE_UPDATE;
  require(file_.open(&param));
}

void PatchFile::openOwn()
{
  own_ = true;
  const kor::HeldInterrupts held;
  temporary_ = openTemporary(file_);
  // Where an open file can be removed it is gone from now on, however the program ends.
  if (kor::removeFile(temporary_))
  {
    temporary_.clear();
    return;
  }
  kor::removeOnInterrupt(temporary_);
}

PatchFile::~PatchFile()
{
  file_.close();
  if (!temporary_.empty())
  {
    kor::removeFile(temporary_);
    kor::keepOnInterrupt(temporary_);
  }
}

void PatchFile::append(std::string_view bytes)
{
  if (buffer_.size() + bytes.size() > kBuffer)
  {
    flush();
  }
  if (bytes.size() > kBuffer)
  {
    writeAt(flushed_, bytes.data(), bytes.size());
    flushed_ += bytes.size();
    return;
  }
  buffer_ += bytes;
}

void PatchFile::append(std::span<const uint8_t> bytes)
{
  append(std::string_view(reinterpret_cast<const char*>(bytes.data()), bytes.size()));
}

void PatchFile::appendZeros(uint64_t count)
{
  constexpr uint64_t block = uint64_t{64} * 1024;
  const std::string zeros(static_cast<size_t>(std::min(count, block)), '\0');
  while (count != 0)
  {
    const uint64_t now = std::min(count, block);
    append(std::string_view(zeros).substr(0, static_cast<size_t>(now)));
    count -= now;
  }
}

void PatchFile::patch(uint64_t offset, std::span<const uint8_t> bytes)
{
  if (offset >= flushed_)
  {
    std::memcpy(buffer_.data() + (offset - flushed_), bytes.data(), bytes.size());
    return;
  }
  if (bytes.size() > flushed_ - offset)
  {
    flush(); // it lies across the border
  }
  writeAt(offset, bytes.data(), bytes.size());
}

size_t PatchFile::read(uint64_t offset, std::span<uint8_t> to)
{
  flush();
  KORFileSeekParam seek;
  seek.offset = offset;
  require(file_.seek(&seek, nullptr));
  KORFileReadParam param;
  param.length = to.size();
  uint64_t done = 0;
  const uint32_t code = file_.read(&param, to.data(), &done);
  require(code == TAV_RC_END_OF_STORAGE ? TAV_RC_OK : code);
  place_ = offset + done;
  return static_cast<size_t>(done);
}

void PatchFile::flush()
{
  writeAt(flushed_, buffer_.data(), buffer_.size());
  flushed_ += buffer_.size();
  buffer_.clear();
}

void PatchFile::writeAt(uint64_t offset, const void* bytes, uint64_t count)
{
  if (count == 0)
  {
    return;
  }
  if (offset != place_)
  {
    KORFileSeekParam seek;
    seek.offset = offset;
    require(file_.seek(&seek, nullptr));
  }
  KORFileWriteParam param;
  param.pData = bytes;
  param.length = count;
  uint64_t done = 0;
  require(file_.write(&param, &done));
  place_ = offset + count;
}

void PatchFile::copyOut()
{
  KORFileSeekParam start;
  require(file_.seek(&start, nullptr));
  std::string block(kBuffer, '\0');
  for (uint64_t left = flushed_; left != 0;)
  {
    KORFileReadParam param;
    param.length = std::min<uint64_t>(left, block.size());
    uint64_t done = 0;
    require(file_.read(&param, block.data(), &done));
    out_->write(std::string_view(block).substr(0, static_cast<size_t>(done)));
    left -= done;
  }
}

void PatchFile::finish()
{
  flush();
  if (own_)
  {
    copyOut();
  }
  require(file_.close());
  out_->commit();
}

} // namespace tav::tool
