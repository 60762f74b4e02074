/// With TAV_TRACE_SEEN=<file>, a test program writes down which records its tests left: a line each of probe, kind,
/// point and the number of items. tests/system/docs/trace_test.py holds docs/trace.md against them.
#include <array>
#include <atomic>
#include <cstdlib>
#include <fstream>
#include <gtest/gtest.h>

#include "support/traceLog.h"

namespace
{

/// The records seen, each once, in a table that needs no memory: tests count allocations and let them fail.
constinit std::array<std::atomic<uint64_t>, 1U << 14U> seen{};

constexpr uint64_t keyOf(const KORTraceRecord& record)
{
  const uint64_t place = uint64_t{record.probe} << 32U | uint64_t{record.point} << 12U;
  return place | uint64_t{record.kind} << 28U | record.itemCount;
}

void note(void* /*context*/, const KORTraceRecord* record)
{
  const uint64_t key = keyOf(*record);
  for (uint64_t at = key * 0x9E3779B97F4A7C15U >> 50U;; at = (at + 1) % seen.size())
  {
    uint64_t there = 0;
    if (seen[at].compare_exchange_strong(there, key) || there == key)
    {
      return;
    }
  }
}

class Witness : public testing::Environment
{
public:
  void SetUp() override
  {
    if (file_ != nullptr)
    {
      test::traceAllTo(note);
    }
  }
  void TearDown() override
  {
    if (file_ == nullptr)
    {
      return;
    }
    test::traceAllTo(nullptr);
    std::ofstream out(file_);
    for (const std::atomic<uint64_t>& one : seen)
    {
      const uint64_t key = one.load();
      if (key == 0)
      {
        continue;
      }
      out << (key >> 32U) << ' ' << (key >> 28U & 0xFU) << ' ' << (key >> 12U & 0xFFFFU) << ' ';
      out << (key & 0xFFFU) << '\n';
    }
  }

private:
  const char* file_ = std::getenv("TAV_TRACE_SEEN");
};

const testing::Environment* const witness = testing::AddGlobalTestEnvironment(new Witness);

} // namespace
