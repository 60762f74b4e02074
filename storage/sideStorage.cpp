#include "kor/shared.h"
#include "tav/probes.h"
#include "tav/tav.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr uint64_t kDefaultIoUnit = 0x10000;

}

TAVSideStorage::TAVSideStorage()
    : TAVSideStorage(0, 0)
{
}

TAVSideStorage::TAVSideStorage(uint32_t storageKind, uint64_t attributeBits)
    : kind(storageKind), attributes(attributeBits), ioUnit(kDefaultIoUnit), status(TAV_RC_OK)
{
  const TraceFrame frame(probe::sideStorage);
  frame.dump(0, kind, attributes);
}

TAVSideStorage::~TAVSideStorage()
{
  const TraceFrame frame(probe::sideStorageEnd);
  // A caller that still holds the storage may ask it: the store is made although the object ends here.
  kor::store(status, TAV_STATUS_DESTROYED);
}

uint32_t TAVSideStorage::getStatus() const
{
  const TraceFrame frame(probe::ssGetStatus);
  frame.dump(100, status);
  return status;
}

bool TAVSideStorage::hasAttributes(uint64_t mask) const
{
  const TraceFrame frame(probe::ssHasAttributes);
  frame.dump(0, mask);
  const bool has = (attributes & mask) >= mask;
  frame.dump(100, has);
  return has;
}
