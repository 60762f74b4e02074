// Loads a library as a program does that was not built against it, finds every operation by its plain name, and lets
// threads come and go, which the module entry has no part in.
//   tav_load LIBRARY LIST
#include <cstdio>
#include <fstream>
#include <string>
#include <thread>

#include "kor/windows.h"

int main(int argc, char** argv)
{
  if (argc != 3)
  {
    return 2;
  }
  const HMODULE library = LoadLibraryA(argv[1]);
  if (library == nullptr)
  {
    std::printf("%s cannot be loaded: error %lu\n", argv[1], GetLastError());
    return 1;
  }
  int found = 0;
  int missing = 0;
  std::ifstream list(argv[2]);
  for (std::string name; std::getline(list, name);)
  {
    if (name.find_first_of(":( ") != std::string::npos)
    {
      continue; // of a class
    }
    const bool here = GetProcAddress(library, name.c_str()) != nullptr;
    ++(here ? found : missing);
    if (!here)
    {
      std::printf("%s is not found\n", name.c_str());
    }
  }
  std::thread([] {}).join();
  const bool freed = FreeLibrary(library) != 0 && GetModuleHandleA(argv[1]) == nullptr;
  std::printf("%d names found, %d missing, the library is %s\n", found, missing, freed ? "gone" : "still there");
  return found != 0 && missing == 0 && freed ? 0 : 1;
}
