// EXPECT: deleted
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  const tav::Writer writer;
  const tav::Writer copy = writer;
}
