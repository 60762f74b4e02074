/// Rows of a table as they are filled.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "inspect/walk/sizeSuits.h"
#include "tav/inspect/table.hpp"

namespace tav::inspect
{

/// What a value is before it is put into a cell.
struct RawCell
{
  uint16_t type = 0;
  const uint8_t* bytes = nullptr; ///< as stored
  uint64_t size = 0;
  bool swap = false; ///< the stream is in the other byte order
};

/// A run of rows. Each cell has a kind and eight bytes: a number or a time, or where in the heap the value lies.
class TableChunk
{
public:
  explicit TableChunk(size_t columns, const std::optional<std::string>& joiner)
      : columns_(columns), joiner_(joiner ? &*joiner : nullptr) {}

  size_t rows() const { return rows_ - first_; }
  size_t columns() const { return columns_.size(); }
  const uint8_t* kinds(size_t column) const { return columns_[column].kinds.data() + first_; }
  const uint64_t* cells(size_t column) const { return columns_[column].cells.data() + first_; }
  CellKind kind(size_t column, size_t row) const { return static_cast<CellKind>(kinds(column)[row]); }
  Cell cell(size_t column, size_t row) const;

  /// A row without values.
  size_t addRow()
  {
    if (rows_ == capacity_) [[unlikely]]
    {
      grow();
    }
    return rows_++;
  }

  /// A data element's value, of a size that suits its type. Taken when it is the first, or joined to those before.
  [[gnu::always_inline]] void put(uint32_t column, size_t row, const RawCell& value)
  {
    Column& to = columns_[column];
    if (joiner_ != nullptr || to.kinds[row] != 0) [[unlikely]]
    {
      joiner_ != nullptr ? join(column, row, value) : void();
      return;
    }
    if (row < loggedBelow_) [[unlikely]]
    {
      log_.push_back({column, row, 0, 0, 0, 0});
    }
    set(to, row, value);
  }

  /// The same of any size.
  void putAny(uint32_t column, size_t row, const RawCell& value);

  /// Gives a cell the value of another one in its column.
  void copy(uint32_t column, size_t fromRow, size_t row);

  /// A place to come back to. Only the last one can be.
  struct Mark
  {
    size_t rows = 0;
    size_t heap = 0;
  };
  Mark mark();
  void forgetMark();
  void goBack(const Mark& mark);
  /// Takes the rows from one on away.
  void cut(size_t rows);

  /// Puts what a row of another chunk has behind what is in a row of this one, as if it had been put here. Nothing may
  /// have been dropped of the other one.
  void merge(size_t row, const TableChunk& from, size_t fromRow);
  /// Takes the first rows away, of which nothing is asked any more. The numbers of rows in `kinds`, `cells`, `kind` and
  /// `cell` begin behind them; elsewhere they stay.
  void dropFirst(size_t rows) { first_ = rows; }

private:
  struct Column
  {
    std::vector<uint8_t> kinds{}; ///< CellKind
    std::vector<uint64_t> cells{};
    std::vector<uint64_t> rooms{}; ///< with a joiner: bytes that a text can have where it lies
    uint64_t lastText = kNone;     ///< the text that was put last: those that repeat are kept once
  };
  struct Logged
  {
    uint32_t column;
    size_t row;
    uint8_t kind;
    uint64_t cell;
    uint64_t size;
    uint64_t room;
  };
  static constexpr uint64_t kNone = ~uint64_t{0};

  void grow();
  void join(uint32_t column, size_t row, const RawCell& value);
  void joinText(uint32_t column, size_t row, std::string_view text);
  void putText(Column& to, size_t row, CellKind kind, const uint8_t* bytes, uint64_t size);
  void putWide(Column& to, size_t row, CellKind kind, const RawCell& value);
  void putHalves(Column& to, size_t row, const std::array<uint64_t, 2>& words);
  void putTime(Column& to, size_t row, const RawCell& value);
  void setOther(Column& to, size_t row, const RawCell& value);
  uint64_t sizeAt(uint64_t place) const;
  uint64_t newText(const uint8_t* bytes, uint64_t size, uint64_t room);

  template<class Number, class Unswapped>
  static uint64_t number(const RawCell& value, Unswapped unswapped)
  {
    Number number{};
    std::memcpy(&number, value.bytes, sizeof number);
    return static_cast<uint64_t>(static_cast<int64_t>(value.swap ? unswapped(number) : number));
  }

  [[gnu::always_inline]] void set(Column& to, size_t row, const RawCell& value)
  {
    const auto put = [&](CellKind kind, uint64_t number) {
      to.kinds[row] = static_cast<uint8_t>(kind);
      to.cells[row] = number;
    };
    const auto swap32 = [](uint32_t word) { return kor::byteswap32(word); };
    const auto swap64 = [](uint64_t word) { return kor::byteswap64(word); };
    switch (value.type)
    {
    case TAV_TYPE_UINT32: put(CellKind::unsigned64, number<uint32_t>(value, swap32)); break;
    case TAV_TYPE_UINT64: put(CellKind::unsigned64, number<uint64_t>(value, swap64)); break;
    case TAV_TYPE_ASCII_STRING: putText(to, row, CellKind::text, value.bytes, value.size); break;
    case TAV_TYPE_UTC_TIMESTAMP: putTime(to, row, value); break;
    default: setOther(to, row, value);
    }
  }

  std::vector<Column> columns_;
  const std::string* joiner_;
  size_t rows_ = 0;
  size_t first_ = 0; ///< those before were dropped
  size_t capacity_ = 0;
  std::vector<uint8_t> heap_{}; ///< sizes with their bytes, and 128-bit numbers, the upper half first
  uint64_t loggedBelow_ = 0;    ///< what is put into rows before it is written down, to come back to the mark
  std::vector<Logged> log_{};
};

} // namespace tav::inspect
