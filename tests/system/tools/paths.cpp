// tav_paths FILE: reads paths from standard input, one a line, and prints for each of them, as a line, the offsets of
// the nodes that it leads to in the file, in the order in which they are found: by the inspection library, which works
// out the form; and, behind an "|", by the layer in that form.
#include <exception>
#include <filesystem>
#include <iostream>
#include <string>

#include "tav/inspect.hpp"
#include "tav/tav.hpp"

namespace
{

std::string inspected(tav::inspect::ByteSource& source, const tav::inspect::Form& form, const tav::Path& path)
{
  std::string found;
  tav::inspect::PathSearch search(source, form, path);
  for (tav::inspect::Event event; search.next(event);)
  {
    found += std::to_string(event.offset) + " ";
  }
  return found;
}

std::string read(const tav::Reader& reader, const tav::Path& path)
{
  std::string found;
  for (const tav::Node& node : reader.find(path))
  {
    found += ' ';
    found += std::to_string(node.offset());
  }
  return found;
}

int run(const char* name)
{
  const auto source = tav::inspect::ByteSource::open(name);
  const tav::inspect::Form form = tav::inspect::recognise(*source, {}).form;
  const tav::Reader reader(std::filesystem::path(name),
                           {.byteOrder = form.swapped ? tav::ByteOrder::swapped : tav::ByteOrder::native,
                            .align8 = form.aligned,
                            .root = form.root64 ? tav::Width::bits64 : tav::Width::bits32});
  for (std::string text; std::getline(std::cin, text);)
  {
    const tav::Path path(text);
    std::cout << inspected(*source, form, path) << "|" << read(reader, path) << "\n";
  }
  return 0;
}

} // namespace

int main(int argc, char** argv)
{
  try
  {
    return argc == 2 ? run(argv[1]) : 2;
  }
  catch (const std::exception& error)
  {
    std::cerr << error.what() << "\n";
    return 1;
  }
}
