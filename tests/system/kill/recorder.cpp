/// Appends numbered nodes to a file through the C++ layer, for as long as it lives, and says what it was promised.
///   kill_recorder FILE FIRST SEED RING
/// A line "flushed N" or "synced N" on standard output: the nodes below N are with the system.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>

#include "tav/tav.hpp"

namespace
{

class Random
{
public:
  explicit Random(uint64_t seed)
      : state_(seed) {}
  uint64_t below(uint64_t limit)
  {
    state_ = state_ * 6364136223846793005U + 1442695040888963407U;
    return (state_ >> 33U) % limit;
  }

private:
  uint64_t state_;
};

class Recording
{
public:
  Recording(tav::Writer& writer, uint64_t first, uint64_t seed)
      : writer_(writer), next_(first), random_(seed) {}

  void add(tav::Group& group, int depth)
  {
    for (uint64_t left = 1 + random_.below(40); left != 0; --left)
    {
      const bool pairs = random_.below(2) == 0;
      if (depth < 3 && random_.below(8) == 0)
      {
        tav::Group inner = group.group(TAV_ELM_CMN_HOST, {.eyeSize = pairs});
        add(inner, depth + 1);
        inner.close();
      }
      else
      {
        group.add(TAV_ELM_CMN_CPU_ONLINE, next_++, {.eyeSize = pairs});
        group.add(TAV_ELM_CMN_HOST_NAME, std::string(random_.below(300), 'x'));
      }
      promise();
    }
  }

private:
  void promise()
  {
    const uint64_t what = random_.below(40);
    if (what > 1)
    {
      return;
    }
    what == 0 ? writer_.flush() : writer_.sync();
    std::printf("%s %llu\n", what == 0 ? "flushed" : "synced", static_cast<unsigned long long>(next_));
    std::fflush(stdout);
  }

  tav::Writer& writer_;
  uint64_t next_;
  Random random_;
};

} // namespace

int main(int argc, char** argv)
{
  if (argc != 5)
  {
    return 2;
  }
  const auto number = [&](int at) { return std::strtoull(argv[at], nullptr, 0); };
  try
  {
    const tav::OpenRoot openRoot = number(3) % 2 == 0 ? tav::OpenRoot::close : tav::OpenRoot::resume;
    tav::Writer writer(argv[1], {.append = true, .openRoot = openRoot}, {.ringBytes = number(4)});
    Recording recording(writer, number(2), number(3));
    {
      tav::Group left = writer.resumed();
      if (left.isOpen())
      {
        recording.add(left, 0);
      }
    }
    while (true)
    {
      tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = number(3) % 3 != 0});
      recording.add(root, 0);
      root.close();
    }
  }
  catch (const std::exception& error)
  {
    std::fprintf(stderr, "%s\n", error.what());
    return 1;
  }
}
