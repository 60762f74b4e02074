/// `tav build` on arbitrary text. What it makes is a stream that json and build reproduce.
#include "fuzz/commands.h"
#include "fuzz/input.h"

namespace
{

using namespace fuzz;

std::vector<Option> conversion(uint8_t flags)
{
  std::vector<Option> options;
  if ((flags & 1U) != 0)
  {
    options.push_back({"--byte-order", (flags & 2U) != 0 ? "big" : "little"});
  }
  if ((flags & 4U) != 0)
  {
    options.push_back({(flags & 8U) != 0 ? "--align" : "--no-align"});
  }
  if ((flags & 0x10U) != 0)
  {
    options.push_back({"--root", (flags & 0x20U) != 0 ? "32" : "64"});
  }
  if ((flags & 0x40U) != 0)
  {
    options.push_back({"--eye-size"});
  }
  return options;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  static const Folder folder;
  if (size > kLargest)
  {
    return 0;
  }
  Input input(data, size);
  std::vector<Option> options = conversion(input.byte());
  options.push_back({"--output", folder.path("y.tav")});
  options.push_back({"--force"});
  const int status = runCommand("build", options, {folder.put("x.json", input.rest())});
  demand(status >= 0 && status <= 3, "build ended with " + std::to_string(status));
  folder.expectOnly({"x.json", "y.tav", "y.json", "z.tav"});
  if (status != 0)
  {
    return 0;
  }
  const int read = runCommand("json", {{"--output", folder.path("y.json")}, {"--force"}}, {folder.path("y.tav")});
  demand(read == 0 || read == 1 || read == 3, "json ended with " + std::to_string(read));
  const int again = runCommand("build", {{"--output", folder.path("z.tav")}, {"--force"}}, {folder.path("y.json")});
  demand(again == 0, "build ended with " + std::to_string(again) + " on what json made");
  demand(folder.get("z.tav") == folder.get("y.tav"), "build, json and build give other bytes");
  return 0;
}
