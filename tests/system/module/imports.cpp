/// The README's program, with the layer imported. What it takes of the standard library it includes itself.
#include <cstdint>
#include <cstdio>

import tav;

int main()
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    tav::Group host = system.group(TAV_ELM_CMN_HOST, {.eyeSize = true});
    host.add(TAV_ELM_CMN_HOST_NAME, "ada");
    host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
  }
  writer.finish();

  tav::Reader reader(writer.bytes());
  int count = 0;
  for (const tav::Node& node : reader.root().descendants())
  {
    std::printf("%.*s\n", static_cast<int>(node.tag().size()), node.tag().data());
    ++count;
  }
  const tav::Index index(reader.root());
  const bool indexed = index.find("host/cpuOnline").has_value();
  return count == 3 && indexed && reader.path("/system/host/cpuOnline")->as<uint32_t>() == 8 ? 0 : 1;
}
