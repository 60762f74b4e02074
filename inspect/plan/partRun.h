/// Threads that work on the parts of a file ahead of the one who needs what they find.
#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <thread>
#include <vector>

#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// Objects that read the same bytes at the same time, each used by one thread. The source itself rests meanwhile.
class Twins
{
public:
  explicit Twins(ByteSource& source, unsigned count);
  ~Twins();
  Twins(const Twins&) = delete;
  Twins& operator=(const Twins&) = delete;

  ByteSource& operator[](size_t i) { return *all_[i]; }

private:
  ByteSource& source_;
  std::mutex turns_{}; ///< of the storage, which has one cursor
  std::vector<std::unique_ptr<ByteSource>> all_{};
};

/// Does a piece of work for each part of a file, by several threads, one of which is the caller's. Parts are taken in
/// their order, and not far ahead of the one that is waited for: what they find is kept until then.
class PartRun
{
public:
  /// Told whether to stop, with bytes of the thread's own and the part's number. What it throws ends the part alone.
  using Work = std::function<void(const std::atomic<bool>& stop, ByteSource& source, size_t part)>;

  /// `threads`: the caller's is one of them. Fewer will do when the system gives no more.
  PartRun(ByteSource& source, size_t parts, unsigned threads, Work work);
  /// Stops what is being done.
  ~PartRun();
  PartRun(const PartRun&) = delete;
  PartRun& operator=(const PartRun&) = delete;

  /// Returns when the work on a part is done; does some meanwhile. False when it could not be done.
  bool await(size_t part);
  /// The parts before this one are not needed any more.
  void passTo(size_t part);
  /// The bytes for the caller's thread.
  ByteSource& source() { return twins_[0]; }

private:
  enum class Progress : uint8_t
  {
    open,
    done,
    failed
  };

  void serve(size_t thread);
  void takeOne(std::unique_lock<std::mutex>& lock, size_t thread);
  bool isWork() const { return next_ < progress_.size() && next_ < needed_ + ahead_; }

  Twins twins_;
  Work work_;
  size_t ahead_; ///< parts that may be begun from the one on that is needed
  std::mutex mutex_{};
  std::condition_variable changed_{};
  std::vector<Progress> progress_;
  size_t next_ = 0;   ///< the first part that nobody has begun
  size_t needed_ = 0; ///< the part that is waited for
  std::atomic<bool> stop_{false};
  std::vector<std::thread> threads_{};
};

} // namespace tav::inspect
