/// What a stream costs the storage under its ring: transfers, seeks and bytes for each byte of the stream.
///   ring_cost [MEBIBYTES]      the stream's size, 64 by default
#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "tav/tav.h"

namespace
{

constexpr uint64_t kMiB = 0x100000;

/// Memory that is read and written like a file, and counts.
class CountingStorage : public TAVSideStorage
{
public:
  explicit CountingStorage(uint64_t pageBytes)
  {
    attributes = TAV_ATTR_WRITABLE | TAV_ATTR_READ_FORWARD | TAV_ATTR_READ_BACKWARD | TAV_ATTR_SEEK;
    ioUnit = pageBytes;
  }

  uint32_t seek(uint64_t offset, uint64_t) override
  {
    ++seeks;
    position_ = offset;
    return TAV_RC_OK;
  }
  uint32_t getPosition(uint64_t* pPosition) override
  {
    *pPosition = position_;
    return TAV_RC_OK;
  }
  uint32_t getTotalSize(uint64_t* pSize) override
  {
    *pSize = bytes_.size();
    return TAV_RC_OK;
  }
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool, bool) override
  {
    ++reads;
    const uint64_t there = position_ < bytes_.size() ? bytes_.size() - position_ : 0;
    *pRead = std::min({wanted, bufSize, there});
    if (*pRead != 0)
    {
      std::memcpy(*ppData, bytes_.data() + position_, *pRead);
    }
    position_ += *pRead;
    bytesRead += *pRead;
    return *pRead < wanted ? TAV_RC_END_OF_STORAGE : TAV_RC_OK;
  }
  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override
  {
    ++writes;
    bytes_.resize(std::max<uint64_t>(bytes_.size(), position_ + size));
    std::memcpy(bytes_.data() + position_, pData, size);
    position_ += size;
    bytesWritten += size;
    *pWritten = size;
    return TAV_RC_OK;
  }
  uint32_t getMemory(void**, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t lock(uint32_t) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t unlock() override { return TAV_RC_NOT_SUPPORTED; }

  void startCounting() { reads = writes = seeks = bytesRead = bytesWritten = 0; }

  uint64_t reads = 0;
  uint64_t writes = 0;
  uint64_t seeks = 0;
  uint64_t bytesRead = 0;
  uint64_t bytesWritten = 0;

private:
  std::vector<uint8_t> bytes_;
  uint64_t position_ = 0;
};

struct Ring
{
  const char* name;
  uint64_t pageBytes;
  uint64_t ringBytes;
};

void check(uint32_t rc, const char* what)
{
  if (rc != TAV_RC_OK)
  {
    std::fprintf(stderr, "ring_cost: %s: %s\n", what, korCodeName(rc));
    std::exit(1);
  }
}

class OpenHandle
{
public:
  OpenHandle(CountingStorage& storage, uint64_t options, const Ring& ring)
  {
    TAVInitParam param(&storage, options, ring.ringBytes, 0x20000, 0, 0);
    check(tavInitHandle(&handle_, &param), "open");
  }
  ~OpenHandle() { tavTermHandle(&handle_); }
  OpenHandle(const OpenHandle&) = delete;
  OpenHandle& operator=(const OpenHandle&) = delete;
  TAVHandle* get() { return handle_; }

private:
  TAVHandle* handle_ = nullptr;
};

void add(TAVHandle* handle, uint64_t size, uint16_t type, uint8_t* payload)
{
  TAVHeaderData node{};
  node.header.hdr64 = {size, TAV_INFO_EYE_SIZE, type, 1};
  node.header.hdrType = TAV_HDR_64;
  node.pDataBuf = payload;
  check(tavAddElement(0, handle, &node), "append");
}

void printRow(const char* what, const CountingStorage& storage, double units, const char* unit)
{
  const auto perUnit = [units](uint64_t count) { return static_cast<double>(count) / units; };
  std::printf("  %-28s %12.6g %12.6g %12.6g %14.4f %14.4f  per %s\n", what, perUnit(storage.reads),
              perUnit(storage.writes), perUnit(storage.seeks), perUnit(storage.bytesRead),
              perUnit(storage.bytesWritten), unit);
}

/// Elements of 100 bytes in one group, or in groups of 100 that are closed as they go; returns the stream's length.
/// The outermost group's close is not counted: it goes back to the first byte once, whatever the length.
uint64_t writeStream(CountingStorage& storage, const Ring& ring, uint64_t length, bool groups)
{
  uint8_t payload[100] = {};
  OpenHandle handle(storage, TAV_OPT_WRITE, ring);
  add(handle.get(), TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, nullptr);
  while (handle.get()->streamBytes < length)
  {
    if (groups)
    {
      add(handle.get(), TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, nullptr);
    }
    for (int i = 0; i < 100; ++i)
    {
      add(handle.get(), sizeof payload, TAV_TYPE_BINARY, payload);
    }
    if (groups)
    {
      check(tavCloseHeader(0, handle.get()), "close");
    }
  }
  check(handle.get()->pCircularBuf->reset(), "last pages");
  printRow(groups ? "groups of 100, closed" : "append", storage, static_cast<double>(handle.get()->streamBytes),
           "stream byte");
  check(tavCloseHeader(0, handle.get()), "close");
  check(handle.get()->pCircularBuf->reset(), "last pages");
  return handle.get()->streamBytes;
}

void readAll(CountingStorage& storage, const Ring& ring)
{
  OpenHandle handle(storage, TAV_OPT_READ, ring);
  TAVHeaderData root{};
  check(tavGetNextChild(0, handle.get(), nullptr, nullptr, &root), "first node");
  TAVHeaderData nodes[2]{};
  TAVHeader* previous = nullptr;
  for (size_t current = 0;; current ^= 1U)
  {
    const uint32_t rc = tavGetNextChild(0, handle.get(), &root.header, previous, &nodes[current]);
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      return;
    }
    check(rc, "read");
    previous = &nodes[current].header;
  }
}

