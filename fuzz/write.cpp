/// Sequences of writing operations, over direct memory and through a ring: both hold the same bytes and answer the
/// same, also when everything is read back.
#include "fuzz/input.h"
#include "support/twinReader.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  using namespace test;
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  fuzz::Input input(data, size);
  const uint8_t flags = input.byte();
  const uint8_t page = input.byte();
  ScriptCase one;
  one.seed = flags;
  one.pageUnit = page != 0 ? page : 4096U;
  one.ringPages = 1 + (flags >> 2) % 12U;
  one.swap = (flags & 1U) != 0;
  one.align = (flags & 2U) != 0;
  Random random(input.rest(), one.seed);
  TwinWriter writer(one, random);
  writer.run();
  TwinReader(one, random, writer.stream(), writer.root32()).run(writer.nodes());
  return 0;
}
