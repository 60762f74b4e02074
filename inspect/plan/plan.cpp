#include "tav/inspect/plan.hpp"

#include <algorithm>

#include "inspect/plan/partChain.h"
#include "inspect/plan/planner.h"

namespace tav::inspect
{

namespace
{

constexpr uint64_t kShortest = uint64_t{1} << 20U; ///< of the parts that are made where nobody says how long they are
constexpr uint64_t kLongest = uint64_t{16} << 20U;
constexpr uint64_t kParts = 64;                  ///< that a file of a middling size is cut into
constexpr uint64_t kRing = uint64_t{256} * 1024; ///< a plan jumps: what was read is not needed any more

std::vector<Part> cut(ByteSource& source, const Form& form, const PlanOptions& options, bool everyForm)
{
  const uint64_t size = source.size();
  uint64_t target = options.targetBytes != 0 ? options.targetBytes : std::clamp(size / kParts, kShortest, kLongest);
  if (options.maxParts != 0)
  {
    target = std::max(target, size / options.maxParts + 1);
  }
  const auto window = source.window(0, kRing);
  return Planner(*window, form, everyForm, options.maxDepth).run(target);
}

constexpr uint64_t kWorthCutting = uint64_t{4} << 20U;

} // namespace

std::vector<Part> partsFor(ByteSource& source, const Form& form, unsigned threads, uint64_t partBytes)
{
  if (threads < 2 || (partBytes == 0 && source.size() < kWorthCutting))
  {
    return {};
  }
  std::vector<Part> parts = plan(source, form, {.targetBytes = partBytes});
  return parts.size() < 2 ? std::vector<Part>{} : parts;
}

namespace
{

Part atWholeGroup(Part part, const std::function<bool(const PartGroup&)>& isWhole)
{
  const auto group = std::find_if(part.around.begin(), part.around.end(), isWhole);
  if (group != part.around.end())
  {
    part.offset = group->offset;
    part.wide = group == part.around.begin() ? group->wide : part.wide;
    part.afterDamage = false;
    part.firstChild.reset();
    part.around.erase(group, part.around.end());
  }
  return part;
}

} // namespace

std::vector<Part> withWhole(const ByteSource& source, std::vector<Part> parts,
                            const std::function<bool(const PartGroup&)>& isWhole)
{
  std::vector<Part> whole;
  for (Part& planned : parts)
  {
    Part part = atWholeGroup(std::move(planned), isWhole);
    if (whole.empty() || part.offset > whole.back().offset)
    {
      whole.push_back(std::move(part));
    }
  }
  for (size_t i = 0; i < whole.size(); ++i)
  {
    whole[i].size = (i + 1 < whole.size() ? whole[i + 1].offset : source.size()) - whole[i].offset;
  }
  return whole.size() < 2 ? std::vector<Part>{} : whole;
}

bool standsAt(const Walker& walk, const Part& part)
{
  return walk.place() == part.offset && walk.depth() == part.around.size() &&
         isSeam(partAt(walk.state(), walk.form(), part.streamOffset), part);
}

std::vector<Part> plan(ByteSource& source, const PlanOptions& options)
{
  const Recognition found = recognise(source, options.form);
  PlanOptions own = options;
  own.targetBytes = found.isStream ? own.targetBytes : ~uint64_t{0};
  return cut(source, found.form, own, true);
}

std::vector<Part> plan(ByteSource& source, const Form& form, const PlanOptions& options)
{
  return cut(source, form, options, false);
}

} // namespace tav::inspect
