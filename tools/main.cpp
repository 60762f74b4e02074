#include <cstdio>
#include <exception>

#include "tools/shell/options.h"
#include "tools/shell/report.h"

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
