// Parts of a file: where their walks begin, how they are told apart, and as numbers.
#include <algorithm>
#include <utility>

#include "inspect/plan/partState.h"
#include "inspect/walk/prober.h"
#include "tav/inspect/plan.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

namespace
{

constexpr uint32_t kOpenFlags = kOpen | kOverrun;

[[noreturn]] void failAsNoPart(const std::string& file, uint64_t offset)
{
  throw Error(Problem{.file = file,
                      .offset = offset,
                      .sentence = "no part of this file begins here",
                      .code = TAV_RC_BAD_PARAM});
}

bool isSameGroup(const PartGroup& a, const PartGroup& b)
{
  return a.offset == b.offset && a.end == b.end && a.flags == b.flags && a.wide == b.wide;
}

/// Bits of the third number of a part.
enum PartBit : uint64_t
{
  kPartSwapped = 0x1,
  kPartRoot64 = 0x2,
  kPartAligned = 0x4,
  kPartExtra = 0x8,
  kPartWide = 0x10,
  kPartGuessed = 0x20,
  kPartAfterDamage = 0x40,
  kPartFirstChild = 0x80,
  kPartBits = 0xFF
};

constexpr size_t kPartNumbers = 5;  ///< of a part without groups
constexpr size_t kGroupNumbers = 3; ///< of a group around it
constexpr uint64_t kGroupWide = uint64_t{1} << 32U;
constexpr uint64_t kGroupDamaged = uint64_t{1} << 33U;

} // namespace

Part wholeOf(const ByteSource& source, const Form& form)
{
  Part part;
  part.size = source.size();
  part.form = form;
  part.wide = form.root64;
  return part;
}

Walker::State stateOf(ByteSource& source, const Part& part)
{
  const uint64_t size = source.size();
  Walker::State state;
  state.position = part.offset;
  state.afterDamage = part.afterDamage;
  auto& file = state.frames.emplace_back();
  file.limit = size;
  file.open = true;
  file.wide = part.wide;
  if (part.offset > size || part.size > size - part.offset || part.streamOffset > part.offset)
  {
    failAsNoPart(source.name(), part.offset);
  }
  const Prober prober(source, part.form, 0);
  uint64_t from = part.streamOffset;
  for (const PartGroup& group : part.around)
  {
    const auto around = state.frames.back();
    auto& frame = state.frames.emplace_back();
    Node& node = frame.node;
    const bool fits = group.offset >= from && group.end <= around.limit && group.end >= part.offset &&
                      (group.wide == around.wide || state.frames.size() == 2) &&
                      prober.header(group.offset, group.wide, around.limit, node.header) && node.isGroup() &&
                      node.payloadOffset() <= part.offset;
    if (!fits)
    {
      failAsNoPart(source.name(), part.offset);
    }
    from = node.payloadOffset();
    node.depth = state.frames.size() - 2;
    node.parentOffset = state.frames.size() > 2 ? around.node.offset() : kNoOffset;
    node.limit = group.end;
    node.flags = group.flags;
    frame.limit = group.end;
    frame.lastDamage = group.damaged ? from : 0;
    frame.wide = layout::hasChildren64(node.header);
    frame.open = (group.flags & kOpenFlags) != 0;
  }
  return state;
}

Part partAt(const Walker::State& state, const Form& form, uint64_t streamOffset)
{
  Part part;
  part.offset = state.position;
  part.form = form;
  part.streamOffset = streamOffset;
  part.wide = state.frames.front().wide;
  part.afterDamage = state.afterDamage;
  for (size_t i = 1; i < state.frames.size(); ++i)
  {
    const auto& frame = state.frames[i];
    part.around.push_back({.offset = frame.node.offset(),
                           .end = frame.limit,
                           .flags = frame.node.flags,
                           .wide = frame.node.is64(),
                           .damaged = frame.lastDamage != 0});
  }
  return part;
}

