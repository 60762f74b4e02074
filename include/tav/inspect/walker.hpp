/// @file walker.hpp
/// A walk over any bytes as a stream: always forward, always to the end, every byte accounted for exactly once.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// What a piece of the file is. All but nodeEnd stand for bytes; the pieces of a file follow one another without gap or
/// overlap.
enum class What : uint8_t
{
  nodeBegin, ///< the header; the bytes are those of the header
  payload,   ///< of a data element
  extra,     ///< the two bytes behind a UTF-8 string that no size counts
  padding,   ///< up to a multiple of 8
  pair,      ///< a data element's eye/size pair, which has no header of its own
  nodeEnd,   ///< no bytes; the node ends at `offset`
  damaged,   ///< cannot be explained; see `reason`
  zeros,     ///< behind a root: to the end of the file, which may be longer than its stream, or to what is there
  skipped,   ///< the children of a group that were not asked for
  unread     ///< to the end of the file; not looked at, because the budget was used up
};

/// How a node ended.
enum class End : uint8_t
{
  closed,       ///< its size was used up
  byEndElement, ///< a group of unknown size, by its end element
  byParent,     ///< it goes on to the end of its parent
  byFile        ///< it goes on to the end of the file
};

struct Event
{
  What what = What::unread;
  uint64_t offset = 0;
  uint64_t length = 0;
  End end = End::closed;     ///< of nodeEnd
  Node node{};               ///< that the piece belongs to; of damaged, zeros and unread: nothing
  uint64_t depth = 0;        ///< of the node; of damaged: the depth that a node at this place would have
  uint32_t code = TAV_RC_OK; ///< of damaged
  std::string reason{};      ///< of damaged
};

/// Whether a node only ends a group, which is structure and no content. A group does not, whatever its id is: it is
/// a place that its children's paths lead through.
inline bool isEndNode(const Node& node)
{
  return layout::isEndElement(node.elm()) && !node.isGroup();
}

/// Whether a piece belongs to a node that only ends a group.
inline bool isEndPiece(const Event& event)
{
  return event.node.header.hdrType != 0 && isEndNode(event.node);
}

/// How a path is written. A text with a whole path for each node grows with the square of the depth.
enum class PathStyle : uint8_t
{
  whole,
  brief ///< of more than kWholeSteps steps the first and the last ones, with an ellipsis between them
};

inline constexpr uint64_t kWholeSteps = 24;
inline constexpr uint64_t kFirstSteps = 4;
inline constexpr uint64_t kLastSteps = 8;

/// Bytes of padding that are not there between a data element's payload and its pair or end. `ended` is its nodeEnd.
TAV_INSPECT_API uint64_t missingPadding(const Event& ended, const Form& form);

inline constexpr uint64_t kNoBudget = ~uint64_t{0};

/// Where a walk begins, and how much it may look for.
struct WalkStart
{
  uint64_t offset = 0;
  bool wide = true;            ///< header of the node there; only with an offset other than 0
  bool inside = false;         ///< the node is in a group that was closed: then an empty one was, too
  uint64_t budget = kNoBudget; ///< bytes to look through in damaged regions and for zeros at the end
};

class Prober;

/// Walks a stream in pre-order and cuts it into events. Memory grows with the depth alone; every step moves forward,
/// so that the walk ends whatever the bytes say.
///
/// Where bytes are no node, they are handed out as `damaged` up to the place where a node can start again: one that
/// an eye/size pair leads back to, one behind a pair, one that looks as a writer makes it and is followed by another;
/// at the latest the end of the group around them.
class Walker
{
public:
  struct Mark;
  struct State;

  /// `source` outlives the walk.
  TAV_INSPECT_API Walker(ByteSource& source, const Form& form, WalkStart start = {});
  /// A walk of its own through the group that a walk has marked: its pieces up to its nodeEnd, the same as there. It
  /// knows no more than the node's parent, so that its paths are none.
  TAV_INSPECT_API static Walker through(ByteSource& source, const Form& form, const Mark& mark);
  /// A walk that goes on where another one stands, or is believed to.
  TAV_INSPECT_API static Walker from(ByteSource& source, const Form& form, const State& state,
                                     uint64_t budget = kNoBudget);
  TAV_INSPECT_API ~Walker();
  TAV_INSPECT_API Walker(Walker&&) noexcept;

  /// The next event; false at the end of the file.
  TAV_INSPECT_API bool next(Event& event);
  /// The same for who hands in what the last call has filled, unchanged: of a node, only what is another is written.
  TAV_INSPECT_API bool goOn(Event& event);

  /// Directly after the nodeBegin of a group: hands out its children as one `skipped` piece. False, and no effect, for
  /// a group whose end is not known without walking it: it was never closed, or what is at its end, or behind it,
  /// is not what should.
  TAV_INSPECT_API bool skip();

  /// The path of the event's node, which must be the event returned last (or one of the same node before). A whole
  /// one leads back to the node as a Path: steps are tags, or ids where a tag is not unique, and the place among the
  /// siblings of that name.
  TAV_INSPECT_API std::string path(const Event& event, PathStyle style = PathStyle::whole) const;
  /// Appends it.
  TAV_INSPECT_API void appendPath(std::string& out, const Event& event, PathStyle style = PathStyle::whole) const;

