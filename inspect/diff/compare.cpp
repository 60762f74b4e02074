#include <algorithm>
#include <cstdlib>
#include <string>
#include <vector>

#include "inspect/diff/align.h"
#include "inspect/diff/index.h"
#include "tav/inspect/diff.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

constexpr size_t kMaxChildren = 200'000; ///< of one group that are compared at once
constexpr uint64_t kPiece = uint64_t{64} * 1024;

bool holds(const Tolerance& tolerance, uint64_t difference, uint64_t larger)
{
  const double limit = tolerance.percent ? static_cast<double>(larger) * tolerance.amount / 100 : tolerance.amount;
  return static_cast<double>(difference) <= limit;
}

DiffIndex indexOf(const DiffInput& input, const DiffOptions& options)
{
  return {input, options, [&](const Walker& walker, const Event& event) {
            if (options.seen)
            {
              options.seen(input.source, walker, event);
            }
          }};
}

class Comparer
{
public:
  Comparer(DiffIndex& a, DiffIndex& b, const DiffOptions& options, const std::function<void(const Difference&)>& found)
      : a_(a), b_(b), options_(options), tell_(found) {}

  /// Compares everything; true when there is a difference. `subtrees`: the first rows stand for each other.
  bool run(bool subtrees);

private:
  struct Level
  {
    uint64_t fromA; ///< children that were not aligned so far
    uint64_t endA;
    uint64_t fromB;
    uint64_t endB;
    Pairs pairs{};
    size_t at = 0;
  };

  static std::vector<Child> children(DiffIndex& index, uint64_t& from, uint64_t end);
  void fill(Level& level);
  void compare(uint64_t first, uint64_t second);
  bool samePayload(const Row& a, const Row& b);
  bool near(const Row& a, const Row& b);
  DiffSide side(DiffIndex& index, uint64_t number) const;
  void tellOne(DiffIndex& index, Change change, uint64_t number);
  void tell(Change change, uint64_t first, uint64_t second, std::string sentence);

  DiffIndex& a_;
  DiffIndex& b_;
  const DiffOptions& options_;
  const std::function<void(const Difference&)>& tell_;
  bool found_ = false;
  std::vector<Level> levels_{};
};

bool Comparer::run(bool subtrees)
{
  subtrees&& a_.rows() != 0 && b_.rows() != 0 ? compare(0, 0) : levels_.push_back({0, a_.rows(), 0, b_.rows()});
  while (!levels_.empty())
  {
    Level& level = levels_.back();
    if (level.at < level.pairs.size())
    {
      const auto [first, second] = level.pairs[level.at++];
      compare(first, second);
    }
    else if (level.fromA < level.endA || level.fromB < level.endB)
    {
      fill(level);
    }
    else
    {
      levels_.pop_back();
    }
  }
  return found_;
}

std::vector<Child> Comparer::children(DiffIndex& index, uint64_t& from, uint64_t end)
{
  std::vector<Child> list;
  while (from < end && list.size() < kMaxChildren)
  {
    const Row row = index.row(from);
    const uint32_t kind = row.elm | (row.isGroup() ? 0x10000u : row.isDamaged() ? 0x20000u
                                                                                : 0u);
    list.push_back({from, row.hash, row.key, kind});
    from = row.next;
  }
  return list;
}

void Comparer::fill(Level& level)
{
  level.at = 0;
  const std::vector<Child> first = children(a_, level.fromA, level.endA);
  const std::vector<Child> second = children(b_, level.fromB, level.endB);
  level.pairs = align(first, second);
}

