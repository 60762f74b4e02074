#include "tools/shell/temporary.h"

#include "kor/host.h"

namespace tav::tool
{

Temporary::Temporary()
{
  const kor::HeldInterrupts held;
  path_ = inspect::openTemporary(file_, kor::processId());
  if (kor::removeFile(path_))
  {
    path_.clear();
    return;
  }
  kor::removeOnInterrupt(path_);
}

Temporary::~Temporary()
{
  file_.close();
  if (!path_.empty())
  {
    kor::removeFile(path_);
    kor::keepOnInterrupt(path_);
  }
}

} // namespace tav::tool
