/// A writer that goes on in a file of arbitrary bytes: it refuses and leaves the file as it was, or what it adds is
/// there afterwards, behind what was there before.
#include <algorithm>
#include <filesystem>
#include <fstream>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "fuzz/input.h"
#include "tav/tav.hpp"

namespace
{

using fuzz::demand;
using test::Bytes;

constexpr uint16_t kAdded = TAV_ELM_CMN_CPU_ONLINE;
constexpr uint16_t kRoot = TAV_ELM_CMN_SYSTEM;

/// A file that is there as long as the program.
class File
{
public:
  File()
      : path_(std::filesystem::temp_directory_path() / ("tav-append-" + std::to_string(std::random_device()())))
  {
  }
  ~File()
  {
    std::error_code ignored;
    std::filesystem::remove(path_, ignored);
  }
  File(const File&) = delete;
  File& operator=(const File&) = delete;

  [[nodiscard]] const std::filesystem::path& path() const { return path_; }

  void store(std::span<const uint8_t> bytes) const
  {
    std::ofstream out(path_, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    demand(!out.flush().fail(), "the file cannot be written");
  }
  [[nodiscard]] Bytes content() const
  {
    Bytes bytes(std::filesystem::file_size(path_));
    std::ifstream in(path_, std::ios::binary);
    in.read(reinterpret_cast<char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    return bytes;
  }

private:
  std::filesystem::path path_;
};

/// What is done with the bytes.
struct Plan
{
  tav::StreamOptions options{};
  tav::OpenRoot openRoot = tav::OpenRoot::close;
  bool isFormGiven = false;
  unsigned added = 0;
};

Plan takePlan(fuzz::Input& input)
{
  constexpr tav::OpenRoot openRoots[] = {tav::OpenRoot::close, tav::OpenRoot::resume, tav::OpenRoot::refuse};
  const uint8_t flags = input.byte();
  const uint8_t more = input.byte();
  Plan plan;
  plan.options.byteOrder = (flags & 1U) != 0 ? tav::ByteOrder::swapped : tav::ByteOrder::native;
  plan.options.align8 = (flags & 2U) != 0;
  plan.options.root = (flags & 4U) != 0 ? tav::Width::bits32 : tav::Width::bits64;
  plan.options.ringBytes = uint64_t{2} << 20U;
  plan.isFormGiven = (flags & 8U) == 0;
  plan.openRoot = openRoots[more % 3];
  plan.added = more / 3 % 8;
  return plan;
}

void fill(tav::Group& group, unsigned count)
{
  for (unsigned i = 0; i < count; ++i)
  {
    group.add(kAdded, i);
  }
  group.close();
}

struct Root
{
  uint64_t offset = 0;
  std::vector<uint32_t> numbers{}; ///< that were added to it

  bool operator==(const Root&) const = default;
};

std::vector<Root> rootsOf(const Bytes& bytes, const tav::StreamOptions& options)
{
  std::vector<Root> roots;
  std::error_code ec;
  const tav::Reader reader(std::as_bytes(std::span(bytes)), options, ec);
  for (const tav::Node& node : reader.roots(ec))
  {
    Root& root = roots.emplace_back(Root{node.offset()});
    std::error_code damaged;
    for (const tav::Node& child : node.children(damaged))
    {
      std::error_code other;
      const auto number = child.as<uint32_t>(other);
      if (child.elm() == kAdded && !other)
      {
        root.numbers.push_back(number);
      }
    }
  }
  return roots;
}

bool beginsAlike(const Bytes& one, const Bytes& other, uint64_t length)
{
  const auto count = static_cast<ptrdiff_t>(std::min({length, uint64_t{one.size()}, uint64_t{other.size()}}));
  return std::equal(one.begin(), one.begin() + count, other.begin());
}

/// What was there is there still, and the root that was added is the last one.
void compare(const Bytes& before, const Bytes& after, const Plan& plan, uint64_t start)
{
  const std::vector<Root> old = rootsOf(before, plan.options);
  const std::vector<Root> now = rootsOf(after, plan.options);
  Root added{start};
  for (unsigned i = 0; i < plan.added; ++i) added.numbers.push_back(i);
  demand(!now.empty() && now.back() == added, "what was added is not there");
  for (size_t i = 0; i < old.size() && old[i].offset < start; ++i)
  {
    demand(i < now.size() && now[i].offset == old[i].offset, "a root has gone");
  }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  static const File file;
  fuzz::Input input(data, size);
  const Plan plan = takePlan(input);
  const Bytes before = input.copyOfRest();
  file.store(before);
  const tav::FileOptions options{.append = true, .openRoot = plan.openRoot};
  std::error_code ec;
  tav::Writer writer = plan.isFormGiven ? tav::Writer(file.path(), options, plan.options, ec)
                                        : tav::Writer(file.path(), options, ec);
  if (ec)
  {
    demand(file.content() == before, "a refusal has changed the file");
    return 0;
  }
  if (tav::Group resumed = writer.resumed(); resumed.isOpen())
  {
    fill(resumed, 1);
  }
  const uint64_t found = writer.size();
  tav::Group root = writer.group(kRoot);
  fill(root, plan.added);
  writer.finish();
  const Bytes after = file.content();
  demand(plan.openRoot != tav::OpenRoot::refuse || beginsAlike(before, after, found), "what was there has changed");
  if (plan.isFormGiven)
  {
    compare(before, after, plan, found);
  }
  return 0;
}
