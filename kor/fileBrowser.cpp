// A page in a browser has no files of a system: what it was given, and what it makes, is with the worker around the
// module, which answers these calls. The names say what they want; numbers below 0 are refusals.
#include <cstring>

#include "kor/fileNative.h"

#define HOST(name) __attribute__((import_module("host"), import_name(#name)))

extern "C" {
/// A number of the file; -1: there is none, -2: it cannot be written.
HOST(open)
int32_t hostOpen(const char* path, uint32_t length, uint32_t write, uint32_t create);
HOST(close)
void hostClose(int32_t file);
/// Bytes done at the place where the file stands, which goes behind them; -1: the browser refused.
HOST(read)
int32_t hostRead(int32_t file, void* to, uint32_t length);
HOST(write)
int32_t hostWrite(int32_t file, const void* from, uint32_t length);
HOST(seek)
void hostSeek(int32_t file, uint64_t offset);
HOST(place)
uint64_t hostPlace(int32_t file);
HOST(size)
uint64_t hostSize(int32_t file);
HOST(setSize)
int32_t hostSetSize(int32_t file, uint64_t size);
}

namespace tav::kor
{

namespace
{

constexpr std::size_t kMostAtOnce = std::size_t{1} << 30U;

int32_t numberOf(intptr_t file)
{
  return static_cast<int32_t>(file);
}

uint32_t lengthOf(std::size_t length)
{
  return static_cast<uint32_t>(length < kMostAtOnce ? length : kMostAtOnce);
}

} // namespace

const bool kOpenFileHoldsName = false;

uint32_t openNative(const char* pPath, const OpenMode& mode, intptr_t& file)
{
  const int32_t opened =
      hostOpen(pPath, static_cast<uint32_t>(std::strlen(pPath)), mode.write ? 1 : 0, mode.create ? 1 : 0);
  if (opened < 0)
  {
    return opened == -1 ? KOR_RC_NO_SUCH_FILE : KOR_RC_WRONG_ACCESS;
  }
  file = opened;
  return TAV_RC_OK;
}

uint32_t closeNative(intptr_t file)
{
  hostClose(numberOf(file));
  return TAV_RC_OK;
}

uint32_t readSome(intptr_t file, void* bytes, std::size_t length, std::size_t& done)
{
  const int32_t count = hostRead(numberOf(file), bytes, lengthOf(length));
  done = count < 0 ? 0 : static_cast<std::size_t>(count);
  return count < 0 ? KOR_RC_IO_ERROR : TAV_RC_OK;
}

uint32_t writeSome(intptr_t file, const void* bytes, std::size_t length, std::size_t& done)
{
  const int32_t count = hostWrite(numberOf(file), bytes, lengthOf(length));
  done = count < 0 ? 0 : static_cast<std::size_t>(count);
  return count <= 0 ? KOR_RC_IO_ERROR : TAV_RC_OK;
}

uint32_t seekNative(intptr_t file, int64_t offset, uint64_t& position)
{
  hostSeek(numberOf(file), static_cast<uint64_t>(offset));
  position = static_cast<uint64_t>(offset);
  return TAV_RC_OK;
}

bool moveBack(intptr_t file, int64_t distance)
{
  hostSeek(numberOf(file), hostPlace(numberOf(file)) - static_cast<uint64_t>(distance));
  return true;
}

uint32_t lockNative(intptr_t, bool, bool, bool)
{
  return TAV_RC_OK; // nobody else has the file
}

uint32_t unlockNative(intptr_t)
{
  return TAV_RC_OK;
}

uint32_t sizeNative(intptr_t file, uint64_t& size)
{
  size = hostSize(numberOf(file));
  return TAV_RC_OK;
}

uint32_t setSizeNative(intptr_t file, int64_t size)
{
  return hostSetSize(numberOf(file), static_cast<uint64_t>(size)) == 0 ? TAV_RC_OK : KOR_RC_WRONG_ACCESS;
}

uint32_t syncNative(intptr_t)
{
  return TAV_RC_OK;
}

uint32_t syncDataNative(intptr_t)
{
  return TAV_RC_OK;
}

uint32_t syncFolderNative(const char*)
{
  return TAV_RC_OK;
}

uint32_t copyRightsNative(intptr_t, intptr_t)
{
  return TAV_RC_OK;
}

bool isAtNative(intptr_t, const char*)
{
  return true;
}

uint32_t findDataNative(intptr_t, uint64_t offset, uint64_t& found)
{
  found = offset; // a browser does not tell of holes
  return TAV_RC_OK;
}

uint32_t mapNative(intptr_t, void*&, uint64_t&)
{
  return TAV_RC_NOT_SUPPORTED;
}

void unmapNative(void*, uint64_t) {}

void readAheadNative(void*, uint64_t) {}

bool isDeviceNative(const char*)
{
  return false;
}

uint32_t listFolderNative(const char*, KORFileNameVisit, void*)
{
  return TAV_RC_NOT_SUPPORTED;
}

uint32_t renameNative(const char*, const char*)
{
  return TAV_RC_NOT_SUPPORTED;
}

} // namespace tav::kor
