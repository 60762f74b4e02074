#include "tools/shell/temporary.h"

#include "tools/host/host.h"

namespace tav::tool
{

Temporary::Temporary()
{
  const host::HeldInterrupts held;
  path_ = inspect::openTemporary(file_, host::processId());
  if (host::removeFile(path_))
  {
    path_.clear();
    return;
  }
  host::removeOnInterrupt(path_);
}

Temporary::~Temporary()
{
  file_.close();
  if (!path_.empty())
  {
    host::removeFile(path_);
    host::keepOnInterrupt(path_);
  }
}

} // namespace tav::tool
