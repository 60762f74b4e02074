/// Random streams of open groups, of pairs that lead to them or anywhere, and of what hides pairs.
#pragma once

#include <cstdint>
#include <random>
#include <vector>

#include "support/byteRows.h"

namespace test
{

/// Groups are opened and, somewhere behind, their pairs follow in any order; between them stand elements, ends of
/// groups, and pairs in payloads. A wild stream also has pairs that lead anywhere, sizes that lie, and eye catchers
/// that are hidden.
class OpenGroupSoup
{
public:
  /// Where `narrow`, some groups have children with 32-bit headers.
  OpenGroupSoup(uint64_t seed, bool swap, uint64_t nodes, bool narrow = false)
      : random_(seed), rows_(swap), swap_(swap), narrow_(narrow), wild_(seed % 3 == 0)
  {
    group(TAV_SIZE_UNKNOWN);
    for (uint64_t i = 0; i < nodes; ++i)
    {
      wild_&& pick(4) == 0 ? wildNode() : node();
    }
    closeAll();
    rows_.fill(16);
  }

  [[nodiscard]] const Bytes& bytes() const { return rows_.bytes; }

private:
  uint64_t pick(uint64_t below) { return random_() % below; }

  void group(uint64_t size)
  {
    open_.push_back(rows_.at());
    all_.push_back(rows_.at());
    const bool children32 = narrow_ && pick(6) == 0;
    rows_.h64(size, pick(2) == 0 ? TAV_INFO_EYE_SIZE : 0, children32 ? TAV_TYPE_HEADER32 : TAV_TYPE_HEADER64,
              static_cast<uint16_t>(1 + pick(3)));
  }

  void pair(uint64_t target)
  {
    const uint64_t at = rows_.at();
    ByteRows either(pick(5) == 0 ? !swap_ : swap_);
    rows_.data(either.pair(at - target).bytes);
  }

  void marker() { rows_.h64(0, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER); }

  /// Ends a group that is open, mostly the innermost, with or without an element before that says so.
  void close()
  {
    const uint64_t last = open_.size() - 1;
    const uint64_t index = pick(4) == 0 ? pick(open_.size()) : last;
    const uint64_t target = open_[index];
    switch (pick(4))
    {
    case 0: marker(); break;
    case 1: rows_.h64(16 + 8 * pick(3), 0, TAV_TYPE_BINARY, 7); break;
    default: rows_.h64(16, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE); break;
    }
    pair(target);
    if (pick(4) != 0)
    {
      open_.erase(open_.begin() + static_cast<ptrdiff_t>(index));
    }
  }

  void closeAll()
  {
    const bool leavesSome = pick(4) == 0;
    while (!open_.empty() && !(leavesSome && pick(8) == 0))
    {
      close();
    }
    marker();
  }

  void node()
  {
    switch (pick(7))
    {
    case 0:
    case 1:
    case 2: group(TAV_SIZE_UNKNOWN); break;
    case 3:
      if (!open_.empty())
      {
        close();
      }
      break;
    case 4: rows_.h64(4, 0, TAV_TYPE_UINT32, 8).fill(4, 7); break;
    case 5: rows_.fill(16 * pick(3)); break;
    default: marker(); break;
    }
  }

  void wildNode()
  {
    switch (pick(7))
    {
    case 0: group(pick(200)); break;
    case 1: pair(all_[pick(all_.size())]); break;
    case 2: pair(pick(rows_.at() + 1)); break;
    case 3: pair(rows_.at() + 16 * pick(2)); break;
    case 4: rows_.h64(pick(2) == 0 ? pick(400) : ~uint64_t{0} - pick(40), 0, TAV_TYPE_BINARY, 7); break;
    case 5: rows_.fill(8 * pick(4)); break;
    default: // an eye catcher that is hidden, or hides half
      rows_.data(Bytes(1 + pick(3), eyeBytes(swap_)[0]));
      pair(all_[pick(all_.size())]);
      break;
    }
  }

  std::mt19937_64 random_;
  ByteRows rows_;
  bool swap_;
  bool narrow_;
  bool wild_;
  std::vector<uint64_t> open_;
  std::vector<uint64_t> all_;
};

} // namespace test
