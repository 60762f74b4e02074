/// @file tree.h
/// The tree that the page shows, level by level: a row is a child of a group, or bytes among them that are none.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

#include "tav/inspect.hpp"

namespace tav::web
{

/// The children of one group, or the roots. Rows are counted by walking over them once, as far as somebody asked; every
/// few hundred the walk's state is kept, so that any row can be read again from near it.
class Level
{
public:
  /// The roots of a file, all streams of it, each in its own form.
  Level(inspect::ByteSource& source, const inspect::Form& form);
  /// What is below a group that a walk has just begun.
  Level(const inspect::Walker& walker, const inspect::Event& group);

  /// Counts on, `most` rows at the most; false when all are counted.
  bool count(uint64_t most);

  uint64_t rows() const { return rows_; }
  bool isCounted() const { return done_; }
  /// How far counting has come in the file.
  uint64_t place() const { return place_; }

  /// Calls `take(walk, event)` for `most` rows from one on, as far as they are counted.
  template<class Take>
  void read(uint64_t from, uint64_t most, const Take& take);

  /// The row that an offset belongs to, counting on as far as needed; nothing where it lies outside.
  std::optional<uint64_t> rowOf(uint64_t offset);

  /// The level below a row; nothing for a row without children.
  std::unique_ptr<Level> below(uint64_t row);

  uint64_t group() const { return group_; } ///< where the group begins; kNoOffset: the file

private:
  struct Mark
  {
    uint64_t row = 0;
    uint64_t offset = 0;
    uint64_t streamOffset = 0;
    inspect::Form form{};
    inspect::Walker::State state{};
  };

  /// A walk over the rows from a mark on.
  class Cursor
  {
  public:
    Cursor(Level& level, const Mark& mark);
    /// The next row; false behind the last. The walk stands at its beginning until the next call.
    bool next(inspect::Event& event);
    /// Whether what follows is a place to go on from.
    std::optional<Mark> mark();
    inspect::StreamWalk& walk() { return walk_; }

  private:
    bool finishRow();
    bool isRow(const inspect::Event& event) const;

    Level& level_;
    inspect::StreamWalk walk_;
    inspect::Event last_{};
    bool inRow_ = false;
    bool done_ = false;
  };

  static constexpr uint64_t kStep = 256; ///< rows from one mark to the next
  /// Bytes between two marks that may be searched for nodes, or for the end of zeros: the tree answers while somebody
  /// waits. What is behind them is one row, which says so.
  static constexpr uint64_t kBudget = uint64_t{4} << 20U;

  const Mark& markBefore(uint64_t row) const;

  inspect::ByteSource& source_;
  uint64_t group_ = inspect::kNoOffset;
  uint64_t depth_ = 0; ///< of the rows
  std::vector<Mark> marks_{};
  std::unique_ptr<Cursor> counting_{};
  uint64_t rows_ = 0;
  uint64_t place_ = 0;
  bool done_ = false;
};

template<class Take>
void Level::read(uint64_t from, uint64_t most, const Take& take)
{
  if (from >= rows_ || most == 0)
  {
    return;
  }
  const Mark& mark = markBefore(from);
  Cursor cursor(*this, mark);
  inspect::Event event;
  const uint64_t end = from + std::min(most, rows_ - from);
  for (uint64_t row = mark.row; row < end && cursor.next(event); ++row)
  {
    if (row >= from)
    {
      take(cursor.walk(), event);
    }
  }
}

} // namespace tav::web
