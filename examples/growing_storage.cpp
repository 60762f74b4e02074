/// A storage of one's own: a block that grows in memory and is read and written like a file. A small stream goes
/// through it and is printed from it.
#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <vector>

#include "tav/tav.h"

namespace
{

class GrowingStorage : public TAVSideStorage
{
public:
  GrowingStorage()
  {
    attributes = TAV_ATTR_WRITABLE | TAV_ATTR_READ_FORWARD | TAV_ATTR_SEEK;
    ioUnit = 4096; // the page size of the circular buffer over it
  }
  uint32_t seek(uint64_t offset, uint64_t) override { return cursor_ = offset, TAV_RC_OK; }
  uint32_t getPosition(uint64_t* pPosition) override { return *pPosition = cursor_, TAV_RC_OK; }
  uint32_t getTotalSize(uint64_t* pSize) override { return *pSize = bytes_.size(), TAV_RC_OK; }
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool, bool) override
  {
    const uint64_t there = cursor_ < bytes_.size() ? bytes_.size() - cursor_ : 0;
    *pRead = std::min({wanted, bufSize, there});
    std::copy_n(bytes_.data() + std::min<uint64_t>(cursor_, bytes_.size()), *pRead, static_cast<uint8_t*>(*ppData));
    cursor_ += *pRead;
    return *pRead < wanted ? TAV_RC_END_OF_STORAGE : TAV_RC_OK; // the end comes with the last bytes
  }
  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override
  {
    bytes_.resize(std::max<uint64_t>(bytes_.size(), cursor_ + size)); // what is skipped reads as zeros
    std::copy_n(static_cast<const uint8_t*>(pData), size, bytes_.data() + cursor_);
    cursor_ += * pWritten = size;
    return TAV_RC_OK;
  }
  uint32_t getMemory(void**, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; } // so a ring is used
  uint32_t lock(uint32_t) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t unlock() override { return TAV_RC_NOT_SUPPORTED; }

private:
  std::vector<uint8_t> bytes_; // may move when it grows: no pointer to it leaves the class
  uint64_t cursor_ = 0;
};

bool writeStream(TAVHandle* handle)
{
  char host[] = "example";
  TAVHeaderData group{};
  group.header.hdr64 = {TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST};
  group.header.hdrType = TAV_HDR_64;
  TAVHeaderData name{};
  name.header.hdr64 = {sizeof host - 1, TAV_INFO_EYE_SIZE, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME};
  name.header.hdrType = TAV_HDR_64;
  name.pDataBuf = reinterpret_cast<uint8_t*>(host);
  return tavAddElement(0, handle, &group) == TAV_RC_OK && tavAddElement(0, handle, &name) == TAV_RC_OK &&
         tavCloseHeader(0, handle) == TAV_RC_OK && handle->pCircularBuf->reset() == TAV_RC_OK;
}

} // namespace

int main()
{
  GrowingStorage storage;
  TAVHandle* handle = nullptr;
  TAVInitParam writing(&storage, TAV_OPT_WRITE);
  const bool written = tavInitHandle(&handle, &writing) == TAV_RC_OK && writeStream(handle);
  tavTermHandle(&handle);
  TAVInitParam reading(&storage, TAV_OPT_READ);
  TAVPrintParam out{0, nullptr, 0, stdout};
  uint64_t printed = 0;
  constexpr uint64_t what = TAV_PRINT_SUBTREE | TAV_PRINT_DATA;
  const bool shown = written && tavInitHandle(&handle, &reading) == TAV_RC_OK &&
                     tavPrintSubtree(what, handle, nullptr, &out, &printed) == TAV_RC_OK;
  tavTermHandle(&handle);
  return shown ? 0 : 1;
}
