/// An index made of the parts of a walk, which several threads may walk through.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "layer/indexEntries.h"
#include "layer/indexWalk.h"
#include "tav/cpp/index.hpp"

namespace tav::detail
{

class IndexParts
{
public:
  IndexParts(const Node& start, const IndexWork& work);

  static IndexBytes bytesOf(const Node& start) noexcept;

  /// Walks through all parts, until damage. Parts that do not begin where the one before has ended are walked through
  /// anew, from there.
  uint32_t walk();
  /// Puts children next to each other, in the order of their parents.
  IndexEntries arrange();

private:
  /// A group that is around a part.
  struct Around
  {
    IndexGroup* group; ///< as the part has it in which it begins
    uint32_t before;   ///< of its children, those that come before the part
  };
  struct Part
  {
    IndexWalk walk{};
    uint64_t stop = ~uint64_t{0};
    bool isWalked = false; ///< false when memory did not suffice
    std::vector<Around> around{};
  };

  template<class Piece>
  void eachPart(const Piece& piece);
  template<class Take>
  void eachGroup(size_t part, const Take& take);
  void walkAlone(size_t part) noexcept;
  void settle(size_t part);
  bool isTooMuch(size_t part, size_t& nodes) const;
  void countAround(size_t part);
  static void tell(const IndexGroup& group, IndexEntry& entry) noexcept;
  void place(size_t part, IndexEntries& entries) noexcept;

  const Node& start_;
  const IndexWork& work_;
  IndexBytes bytes_{};
  std::vector<Part> parts_;
};

} // namespace tav::detail
