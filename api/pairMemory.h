/// What scans for the pairs of open groups have shown, so that no scan looks at the same bytes again.
///
/// A scan goes from pair to pair, each sought from behind the one before. The bytes of an open group's size occur in no
/// eye catcher: whatever a scan that comes along has seen before, from there on it takes the same pairs as one that
/// begins there. So all scans that begin at an open group with a 64-bit header follow one chain of pairs, and what one
/// of them has covered the others need not read.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <new>
#include <unordered_map>
#include <utility>

#include "tav/tav.h"

namespace tav::inside
{

/// Allocates as the rest of the library does, by the form of `new` that reports a failure; containers want it thrown.
template<class T>
struct PairAllocator
{
  using value_type = T;

  PairAllocator() = default;
  template<class Other>
  PairAllocator(const PairAllocator<Other>&) noexcept // NOLINT(google-explicit-constructor): as the standard's own
  {
  }

  T* allocate(size_t count)
  {
    // NOLINTNEXTLINE(bugprone-sizeof-expression): a container's table holds pointers
    void* const block = ::operator new(count * sizeof(T), std::nothrow);
    if (block == nullptr)
    {
      throw std::bad_alloc();
    }
    return static_cast<T*>(block);
  }
  void deallocate(T* block, size_t /*count*/) noexcept
  {
    ::operator delete(block, std::nothrow);
  }
  template<class Other>
  bool operator==(const PairAllocator<Other>&) const noexcept
  {
    return true;
  }
};

/// Which stretches of the chain were looked at, and where their pairs lead. Lives with the handle; what it cannot keep
/// is sought again.
class PairMemory
{
public:
  /// How many entries it has at the most: some 16 MiB.
  static constexpr uint64_t kMostEntries = 0x40000;

  /// Whether the pair at a place, or the next one, was looked at; `end`: where the chain goes on behind what was.
  [[nodiscard]] bool isCovered(uint64_t place, uint64_t& end) const;

  /// Where the next stretch that was looked at begins, behind a place; false when there is none.
  [[nodiscard]] bool findCovered(uint64_t place, uint64_t& start) const;

  /// Joins a stretch, which begins at an open group, with those that it overlaps.
  void cover(uint64_t start, uint64_t end);

  /// The first pair that leads to an open group, among those looked at.
  [[nodiscard]] bool findPair(uint64_t group, uint64_t& eyeOffset) const;

  /// False when that pair could not be kept: then its place does not count as covered.
  bool keepPair(uint64_t group, uint64_t eyeOffset);

  /// The code of a scan that goes on at a place, and fails.
  [[nodiscard]] bool findEnd(uint64_t place, uint32_t& rc) const;
  void keepEnd(uint64_t place, uint32_t rc);

  /// The eye catcher that a scan for a readable node comes to behind one that no such node follows; the largest offset
  /// when there is none.
  [[nodiscard]] bool findSuccessor(uint64_t eyeOffset, uint64_t& next) const;
  void keepSuccessor(uint64_t eyeOffset, uint64_t next);

  /// Forgets everything.
  void clear();

  /// Forgets everything when there is no room left.
  void makeRoom();

  /// Whether scans that ended in vain are kept. Where single steps are taken the stream may grow between two of them.
  bool keepsEnds = false;

  uint64_t scanned = 0;  ///< bytes that scans have gone through
  uint64_t farthest = 0; ///< where the farthest of them ended

private:
  using Entry = std::pair<const uint64_t, uint64_t>;
  using Entries = std::unordered_map<uint64_t, uint64_t, std::hash<uint64_t>, std::equal_to<>, PairAllocator<Entry>>;
  using Stretches = std::map<uint64_t, uint64_t, std::less<>, PairAllocator<Entry>>;

  static bool lookUp(const Entries& entries, uint64_t key, uint64_t& value);
  [[nodiscard]] bool isFull() const;
  bool keep(Entries& entries, uint64_t key, uint64_t value) const;

  Stretches covered_; ///< start -> end; they neither overlap nor touch
  Entries pairs_;
  Entries ends_;
  Entries successors_;
};

} // namespace tav::inside
