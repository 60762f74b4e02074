/// @file recovery.h
/// Finds what is whole in a damaged stream, forward from node to node and back from eye catchers, and writes it.
#pragma once

#include <cstdint>
#include <string>

#include "inspect/recover/judge.h"
#include "inspect/recover/ledger.h"
#include "inspect/recover/nesting.h"
#include "inspect/recover/place.h"
#include "inspect/recover/rebuild.h"
#include "inspect/recover/search.h"
#include "inspect/walk/prober.h"
#include "tav/inspect/recover.hpp"

namespace tav::inspect
{

/// Goes through the file once; a second time, for eye catchers alone, from the first damage on. What is found goes to
/// the rebuilder at once, so that memory grows with the depth, and with the groups whose headers are lost.
///
/// Nodes follow one another without gaps, so a node is believed when it lies where one has to be, and what follows it
/// is a node, too. A group's size is believed when its end element confirms it, else until a child contradicts it.
/// Behind damage a node is one that its pair leads back to, one that is followed by another, or one that looks like
/// nothing else; in that order.
class Recovery
{
public:
  using Sinks = Ledger::Sinks;

  /// `search`: bytes that may be searched for nodes.
  /// `threads` search for eye catchers.
  Recovery(ByteSource& source, const Form& form, Rebuilder& rebuilder, uint64_t search, Sinks sinks,
           unsigned threads = 1);

  /// Refers to its own parts.
  Recovery(const Recovery&) = delete;
  Recovery& operator=(const Recovery&) = delete;

  /// Goes on by one node or one gap; false at the end, when all groups are closed.
  bool step();

  uint64_t position() const { return place_.position(); }
  RecoveryTotals totals() const;

private:
  /// What was entered by an end element that leads back to the place.
  enum class Entered : uint8_t
  {
    none,
    whole,   ///< a group whose header is right but for its size
    headless ///< a group whose header is lost; its bytes are searched, too: the distance can be the damaged part
  };

  Footing footing() const { return ledger_.isDamaged() ? Footing::damaged : Footing::sound; }
  void index(uint64_t from);
  bool takeEnding();
  bool takeEnd(uint64_t offset, bool wide);
  bool takeDamagedEnd();
  bool enterLost();
  Entered enterEnding();
  void trimPair(Candidate& found);
  void take(Candidate found);
  void takeGroup(const Candidate& found);
  void keepHeader(const TAVHeader& header);
  void loseNested(uint64_t to);
  bool loseStranger(const TAVHeader& header);
  void gap();
  uint64_t endOfGap() const;
  void loseGap(uint64_t to);
  bool endsTooSoon(const TAVHeader& root, uint64_t end);
  bool mayEndInZeros() const;
  bool endByZeros();
  bool passZeros();

  ByteSource& source_;
  Form form_;
  unsigned threads_;
  Rebuilder& rebuilder_;
  Prober prober_;
  Place place_;
  Judge judge_;
  RecoverySearch search_;
  Ledger ledger_;
  Nesting nesting_;
  bool indexed_ = false;
};

} // namespace tav::inspect
