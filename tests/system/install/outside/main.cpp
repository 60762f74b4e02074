// A user's program: writes a small stream, reads it back and exits with 0 when every value is as written.
#include <cstdint>
#include <cstring>

#include <tav/elements.h>
#include <tav/tav.h>

namespace
{

constexpr uint32_t kValue = 4711;

bool write(TAVSSMemory& storage)
{
  TAVInitParam param(&storage, TAV_OPT_WRITE);
  TAVHandle* handle = nullptr;
  if (tavInitHandle(&handle, &param) != TAV_RC_OK)
  {
    return false;
  }

  TAVHeaderData group{};
  group.header.hdrType = TAV_HDR_64;
  group.header.hdr64 = {0, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST};
  uint32_t value = kValue;
  TAVHeaderData element{};
  element.header.hdrType = TAV_HDR_64;
  element.header.hdr64 = {sizeof value, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_HOST};
  element.pDataBuf = reinterpret_cast<uint8_t*>(&value);
  element.dataBufSize = sizeof value;

  const bool ok = tavAddElement(0, handle, &group) == TAV_RC_OK &&
                  tavAddElement(0, handle, &element) == TAV_RC_OK &&
                  tavCloseHeader(0, handle) == TAV_RC_OK;
  return tavTermHandle(&handle) == TAV_RC_OK && ok;
}

bool readBack(TAVSSMemory& storage)
{
  TAVInitParam param(&storage, TAV_OPT_READ);
  TAVHandle* handle = nullptr;
  if (tavInitHandle(&handle, &param) != TAV_RC_OK)
  {
    return false;
  }

  TAVHeaderData group{};
  TAVHeaderData child{};
  uint32_t value = 0;
  const bool ok = tavGetNextChild(0, handle, nullptr, nullptr, &group) == TAV_RC_OK &&
                  tavGetNextChild(0, handle, &group.header, nullptr, &child) == TAV_RC_OK &&
                  child.header.hdr64.type == TAV_TYPE_UINT32 &&
                  child.header.hdr64.elm == TAV_ELM_CMN_HOST &&
                  child.header.hdr64.size == sizeof value;
  if (ok)
  {
    std::memcpy(&value, child.pDataBuf, sizeof value);
  }
  return tavTermHandle(&handle) == TAV_RC_OK && ok && value == kValue;
}

} // namespace

int main()
{
  alignas(8) uint8_t block[256] = {};
  TAVSSMemory storage(block, sizeof block);
  const bool named = std::strcmp(korCodeName(TAV_RC_BAD_PARAM), "TAV_RC_BAD_PARAM") == 0;
  return write(storage) && readBack(storage) && named ? 0 : 1;
}
