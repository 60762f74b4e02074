#include <algorithm>

#include "kor/fileNative.h"
#include "tav/kor.h"

namespace
{
using namespace tav::kor;

/// The most that one transfer is asked for: systems refuse or cut requests of 2 GiB and more.
constexpr uint64_t kLargestTransfer = 0x40000000;

constexpr uint64_t kAccessOptions = KOR_FILE_READ | KOR_FILE_WRITE | KOR_FILE_UPDATE;
constexpr uint64_t kOpenOptions = kAccessOptions | KOR_FILE_CREATE | KOR_FILE_TRUNCATE | KOR_FILE_EXCLUSIVE;

constexpr uint32_t kLockWord1Exclusive = 1;
constexpr uint32_t kLockWord2NoWait = 2;

template<class Param>
bool isParam(const Param* pParam)
{
  return pParam != nullptr && pParam->version == KOR_PARAM_VERSION;
}

/// False for options that have no meaning: unknown bits, no access, emptying a file that is not written to,
/// refusing an existing file without creating one.
bool resolve(const KORFileOpenParam& param, OpenMode& mode)
{
  const auto has = [&param](uint64_t option) { return (param.options & option) != 0; };
  mode.read = has(KOR_FILE_READ | KOR_FILE_UPDATE);
  mode.write = has(KOR_FILE_WRITE | KOR_FILE_UPDATE);
  mode.create = has(KOR_FILE_CREATE);
  mode.truncate = has(KOR_FILE_TRUNCATE);
  mode.exclusive = has(KOR_FILE_EXCLUSIVE);
  mode.permissions = param.permissions;
  return (param.options & ~kOpenOptions) == 0 && has(kAccessOptions) && (mode.write || !mode.truncate) &&
         (mode.create || !mode.exclusive);
}

std::size_t nextTransfer(uint64_t length, uint64_t done)
{
  return static_cast<std::size_t>(std::min(length - done, kLargestTransfer));
}
} // namespace

KORHFile::KORHFile()
    : native_(kNoFile), locked_(false) {}

KORHFile::~KORHFile()
{
  if (native_ != kNoFile)
  {
    close();
  }
}

uint32_t KORHFile::open(const KORFileOpenParam* pParam)
{
  OpenMode mode{};
  if (!isParam(pParam) || pParam->pPath == nullptr || !resolve(*pParam, mode))
  {
    return TAV_RC_BAD_PARAM;
  }
  if (native_ != kNoFile)
  {
    return KOR_RC_BUSY;
  }
  return openNative(pParam->pPath, mode, native_);
}

uint32_t KORHFile::close()
{
  if (native_ == kNoFile)
  {
    return KOR_RC_NOT_OPEN;
  }
  // Closing would leave the lock to a forked process that shares the open file.
  if (locked_)
  {
    unlockNative(native_);
  }
  const uint32_t code = closeNative(native_);
  native_ = kNoFile;
  locked_ = false;
  return code;
}

