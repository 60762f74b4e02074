/// Appending nodes: elements and groups, and the step that encodes one node.
#include <array>
#include <cstring>

#include "api/rawWrite.h"
#include "core/fastWay.h"
#include "format/copySmall.h"
#include "format/hdrStack.h"
#include "format/layout.h"
#include "kor/traceFrame.h"
#include "tav/probes.h"

using namespace tav;

namespace
{

/// A data element comes with its whole payload, or with none at all when the caller writes it afterwards.
bool isPayloadComplete(const TAVHeader& header, const uint8_t* payload, uint64_t length)
{
  const bool none = payload == nullptr && length == 0;
  return isGroup(header) || none || (payload != nullptr && length >= sizeOf(header));
}

/// Refuses a node for which the stream has no place, before any byte is written.
uint32_t checkNodeRoom(const TAVHandle& handle, const TAVHeader& header, uint64_t position)
{
  if (!isDirect(handle))
  {
    return handle.pCircularBuf != nullptr ? TAV_RC_OK : TAV_RC_NO_CIRCULAR_BUF;
  }
  if (handle.pDirectData == nullptr)
  {
    return TAV_RC_NO_MEMORY;
  }
  const bool fits = hasRoom(handle, position, headerLength(header.hdrType), isGroup(header) ? 0 : sizeOf(header));
  return fits ? TAV_RC_OK : TAV_RC_END_OF_STORAGE;
}

uint32_t writeHeader(TAVHandle& handle, const TAVHeader& header, uint64_t& position)
{
  std::array<uint8_t, kHeaderSize64> bytes;
  const uint64_t length = encodeHeader(header, handle.swapBytes != 0, bytes.data());
  return rawWrite(handle, position, bytes.data(), length);
}

/// Payload, padding and eye/size pair of a data element.
uint32_t writeBody(TAVHandle& handle, const TAVHeader& header, uint64_t& position, const uint8_t* payload)
{
  const uint64_t size = sizeOf(header);
  const uint64_t start = position;
  uint32_t rc = writePayload(handle, position, typeOf(header), payload, size);
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  if (handle.alignMode == 1)
  {
    uint64_t padded = size; // the payload's size is rounded up, wherever the node stands
    roundUp8Checked(padded);
    position = addSaturated(start, padded);
  }
  if (hasEyeSize(header))
  {
    const EyeSizeBytes pair = encodeEyeSize(dataDistance(size), handle.swapBytes != 0);
    rc = rawWrite(handle, position, pair.data(), pair.size());
  }
  return rc;
}

uint32_t writeNode(TAVHandle& handle, const TAVHeader& header, uint64_t& position, const uint8_t* payload)
{
  const uint32_t rc = writeHeader(handle, header, position);
  if (rc != TAV_RC_OK || isGroup(header) || payload == nullptr)
  {
    return rc;
  }
  return writeBody(handle, header, position, payload);
}

uint32_t pushGroup(TAVHandle& handle, const TAVHeader& group)
{
  return handle.pHdrStack != nullptr ? handle.pHdrStack->push(&group) : TAV_RC_NO_HDR_STACK;
}

/// The bytes of a payload with its padding.
uint64_t paddedSize(const TAVHandle& handle, uint64_t size)
{
  if (handle.alignMode == 1)
  {
    roundUp8Checked(size);
  }
  return size;
}

/// Whether a payload stands apart from the place that its node is encoded to.
bool isApart(const uint8_t* payload, uint64_t size, const uint8_t* to, uint64_t length)
{
  const auto from = reinterpret_cast<uintptr_t>(payload);
  const auto start = reinterpret_cast<uintptr_t>(to);
  return from + size <= start || start + length <= from;
}

/// Encodes a payload at its place, in the other byte order if `swap`.
void encodePayload(uint16_t type, bool swap, const uint8_t* payload, uint64_t size, uint8_t* to)
{
  uint64_t prefix = 0;
  if (swap) [[unlikely]]
  {
    const SwapRule rule = typeInfo(type).swapRule;
    prefix = swappedPrefix(rule, size);
    swapPayload(rule, payload, to, prefix);
  }
  copySmall(to + prefix, payload + prefix, size - prefix);
}

/// Whether a child of this form may stand under the open group. A stream's first node is not a usual child.
template<bool Wide>
[[gnu::always_inline]] inline bool isUsualChild(const TAVHandle& handle)
{
  const TAVHdrStack* const stack = handle.pHdrStack;
  if (isReadOnly(handle) || stack == nullptr) [[unlikely]]
  {
    return false;
  }
  const uint64_t open = stack->count;
  if (open == 0) [[unlikely]]
  {
    return false;
  }
  const TAVHeader& parent = stack->pEntries[open - 1];
  return Wide ? is64(parent) && parent.hdr64.type != TAV_TYPE_HEADER32 : typeOf(parent) == TAV_TYPE_HEADER32;
}

constexpr uint64_t kUsualSize = ~uint64_t{0} / 2; // far from where sums would pass 64 bits

/// Whether a data element comes with its payload, of a size that can be.
[[gnu::always_inline]] inline bool hasUsualPayload(const TAVHeaderData& node, const HeaderFields& fields)
{
  const bool complete = node.dataBufSize == 0 || node.dataBufSize >= fields.size;
  return node.pDataBuf != nullptr && complete && fields.size <= kUsualSize;
}

/// Opens a group in place.
template<bool Wide>
uint32_t openSilently(TAVHandle& handle, TAVHeader& header, HeaderFields fields)
{
  const uint64_t position = handle.streamBytes;
  constexpr uint64_t length = Wide ? kHeaderSize64 : kHeaderSize32;
  uint8_t* const to = takePlace(handle, position, length);
  if (to == nullptr) [[unlikely]]
  {
    return core::kNotHere;
  }
  if (Wide && handle.alignMode == 1)
  {
    fields.info |= TAV_INFO_ALIGNED8;
    header.hdr64.info = fields.info;
  }
  encodeFields(fields, Wide, handle.swapBytes != 0, to);
  header.nodeOffset = position;
  handle.streamBytes = position + length;
  return pushEntry<SilentFrame>(*handle.pHdrStack, &header);
}

/// What ends an append: the node stands where the write offset was. The payload was read before, as it may be one of
/// these numbers.
[[gnu::always_inline]] inline uint32_t moveBehind(TAVHandle& handle, TAVHeaderData& node, uint64_t position,
                                                  uint64_t length)
{
  node.header.nodeOffset = position;
  handle.streamBytes = position + length;
  return TAV_RC_OK;
}

/// Appends a data element in place, whether or not it is in the other byte order, padded, or followed by a pair.
template<bool Wide>
[[gnu::noinline]] uint32_t addInPlace(TAVHandle& handle, TAVHeaderData& node, HeaderFields fields)
{
  constexpr uint64_t headerSize = Wide ? kHeaderSize64 : kHeaderSize32;
  const uint64_t size = fields.size;
  const uint64_t padded = paddedSize(handle, size);
  const bool pair = (fields.info & TAV_INFO_EYE_SIZE) != 0;
  const uint64_t length = headerSize + (pair ? padded + kEyeSizeLength : size); // last padding is not written
  const uint64_t position = handle.streamBytes;
  const bool swap = handle.swapBytes != 0;
  uint8_t* const to = takePlace(handle, position, length);
  const uint8_t* const payload = node.pDataBuf;
  if (to == nullptr || (swap && !isApart(payload, size, to, length))) [[unlikely]]
  {
    return core::kNotHere;
  }
  if (Wide && handle.alignMode == 1)
  {
    fields.info |= TAV_INFO_ALIGNED8;
    node.header.hdr64.info = fields.info;
  }
  encodeFields(fields, Wide, swap, to);
  encodePayload(fields.type, swap, payload, size, to + headerSize);
  if (pair)
  {
    const EyeSizeBytes bytes = encodeEyeSize(dataDistance(size), swap);
    std::memcpy(to + headerSize + padded, bytes.data(), bytes.size());
  }
  return moveBehind(handle, node, position, pair ? length : headerSize + padded);
}

/// Copies a payload that copySmall would call for: as a function of its own that ends the caller, which then saves no
/// registers.
[[gnu::noinline, gnu::used]] uint32_t putLong(uint64_t /*options*/, TAVHandle* handle, TAVHeaderData* node,
                                              const uint8_t* payload, uint64_t size, uint8_t* to)
{
  std::memmove(to, payload, size);
  return moveBehind(*handle, *node, handle->streamBytes, kHeaderSize64 + size);
}

/// Puts a data element with a 64-bit header in host order, neither padded nor with a pair, behind the stream's last
/// node. `to` is where its payload goes; most are one 32-bit or 64-bit value.
[[gnu::always_inline]] inline uint32_t putPlain(TAVHandle& handle, TAVHeaderData& node, uint64_t size, uint64_t rest,
                                                const uint8_t* payload, uint64_t position, uint8_t* to)
{
  std::memcpy(to - kHeaderSize64, &size, sizeof size);
  keepStoresApart();
  std::memcpy(to - sizeof rest, &rest, sizeof rest);
  if (size == sizeof(uint32_t))
  {
    std::memcpy(to, payload, sizeof(uint32_t));
    return moveBehind(handle, node, position, kHeaderSize64 + size);
  }
  if (size == sizeof(uint64_t))
  {
    std::memcpy(to, payload, sizeof(uint64_t));
    return moveBehind(handle, node, position, kHeaderSize64 + size);
  }
  if (size > kLongestSmall)
  {
    return putLong(0, &handle, &node, payload, size, to);
  }
  copySmall(to, payload, size);
  return moveBehind(handle, node, position, kHeaderSize64 + size);
}

/// Appends a node in place, other than by putPlain; else `core::kNotHere`, with nothing done.
template<bool Wide>
uint32_t addSilently(TAVHandle& handle, TAVHeaderData& node)
{
  if (!isUsualChild<Wide>(handle))
  {
    return core::kNotHere;
  }
  const HeaderFields fields = fieldsOf<Wide>(node.header);
  if (isGroupType(fields.type))
  {
    return openSilently<Wide>(handle, node.header, fields);
  }
  return hasUsualPayload(node, fields) ? addInPlace<Wide>(handle, node, fields) : core::kNotHere;
}

/// The same for a node of either form.
uint32_t addSilently(TAVHandle& handle, TAVHeaderData& node)
{
  switch (node.header.hdrType)
  {
  case TAV_HDR_64:
    return addSilently<true>(handle, node);
  case TAV_HDR_32:
    return addSilently<false>(handle, node);
  default:
    return core::kNotHere;
  }
}

} // namespace

