// EXPECT: only an integer can be added as an integer type
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Writer writer;
  tav::Group group = writer.group(TAV_ELM_CMN_SYSTEM);
  group.add<TAV_TYPE_UINT8>(TAV_ELM_CMN_CPU_ONLINE, true);
}
