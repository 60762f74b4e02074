// Paths that were read, each for as long as anybody has it.
#include "tav/path/path.hpp"

#include <memory>
#include <string_view>

#include "layer/countedPath.h"
#include "layer/pathParser.h"

namespace tav::detail::paths
{

const Compiled* readPath(const char* text, size_t length, const dictionary::OwnName* own, size_t owns,
                         const FaultTaker& taker)
{
  auto path = std::make_unique<Counted>();
  PathFault fault;
  Parser(std::string_view(text, length), dictionary::OwnNames(own, owns), *path, fault).parse();
  path->keepIds();
  if (fault.kind != PathFault::Kind::none)
  {
    taker.take(taker.fault, static_cast<uint32_t>(fault.kind), fault.column,
               {fault.sentence.data(), fault.sentence.size()}, {fault.nearest.data(), fault.nearest.size()});
  }
  return path.release();
}

void retainPath(const Compiled& path) noexcept
{
  countedOf(path).owners.fetch_add(1, std::memory_order_relaxed);
}

void releasePath(const Compiled& path) noexcept
{
  if (countedOf(path).owners.fetch_sub(1, std::memory_order_acq_rel) == 1)
  {
    delete &countedOf(path);
  }
}

bool leadsNowhere(const Compiled& path) noexcept
{
  return path.main.empty();
}

} // namespace tav::detail::paths
