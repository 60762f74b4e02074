#include <gtest/gtest.h>

#include "fuzz/input.h"

/// The checks of the tests' own helpers end the program here, as a finding has to.
extern "C" int LLVMFuzzerInitialize(int*, char***)
{
  GTEST_FLAG_SET(throw_on_failure, true);
  return 0;
}
