#include "bench/workload.hpp"

namespace snapshot
{
namespace
{

struct SplitMix64
{
  uint64_t state;
  uint64_t operator()()
  {
    uint64_t z = (state += 0x9E3779B97F4A7C15u);
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9u;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBu;
    return z ^ (z >> 31);
  }
};

constexpr char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789_.";

Model makeModel()
{
  Model m;
  SplitMix64 rng{0x5EED};
  m.leaves.reserve(kLeaves);
  for (unsigned k = 0; k < kDatabases; ++k)
  {
    for (unsigned j = 0; j < kApplications; ++j)
    {
      for (unsigned i = 0; i < kMetrics; ++i)
      {
        Leaf leaf{};
        leaf.id = static_cast<uint16_t>(kMetricId + i);
        leaf.type = kSchema[i];
        const uint64_t r = rng();
        switch (leaf.type)
        {
        case 'u': // all magnitudes equally likely
          leaf.value = (rng() >> 32) >> (r % 32);
          leaf.size = 4;
          break;
        case 'U':
          leaf.value = rng() >> (r % 64);
          leaf.size = 8;
          break;
        case 't':
        { // seconds, then microseconds and a zone in 16-bit parts
          leaf.value = m.pool.size();
          leaf.size = 16;
          const uint64_t seconds = 1600000000 + (r & 0x0FFFFFFF);
          const uint64_t parts = rng();
          m.pool.append(reinterpret_cast<const char*>(&seconds), 8);
          m.pool.append(reinterpret_cast<const char*>(&parts), 8);
          break;
        }
        default:
          leaf.value = m.pool.size();
          leaf.size = static_cast<uint32_t>(8 + r % 33);
          for (uint32_t c = 0; c < leaf.size; ++c)
          {
            m.pool += kAlphabet[rng() & 63];
          }
        }
        m.leaves.push_back(leaf);
        m.payloadBytes += leaf.size;
      }
    }
  }
  for (const Leaf& leaf : m.leaves)
  {
    m.checksum += sumLeaf(m, leaf);
  }
  return m;
}

std::vector<std::string> makeNames(bool digitsOnly)
{
  std::vector<std::string> all(kIdLimit);
  for (unsigned id = kMetricId; id < kIdLimit; ++id)
  {
    static constexpr const char* kind[] = {"", "metric_", "application_", "database_", "host_", "snapshot_"};
    all[id] = (digitsOnly ? "" : kind[id / 1000]) + std::to_string(id);
  }
  return all;
}

} // namespace

const Model& model()
{
  static const Model m = makeModel();
  return m;
}

const std::vector<std::string> names = makeNames(false);
const std::vector<std::string> digits = makeNames(true);

const std::vector<Path>& randomPaths()
{
  static const std::vector<Path> paths = [] {
    std::vector<Path> p(4096);
    SplitMix64 rng{0xFA7E};
    for (Path& path : p)
    {
      path.k = static_cast<uint16_t>(rng() % kDatabases);
      path.j = static_cast<uint16_t>(rng() % kApplications);
      path.m = static_cast<uint16_t>(rng() % kMetrics);
    }
    return p;
  }();
  return paths;
}

std::FILE* devNull()
{
  static std::FILE* f = std::fopen("/dev/null", "w");
  return f;
}

} // namespace snapshot
