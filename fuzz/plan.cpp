/// A plan of arbitrary bytes: the walks through its parts give what one walk gives, and several threads find what one
/// does.
#include <span>
#include <string>
#include <vector>

#include "fuzz/input.h"
#include "support/writtenDown.h"
#include "tav/inspect.hpp"

namespace
{

using fuzz::demand;
using namespace tav::inspect;

std::string inOneWalk(ByteSource& source, const Form& form)
{
  std::string text;
  Walker walker(source, form);
  for (Event event; walker.next(event);) text += test::writtenDown(event) + "\n";
  return text;
}

std::string inParts(ByteSource& source, std::vector<Part> parts)
{
  std::vector<std::string> texts(parts.size());
  std::vector<PartEnd> ends(parts.size());
  const auto walk = [&](size_t i) {
    texts[i].clear();
    ends[i] = walkPart(
        source, partOf(numbersOf(parts[i])),
        [&](const Walker&, const Event& event) { texts[i] += test::writtenDown(event) + "\n"; }, Streams::oneForm);
  };
  for (size_t i = 0; i < parts.size(); ++i) walk(i);
  size_t mended = 0;
  while (const auto i = mendParts(parts, ends))
  {
    demand(++mended < parts.size(), "mended more than once");
    walk(*i);
  }
  std::string all;
  for (const std::string& text : texts) all += text;
  return all;
}

std::string checked(ByteSource& source, const Form& form, unsigned threads, uint64_t part)
{
  std::string text;
  const auto sink = [&](const Finding& found) {
    text += std::to_string(found.offset) + " " + found.path + " " + found.sentence + "\n";
  };
  const auto all = [](RuleId) { return true; };
  const CheckTotals totals =
      check(source, form, {.wanted = all, .sink = sink, .threads = threads, .partBytes = part});
  return text + std::to_string(totals.nodes) + " " + std::to_string(totals.endElements);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  fuzz::Input input(data, size);
  const uint8_t flags = input.byte();
  const Form form{.swapped = (flags & 1U) != 0, .root64 = (flags & 4U) == 0, .aligned = (flags & 2U) != 0};
  const uint64_t target = 1 + uint64_t{input.byte()};
  ByteSource source("x", input.rest());
  const std::vector<Part> parts = plan(source, form, {.targetBytes = target});
  uint64_t end = 0;
  for (const Part& part : parts)
  {
    demand(part.offset == end, "parts with a gap between them, or over one another");
    end = part.end();
  }
  demand(end == source.size(), "parts that are not the file");
  demand(inParts(source, parts) == inOneWalk(source, form), "the parts give something else than one walk");
  demand(checked(source, form, 2, target) == checked(source, form, 1, 0), "two threads find something else than one");
  return 0;
}
