#include <algorithm>
#include <new>

#include "tav/probes.h"
#include "tav/tav.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr uint64_t kFileAttributes = 0x38; // can seek, and two bits of no use here
constexpr uint64_t kFileIoUnit = 0x100000;

uint64_t attributesOf(uint64_t openOptions)
{
  uint64_t attributes = kFileAttributes;
  if ((openOptions & (KOR_FILE_READ | KOR_FILE_UPDATE)) != 0)
  {
    attributes |= TAV_ATTR_READ_FORWARD | TAV_ATTR_READ_BACKWARD;
  }
  if ((openOptions & (KOR_FILE_WRITE | KOR_FILE_UPDATE)) != 0)
  {
    attributes |= TAV_ATTR_WRITABLE;
  }
  return attributes;
}

uint32_t seekFile(KORHFile& file, uint64_t offset, uint64_t& landed)
{
  KORFileSeekParam param;
  param.offset = offset;
  return file.seek(&param, &landed);
}

/// Brings the file to the cursor; a file that lands elsewhere must not be read or written there.
uint32_t seekToCursor(TraceFrame& frame, uint32_t point, KORHFile& file, uint64_t offset)
{
  uint64_t landed = 0;
  if (frame.step(point, seekFile(file, offset, landed)))
  {
    static_cast<void>(frame.require(point, landed == offset, TAV_RC_NO_MEMORY));
  }
  return frame.code();
}

/// Bytes that came together with success or with the end of the file count; bytes of a failed read do not.
bool bytesCount(uint32_t code)
{
  return code == TAV_RC_OK || code == TAV_RC_END_OF_STORAGE;
}

} // namespace

TAVSSFile::TAVSSFile(KORFileOpenParam* openParam, uint32_t* rc)
    : TAVSideStorage(TAV_STORAGE_FILE, 0), pFile(nullptr), position(0), needSeek(0)
{
  TraceFrame frame(probe::ssFile);
  frame.dump(0, trace::record(openParam), rc);
  if (!frame.require(10, openParam != nullptr && rc != nullptr, TAV_RC_BAD_PARAM))
  {
    status = frame.code();
  }
  else
  {
    pFile = new (std::nothrow) KORHFile;
    if (frame.require(20, pFile != nullptr, TAV_RC_NO_MEMORY))
    {
      attributes = attributesOf(openParam->options);
      ioUnit = kFileIoUnit;
      if (!frame.step(30, pFile->open(openParam)))
      {
        delete pFile;
        pFile = nullptr;
      }
      else
      {
        frame.dump(100, pFile, attributes, ioUnit);
      }
    }
    status = frame.code();
  }
  if (rc != nullptr)
  {
    *rc = status;
  }
}

TAVSSFile::~TAVSSFile()
{
  TraceFrame frame(probe::ssFileEnd);
  if (pFile != nullptr)
  {
    static_cast<void>(frame.step(10, pFile->close()));
    delete pFile;
    pFile = nullptr;
  }
  position = 0;
  needSeek = 0;
}

uint32_t TAVSSFile::seek(uint64_t offset, uint64_t hint)
{
  TraceFrame frame(probe::ssFileSeek);
  frame.dump(0, offset, hint);
  uint64_t landed = 0;
  if (frame.require(10, pFile != nullptr, KOR_RC_NOT_OPEN) && frame.step(20, seekFile(*pFile, offset, landed)))
  {
    position = offset;
    frame.dump(100, position);
  }
  return frame.code();
}

uint32_t TAVSSFile::getPosition(uint64_t* pPosition)
{
  TraceFrame frame(probe::ssFileGetPosition);
  frame.dump(0, pPosition);
  if (frame.require(110, pPosition != nullptr, TAV_RC_BAD_PARAM))
  {
    *pPosition = position;
    frame.dump(100, position);
  }
  return frame.code();
}

uint32_t TAVSSFile::getTotalSize(uint64_t* pSize)
{
  TraceFrame frame(probe::ssFileGetTotalSize);
  frame.dump(0, pSize);
  uint64_t size = 0;
  if (frame.require(10, pSize != nullptr, TAV_RC_BAD_PARAM) && frame.require(20, pFile != nullptr, KOR_RC_NOT_OPEN) &&
      frame.step(30, pFile->getSize(&size)))
  {
    *pSize = size;
    frame.dump(100, size);
  }
  return frame.code();
}

