/// `tav recover` on arbitrary bytes: what it makes has no defect.
#include "fuzz/commands.h"
#include "fuzz/input.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  using namespace fuzz;
  static const Folder folder;
  if (size > kLargest)
  {
    return 0;
  }
  Input input(data, size);
  // What is recognised from damaged bytes can be another form than what is recognised from the sound ones.
  const std::vector<Option> form = formOptions(0x80U | input.byte());
  const std::string file = folder.put("x.tav", input.rest());
  const std::vector<Option> into =
      with(form, {{"--output", folder.path("r.tav")}, {"--force"}, {"--report", folder.path("r.json")}});
  const int status = runCommand("recover", into, {file});
  demand(status == 0 || status == 1 || status == 3, "recover ended with " + std::to_string(status));
  folder.expectOnly({"x.tav", "r.tav", "r.json"});
  if (status == 3)
  {
    return 0;
  }
  const int sound = runCommand("check", form, {folder.path("r.tav")});
  demand(sound == 0, "check ended with " + std::to_string(sound) + " on what recover made");
  return 0;
}
