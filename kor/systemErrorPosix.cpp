#include "kor/port.h"

#include <cerrno>

#include "tav/kor.h"

namespace tav::kor
{
namespace
{
struct ErrorCode
{
  int error;
  uint32_t code;
};

constexpr ErrorCode kErrorCodes[] = {
    {ENOENT, KOR_RC_NO_SUCH_FILE},
    {ENOTDIR, KOR_RC_NOT_A_FOLDER},
    {EISDIR, KOR_RC_IS_FOLDER},
    {EEXIST, KOR_RC_FILE_EXISTS},
    {EACCES, KOR_RC_NO_PERMISSION},
    {EPERM, KOR_RC_NO_PERMISSION},
    {EROFS, KOR_RC_READ_ONLY},
    {ENAMETOOLONG, KOR_RC_BAD_NAME},
    {ELOOP, KOR_RC_BAD_NAME},
    {EILSEQ, KOR_RC_BAD_NAME},
    {EMFILE, KOR_RC_TOO_MANY_FILES},
    {ENFILE, KOR_RC_TOO_MANY_FILES},
    {ENOSPC, KOR_RC_NO_SPACE},
    {EDQUOT, KOR_RC_NO_SPACE},
    {EFBIG, KOR_RC_FILE_TOO_LARGE},
    {EOVERFLOW, KOR_RC_FILE_TOO_LARGE},
    {EIO, KOR_RC_IO_ERROR},
    {EPIPE, KOR_RC_IO_ERROR},
    {EINTR, KOR_RC_IO_ERROR}, // of close alone, which cannot be repeated: the last writes may not have arrived
    {EBADF, KOR_RC_NOT_OPEN},
    {ESPIPE, KOR_RC_NOT_SEEKABLE},
    {EWOULDBLOCK, KOR_RC_LOCKED}, // descriptors are never non-blocking: only a lock answers so
    {EBUSY, KOR_RC_BUSY},
    {ETXTBSY, KOR_RC_BUSY},
    {ENOMEM, TAV_RC_NO_MEMORY},
    {ENOSYS, TAV_RC_NOT_SUPPORTED},
    {EOPNOTSUPP, TAV_RC_NOT_SUPPORTED},
    {EFAULT, TAV_RC_BAD_PARAM},
};
} // namespace

uint32_t codeOfSystemError(int64_t error)
{
  for (const ErrorCode& known : kErrorCodes)
    if (known.error == error)
    {
      return known.code;
    }
  return KOR_RC_OS_ERROR;
}
} // namespace tav::kor
