#include "inspect/table/arrowColumn.h"

#include <cstring>
#include <utility>

#include "inspect/table/columnType.h"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

/// Appends a number as it stands in memory.
template<class Number>
void append(std::vector<uint8_t>& to, Number number)
{
  const size_t size = to.size();
  to.resize(size + sizeof number);
  std::memcpy(to.data() + size, &number, sizeof number);
}

template<class Visit>
void eachRow(const std::vector<RowRun>& rows, const Visit& visit)
{
  for (const RowRun& run : rows)
  {
    for (size_t row = run.first; row < run.first + run.count; ++row)
    {
      visit(*run.chunk, row);
    }
  }
}

uint64_t lengthOf(const std::vector<RowRun>& rows)
{
  uint64_t length = 0;
  for (const RowRun& run : rows)
  {
    length += run.count;
  }
  return length;
}

/// A bit for each row that has a value; how many have none.
uint64_t fillBitmap(const std::vector<RowRun>& rows, size_t column, std::vector<uint8_t>& out)
{
  out.resize(static_cast<size_t>(lengthOf(rows) / 8 + 1));
  uint64_t at = 0;
  uint64_t missing = 0;
  eachRow(rows, [&](const TableChunk& chunk, size_t row) {
    const unsigned isThere = chunk.kinds(column)[row] != 0 ? 1 : 0;
    out[static_cast<size_t>(at / 8)] |= static_cast<uint8_t>(isThere << at % 8);
    missing += 1 - isThere;
    ++at;
  });
  if (missing == 0)
  {
    out.clear();
  }
  return missing;
}

/// What is no UTF-8 stands as escapes.
std::string wellFormed(std::string text)
{
  if (isUtf8(text))
  {
    return text;
  }
  const std::string escaped = inspect::quoted(text);
  return escaped.substr(1, escaped.size() - 2);
}

} // namespace

ArrowColumn::ArrowColumn(const Table& table, size_t column, bool dictionaries)
    : column_(column), name_(table.columns()[column].name)
{
  ColumnType type;
  for (const auto& chunk : table.chunks())
  {
    type.see(*chunk, column);
  }
  switch (type.kind())
  {
  case CellKind::unsigned64: format_ = "L"; return;
  case CellKind::signed64: format_ = "l"; return;
  case CellKind::time: format_ = "tsn:UTC"; return;
  case CellKind::unsigned128:
  case CellKind::signed128:
    if (!type.exceedsDecimal())
    {
      format_ = "d:38,0";
      layout_ = Layout::decimal;
      return;
    }
    break;
  case CellKind::bytes: layout_ = Layout::bytes; break;
  default: break;
  }
  if (layout_ != Layout::bytes)
  {
    layout_ = Layout::texts;
  }
  chooseText(table, dictionaries && layout_ == Layout::texts);
}

std::string ArrowColumn::textOf(const TableChunk& chunk, size_t row) const
{
  const Cell cell = chunk.cell(column_, row);
  return layout_ == Layout::bytes ? std::string(cell.text) : wellFormed(cellText(cell));
}

/// A dictionary pays where the texts and their offsets take less than half of the bytes that all rows' texts do. That
/// is known to fail early where most of the first texts differ.
void ArrowColumn::chooseText(const Table& table, bool dictionaries)
{
  constexpr uint64_t fewest = 1024;
  auto numbers = std::make_shared<TextNumbers>();
  bool pays = dictionaries;
  uint64_t count = 0;
  uint64_t bytes = 0;
  for (const auto& chunk : table.chunks())
  {
    for (size_t row = 0; row < chunk->rows(); ++row)
    {
      const std::string text = textOf(*chunk, row);
      const bool isThere = chunk->kind(column_, row) != CellKind::missing;
      bytes += text.size();
      count += isThere ? 1 : 0;
      if (pays && isThere)
      {
        numbers->numberOf(text);
        pays = count < fewest || numbers->texts().size() < count / 2;
      }
    }
  }
  pays = pays && numbers->bytes() + numbers->texts().size() * sizeof(uint32_t) < bytes / 2;
  const uint64_t most = static_cast<uint64_t>(INT32_MAX);
  large_ = (pays ? numbers->bytes() : bytes) > most;
  format_ = layout_ == Layout::bytes ? (large_ ? "Z" : "z") : (large_ ? "U" : "u");
  if (pays)
  {
    layout_ = Layout::numbers;
    numbers_ = std::move(numbers);
  }
}

