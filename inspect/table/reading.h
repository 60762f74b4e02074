/// Fills rows on a walk through a source, or through a part of one.
#pragma once

#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <vector>

#include "inspect/path/walkedTree.h"
#include "inspect/plan/partState.h"
#include "inspect/table/filling.h"
#include "inspect/walk/exactWalk.h"
#include "tav/inspect/streamWalk.hpp"
#include "tav/inspect/table.hpp"

namespace tav::inspect
{

/// Bytes of a group that is read at once, by the exact steps: of one that is longer than a part, several threads read.
inline uint64_t mostAtOnce(const TableOptions& options)
{
  constexpr uint64_t most = uint64_t{16} * 1024 * 1024;
  return options.partBytes == 0 ? most : std::min(most, options.partBytes);
}

/// A walk that goes from node to node with the paths of a table, and the rows that it fills.
class TableReading
{
public:
  TableReading(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options);
  /// A walk that goes on where another one stands, or is believed to, whose first stream has this form. Its first rows
  /// are those of the groups around the place that have one.
  TableReading(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options,
               const Walker::State& state, uint64_t streamOffset = 0);
  TableReading(const TableReading&) = delete;
  TableReading& operator=(const TableReading&) = delete;

  /// Goes on by an event; false at the end, or at damage where that stops reading.
  bool step();

  size_t rows() { return filling_.chunk().rows(); }
  bool hasOpenRows() const { return filling_.hasOpenRows(); }
  /// The rows whose nodes have not ended, from the outermost inwards.
  std::vector<size_t> openRows() const { return filling_.openRows(); }
  /// The rows so far.
  std::shared_ptr<TableChunk> take();

  const std::optional<Problem>& stopped() const { return stopped_; }
  /// When it has stopped: the first row whose node had not ended. It was taken away with all behind it.
  uint64_t dropped() const { return dropped_; }

  /// Reads the rows that begin in a part of the file and no others, by the constructor that is given its state. Throws
  /// Error for a part in which they cannot be told from those before and behind it.
  void confineTo(const Part& part, const Walker::State& state);
  /// Of a part, behind its last event.
  PartEnd end() const { return endOf(walk_); }

  const Walker& walker() const { return walk_.walker(); }
  /// Whether it goes on in a stream of another form than the one in which it began.
  bool hasChangedForm() const { return walk_.streamOffset() != begin_; }
  /// Whether nothing below the group around its place is wanted.
  bool isIdle() { return filling_.automaton().isDead(filling_.top().state); }

private:
  using Place = WalkedTree::Place;
  /// The node that a column's value was looked up from last, and the row that has it.
  struct Known
  {
    uint64_t offset = kNoOffset;
    size_t row = 0;
  };

  /// The filling as the exact steps tell it of nodes.
  struct Told
  {
    bool enter(const core::Node& group)
    {
      const Automaton::Move move = filling.meet(group.elm());
      const bool isWanted = !filling.automaton().isDead(move.state);
      if (isWanted || move.isRow)
      {
        filling.enter(move);
        isWanted ? void() : filling.leave();
      }
      return isWanted;
    }
    void leave() { filling.leave(); }
    [[gnu::always_inline]] void data(const core::Node& node, const uint8_t* payload, bool swap)
    {
      filling.data(filling.meet(node.elm()), {node.type(), payload, node.size(), swap});
    }
    Filling& filling;
  };

  const CompiledQuery& compiled() const { return query_.compiled(); }

  void passOver(const PassedOver& passed);
  /// Whether the part is read. A row that has begun in it is read to its end.
  bool isBehindPart() const;
  void begin();
  void takeData(const Automaton::Move& move);
  RawCell valueOf(const Node& node);
  void goBelow(uint32_t state);
  /// Reads a group by the exact steps, unless it is one that they are known to give up in. Of a group around it the
  /// Walker then goes on, so that each byte is gone through twice at the most.
  void goThrough();
  bool tryExact(std::span<const uint8_t> bytes);
  std::span<const uint8_t> bytesOf(uint64_t offset, uint64_t size);
  /// Looks the row's columns up whose paths are not plain.
  void seek(size_t row);
  void search(const SoughtColumn& sought, size_t row);
  /// Whether more values are wanted.
  bool take(uint32_t column, size_t row, const Place& place);

  ByteSource& source_;
  TableQuery query_;
  const std::vector<SoughtColumn>& sought_;
  TableOptions options_;
  PathMatcher matcher_; ///< of the rows, when they are not plain
  Filling filling_;
  Told told_{filling_};
  ExactWalk<Told> exact_;
  StreamWalk walk_;
  Event event_{};
  WalkedTree tree_{};
  std::vector<Place> line_; ///< with columns to look up: above the roots, the groups around the node, the node
  std::vector<Known> known_;
  std::vector<uint8_t> buffer_{};
  std::optional<Problem> stopped_{};
  uint64_t failed_ = kNoOffset; ///< where the exact steps gave up last
  uint64_t notBefore_ = 0;      ///< they are not tried before
  uint64_t dropped_ = Filling::kNoRow;
  bool knowsPaths_ = true; ///< places are counted from the file's start
  uint64_t partEnd_ = kNoOffset;
  uint64_t begin_ = 0; ///< of the stream that it began in
  bool done_ = false;
};

} // namespace tav::inspect
