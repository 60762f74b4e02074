#include "inspect/plan/partRun.h"

#include <algorithm>
#include <exception>
#include <system_error>
#include <utility>

namespace tav::inspect
{

namespace
{

constexpr uint64_t kLeastRing = uint64_t{1} << 20U;
constexpr size_t kAhead = 4; ///< parts a thread

/// A storage as one of several readers sees it: each call is one of seeking and reading.
class SharedStorage : public TAVSideStorage
{
public:
  SharedStorage(TAVSideStorage& whole, std::mutex& turns)
      : TAVSideStorage(0, whole.attributes & (TAV_ATTR_READ_FORWARD | TAV_ATTR_SEEK)), whole_(whole), turns_(turns)
  {
    ioUnit = whole.ioUnit;
  }

  uint32_t seek(uint64_t offset, uint64_t) override
  {
    place_ = offset;
    return TAV_RC_OK;
  }
  uint32_t getPosition(uint64_t* position) override
  {
    *position = place_;
    return TAV_RC_OK;
  }
  uint32_t getTotalSize(uint64_t* size) override
  {
    const std::lock_guard lock(turns_);
    return whole_.getTotalSize(size);
  }
  uint32_t read(uint64_t wanted, void** data, uint64_t room, uint64_t* done, bool zeroCopy, bool backward) override
  {
    if (backward)
    {
      return TAV_RC_NOT_SUPPORTED;
    }
    const std::lock_guard lock(turns_);
    uint32_t code = whole_.seek(place_, 1);
    if (code == TAV_RC_OK)
    {
      code = whole_.read(wanted, data, room, done, zeroCopy, false);
      place_ += *done;
    }
    return code;
  }
  uint32_t write(const void*, uint64_t, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t getMemory(void**, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t lock(uint32_t) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t unlock() override { return TAV_RC_NOT_SUPPORTED; }

private:
  TAVSideStorage& whole_;
  std::mutex& turns_;
  uint64_t place_ = 0;
};

} // namespace

Twins::Twins(ByteSource& source, unsigned count)
    : source_(source)
{
  const uint64_t ring = std::max(kLeastRing, source.ringBytes() / count);
  for (unsigned i = 0; i < count; ++i)
  {
    all_.push_back(source.isMemory()
                       ? std::make_unique<ByteSource>(source.name(), source.view(0))
                       : std::make_unique<ByteSource>(
                             source.name(), std::make_unique<SharedStorage>(source.storage(), turns_), ring));
    all_.back()->setDictionary(source.dictionary());
  }
}

Twins::~Twins()
{
  for (const auto& twin : all_)
  {
    source_.countReads(*twin);
  }
}

PartRun::PartRun(ByteSource& source, size_t parts, unsigned threads, Work work)
    : twins_(source, threads), work_(std::move(work)), ahead_(kAhead * threads), progress_(parts, Progress::open)
{
  for (unsigned i = 1; i < threads; ++i)
  {
    try
    {
      threads_.emplace_back([this, i] { serve(i); });
    }
    catch (const std::system_error&)
    {
      break; // the work is done all the same
    }
  }
}

PartRun::~PartRun()
{
  {
    const std::lock_guard lock(mutex_);
    stop_.store(true);
    changed_.notify_all();
  }
  for (std::thread& thread : threads_)
  {
    thread.join();
  }
}

void PartRun::serve(size_t thread)
{
  std::unique_lock lock(mutex_);
  while (!stop_.load())
  {
    isWork() ? takeOne(lock, thread) : changed_.wait(lock);
  }
}

void PartRun::takeOne(std::unique_lock<std::mutex>& lock, size_t thread)
{
  const size_t part = next_++;
  Progress outcome = Progress::done;
  lock.unlock();
  try
  {
    work_(stop_, twins_[thread], part);
  }
  catch (...)
  {
    outcome = Progress::failed; // when the part is needed, the one who needs it runs into the same
  }
  lock.lock();
  progress_[part] = outcome;
  changed_.notify_all();
}

bool PartRun::await(size_t part)
{
  std::unique_lock lock(mutex_);
  if (part > needed_)
  {
    needed_ = part;
    changed_.notify_all();
  }
  while (progress_[part] == Progress::open)
  {
    if (part < next_ || isWork())
    {
      isWork() ? takeOne(lock, 0) : changed_.wait(lock);
    }
  }
  return progress_[part] == Progress::done;
}

void PartRun::passTo(size_t part)
{
  const std::lock_guard lock(mutex_);
  needed_ = std::max(needed_, part);
  next_ = std::max(next_, part);
  changed_.notify_all();
}

} // namespace tav::inspect
