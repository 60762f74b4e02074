/// @file judge.h
/// How much a node is worth that seems to stand somewhere in a damaged stream.
#pragma once

#include <cstdint>

#include "inspect/recover/place.h"
#include "inspect/recover/rebuild.h"
#include "inspect/walk/prober.h"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// How much speaks for a node, in rising order.
enum class Trust : uint8_t
{
  none,
  alone,    ///< its header looks like one
  followed, ///< and what follows it, too
  paired    ///< its eye/size pair or its end element leads back to it
};

/// What may be a node.
struct Candidate
{
  FoundData data{};
  uint64_t end = 0;       ///< of the data element, or of the group as it claims
  uint64_t pairBytes = 0; ///< of a pair that is damaged
  Trust trust = Trust::none;
  bool pairMissing = false;
  bool open = false; ///< a group whose end is not known

  const TAVHeader& header() const { return data.header; }
  bool isGroup() const { return layout::isGroup(data.header); }
};

/// Judges by the bytes and by what is known around them. It keeps nothing: the same question about the same bytes at
/// the same place has the same answer.
class Judge
{
public:
  /// `place` is where the bytes are judged from; it outlives this object and may move on between two questions.
  Judge(ByteSource& source, const Form& form, const Place& place)
      : source_(source), form_(form), place_(place), prober_(source, form, kNoOffset) {}

  /// The node at an offset, with a 64-bit header or a 32-bit one, and how much speaks for it.
  Candidate look(uint64_t offset, bool wide) const;

  /// As `look`, where the type and the element of a header, whose bytes are given, are known; false when nothing
  /// speaks for it.
  bool tryAt(const uint8_t* bytes, uint64_t offset, bool wide, Candidate& found) const;

  /// As Prober::judge, but an element that nobody knows counts where a node follows; and what claims more than there
  /// is, as all around the place where a file was cut, counts by what is in it.
  Belief beliefAt(uint64_t offset, bool wide, uint64_t limit) const;

  /// Whether there is a node at a place, in a group with these headers or behind its end.
  bool goesOn(uint64_t offset, bool wide) const;

  /// Whether a group ends at a place, or one begins whose header is lost. What nothing confirms ends a group only where
  /// nodes go on behind it: its size may be the damaged part.
  bool isBoundary(uint64_t offset) const;

  /// Whether several nodes follow one another, or few up to the end of a group.
  bool isRun(uint64_t offset, bool wide) const;

  /// Whether several nodes follow one another from a place between `from` and `to` on.
  bool holdsRun(uint64_t from, uint64_t to) const;

  /// Whether nodes follow one another from a place exactly to another one, into groups that end behind it.
  bool leadsTo(uint64_t from, bool wide, uint64_t end) const;

  /// Whether there is a node at an offset beyond doubt, with headers of either width. `bytes` are those of the header.
  bool isSure(const uint8_t* bytes, uint64_t offset, bool wide) const;

  /// Whether it is a node to be taken where one is searched for: what is left of a header, or a group that claims what
  /// no writer makes, is none.
  bool isWorthTaking(const Candidate& found, uint64_t from, uint64_t to) const;

  /// Whether something speaks for the size that a group claims.
  bool isConfirmed(const Candidate& group) const;

  /// Whether a group's header is such as no writer makes, or its claim such as few groups have.
  static bool isStrange(const Candidate& found);

  /// Where a data element ends that no reader takes, for its type or for a size that its type does not have. False when
  /// it is none.
  bool endOfStranger(const TAVHeader& header, uint64_t limit, uint64_t& end) const;

  /// Whether it is an end element that leads nowhere.
  bool isDamagedEnd(const Candidate& found, uint64_t limit) const;

  /// Whether a type is one that readers know.
  static bool isKnown(const TAVHeader& header);

  /// Whether a size can be no other for the type: a damaged header hardly has one.
  static bool isExact(const TAVHeader& header);

  /// Whether nodes may stand in a payload: bytes may be anything, a stream, too. Text holds none; where a pair is
  /// announced it has to stand behind the payload.
  static bool mayHoldNodes(const Candidate& found);

  const Prober& prober() const { return prober_; }

private:
  void lookAtGroup(Candidate& found, uint64_t limit) const;
  void lookAtData(Candidate& found, uint64_t limit) const;
  void lookBehind(Candidate& found, uint64_t base, uint64_t limit) const;
  bool lookForPair(Candidate& found, uint64_t base, uint64_t limit) const;
  bool isCutAt(uint64_t offset, bool wide) const;
  bool isBetter(uint64_t with, uint64_t without, bool wide, uint64_t limit) const;
  bool isOfOtherWidth(uint64_t offset, bool wide, uint64_t limit) const;
  bool isPlausible(uint64_t offset, bool wide, uint64_t limit) const;
  Belief beliefBehind(uint64_t end, bool wide, uint64_t limit) const;
  static bool isOdd(const TAVHeader& group);
  bool isMovedRoot(const Candidate& found) const;
  bool isMovedHeader(const TAVHeader& group) const;
  bool isTail(const Candidate& found, uint64_t from) const;

  ByteSource& source_;
  Form form_;
  const Place& place_;
  Prober prober_;
};

} // namespace tav::inspect
