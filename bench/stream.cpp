/// The workload as a file, for the program.
///   tav_stream FILE HOSTS      HOSTS: how often the stream holds the workload's host
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <vector>

#include "bench/floor.hpp"

int main(int argc, char** argv)
{
  const size_t hosts = argc == 3 ? std::strtoull(argv[2], nullptr, 10) : 0;
  if (hosts == 0)
  {
    std::fprintf(stderr, "usage: tav_stream FILE HOSTS\n");
    return 2;
  }
  std::vector<char> bytes(snapshot::streamBytes(hosts));
  std::ofstream file(argv[1], std::ios::binary);
  file.write(bytes.data(), static_cast<std::streamsize>(floor0::encode(snapshot::model(), bytes.data(), hosts)));
  file.close();
  return file ? 0 : 1;
}