void ArrowColumn::schema(ArrowSchema& out) const
{
  const bool isNumbered = layout_ == Layout::numbers;
  makeSchema(out, name_, isNumbered ? "i" : format_, 0, isNumbered);
  if (isNumbered)
  {
    makeSchema(*out.dictionary, "", format_, 0, false);
  }
}

void ArrowColumn::array(const std::vector<RowRun>& rows, ArrowArray& out) const
{
  const bool hasOffsets = layout_ == Layout::texts || layout_ == Layout::bytes;
  std::vector<std::vector<uint8_t>> buffers(hasOffsets ? 3 : 2);
  const uint64_t missing = fillBitmap(rows, column_, buffers[0]);
  switch (layout_)
  {
  case Layout::words: fillWords(rows, buffers[1]); break;
  case Layout::decimal: fillDecimals(rows, buffers[1]); break;
  case Layout::numbers: fillNumbers(rows, buffers[1]); break;
  default:
    large_ ? fillTexts<int64_t>(rows, buffers[1], buffers[2]) : fillTexts<int32_t>(rows, buffers[1], buffers[2]);
  }
  makeArray(out, lengthOf(rows), missing, std::move(buffers), 0, layout_ == Layout::numbers);
  if (layout_ == Layout::numbers)
  {
    dictionary(*out.dictionary);
  }
}

void ArrowColumn::fillWords(const std::vector<RowRun>& rows, std::vector<uint8_t>& out) const
{
  for (const RowRun& run : rows)
  {
    const auto* const first = reinterpret_cast<const uint8_t*>(run.chunk->cells(column_) + run.first);
    out.insert(out.end(), first, first + run.count * sizeof(uint64_t));
  }
}

void ArrowColumn::fillDecimals(const std::vector<RowRun>& rows, std::vector<uint8_t>& out) const
{
  eachRow(rows, [&](const TableChunk& chunk, size_t row) {
    const Cell cell = chunk.cell(column_, row);
    const bool isNegative = cell.kind == CellKind::signed64 && (cell.number >> 63U) != 0;
    const uint64_t high = isNegative ? ~uint64_t{0} : cell.high;
    append(out, kor::isLittleEndian ? cell.number : high);
    append(out, kor::isLittleEndian ? high : cell.number);
  });
}

void ArrowColumn::fillNumbers(const std::vector<RowRun>& rows, std::vector<uint8_t>& out) const
{
  eachRow(rows, [&](const TableChunk& chunk, size_t row) {
    const bool isThere = chunk.kind(column_, row) != CellKind::missing;
    append(out, isThere ? numbers_->known(textOf(chunk, row)) : uint32_t{0});
  });
}

template<class Offset>
void ArrowColumn::fillTexts(const std::vector<RowRun>& rows, std::vector<uint8_t>& offsets,
                            std::vector<uint8_t>& out) const
{
  append(offsets, Offset{0});
  eachRow(rows, [&](const TableChunk& chunk, size_t row) {
    const std::string text = textOf(chunk, row);
    out.insert(out.end(), text.begin(), text.end());
    append(offsets, static_cast<Offset>(out.size()));
  });
}

void ArrowColumn::dictionary(ArrowArray& out) const
{
  std::vector<std::vector<uint8_t>> buffers(3);
  const auto end = [&] {
    large_ ? append(buffers[1], static_cast<int64_t>(buffers[2].size()))
           : append(buffers[1], static_cast<int32_t>(buffers[2].size()));
  };
  end();
  for (const std::string_view text : numbers_->texts())
  {
    buffers[2].insert(buffers[2].end(), text.begin(), text.end());
    end();
  }
  makeArray(out, numbers_->texts().size(), 0, std::move(buffers), 0, false);
}

} // namespace tav::inspect
