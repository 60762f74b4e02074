#include <algorithm>
#include <cstdarg>
#include <cstdio>

#include "tav/kor.h"

uint64_t korSnprintf(char* pBuffer, uint64_t bufferSize, const char* pFormat, ...)
{
  if (pBuffer == nullptr || bufferSize == 0) return 0;
  pBuffer[0] = '\0';
  if (pFormat == nullptr) return 0;

  va_list arguments;
  va_start(arguments, pFormat);
  const int wanted = std::vsnprintf(pBuffer, bufferSize, pFormat, arguments);
  va_end(arguments);

  if (wanted < 0)
  {
    pBuffer[0] = '\0'; // a format that fails half-way has stored its first half
    return 0;
  }
  return std::min(static_cast<uint64_t>(wanted), bufferSize - 1);
}
