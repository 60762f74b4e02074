#include "inspect/text/bytes.h"

#include <string>

#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

void failAtLength(const ByteSource& source, uint64_t offset, uint64_t count)
{
  throw Error(Problem{.file = source.name(),
                      .offset = offset,
                      .sentence = "a value of " + std::to_string(count) + " bytes is more than memory can have here",
                      .code = TAV_RC_NO_MEMORY});
}

} // namespace tav::inspect
