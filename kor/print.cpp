#include <algorithm>
#include <climits>
#include <cstdarg>
#include <cstddef>
#include <cstdint>
#include <cstdio>

#include "tav/kor.h"

uint32_t korSnprintf(char* pBuffer, uint64_t bufferSize, const char* pFormat, ...)
{
  if (pBuffer == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  if (bufferSize != 0)
  {
    pBuffer[0] = '\0';
  }
  if (pFormat == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }

  // The length that comes back is an int, so that no text is longer; more room than that is none of its business, and
  // the size of a buffer that is said to be larger may not even be a number here.
  const auto room = static_cast<std::size_t>(std::min<uint64_t>(bufferSize, INT_MAX));
  va_list arguments;
  va_start(arguments, pFormat);
  const int wanted = std::vsnprintf(pBuffer, room, pFormat, arguments);
  va_end(arguments);

  if (wanted < 0)
  {
    if (bufferSize != 0)
    {
      pBuffer[0] = '\0'; // a format that fails half-way has stored its first half
    }
    return TAV_RC_BAD_PARAM;
  }
  return static_cast<std::size_t>(wanted) < room ? TAV_RC_OK : TAV_RC_NO_MEMORY;
}
