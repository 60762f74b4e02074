/// Paths of any characters over one small stream: each is told to be none, with a place in it, or leads the inspection
/// library and the layer to the same nodes, in the order of the stream, each once.
#include <algorithm>
#include <span>
#include <string>
#include <vector>

#include "fuzz/input.h"
#include "support/pathRows.h"
#include "tav/inspect.hpp"
#include "tav/tav.hpp"

namespace
{

using fuzz::demand;

/// The stream in one form, and its readers.
class Subject
{
public:
  explicit Subject(bool swap)
      : options_{.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native, .align8 = swap},
        bytes_(test::pathStream(options_)),
        source_("x", std::span(reinterpret_cast<const uint8_t*>(bytes_.data()), bytes_.size())),
        form_{.swapped = swap, .aligned = swap}, reader_(std::span<const std::byte>(bytes_), options_)
  {
  }

  void look(const tav::Path& path)
  {
    std::vector<uint64_t> inspected;
    tav::inspect::PathSearch search(source_, form_, path);
    for (tav::inspect::Event event; search.next(event);) inspected.push_back(event.offset);
    std::vector<uint64_t> read;
    for (const tav::Node& node : reader_.find(path)) read.push_back(node.offset());
    demand(inspected == read, "the library and the layer find others");
    demand(std::is_sorted(read.begin(), read.end(), std::less_equal()), "not in order, or twice");
    const auto first = reader_.path(path);
    demand(first.has_value() == !read.empty() && (!first || first->offset() == read.front()), "another first");
    static_cast<void>(reader_.root().all(path));
    static_cast<void>(reader_.path("/system/host[2]/cpu")->all(path));
  }

private:
  tav::StreamOptions options_;
  std::vector<std::byte> bytes_;
  tav::inspect::ByteSource source_;
  tav::inspect::Form form_;
  tav::Reader reader_;
};

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  fuzz::Input input(data, size);
  const bool swap = (input.byte() & 1U) != 0;
  const auto rest = input.rest();
  const std::string text(rest.begin(), rest.end());
  tav::PathFault fault;
  const tav::Path path(text, fault);
  if (path.empty())
  {
    demand(fault.kind != tav::PathFault::Kind::none, "no path, and nobody says why");
    demand(fault.column >= 1 && fault.column <= text.size() + 1, "a column that is not in the path");
    demand(!fault.sentence.empty() && fault.sentence.size() < 500, "no sentence");
    return 0;
  }
  Subject(swap).look(path);
  return 0;
}
