/// W7 with the plain operations: elements of 40 bytes, header included, in a file of 1 GiB through the ring.
#include <cstring>
#include <memory>

#include "bench/file.hpp"
#include "bench/library/plain.hpp"
#include "bench/library/ringSteps.hpp"

namespace
{

using namespace file;

constexpr uint64_t kPayloadBytes = kPieceBytes - sizeof(TAVHeader64);
constexpr uint64_t kElements = (kFileBytes - sizeof(TAVHeader64)) / kPieceBytes;

/// A handle over the file through a ring of the default size.
class FileHandle
{
public:
  FileHandle(uint64_t fileOptions, uint64_t options)
  {
    KORFileOpenParam open;
    open.pPath = path().c_str();
    open.options = fileOptions;
    uint32_t rc = TAV_RC_OK;
    storage_ = std::make_unique<TAVSSFile>(&open, &rc);
    TAVInitParam param(storage_.get(), options);
    if (rc == TAV_RC_OK)
    {
      tavInitHandle(&handle_, &param);
    }
  }
  ~FileHandle()
  {
    if (handle_ != nullptr)
    {
      tavTermHandle(&handle_);
    }
  }
  FileHandle(const FileHandle&) = delete;
  FileHandle& operator=(const FileHandle&) = delete;

  [[nodiscard]] TAVHandle* get() const { return handle_; }

private:
  std::unique_ptr<TAVSSFile> storage_;
  TAVHandle* handle_ = nullptr;
};

uint32_t add(TAVHandle* handle, uint64_t size, uint16_t type, void* payload)
{
  TAVHeaderData node;
  node.header.hdr64 = {size, 0, type, 1000};
  node.header.hdrType = TAV_HDR_64;
  node.pDataBuf = static_cast<uint8_t*>(payload);
  node.dataBufSize = payload != nullptr ? size : 0;
  return tavAddElement(0, handle, &node);
}

/// What the payloads' words add up to: the first word of element i is i.
constexpr uint64_t kSum = kElements * (kElements - 1) / 2;

bool write(uint64_t fileOptions)
{
  const FileHandle file(fileOptions, TAV_OPT_WRITE);
  TAVHandle* const handle = file.get();
  uint32_t rc = handle == nullptr ? TAV_RC_BAD_PARAM : add(handle, TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, nullptr);
  uint64_t words[kPayloadBytes / sizeof(uint64_t)] = {};
  for (uint64_t i = 0; i < kElements; ++i)
  {
    words[0] = i;
    rc |= add(handle, kPayloadBytes, TAV_TYPE_BINARY, words);
  }
  return rc == TAV_RC_OK && tavCloseHeader(0, handle) == TAV_RC_OK && handle->pCircularBuf->reset() == TAV_RC_OK;
}

uint64_t read()
{
  const FileHandle file(KOR_FILE_READ, TAV_OPT_READ);
  TAVHandle* const handle = file.get();
  TAVHeaderData root;
  if (handle == nullptr || tavGetNextChild(0, handle, nullptr, nullptr, &root) != TAV_RC_OK)
  {
    return 0;
  }
  uint64_t sum = 0;
  TAVHeaderData nodes[2];
  TAVHeader* previous = nullptr;
  for (size_t i = 0; tavGetNextChild(0, handle, &root.header, previous, &nodes[i]) == TAV_RC_OK; i ^= 1U)
  {
    previous = &nodes[i].header;
    sum += sumWords(reinterpret_cast<const char*>(nodes[i].pDataBuf), kPayloadBytes);
  }
  return sum;
}

/// The same with the C++ layer.
bool writeLayer()
{
  tav::Writer writer(path(), {.overwrite = true, .inPlace = true, .lock = false});
  uint64_t words[kPayloadBytes / sizeof(uint64_t)] = {};
  tav::Group root = writer.group(1000);
  for (uint64_t i = 0; i < kElements; ++i)
  {
    words[0] = i;
    root.add(1000, std::as_bytes(std::span(words)));
  }
  root.close();
  writer.finish();
  return true;
}

bool writeLayerOver()
{
  KORFileOpenParam open;
  open.pPath = path().c_str();
  open.options = KOR_FILE_UPDATE;
  uint32_t rc = TAV_RC_OK;
  TAVSSFile storage(&open, &rc);
  tav::Writer writer(storage);
  return library::addThroughRing(writer, kElements) && rc == TAV_RC_OK;
}

uint64_t readLayer()
{
  const tav::Reader reader(path());
  uint64_t sum = 0;
  for (const tav::Node& node : reader.root().children())
  {
    const tav::PayloadView payload = node.payload();
    sum += sumWords(reinterpret_cast<const char*>(payload.data()), payload.size());
  }
  return sum;
}

template<class Pass>
void perFile(benchmark::State& state, Pass&& pass)
{
  bool works = true;
  for ([[maybe_unused]] const auto iteration : state)
  {
    works &= pass();
  }
  if (!works)
  {
    state.SkipWithError("the library failed on the workload");
  }
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(kFileBytes));
}

void writeOver(benchmark::State& state)
{
  path();
  perFile(state, [] { return write(KOR_FILE_UPDATE); });
  if (read() != kSum)
  {
    state.SkipWithError("what was written reads back otherwise");
  }
}
BENCHMARK(writeOver)->Name("W7write/tavAddElement")->UseRealTime();

void writeLayerOver(benchmark::State& state)
{
  path();
  perFile(state, [] { return writeLayerOver(); });
  if (readLayer() != kSum)
  {
    state.SkipWithError("what was written reads back otherwise");
  }
}
BENCHMARK(writeLayerOver)->Name("W7write/layer")->UseRealTime();

void writeLayerNew(benchmark::State& state)
{
  path();
  perFile(state, [] { return writeLayer(); });
}
BENCHMARK(writeLayerNew)->Name("W7new/layer")->UseRealTime();

void readLayer(benchmark::State& state)
{
  path();
  if (!writeLayerOver())
  {
    state.SkipWithError("the stream could not be written");
    return;
  }
  perFile(state, [] { return readLayer() == kSum; });
}
BENCHMARK(readLayer)->Name("W7read/layer")->UseRealTime();

/// A file that grows: the system adds pages to its cache meanwhile.
void writeNew(benchmark::State& state)
{
  path();
  perFile(state, [] { return write(KOR_FILE_UPDATE | KOR_FILE_TRUNCATE); });
}
BENCHMARK(writeNew)->Name("W7new/tavAddElement")->UseRealTime();

void readAll(benchmark::State& state)
{
  path();
  if (!write(KOR_FILE_UPDATE))
  {
    state.SkipWithError("the stream could not be written");
    return;
  }
  perFile(state, [] { return read() == kSum; });
}
BENCHMARK(readAll)->Name("W7read/tavGetNextChild")->UseRealTime();

} // namespace
