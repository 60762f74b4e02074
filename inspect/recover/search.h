/// @file search.h
/// Looks through the bytes of a damaged stream for what is surely a node.
#pragma once

#include <cstdint>

#include "inspect/recover/judge.h"
#include "inspect/recover/place.h"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// How a candidate was come by.
enum class Footing : uint8_t
{
  sound,   ///< it lies where a node has to be, behind one that came back
  damaged, ///< it lies where a node has to be, behind lost bytes
  searched ///< it was found by looking at one byte after another
};

/// Finds candidates by what the judge says of one place after another, and believes a candidate where nothing in its
/// bytes is surer. Remembers what was searched, so that claims that overlap are not searched once more for each.
class RecoverySearch
{
public:
  /// `budget`: bytes that `findNext` may look through. All that is given outlives this object.
  RecoverySearch(ByteSource& source, const Form& form, const Place& place, const Judge& judge, uint64_t budget)
      : source_(source), form_(form), place_(place), judge_(judge), budget_(budget) {}

  /// The first place from `from` on where a node can begin; false when there is none before `to`, or the budget is used
  /// up.
  bool findNext(uint64_t from, uint64_t to, Candidate& found);

  /// The first node between two places that is beyond doubt; `to` when there is none.
  uint64_t firstSure(uint64_t from, uint64_t to, bool wide);

  /// Whether a node is where it seems to. On the way from node to node its header is trusted; behind damage, all
  /// its bytes are searched for something surer. Takes the padding away from one that has none.
  bool believe(Candidate& found, Footing footing);

  /// Whether all but a node's own header speaks for it: nodes go on behind it, perhaps behind others like it, and none
  /// begins in its bytes, as in a group whose type is damaged. Then `end` is where it ends.
  bool isStranger(const TAVHeader& header, uint64_t& end);

  bool gaveUp() const { return spent_ > budget_; }

private:
  bool isFound(const uint8_t* bytes, uint64_t offset, uint64_t from, uint64_t to, Candidate& found);
  bool isContradicted(const Candidate& found);

  ByteSource& source_;
  Form form_;
  const Place& place_;
  const Judge& judge_;
  uint64_t budget_;
  uint64_t spent_ = 0;
  uint64_t sureFrom_ = 0; ///< the first node beyond doubt at or behind this place is at sureAt_
  uint64_t sureAt_ = 0;
  bool sureFound_ = false;
  bool sureWide_ = false; ///< as seen from nodes with these headers
};

} // namespace tav::inspect
