/// How a path with many steps is written.
#pragma once

#include <cstdint>
#include <string>

#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// `append(text, i)` appends the step `i`, from 0 on. A brief text has the first and the last of many.
template<class Append>
void appendSteps(std::string& text, uint64_t steps, PathStyle style, Append append)
{
  const bool cut = style == PathStyle::brief && steps > kWholeSteps;
  for (uint64_t i = 0; i < steps; ++i)
  {
    if (cut && i == kFirstSteps)
    {
      text += "/\xE2\x80\xA6";
      i = steps - kLastSteps;
    }
    append(text, i);
  }
}

template<class Append>
std::string textOfSteps(uint64_t steps, PathStyle style, Append append)
{
  std::string text;
  appendSteps(text, steps, style, append);
  return text;
}

} // namespace tav::inspect
