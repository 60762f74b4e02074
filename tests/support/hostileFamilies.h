/// Families of hostile streams: each member is as long as is asked for and tries to make reading it cost more than its
/// length. What they try is in the comment of each.
#pragma once

#include <algorithm>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "support/byteRows.h"
#include "support/streams.h"

namespace test
{

/// A stream that is being laid out up to a length.
class HostileRows : public ByteRows
{
public:
  HostileRows(uint64_t length, bool swap)
      : ByteRows(swap), length_(length), swap_(swap)
  {
  }

  [[nodiscard]] uint64_t length() const { return length_; }

  uint64_t open(uint16_t elm = 9)
  {
    h64(TAV_SIZE_UNKNOWN, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER64, elm);
    return at() - kHeader;
  }
  uint64_t closed(uint64_t size, uint16_t elm = 9)
  {
    h64(size, 0, TAV_TYPE_HEADER64, elm);
    return at() - kHeader;
  }
  HostileRows& marker()
  {
    h64(0, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER);
    return *this;
  }
  HostileRows& pairTo(uint64_t target)
  {
    pair(at() - target);
    return *this;
  }
  /// As a machine of the other byte order writes it.
  HostileRows& otherPairTo(uint64_t target)
  {
    data(ByteRows(!swap_).pair(at() - target).bytes);
    return *this;
  }
  /// The element that ends a group, and its pair.
  HostileRows& endOf(uint64_t group)
  {
    h64(16, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE);
    return pairTo(group);
  }
  /// An element whose payload is a pair.
  HostileRows& payloadPair(uint64_t target)
  {
    h64(16, 0, TAV_TYPE_BINARY, 7);
    return pairTo(target);
  }
  /// One element over all bytes up to `end`.
  HostileRows& elementUpTo(uint64_t end)
  {
    const uint64_t size = end > at() + kHeader ? end - at() - kHeader : 0;
    h64(size, 0, TAV_TYPE_BINARY, 7).fill(size, 0x11);
    return *this;
  }
  /// Repeats what adds bytes until it would pass a length.
  template<class Add>
  void repeatUpTo(uint64_t end, uint64_t most, Add add)
  {
    while (at() + most <= end) add();
  }

  static constexpr uint64_t kHeader = 16;

private:
  uint64_t length_;
  bool swap_;
};

using Groups = std::vector<uint64_t>;

inline Groups openMany(HostileRows& rows, uint64_t end, uint16_t elm = 9)
{
  Groups groups;
  rows.repeatUpTo(end, 16, [&] { groups.push_back(rows.open(elm)); });
  return groups;
}

struct HostileFamily
{
  const char* name;
  void (*build)(HostileRows& rows);
};

/// @name Open groups in each other
/// @{

/// All are opened at the start and ended at the end, as by a writer that never comes back to a size.
inline void nestedInOrder(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 3);
  for (auto group = groups.rbegin(); group != groups.rend(); ++group) rows.endOf(*group);
}

/// As before with much in between.
inline void nestedAroundFiller(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 8);
  rows.elementUpTo(rows.length() * 3 / 4);
  for (auto group = groups.rbegin(); group != groups.rend(); ++group) rows.endOf(*group);
}

/// The outermost is ended first, so that a walk goes back further and further.
inline void nestedEndedFromOutside(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 3);
  rows.marker();
  for (const uint64_t group : groups) rows.pairTo(group).marker();
}

/// The deepest 100 alone are ended.
inline void nestedWithoutEnds(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() - 4096);
  for (size_t i = 0; i < 100; ++i) rows.endOf(groups[groups.size() - 1 - i]);
}

/// Each group's pair is the payload of its first child: what follows is child and sibling.
inline void overlapping(HostileRows& rows)
{
  rows.repeatUpTo(rows.length() - 16, 48, [&] {
    const uint64_t group = rows.open();
    rows.payloadPair(group);
  });
  rows.marker();
}

/// As before, each with a hundred bytes of its own.
inline void overlappingFar(HostileRows& rows)
{
  rows.repeatUpTo(rows.length() - 16, 176, [&] {
    const uint64_t group = rows.open();
    rows.h64(96, 0, TAV_TYPE_BINARY, 7).fill(96);
    rows.h64(48, 0, TAV_TYPE_BINARY, 7).fill(32);
    rows.pairTo(group);
  });
  rows.marker();
}

