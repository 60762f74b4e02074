/// @file probes.h
/// The probe ids under which the library's functions trace, to filter a trace or to read one.
#pragma once

#include <cstdint>

namespace tav::probe
{

// clang-format off
// PROBE(name, function number, function)
#define TAV_PROBE_LIST(PROBE)                                                     \
  PROBE(initParam,            0x01, "TAVInitParam::TAVInitParam")                 \
  PROBE(initParamEnd,         0x02, "TAVInitParam::~TAVInitParam")                \
  PROBE(initParamVersion,     0x03, "TAVInitParam::getVersion")                   \
  PROBE(resetParam,           0x04, "TAVResetParam::TAVResetParam")               \
  PROBE(resetParamEnd,        0x05, "TAVResetParam::~TAVResetParam")              \
  PROBE(resetParamVersion,    0x06, "TAVResetParam::getVersion")                  \
  PROBE(addElement,           0x07, "tavAddElement")                              \
  PROBE(updateElement,        0x08, "tavUpdateElement")                           \
  PROBE(addStream,            0x0A, "tavAddStream")                               \
  PROBE(addString,            0x0B, "tavAddString")                               \
  PROBE(closeHeader,          0x0D, "tavCloseHeader")                             \
  PROBE(findNodeFromIndex,    0x0E, "tavFindNodeFromIndex")                       \
  PROBE(getNextChild,         0x0F, "tavGetNextChild")                            \
  PROBE(getNextDataBuffer,    0x10, "tavGetNextDataBuffer")                       \
  PROBE(placeholderOp,        0x11, "tavPlaceholderOp")                           \
  PROBE(getPrevNode,          0x12, "tavGetPrevNode")                             \
  PROBE(initHandle,           0x13, "tavInitHandle")                              \
  PROBE(termHandle,           0x14, "tavTermHandle")                              \
  PROBE(resetHandle,          0x15, "tavResetHandle")                             \
  PROBE(getSideStorage,       0x16, "tavGetSideStorage")                          \
  PROBE(printSubtree,         0x17, "tavPrintSubtree")                            \
  PROBE(validateHierarchy,    0x18, "tavValidateHierarchy")                       \
  PROBE(validateSubtree,      0x19, "tavValidateSubtreeInt")                      \
  PROBE(hdrStack,             0x1A, "TAVHdrStack::TAVHdrStack")                   \
  PROBE(hdrStackEnd,          0x1B, "TAVHdrStack::~TAVHdrStack")                  \
  PROBE(hdrStackGrow,         0x1C, "TAVHdrStack::grow")                          \
  PROBE(hdrStackPush,         0x1D, "TAVHdrStack::push")                          \
  PROBE(hdrStackPopCopy,      0x1E, "TAVHdrStack::pop(TAVHeader*)")               \
  PROBE(hdrStackPop,          0x1F, "TAVHdrStack::pop")                           \
  PROBE(hdrStackTop,          0x20, "TAVHdrStack::top")                           \
  PROBE(readNode,             0x23, "tavReadNodeInt")                             \
  PROBE(writeNode,            0x24, "tavWriteNodeInt")                            \
  PROBE(findLogicalGroup,     0x26, "tavFindLogicalGroup")                        \
  PROBE(findEyeSizeCombo,     0x27, "tavFindEyeSizeComboInt")                     \
  PROBE(findElement,          0x28, "tavFindElmInt")                              \
  PROBE(validateChild,        0x29, "child against open group")                   \
  PROBE(rawWrite,             0x2A, "raw write")                                  \
  PROBE(circularBuf,          0x2B, "TAVCircularBuf::TAVCircularBuf")             \
  PROBE(circularBufEnd,       0x2C, "TAVCircularBuf::~TAVCircularBuf")            \
  PROBE(cbReset,              0x2E, "TAVCircularBuf::reset")                      \
  PROBE(cbGetChunk,           0x2F, "TAVCircularBuf::getChunk")                   \
  PROBE(cbReposition,         0x31, "TAVCircularBuf::reposition")                 \
  PROBE(cbFill,               0x32, "TAVCircularBuf::fill")                       \
  PROBE(cbMarkPages,          0x33, "TAVCircularBuf::markPages")                  \
  PROBE(cbWrite,              0x34, "TAVCircularBuf::write")                      \
  PROBE(cbPageOfIndex,        0x35, "TAVCircularBuf::pageOf")                     \
  PROBE(cbOffsetToIndex,      0x36, "TAVCircularBuf::indexOf")                    \
  PROBE(cbIndexToOffset,      0x37, "TAVCircularBuf::offsetOf")                   \
  PROBE(cbReadPages,          0x38, "TAVCircularBuf::readPages")                  \
  PROBE(cbReleasePages,       0x39, "TAVCircularBuf::releasePages")               \
  PROBE(cbCachedCount,        0x3F, "TAVCircularBuf::cachedCount")                \
  PROBE(cbIsEmpty,            0x41, "TAVCircularBuf::isEmpty")                    \
  PROBE(sideStorage,          0x44, "TAVSideStorage::TAVSideStorage")             \
  PROBE(sideStorageEnd,       0x45, "TAVSideStorage::~TAVSideStorage")            \
  PROBE(ssGetStatus,          0x47, "TAVSideStorage::getStatus")                  \
  PROBE(ssHasAttributes,      0x50, "TAVSideStorage::hasAttributes")              \
  PROBE(ssMemory,             0x53, "TAVSSMemory::TAVSSMemory")                   \
  PROBE(ssMemoryEnd,          0x54, "TAVSSMemory::~TAVSSMemory")                  \
  PROBE(ssMemoryGetMemory,    0x55, "TAVSSMemory::getMemory")                     \
  PROBE(ssMemoryGetPosition,  0x57, "TAVSSMemory::getPosition")                   \
  PROBE(ssMemoryGetTotalSize, 0x5B, "TAVSSMemory::getTotalSize")                  \
  PROBE(ssMemoryLock,         0x5C, "TAVSSMemory::lock")                          \
  PROBE(ssMemoryRead,         0x5D, "TAVSSMemory::read")                          \
  PROBE(ssMemorySeek,         0x5E, "TAVSSMemory::seek")                          \
  PROBE(ssMemoryUnlock,       0x60, "TAVSSMemory::unlock")                        \
  PROBE(ssMemoryWrite,        0x61, "TAVSSMemory::write")                         \
  PROBE(ssFile,               0x62, "TAVSSFile::TAVSSFile")                       \
  PROBE(ssFileEnd,            0x63, "TAVSSFile::~TAVSSFile")                      \
  PROBE(ssFileGetMemory,      0x64, "TAVSSFile::getMemory")                       \
  PROBE(ssFileGetPosition,    0x66, "TAVSSFile::getPosition")                     \
  PROBE(ssFileGetTotalSize,   0x6A, "TAVSSFile::getTotalSize")                    \
  PROBE(ssFileLock,           0x6B, "TAVSSFile::lock")                            \
  PROBE(ssFileRead,           0x6C, "TAVSSFile::read")                            \
  PROBE(ssFileSeek,           0x6D, "TAVSSFile::seek")                            \
  PROBE(ssFileUnlock,         0x6F, "TAVSSFile::unlock")                          \
  PROBE(ssFileWrite,          0x70, "TAVSSFile::write")                           \
  PROBE(timeStampToDate,      0x80, "tavTimeStampToDateInt")                      \
  PROBE(printValue,           0x81, "tavPrintValue")                              \
  PROBE(printNode,            0x89, "tavPrintNode")
// clang-format on

/// A probe id is this base plus a function number.
inline constexpr uint32_t kBase = 0x088A0000;

#define TAV_DEFINE_PROBE(name, number, function) inline constexpr uint32_t name = kBase + (number); ///< function
TAV_PROBE_LIST(TAV_DEFINE_PROBE)
#undef TAV_DEFINE_PROBE

/// The function that traces under `id`, or "unknown probe". Never null.
constexpr const char* functionName(uint32_t id)
{
  switch (id)
  {
#define TAV_NAME_PROBE(name, number, function) \
  case kBase + (number):                       \
    return function;
    TAV_PROBE_LIST(TAV_NAME_PROBE)
#undef TAV_NAME_PROBE
  default:
    return "unknown probe";
  }
}

} // namespace tav::probe
