#include <cstdio>
#include <exception>

#include "tools/options.h"
#include "tools/report.h"

int main(int argc, char** argv)
{
  try
  {
    return tav::tool::runProgram(argc, argv);
  }
  catch (const std::exception& error)
  {
    tav::tool::report(error.what());
    return tav::tool::kTrouble;
  }
}