/// Staircases: a few groups in each other, whose ends are in the next staircase.
inline void staircases(HostileRows& rows)
{
  Groups before;
  rows.repeatUpTo(rows.length() - 512, 512, [&] {
    Groups groups;
    for (int i = 0; i < 8; ++i) groups.push_back(rows.open());
    rows.marker();
    for (auto group = before.rbegin(); group != before.rend(); ++group) rows.pairTo(*group).marker();
    before = groups;
  });
  for (auto group = before.rbegin(); group != before.rend(); ++group) rows.pairTo(*group).marker();
}

/// One staircase whose ends are all behind a filler, in the order that leads back.
inline void staircaseBehindFiller(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 4);
  rows.marker();
  rows.elementUpTo(rows.length() / 2);
  for (const uint64_t group : groups) rows.pairTo(group).marker();
}

/// A staircase over rising stairs: each child jumps to the far end, its group's pair is near.
inline void jumpingThereAndBack(HostileRows& rows)
{
  const uint64_t end = rows.length() - 64;
  rows.repeatUpTo(rows.length() / 2, 64, [&] {
    const uint64_t group = rows.open();
    rows.payloadPair(group);
    rows.h64(end - rows.at() - 16, 0, TAV_TYPE_BINARY, 7);
  });
  rows.fill(end - rows.at(), 0x22);
  rows.marker();
}

/// @}
/// @name Open groups beside each other
/// @{

inline void wide(HostileRows& rows)
{
  const uint64_t root = rows.open(1);
  rows.repeatUpTo(rows.length() - 48, 48, [&] { rows.endOf(rows.open()); });
  rows.endOf(root);
}

inline void wideWithElements(HostileRows& rows)
{
  const uint64_t root = rows.open(1);
  rows.repeatUpTo(rows.length() - 48, 112, [&] {
    const uint64_t group = rows.open();
    rows.h64(8, TAV_INFO_EYE_SIZE, TAV_TYPE_UINT64, 8).fill(8).pair(24);
    rows.h64(3, TAV_INFO_ALIGNED8, TAV_TYPE_ASCII_STRING, 8).fill(8, 'a');
    rows.endOf(group);
  });
  rows.endOf(root);
}

/// Behind each end is what cannot be read, so that the sibling is far behind.
inline void endsBeforeUnreadable(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 4);
  rows.marker();
  for (auto group = groups.rbegin(); group != groups.rend(); ++group)
  {
    rows.pairTo(*group).h64(uint64_t{1} << 60, 0, TAV_TYPE_BINARY, 7);
  }
  rows.pairTo(0).marker();
}

/// As before, in the order that leads back.
inline void endsBeforeUnreadableFromOutside(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 4);
  rows.marker();
  for (const uint64_t group : groups) rows.pairTo(group).h64(uint64_t{1} << 60, 0, TAV_TYPE_BINARY, 7);
  rows.pairTo(0).marker();
}

/// Behind each end is an element of a size that a small ring cannot hold.
inline void endsBeforeLarge(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 4);
  rows.marker();
  for (const uint64_t group : groups) rows.pairTo(group).h64(rows.length() / 8, 0, TAV_TYPE_BINARY, 7);
  rows.elementUpTo(rows.length());
  rows.pairTo(0).marker();
}

/// Groups whose ends are missing, each in a closed one that says nothing of it.
inline void openInClosed(HostileRows& rows)
{
  const uint64_t root = rows.open(1);
  rows.repeatUpTo(rows.length() - 48, 48, [&] {
    rows.closed(32);
    rows.open(8);
    rows.marker();
  });
  rows.endOf(root);
}

/// @}
/// @name Pairs
/// @{

inline void pairsTo(HostileRows& rows, uint64_t groups, uint64_t filler, uint64_t target)
{
  for (uint64_t i = 0; i < groups; ++i) rows.open();
  rows.marker();
  if (filler != 0)
  {
    rows.elementUpTo(filler);
  }
  rows.repeatUpTo(rows.length(), 16, [&] { rows.pairTo(target); });
}

