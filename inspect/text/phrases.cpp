#include "tav/inspect/phrases.hpp"

#include "tav/codes.h"

namespace tav::inspect
{

std::string_view codeSentence(uint32_t code)
{
  switch (code)
  {
#define TAV_SENTENCE(name, value, sentence) \
  case value:                               \
    return sentence;
    TAV_CODE_LIST(TAV_SENTENCE)
#undef TAV_SENTENCE
  default:
    return "unknown code";
  }
}

std::string hexOffset(uint64_t offset)
{
  std::string text;
  appendHexOffset(text, offset);
  return text;
}

std::string counted(uint64_t count, std::string_view singular)
{
  std::string text = std::to_string(count);
  text += ' ';
  text += singular;
  if (count != 1)
  {
    text += 's';
  }
  return text;
}

std::string byteText(uint64_t bytes)
{
  static constexpr const char* units[] = {"KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
  if (bytes < 10000)
  {
    return counted(bytes, "byte");
  }
  unsigned shift = 10;
  size_t unit = 0;
  while (bytes >> shift >= 1024)
  {
    shift += 10;
    ++unit;
  }
  // Tenths, and what is left of the tenth below: a half goes to the even one, as printf has it.
  const uint64_t part = (bytes & ((uint64_t{1} << shift) - 1)) * 10;
  const uint64_t half = uint64_t{1} << (shift - 1);
  const uint64_t left = part & ((uint64_t{1} << shift) - 1);
  uint64_t tenths = (bytes >> shift) * 10 + (part >> shift);
  tenths += left > half || (left == half && tenths % 2 != 0) ? 1 : 0;
  std::string text = std::to_string(tenths / 10);
  text += '.';
  text += static_cast<char>('0' + tenths % 10);
  text += ' ';
  text += units[unit];
  return text;
}

} // namespace tav::inspect
