/// How a node becomes a row, inlined where many are read.
#pragma once

#include <cstdint>
#include <limits>
#include <type_traits>

#include "inspect/walk/sizeSuits.h"
#include "tav/inspect/nodeColumns.hpp"

namespace tav::inspect
{

/// Nanoseconds since 1970 of a timestamp where 64 bits hold them.
inline std::optional<int64_t> nanosecondsOf(const TAVTimeStamp& stamp) noexcept
{
  constexpr uint64_t most = std::numeric_limits<int64_t>::max();
  constexpr uint64_t billion = 1'000'000'000;
  const uint64_t fraction = (uint64_t{stamp.fractionA} * 1000 + stamp.fractionB) * 1000;
  const bool fits = stamp.seconds <= (most - fraction) / billion;
  return fits ? std::optional(static_cast<int64_t>(stamp.seconds * billion + fraction)) : std::nullopt;
}

/// The widest values come first, so that each column is aligned where the one before it ends.
template<class Use>
void NodeColumns::eachColumn(const Use& use)
{
  use(parent);
  use(offset);
  use(size);
  use(number);
  use(time);
  use(depth);
  use(place_);
  use(id);
  use(type);
  use(key);
  use(kind);
}

template<class Number>
ValueKind NodeColumns::takeNumber(const tav::detail::RawValue& raw, size_t row)
{
  Number value{};
  if (tav::detail::decode(raw, value) != TAV_RC_OK)
  {
    return ValueKind::bytes;
  }
  if constexpr (std::is_signed_v<Number>)
  {
    number[row] = static_cast<uint64_t>(static_cast<int64_t>(value));
  }
  else
  {
    number[row] = value;
  }
  return ValueKind::number;
}

inline ValueKind NodeColumns::takeTime(const tav::detail::RawValue& raw, size_t row)
{
  TAVTimeStamp stamp{};
  if (tav::detail::decode(raw, stamp) != TAV_RC_OK)
  {
    return ValueKind::bytes;
  }
  const std::optional<int64_t> nanoseconds = nanosecondsOf(stamp);
  time[row] = nanoseconds.value_or(kNoTime);
  return nanoseconds ? ValueKind::time : ValueKind::none;
}

/// What does not have the size of its type is bytes.
inline ValueKind NodeColumns::classify(const tav::detail::RawValue& raw, size_t row)
{
  switch (raw.type)
  {
  case TAV_TYPE_UINT8: return takeNumber<uint8_t>(raw, row);
  case TAV_TYPE_SINT8: return takeNumber<int8_t>(raw, row);
  case TAV_TYPE_UINT16: return takeNumber<uint16_t>(raw, row);
  case TAV_TYPE_SINT16: return takeNumber<int16_t>(raw, row);
  case TAV_TYPE_UINT32: return takeNumber<uint32_t>(raw, row);
  case TAV_TYPE_SINT32: return takeNumber<int32_t>(raw, row);
  case TAV_TYPE_UINT64: return takeNumber<uint64_t>(raw, row);
  case TAV_TYPE_SINT64: return takeNumber<int64_t>(raw, row);
  case TAV_TYPE_UINT128:
  case TAV_TYPE_SINT128: return raw.size == 2 * sizeof(uint64_t) ? ValueKind::wide : ValueKind::bytes;
  case TAV_TYPE_BYTE:
    number[row] = raw.size == 1 ? *raw.bytes : 0;
    return raw.size == 1 ? ValueKind::number : ValueKind::bytes;
  case TAV_TYPE_UTC_TIMESTAMP: return takeTime(raw, row);
  case TAV_TYPE_ASCII_STRING: return ValueKind::text;
  case TAV_TYPE_UTF8_STRING: return raw.size >= sizeof(uint16_t) ? ValueKind::text : ValueKind::bytes;
  default: return ValueKind::bytes;
  }
}

inline void NodeColumns::addRow(const NodeFacts& node, int64_t parentRow)
{
  const size_t row = count_++;
  parent[row] = parentRow;
  offset[row] = node.offset;
  size[row] = node.size;
  depth[row] = static_cast<uint32_t>(node.depth);
  id[row] = node.elm;
  type[row] = node.type;
  key[row] = node.key;
  number[row] = 0;
  time[row] = kNoTime;
  kind[row] = ValueKind::none;
  if (node.payload == nullptr)
  {
    return;
  }
  const ValueKind found = classify({node.type, node.payload, node.size, node.swapped}, row);
  kind[row] = found;
  if (found == ValueKind::text || found == ValueKind::bytes || found == ValueKind::wide)
  {
    place_[row] = static_cast<uint32_t>(rests_.size());
    rests_.push_back({node.payload, node.swapped});
  }
}

} // namespace tav::inspect
