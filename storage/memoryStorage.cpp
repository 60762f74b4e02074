#include <algorithm>
#include <cstring>

#include "tav/probes.h"
#include "tav/tav.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

// What the allocator's records name as the caller.
constexpr const char* kUnit = "tavSideStorage";
constexpr uint32_t kMakeLine = 812;
constexpr uint32_t kEndLine = 847;
constexpr uint64_t kMemoryAttributes = 0xE3; // writable, readable forward, direct memory, and a bit of no use here

} // namespace

TAVSSMemory::TAVSSMemory(uint64_t size, uint32_t* rc)
    : TAVSideStorage(TAV_STORAGE_MEMORY, kMemoryAttributes), pBuffer(nullptr), bufferSize(0), ownsBuffer(0), position(0)
{
  TraceFrame frame(probe::ssMemory);
  frame.dump(0, size, rc);
  void* block = nullptr;
  status = korMemAlloc(&block, 0, size, KOR_MEM_PLAIN, kUnit, kMakeLine);
  if (frame.step(10, status))
  {
    pBuffer = static_cast<uint8_t*>(block);
    bufferSize = size;
    ownsBuffer = 1;
    frame.dump(100, pBuffer, bufferSize);
  }
  if (rc != nullptr)
  {
    *rc = status;
  }
}

TAVSSMemory::TAVSSMemory(void* block, uint64_t size)
    : TAVSideStorage(TAV_STORAGE_MEMORY, kMemoryAttributes), pBuffer(static_cast<uint8_t*>(block)), bufferSize(size),
      ownsBuffer(0), position(0)
{
  const TraceFrame frame(probe::ssMemory);
  frame.dump(0, block, size);
  frame.dump(100, pBuffer, bufferSize);
}

TAVSSMemory::~TAVSSMemory()
{
  const TraceFrame frame(probe::ssMemoryEnd);
  if (ownsBuffer != 0 && pBuffer != nullptr)
  {
    void* block = pBuffer;
    korMemFree(&block, 0, 0, kUnit, kEndLine);
  }
  pBuffer = nullptr;
  bufferSize = 0;
  ownsBuffer = 0;
}

uint32_t TAVSSMemory::seek(uint64_t offset, uint64_t hint)
{
  TraceFrame frame(probe::ssMemorySeek);
  frame.dump(0, offset, hint);
  if (frame.require(10, offset < bufferSize, TAV_RC_BAD_PARAM))
  {
    position = offset;
    frame.dump(100, position);
  }
  return frame.code();
}

uint32_t TAVSSMemory::getPosition(uint64_t* pPosition)
{
  TraceFrame frame(probe::ssMemoryGetPosition);
  frame.dump(0, pPosition);
  if (frame.require(10, pPosition != nullptr, TAV_RC_BAD_PARAM))
  {
    *pPosition = position;
    frame.dump(100, position);
  }
  return frame.code();
}

uint32_t TAVSSMemory::getTotalSize(uint64_t* pSize)
{
  TraceFrame frame(probe::ssMemoryGetTotalSize);
  frame.dump(0, pSize);
  if (frame.require(10, pSize != nullptr, TAV_RC_BAD_PARAM))
  {
    *pSize = bufferSize;
    frame.dump(100, bufferSize);
  }
  return frame.code();
}

uint32_t TAVSSMemory::read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool zeroCopy,
                           bool backward)
{
  TraceFrame frame(probe::ssMemoryRead);
  frame.dump(0, wanted, ppData, bufSize, pRead, zeroCopy, backward);
  if (!frame.require(120, ppData != nullptr && pRead != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(110, position < bufferSize, TAV_RC_END_OF_STORAGE))
  {
    return frame.code();
  }
  uint64_t length = std::min(bufferSize - position, wanted);
  *pRead = length; // told even when there is no buffer to take it
  if (!frame.require(90, zeroCopy || *ppData != nullptr, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  if (zeroCopy)
  {
    *ppData = pBuffer + position;
  }
  else
  {
    length = std::min(length, bufSize);
    std::memcpy(*ppData, pBuffer + position, static_cast<size_t>(length));
  }
  *pRead = length;
  position += length;
  // Readers of traces know this record under the file storage's read, whichever storage it comes from.
  trace::dump(probe::ssFileRead, 100, length, position);
  return frame.code();
}

uint32_t TAVSSMemory::write(const void* pData, uint64_t size, uint64_t* pWritten)
{
  TraceFrame frame(probe::ssMemoryWrite);
  frame.dump(0, pData, size, pWritten);
  if (frame.require(120, pData != nullptr && pWritten != nullptr, TAV_RC_BAD_PARAM) &&
      frame.require(110, position < bufferSize, TAV_RC_END_OF_STORAGE) &&
      frame.require(50, size <= bufferSize - position, TAV_RC_END_OF_STORAGE))
  {
    std::memmove(pBuffer + position, pData, static_cast<size_t>(size)); // the bytes may lie in the block themselves
    position += size;
    *pWritten = size;
    frame.dump(100, size, position);
  }
  return frame.code();
}

uint32_t TAVSSMemory::getMemory(void** ppData, uint64_t* pSize)
{
  TraceFrame frame(probe::ssMemoryGetMemory);
  frame.dump(0, ppData, pSize);
  if (frame.require(110, ppData != nullptr && pSize != nullptr, TAV_RC_BAD_PARAM))
  {
    *ppData = pBuffer;
    *pSize = bufferSize;
    frame.dump(100, pBuffer, bufferSize);
  }
  return frame.code();
}

uint32_t TAVSSMemory::lock(uint32_t mode)
{
  TraceFrame frame(probe::ssMemoryLock);
  frame.dump(0, mode);
  static_cast<void>(frame.fail(10, TAV_RC_NOT_SUPPORTED));
  return frame.code();
}

uint32_t TAVSSMemory::unlock()
{
  TraceFrame frame(probe::ssMemoryUnlock);
  static_cast<void>(frame.fail(10, TAV_RC_NOT_SUPPORTED));
  return frame.code();
}