  /// Directly after the nodeBegin of a group: what is needed to walk through it once more, at any time.
  TAV_INSPECT_API Mark mark() const;

  /// Whether all before `place()` was handed out, all groups that end there are ended, and a node may begin there.
  bool isBetween() const
  {
    return queueHead_ == queueCount_ && !endPending_ && (frames_.size() == 1 || position_ < frames_.back().limit);
  }
  uint64_t place() const { return position_; }
  /// Groups around it; of the file and each of them, by depth: where it begins (kNoOffset: the file), where it ends at
  /// the latest, and whether its children have 64-bit headers.
  size_t depth() const { return frames_.size() - 1; }
  uint64_t groupAt(size_t level) const { return level == 0 ? kNoOffset : frames_[level].node.offset(); }
  uint64_t limitAt(size_t level) const { return frames_[level].limit; }
  bool wideAt(size_t level) const { return frames_[level].wide; }
  /// Whether the bytes directly before it are damaged.
  bool isAfterDamage() const { return afterDamage_; }
  /// While `isBetween`: all that the rest of the walk depends on but the bytes.
  TAV_INSPECT_API State state() const;
  /// Of a walk that goes on where another one stands: whether it asked if there was damage before it in a group around
  /// its first place.
  bool leansOnDamage() const { return leans_; }
  /// And how many of the file and the groups around that place it is still in.
  size_t inherited() const { return inherited_; }

  const Form& form() const { return form_; }
  ByteSource& source() const { return source_; }
  /// UTF-8 strings so far with and without the two extra bytes, where the bytes around told.
  uint64_t stringsWithExtra() const { return withExtra_; }
  uint64_t stringsWithoutExtra() const { return withoutExtra_; }
  /// Bytes looked through in search of nodes.
  TAV_INSPECT_API uint64_t spent() const;

private:
  struct Count
  {
    uint16_t elm;
    uint64_t count;
  };
  struct Piece
  {
    What what = What::unread;
    uint64_t offset = 0;
    uint64_t length = 0;
  };
  struct Frame
  {
    Node node{};
    uint64_t limit = 0;
    size_t counts = 0;       ///< where its children's counts begin
    uint64_t counted = 0;    ///< a bit for each id that is among them: where it is not set, the id is new
    uint64_t lastDamage = 0; ///< end of the last damaged piece among its children
    bool wide = false;       ///< children have 64-bit headers
    bool open = false;       ///< an end element ends it
  };

  bool endIsSure();
  void step();
  void endGroup(End end);
  void endByLimit();
  bool endByZeros();
  bool passZeros();
  void begin(TAVHeader& header);
  void beginGroup(Node& node);
  bool holdsNodes(TAVHeader group, uint64_t limit);
  bool isStrange(const TAVHeader& header);
  bool looksUnfinished(const Node& node, const Frame& parent);
  void takeData(Node& node);
  bool extraBehind(const Node& node, uint64_t base, uint64_t limit);
  void takePair(Node& node, uint64_t limit);
  void afterEndElement(const Node& node);
  void damage(uint64_t from, uint32_t code, std::string reason);
  std::string whyNot(const TAVHeader& header, uint64_t limit) const;
  uint64_t countChild(uint16_t elm);
  void queue(What what, uint64_t offset, uint64_t length);

  ByteSource& source_;
  Form form_;
  std::unique_ptr<Prober> prober_;
  std::vector<Frame> frames_{}; ///< the first stands for the file
  uint64_t above_ = 0;          ///< levels between the file and the second frame that are not there
  std::vector<Count> counts_{};
  uint64_t position_;
  uint64_t withExtra_ = 0;
  uint64_t withoutExtra_ = 0;
  bool afterDamage_ = false;
  bool endPending_ = false; ///< the group on top was ended by its end element
  bool done_ = false;
  bool canSkip_ = false;
  bool leans_ = false;
  bool inside_ = false; ///< the walk began in a closed group
  size_t inherited_ = 0;
  std::array<Piece, 8> queue_{};
  Event shared_{}; ///< what the pieces in the queue have in common
  size_t queueHead_ = 0;
  size_t queueCount_ = 0;
};

/// A group that a walk came to, with what its bytes are judged by.
struct Walker::Mark
{
  Frame file{};
  Frame parent{}; ///< of a root: the file's
  Frame group{};
  uint64_t depth = 0;
  uint64_t position = 0;
  uint64_t budget = 0;
};

/// Where a walk stands between two nodes.
struct Walker::State
{
  std::vector<Frame> frames{}; ///< of the file and the groups around the place
  std::vector<Count> counts{};
  uint64_t above = 0;
  uint64_t position = 0;
  bool afterDamage = false;

  /// Makes this state, of a walk that began at `before` without knowing what was counted in the `shared` first frames,
  /// one of the whole walk. False where counts are not known: there were too many ids among siblings.
  TAV_INSPECT_API bool join(const State& before, size_t shared);
  /// Forgets what was counted and lost before the place.
  TAV_INSPECT_API void forget();
};

} // namespace tav::inspect
