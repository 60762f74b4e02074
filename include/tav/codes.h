/// @file codes.h
/// Every return code of the system with its name and its sentence, once. The constants, the names
/// that `korCodeName` gives and the messages of the C++ layer all come from the list below. C and C++.
#pragma once

#if defined(__cplusplus)
#include <cstdint>
#else
#include <stdint.h>
#endif

#include "tav/decl.h"

// clang-format off
// CODE(name, value, sentence)
#define TAV_CODE_LIST(CODE)                                                                                            \
  CODE(TAV_RC_OK,              0x00000000, "success")                                                                  \
  CODE(TAV_RC_NO_MEMORY,       0x90000002, "memory could not be allocated, or fewer bytes are at hand than needed")    \
  CODE(TAV_RC_NOT_SUPPORTED,   0x90000005, "the operation is not offered by this object or in this mode")              \
  CODE(TAV_RC_BAD_PARAM,       0x9000000C, "an argument is null or out of range")                                      \
  CODE(TAV_RC_NO_HDR_STACK,    0x9000000D, "a header stack could not be created")                                      \
  CODE(TAV_RC_END_OF_STORAGE,  0x90000021, "the end of the storage was reached")                                       \
  CODE(TAV_RC_END_OF_DATA,     0x90000022, "the file layer has no more data")                                          \
  CODE(KOR_RC_NO_SUCH_FILE,    0x90000030, "no such file or folder")                                                   \
  CODE(KOR_RC_NO_PERMISSION,   0x90000031, "permission denied")                                                        \
  CODE(KOR_RC_NO_SPACE,        0x90000032, "no space left on the device, or the quota is used up")                     \
  CODE(KOR_RC_IS_FOLDER,       0x90000033, "the path names a folder")                                                  \
  CODE(KOR_RC_LOCKED,          0x90000034, "the file is locked by another process")                                    \
  CODE(KOR_RC_IO_ERROR,        0x90000035, "input or output error")                                                    \
  CODE(KOR_RC_FILE_EXISTS,     0x90000036, "the file exists already")                                                  \
  CODE(KOR_RC_READ_ONLY,       0x90000037, "the file system is read-only")                                             \
  CODE(KOR_RC_FILE_TOO_LARGE,  0x90000038, "the file would grow beyond the size that is allowed")                      \
  CODE(KOR_RC_TOO_MANY_FILES,  0x90000039, "too many files are open")                                                  \
  CODE(KOR_RC_NOT_OPEN,        0x9000003A, "the file is not open")                                                     \
  CODE(KOR_RC_NOT_SEEKABLE,    0x9000003B, "the file cannot be positioned (a pipe, a terminal)")                       \
  CODE(KOR_RC_WRONG_ACCESS,    0x9000003C, "the file was not opened for this access")                                  \
  CODE(KOR_RC_NOT_A_FOLDER,    0x9000003D, "a part of the path is not a folder")                                       \
  CODE(KOR_RC_BAD_NAME,        0x9000003E, "the path is too long or not valid")                                        \
  CODE(KOR_RC_NOT_LOCKED,      0x9000003F, "the file is not locked")                                                   \
  CODE(KOR_RC_TRACE_ACTIVE,    0x90000040, "a trace is running already")                                               \
  CODE(KOR_RC_TRACE_INACTIVE,  0x90000041, "no trace is running")                                                      \
  CODE(KOR_RC_BUSY,            0x90000042, "the file is in use")                                                       \
  CODE(KOR_RC_OS_ERROR,        0x9000004F, "the operating system refused for a reason without a code of its own")      \
  CODE(TAV_RC_BAD_OPTIONS,     0x90000594, "the options hold a value that the operation does not accept")              \
  CODE(TAV_RC_NO_CIRCULAR_BUF, 0x90000595, "the handle has neither direct memory nor a circular buffer")               \
  CODE(TAV_RC_NO_MORE_CHILDREN,0x90000596, "the group has no further child")                                           \
  CODE(TAV_RC_OUTSIDE_PARENT,  0x90000597, "a node lies outside its parent, or a size does not fit its type")          \
  CODE(TAV_STATUS_DESTROYED,   0x90000598, "the storage was destroyed")                                                \
  CODE(TAV_RC_DATA_TOO_LARGE,  0x90000599, "a node's data is larger than the bytes at hand")                           \
  CODE(TAV_RC_WRONG_MODE,      0x9000059A, "the operation does not fit the mode in which the handle was opened")       \
  CODE(TAV_RC_NOT_FOUND,       0x9000059B, "nothing was found, or no group is open")                                   \
  CODE(TAV_RC_BAD_HDR_TYPE,    0x9000059C, "a header type other than 1 (32-bit) and 2 (64-bit)")                       \
  CODE(TAV_RC_CB_STATE,        0x9000059D, "the circular buffer's range and the request disagree")                     \
  CODE(TAV_RC_BAD_CHILD_HDR,   0x9000059E, "the open group does not take children with this header")                   \
  CODE(TAV_RC_BAD_PAYLOAD,     0x9000059F, "the payload is missing or shorter than the node's size")                   \
  CODE(TAV_RC_NO_MORE_DATA,    0x900005A0, "all data of the node has been handed out")
// clang-format on

#define TAV_DEFINE_CODE(name, value, sentence) TAV_CONSTANT uint32_t name = value; ///< sentence
TAV_CODE_LIST(TAV_DEFINE_CODE)
#undef TAV_DEFINE_CODE