inline void pairsToTheStart(HostileRows& rows)
{
  pairsTo(rows, 2, rows.length() / 2, 0);
}
inline void pairsToTheStartOfThree(HostileRows& rows)
{
  pairsTo(rows, 3, 0, 0);
}
inline void pairsToTheSecond(HostileRows& rows)
{
  pairsTo(rows, 4, 0, 16);
}

inline void pairsToThemselves(HostileRows& rows)
{
  openMany(rows, 64);
  rows.marker();
  rows.repeatUpTo(rows.length(), 16, [&] { rows.pair(0); });
}

inline void pairsToTheOneBefore(HostileRows& rows)
{
  openMany(rows, 64);
  rows.marker();
  rows.repeatUpTo(rows.length(), 16, [&] { rows.pair(16); });
}

inline void pairsForward(HostileRows& rows)
{
  rows.repeatUpTo(rows.length(), 64, [&] {
    rows.open();
    rows.marker();
    rows.pair(~uint64_t{0} - 31).fill(16);
  });
}

/// Nothing but eye catchers, each the distance of the one before.
inline void eyesOnly(HostileRows& rows)
{
  openMany(rows, 64);
  rows.repeatUpTo(rows.length(), 8, [&] { rows.number(TAV_EYE_CATCHER, 8); });
}

/// Eye catchers that scans do not see.
inline void hiddenEyes(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 8);
  rows.marker();
  const uint8_t first = eyeBytes(false)[0];
  rows.repeatUpTo(rows.length() * 5 / 8, 24, [&] {
    rows.fill(1, first);
    rows.pairTo(0).fill(7, 0x33);
  });
  for (const uint64_t group : groups) rows.pairTo(group).marker();
}

/// Runs of a byte that begins an eye catcher.
inline void firstBytesOnly(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 8);
  rows.marker();
  rows.fill(rows.length() * 5 / 8 - rows.at(), eyeBytes(false)[0]).fill(1);
  for (const uint64_t group : groups) rows.pairTo(group).marker();
}

/// Pairs of the other byte order end the groups.
inline void otherOrder(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 3);
  rows.marker();
  for (const uint64_t group : groups) rows.otherPairTo(group).marker();
}

/// Elements of no size with pairs, in an open group.
inline void emptyElements(HostileRows& rows)
{
  const uint64_t root = rows.open(1);
  rows.repeatUpTo(rows.length() - 32, 32, [&] { rows.h64(0, TAV_INFO_EYE_SIZE, TAV_TYPE_BINARY, 8).pair(16); });
  rows.endOf(root);
}

/// Streams in payloads: open groups that no walk comes to.
inline void embedded(HostileRows& rows)
{
  const uint64_t first = rows.open(1);
  const uint64_t second = rows.open(2);
  rows.repeatUpTo(rows.length() - 128, 176, [&] {
    rows.h64(160, 0, TAV_TYPE_BINARY, 7);
    const uint64_t outer = rows.open();
    const uint64_t inner = rows.open();
    rows.endOf(inner).endOf(outer).fill(32);
  });
  rows.endOf(second).endOf(first);
}

/// @}
/// @name Sizes that lie
/// @{

/// Closed groups in each other, down to where no more can be open.
inline void deep(HostileRows& rows)
{
  rows.repeatUpTo(rows.length(), 16, [&] { rows.closed(rows.length() - rows.at() - 16); });
}

/// Every second child reaches beyond its parent, and what is in it beyond that.
inline void children(HostileRows& rows)
{
  rows.closed(rows.length(), 1);
  rows.repeatUpTo(rows.length(), 32, [&] {
    rows.closed(16);
    rows.closed(rows.length());
  });
}

inline void hugeSizes(HostileRows& rows)
{
  rows.repeatUpTo(rows.length(), 32, [&] {
    rows.open();
    rows.closed(uint64_t{1} << 62);
  });
}

