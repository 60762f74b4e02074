#include "tav/inspect/table.hpp"

#include <algorithm>
#include <array>
#include <charconv>
#include <utility>

#include "inspect/table/chunk.h"
#include "inspect/table/columnType.h"
#include "tav/cpp/text.hpp"
#include "tav/cpp/valueText.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

template<class Number>
void appendNumber(std::string& to, Number number)
{
  std::array<char, 24> digits{};
  const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), number).ptr;
  to.append(digits.data(), end);
}

void appendTime(std::string& to, int64_t nanoseconds)
{
  constexpr int64_t second = 1'000'000'000;
  TAVTimeStamp stamp{};
  stamp.seconds = static_cast<uint64_t>(nanoseconds / second);
  stamp.fractionA = static_cast<uint16_t>(nanoseconds % second / 1'000'000);
  stamp.fractionB = static_cast<uint16_t>(nanoseconds / 1000 % 1000);
  const std::string text = dateText(stamp);
  to.append(text, 0, text.size() - std::string_view("+00:00").size());
  to += 'Z';
}

} // namespace

void appendCell(std::string& to, const Cell& cell)
{
  switch (cell.kind)
  {
  case CellKind::unsigned64: appendNumber(to, cell.number); break;
  case CellKind::signed64: appendNumber(to, static_cast<int64_t>(cell.number)); break;
  case CellKind::unsigned128: to += detail::longText(tav::Uint128{.high = cell.high, .low = cell.number}); break;
  case CellKind::signed128:
    to += detail::longText(tav::Sint128{.high = static_cast<int64_t>(cell.high), .low = cell.number});
    break;
  case CellKind::time: appendTime(to, static_cast<int64_t>(cell.number)); break;
  case CellKind::text: to += cell.text; break;
  case CellKind::bytes:
    to += hexText(std::span(reinterpret_cast<const uint8_t*>(cell.text.data()), cell.text.size()));
    break;
  default: break;
  }
}

std::string cellText(const Cell& cell)
{
  std::string text;
  appendCell(text, cell);
  return text;
}

Table::Table(const TableQuery& query)
    : query_(query)
{
}

Table::~Table() = default;
Table::Table(const Table&) = default;
Table& Table::operator=(const Table&) = default;
Table::Table(Table&&) noexcept = default;
Table& Table::operator=(Table&&) noexcept = default;

Cell Table::cell(size_t column, uint64_t row) const
{
  const auto behind = std::upper_bound(starts_.begin(), starts_.end(), row);
  const auto chunk = static_cast<size_t>(behind - starts_.begin()) - 1;
  return chunks_[chunk]->cell(column, static_cast<size_t>(row - starts_[chunk]));
}

CellKind Table::type(size_t column) const
{
  ColumnType type;
  for (const auto& chunk : chunks_)
  {
    type.see(*chunk, column);
  }
  return type.kind();
}

void Table::append(std::shared_ptr<const TableChunk> chunk)
{
  starts_.push_back(starts_.back() + chunk->rows());
  chunks_.push_back(std::move(chunk));
}

void Table::append(Table other)
{
  for (auto& chunk : other.chunks_)
  {
    append(std::move(chunk));
  }
}

} // namespace tav::inspect
