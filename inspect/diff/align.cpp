#include "inspect/diff/align.h"

#include <algorithm>
#include <map>
#include <unordered_map>

namespace tav::inspect
{

namespace
{

constexpr size_t kMaxTable = size_t{4} * 1024 * 1024; ///< cells of the table of longest common parts

using Places = std::vector<size_t>; ///< in the list of children

class Aligner
{
public:
  Aligner(const std::vector<Child>& first, const std::vector<Child>& second)
      : first_(first), second_(second), partner_(first.size(), second.size()), taken_(second.size(), false)
  {
  }

  Pairs run()
  {
    std::map<uint32_t, std::pair<Places, Places>> kinds;
    for (size_t i = 0; i < first_.size(); ++i)
    {
      kinds[first_[i].kind].first.push_back(i);
    }
    for (size_t i = 0; i < second_.size(); ++i)
    {
      kinds[second_[i].kind].second.push_back(i);
    }
    for (auto& [kind, places] : kinds)
    {
      alignKind(places.first, places.second);
    }
    Pairs pairs;
    for (size_t i = 0; i < first_.size(); ++i)
    {
      pairs.emplace_back(first_[i].row, partner_[i] < second_.size() ? second_[partner_[i]].row : kNoRow);
    }
    for (size_t i = 0; i < second_.size(); ++i)
    {
      if (!taken_[i])
      {
        pairs.emplace_back(kNoRow, second_[i].row);
      }
    }
    return pairs;
  }

private:
  void match(size_t a, size_t b)
  {
    partner_[a] = b;
    taken_[b] = true;
  }

  void alignKind(Places& a, Places& b)
  {
    if (a.size() == 1 && b.size() == 1)
    {
      match(a[0], b[0]);
      return;
    }
    alignByKey(a, b);
    // What has a key is nothing else than what has the same.
    std::erase_if(a, [&](size_t place) { return first_[place].key != 0; });
    std::erase_if(b, [&](size_t place) { return second_[place].key != 0; });
    alignByOrder(a, b);
  }

  void alignByKey(const Places& a, const Places& b)
  {
    std::unordered_map<uint64_t, Places> byKey;
    std::for_each(b.rbegin(), b.rend(), [&](size_t place) {
      if (second_[place].key != 0)
      {
        byKey[second_[place].key].push_back(place);
      }
    });
    for (const size_t place : a)
    {
      const auto found = byKey.find(first_[place].key);
      if (first_[place].key != 0 && found != byKey.end() && !found->second.empty())
      {
        match(place, found->second.back());
        found->second.pop_back();
      }
    }
  }

  bool equal(size_t a, size_t b) const { return first_[a].hash == second_[b].hash; }

  void alignByOrder(const Places& a, const Places& b)
  {
    size_t start = 0;
    while (start < std::min(a.size(), b.size()) && equal(a[start], b[start]))
    {
      match(a[start], b[start]);
      ++start;
    }
    size_t endA = a.size();
    size_t endB = b.size();
    while (endA > start && endB > start && equal(a[endA - 1], b[endB - 1]))
    {
      match(a[--endA], b[--endB]);
    }
    const size_t rows = endA - start;
    const size_t columns = endB - start;
    if (rows == 0 || columns == 0)
    {
      return;
    }
    if (rows >= kMaxTable / (columns + 1))
    {
      pairUp(a, start, endA, b, start, endB); // too many to look for the longest common part
      return;
    }
    alignByTable(a, b, start, endA, endB);
  }

  void alignByTable(const Places& a, const Places& b, size_t start, size_t endA, size_t endB)
  {
    const size_t rows = endA - start;
    const size_t columns = endB - start;
    std::vector<uint32_t> table((rows + 1) * (columns + 1), 0);
    const auto cell = [&](size_t i, size_t j) -> uint32_t& { return table[i * (columns + 1) + j]; };
    for (size_t i = rows; i-- > 0;)
    {
      for (size_t j = columns; j-- > 0;)
      {
        cell(i, j) =
            equal(a[start + i], b[start + j]) ? cell(i + 1, j + 1) + 1 : std::max(cell(i + 1, j), cell(i, j + 1));
      }
    }
    size_t i = 0;
    size_t j = 0;
    size_t gapA = 0;
    size_t gapB = 0;
    while (i < rows && j < columns)
    {
      if (equal(a[start + i], b[start + j]))
      {
        pairUp(a, start + gapA, start + i, b, start + gapB, start + j);
        match(a[start + i], b[start + j]);
        gapA = ++i;
        gapB = ++j;
      }
      else
      {
        cell(i + 1, j) >= cell(i, j + 1) ? ++i : ++j;
      }
    }
    pairUp(a, start + gapA, endA, b, start + gapB, endB);
  }

  void pairUp(const Places& a, size_t fromA, size_t endA, const Places& b, size_t fromB, size_t endB)
  {
    while (fromA < endA && fromB < endB)
    {
      match(a[fromA++], b[fromB++]);
    }
  }

  const std::vector<Child>& first_;
  const std::vector<Child>& second_;
  std::vector<size_t> partner_;
  std::vector<bool> taken_;
};

} // namespace

Pairs align(const std::vector<Child>& first, const std::vector<Child>& second)
{
  return Aligner(first, second).run();
}

} // namespace tav::inspect
