// EXPECT: deleted
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Writer writer;
  tav::Group group = writer.group(TAV_ELM_CMN_SYSTEM).group(TAV_ELM_CMN_HOST);
}