void findAtRandom(CountingStorage& storage, const Ring& ring, uint64_t length, uint64_t finds)
{
  OpenHandle handle(storage, TAV_OPT_READ, ring);
  uint64_t word = 1;
  for (uint64_t i = 0; i < finds; ++i)
  {
    word = word * 6364136223846793005 + 1442695040888963407;
    TAVHeaderData node{};
    check(tavFindNodeFromIndex(0, handle.get(), (word >> 16) % (length - 1000), 0, &node), "find");
  }
}

void measure(const Ring& ring, uint64_t length)
{
  std::printf("%s\n  %-28s %12s %12s %12s %14s %14s\n", ring.name, "", "reads", "writes", "seeks", "bytes read",
              "bytes written");
  CountingStorage grouped(ring.pageBytes);
  writeStream(grouped, ring, length, true);
  CountingStorage flat(ring.pageBytes);
  const uint64_t written = writeStream(flat, ring, length, false);

  flat.attributes &= ~TAV_ATTR_WRITABLE; // as a file opened for reading
  flat.startCounting();
  readAll(flat, ring);
  printRow("sequential read", flat, static_cast<double>(written), "stream byte");

  constexpr uint64_t finds = 1000;
  flat.startCounting();
  findAtRandom(flat, ring, written, finds);
  printRow("find from a random index", flat, finds, "find");
}

} // namespace

int main(int argc, char** argv)
{
  const uint64_t length = (argc > 1 ? std::strtoull(argv[1], nullptr, 0) : 64) * kMiB;
  if (length == 0)
  {
    std::fprintf(stderr, "usage: ring_cost [MEBIBYTES]\n");
    return 2;
  }
  std::printf("a stream of %llu bytes, elements of 100 bytes\n\n", static_cast<unsigned long long>(length));
  measure({"ring of 10 pages of 1 MiB (the default over a file)", kMiB, 10 * kMiB}, length);
  measure({"ring of 2 pages of 64 KiB", 0x10000, 0x20000}, length);
  return 0;
}
