// EXPECT: (discards|no matching|not viable|passing|ref-qualifier)
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const std::vector<std::byte> bytes(100);
  const tav::Reader reader(bytes);
  const auto first = reader.root().children().begin();
}
