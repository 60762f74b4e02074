/// @file following.h
/// What --follow does in the commands that take it.
#pragma once

#include <functional>
#include <string>

#include "tav/inspect/follow.hpp"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

/// A node that a command prints, from a walk or from a file that is followed.
struct FoundNode
{
  ByteSource& source;
  const Form& form;
  const Node& node;
  std::function<std::string(PathStyle)> path;
};

FoundNode foundIn(const Walker& walker, const Event& event);
FoundNode foundIn(const Arrival& arrival);

/// Option --follow.
OptionSpec followOption();

/// Follows the file that the command names until it is interrupted. `told` has what the command does with nodes; what
/// becomes of the file, and damage, is told here, and everything printed to `out` is handed over a node at a time.
/// kFindings where damage was passed over, else kFine. Throws Failure for options that have no meaning here.
Status followFile(const Invocation& invocation, inspect::FollowTold told, Output& out);

} // namespace tav::tool
