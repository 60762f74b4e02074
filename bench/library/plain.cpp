/// W1, W2, W3 and W5 with the plain operations.
#include "bench/library/plain.hpp"

using namespace snapshot;

namespace
{

uint32_t openGroup(TAVHandle* handle, unsigned id)
{
  TAVHeaderData node;
  node.header.hdr64 = {TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, static_cast<uint16_t>(id)};
  node.header.hdrType = TAV_HDR_64;
  node.pDataBuf = nullptr;
  node.dataBufSize = 0;
  return tavAddElement(0, handle, &node);
}

/// A leaf's payload, which is only read.
uint8_t* payloadOf(const Model& model, const Leaf& leaf)
{
  return static_cast<uint8_t*>(const_cast<void*>(model.payload(leaf)));
}

/// One descriptor for all leaves, of which each changes what is its own. `sized`: the payload's size is given, too.
template<bool sized>
class KeptDescriptor
{
public:
  KeptDescriptor()
  {
    node_.header.hdr64.info = 0;
    node_.header.hdrType = TAV_HDR_64;
    node_.dataBufSize = 0;
  }
  uint32_t add(TAVHandle* handle, const Model& model, const Leaf& leaf)
  {
    node_.header.hdr64.size = leaf.size;
    node_.header.hdr64.type = floor0::typeOf(leaf.type);
    node_.header.hdr64.elm = leaf.id;
    node_.pDataBuf = payloadOf(model, leaf);
    if constexpr (sized)
    {
      node_.dataBufSize = leaf.size;
    }
    return tavAddElement(0, handle, &node_);
  }

private:
  TAVHeaderData node_;
};

/// One for each leaf, zeroed and filled field by field.
struct ZeroedDescriptor
{
  static uint32_t add(TAVHandle* handle, const Model& model, const Leaf& leaf)
  {
    TAVHeaderData node{};
    node.header.hdr64.size = leaf.size;
    node.header.hdr64.type = floor0::typeOf(leaf.type);
    node.header.hdr64.elm = leaf.id;
    node.header.hdrType = TAV_HDR_64;
    node.pDataBuf = payloadOf(model, leaf);
    return tavAddElement(0, handle, &node);
  }
};

/// One for each leaf, all members at once.
struct InitializedDescriptor
{
  static uint32_t add(TAVHandle* handle, const Model& model, const Leaf& leaf)
  {
    TAVHeaderData node{
        {{.hdr64 = {leaf.size, 0, floor0::typeOf(leaf.type), leaf.id}}, TAV_HDR_64, 0}, payloadOf(model, leaf), 0, 0};
    return tavAddElement(0, handle, &node);
  }
};

/// The codes of all calls together: 0 when all worked.
template<class Descriptor>
uint32_t writeHost(TAVHandle* handle, const Model& model)
{
  uint32_t rc = openGroup(handle, kHostId);
  Descriptor descriptor;
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    rc |= openGroup(handle, kDatabaseId + k);
    for (unsigned j = 0; j < kApplications; ++j)
    {
      rc |= openGroup(handle, kApplicationId + j);
      const Leaf* leaf = model.application(k, j);
      for (unsigned m = 0; m < kMetrics; ++m, ++leaf)
      {
        rc |= descriptor.add(handle, model, *leaf);
      }
      rc |= tavCloseHeader(0, handle);
    }
    rc |= tavCloseHeader(0, handle);
  }
  rc |= tavCloseHeader(0, handle);
  return rc;
}

template<class Descriptor>
size_t encodeWith(const Model& model, void* block, uint64_t size, size_t hosts)
{
  const library::MemoryHandle handle(block, size, TAV_OPT_WRITE);
  uint32_t rc = openGroup(handle.get(), kRootId);
  for (size_t i = 0; i < hosts; ++i)
  {
    rc |= writeHost<Descriptor>(handle.get(), model);
  }
  rc |= tavCloseHeader(0, handle.get());
  return rc == TAV_RC_OK ? handle.get()->streamBytes : 0;
}

uint64_t valueOf(const TAVHeaderData& leaf)
{
  return floor0::sumPayload(leaf.header.hdr64.type, leaf.header.hdr64.size,
                            reinterpret_cast<const char*>(leaf.pDataBuf));
}