uint32_t KORHFile::read(const KORFileReadParam* pParam, void* pBuffer, uint64_t* pDone)
{
  if (pDone == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  *pDone = 0;
  if (!isParam(pParam) || (pBuffer == nullptr && pParam->length != 0))
  {
    return TAV_RC_BAD_PARAM;
  }
  if (native_ == kNoFile)
  {
    return KOR_RC_NOT_OPEN;
  }

  auto* const bytes = static_cast<uint8_t*>(pBuffer);
  while (*pDone < pParam->length)
  {
    std::size_t done = 0;
    const uint32_t code = readSome(native_, bytes + *pDone, nextTransfer(pParam->length, *pDone), done);
    if (code != TAV_RC_OK)
    {
      // What came before the failure is read again by a second attempt.
      if (*pDone != 0 && moveBack(native_, static_cast<int64_t>(*pDone)))
      {
        *pDone = 0;
      }
      return code;
    }
    if (done == 0)
    {
      return TAV_RC_END_OF_STORAGE;
    }
    *pDone += done;
  }
  return TAV_RC_OK;
}

uint32_t KORHFile::write(const KORFileWriteParam* pParam, uint64_t* pDone)
{
  if (pDone == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  *pDone = 0;
  if (!isParam(pParam) || (pParam->pData == nullptr && pParam->length != 0))
  {
    return TAV_RC_BAD_PARAM;
  }
  if (native_ == kNoFile)
  {
    return KOR_RC_NOT_OPEN;
  }

  const auto* const bytes = static_cast<const uint8_t*>(pParam->pData);
  while (*pDone < pParam->length)
  {
    std::size_t done = 0;
    const uint32_t code = writeSome(native_, bytes + *pDone, nextTransfer(pParam->length, *pDone), done);
    if (code != TAV_RC_OK)
    {
      return code;
    }
    *pDone += done;
  }
  return TAV_RC_OK;
}

uint32_t KORHFile::seek(const KORFileSeekParam* pParam, uint64_t* pNewPosition)
{
  uint64_t position = 0;
  if (pNewPosition != nullptr)
  {
    *pNewPosition = 0;
  }
  if (!isParam(pParam) || pParam->offset > static_cast<uint64_t>(INT64_MAX))
  {
    return TAV_RC_BAD_PARAM;
  }
  if (native_ == kNoFile)
  {
    return KOR_RC_NOT_OPEN;
  }

  const uint32_t code = seekNative(native_, static_cast<int64_t>(pParam->offset), position);
  if (pNewPosition != nullptr)
  {
    *pNewPosition = position;
  }
  return code;
}

uint32_t KORHFile::lock(const KORFileLockParam* pParam)
{
  if (!isParam(pParam) || pParam->word1 > kLockWord1Exclusive || (pParam->word2 & ~kLockWord2NoWait) != 0)
    return TAV_RC_BAD_PARAM;
  if (native_ == kNoFile)
  {
    return KOR_RC_NOT_OPEN;
  }

  const bool exclusive = pParam->word1 == kLockWord1Exclusive;
  const bool wait = (pParam->word2 & kLockWord2NoWait) == 0;
  const uint32_t code = lockNative(native_, exclusive, wait, locked_);
  locked_ = code == TAV_RC_OK;
  return code;
}

uint32_t KORHFile::unlock()
{
  if (native_ == kNoFile)
  {
    return KOR_RC_NOT_OPEN;
  }
  if (!locked_)
  {
    return KOR_RC_NOT_LOCKED;
  }
  const uint32_t code = unlockNative(native_);
  if (code == TAV_RC_OK)
  {
    locked_ = false;
  }
  return code;
}

uint32_t KORHFile::getSize(uint64_t* pSize)
{
  if (pSize == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  *pSize = 0;
  if (native_ == kNoFile)
  {
    return KOR_RC_NOT_OPEN;
  }
  return sizeNative(native_, *pSize);
}

uint32_t KORHFile::setSize(uint64_t size)
{
  if (size > static_cast<uint64_t>(INT64_MAX))
  {
    return TAV_RC_BAD_PARAM;
  }
  return native_ == kNoFile ? KOR_RC_NOT_OPEN : setSizeNative(native_, static_cast<int64_t>(size));
}

uint32_t KORHFile::sync()
{
  return native_ == kNoFile ? KOR_RC_NOT_OPEN : syncNative(native_);
}

uint32_t KORHFile::syncData()
{
  return native_ == kNoFile ? KOR_RC_NOT_OPEN : syncDataNative(native_);
}

uint32_t KORHFile::findData(uint64_t offset, uint64_t* pFound) const
{
  if (pFound == nullptr || offset > static_cast<uint64_t>(INT64_MAX))
  {
    return TAV_RC_BAD_PARAM;
  }
  *pFound = offset;
  return native_ == kNoFile ? KOR_RC_NOT_OPEN : findDataNative(native_, offset, *pFound);
}

uint32_t KORHFile::copyRights(const KORHFile& from)
{
  const bool open = native_ != kNoFile && from.native_ != kNoFile;
  return open ? copyRightsNative(from.native_, native_) : KOR_RC_NOT_OPEN;
}

bool KORHFile::isAt(const char* pPath) const
{
  return native_ != kNoFile && pPath != nullptr && isAtNative(native_, pPath);
}

uint32_t KORHFile::replaceBy(const char* pFrom, const char* pPath)
{
  if (pFrom == nullptr || pPath == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  if (kOpenFileHoldsName && native_ != kNoFile)
  {
    close();
  }
  const uint32_t code = renameNative(pFrom, pPath);
  if (code == TAV_RC_OK && native_ != kNoFile)
  {
    close(); // nobody reaches it by the path any more
  }
  return code;
}

KORFileMapping::KORFileMapping()
    : pBytes_(nullptr), size_(0) {}

KORFileMapping::~KORFileMapping()
{
  unmap();
}

uint32_t KORFileMapping::map(const KORHFile& file)
{
  if (pBytes_ != nullptr)
  {
    return KOR_RC_BUSY;
  }
  return file.native_ == kNoFile ? KOR_RC_NOT_OPEN : mapNative(file.native_, pBytes_, size_);
}

void KORFileMapping::unmap()
{
  if (pBytes_ != nullptr)
  {
    unmapNative(pBytes_, size_);
  }
  pBytes_ = nullptr;
  size_ = 0;
}

void KORFileMapping::readAhead()
{
  if (pBytes_ != nullptr)
  {
    readAheadNative(pBytes_, size_);
  }
}

uint32_t korSyncFolderOf(const char* pPath)
{
  return pPath != nullptr ? syncFolderNative(pPath) : TAV_RC_BAD_PARAM;
}
