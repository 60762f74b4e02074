// EXPECT: deleted
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const tav::Reader reader(tav::Writer().bytes());
}
