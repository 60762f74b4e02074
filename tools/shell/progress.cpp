#include "tools/shell/progress.h"

#include <algorithm>
#include <cstdio>

#include "tools/host/host.h"
#include "tools/shell/report.h"

namespace tav::tool
{

// How long nothing is shown, and then how often.
constexpr std::chrono::milliseconds kPatience{500};
constexpr std::chrono::milliseconds kPause{100};

Progress::Progress(std::string what, uint64_t totalBytes)
    : what_(std::move(what)), total_(totalBytes), active_(host::isTerminal(stderr))
{
}

Progress::Progress(std::string what, ByteSource& source)
    : Progress(std::move(what), source.size())
{
  if (active_)
  {
    source_ = &source;
    source.tellOfPieces([this](uint64_t offset) { show(offset); });
  }
}

Progress::~Progress()
{
  if (source_ != nullptr)
  {
    source_->tellOfPieces({});
  }
  if (shown_)
  {
    std::fputs("\r\033[K", stderr);
  }
}

void Progress::show(uint64_t bytes)
{
  const Clock::time_point now = Clock::now();
  if (now - start_ < kPatience || now - last_ < kPause)
  {
    return;
  }
  last_ = now;
  shown_ = true;
  const double seconds = std::chrono::duration<double>(now - start_).count();
  const double rate = static_cast<double>(bytes) / seconds;
  const double share = total_ == 0 ? 0 : static_cast<double>(std::min(bytes, total_)) / static_cast<double>(total_);
  const double left = rate > 0 && total_ > bytes ? static_cast<double>(total_ - bytes) / rate : 0;
  std::fprintf(stderr, "\r%s: %s of %s (%.0f %%), %s/s, %.0f s left\033[K", what_.c_str(), byteText(bytes).c_str(),
               byteText(total_).c_str(), share * 100, byteText(static_cast<uint64_t>(rate)).c_str(), left);
}

} // namespace tav::tool
