/// @file path.h
/// Paths through a stream: `/system/host[2]/hostName`.
///
///   step   = name | #id | * | **           name: an element's tag, enum name or constant
///   index  = [n]                           the nth of those that the step finds under the same parent, from 1
///          | [@offset]                     the one at this offset; 0x for hexadecimal
///   path   = / | / { step [index] / }
///
/// `*` is any one node, `**` any number of levels; elements that only end a group are meant where they are named. The
/// leading slash may be left out. A slash alone leads to the roots.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tools/report.h"
#include "tools/walker.h"

namespace tav::tool
{

/// The tag of an element when it stands for this id alone and can be written in a path, else "#id".
std::string elementText(uint16_t elm);

/// Appends "/tag", "/tag[3]" or "/tag[@0x1a40]": the step that leads to `node` from its parent. The first of its id
/// gets no index, as the first match is what every command takes.
void appendStep(std::string& path, const Node& node);

/// "/**/tag[@0x1a40]": a path that leads to `node` alone and is short at any depth. Without a node: "/**".
std::string offsetPath(const Node& node);

/// The ids that a name means: a tag, an enum name, a constant, "#12" or "12". Empty when there is none.
std::vector<uint16_t> idsOf(std::string_view name);

/// Up to three elements whose names are close to a misspelt one, for a hint; empty when there is none.
std::string similarNames(std::string_view name);

class Path
{
public:
  /// Throws Failure, with the place of the error, when the text is no path. A name that no element has is none of
  /// that: such a path leads to no node of any stream.
  explicit Path(std::string_view text);

  struct Step
  {
    enum class Kind : uint8_t
    {
      ids,      ///< one of `ids`
      any,      ///< *
      anyLevels ///< **
    };
    Kind kind = Kind::ids;
    std::vector<uint16_t> ids{};
    uint64_t ordinal = 0;        ///< 0: any
    uint64_t offset = kNoOffset; ///< kNoOffset: any
  };

  const std::string& text() const { return text_; }
  const std::vector<Step>& steps() const { return steps_; }

  /// Throws Failure when a step has a name that no element has.
  void requireNames() const;

  /// What to report when the path has led to no node of a file.
  Problem noMatch(const std::string& file) const;

private:
  void addStep(std::string_view text);
  void addIndex(std::string_view index, Step& step) const;
  [[noreturn]] void fail(const std::string& sentence, std::string hint = {}) const;

  std::string text_;
  std::vector<Step> steps_{};
  std::string unknown_{}; ///< the first name that no element has, as a sentence; empty: none
  std::string hint_{};    ///< what may have been meant by it
};

/// Follows a walk and tells which nodes a path leads to. Give it the nodeBegin of every node of the walk whose parent
/// was not skipped. Memory grows with the depth times the `**` of the path.
class PathMatcher
{
public:
  explicit PathMatcher(const Path& path);

  /// Whether the path leads to this node.
  bool matches(const Node& node);

  /// Whether the path can lead to something below the node that was given last.
  bool reachesBelow() const { return starts_.back() < states_.size(); }

private:
  void enter(size_t state, bool& match);

  const std::vector<Path::Step>& steps_;
  std::vector<size_t> states_{};   ///< positions in the path, level by level
  std::vector<uint64_t> counts_{}; ///< what the step at each of them has found under the present parent
  std::vector<size_t> starts_{};   ///< where a level's positions begin
};

} // namespace tav::tool
