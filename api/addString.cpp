/// Appending strings.
#include "api/rawWrite.h"
#include "format/layout.h"
#include "tav/probes.h"
#include "trace/traceFrame.h"

using namespace tav;
using namespace tav::inside;

namespace
{

constexpr uint64_t kCodePageLength = sizeof(uint16_t);

bool isStringType(uint16_t type, uint16_t codePage)
{
  return (type == TAV_TYPE_ASCII_STRING && codePage == TAV_CODE_PAGE_ASCII) || type == TAV_TYPE_UTF8_STRING;
}

/// Counts the code page in a string's size; false, with the size as it is, where the size has no room for it.
bool countCodePage(TAVHeader& header)
{
  const uint64_t most = is64(header) ? ~uint64_t{0} : ~uint32_t{0};
  const uint64_t size = sizeOf(header);
  if (size > most - kCodePageLength)
  {
    return false;
  }
  setSize(header, size + kCodePageLength);
  return true;
}

uint32_t writeCodePage(TAVHandle& handle, uint64_t& position, uint16_t codePage)
{
  const uint16_t word = handle.swapBytes != 0 ? kor::byteswap16(codePage) : codePage;
  return rawWrite(handle, position, &word, sizeof word);
}

/// What follows the header. A UTF-8 string's size counts the code page already, and that many bytes of text follow
/// the code page: 2 more than counted. Its pair is in host order in either stream. Existing streams have it so.
uint32_t writeText(TAVHandle& handle, const TAVHeader& header, uint64_t& position, const uint8_t* text,
                   uint16_t codePage)
{
  const uint64_t size = sizeOf(header);
  uint32_t rc = TAV_RC_OK;
  if (typeOf(header) == TAV_TYPE_UTF8_STRING)
  {
    rc = writeCodePage(handle, position, codePage);
  }
  if (rc == TAV_RC_OK)
  {
    rc = rawWrite(handle, position, text, size);
  }
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  if (handle.alignMode == 1 && size % 8 != 0)
  {
    position += 8 - size % 8;
  }
  if (hasEyeSize(header))
  {
    const EyeSizeBytes pair = encodeEyeSize(dataDistance(size), false);
    rc = rawWrite(handle, position, pair.data(), pair.size());
  }
  return rc;
}

} // namespace

uint32_t tavAddString(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData, uint16_t codePage)
{
  TraceFrame frame(probe::addString);
  frame.dump(0, options, handle, "Element header", trace::record(headerData), codePage);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, headerData != nullptr, TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  TAVHeader& header = headerData->header;
  const bool utf8 = typeOf(header) == TAV_TYPE_UTF8_STRING;
  if (!frame.require(30, isStringType(typeOf(header), codePage), TAV_RC_BAD_PARAM) ||
      !frame.step(40, validateChild(*handle, header)) ||
      !frame.require(50, headerData->pDataBuf != nullptr || (!utf8 && sizeOf(header) == 0), TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  const uint64_t size = sizeOf(header);
  if (!frame.require(55, !utf8 || countCodePage(header), TAV_RC_BAD_PARAM))
  {
    return frame.code();
  }
  uint64_t position = handle->streamBytes;
  if (frame.step(60, tavWriteNodeInt(options, handle, &header, &position, nullptr, 0)) &&
      frame.step(70, writeText(*handle, header, position, headerData->pDataBuf, codePage)))
  {
    handle->streamBytes = position;
    frame.dump(100, position);
  }
  else
  {
    setSize(header, size); // which the same call counts again
  }
  return frame.code();
}
