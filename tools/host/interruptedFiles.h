/// @file interruptedFiles.h
/// The files that are removed when a signal ends the program: a table that the handler of the signal may look at.
#pragma once

#include <algorithm>
#include <csignal>
#include <cstddef>
#include <string>

namespace tav::host
{
/// A program has few of them at a time: its output, and what it keeps of its input. One that finds no place stays.
template<class Char>
class InterruptedFiles
{
public:
  void add(const std::basic_string<Char>& path)
  {
    Slot* const slot = std::find_if(slots_, slots_ + kSlots, [](const Slot& place) { return place.used == 0; });
    if (slot == slots_ + kSlots || path.empty() || path.size() >= kLongest)
    {
      return;
    }
    std::copy_n(path.c_str(), path.size() + 1, slot->path);
    slot->used = 1; // from here on the handler looks at it
  }

  void drop(const std::basic_string<Char>& path)
  {
    for (Slot& slot : slots_)
      if (slot.used != 0 && path == slot.path)
      {
        slot.used = 0;
      }
  }

  /// In the handler: calls `remove` with every path.
  template<class Remove>
  void each(Remove remove) const
  {
    for (const Slot& slot : slots_)
      if (slot.used != 0)
      {
        remove(slot.path);
      }
  }

private:
  static constexpr std::size_t kSlots = 8;
  static constexpr std::size_t kLongest = 4096;

  struct Slot
  {
    Char path[kLongest];
    volatile std::sig_atomic_t used;
  };

  Slot slots_[kSlots]{};
};
} // namespace tav::host
