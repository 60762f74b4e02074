/// @file ledger.h
/// Where every byte of a damaged stream went, and what is to be said of it.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "inspect/recover/place.h"
#include "tav/inspect/recover.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// Accounts for the bytes in their order. Whatever moves the place of a recovery goes through it.
class Ledger
{
public:
  /// Functions that are called with what is found. Either may be empty.
  struct Sinks
  {
    std::function<void(const Loss&)> loss{};
    std::function<void(const Doubt&)> doubt{};
  };

  Ledger(ByteSource& source, Place& place, Sinks sinks)
      : source_(source), place_(place), sinks_(std::move(sinks)) {}

  /// The bytes up to there came back.
  void keep(uint64_t to);

  /// The bytes up to there are lost.
  void lose(uint64_t to, std::string reason);

  /// The bytes up to there are zeros behind a stream, which count as kept.
  void keepZeros(uint64_t to);

  /// The rest was not searched.
  void leaveUnread();

  /// A node at the place comes back. Beside lost bytes it may be doubtful.
  void comesBack(const TAVHeader& node);

  /// All that came back ends here.
  void cameBackTo(uint64_t end) { keptTo_ = end; }
  uint64_t keptTo() const { return keptTo_; }

  /// Whether bytes directly before the place are lost, as far as that puts what follows in doubt.
  bool isDamaged() const { return damaged_; }
  void setDamaged(bool damaged) { damaged_ = damaged; }

  const RecoveryTotals& totals() const { return totals_; }
  /// For what is counted by others: nodes, groups, pairs.
  RecoveryTotals& totals() { return totals_; }

private:
  void doubt(const TAVHeader& node);
  bool isMostlyEyes(const TAVHeader& data);

  ByteSource& source_;
  Place& place_;
  Sinks sinks_;
  RecoveryTotals totals_{};
  bool damaged_ = false;
  uint64_t keptTo_ = 0;  ///< behind the last node that came back
  TAVHeader last_{};     ///< that node,
  bool lastTold_ = true; ///< and whether nothing more is to be said of it
};

/// What is to be said of an end element that leads to a place before the file; nothing of other bytes.
std::string reasonOfEnd(ByteSource& source, const Form& form, uint64_t offset, bool wide);

/// Why bytes are lost in which no node is whole.
std::string reasonAt(ByteSource& source, const Form& form, uint64_t offset);

} // namespace tav::inspect
