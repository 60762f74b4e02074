#include "tools/cmd/tableRates.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>

namespace tav::tool
{

namespace
{

bool isNumber(const Cell& cell)
{
  return cell.kind == CellKind::unsigned64 || cell.kind == CellKind::signed64 || cell.kind == CellKind::unsigned128 ||
         cell.kind == CellKind::signed128;
}

bool isNegative(const Cell& cell)
{
  const bool isSigned = cell.kind == CellKind::signed64 || cell.kind == CellKind::signed128;
  const uint64_t top = cell.kind == CellKind::signed64 ? cell.number : cell.high;
  return isSigned && (top >> 63U) != 0;
}

uint64_t highOf(const Cell& cell)
{
  return cell.kind == CellKind::signed64 && isNegative(cell) ? ~uint64_t{0} : cell.high;
}

/// Whether a is less than b.
bool isLess(const Cell& a, const Cell& b)
{
  if (isNegative(a) != isNegative(b))
  {
    return isNegative(a);
  }
  return highOf(a) != highOf(b) ? highOf(a) < highOf(b) : a.number < b.number;
}

/// b - a, which is not negative.
double difference(const Cell& a, const Cell& b)
{
  const uint64_t low = b.number - a.number;
  const uint64_t high = highOf(b) - highOf(a) - (b.number < a.number ? 1 : 0);
  return std::ldexp(static_cast<double>(high), 64) + static_cast<double>(low);
}

std::string shortest(double number)
{
  std::array<char, 64> text{};
  const auto result = std::to_chars(text.data(), text.data() + text.size(), number);
  return {text.data(), result.ptr};
}

} // namespace

Rates::Rates(const std::vector<OutColumn>& columns)
    : last_(columns.size())
{
  for (size_t i = 0; i < columns.size(); ++i)
  {
    if (columns[i].isCounter)
    {
      counters_.push_back(i);
    }
  }
}

void Rates::apply(OutRow& row)
{
  const auto found =
      std::find_if(row.begin(), row.end(), [](const OutCell& cell) { return cell.cell.kind == CellKind::time; });
  const bool hasTime = found != row.end();
  const int64_t time = hasTime ? static_cast<int64_t>(found->cell.number) : 0;
  for (const size_t column : counters_)
  {
    OutCell& cell = row[column];
    const Cell value = cell.cell;
    if (!isNumber(value))
    {
      continue; // a text stays what it is
    }
    cell = {};
    auto& last = last_[column];
    if (!hasTime || (last && time <= last->time))
    {
      continue;
    }
    if (last && !isLess(value, last->value))
    {
      constexpr double nanoseconds = 1e9;
      const double seconds = static_cast<double>(time - last->time) / nanoseconds;
      cell.own = shortest(difference(last->value, value) / seconds);
      cell.isOwn = true;
    }
    last = Last{value, time};
  }
}

} // namespace tav::tool
