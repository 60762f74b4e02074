#include "kor/port.h"

namespace tav::kor
{

/// The system's C library takes line buffering for full buffering.
bool isLineBuffered(std::FILE* /*stream*/)
{
  return false;
}

} // namespace tav::kor
