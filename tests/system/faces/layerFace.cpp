/// What the C++ layer makes of a file, for comparison with the program.
///   layer_face tree FILE SEED        writes a random tree of few different elements
///   layer_face values FILE           writes a value of every kind that can be added
///   layer_face find FILE             offsets of what each path on standard input leads to, a line a path
///   layer_face print FILE            the stream as XML
///   layer_face overwrite FILE        overwrites a file for ever
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <iostream>
#include <random>
#include <string>
#include <vector>

#include "tav/tav.hpp"

namespace
{

using namespace std::chrono_literals;

constexpr uint16_t kElements[] = {TAV_ELM_CMN_HOST, TAV_ELM_CMN_OS, TAV_ELM_CMN_HOST_NAME, 40001};

class RandomTree
{
public:
  explicit RandomTree(unsigned seed)
      : random_(seed)
  {
  }

  void fill(tav::Group& group, unsigned depth)
  {
    for (unsigned left = 2 + number(5); left != 0; --left)
    {
      const bool pair = number(2) == 0;
      const uint16_t elm = kElements[number(std::size(kElements))];
      if (depth < 3 && number(2) == 0)
      {
        tav::Group inner = group.group(elm, {.eyeSize = pair});
        fill(inner, depth + 1);
      }
      else
      {
        group.add(elm, number(1000), {.eyeSize = pair});
      }
    }
  }

private:
  unsigned number(unsigned below)
  {
    return static_cast<unsigned>(random_() % below);
  }

  std::mt19937 random_;
};

int writeTree(const std::filesystem::path& path, unsigned seed)
{
  tav::Writer writer(path);
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = seed % 2 == 0});
    RandomTree(seed).fill(root, 0);
  }
  writer.finish();
  return 0;
}

int writeValues(const std::filesystem::path& path)
{
  const std::vector<std::byte> bytes{std::byte{0}, std::byte{'<'}, std::byte{0xFF}};
  const std::vector<uint64_t> words{1, 2, 3};
  tav::Writer writer(path);
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    const auto add = [&root](const auto& value) { root.add(TAV_ELM_CMN_HOST_NAME, value); };
    for (const char* const text : {"ada", "", "<&>\"'", "gr\xC3\xBC\xC3\x9F"
                                                        "e",
                                   "]]>", "\x1B[31m", "\r\n\t", "\xEF\xBF\xBE"})
    {
      add(text);
    }
    add(u8"\u20AC \U0001F600");
    add(tav::Utf8{"\xE4", 819});
    for (int number = -128; number < 128; ++number)
    {
      add(static_cast<int8_t>(number));
      add(static_cast<std::byte>(number));
    }
    add(uint8_t{255}), add(uint16_t{65535}), add(int16_t{-1}), add(uint32_t{7}), add(-7), add(~uint64_t{0}),
        add(INT64_MIN);
    add(tav::Uint128{1, 2}), add(tav::Sint128{-1, 2}), add(bytes), add(words);
    add(std::chrono::sys_seconds(1709164800s) + 123456us), add(TAVTimeStamp{1, 65535, 65535, 9, -720});
    root.addRaw(999, 40001, bytes);
    root.addRaw(TAV_TYPE_UINT32, 991, bytes);
    tav::Group host = root.group(TAV_ELM_CMN_HOST, {.children = tav::Width::bits32, .eyeSize = true});
    host.add(TAV_ELM_CMN_HOST_NAME, "<\"two\">\n");
    host.add(TAV_ELM_CMN_HOST_NAME, "keys");
  }
  writer.finish();
  return 0;
}

int find(const std::filesystem::path& path)
{
  const tav::Reader reader(path);
  for (std::string line; std::getline(std::cin, line);)
  {
    for (const tav::Node& node : reader.all(line))
    {
      std::printf("%llu ", static_cast<unsigned long long>(node.offset()));
    }
    std::printf("\n");
  }
  return 0;
}

int print(const std::filesystem::path& path)
{
  const tav::Reader reader(path);
  reader.print(stdout, tav::PrintOptions{.xml = true, .attributes = true});
  return 0;
}

int overwrite(const std::filesystem::path& path)
{
  for (uint64_t round = 0;; ++round)
  {
    tav::Writer writer(path, {.overwrite = true});
    {
      tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
      for (uint64_t i = 0; i < 1000; ++i)
      {
        root.add(TAV_ELM_CMN_CPU_ONLINE, round);
      }
    }
    writer.finish();
  }
}

} // namespace

int main(int argc, char** argv)
try
{
  const std::string what = argc > 2 ? argv[1] : "";
  const std::filesystem::path path = argc > 2 ? argv[2] : "";
  return what == "tree" && argc > 3 ? writeTree(path, static_cast<unsigned>(std::atoi(argv[3])))
         : what == "values"         ? writeValues(path)
         : what == "find"           ? find(path)
         : what == "print"          ? print(path)
         : what == "overwrite"      ? overwrite(path)
                                    : 2;
}
catch (const std::exception& error)
{
  std::fprintf(stderr, "%s\n", error.what());
  return 1;
}