uint32_t tavWriteNodeInt(uint64_t options, TAVHandle* handle, TAVHeader* header, uint64_t* position, uint8_t* payload,
                         uint64_t payloadLength)
{
  TraceFrame frame(probe::writeNode);
  frame.dump(0, options, handle, "Node to be written", trace::record(header), position, payload, payloadLength);
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, header != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(30, position != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(40, isPayloadComplete(*header, payload, payloadLength), TAV_RC_BAD_PAYLOAD))
  {
    return frame.code();
  }
  // NOLINTNEXTLINE(clang-analyzer-core.NullDereference): the analyser does not follow the frame's checks so deep
  if (handle->alignMode == 1 && is64(*header))
  {
    header->hdr64.info |= TAV_INFO_ALIGNED8;
  }
  // NOLINTNEXTLINE(clang-analyzer-core.NullDereference): likewise
  if (frame.step(50, checkNodeRoom(*handle, *header, *position)) &&
      frame.require(60, isKnownHdrType(header->hdrType), TAV_RC_BAD_HDR_TYPE) &&
      frame.step(70, writeNode(*handle, *header, *position, payload)))
  {
    frame.dump(100, *position);
  }
  return frame.code();
}

namespace
{

[[gnu::noinline]] uint32_t addTraced(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  TraceFrame frame(probe::addElement);
  frame.dump(0, options, handle, "Element to be appended", trace::record(headerData));
  if (!frame.require(10, handle != nullptr, TAV_RC_BAD_PARAM) ||
      !frame.require(20, headerData != nullptr, TAV_RC_BAD_PARAM) ||
      // NOLINTNEXTLINE(clang-analyzer-core.NonNullParamChecker): likewise
      !frame.require(30, !isReadOnly(*handle), TAV_RC_WRONG_MODE) ||
      !frame.require(40, options == 0, TAV_RC_BAD_OPTIONS))
  {
    return frame.code();
  }
  TAVHeader& header = headerData->header;
  uint64_t position = handle->streamBytes;
  const uint64_t length = headerData->dataBufSize != 0 ? headerData->dataBufSize : sizeOf(header);
  if (frame.step(50, validateChild(*handle, header)) &&
      frame.require(60, isGroup(header) || headerData->pDataBuf != nullptr, TAV_RC_BAD_PARAM) &&
      frame.step(70, tavWriteNodeInt(0, handle, &header, &position, headerData->pDataBuf, length)))
  {
    header.nodeOffset = handle->streamBytes;
    if (isGroup(header))
    {
      static_cast<void>(frame.step(80, pushGroup(*handle, header)));
    }
    handle->streamBytes = position;
    frame.dump(100, header.nodeOffset, position);
  }
  return frame.code();
}

/// Whether a node is a data element with its whole payload and without a pair.
[[gnu::always_inline]] inline bool isPlainElement(const HeaderFields& fields, const uint8_t* payload, uint64_t length)
{
  return fields.type > TAV_TYPE_HEADER64 && length >= fields.size && (fields.info & TAV_INFO_EYE_SIZE) == 0 &&
         payload != nullptr;
}

/// Everything but the plain element.
[[gnu::noinline]] uint32_t addNotPlain(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  const bool silent = core::isFastCall(options) && handle != nullptr && headerData != nullptr;
  const uint32_t rc = silent ? addSilently(*handle, *headerData) : core::kNotHere;
  return rc != core::kNotHere ? rc : addTraced(options, handle, headerData);
}

/// Everything but the plain element in a block of memory, without a record. `used` keeps its arguments where they are.
[[gnu::noinline, gnu::used]] uint32_t addOther(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  if (handle == nullptr || headerData == nullptr || !isPlainRing(*handle) || !is64(headerData->header) ||
      !isUsualChild<true>(*handle)) [[unlikely]]
  {
    return addNotPlain(options, handle, headerData);
  }
  const HeaderFields fields = fieldsOf<true>(headerData->header);
  const uint8_t* const payload = headerData->pDataBuf;
  const uint64_t position = handle->streamBytes;
  TAVCircularBuf& ring = *handle->pCircularBuf;
  if (!isPlainElement(fields, payload, headerData->dataBufSize) || fields.size > kUsualSize ||
      ring.storageWritable == 0) [[unlikely]]
  {
    return addNotPlain(0, handle, headerData);
  }
  const uint64_t rest = joinRest(fields);
  uint8_t* const to = takeInPage(ring, position, kHeaderSize64 + fields.size);
  if (to == nullptr) [[unlikely]]
  {
    return addNotPlain(0, handle, headerData);
  }
  return putPlain(*handle, *headerData, fields.size, rest, payload, position, to + kHeaderSize64);
}

/// The data element with a 64-bit header in host order, added to a block of memory, is what streams are made of. Every
/// other way out ends in one call. Accesses to memory are what limits it: no field is loaded twice, no register saved.
[[gnu::always_inline]] inline uint32_t addPlain(TAVHandle* handle, TAVHeaderData* headerData)
{
  if (handle == nullptr || headerData == nullptr || !isPlainBlock(*handle) || !is64(headerData->header) ||
      !isUsualChild<true>(*handle)) [[unlikely]]
  {
    return addOther(0, handle, headerData);
  }
  const HeaderFields fields = fieldsOf<true>(headerData->header);
  const uint8_t* const payload = headerData->pDataBuf;
  if (!isPlainElement(fields, payload, headerData->dataBufSize)) [[unlikely]]
  {
    return addOther(0, handle, headerData);
  }
  const uint64_t size = fields.size;
  const uint64_t rest = joinRest(fields);
  if (!hasRoom(*handle, handle->streamBytes, kHeaderSize64, size) || handle->pDirectData == nullptr) [[unlikely]]
  {
    return addOther(0, handle, headerData);
  }
  const uint64_t position = handle->streamBytes;
  uint8_t* const to = handle->pDirectData + position + kHeaderSize64;
  return putPlain(*handle, *headerData, size, rest, payload, position, to);
}

/// The same where tracing was on once, and every call with options or with records.
[[gnu::noinline]] uint32_t addOnceTraced(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  return core::isFastCall(options) ? addPlain(handle, headerData) : addNotPlain(options, handle, headerData);
}

} // namespace

uint32_t tavAddElement(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData)
{
  return core::isFastCallAtOnce(options) ? addPlain(handle, headerData) : addOnceTraced(options, handle, headerData);
}