/// A group's limit, which is its size, lies in the middle of a scan for the pair of its child.
inline void limits(HostileRows& rows)
{
  const uint64_t middle = rows.length() / 2;
  Groups groups;
  rows.repeatUpTo(rows.length() / 4, 32, [&] {
    rows.closed(middle);
    groups.push_back(rows.open());
  });
  rows.elementUpTo(middle - 8).pairTo(0);
  for (auto group = groups.rbegin(); group != groups.rend(); ++group) rows.endOf(*group);
}

/// 32-bit headers: an open group ends nowhere.
inline void narrow(HostileRows& rows)
{
  rows.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER32, 9);
  rows.repeatUpTo(rows.length() / 2, 8, [&] { rows.h32(0xFFFFFFFF, TAV_TYPE_HEADER32, 9); });
  rows.h32(0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER);
  rows.repeatUpTo(rows.length(), 16, [&] { rows.pairTo(16); });
}

/// Groups of which children with 32-bit headers are open at the same places.
inline void mixedWidths(HostileRows& rows)
{
  const uint64_t root = rows.open(1);
  rows.repeatUpTo(rows.length() - 32, 80, [&] {
    const uint64_t group = rows.at();
    rows.h64(TAV_SIZE_UNKNOWN, TAV_INFO_EYE_SIZE, TAV_TYPE_HEADER32, 9);
    rows.h32(4, TAV_TYPE_UINT32, 8).fill(8);
    rows.h32(16, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE).fill(8);
    rows.pairTo(group);
  });
  rows.endOf(root);
}

/// @}
/// @name What is printed with keys
/// @{

inline void keyed(HostileRows& rows)
{
  const Groups groups = openMany(rows, rows.length() / 3, TAV_ELM_CMN_HOST);
  for (auto group = groups.rbegin(); group != groups.rend(); ++group) rows.endOf(*group);
}

inline void keyedOverlapping(HostileRows& rows)
{
  rows.repeatUpTo(rows.length() - 16, 48, [&] {
    const uint64_t group = rows.open(TAV_ELM_CMN_HOST);
    rows.payloadPair(group);
  });
  rows.marker();
}

/// @}

inline const std::vector<HostileFamily>& hostileFamilies()
{
  static const std::vector<HostileFamily> families{
      {"nested", nestedInOrder},
      {"nestedAroundFiller", nestedAroundFiller},
      {"nestedEndedFromOutside", nestedEndedFromOutside},
      {"nestedWithoutEnds", nestedWithoutEnds},
      {"overlapping", overlapping},
      {"overlappingFar", overlappingFar},
      {"staircases", staircases},
      {"staircaseBehindFiller", staircaseBehindFiller},
      {"jumpingThereAndBack", jumpingThereAndBack},
      {"wide", wide},
      {"wideWithElements", wideWithElements},
      {"endsBeforeUnreadable", endsBeforeUnreadable},
      {"endsBeforeUnreadableFromOutside", endsBeforeUnreadableFromOutside},
      {"endsBeforeLarge", endsBeforeLarge},
      {"openInClosed", openInClosed},
      {"pairsToTheStart", pairsToTheStart},
      {"pairsToTheStartOfThree", pairsToTheStartOfThree},
      {"pairsToTheSecond", pairsToTheSecond},
      {"pairsToThemselves", pairsToThemselves},
      {"pairsToTheOneBefore", pairsToTheOneBefore},
      {"pairsForward", pairsForward},
      {"eyesOnly", eyesOnly},
      {"hiddenEyes", hiddenEyes},
      {"firstBytesOnly", firstBytesOnly},
      {"otherOrder", otherOrder},
      {"emptyElements", emptyElements},
      {"embedded", embedded},
      {"deep", deep},
      {"children", children},
      {"hugeSizes", hugeSizes},
      {"limits", limits},
      {"narrow", narrow},
      {"mixedWidths", mixedWidths},
      {"keyed", keyed},
      {"keyedOverlapping", keyedOverlapping},
  };
  return families;
}

/// A member of a family in either byte order, of exactly `length` bytes and 64 of zeros behind.
inline Bytes hostileStream(const HostileFamily& family, uint64_t length, bool swap)
{
  HostileRows rows(length, swap);
  family.build(rows);
  rows.bytes.resize(length + 64);
  return rows.bytes;
}

} // namespace test