void Comparer::compare(uint64_t first, uint64_t second)
{
  if (first == kNoRow || second == kNoRow)
  {
    const bool removed = second == kNoRow;
    tellOne(removed ? a_ : b_, removed ? Change::removed : Change::added, removed ? first : second);
    return;
  }
  const Row a = a_.row(first);
  const Row b = b_.row(second);
  if (a.info != b.info)
  {
    tell(Change::changed, first, second, "info  " + hexOffset(a.info) + " -> " + hexOffset(b.info));
  }
  if (a.isGroup() && b.isGroup())
  {
    // What was found below both is alike, and so is every byte of it: it need not be looked at node by node.
    if (a.hash == b.hash && a_.form() == b_.form() && samePayload(a, b))
    {
      return;
    }
    levels_.push_back({first + 1, a.next, second + 1, b.next});
    return;
  }
  if (a.type != b.type)
  {
    tell(Change::changed, first, second, a_.text(first) + " -> " + b_.text(second));
  }
  else if (!samePayload(a, b) && !near(a, b))
  {
    constexpr uint64_t most = 200;
    tell(Change::changed, first, second,
         DiffIndex::kindText(a) + "  " + a_.value(a, most) + " -> " + b_.value(b, most));
  }
}

bool Comparer::samePayload(const Row& a, const Row& b)
{
  if (a.size != b.size)
  {
    return false;
  }
  for (uint64_t at = 0; at < a.size; at += kPiece)
  {
    const std::span<const uint8_t> first = a_.piece(a, at, kPiece);
    const std::span<const uint8_t> second = b_.piece(b, at, kPiece);
    if (!std::equal(first.begin(), first.end(), second.begin(), second.end()))
    {
      return false;
    }
  }
  return true;
}

bool Comparer::near(const Row& a, const Row& b)
{
  const bool number = a.type >= TAV_TYPE_UINT8 && a.type <= TAV_TYPE_SINT64 && a.size == b.size &&
                      a.size == layout::typeInfo(a.type).valueSize;
  if (!number || options_.tolerance.amount == 0)
  {
    return false;
  }
  const std::string textA = a_.value(a, kPiece);
  const std::string textB = b_.value(b, kPiece);
  const auto magnitude = [](const std::string& text) {
    return std::strtoull(text.c_str() + (text.starts_with('-') ? 1 : 0), nullptr, 10);
  };
  const uint64_t sizeA = magnitude(textA);
  const uint64_t sizeB = magnitude(textB);
  const uint64_t larger = std::max(sizeA, sizeB);
  const bool sameSign = textA.starts_with('-') == textB.starts_with('-');
  // Of numbers with different signs the sum is at most 2^63 + 2^63 - 1.
  return holds(options_.tolerance, sameSign ? larger - std::min(sizeA, sizeB) : sizeA + sizeB, larger);
}

DiffSide Comparer::side(DiffIndex& index, uint64_t number) const
{
  const Row row = index.row(number);
  DiffSide side;
  side.path = index.path(number);
  side.offset = row.offset;
  side.type = row.isDamaged() ? "damaged" : typeText(row.type);
  side.info = row.info;
  if (!row.isGroup() && options_.mostValue != 0)
  {
    side.value = index.value(row, options_.mostValue);
  }
  return side;
}

/// Of a group the one line counts its nodes; where the contents are wanted, too, each of them has its own.
void Comparer::tellOne(DiffIndex& index, Change change, uint64_t number)
{
  const bool removed = change == Change::removed;
  const uint64_t end = options_.contents ? index.row(number).next : number + 1;
  for (; number < end; ++number)
  {
    tell(change, removed ? number : kNoRow, removed ? kNoRow : number, index.text(number));
  }
}

void Comparer::tell(Change change, uint64_t first, uint64_t second, std::string sentence)
{
  found_ = true;
  Difference difference{.change = change, .sentence = std::move(sentence)};
  if (first != kNoRow)
  {
    difference.before = side(a_, first);
  }
  if (second != kNoRow)
  {
    difference.after = side(b_, second);
  }
  tell_(difference);
}

} // namespace

bool diff(const DiffInput& a, const DiffInput& b, const DiffOptions& options,
          const std::function<void(const Difference&)>& found)
{
  DiffIndex indexA = indexOf(a, options);
  DiffIndex indexB = indexOf(b, options);
  return Comparer(indexA, indexB, options, found).run(a.path && b.path);
}

} // namespace tav::inspect
