/* Records measurements, and reads them again: all of it in C99.
 *   record [FILE]     FILE is made anew, and stays
 */
#include <inttypes.h>
#include <stdio.h>
#include <string.h>

#include "tav/tav_c.h"

/* One snapshot: a root with the machine's name, its time, and a group for each processor. */
static uint32_t addSnapshot(tav_writer* writer, int64_t nanoseconds)
{
  uint32_t rc = tav_begin(writer, TAV_ELM_CMN_SYSTEM, TAV_INFO_EYE_SIZE);
  if (rc == TAV_RC_OK)
  {
    rc = tav_add_text(writer, TAV_ELM_CMN_HOST_NAME, "ada", strlen("ada"));
  }
  if (rc == TAV_RC_OK)
  {
    rc = tav_add_time(writer, 40001, nanoseconds);
  }
  for (uint32_t processor = 0; rc == TAV_RC_OK && processor < 4; ++processor)
  {
    rc = tav_begin(writer, TAV_ELM_CMN_CPU, 0);
    if (rc == TAV_RC_OK)
    {
      rc = tav_add_u64(writer, 40002, 1000U * processor);
    }
    if (rc == TAV_RC_OK)
    {
      rc = tav_end(writer);
    }
  }
  return rc == TAV_RC_OK ? tav_end(writer) : rc;
}

static int record(const char* path)
{
  tav_writer* writer = NULL;
  uint32_t rc = tav_create_file(path, NULL, TAV_CREATE_OVERWRITE, &writer);
  if (rc != TAV_RC_OK)
  {
    fprintf(stderr, "%s: %s\n", path, tav_message(rc));
    return 1;
  }
  for (int64_t i = 0; rc == TAV_RC_OK && i < 3; ++i)
  {
    rc = addSnapshot(writer, (1709202600 + i) * 1000000000);
  }
  if (rc == TAV_RC_OK)
  {
    rc = tav_finish(&writer, NULL, NULL); /* a file: there are no bytes to hand out */
  }
  if (rc != TAV_RC_OK)
  {
    fprintf(stderr, "%s: %s\n", path, tav_writer_message(writer));
    tav_discard(&writer);
  }
  return rc == TAV_RC_OK ? 0 : 1;
}

struct Sum
{
  tav_reader* reader;
  uint64_t total;
  unsigned count;
};

/* Is called with each node that is found; another answer than 0 would end the search. */
static int addUp(const tav_node* node, void* context)
{
  struct Sum* const sum = context;
  uint64_t value = 0;
  if (tav_get_u64(sum->reader, node, &value) != TAV_RC_OK)
  {
    return 1;
  }
  sum->total += value;
  ++sum->count;
  return 0;
}

static int readAgain(const char* path)
{
  tav_reader* reader = NULL;
  uint32_t rc = tav_open_file(path, NULL, &reader); /* whatever its form is */
  if (rc != TAV_RC_OK)
  {
    fprintf(stderr, "%s: %s\n", path, tav_message(rc));
    return 1;
  }
  unsigned roots = 0;
  tav_node root;
  for (rc = tav_next_root(reader, NULL, &root); rc == TAV_RC_OK; rc = tav_next_root(reader, &root, &root))
  {
    tav_node child;
    int64_t nanoseconds = 0;
    const char* name = NULL;
    size_t length = 0;
    if (tav_find(reader, &root, "hostName", &child) == TAV_RC_OK &&
        tav_get_text(reader, &child, &name, &length) == TAV_RC_OK)
    {
      printf("%.*s", (int)length, name);
    }
    if (tav_find(reader, &root, "#40001", &child) == TAV_RC_OK &&
        tav_get_time(reader, &child, &nanoseconds) == TAV_RC_OK)
    {
      printf(" at %" PRId64 " ns", nanoseconds);
    }
    unsigned children = 0;
    uint32_t step = tav_first_child(reader, &root, &child);
    for (; step == TAV_RC_OK; step = tav_next_sibling(reader, &child, &child))
    {
      ++children;
    }
    printf(": %u children\n", children);
    ++roots;
  }
  struct Sum sum = {reader, 0, 0};
  if (rc == TAV_RC_NO_MORE_CHILDREN)
  {
    rc = tav_find_each(reader, NULL, "/system/cpu/#40002", addUp, &sum);
  }
  if (rc != TAV_RC_OK)
  {
    fprintf(stderr, "%s\n", tav_last_message(reader));
  }
  printf("%u roots, %u processors, %" PRIu64 " in all\n", roots, sum.count, sum.total);
  tav_close(reader);
  return rc == TAV_RC_OK && roots == 3 && sum.count == 12 && sum.total == 18000 ? 0 : 1;
}

int main(int argc, char** argv)
{
  const char* const path = argc > 1 ? argv[1] : "record.tav";
  return record(path) != 0 || readAgain(path) != 0;
}