/// One descriptor: the child returned last is the next call's reference, and is read before the next one takes its
/// place.
uint64_t sumBelow(TAVHandle* handle, TAVHeader* parent)
{
  uint64_t sum = 0;
  TAVHeaderData node;
  TAVHeader* previous = nullptr;
  while (tavGetNextChild(0, handle, parent, previous, &node) == TAV_RC_OK)
  {
    previous = &node.header;
    sum += node.header.hdr64.type == TAV_TYPE_HEADER64 ? sumBelow(handle, previous) : valueOf(node);
  }
  return sum;
}

void encode(benchmark::State& state, library::Filling filling)
{
  std::vector<char> block(kBlockBytes);
  perEncoding(state, block, [&] { return library::encodePlain(model(), block.data(), block.size(), filling); });
}
BENCHMARK_CAPTURE(encode, sized, library::Filling::sized)->Name("W1/tavAddElement");
BENCHMARK_CAPTURE(encode, kept, library::Filling::kept)->Name("W1/tavAddElement_kept_descriptor");
BENCHMARK_CAPTURE(encode, zeroed, library::Filling::zeroed)->Name("W1/tavAddElement_zeroed_descriptor");
BENCHMARK_CAPTURE(encode, initialized, library::Filling::initialized)->Name("W1/tavAddElement_initialized_descriptor");

void walk(benchmark::State& state)
{
  perWalk(state, library::encodedSize(), [] { return library::walkPlain(library::encoded(), library::encodedSize()); });
}
BENCHMARK(walk)->Name("W2/tavGetNextChild");

void find(benchmark::State& state)
{
  const library::MemoryHandle handle(library::encoded(), library::encodedSize(), TAV_OPT_READ);
  perPath(state, [&](const Path& path) { return library::findPlain(handle.get(), path, nullptr); });
}
BENCHMARK(find)->Name("W3/tavFindElmInt");

void findWithStack(benchmark::State& state)
{
  const library::MemoryHandle handle(library::encoded(), library::encodedSize(), TAV_OPT_READ);
  TAVHdrStack stack;
  perPath(state, [&](const Path& path) { return library::findPlain(handle.get(), path, &stack); });
}
BENCHMARK(findWithStack)->Name("W3/tavFindElmInt_own_stack");

void validate(benchmark::State& state)
{
  perTree(state, [] {
    const bool sound = library::validatePlain(library::encoded(), library::encodedSize());
    return sound ? library::encodedSize() : 0;
  });
}
BENCHMARK(validate)->Name("W5/tavValidateHierarchy");

} // namespace

namespace library
{

size_t encodePlain(const Model& model, void* block, uint64_t size, Filling filling, size_t hosts)
{
  switch (filling)
  {
  case Filling::kept: return encodeWith<KeptDescriptor<false>>(model, block, size, hosts);
  case Filling::zeroed: return encodeWith<ZeroedDescriptor>(model, block, size, hosts);
  case Filling::initialized: return encodeWith<InitializedDescriptor>(model, block, size, hosts);
  default: return encodeWith<KeptDescriptor<true>>(model, block, size, hosts);
  }
}

uint64_t walkPlain(void* block, uint64_t size)
{
  const MemoryHandle handle(block, size, TAV_OPT_READ);
  TAVHeaderData root;
  return tavGetNextChild(0, handle.get(), nullptr, nullptr, &root) == TAV_RC_OK ? sumBelow(handle.get(), &root.header)
                                                                                : 0;
}

/// The path from the root, a search a level.
uint64_t findPlain(TAVHandle* handle, const Path& path, TAVHdrStack* stack)
{
  const uint32_t ids[] = {kHostId, kDatabaseId + uint32_t{path.k}, kApplicationId + uint32_t{path.j},
                          kMetricId + uint32_t{path.m}};
  TAVHeaderData parent;
  if (tavGetNextChild(0, handle, nullptr, nullptr, &parent) != TAV_RC_OK)
  {
    return 0;
  }
  for (const uint32_t id : ids)
  {
    TAVHeaderData found;
    if (tavFindElmInt(handle, &parent.header, 0, 0, 0, id, nullptr, stack, &found) != TAV_RC_OK)
    {
      return 0;
    }
    if (stack != nullptr)
    {
      stack->pop(); // the search leaves its level there
    }
    parent = found;
  }
  return valueOf(parent);
}

bool validatePlain(void* block, uint64_t size)
{
  const MemoryHandle handle(block, size, TAV_OPT_READ);
  TAVHeaderData root;
  return tavGetNextChild(0, handle.get(), nullptr, nullptr, &root) == TAV_RC_OK &&
         tavValidateHierarchy(0, handle.get(), &root.header) == TAV_RC_OK;
}

} // namespace library
