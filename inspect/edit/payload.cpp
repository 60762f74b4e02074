#include "inspect/edit/payload.h"

#include <algorithm>
#include <charconv>

#include "inspect/json/encoder.h"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

[[noreturn]] void refuse(std::string_view text, uint16_t type, const std::string& why)
{
  constexpr size_t most = 60;
  throw BuildError(quoted(cutToWidth(text, most)) + " is no value for " + typeText(type) + why);
}

/// "[1 2 3]", "1 2 3", "1,2,3": the numbers in host order.
std::string arrayBytes(std::string_view text, uint16_t type)
{
  std::string_view rest = text;
  if (rest.starts_with('[') && rest.ends_with(']'))
  {
    rest = rest.substr(1, rest.size() - 2);
  }
  std::string bytes;
  const auto isBetween = [](char c) { return c == ' ' || c == ','; };
  while (!rest.empty())
  {
    const auto* const begin = std::find_if_not(rest.begin(), rest.end(), isBetween);
    const auto* const end = std::find_if(begin, rest.end(), isBetween);
    uint64_t number = 0;
    const auto result = std::from_chars(begin, end, number);
    if (begin != end && (result.ec != std::errc() || result.ptr != end))
    {
      refuse(text, type, ": whole numbers are, as [1 2 3]");
    }
    if (begin != end)
    {
      bytes.append(reinterpret_cast<const char*>(&number), sizeof number);
    }
    rest.remove_prefix(static_cast<size_t>(end - rest.begin()));
  }
  return bytes;
}

std::string hexBytesOf(std::string_view text, uint16_t type)
{
  std::string bytes;
  if (!appendHexBytes(bytes, text) || (type == TAV_TYPE_BYTE && bytes.size() != 1))
  {
    refuse(text, type, type == TAV_TYPE_BYTE ? ": two hexadecimal digits are" : ": hexadecimal bytes are, as 00ff");
  }
  return bytes;
}

void requireText(std::string_view text, uint16_t type, uint16_t codePage)
{
  const auto isHigh = [](char c) { return static_cast<uint8_t>(c) >= 0x80; };
  if (type == TAV_TYPE_ASCII_STRING && std::any_of(text.begin(), text.end(), isHigh))
  {
    refuse(text, type, ", which ends at 127; a UTF8 String takes it");
  }
  if (type == TAV_TYPE_UTF8_STRING && codePage == kUsualCodePage && !isUtf8(text))
  {
    refuse(text, type, ": it is no UTF-8");
  }
}

} // namespace

std::string payloadOfText(std::string_view text, uint16_t type, uint16_t codePage, bool swapped)
{
  Draft draft;
  draft.codePage = codePage;
  const bool isText = type == TAV_TYPE_ASCII_STRING || type == TAV_TYPE_UTF8_STRING;
  const bool isNumber = (type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64) || type == TAV_TYPE_UINT128 ||
                        type == TAV_TYPE_SINT128 || type == TAV_TYPE_UTC_TIMESTAMP;
  if (type == TAV_TYPE_UINT64_ARRAY)
  {
    draft.given = Given::array;
    draft.value = arrayBytes(text, type);
  }
  else if (isText || isNumber)
  {
    requireText(text, type, codePage);
    draft.given = Given::text;
    draft.value = text;
  }
  else
  {
    draft.given = Given::bytes;
    draft.value = hexBytesOf(text, type);
  }
  return payloadFor(draft, type, swapped, false);
}

} // namespace tav::inspect
