// EXPECT: has no type in the stream
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Writer writer;
  tav::Group group = writer.group(TAV_ELM_CMN_SYSTEM);
  group.add(TAV_ELM_CMN_CPU_ONLINE, 1.5);
}
