/* From C, with the installed headers alone. */
#include "tav/tav_c.h"

int main(void)
{
  tav_writer* writer = 0;
  tav_reader* reader = 0;
  tav_node root;
  const void* bytes = 0;
  size_t size = 0;
  const int fine = tav_create_memory(0, &writer) == TAV_RC_OK && tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0) == TAV_RC_OK &&
                   tav_add_u32(writer, TAV_ELM_CMN_CPU_ONLINE, 8) == TAV_RC_OK && tav_end(writer) == TAV_RC_OK &&
                   tav_finish(&writer, &bytes, &size) == TAV_RC_OK &&
                   tav_open_memory(bytes, size, 0, &reader) == TAV_RC_OK &&
                   tav_next_root(reader, 0, &root) == TAV_RC_OK && root.elm == TAV_ELM_CMN_SYSTEM;
  tav_close(reader);
  tav_free(bytes);
  return fine ? 0 : 1;
}
