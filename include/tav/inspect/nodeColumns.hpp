/// @file nodeColumns.hpp
/// The nodes of streams as rows, column by column.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tav/cpp/decode.hpp"
#include "tav/inspect/api.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/document.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/plan.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// Which of the value's columns a row has.
enum class ValueKind : uint8_t
{
  none,
  number,
  wide, ///< a number that 64 bits do not hold
  text,
  time,
  bytes
};

/// A node as it becomes a row.
struct NodeFacts
{
  uint64_t offset = 0;
  uint64_t size = 0; ///< as its header says it
  uint64_t depth = 0;
  uint16_t elm = 0;
  uint16_t type = 0;
  uint16_t key = 0;
  bool swapped = false;
  const uint8_t* payload = nullptr; ///< of a data element that is whole, when its value is wanted
};

/// Rows of nodes. What does not fit a word is left where it lies, in memory that the source has or the columns keep.
/// Used by one thread.
class NodeColumns
{
public:
  static constexpr int64_t kNoParent = -1;
  static constexpr int64_t kNoTime = INT64_MIN;

  /// The values of a column, in the rows' block.
  template<class T>
  class Column
  {
  public:
    T& operator[](size_t at) { return items_[at]; }
    const T& operator[](size_t at) const { return items_[at]; }
    T* data() { return items_; }
    const T* data() const { return items_; }

  private:
    friend class NodeColumns;
    T* items_ = nullptr;
  };

  /// A text for each row, one behind the other.
  class Texts
  {
  public:
    size_t size() const { return ends_.size(); }
    std::string_view operator[](size_t row) const { return joined(row, 1); }
    /// Those of rows that follow on each other, as one.
    std::string_view joined(size_t row, size_t count) const
    {
      const size_t from = row == 0 ? 0 : ends_[row - 1];
      return std::string_view(text_).substr(from, count == 0 ? 0 : ends_[row + count - 1] - from);
    }

  private:
    friend class NodeColumns;
    friend class NodeReader;
    void add(std::string_view text)
    {
      text_ += text;
      ends_.push_back(text_.size());
    }
    void cut(size_t rows)
    {
      ends_.resize(std::min(ends_.size(), rows));
      text_.resize(ends_.empty() ? 0 : ends_.back());
    }

    std::string text_{};
    std::vector<size_t> ends_{};
  };

  NodeColumns() = default;
  TAV_INSPECT_API ~NodeColumns();
  NodeColumns(const NodeColumns&) = delete;
  NodeColumns& operator=(const NodeColumns&) = delete;

  size_t count() const { return count_; }
  /// A value that is left where it lies: of a row of kind wide, text or bytes.
  tav::detail::RawValue rest(size_t row) const
  {
    const Rest& found = rests_[place_[row]];
    return {type[row], found.payload, size[row], found.swapped};
  }

  /// Adds a row.
  TAV_INSPECT_API void add(const NodeFacts& node, int64_t parentRow);
  /// Keeps memory that payloads lie in as long as the rows.
  void keep(std::shared_ptr<const void> memory) { kept_.push_back(std::move(memory)); }
  /// Takes the rows from one on away.
  TAV_INSPECT_API void cut(size_t rows);
  /// Takes all rows away, and keeps their room.
  TAV_INSPECT_API void clear();

  Column<int64_t> parent{}; ///< the number of the row around it, counted by who adds them; kNoParent: none
  Column<uint64_t> offset{};
  Column<uint64_t> size{};
  Column<uint64_t> number{}; ///< of a negative number its two's complement
  Column<int64_t> time{};    ///< nanoseconds since 1970; kNoTime: none
  Column<uint32_t> depth{};
  Column<uint16_t> id{};
  Column<uint16_t> type{};
  Column<uint16_t> key{};
  Column<ValueKind> kind{};
  Texts paths{}; ///< where they are asked for

private:
  friend class NodeReader;

  struct Rest
  {
    const uint8_t* payload;
    bool swapped;
  };
  /// What the value's columns have of a row.
  struct Word
  {
    ValueKind kind = ValueKind::none;
    uint64_t number = 0;
    int64_t time = kNoTime;
  };

  void makeRoom(size_t rows);
  template<class Use>
  void eachColumn(const Use& use);
  bool isFull() const { return count_ == room_; }
  /// There is room for it.
  void addRow(const NodeFacts& node, int64_t parentRow);
  static bool isRest(ValueKind of)
  {
    return of == ValueKind::text || of == ValueKind::bytes || of == ValueKind::wide;
  }
  static Word wordIn(const tav::detail::RawValue& raw);
  template<class Number>
  static Word numberIn(const tav::detail::RawValue& raw);
  static Word timeIn(const tav::detail::RawValue& raw);

  size_t count_ = 0;
  size_t room_ = 0;
  std::unique_ptr<uint64_t[]> block_{}; ///< of all columns
  Column<uint32_t> place_{};            ///< of the rest
  std::vector<Rest> rests_{};
  std::vector<std::shared_ptr<const void>> kept_{};
};

struct NodeReaderOptions
{
  OnDamage onDamage = OnDamage::stop;
  bool values = true; ///< payloads are looked at
  bool paths = false;
  DamageWatch::Sink passedOver{}; ///< is told of the damage that `skip` passes over
};

/// Reads the nodes of a source as rows, in one pass in stream order, every stream in it in its own form. Elements that
/// only end a group are no rows. What lies in closed groups whose every node is as a writer makes it is read by the
/// exact steps, all else by the Walker, with the same result. Memory: the rows that are not handed out yet, and at most
/// 4 MiB of a file beside values. Used by one thread.
class NodeReader
{
public:
  /// `source` outlives the reader.
  TAV_INSPECT_API NodeReader(ByteSource& source, const Form& form, const NodeReaderOptions& options = {});
  /// Of a part: the parents that lie before it are told as `-2 - level`, by the level of the group around it. Paths are
  /// not known there.
  TAV_INSPECT_API NodeReader(ByteSource& source, const Part& part, const NodeReaderOptions& options = {});
  TAV_INSPECT_API ~NodeReader();
  NodeReader(const NodeReader&) = delete;
  NodeReader& operator=(const NodeReader&) = delete;

  /// Tells at groups, every some thousand rows, the offset that reading has come to. What `progress` throws ends it.
  TAV_INSPECT_API void tellProgress(std::function<void(uint64_t)> progress);

  /// Adds so many rows, and as many as come together; fewer at the end, where it returns false when there are none.
  /// Throws Error when the source does.
  TAV_INSPECT_API bool next(NodeColumns& out, size_t rows = kBatch);

  /// The damage at which reading has stopped. The rows before it have been handed out.
  TAV_INSPECT_API const std::optional<Problem>& stopped() const noexcept;

  /// At the end of a part: where it ended, and the rows that the groups around that place are, by level.
  TAV_INSPECT_API PartEnd end() const;
  TAV_INSPECT_API const std::vector<int64_t>& open() const noexcept;

  static constexpr size_t kBatch = 65536;

private:
  class State;
  std::unique_ptr<State> state_;
};

} // namespace tav::inspect
