/// Snapshots of this machine one after another, at the end of a file.
#pragma once

#include <functional>
#include <span>

#include "tav/tav.hpp"
#include "tools/shell/options.h"

namespace tav::tool
{

/// What is below the root of one snapshot, in the form that the invocation asks for.
using SnapshotMaker = std::function<void(const std::function<void(std::span<const std::byte>)>&)>;

/// The form that the invocation asks for.
struct SnapshotForm
{
  StreamOptions stream;
  bool pairs = false;
};

/// Runs `tav snapshot --append`: a root for each snapshot, with its time. Each is on the device before the next one is
/// waited for. Throws Failure.
int appendSnapshots(const Invocation& invocation, const SnapshotForm& form, const SnapshotMaker& make);

/// Throws Failure for options of a series without --append.
void refuseSeries(const Invocation& invocation);

} // namespace tav::tool
