/// @file lock.h
/// The layer's lock for its few lines of shared state.
#pragma once

#include <atomic>
#include <cstdint>

namespace tav::kor
{
/// A lock for `std::lock_guard`, shared by threads. Unlike `std::mutex` it is constant-initialised on every platform,
/// so that static objects of a program may use the layer before the layer's own were constructed.
class Lock
{
public:
  constexpr Lock() noexcept = default;
  Lock(const Lock&) = delete;
  Lock& operator=(const Lock&) = delete;

  void lock() noexcept
  {
    while (held_.exchange(1, std::memory_order_acquire) != 0) held_.wait(1, std::memory_order_relaxed);
  }

  void unlock() noexcept
  {
    held_.store(0, std::memory_order_release);
    held_.notify_one();
  }

private:
  std::atomic<uint32_t> held_{0};
};
} // namespace tav::kor
