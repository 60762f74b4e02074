// EXPECT: deleted
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const std::vector<std::byte> bytes(100);
  const tav::Reader reader(bytes);
  const auto payload = reader.root().copy().payload();
}
