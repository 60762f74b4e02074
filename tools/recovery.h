/// @file recovery.h
/// Finds what is whole in a damaged stream, forward from node to node and back from eye catchers.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "tools/endings.h"
#include "tools/prober.h"
#include "tools/rebuild.h"

namespace tav::tool
{

/// Bytes of the file that did not come back.
struct Loss
{
  uint64_t offset = 0;
  uint64_t length = 0;
  std::string reason{};
};

/// A node that came back from beside lost bytes, of which something says that it may be none.
struct Doubt
{
  uint64_t offset = 0;
  uint64_t length = 0; ///< of its header and its payload; of a group: its header
  std::string reason{};
};

/// Where every byte of the file went, and what was done.
struct RecoveryTotals
{
  uint64_t kept = 0; ///< of nodes that came back, their paddings, pairs and end elements, and zeros behind the stream
  uint64_t lost = 0;
  uint64_t unread = 0; ///< behind the place where searching was given up
  uint64_t zeros = 0;  ///< of the kept: behind the stream
  uint64_t nodes = 0;  ///< that came back, end elements not counted
  uint64_t ends = 0;   ///< end elements that were written
  uint64_t losses = 0; ///< runs of lost bytes
  uint64_t doubts = 0; ///< nodes that may be none
  uint64_t closed = 0; ///< groups that were open or whose size was wrong
  uint64_t made = 0;   ///< groups made for what has lost its own
  uint64_t pairs = 0;  ///< pairs and end elements that were missing or damaged
};

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
  /// Whom to tell. Either may be empty.
  struct Sinks
  {
    std::function<void(const Loss&)> loss{};
    std::function<void(const Doubt&)> doubt{};
  };

  /// `search`: bytes that may be searched for nodes.
  Recovery(ByteSource& source, const Form& form, Rebuilder& rebuilder, uint64_t search, Sinks sinks);

  /// Goes on by one node or one gap; false at the end, when all groups are closed.
  bool step();

  uint64_t position() const { return position_; }
  RecoveryTotals totals() const;

private:
  /// How much speaks for a node.
  enum class Trust : uint8_t
  {
    none,
    alone,    ///< its header looks like one
    followed, ///< and what follows it, too
    paired    ///< its eye/size pair or its end element leads back to it
  };
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
  struct Frame
  {
    uint64_t start = 0;
    uint64_t limit = 0;
    bool wide = false;   ///< children have 64-bit headers
    bool sure = false;   ///< the limit is confirmed
    bool fixed = false;  ///< a root: what has other headers than its children does not end it
    bool open = false;   ///< ends where what is around ends
    size_t sureAt = 0;   ///< the innermost frame from here up whose limit is confirmed
    size_t heldAt = 0;   ///< and the one that decides whether 64-bit headers can stand here
    bool hidden = false; ///< too deep: its children go to the group around
    uint64_t claim = 0;  ///< where its size says that it ends, when only what stands there speaks against it; else 0
  };

  static bool isKnown(const TAVHeader& header);
  Candidate look(uint64_t offset, bool wide);
  void lookAtGroup(Candidate& found, uint64_t limit);
  void lookAtData(Candidate& found, uint64_t limit);
  bool isCutAt(uint64_t offset, bool wide);
  bool lookForPair(Candidate& found, uint64_t base, uint64_t limit);
  bool isBetter(uint64_t with, uint64_t without, bool wide, uint64_t limit);
  Belief judge(uint64_t offset, bool wide, uint64_t limit);
  bool isPlausible(uint64_t offset, bool wide, uint64_t limit);
  bool isBoundary(uint64_t offset);
  bool holdsRun(uint64_t from, uint64_t to);
  bool isConfirmed(const Candidate& group);
  Belief beliefBehind(uint64_t end, bool wide, uint64_t limit);
  bool goesOn(uint64_t offset, bool wide);
  static bool isExact(const TAVHeader& header);
  static bool isOdd(const TAVHeader& group);
  static bool isStrange(const Candidate& found);
  bool isMovedRoot(const Candidate& found);
  bool isSure(const uint8_t* bytes, uint64_t offset, bool wide);
  static bool mayHoldNodes(const Candidate& found);
  bool isContradicted(const Candidate& found);
  bool isRun(uint64_t offset, bool wide);
  bool believe(Candidate& found, bool onWay);
  bool endOfStranger(const TAVHeader& header, uint64_t limit, uint64_t& end);
  bool isStranger(const TAVHeader& header, uint64_t& end);
  bool isTail(const Candidate& found, uint64_t from);
  bool isDamagedEnd(const Candidate& found, uint64_t limit);
  uint64_t firstSure(uint64_t from, uint64_t to, bool wide);
  bool leadsTo(uint64_t from, bool wide, uint64_t end);

  void closeFinished();
  bool wouldReadAsOpen() const;
  void keepOpen();
  bool takeEnding();
  bool takeEnd(uint64_t offset, bool wide);
  bool enterEnding();
  void trimPair(Candidate& found);
  void contradict(uint64_t end);
  void take(Candidate found);
  void takeGroup(const Candidate& found);
  void keepHeader(const TAVHeader& header);
  void loseNested(uint64_t to);
  bool loseStranger(const TAVHeader& header);
  std::string reasonOfEnd(uint64_t offset, bool wide);
  std::string reasonAt(uint64_t offset);
  void gap();
  bool findNext(uint64_t from, uint64_t to, Candidate& found);
  bool tryAt(const uint8_t* bytes, uint64_t offset, bool wide, Candidate& found);
  bool endsTooSoon(uint64_t end);
  bool mayEndInZeros() const;
  bool endByZeros();
  void lose(uint64_t to, std::string reason);
  void settleClaim();
  bool isMostlyEyes(const TAVHeader& data);
  void doubt(const TAVHeader& node);
  void openGroup(const Frame& frame, const TAVHeader& header);
  void closeGroup();
  void makeParent(bool wide);
  bool canHold(bool wide) const;
  void fit(bool wide, bool isRoot);
  void index(uint64_t from);
  uint64_t sureLimit() const;
  Ending* nextEnding();

  ByteSource& source_;
  Form form_;
  Rebuilder& rebuilder_;
  Prober prober_;
  Sinks sinks_;
  uint64_t search_;
  uint64_t spent_ = 0;
  RecoveryTotals totals_{};
  std::vector<Frame> frames_{}; ///< the first stands for the file
  std::vector<Ending> endings_{};
  size_t ending_ = 0;
  bool indexed_ = false;
  bool damaged_ = false; ///< bytes directly before the position are lost
  uint64_t position_ = 0;
  uint64_t keptTo_ = 0;   ///< behind the last node that came back
  TAVHeader last_{};      ///< that node,
  bool lastTold_ = true;  ///< and whether nothing more is to be said of it
  uint64_t sureFrom_ = 0; ///< the first node beyond doubt at or behind this place is at sureAt_
  uint64_t sureAt_ = 0;
  bool sureFound_ = false;
  bool sureWide_ = false; ///< as seen from nodes with these headers
};

} // namespace tav::tool
