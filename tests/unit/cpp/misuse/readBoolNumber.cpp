// EXPECT: (no matching|no match)
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const std::vector<std::byte> bytes(100);
  const tav::Reader reader(bytes);
  const auto value = reader.root().asNumber<bool>();
}
