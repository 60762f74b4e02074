/// The handle's life: open, close, reset, and what it sits on.
#include <cstring>
#include <new>

#include "api/ownedHandle.h"
#include "tav/probes.h"
#include "tav/tav.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

// What the allocator's records name as the caller.
constexpr const char* kUnit = "tavAPI";
constexpr uint32_t kMakeLine = 465;
constexpr uint32_t kRefusedLine = 602;
constexpr uint32_t kEndLine = 772;
constexpr uint64_t kModeBits = TAV_OPT_READ | TAV_OPT_WRITE | TAV_OPT_UPDATE;

bool hasOneMode(uint64_t options)
{
  const uint64_t mode = options & kModeBits;
  return mode != 0 && (mode & (mode - 1)) == 0;
}

void fillHandle(TAVHandle& handle, const TAVInitParam& param)
{
  handle.initVersion = param.getVersion();
  handle.version = TAV_STRUCT_VERSION;
  handle.curOffset = 0;
  handle.pDirectData = nullptr;
  handle.directDataSize = 0;
  handle.streamBytes = 0;
  handle.pCircularBuf = nullptr;
  handle.pSideStorage = param.pSideStorage;
  handle.pHdrStack = nullptr;
  handle.options = param.options;
  handle.alignMode = param.alignMode;
  handle.swapBytes = param.byteOrder == TAV_BYTE_ORDER_SWAPPED ? 1 : 0;
}

/// Takes the storage's block as the stream.
uint32_t attachMemory(TAVHandle& handle)
{
  handle.pCircularBuf = nullptr;
  handle.options |= TAV_OPT_DIRECT;
  void* block = handle.pDirectData; // a storage that refuses leaves them as they were
  uint64_t size = handle.directDataSize;
  const uint32_t rc = handle.pSideStorage->getMemory(&block, &size);
  handle.pDirectData = static_cast<uint8_t*>(block);
  handle.directDataSize = size;
  return rc;
}

uint32_t attachRing(TAVHandle& handle, uint64_t ringBytes)
{
  uint32_t rc = TAV_RC_OK;
  handle.pCircularBuf = new (std::nothrow) TAVCircularBuf(handle.pSideStorage, ringBytes, &rc);
  if (handle.pCircularBuf == nullptr)
  {
    return TAV_RC_NO_MEMORY;
  }
  return (handle.options & TAV_OPT_UPDATE) != 0 ? TAV_RC_NOT_SUPPORTED : rc;
}

uint32_t attachHdrStack(TAVHandle& handle)
{
  if ((handle.options & TAV_OPT_NO_HDR_STACK) != 0)
  {
    return TAV_RC_OK;
  }
  handle.pHdrStack = new (std::nothrow) TAVHdrStack;
  return handle.pHdrStack != nullptr ? TAV_RC_OK : TAV_RC_NO_HDR_STACK;
}

uint32_t attachCompanions(TAVHandle& handle, uint64_t ringBytes)
{
  if ((handle.options & TAV_OPT_READ) != 0)
  {
    handle.options |= TAV_OPT_NO_HDR_STACK;
  }
  const uint32_t rc = handle.pSideStorage->hasAttributes(TAV_ATTR_DIRECT) ? attachMemory(handle)
                                                                          : attachRing(handle, ringBytes);
  return rc == TAV_RC_OK ? attachHdrStack(handle) : rc;
}

void freeHandle(TAVHandle** inout, uint32_t line)
{
  void* block = *inout;
  korMemFree(&block, 0, 0, kUnit, line);
  *inout = static_cast<TAVHandle*>(block);
}

void destroyRing(TAVHandle& handle)
{
  delete handle.pCircularBuf;
  handle.pCircularBuf = nullptr;
}

void destroyHdrStack(TAVHandle& handle)
{
  delete handle.pHdrStack;
  handle.pHdrStack = nullptr;
}

