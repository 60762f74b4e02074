// EXPECT: as<T>\(\) takes a sized integer, .*std::chrono::sys_time
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const std::vector<std::byte> bytes(100);
  const tav::Reader reader(bytes);
  const auto value = reader.root().as<const char*>();
}
