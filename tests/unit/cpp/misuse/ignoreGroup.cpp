// EXPECT: (nodiscard|unused)
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Writer writer;
  writer.group(TAV_ELM_CMN_SYSTEM);
}
