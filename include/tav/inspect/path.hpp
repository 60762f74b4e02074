/// @file path.hpp
/// Paths through a stream, by the grammar of tav/path/path.hpp: `/system/host[2]/hostName`. A leading slash may be left
/// out: without a node at hand a path begins at the roots.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/walker.hpp"
#include "tav/path/path.hpp"

namespace tav::inspect
{

/// The tag of an element when it stands for this id alone and can be written in a path, else "#id".
TAV_INSPECT_API std::string elementText(uint16_t elm);
TAV_INSPECT_API std::string elementText(uint16_t elm, const Dictionary& dictionary);

/// Appends it.
TAV_INSPECT_API void appendElementText(std::string& out, uint16_t elm, const Dictionary& dictionary);

/// Appends "/tag", "/tag[3]" or "/tag[@0x1a40]": the step that leads to `node` from its parent. The first of its id
/// gets no index, as the first match is what every command takes.
TAV_INSPECT_API void appendStep(std::string& path, const Node& node);
TAV_INSPECT_API void appendStep(std::string& path, const Node& node, const Dictionary& dictionary);

/// "/**/tag[@0x1a40]": a path that leads to `node` alone and is short at any depth. Without a node: "/**".
TAV_INSPECT_API std::string offsetPath(const Node& node);
TAV_INSPECT_API std::string offsetPath(const Node& node, const Dictionary& dictionary);

/// The ids that a name means: a tag, an enum name, a constant, "#12" or "12". Empty when there is none.
TAV_INSPECT_API std::vector<uint16_t> idsOf(std::string_view name);
TAV_INSPECT_API std::vector<uint16_t> idsOf(std::string_view name, const Dictionary& dictionary);

/// Up to three elements whose names are close to a misspelt one, for a hint; empty when there is none.
TAV_INSPECT_API std::string similarNames(std::string_view name);
TAV_INSPECT_API std::string similarNames(std::string_view name, const Dictionary& dictionary);

using tav::Path;
using tav::PathFault;

/// Reads a path. Throws Error with the column: Trouble::notFound for a name that no element has, with the nearest one;
/// Trouble::refused for a text that is no path.
TAV_INSPECT_API Path pathOf(std::string_view text);
TAV_INSPECT_API Path pathOf(std::string_view text, const Dictionary& dictionary);

/// What pathOf throws.
TAV_INSPECT_API Error pathError(std::string_view text, const PathFault& fault);

/// What there is to say of a path that leads to no node of a file.
TAV_INSPECT_API Problem noMatch(const Path& path, const std::string& file);

/// Follows a walk and reports which nodes a path leads to. Give it the nodeBegin of every node of the walk whose parent
/// was not skipped. What a condition asks for ahead of the walk is looked up in the source. Memory grows with the depth
/// alone: by a state for each place in the path that a node can be at.
class PathMatcher
{
public:
  /// From the place above the roots, for a walk over the whole stream.
  TAV_INSPECT_API explicit PathMatcher(const Path& path);
  /// From the node at an offset, for a walk over the whole stream, which may begin before the node: `..` leads there.
  TAV_INSPECT_API PathMatcher(const Path& path, ByteSource& source, const Form& form, uint64_t offset);
  /// From the first node that it is given, for a walk that begins there.
  TAV_INSPECT_API static PathMatcher below(const Path& path);

  /// Whether a path can lead out of what is below the node that it begins at.
  TAV_INSPECT_API static bool leavesStart(const Path& path);

  TAV_INSPECT_API ~PathMatcher();
  TAV_INSPECT_API PathMatcher(PathMatcher&&) noexcept;

  /// Whether what a path leads to depends on what comes behind a node, or is in it: on conditions, places, or parents.
  TAV_INSPECT_API static bool looksAhead(const Path& path);

  /// Whether the path leads to this node, whose nodeBegin the walk has returned last.
  TAV_INSPECT_API bool matches(const Walker& walker, const Event& event);
  /// The same without a walk, for a path that does not look ahead. The nodes come in stream order.
  TAV_INSPECT_API bool matches(const Node& node);

  /// Whether the path can lead to something below the node that was given last.
  TAV_INSPECT_API bool reachesBelow() const;

private:
  struct State;
  explicit PathMatcher(std::unique_ptr<State> state);

  std::unique_ptr<State> state_;
};

/// The nodes that a path leads to, in the order of the stream, each once, through damage as a Walker goes. Groups below
/// which there can be none are skipped by their sizes. Used by one thread.
class PathSearch
{
public:
  /// `source` outlives the search.
  TAV_INSPECT_API PathSearch(ByteSource& source, const Form& form, const Path& path);

  /// Walks on to the next node; false behind the last. `event` is its nodeBegin.
  TAV_INSPECT_API bool next(Event& event);

  /// The walk that is searched: for the node's path, or to walk on from it.
  Walker& walker() { return walker_; }

private:
  Walker walker_;
  PathMatcher matcher_;
};

} // namespace tav::inspect