bool isSeam(const Part& behind, const Part& next)
{
  return behind.offset == next.offset && behind.form == next.form && behind.streamOffset == next.streamOffset &&
         behind.wide == next.wide && behind.afterDamage == next.afterDamage &&
         std::equal(behind.around.begin(), behind.around.end(), next.around.begin(), next.around.end(), isSameGroup);
}

Part behindOf(const Part& part, const PartEnd& end)
{
  // What the walk through a part does not know is what was lost before it.
  const std::vector<PartGroup>& before = part.around;
  Part behind = end.behind;
  for (size_t k = 0; k < end.shared && k < before.size() && k < behind.around.size(); ++k)
  {
    behind.around[k].damaged = behind.around[k].damaged || before[k].damaged;
  }
  return behind;
}

bool holdsBehind(const Part& behind, const Part& part, const PartEnd& end)
{
  return isSeam(behind, part) && (!end.leans || behind.around == part.around);
}

std::optional<size_t> mendParts(std::span<Part> parts, std::span<const PartEnd> ends)
{
  Part behind;
  for (size_t i = 0; i < parts.size() && i < ends.size(); ++i)
  {
    Part& part = parts[i];
    if (i != 0 && !holdsBehind(behind, part, ends[i]))
    {
      behind.size = part.end() - std::min(part.end(), behind.offset);
      part = std::move(behind);
      return i;
    }
    behind = behindOf(i == 0 ? part : behind, ends[i]);
  }
  return std::nullopt;
}

std::vector<uint64_t> numbersOf(const Part& part)
{
  const Form& form = part.form;
  uint64_t bits = 0;
  const auto put = [&bits](bool is, PartBit bit) { bits |= is ? uint64_t{bit} : 0; };
  put(form.swapped, kPartSwapped);
  put(form.root64, kPartRoot64);
  put(form.aligned, kPartAligned);
  put(form.extra, kPartExtra);
  put(part.wide, kPartWide);
  put(part.guessed, kPartGuessed);
  put(part.afterDamage, kPartAfterDamage);
  put(part.firstChild.has_value(), kPartFirstChild);
  std::vector<uint64_t> numbers{part.offset, part.size, bits, part.streamOffset, part.firstChild.value_or(0)};
  for (const PartGroup& group : part.around)
  {
    numbers.push_back(group.offset);
    numbers.push_back(group.end);
    numbers.push_back(group.flags | (group.wide ? kGroupWide : 0U) | (group.damaged ? kGroupDamaged : 0U));
  }
  return numbers;
}

Part partOf(std::span<const uint64_t> numbers)
{
  if (numbers.size() < kPartNumbers || (numbers.size() - kPartNumbers) % kGroupNumbers != 0 ||
      numbers[2] > kPartBits || numbers[1] > ~uint64_t{0} - numbers[0])
  {
    throw Error(Problem{.sentence = "the numbers are no part of a file", .code = TAV_RC_BAD_PARAM});
  }
  const uint64_t bits = numbers[2];
  const auto has = [bits](PartBit bit) { return (bits & bit) != 0; };
  Part part;
  part.offset = numbers[0];
  part.size = numbers[1];
  part.form = {.swapped = has(kPartSwapped),
               .root64 = has(kPartRoot64),
               .aligned = has(kPartAligned),
               .extra = has(kPartExtra)};
  part.streamOffset = numbers[3];
  part.wide = has(kPartWide);
  part.guessed = has(kPartGuessed);
  part.afterDamage = has(kPartAfterDamage);
  part.firstChild = has(kPartFirstChild) ? std::optional(numbers[4]) : std::nullopt;
  for (size_t at = kPartNumbers; at < numbers.size(); at += kGroupNumbers)
  {
    const uint64_t flags = numbers[at + 2];
    part.around.push_back({.offset = numbers[at],
                           .end = numbers[at + 1],
                           .flags = static_cast<uint32_t>(flags),
                           .wide = (flags & kGroupWide) != 0,
                           .damaged = (flags & kGroupDamaged) != 0});
  }
  return part;
}

} // namespace tav::inspect
