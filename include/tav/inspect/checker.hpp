/// @file checker.hpp
/// Follows a walk and says what is wrong.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/rules.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

struct Finding
{
  RuleId rule = RuleId::damaged;
  uint64_t offset = 0;
  uint64_t length = 0; ///< bytes concerned; 0: no run of bytes is meant
  std::string path{};
  std::string sentence{};   ///< starts with a lower-case letter, no full stop
  bool otherStream = false; ///< a stream in another form seems to begin there
};

/// Walks a stream once, in memory that grows with the depth alone. Findings come in the order in which they are
/// certain: what is known of a group only at its end comes there.
class Checker
{
public:
  using Sink = std::function<void(const Finding&)>;

  /// `wanted` says which rules to look for: payloads are read only for rules about strings.
  /// `style` is that of the findings' paths; whole ones are given down to 4,000 levels.
  TAV_INSPECT_API Checker(ByteSource& source, const Form& form, std::function<bool(RuleId)> wanted, Sink sink,
                          PathStyle style = PathStyle::whole);
  /// Goes on where a walk stands, before which `isPlain`. `rootEnded`: a root has ended before. Without a sink,
  /// findings are counted alone.
  TAV_INSPECT_API Checker(ByteSource& source, const Form& form, std::function<bool(RuleId)> wanted, Sink sink,
                          PathStyle style, const Walker::State& state, bool rootEnded);

  /// Goes on by one piece of the file; false at its end.
  TAV_INSPECT_API bool step();

  uint64_t position() const { return event_.offset + event_.length; }
  /// End elements are structure: they are counted apart.
  uint64_t nodes() const { return nodes_; }
  uint64_t endElements() const { return endElements_; }
  uint64_t findings() const { return findings_; }
  uint64_t damages() const { return damages_; } ///< runs of damaged bytes
  bool rootEnded() const { return rootEnded_; }
  const Walker& walker() const { return walker_; }
  /// Whether what is said of the rest of the stream depends on the walk and on `rootEnded` alone.
  TAV_INSPECT_API bool isPlain() const;

private:
  struct Group
  {
    Node node{};
    uint64_t claimedEnd = kNoOffset; ///< where it says that it ends; kNoOffset: it does not say
    uint64_t cutClaim = kNoOffset;   ///< the claim of the innermost group from here up that the file's end cut
    uint64_t afterEnd = 0;           ///< the first thing behind its end element
    uint64_t lastClaim = 0;          ///< of a child that its end element ended before its size was used up
    uint64_t lastClaimer = 0;        ///< where that child begins
    uint64_t lastClaimEnd = 0;       ///< and where it ended
    std::string lastClaimPath{};
    bool wide = false;
    bool ended = false;       ///< its end element was seen
    bool damagedTail = false; ///< damage since the last child
  };

  void enter(const Node& node);
  void found(RuleId rule, uint64_t offset, uint64_t length, std::string sentence, bool otherStream = false);
  template<class Say>
  void foundThat(RuleId rule, uint64_t length, const Say& say);
  void beginNode();
  void beginGroup();
  void endNode();
  void endGroup();
  void checkHeader();
  std::string path() const;
  void tellOpen(bool open);
  void checkOverrun(const Group& group);
  void checkEndElement();
  void checkDataEnd();
  void tellPadding(uint64_t missing);
  void checkDataPair();
  void checkPair(uint64_t offset, uint64_t expected, bool eitherOrder);
  void checkText();
  void checkClaim(uint64_t offset, bool boundary);
  void tellClaim(Group& group, uint64_t offset);
  void checkPadding();
  void checkDamage();
  bool checkCutHeader();
  void checkZeros();
  void placeIsTaken();

  ByteSource& source_;
  Form form_;
  std::function<bool(RuleId)> wanted_;
  Sink sink_;
  PathStyle style_;
  Walker walker_;
  Event event_{};
  std::vector<Group> groups_{}; ///< the first stands for the file
  uint64_t nodes_ = 0;
  uint64_t endElements_ = 0;
  uint64_t findings_ = 0;
  uint64_t damages_ = 0;
  uint64_t paddingCut_ = 0; ///< bytes of padding that the last data element lacks at the end of the file
  uint64_t deepOpen_ = 0;   ///< groups below the deepest level that is told of that were never closed
  bool rootEnded_ = false;
  bool deepTold_ = false;
};

struct CheckOptions
{
  std::function<bool(RuleId)> wanted{}; ///< which rules to look for; nothing: all that are no notes
  Checker::Sink sink{};
  PathStyle style = PathStyle::whole;       ///< of the findings' paths
  std::function<void(uint64_t)> progress{}; ///< is told by offset how far the work is
  unsigned threads = 1;                     ///< that work on it; the caller's is one of them
  uint64_t partBytes = 0;                   ///< how long the parts are that threads take; 0: by the file's size
};

struct CheckTotals
{
  uint64_t nodes = 0;
  uint64_t endElements = 0;
};

/// Checks a whole file in one form, as a Checker does. The callbacks are called by the caller's thread, with findings
/// in the same order for any number of threads. Of a file of less than 4 MiB, and where it is full of findings, one
/// thread does all the work. Throws Error, and what the callbacks throw.
TAV_INSPECT_API CheckTotals check(ByteSource& source, const Form& form, const CheckOptions& options);

} // namespace tav::inspect