uint32_t allocateHandle(TAVHandle** out)
{
  void* block = nullptr;
  const uint32_t rc = korMemAlloc(&block, 0, sizeof(OwnedHandle), KOR_MEM_PLAIN, kUnit, kMakeLine);
  // All of it is set: a trace shows the bytes between the fields, too.
  *out = rc == TAV_RC_OK ? &(new (std::memset(block, 0, sizeof(OwnedHandle))) OwnedHandle)->handle : nullptr;
  return rc;
}

} // namespace

uint32_t tavInitHandle(TAVHandle** out, TAVInitParam* param)
{
  TraceFrame frame(probe::initHandle);
  frame.dump(0, out, " List of options used to configure tav APIs ", trace::record(param));
  korOneTimeOnly();
  if (out != nullptr)
  {
    *out = nullptr;
  }
  if (!frame.require(10, out != nullptr, TAV_RC_BAD_PARAM) || !frame.require(20, param != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, param->pSideStorage != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(40, param->pSideStorage->getStatus() == TAV_RC_OK, TAV_RC_BAD_PARAM) ||
      !frame.require(50, hasOneMode(param->options), TAV_RC_BAD_PARAM) || !frame.step(70, allocateHandle(out)))
  {
    return frame.code();
  }
  TAVHandle& handle = **out;
  fillHandle(handle, *param);
  frame.dump(60, handle.swapBytes);
  if (frame.keep(attachCompanions(handle, param->circularBufSize)))
  {
    frame.dump(200, handle.options, "tav handle", trace::record(&handle));
    return frame.code();
  }
  destroyRing(handle);
  destroyHdrStack(handle);
  freeHandle(out, kRefusedLine);
  frame.report(210, frame.code());
  return frame.code();
}

uint32_t tavTermHandle(TAVHandle** inout)
{
  TraceFrame frame(probe::termHandle);
  if (!frame.require(10, inout != nullptr, TAV_RC_BAD_PARAM) ||
      !(*inout != nullptr || frame.keep(TAV_RC_BAD_PARAM)))
  {
    return frame.code();
  }
  TAVHandle& handle = **inout;
  frame.dump(100, "tav handle to be terminated", trace::record(&handle));
  destroyHdrStack(handle);
  destroyRing(handle);
  forgetPairs(handle);
  freeHandle(inout, kEndLine);
  return frame.code();
}

uint32_t tavResetHandle(TAVHandle* handle, TAVResetParam* resetParam)
{
  TraceFrame frame(probe::resetHandle);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, resetParam != nullptr, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  frame.dump(30, handle, "Reset parameter structure", resetParam);
  forgetPairs(*handle);
  handle->streamBytes = 0;
  handle->curOffset = 0;
  if (handle->pSideStorage->hasAttributes(TAV_ATTR_DIRECT))
  {
    static_cast<void>(frame.step(40, attachMemory(*handle)));
  }
  else
  {
    handle->pDirectData = nullptr;
    handle->directDataSize = 0;
  }
  if (handle->pCircularBuf != nullptr)
  {
    handle->pCircularBuf->reset();
  }
  if (handle->pHdrStack != nullptr)
  {
    handle->pHdrStack->count = 0;
  }
  frame.dump(1000, "tav handle after reset", trace::record(handle));
  return frame.code();
}

uint32_t tavGetSideStorage(TAVHandle* handle, TAVSideStorage** outStorage, uint64_t* outBytes)
{
  TraceFrame frame(probe::getSideStorage);
  frame.dump(0, handle, outStorage, outBytes);
  if (frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) &&
      frame.require(20, outStorage != nullptr, TAV_RC_BAD_PARAM) &&
      frame.require(30, outBytes != nullptr, TAV_RC_BAD_PARAM))
  {
    *outStorage = handle->pSideStorage;
    *outBytes = handle->streamBytes;
    frame.dump(100, *outStorage, *outBytes);
  }
  return frame.code();
}
