#include "api/peekNode.h"

#include <algorithm>
#include <array>
#include <cstring>

#include "api/fetchBytes.h"
#include "api/rawWrite.h"
#include "core/fastWay.h"
#include "tav/probes.h"

namespace tav::inside
{
namespace
{

constexpr uint64_t kSeekHint = 1;

bool isEnd(uint32_t rc)
{
  return rc == TAV_RC_END_OF_STORAGE || rc == TAV_RC_END_OF_DATA;
}

/// Reads from the storage. The ring finds the cursor elsewhere afterwards and brings it back.
uint32_t readPastRing(TAVSideStorage& storage, uint64_t offset, uint8_t* to, uint64_t length)
{
  if (!storage.hasAttributes(TAV_ATTR_SEEK))
  {
    return core::kNotHere;
  }
  uint64_t position = 0;
  if (storage.seek(offset, kSeekHint) != TAV_RC_OK || storage.getPosition(&position) != TAV_RC_OK ||
      position != offset)
  {
    return core::kNotHere;
  }
  while (length != 0)
  {
    void* buffer = to;
    uint64_t got = 0;
    const uint32_t rc = storage.read(length, &buffer, length, &got, false, false);
    if (rc != TAV_RC_OK && !isEnd(rc))
    {
      return rc;
    }
    got = std::min(got, length);
    to += got;
    length -= got;
    if (length != 0 && (got == 0 || isEnd(rc)))
    {
      return core::kNotHere;
    }
  }
  return TAV_RC_OK;
}

/// Whether the storage has the bytes up to `end`; `kNotHere` when it does not tell.
uint32_t judgeEnd(TAVCircularBuf& ring, uint64_t dataOffset, uint64_t size)
{
  uint64_t end = dataOffset;
  const bool fits = addChecked(end, size) && size <= ring.ringSize;
  if (fits && ring.empty == 0 && end >= ring.headOffset && end - ring.headOffset <= cachedBytes(ring))
  {
    return TAV_RC_OK;
  }
  uint64_t total = 0;
  if (ring.pStorage->getTotalSize(&total) != TAV_RC_OK)
  {
    return core::kNotHere;
  }
  if (dataOffset >= total)
  {
    return TAV_RC_END_OF_STORAGE;
  }
  return fits && end <= total ? TAV_RC_OK : TAV_RC_DATA_TOO_LARGE;
}

/// The code that reading the node would give, and its header; `kNotHere` where only reading it can tell.
uint32_t judge(TAVHandle& handle, uint64_t offset, TAVHeaderData& node)
{
  if (isDirect(handle) || handle.pCircularBuf == nullptr)
  {
    return core::kNotHere;
  }
  std::array<uint8_t, kHeaderSize64> bytes;
  const uint32_t rc = peekBytes(*handle.pCircularBuf, offset, bytes.data(), bytes.size());
  if (rc != TAV_RC_OK)
  {
    return rc;
  }
  decodeHeader(bytes.data(), true, handle.swapBytes != 0, node.header);
  node.header.nodeOffset = offset;
  node.pDataBuf = nullptr;
  node.dataBufSize = 0;
  node.dataBufOffset = 0;
  return isGroup(node.header) || node.header.hdr64.size == 0
             ? TAV_RC_OK
             : judgeEnd(*handle.pCircularBuf, offset + kHeaderSize64, node.header.hdr64.size);
}

/// Leaves the records of a node that was judged.
uint32_t report(TAVHandle& handle, uint64_t offset, TAVHeaderData& node, uint32_t rc)
{
  TraceFrame frame(probe::readNode);
  frame.dump(0, uint64_t{0}, &handle, offset, true, &node);
  if (frame.step(rc == TAV_RC_DATA_TOO_LARGE ? 70 : 40, rc))
  {
    frame.dump(100, trace::record(&node));
  }
  return frame.code();
}

} // namespace

uint32_t peekBytes(TAVCircularBuf& ring, uint64_t offset, uint8_t* to, uint64_t length)
{
  while (length != 0)
  {
    const auto [index, cached] = runAt(ring, offset);
    uint64_t piece = std::min(cached, length);
    if (piece != 0)
    {
      std::memcpy(to, ring.pRing + index, static_cast<size_t>(piece));
    }
    else
    {
      const bool meetsRing = ring.empty == 0 && offset < ring.headOffset && ring.headOffset - offset < length;
      piece = meetsRing ? ring.headOffset - offset : length;
      const uint32_t rc = readPastRing(*ring.pStorage, offset, to, piece);
      if (rc != TAV_RC_OK)
      {
        return rc;
      }
    }
    to += piece;
    length -= piece;
    if (length != 0 && !addChecked(offset, piece))
    {
      return core::kNotHere;
    }
  }
  return TAV_RC_OK;
}

uint32_t peekNode(TAVHandle& handle, uint64_t offset, TAVHeaderData& node)
{
  const uint32_t rc = judge(handle, offset, node);
  return rc == core::kNotHere ? tavReadNodeInt(0, &handle, offset, true, &node) : report(handle, offset, node, rc);
}

uint32_t readIfWhole(TAVHandle& handle, uint64_t offset, TAVHeaderData& node)
{
  const uint32_t rc = judge(handle, offset, node);
  const bool mustRead = rc == core::kNotHere || (rc == TAV_RC_OK && !isGroup(node.header));
  return mustRead ? tavReadNodeInt(0, &handle, offset, true, &node) : report(handle, offset, node, rc);
}

} // namespace tav::inside
