// EXPECT: deleted
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Group group = tav::Writer().group(TAV_ELM_CMN_SYSTEM);
}
