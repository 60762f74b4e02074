/// @file compare.hpp
/// Values as the expressions in a path compare them.
#pragma once

#include <compare>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "tav/path/compiled.hpp"
#include "tav/path/decimal.hpp"

namespace tav::detail::paths
{

/// A value of an expression.
struct Value
{
  enum class Kind : uint8_t
  {
    number,   ///< a number in the path, or a place
    text,     ///< of a node, an attribute or the path; can be a number, too
    onlyText, ///< a moment or an array: no number, whatever its characters are
  };
  Kind kind = Kind::text;
  std::string text{};
};

inline bool holds(Operator comparison, std::partial_ordering order) noexcept
{
  // NOLINTBEGIN(modernize-use-nullptr): orders compare with 0; not every standard library has std::is_eq
  switch (comparison)
  {
  case Operator::equal: return order == 0;
  case Operator::unequal: return order != 0;
  case Operator::less: return order < 0;
  case Operator::lessOrEqual: return order <= 0;
  case Operator::greater: return order > 0;
  default: return order >= 0;
  }
  // NOLINTEND(modernize-use-nullptr)
}

/// Equal are two texts of the same characters or, beside a number, two of the same value. The order is that of numbers;
/// what is no number is neither before nor behind one. Of moments and arrays it is that of their characters.
inline bool compare(Operator comparison, const Value& left, const Value& right) noexcept
{
  using Kind = Value::Kind;
  const bool number = left.kind == Kind::number || right.kind == Kind::number;
  const bool onlyText = left.kind == Kind::onlyText || right.kind == Kind::onlyText;
  const bool equality = comparison == Operator::equal || comparison == Operator::unequal;
  if (!number && (equality || onlyText))
  {
    return holds(comparison, left.text.compare(right.text) <=> 0);
  }
  const std::optional<Decimal> a = onlyText ? std::nullopt : decimalOf(left.text);
  const std::optional<Decimal> b = onlyText ? std::nullopt : decimalOf(right.text);
  return a && b ? holds(comparison, *a <=> *b) : comparison == Operator::unequal;
}

} // namespace tav::detail::paths
