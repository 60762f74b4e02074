// From values of a JSON document to payloads.
#include <algorithm>
#include <bit>
#include <charconv>
#include <cstring>
#include <limits>

#include "inspect/json/encoder.h"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

template<class Number>
bool parseWhole(std::string_view text, Number& value)
{
  const char* const end = text.data() + text.size();
  const auto result = std::from_chars(text.data(), end, value);
  return result.ec == std::errc() && result.ptr == end;
}

template<class Number>
std::string wholeBytes(const std::string& text, uint16_t type)
{
  Number value{};
  if (!parseWhole(text, value))
  {
    throw BuildError(quoted(text) + " is no value for " + typeText(type) + ": whole numbers from " +
                     std::to_string(std::numeric_limits<Number>::min()) + " to " +
                     std::to_string(std::numeric_limits<Number>::max()) + " are");
  }
  return {reinterpret_cast<const char*>(&value), sizeof value};
}

std::string integerBytes(const std::string& text, uint16_t type)
{
  switch (type)
  {
  case TAV_TYPE_UINT8:
  case TAV_TYPE_BYTE: return wholeBytes<uint8_t>(text, type);
  case TAV_TYPE_SINT8: return wholeBytes<int8_t>(text, type);
  case TAV_TYPE_UINT16: return wholeBytes<uint16_t>(text, type);
  case TAV_TYPE_SINT16: return wholeBytes<int16_t>(text, type);
  case TAV_TYPE_UINT32: return wholeBytes<uint32_t>(text, type);
  case TAV_TYPE_SINT32: return wholeBytes<int32_t>(text, type);
  case TAV_TYPE_UINT64: return wholeBytes<uint64_t>(text, type);
  case TAV_TYPE_SINT64: return wholeBytes<int64_t>(text, type);
  default: break;
  }
  const auto value = parseInt128(text, type == TAV_TYPE_SINT128);
  if (!value)
  {
    throw BuildError(quoted(text) + " is no value for " + typeText(type));
  }
  return {reinterpret_cast<const char*>(value->data()), value->size()};
}

std::string dateBytes(const std::string& text)
{
  const auto stamp = parseDate(text);
  if (!stamp)
  {
    throw BuildError(quoted(text) + " is no date that a timestamp holds; 2024-02-29T10:30:00.123456+01:00 is");
  }
  return {reinterpret_cast<const char*>(&*stamp), sizeof *stamp};
}

bool isInteger(uint16_t type)
{
  return (type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64) || type == TAV_TYPE_UINT128 || type == TAV_TYPE_SINT128 ||
         type == TAV_TYPE_BYTE;
}

/// The value in host order.
std::string hostBytes(const Draft& draft, uint16_t type)
{
  const bool text = draft.given == Given::text;
  if (isInteger(type) && (text || draft.given == Given::integer))
  {
    return integerBytes(draft.value, type);
  }
  if (type == TAV_TYPE_UTC_TIMESTAMP && (text || draft.given == Given::date))
  {
    return text ? dateBytes(draft.value) : draft.value;
  }
  if (type == TAV_TYPE_UINT64_ARRAY && (draft.given == Given::array || (text && draft.value.empty())))
  {
    return draft.value;
  }
  const bool asText = type == TAV_TYPE_ASCII_STRING || type == TAV_TYPE_UTF8_STRING || type == TAV_TYPE_BINARY ||
                      !typeInfo(type).known;
  const bool emptyArray = draft.given == Given::array && draft.value.empty();
  if (!asText || (!text && !emptyArray))
  {
    static constexpr const char* kinds[] = {"no value", "a text", "a number", "an array of numbers", "a date"};
    throw BuildError(std::string(kinds[static_cast<size_t>(draft.given)]) + " is no value for " + typeText(type));
  }
  if (type != TAV_TYPE_UTF8_STRING || draft.begun)
  {
    return draft.value;
  }
  const uint16_t codePage = draft.codePage.value_or(kUsualCodePage);
  return std::string(reinterpret_cast<const char*>(&codePage), sizeof codePage) + draft.value;
}

void reverseOrder(std::string& bytes, uint16_t type)
{
  const SwapRule rule = typeInfo(type).swapRule;
  const uint64_t prefix = swappedPrefix(rule, bytes.size());
  const std::string stored = bytes.substr(0, static_cast<size_t>(prefix));
  swapPayload(rule, reinterpret_cast<const uint8_t*>(stored.data()), reinterpret_cast<uint8_t*>(bytes.data()), prefix);
}

} // namespace

uint16_t typeFor(const Draft& draft)
{
  switch (draft.given)
  {
  case Given::text:
  {
    const auto isAscii = [](char c) { return static_cast<uint8_t>(c) < 0x80; };
    const bool ascii = !draft.codePage && std::all_of(draft.value.begin(), draft.value.end(), isAscii);
    return ascii ? TAV_TYPE_ASCII_STRING : TAV_TYPE_UTF8_STRING;
  }
  case Given::integer:
  {
    uint64_t positive = 0;
    int64_t negative = 0;
    if (draft.isTruth)
    {
      return TAV_TYPE_UINT8;
    }
    if (parseWhole(draft.value, positive))
    {
      return positive <= 0xFFFFFFFF ? TAV_TYPE_UINT32 : TAV_TYPE_UINT64;
    }
    if (parseWhole(draft.value, negative))
    {
      return negative >= INT32_MIN ? TAV_TYPE_SINT32 : TAV_TYPE_SINT64;
    }
    return draft.value.starts_with('-') ? TAV_TYPE_SINT128 : TAV_TYPE_UINT128;
  }
  case Given::array: return TAV_TYPE_UINT64_ARRAY;
  case Given::date: return TAV_TYPE_UTC_TIMESTAMP;
  case Given::bytes: return TAV_TYPE_BINARY;
  default: throw BuildError("the node has neither a value nor children");
  }
}

std::string payloadFor(const Draft& draft, uint16_t type, bool swapped, bool reorder)
{
  if (draft.given == Given::bytes)
  {
    std::string bytes = draft.value;
    // Of a long value, what has a byte order is in front, but for arrays.
    if (reorder && (!draft.begun || typeInfo(type).swapRule == SwapRule::all64))
    {
      reverseOrder(bytes, type);
    }
    return bytes;
  }
  std::string bytes = hostBytes(draft, type);
  if (swapped && (!draft.begun || typeInfo(type).swapRule == SwapRule::all64))
  {
    reverseOrder(bytes, type);
  }
  return bytes;
}

} // namespace tav::inspect