namespace
{

uint32_t readForward(TraceFrame& frame, TAVSSFile& storage, uint64_t wanted, void* buffer, uint64_t& done)
{
  if (!frame.require(20, buffer != nullptr || wanted == 0, TAV_RC_BAD_PARAM) ||
      (storage.needSeek != 0 && seekToCursor(frame, 100, *storage.pFile, storage.position) != TAV_RC_OK))
  {
    return frame.code();
  }
  KORFileReadParam param;
  param.length = wanted;
  uint64_t got = 0;
  static_cast<void>(frame.step(30, storage.pFile->read(&param, buffer, &got)));
  if (bytesCount(frame.code()))
  {
    done = got;
    storage.position += got;
  }
  return frame.code();
}

uint32_t readBackward(TraceFrame& frame, TAVSSFile& storage, uint64_t wanted, uint8_t* buffer, uint64_t bufSize,
                      uint64_t& done)
{
  if (!frame.require(210, storage.position != 0, TAV_RC_END_OF_STORAGE))
  {
    return frame.code();
  }
  KORFileReadParam param;
  param.length = std::min({storage.position, wanted, bufSize});
  const uint64_t start = storage.position - param.length;
  if (!frame.require(20, buffer != nullptr || param.length == 0, TAV_RC_BAD_PARAM) ||
      seekToCursor(frame, 40, *storage.pFile, start) != TAV_RC_OK)
  {
    return frame.code();
  }
  uint64_t got = 0;
  uint8_t* const to = buffer != nullptr ? buffer + (bufSize - param.length) : nullptr;
  static_cast<void>(frame.step(50, storage.pFile->read(&param, to, &got)));
  storage.position = start;
  storage.needSeek = 1; // the file now is behind the bytes, the cursor before them
  if (bytesCount(frame.code()))
  {
    done = got;
  }
  return frame.code();
}

} // namespace

uint32_t TAVSSFile::read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool zeroCopy,
                         bool backward)
{
  TraceFrame frame(probe::ssFileRead);
  frame.dump(0, wanted, ppData, bufSize, pRead, zeroCopy, backward);
  if (!frame.require(240, ppData != nullptr && pRead != nullptr, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  *pRead = 0;
  const uint64_t direction = backward ? TAV_ATTR_READ_BACKWARD : TAV_ATTR_READ_FORWARD;
  if (zeroCopy || (attributes & direction) == 0)
  {
    static_cast<void>(wanted != 0 ? frame.fail(230, TAV_RC_NOT_SUPPORTED) : frame.fail(220, TAV_RC_BAD_PARAM));
    return frame.code();
  }
  if (!frame.require(10, pFile != nullptr, KOR_RC_NOT_OPEN))
  {
    return frame.code();
  }
  auto* const buffer = static_cast<uint8_t*>(*ppData);
  if (backward)
  {
    readBackward(frame, *this, wanted, buffer, bufSize, *pRead);
  }
  else
  {
    readForward(frame, *this, std::min(wanted, bufSize), buffer, *pRead);
  }
  frame.dump(100, *pRead, position);
  return frame.code();
}

uint32_t TAVSSFile::write(const void* pData, uint64_t size, uint64_t* pWritten)
{
  TraceFrame frame(probe::ssFileWrite);
  frame.dump(0, pData, size, pWritten);
  if (!frame.require(10, pData != nullptr && pWritten != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(160, (attributes & TAV_ATTR_WRITABLE) != 0, TAV_RC_NOT_SUPPORTED) ||
      !frame.require(20, pFile != nullptr, KOR_RC_NOT_OPEN) ||
      (needSeek != 0 && seekToCursor(frame, 30, *pFile, position) != TAV_RC_OK))
  {
    return frame.code();
  }
  KORFileWriteParam param;
  param.pData = pData;
  param.length = size;
  uint64_t done = 0;
  static_cast<void>(frame.step(40, pFile->write(&param, &done)));
  *pWritten = done;
  position += done;
  frame.dump(100, done, position);
  return frame.code();
}

uint32_t TAVSSFile::getMemory(void** ppData, uint64_t* pSize)
{
  TraceFrame frame(probe::ssFileGetMemory);
  frame.dump(0, ppData, pSize);
  static_cast<void>(frame.fail(10, TAV_RC_NOT_SUPPORTED));
  return frame.code();
}

uint32_t TAVSSFile::lock(uint32_t mode)
{
  TraceFrame frame(probe::ssFileLock);
  frame.dump(0, mode);
  KORFileLockParam param;
  param.word1 = 1; // exclusive
  param.word2 = 2; // refuse at once
  static_cast<void>(frame.require(10, pFile != nullptr, KOR_RC_NOT_OPEN) && frame.step(20, pFile->lock(&param)));
  return frame.code();
}

uint32_t TAVSSFile::unlock()
{
  TraceFrame frame(probe::ssFileUnlock);
  static_cast<void>(frame.require(10, pFile != nullptr, KOR_RC_NOT_OPEN) && frame.step(20, pFile->unlock()));
  return frame.code();
}
