// EXPECT: not the code of an integer type
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Writer writer;
  tav::Group group = writer.group(TAV_ELM_CMN_SYSTEM);
  group.add<TAV_TYPE_ASCII_STRING>(TAV_ELM_CMN_HOST_NAME, 5);
}
