/// @file plan.hpp
/// Cuts a file into parts that are walked one by one, by several threads or on several machines, with the same outcome
/// as one walk over the whole.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// A group around a part.
struct PartGroup
{
  uint64_t offset = 0;
  uint64_t end = 0;     ///< of its children, at the latest
  uint32_t flags = 0;   ///< NodeFlag bits
  bool wide = true;     ///< it has a 64-bit header
  bool damaged = false; ///< there was damage among its children before the part

  bool operator==(const PartGroup&) const = default;
};

/// A part of a file: what a walk gives out from `offset` on until it stands at `end` or behind it. It begins with a
/// node, or where a stream ends. All that a walk has to know to begin there is in it, but for the bytes.
struct Part
{
  uint64_t offset = 0;
  uint64_t size = 0;
  Form form{};                          ///< of the stream that it begins in
  uint64_t streamOffset = 0;            ///< where the walk in this form began
  bool wide = true;                     ///< the next root is expected to have a 64-bit header
  bool guessed = false;                 ///< its bytes look like a seam; no sizes lead there from the start
  bool afterDamage = false;             ///< there is damage directly before it
  std::vector<PartGroup> around{};      ///< from the root inwards; empty: between streams
  std::optional<uint64_t> firstChild{}; ///< children of the innermost group before it, where that is known

  uint64_t end() const { return offset + size; }
};

/// What a walk through a part has found.
struct PartEnd
{
  /// Where the walk stands: as the following part has to begin. Its size is 0.
  Part behind{};
  bool leans = false; ///< it asked whether there was damage before it in a group that is around the part
  size_t shared = 0;  ///< how many of the groups around the part are around `behind`, too
};

struct PlanOptions
{
  uint64_t targetBytes = 0; ///< about how long a part is; 0: from 1 to 16 MiB, by the file's size
  size_t maxParts = 0;      ///< parts are longer where there would be more; 0: any number
  size_t maxDepth = 64;     ///< groups around a part, at most; 0: parts begin with roots. No more than 64
  FormChoice form{};        ///< what is known of the form; the rest is found out
};

/// Cuts a file with one stream or several in it, each of which is read in its own form, as Document does. Groups are
/// stepped over by their sizes; in long runs of small nodes a place is looked for that looks like a node of the same
/// group. What is read does not grow with the number of nodes. Such a place can be a mistake, also one that somebody
/// made: a part that begins at one is no part of the file, and `mendParts` finds it out. The parts depend on the bytes
/// and the options alone. An empty file and one that is no stream is one part. Throws Error where the file cannot be
/// read.
TAV_INSPECT_API std::vector<Part> plan(ByteSource& source, const PlanOptions& options = {});

/// The same of a walk in one form, as Walker, Checker and Schema go: streams in other forms are damage to it.
TAV_INSPECT_API std::vector<Part> plan(ByteSource& source, const Form& form, const PlanOptions& options = {});

/// Whether a walk goes on in streams of other forms.
enum class Streams : uint8_t
{
  everyForm, ///< as Document
  oneForm    ///< as Walker
};

class StreamWalk;

/// A walk through one part. What it gives out is what one walk over the whole file gives out there, if the part begins
/// where that walk comes by. Places among siblings (`ordinal`, and numbers in paths) are counted from the part's start
/// on in the groups around it.
class PartWalk
{
public:
  /// `source` outlives the walk. `passed` is told of damage. Throws Error for a part that cannot be one of this file.
  TAV_INSPECT_API PartWalk(ByteSource& source, const Part& part, DamageWatch::Sink passed = {},
                           Streams streams = Streams::everyForm);
  TAV_INSPECT_API ~PartWalk();
  TAV_INSPECT_API PartWalk(PartWalk&&) noexcept;

  /// The groups around the part as the walk over the whole file has given them out, from the root inwards: for a
  /// PathMatcher, which has to know them.
  const std::vector<Event>& around() const { return around_; }

  /// The next event; false at the part's end.
  TAV_INSPECT_API bool next(Event& event);
  /// As Walker::skip.
  TAV_INSPECT_API bool skip();

  TAV_INSPECT_API const Walker& walker() const;
  TAV_INSPECT_API const Form& form() const;

  /// When `next` has returned false: where the part ended.
  TAV_INSPECT_API PartEnd end() const;

private:
  uint64_t end_ = 0;
  std::unique_ptr<StreamWalk> walk_;
  std::vector<Event> around_{};
};

/// Walks through a part and calls with each event. Throws Error, and what the callbacks throw.
TAV_INSPECT_API PartEnd walkPart(ByteSource& source, const Part& part,
                                 const std::function<void(const Walker&, const Event&)>& seen,
                                 Streams streams = Streams::everyForm);

/// Whether a part begins where a walk stands, and in the same groups. Damage before it is left out: see PartEnd::leans.
TAV_INSPECT_API bool isSeam(const Part& behind, const Part& next);

/// Where the one walk over the file stands when it has come through a part, which began where that walk came by:
/// `end.behind`, and what it knows of damage before the part. Its size is 0.
TAV_INSPECT_API Part behindOf(const Part& part, const PartEnd& end);

/// Whether what was found in a part is what the one walk finds there, which stands at `behind`. `end` is the part's.
TAV_INSPECT_API bool holdsBehind(const Part& behind, const Part& part, const PartEnd& end);

/// Finds the first part that does not begin as the one before it ended, and puts it right: it begins there, and has to
/// be walked through once more. Returns its place among the parts; nothing when all parts together are the file, and
/// what was found in them, one after another, is what one walk finds. `ends` are those of the parts.
TAV_INSPECT_API std::optional<size_t> mendParts(std::span<Part> parts, std::span<const PartEnd> ends);

/// A part as plain numbers, to be sent elsewhere, and back. partOf throws Error for numbers that are no part.
TAV_INSPECT_API std::vector<uint64_t> numbersOf(const Part& part);
TAV_INSPECT_API Part partOf(std::span<const uint64_t> numbers);

} // namespace tav::inspect
