/// The program's commands on arbitrary bytes: json and back gives the same bytes; recover, get, check and tree end.
#include "fuzz/commands.h"
#include "fuzz/input.h"

namespace
{

using namespace fuzz;

void thereAndBack(const Folder& folder, const std::string& file, const std::vector<Option>& form, uint8_t style)
{
  std::vector<Option> options = with(form, {{"--output", folder.path("x.json")}, {"--force"}});
  if (style % 3U == 1)
  {
    options.push_back({"--lines"});
  }
  if (style % 3U == 2)
  {
    options.push_back({"--compact"});
  }
  if (style >= 0x80)
  {
    options.push_back({"--safe"});
  }
  const int status = runCommand("json", options, {file});
  demand(status == 0 || status == 1 || status == 3, "json ended with " + std::to_string(status));
  const int built = runCommand("build", {{"--output", folder.path("y.tav")}, {"--force"}}, {folder.path("x.json")});
  demand(built == 0, "build ended with " + std::to_string(built) + " on what json made");
  demand(folder.get("y.tav") == folder.get("x.tav"), "json and build give other bytes");
}

void recover(const Folder& folder, const std::string& file, const std::vector<Option>& form)
{
  const std::vector<Option> into =
      with(form, {{"--output", folder.path("r.tav")}, {"--force"}, {"--report", folder.path("r.json")}, {"--json"}});
  const int status = runCommand("recover", into, {file});
  demand(status == 0 || status == 1 || status == 3, "recover ended with " + std::to_string(status));
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
  const uint8_t choice = input.byte();
  const std::vector<Option> form = formOptions(input.byte());
  const uint8_t style = input.byte();
  const std::string path = choice % 4U == 2 ? input.text(32) : std::string();
  const std::string file = folder.put("x.tav", input.rest());
  switch (choice % 4U)
  {
  case 0: thereAndBack(folder, file, form, style); break;
  case 1: recover(folder, file, form); break;
  case 2:
    runCommand("get", with(form, {{style % 2U != 0 ? "--all" : "--paths"}, {style % 3U != 0 ? "--json" : "--paths"}}),
               {file, path.empty() ? "**" : path});
    break;
  default: runCommand(style % 2U != 0 ? "check" : "tree", form, {file}); break;
  }
  folder.expectOnly({"x.tav", "y.tav", "x.json", "r.tav", "r.json"});
  return 0;
}
