// EXPECT: deleted
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const tav::Reader reader(std::vector<std::byte>(100));
}
