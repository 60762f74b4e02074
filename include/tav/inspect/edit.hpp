/// @file edit.hpp
/// Gives nodes of a stream other values: all that is asked for, or nothing.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <span>
#include <string>

#include "tav/inspect/api.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/scratch.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// A value for all nodes that a path leads to, as `plainText` writes it: texts as they are, numbers in decimal, dates,
/// arrays as "[1 2 3]", other bytes in hexadecimal.
struct Assignment
{
  Path path;
  std::string value{};
};

struct EditOptions
{
  std::optional<uint16_t> type{};      ///< that all these nodes get; else each keeps its own
  ScratchMaker makeFile = makeScratch; ///< for the places of the nodes
  /// Is told of every event while the nodes are looked for.
  std::function<void(const Walker&, const Event&)> seen{};
};

/// Finds the nodes and judges their new values first; only then anything is written. Used by one thread.
class Editor
{
public:
  /// Walks the stream. Of paths that lead to the same node the last counts. `source` outlives this object, the
  /// assignments and the options need not. Throws Error, where a path leads to no node (Trouble::notFound), to a group
  /// or to what only ends one, or where a value is none of the node's type.
  TAV_INSPECT_API Editor(ByteSource& source, const Form& form, std::span<const Assignment> assignments,
                         const EditOptions& options = {});
  TAV_INSPECT_API ~Editor();
  Editor(const Editor&) = delete;
  Editor& operator=(const Editor&) = delete;

  /// Nodes that get another value or another type, and those that have theirs already.
  TAV_INSPECT_API uint64_t changed() const;
  TAV_INSPECT_API uint64_t unchanged() const;

  /// Throws Error, naming the first node, unless every payload keeps its size.
  TAV_INSPECT_API void requireSameSizes() const;

  /// Writes the changed nodes into the file of the source, which is open for reading and writing. All sizes must stay.
  /// Throws Error, before anything is written, where the nodes are not what they were when they were found. The source
  /// may be closed by now.
  TAV_INSPECT_API void writeInto(KORHFile& file);

  /// The same of the file with this name, which nobody else may have locked, and which is on the device behind it.
  /// Throws Error, naming the file.
  TAV_INSPECT_API void writeInPlace(const std::string& path);

  /// Appends the whole stream with the new values. Sizes of the groups around them, and the distances in the pairs
  /// behind them, follow; every other byte stays as it is. Throws Error.
  TAV_INSPECT_API void writeNew(PatchFile& out, const std::function<void(uint64_t)>& progress = {});

private:
  class Work;
  std::unique_ptr<Work> work_;
};

} // namespace tav::inspect
