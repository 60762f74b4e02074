/// @file nesting.h
/// The groups that are open, both around the place that a recovery has reached and in what it writes.
#pragma once

#include <cstdint>

#include "inspect/recover/ledger.h"
#include "inspect/recover/place.h"
#include "inspect/recover/rebuild.h"

namespace tav::inspect
{

inline constexpr uint64_t kMostNested = 4000; ///< groups that the library follows

/// The header of a group that is made for what has lost its own.
TAVHeader madeHeader(bool wideHeader, bool wideChildren, bool eye);

/// Opens and closes groups in both, and counts those that were open or whose size was wrong, and those that are made.
class Nesting
{
public:
  Nesting(const Form& form, Place& place, Rebuilder& rebuilder, Ledger& ledger)
      : form_(form), place_(place), rebuilder_(rebuilder), ledger_(ledger) {}

  /// Opens a group at the place. One that is too deep is hidden.
  void open(const OpenGroup& group, const TAVHeader& header);

  /// Whether a group with this header can be neither opened nor hidden: the group around cannot hold its nodes.
  bool isTooDeep(bool wideChildren) const;

  void close();
  void closeAll();
  void closeFinished();

  /// Closes all groups up to the one at `at`, whose end element ends at `end`.
  void closeTo(size_t at, uint64_t end);

  /// Closes the innermost group, which was open, at a mark that ends it.
  void closeOpen();

  /// Sees to it that the innermost group takes nodes with this header.
  void fit(bool wide, bool isRoot);

  /// Counts the innermost group, which was open or whose size was wrong.
  void countClosed() { ledger_.totals().closed += place_.top().count(); }

private:
  bool wouldReadAsOpen() const;
  void keepOpen();
  void settleClaim();
  void makeParent(bool wide);

  Form form_;
  Place& place_;
  Rebuilder& rebuilder_;
  Ledger& ledger_;
};

} // namespace tav::inspect
