/// Stands for libFuzzer where it is not at hand: runs every file, and every file of every folder, that is named.
#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "fuzz/input.h"

namespace
{

namespace fs = std::filesystem;

std::vector<fs::path> filesOf(const fs::path& path)
{
  if (!fs::is_directory(path))
  {
    return {path};
  }
  std::vector<fs::path> files;
  for (const auto& entry : fs::directory_iterator(path))
  {
    if (entry.is_regular_file())
    {
      files.push_back(entry.path());
    }
  }
  std::sort(files.begin(), files.end());
  return files;
}

void runFile(const fs::path& path)
{
  std::ifstream file(path, std::ios::binary);
  if (!file)
  {
    throw std::runtime_error("cannot be read: " + path.string());
  }
  const std::vector<uint8_t> content{std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  // A block of exactly its size, so that a step behind its end is seen.
  const auto exact = std::make_unique<uint8_t[]>(content.size());
  std::copy(content.begin(), content.end(), exact.get());
  LLVMFuzzerTestOneInput(exact.get(), content.size());
}

} // namespace

int main(int argc, char** argv)
{
  LLVMFuzzerInitialize(&argc, &argv);
  size_t runs = 0;
  fs::path last;
  try
  {
    for (int i = 1; i < argc; ++i)
    {
      for (const fs::path& path : filesOf(argv[i]))
      {
        last = path;
        runFile(path);
        ++runs;
      }
    }
  }
  catch (const std::exception& error)
  {
    std::fprintf(stderr, "%s: %s\n", last.string().c_str(), error.what());
    return 1;
  }
  std::printf("%zu inputs\n", runs);
  return runs != 0 ? 0 : 1;
}
