/// The nodes of a document that a path leads to. What is known here of paths is all that documents know of them.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "inspect/document/state.h"
#include "tav/inspect/path.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/streamWalk.hpp"

namespace tav::inspect
{

/// Where a search begins: a node and its stream's form.
struct SearchStart
{
  TAVHeader node{};
  Form form{};
};

class Search
{
public:
  /// From the roots. Throws Error for a text that is no path.
  Search(DocumentState& state, std::string_view path, OnDamage onDamage);
  /// From a node, unless the path begins at the roots.
  Search(DocumentState& state, const SearchStart& start, std::string_view path, OnDamage onDamage);

  /// The next node, in `found()`; false when there is none any more. Throws Error at damage that is not skipped.
  bool next();

  const Node& found() const { return event_.node; }
  /// The header of the group around it; header type 0 for a root.
  TAVHeader parent() const { return event_.depth == 0 ? TAVHeader{} : around_[static_cast<size_t>(event_.depth) - 1]; }
  const Form& form() const { return walk_.form(); }
  /// The node as the reader sees it. Throws Error when that cannot read it.
  tav::Node read();
  DocumentState& state() { return state_; }

private:
  Search(DocumentState& state, const SearchStart& start, bool isBelow, PathMatcher matcher, OnDamage onDamage);
  Search(DocumentState& state, const SearchStart& start, const Path& path, OnDamage onDamage);
  void passOver(const PassedOver& passed);
  std::string wholePath(const std::string& path) const;

  DocumentState& state_;
  PathMatcher matcher_;
  OnDamage onDamage_;
  StreamWalk walk_;
  uint64_t start_;
  bool isBelow_; ///< what is searched is below the walk's first node
  bool isDone_ = false;
  uint64_t seen_ = 0; ///< nodes
  Event event_{};
  std::vector<TAVHeader> around_{}; ///< the groups on the way to the event's node, by depth
};

} // namespace tav::inspect
