// EXPECT: \A[^\n]*needs C\+\+20
// STANDARD: c++17
#include "tav/tav.hpp"

int main()
{
  tav::Writer writer;
  writer.finish();
}
