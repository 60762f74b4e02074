// EXPECT: has no type in the stream
#include <string_view>
#include <vector>

#include "tav/tav.hpp"

int main()
{
  tav::Writer writer;
  writer.update(tav::HeaderView(), 1.5);
}
