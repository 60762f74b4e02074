/// libebml. Two-byte EBML ids (0x4000 + element id); masters get a four-byte size
/// that is written again once it is known; the reader takes every element as it comes.
#include <ebml/EbmlBinary.h>
#include <ebml/EbmlContexts.h>
#include <ebml/EbmlDummy.h>
#include <ebml/EbmlMaster.h>
#include <ebml/EbmlStream.h>
#include <ebml/EbmlString.h>
#include <ebml/EbmlUInteger.h>
#include <ebml/IOCallback.h>

#include <memory>
#include <utility>

#include "bench/harness.hpp"

using namespace snapshot;
using namespace libebml;

namespace
{

/// Ids are 1000..5000; two-byte EBML ids run from 0x4000 to 0x7FFE.
EbmlId ebmlId(unsigned id)
{
  return EbmlId(0x4000 + id, 2);
}

class BlockIo : public IOCallback
{
public:
  BlockIo(char* p, size_t n)
      : block(p), capacity(n) {}
  uint32 read(void* to, size_t n) override
  {
    n = std::min(n, capacity - at);
    std::memcpy(to, block + at, n);
    at += n;
    return static_cast<uint32>(n);
  }
  void setFilePointer(int64 offset, seek_mode mode) override
  {
    at = static_cast<size_t>(mode == seek_beginning ? offset
                             : mode == seek_current ? static_cast<int64>(at) + offset
                                                    : static_cast<int64>(capacity) + offset);
  }
  size_t write(const void* from, size_t n) override
  {
    if (n > capacity - at)
    {
      return 0;
    }
    std::memcpy(block + at, from, n);
    at += n;
    return n;
  }
  uint64 getFilePointer() override { return at; }
  void close() override {}

  char* block;
  size_t capacity;
  size_t at = 0;
};

/// A context that knows no ids: every element is read as a dummy, a plain binary.
const EbmlSemanticContext& anyContext()
{
  static const EbmlSemanticContext context(0, nullptr, nullptr, &GetEbmlGlobal_Context, nullptr);
  return context;
}
EbmlElement& noCreate()
{
  return *new EbmlDummy();
}
const EbmlId kAnyId(0x4000, 2);
const EbmlCallbacks kAny(noCreate, kAnyId, "Any", anyContext());

/// A value or a group whose id is the object's own.
template<class Base>
struct WithId : Base
{
  template<class... A>
  explicit WithId(unsigned elementId, A&&... a)
      : Base(std::forward<A>(a)...), id(ebmlId(elementId))
  {}
  operator const EbmlId&() const override { return id; }
  const EbmlCallbacks& Generic() const override { return kAny; }
  EbmlElement& CreateElement() const override { return noCreate(); }
  EbmlElement* Clone() const override { return nullptr; }
  EbmlId id;
};

struct Group : WithId<EbmlMaster>
{
  Group(unsigned elementId, BlockIo& io)
      : WithId<EbmlMaster>(elementId, anyContext()), out(io)
  {
    SetSizeLength(4);
    head = out.at;
    out.at += 6; // id and size, written when the size is known
  }
  void finish()
  {
    const size_t end = out.at;
    binary code[6];
    id.Fill(code);
    CodedValueLength(end - head - 6, 4, code + 2);
    out.at = head;
    out.writeFully(code, 6);
    out.at = end;
  }
  BlockIo& out;
  size_t head;
};

size_t encode(const Model& m, BlockIo& io)
{
  io.at = 0;
  Group root(kRootId, io);
  Group host(kHostId, io);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    Group db(kDatabaseId + k, io);
    for (unsigned j = 0; j < kApplications; ++j)
    {
      Group app(kApplicationId + j, io);
      const Leaf* leaf = m.application(k, j);
      for (unsigned i = 0; i < kMetrics; ++i, ++leaf)
      {
        switch (leaf->type)
        {
        case 'u':
        case 'U':
        {
          WithId<EbmlUInteger> e(leaf->id);
          e.SetValue(leaf->value);
          e.Render(io, true);
          break;
        }
        case 't':
        {
          WithId<EbmlBinary> e(leaf->id);
          e.CopyBuffer(reinterpret_cast<const binary*>(m.bytes(*leaf)), 16);
          e.Render(io, true);
          break;
        }
        default:
        {
          WithId<EbmlString> e(leaf->id);
          e.SetValue(std::string(m.bytes(*leaf), leaf->size));
          e.Render(io, true);
        }
        }
      }
      app.finish();
    }
    db.finish();
  }
  host.finish();
  root.finish();
  return io.at;
}

const std::vector<char>& document()
{
  static const std::vector<char> d = [] {
    std::vector<char> v(4 << 20);
    BlockIo io(v.data(), v.size());
    v.resize(encode(model(), io));
    return v;
  }();
  return d;
}

void encodeEbml(benchmark::State& state)
{
  std::vector<char> out(4 << 20);
  BlockIo io(out.data(), out.size());
  perTree(state, [&] { return encode(model(), io); });
}
BENCHMARK(encodeEbml)->Name("W1/libebml");

uint64_t walk(BlockIo& io, uint64 end)
{
  uint64_t total = 0;
  while (io.at < end)
  {
    int upper = 0;
    std::unique_ptr<EbmlElement> e(EbmlElement::FindNextElement(io, anyContext(), upper, end - io.at, true));
    if (!e)
    {
      break;
    }
    const unsigned id = static_cast<const EbmlId&>(std::as_const(*e)).GetValue() - 0x4000;
    if (id >= kApplicationId)
    {
      const uint64 begin = io.at;
      total += walk(io, begin + e->GetSize());
      continue;
    }
    auto* b = static_cast<EbmlBinary*>(e.get());
    const size_t n = b->ReadData(io);
    const auto* p = b->GetBuffer();
    switch (kSchema[id - kMetricId])
    {
    case 'u':
    case 'U':
    {
      uint64_t v = 0;
      for (size_t i = 0; i < n; ++i)
      {
        v = v << 8 | p[i];
      }
      total += v;
      break;
    }
    case 't': total += sumTimestamp(p); break;
    default: total += sumString(reinterpret_cast<const char*>(p), n);
    }
  }
  return total;
}
void walkEbml(benchmark::State& state)
{
  std::vector<char> d = document();
  perWalk(state, d.size(), [&] {
    BlockIo io(d.data(), d.size());
    return walk(io, d.size());
  });
}
BENCHMARK(walkEbml)->Name("W2/libebml");

} // namespace
