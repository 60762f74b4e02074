/// Dictionary files of any characters: each is told to be none, with line and column, or gives elements that are found
/// by id and tag, that no other has, and that paths and JSON understand.
#include <string>
#include <string_view>

#include "fuzz/input.h"
#include "tav/inspect.hpp"
#include "tav/path/compiled.hpp"

namespace
{

using fuzz::demand;
using namespace tav::inspect;

void look(const Dictionary& names)
{
  demand(names.isEmpty() == names.elements().empty(), "empty, and not");
  demand(names.names().size() == names.elements().size(), "as many names as elements");
  uint32_t least = 0;
  for (const OwnElement& element : names.elements())
  {
    demand(element.id >= least, "not by id, or twice");
    least = element.id + 1U;
    demand(names.find(element.id) == &element && names.find(element.tag) == &element, "not found");
    demand(tav::dictionary::tagOf(element.id).empty() && !tav::dictionary::idOf(element.tag), "a built-in one");
    demand(names.tagOf(element.id) == element.tag && elementText(element.id, names) == element.tag, "another tag");
    demand(idsOf(element.tag, names).size() == 1 && xmlNameOf(element.id, names) == element.tag, "another id");
    const Path path = pathOf("/" + element.tag + "[" + element.tag + " = 1]", names);
    demand(path.compiled().routes.back().steps.back().only == element.id, "a path leads elsewhere");
    demand(element.place.find(": line ") != std::string::npos, "no place");
  }
}

Dictionary read(const std::string& name, std::string_view text)
{
  MemoryText source(name, text);
  try
  {
    return Dictionary::read(source);
  }
  catch (const Error& error)
  {
    demand(error.problem().file.starts_with(name + ": line ") && !error.problem().sentence.empty(), "no place");
  }
  return {};
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  fuzz::Input input(data, size);
  const std::string text = input.text(255);
  const auto rest = input.rest();
  const Dictionary one = read("a", text);
  const Dictionary other = read("b", {reinterpret_cast<const char*>(rest.data()), rest.size()});
  look(one);
  look(other);
  look(one.over(other));
  demand(one.over(other).elements().size() >= one.elements().size(), "the higher one lost a name");
  try
  {
    const Dictionary both = one.with(other);
    look(both);
    demand(both.elements().size() == other.over(one).elements().size(), "they agree in one order alone");
  }
  catch (const Error&)
  {
    demand(!one.isEmpty() && !other.isEmpty(), "nothing contradicts nothing");
  }
  return 0;
}
