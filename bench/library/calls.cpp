/// What a single call costs beside its work: handles, and the header stack that a search or a validation makes for
/// itself.
#include <optional>

#include "bench/library/plain.hpp"

using namespace snapshot;

namespace
{

template<class Call>
void perCall(benchmark::State& state, Call&& call)
{
  bool works = true;
  for ([[maybe_unused]] const auto iteration : state)
  {
    works &= call();
  }
  if (!works)
  {
    state.SkipWithError("a call failed");
  }
  state.SetItemsProcessed(state.iterations());
}

void openAndClose(benchmark::State& state, uint64_t options)
{
  std::vector<char> block = floor0::stream();
  perCall(state, [&] { return library::MemoryHandle(block.data(), block.size(), options).get() != nullptr; });
}
BENCHMARK_CAPTURE(openAndClose, read, TAV_OPT_READ)->Name("call/open_close_for_reading");
BENCHMARK_CAPTURE(openAndClose, write, TAV_OPT_WRITE)->Name("call/open_close_for_writing");

void makeStack(benchmark::State& state)
{
  perCall(state, [] {
    const TAVHdrStack stack;
    return stack.capacity != 0;
  });
}
BENCHMARK(makeStack)->Name("call/header_stack_made_and_freed");

/// The search's work is one header: the host is the root's only child.
void findFirst(benchmark::State& state, bool ownStack)
{
  const library::MemoryHandle handle(library::encoded(), library::encodedSize(), TAV_OPT_READ);
  std::optional<TAVHdrStack> stack;
  TAVHdrStack* const used = ownStack ? &stack.emplace() : nullptr;
  TAVHeaderData root{};
  tavGetNextChild(0, handle.get(), nullptr, nullptr, &root);
  perCall(state, [&] {
    TAVHeaderData found;
    const uint32_t rc = tavFindElmInt(handle.get(), &root.header, 0, 0, 0, kHostId, nullptr, used, &found);
    if (used != nullptr)
    {
      used->pop();
    }
    return rc == TAV_RC_OK;
  });
}
BENCHMARK_CAPTURE(findFirst, null, false)->Name("call/tavFindElmInt_first_child");
BENCHMARK_CAPTURE(findFirst, own, true)->Name("call/tavFindElmInt_first_child_own_stack");

/// The validation's work is a group of one leaf.
void validateSmall(benchmark::State& state)
{
  constexpr floor0::Header headers[] = {{20, 0, floor0::kGroup, kRootId}, {4, 0, floor0::kU32, kMetricId}};
  char block[sizeof headers + 4] = {};
  std::memcpy(block, headers, sizeof headers);
  const library::MemoryHandle handle(block, sizeof block, TAV_OPT_READ);
  TAVHeaderData root{};
  tavGetNextChild(0, handle.get(), nullptr, nullptr, &root);
  perCall(state, [&] { return tavValidateHierarchy(0, handle.get(), &root.header) == TAV_RC_OK; });
}
BENCHMARK(validateSmall)->Name("call/tavValidateHierarchy_one_child");

} // namespace
