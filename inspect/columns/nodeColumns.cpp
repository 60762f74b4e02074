#include "tav/inspect/nodeColumns.hpp"

#include <algorithm>
#include <cstring>
#include <type_traits>
#include <utility>

#include "inspect/columns/addRow.h"

namespace tav::inspect
{

NodeColumns::~NodeColumns() = default;

void NodeColumns::add(const NodeFacts& node, int64_t parentRow)
{
  if (isFull())
  {
    makeRoom(room_ * 2);
  }
  addRow(node, parentRow);
}

void NodeColumns::makeRoom(size_t rows)
{
  constexpr size_t atFirst = 2048;
  const size_t room = std::max(rows, atFirst);
  size_t width = 0;
  eachColumn([&](auto& column) { width += sizeof(column[0]); });
  // NOLINTNEXTLINE(modernize-make-unique): which would fill it with zeros
  std::unique_ptr<uint64_t[]> block(new uint64_t[room * (width + 7) / 8]);
  auto* place = reinterpret_cast<uint8_t*>(block.get());
  eachColumn([&](auto& column) {
    using Item = std::remove_reference_t<decltype(column[0])>;
    auto* const items = reinterpret_cast<Item*>(place);
    if (count_ != 0)
    {
      std::memcpy(items, column.items_, count_ * sizeof(Item));
    }
    column.items_ = items;
    place += room * sizeof(Item);
  });
  block_ = std::move(block);
  room_ = room;
}

void NodeColumns::cut(size_t rows)
{
  for (size_t row = rows; row < count_; ++row)
  {
    if (isRest(kind[row]))
    {
      rests_.resize(place_[row]); // of the first of them: they lie in the order of the rows
      break;
    }
  }
  count_ = std::min(count_, rows);
  paths.cut(rows);
}

void NodeColumns::clear()
{
  count_ = 0;
  rests_.clear();
  paths.cut(0);
  kept_.clear();
}

} // namespace tav::inspect
