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
[[gnu::always_inline]] inline NodeColumns::Word NodeColumns::numberIn(const tav::detail::RawValue& raw)
{
  Number value{};
  if (tav::detail::decode(raw, value) != TAV_RC_OK)
  {
    return {ValueKind::bytes};
  }
  if constexpr (std::is_signed_v<Number>)
  {
    return {ValueKind::number, static_cast<uint64_t>(static_cast<int64_t>(value))};
  }
  else
  {
    return {ValueKind::number, value};
  }
}

inline NodeColumns::Word NodeColumns::timeIn(const tav::detail::RawValue& raw)
{
  TAVTimeStamp stamp{};
  if (tav::detail::decode(raw, stamp) != TAV_RC_OK)
  {
    return {ValueKind::bytes};
  }
  const std::optional<int64_t> nanoseconds = nanosecondsOf(stamp);
  return nanoseconds ? Word{ValueKind::time, 0, *nanoseconds} : Word{};
}

/// What does not have the size of its type is bytes.
[[gnu::always_inline]] inline NodeColumns::Word NodeColumns::wordIn(const tav::detail::RawValue& raw)
{
  switch (raw.type)
  {
  case TAV_TYPE_UINT8: return numberIn<uint8_t>(raw);
  case TAV_TYPE_SINT8: return numberIn<int8_t>(raw);
  case TAV_TYPE_UINT16: return numberIn<uint16_t>(raw);
  case TAV_TYPE_SINT16: return numberIn<int16_t>(raw);
  case TAV_TYPE_UINT32: return numberIn<uint32_t>(raw);
  case TAV_TYPE_SINT32: return numberIn<int32_t>(raw);
  case TAV_TYPE_UINT64: return numberIn<uint64_t>(raw);
  case TAV_TYPE_SINT64: return numberIn<int64_t>(raw);
  case TAV_TYPE_UINT128:
  case TAV_TYPE_SINT128: return {raw.size == 2 * sizeof(uint64_t) ? ValueKind::wide : ValueKind::bytes};
  case TAV_TYPE_BYTE: return raw.size == 1 ? Word{ValueKind::number, *raw.bytes} : Word{ValueKind::bytes};
  case TAV_TYPE_UTC_TIMESTAMP: return timeIn(raw);
  case TAV_TYPE_ASCII_STRING: return {ValueKind::text};
  case TAV_TYPE_UTF8_STRING: return {raw.size >= sizeof(uint16_t) ? ValueKind::text : ValueKind::bytes};
  default: return {ValueKind::bytes};
  }
}

/// Of a group, and of a data element whose value is not wanted, without one.
[[gnu::always_inline]] inline void NodeColumns::addRow(const NodeFacts& node, int64_t parentRow)
{
  const size_t row = count_++;
  parent[row] = parentRow;
  offset[row] = node.offset;
  size[row] = node.size;
  depth[row] = static_cast<uint32_t>(node.depth);
  id[row] = node.elm;
  type[row] = node.type;
  key[row] = node.key;
  const Word word = node.payload == nullptr ? Word{} : wordIn({node.type, node.payload, node.size, node.swapped});
  number[row] = word.number;
  time[row] = word.time;
  kind[row] = word.kind;
  if (isRest(word.kind))
  {
    place_[row] = static_cast<uint32_t>(rests_.size());
    rests_.push_back({node.payload, node.swapped});
  }
}

} // namespace tav::inspect
