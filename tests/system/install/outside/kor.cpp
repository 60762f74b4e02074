// The portability layer alone.
#include <tav/kor.h>

int main()
{
  void* block = nullptr;
  const bool ok = _korMemAlloc(&block, 0, 16, KOR_MEM_PLAIN, "kor.cpp", 0) == TAV_RC_OK && block != nullptr;
  return _korMemFree(&block, 0, 0, "kor.cpp", 0) == TAV_RC_OK && ok ? 0 : 1;
}
