// EXPECT: deleted
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const std::vector<std::byte> bytes(100);
  for (const tav::Node& node : tav::Reader(bytes).root().children())
  {
    static_cast<void>(node);
  }
}
