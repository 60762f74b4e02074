/// Fills the rows of a table while a walk goes from node to node.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "inspect/table/automaton.h"
#include "inspect/table/chunk.h"

namespace tav::inspect
{

/// The groups around a walk's place, with what is wanted of them, and the rows so far. A walk tells of each node that
/// it comes to, data or a group, and of each group's end.
class Filling
{
public:
  static constexpr size_t kNoRow = ~size_t{0};

  struct Level
  {
    uint32_t state = Automaton::kAbove;
    uint32_t move = 0;   ///< of the child before
    size_t row = kNoRow; ///< that the group is
  };

  explicit Filling(const CompiledQuery& query)
      : query_(query), automaton_(query), levels_(1)
  {
    begin();
  }

  Automaton& automaton() { return automaton_; }
  TableChunk& chunk() { return *chunk_; }
  const Level& top() const { return levels_.back(); }

  /// The move of the next node.
  const Automaton::Move& meet(uint16_t elm)
  {
    Level& around = levels_.back();
    return automaton_.move(around.state, elm, around.move);
  }

  /// The node is data of a size that suits its type, or of any.
  [[gnu::always_inline]] void data(const Automaton::Move& move, const RawCell& value)
  {
    if (move.isRow || move.targetCount > 1) [[unlikely]]
    {
      otherData(move, value);
    }
    else if (move.targetCount == 1)
    {
      chunk_->put(move.target.column, rowAt(move.target.up), value);
    }
  }

  /// The node is a group. Returns its row.
  size_t enter(const Automaton::Move& move)
  {
    const size_t row = move.isRow ? chunk_->addRow() : kNoRow;
    open_ += move.isRow ? 1 : 0;
    levels_.push_back({move.state, 0, row});
    return row;
  }
  void leave()
  {
    open_ -= levels_.back().row != kNoRow ? 1 : 0;
    levels_.pop_back();
  }
  /// The same until so many groups are around.
  void leaveTo(size_t depth)
  {
    while (levels_.size() > depth + 1)
    {
      leave();
    }
  }

  /// Rows whose nodes have not ended yet.
  bool hasOpenRows() const { return open_ != 0; }
  /// The open rows, from the outermost inwards.
  std::vector<size_t> openRows() const;
  /// Takes the rows from the first one on away whose node has not ended, and says which that is.
  uint64_t dropOpenRows();
  /// The rows so far. What goes on is put into others.
  std::shared_ptr<TableChunk> take();
  /// Keeps the automaton small, between nodes.
  void tidy();

private:
  void begin();
  void otherData(const Automaton::Move& move, const RawCell& value);

  /// The row so many levels above the node at hand.
  size_t rowAt(uint32_t up) const { return levels_[levels_.size() - up].row; }

  const CompiledQuery& query_;
  Automaton automaton_;
  std::vector<Level> levels_; ///< the first is above the roots
  std::shared_ptr<TableChunk> chunk_{};
  uint64_t open_ = 0;
};

} // namespace tav::inspect
