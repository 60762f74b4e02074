#include "kor/windows.h"

// The entry point of a dynamically loaded library of this project. It wants no calls for threads that come and go.
extern "C" BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID /*reserved*/)
{
  if (reason == DLL_PROCESS_ATTACH)
  {
    DisableThreadLibraryCalls(instance);
  }
  return TRUE;
}
