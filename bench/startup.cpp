/// What a short program pays for the library. TAV_STARTUP_OPENS: it opens a handle and closes it; else it is there to
/// be compared with.
#if defined(TAV_STARTUP_OPENS)
#include "tav/tav.h"

int main()
{
  uint8_t block[64] = {};
  TAVSSMemory storage(block, sizeof block);
  TAVInitParam param(&storage, TAV_OPT_READ);
  TAVHandle* handle = nullptr;
  return tavInitHandle(&handle, &param) == TAV_RC_OK && tavTermHandle(&handle) == TAV_RC_OK ? 0 : 1;
}
#else
int main() {}
#endif
