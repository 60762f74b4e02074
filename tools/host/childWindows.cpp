#include "tav/kor.h"
#include "tools/host/child.h"

namespace tav::host
{
/// Here no file has a name as /dev/fd/3.
bool Child::isPossible()
{
  return false;
}

uint32_t Child::start(const std::string&, const std::vector<std::string>&, const ChildTexts&)
{
  return KOR_RC_OS_ERROR;
}

uint32_t Child::read(char*, size_t, size_t& count)
{
  count = 0;
  return KOR_RC_OS_ERROR;
}

int Child::wait()
{
  return -1;
}

Child::~Child() = default;
} // namespace tav::host
