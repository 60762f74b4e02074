/// What tracing costs: the passes of W1, W2 and W5 with a trace running, whose sink only counts.
#include "bench/library/plain.hpp"

using namespace snapshot;

namespace
{

/// A trace from here to the end of the scope.
class CountedTrace
{
public:
  CountedTrace()
  {
    const KORTraceSink count = [](void* context, const KORTraceRecord*) { ++*static_cast<uint64_t*>(context); };
    works_ = korTraceStart(count, &records_) == TAV_RC_OK;
  }
  ~CountedTrace()
  {
    if (works_)
    {
      korTraceStop();
    }
  }
  CountedTrace(const CountedTrace&) = delete;
  CountedTrace& operator=(const CountedTrace&) = delete;

  [[nodiscard]] uint64_t records() const { return records_; }

private:
  uint64_t records_ = 0;
  bool works_ = false;
};

/// Counts the records of a leaf, too: a pass without any would show that nothing was traced.
template<class Pass>
void perTraced(benchmark::State& state, Pass&& pass)
{
  const CountedTrace trace;
  uint64_t passes = 0;
  perTree(state, [&] {
    ++passes;
    return pass();
  });
  if (trace.records() < passes * kLeaves)
  {
    state.SkipWithError("too few records");
    return;
  }
  state.counters["records"] = static_cast<double>(trace.records() / (passes * kLeaves));
}

void encodeTraced(benchmark::State& state)
{
  std::vector<char> block(kBlockBytes);
  perTraced(state, [&] { return library::encodePlain(model(), block.data(), block.size()); });
}
BENCHMARK(encodeTraced)->Name("W1/tavAddElement_traced");

void walkTraced(benchmark::State& state)
{
  perTraced(state, [] {
    const bool sums = library::walkPlain(library::encoded(), library::encodedSize()) == model().checksum;
    return sums ? library::encodedSize() : 0;
  });
}
BENCHMARK(walkTraced)->Name("W2/tavGetNextChild_traced");

void validateTraced(benchmark::State& state)
{
  perTraced(state, [] {
    const bool sound = library::validatePlain(library::encoded(), library::encodedSize());
    return sound ? library::encodedSize() : 0;
  });
}
BENCHMARK(validateTraced)->Name("W5/tavValidateHierarchy_traced");

} // namespace
