#include "inspect/table/columnType.h"

#include <algorithm>

namespace tav::inspect
{

namespace
{

/// 10^38, in halves.
constexpr uint64_t kDecimalHigh = 0x4B3B4CA85A86C47A;
constexpr uint64_t kDecimalLow = 0x098A224000000000;

} // namespace

void ColumnType::see(const TableChunk& chunk, size_t column)
{
  const uint8_t* const kinds = chunk.kinds(column);
  const uint64_t* const cells = chunk.cells(column);
  for (size_t row = 0; row < chunk.rows(); ++row)
  {
    const auto kind = static_cast<CellKind>(kinds[row]);
    kinds_ |= 1U << kinds[row];
    if (kind == CellKind::unsigned64)
    {
      most64_ = std::max(most64_, cells[row]);
    }
    else if (kind == CellKind::unsigned128 || kind == CellKind::signed128)
    {
      seeWide(chunk.cell(column, row));
    }
  }
}

void ColumnType::seeWide(const Cell& cell)
{
  const bool negative = (cell.high >> 63U) != 0;
  if (cell.kind == CellKind::unsigned128 && negative)
  {
    exceedsSigned_ = true;
    exceedsDecimal_ = true;
    return;
  }
  const uint64_t low = negative ? ~cell.number + 1 : cell.number;
  const uint64_t high = negative ? ~cell.high + (low == 0 ? 1 : 0) : cell.high;
  exceedsDecimal_ = exceedsDecimal_ || high > kDecimalHigh || (high == kDecimalHigh && low >= kDecimalLow);
}

CellKind ColumnType::kind() const
{
  const unsigned kinds = kinds_ & ~1U;
  for (unsigned kind = 1; kind <= static_cast<unsigned>(CellKind::bytes); ++kind)
  {
    if (kinds == 1U << kind)
    {
      return static_cast<CellKind>(kind);
    }
  }
  if (kinds == 0 || has(CellKind::time) || has(CellKind::text) || has(CellKind::bytes))
  {
    return CellKind::text;
  }
  const bool isSigned = has(CellKind::signed64) || has(CellKind::signed128);
  if (!isSigned)
  {
    return CellKind::unsigned128;
  }
  if (exceedsSigned_)
  {
    return CellKind::text;
  }
  const bool is64 = !has(CellKind::unsigned128) && !has(CellKind::signed128) && most64_ <= uint64_t{INT64_MAX};
  return is64 ? CellKind::signed64 : CellKind::signed128;
}

TableTypes::TableTypes(const TableQuery& query)
    : types_(query.columns().size())
{
}

TableTypes::~TableTypes() = default;

void TableTypes::see(const Table& table)
{
  for (const auto& chunk : table.chunks())
  {
    for (size_t i = 0; i < types_.size(); ++i)
    {
      types_[i].see(*chunk, i);
    }
  }
}

CellKind TableTypes::type(size_t column) const
{
  return types_[column].kind();
}

bool TableTypes::exceedsSigned(size_t column) const
{
  return types_[column].exceedsSigned();
}

} // namespace tav::inspect
