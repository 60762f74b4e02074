#include "inspect/table/chunk.h"

#include <algorithm>
#include <array>

#include "tav/cpp/decode.hpp"
#include "tav/path/valueText.hpp"

namespace tav::inspect
{

namespace
{

constexpr uint64_t kSizeBytes = sizeof(uint64_t);
constexpr uint64_t kNanoseconds = 1'000'000'000;
constexpr uint64_t kLastSecond = static_cast<uint64_t>(INT64_MAX) / kNanoseconds - 100; // fractions can add a minute

template<class Number>
uint64_t signedNumber(const RawCell& value)
{
  Number number{};
  static_cast<void>(detail::decode(detail::RawValue{value.type, value.bytes, value.size, value.swap}, number));
  return static_cast<uint64_t>(static_cast<int64_t>(number));
}

} // namespace

void TableChunk::grow()
{
  constexpr size_t fewest = 256;
  capacity_ = std::max(fewest, 2 * capacity_);
  for (Column& column : columns_)
  {
    column.kinds.resize(capacity_);
    column.cells.resize(capacity_);
    if (joiner_ != nullptr)
    {
      column.rooms.resize(capacity_);
    }
  }
}

uint64_t TableChunk::sizeAt(uint64_t place) const
{
  uint64_t size = 0;
  std::memcpy(&size, heap_.data() + place, sizeof size);
  return size;
}

uint64_t TableChunk::newText(const uint8_t* bytes, uint64_t size, uint64_t room)
{
  const uint64_t place = heap_.size();
  heap_.resize(static_cast<size_t>(place + kSizeBytes + room));
  std::memcpy(heap_.data() + place, &size, sizeof size);
  if (size != 0)
  {
    std::memcpy(heap_.data() + place + kSizeBytes, bytes, static_cast<size_t>(size));
  }
  return place;
}

void TableChunk::putText(Column& to, size_t row, CellKind kind, const uint8_t* bytes, uint64_t size)
{
  to.kinds[row] = static_cast<uint8_t>(kind);
  const auto length = static_cast<size_t>(size);
  const bool repeats = to.lastText != kNone && sizeAt(to.lastText) == size &&
                       (size == 0 || std::memcmp(heap_.data() + to.lastText + kSizeBytes, bytes, length) == 0);
  if (!repeats)
  {
    to.lastText = newText(bytes, size, size);
  }
  to.cells[row] = to.lastText;
}

void TableChunk::putWide(Column& to, size_t row, CellKind kind, const RawCell& value)
{
  const detail::RawValue raw{value.type, value.bytes, value.size, value.swap};
  std::array<uint64_t, 2> words{};
  if (kind == CellKind::unsigned128)
  {
    tav::Uint128 number;
    static_cast<void>(detail::decode(raw, number));
    words = {number.high, number.low};
  }
  else
  {
    tav::Sint128 number;
    static_cast<void>(detail::decode(raw, number));
    words = {static_cast<uint64_t>(number.high), number.low};
  }
  to.kinds[row] = static_cast<uint8_t>(kind);
  putHalves(to, row, words);
}

void TableChunk::putHalves(Column& to, size_t row, const std::array<uint64_t, 2>& words)
{
  to.cells[row] = heap_.size();
  const auto* const first = reinterpret_cast<const uint8_t*>(words.data());
  heap_.insert(heap_.end(), first, first + sizeof words);
}

void TableChunk::putTime(Column& to, size_t row, const RawCell& value)
{
  TAVTimeStamp stamp{};
  const detail::RawValue raw{value.type, value.bytes, value.size, value.swap};
  static_cast<void>(detail::decode(raw, stamp));
  if (stamp.seconds > kLastSecond) [[unlikely]]
  {
    stamp.offsetMinutes = 0;
    std::string text = detail::timeText(stamp);
    text = text.ends_with("+00:00") ? text.substr(0, text.size() - 6) + 'Z' : text;
    putText(to, row, CellKind::text, reinterpret_cast<const uint8_t*>(text.data()), text.size());
    return;
  }
  to.kinds[row] = static_cast<uint8_t>(CellKind::time);
  const uint64_t milliseconds = stamp.fractionA;
  const uint64_t microseconds = stamp.fractionB;
  to.cells[row] = stamp.seconds * kNanoseconds + milliseconds * 1'000'000 + microseconds * 1000;
}

void TableChunk::setOther(Column& to, size_t row, const RawCell& value)
{
  const auto put = [&](CellKind kind, uint64_t number) {
    to.kinds[row] = static_cast<uint8_t>(kind);
    to.cells[row] = number;
  };
  switch (value.type)
  {
  case TAV_TYPE_UINT8: put(CellKind::unsigned64, value.bytes[0]); break;
  case TAV_TYPE_UINT16: put(CellKind::unsigned64, signedNumber<uint16_t>(value)); break;
  case TAV_TYPE_SINT8: put(CellKind::signed64, signedNumber<int8_t>(value)); break;
  case TAV_TYPE_SINT16: put(CellKind::signed64, signedNumber<int16_t>(value)); break;
  case TAV_TYPE_SINT32: put(CellKind::signed64, signedNumber<int32_t>(value)); break;
  case TAV_TYPE_SINT64: put(CellKind::signed64, signedNumber<int64_t>(value)); break;
  case TAV_TYPE_UINT128: putWide(to, row, CellKind::unsigned128, value); break;
  case TAV_TYPE_SINT128: putWide(to, row, CellKind::signed128, value); break;
  case TAV_TYPE_UTF8_STRING: // behind its code page
    putText(to, row, CellKind::text, value.bytes + sizeof(uint16_t), value.size - sizeof(uint16_t));
    break;
  case TAV_TYPE_UINT64_ARRAY:
  {
    const std::string text = detail::paths::plainText({value.type, value.bytes, value.size, value.swap});
    putText(to, row, CellKind::text, reinterpret_cast<const uint8_t*>(text.data()), text.size());
    break;
  }
  default: putText(to, row, CellKind::bytes, value.bytes, value.size);
  }
}

void TableChunk::putAny(uint32_t column, size_t row, const RawCell& value)
{
  const bool suits = layout::typeInfo(value.type).known && sizeSuits(value.type, value.size);
  put(column, row, suits ? value : RawCell{TAV_TYPE_BINARY, value.bytes, value.size, false});
}

/// Values that are joined are text from the first on. A text has room for as much again when it has to be moved.
void TableChunk::join(uint32_t column, size_t row, const RawCell& value)
{
  TableChunk one(1, std::nullopt);
  one.addRow();
  one.put(0, 0, value);
  joinText(column, row, cellText(one.cell(0, 0)));
}

void TableChunk::joinText(uint32_t column, size_t row, std::string_view text)
{
  Column& to = columns_[column];
  const bool isFirst = to.kinds[row] == 0;
  if (row < loggedBelow_)
  {
    log_.push_back({column, row, to.kinds[row], to.cells[row], isFirst ? 0 : sizeAt(to.cells[row]), to.rooms[row]});
  }
  if (isFirst)
  {
    to.kinds[row] = static_cast<uint8_t>(CellKind::text);
    // cppcheck-suppress danglingTemporaryLifetime ; the bytes are copied, and their place is a number
    to.cells[row] = newText(reinterpret_cast<const uint8_t*>(text.data()), text.size(), text.size());
    to.rooms[row] = text.size();
    return;
  }
  const uint64_t size = sizeAt(to.cells[row]);
  const uint64_t joined = size + joiner_->size() + text.size();
  if (joined > to.rooms[row])
  {
    std::vector<uint8_t> before(heap_.begin() + static_cast<ptrdiff_t>(to.cells[row] + kSizeBytes),
                                heap_.begin() + static_cast<ptrdiff_t>(to.cells[row] + kSizeBytes + size));
    to.rooms[row] = 2 * joined;
    to.cells[row] = newText(before.data(), size, to.rooms[row]);
  }
  uint8_t* const place = heap_.data() + to.cells[row];
  std::copy(joiner_->begin(), joiner_->end(), place + kSizeBytes + size);
  std::copy(text.begin(), text.end(), place + kSizeBytes + size + joiner_->size());
  std::memcpy(place, &joined, sizeof joined);
}

void TableChunk::merge(size_t row, const TableChunk& from, size_t fromRow)
{
  for (uint32_t i = 0; i < columns_.size(); ++i)
  {
    Column& to = columns_[i];
    const Cell cell = from.cell(i, fromRow);
    if (cell.kind == CellKind::missing || (joiner_ == nullptr && to.kinds[row] != 0))
    {
      continue;
    }
    if (joiner_ != nullptr)
    {
      joinText(i, row, cell.text);
      continue;
    }
    to.kinds[row] = static_cast<uint8_t>(cell.kind);
    to.cells[row] = cell.number;
    if (cell.kind == CellKind::text || cell.kind == CellKind::bytes)
    {
      putText(to, row, cell.kind, reinterpret_cast<const uint8_t*>(cell.text.data()), cell.text.size());
    }
    else if (cell.kind == CellKind::unsigned128 || cell.kind == CellKind::signed128)
    {
      putHalves(to, row, {cell.high, cell.number});
    }
  }
}

void TableChunk::copy(uint32_t column, size_t fromRow, size_t row)
{
  Column& to = columns_[column];
  to.kinds[row] = to.kinds[fromRow];
  to.cells[row] = to.cells[fromRow];
  if (joiner_ != nullptr)
  {
    to.rooms[row] = 0; // what both have is not grown in place
  }
}

TableChunk::Mark TableChunk::mark()
{
  loggedBelow_ = rows_;
  log_.clear();
  return {rows_, heap_.size()};
}

void TableChunk::forgetMark()
{
  loggedBelow_ = 0;
  log_.clear();
}

void TableChunk::goBack(const Mark& mark)
{
  cut(mark.rows);
  // NOLINTNEXTLINE(modernize-loop-convert): clang 14 does not compile the reversed view of the standard library
  for (auto entry = log_.rbegin(); entry != log_.rend(); ++entry)
  {
    Column& column = columns_[entry->column];
    column.kinds[entry->row] = entry->kind;
    column.cells[entry->row] = entry->cell;
    if (joiner_ != nullptr && entry->kind != 0)
    {
      column.rooms[entry->row] = entry->room;
      std::memcpy(heap_.data() + entry->cell, &entry->size, sizeof entry->size);
    }
  }
  heap_.resize(mark.heap);
  for (Column& column : columns_)
  {
    column.lastText = column.lastText != kNone && column.lastText >= mark.heap ? kNone : column.lastText;
  }
  forgetMark();
}

void TableChunk::cut(size_t rows)
{
  for (Column& column : columns_)
  {
    std::fill(column.kinds.begin() + static_cast<ptrdiff_t>(rows), column.kinds.begin() + static_cast<ptrdiff_t>(rows_),
              uint8_t{0});
  }
  rows_ = rows;
}

Cell TableChunk::cell(size_t column, size_t row) const
{
  const Column& from = columns_[column];
  Cell cell{.kind = kind(column, row)};
  const uint64_t value = from.cells[first_ + row];
  switch (cell.kind)
  {
  case CellKind::missing: break;
  case CellKind::text:
  case CellKind::bytes:
    cell.text = {reinterpret_cast<const char*>(heap_.data() + value + kSizeBytes), static_cast<size_t>(sizeAt(value))};
    break;
  case CellKind::unsigned128:
  case CellKind::signed128:
    std::memcpy(&cell.high, heap_.data() + value, sizeof cell.high);
    std::memcpy(&cell.number, heap_.data() + value + sizeof cell.high, sizeof cell.number);
    break;
  default: cell.number = value;
  }
  return cell;
}

} // namespace tav::inspect
