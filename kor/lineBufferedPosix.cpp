#include "kor/port.h"

#if __has_include(<stdio_ext.h>)
#include <stdio_ext.h>
#define TAV_HAS_FLBF
#endif

namespace tav::kor
{

bool isLineBuffered(std::FILE* stream)
{
#if defined(TAV_HAS_FLBF)
  return __flbf(stream) != 0;
#else
  static_cast<void>(stream);
  return true;
#endif
}

} // namespace tav::kor
