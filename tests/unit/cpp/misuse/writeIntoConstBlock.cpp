// EXPECT: (no matching|no match)
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const std::vector<std::byte> block(100);
  tav::Writer writer(block);
}
