// What the others do wrong, done right. Has to compile.
#include <array>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Writer writer({.align8 = true});
  tav::Group group = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
  group.add(TAV_ELM_CMN_CPU_ONLINE, uint8_t{1});
  group.add<TAV_TYPE_UINT8>(TAV_ELM_CMN_CPU_ONLINE, 5);
  group.add(TAV_ELM_CMN_HOST_NAME, "ada");
  tav::Group moved = std::move(group);
  moved.close();
  const std::vector<std::byte> bytes(writer.bytes().begin(), writer.bytes().end());
  const tav::Reader reader(bytes, {.align8 = true});
  const tav::Node root = reader.root();
  const tav::OwnedNode copy = root.path("hostName")->copy();
  return copy.as<std::string_view>() == "ada" && copy.payload().size() == 3 &&
                 root.path("cpuOnline")->asNumber<int>() == 1
             ? 0
             : 1;
}
