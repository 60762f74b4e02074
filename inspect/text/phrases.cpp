#include "tav/inspect/phrases.hpp"

#include <cstdio>
#include <iterator>

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
  double value = static_cast<double>(bytes) / 1024;
  size_t unit = 0;
  while (value >= 1024 && unit + 1 < std::size(units))
  {
    value /= 1024;
    ++unit;
  }
  char text[32];
  std::snprintf(text, sizeof text, "%.1f %s", value, units[unit]);
  return text;
}

} // namespace tav::inspect
