// EXPECT: (deleted|use of deleted|call to (implicitly-)?deleted)
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Writer writer;
  tav::Group group = writer.group(TAV_ELM_CMN_SYSTEM);
  const tav::Group copy = group;
}
