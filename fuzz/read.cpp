/// Every reading operation over arbitrary bytes, in memory and through rings of any page size over a storage that hands
/// out as little as it likes; and both ways compared.
#include "fuzz/input.h"
#include "support/prober.h"
#include "support/twinReader.h"

namespace
{

using namespace test;

enum Part : uint8_t
{
  kRead = 0x01,
  kScan = 0x02,
  kIndex = 0x04,
  kStep = 0x08,
  kSearch = 0x10,
  kValidate = 0x20,
  kPrint = 0x40,
  kCompare = 0x80
};

void probe(const Bytes& stream, const Form& form, uint8_t parts, uint64_t seed)
{
  Prober prober(stream, form, seed);
  if ((parts & kRead) != 0)
  {
    prober.readEverywhere();
  }
  if ((parts & kScan) != 0)
  {
    prober.scanEverywhere();
  }
  if ((parts & kIndex) != 0)
  {
    prober.indexEverywhere();
  }
  if ((parts & kStep) != 0)
  {
    prober.stepEverywhere();
  }
  if (!prober.walk())
  {
    return;
  }
  if ((parts & kSearch) != 0)
  {
    prober.search();
  }
  if ((parts & kValidate) != 0)
  {
    prober.validate();
  }
  if ((parts & kPrint) != 0)
  {
    prober.print();
  }
}

void compare(const Bytes& stream, const Form& form, uint64_t seed)
{
  ScriptCase one;
  one.seed = seed;
  one.pageUnit = form.pageBytes;
  one.ringPages = std::max<uint64_t>(form.ringBytes / one.pageBytes(), 1);
  one.swap = form.swap;
  one.align = form.align;
  Random random(seed);
  TwinReader(one, random, stream, form.root32).run({});
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  fuzz::Input input(data, size);
  const Form form = fuzz::takeForm(input);
  const uint8_t parts = input.byte();
  const uint8_t seed = input.byte();
  const Bytes stream = input.copyOfRest();
  if (stream.empty())
  {
    return 0;
  }
  if ((parts & kCompare) != 0)
    compare(stream, form, seed);
  else
    probe(stream, form, parts, seed);
  return 0;
}
