#include "inspect/table/filling.h"

namespace tav::inspect
{

void Filling::begin()
{
  chunk_ = std::make_shared<TableChunk>(query_.columns.size(), query_.joiner);
}

void Filling::otherData(const Automaton::Move& move, const RawCell& value)
{
  const size_t own = move.isRow ? chunk_->addRow() : kNoRow;
  const auto put = [&](const Automaton::Target& target) {
    chunk_->put(target.column, target.up == 0 ? own : rowAt(target.up), value);
  };
  if (move.targetCount == 0)
  {
    return;
  }
  put(move.target);
  for (const Automaton::Target& target : automaton_.others(move))
  {
    put(target);
  }
}

std::vector<size_t> Filling::openRows() const
{
  std::vector<size_t> rows;
  for (const Level& level : levels_)
  {
    if (level.row != kNoRow)
    {
      rows.push_back(level.row);
    }
  }
  return rows;
}

uint64_t Filling::dropOpenRows()
{
  const std::vector<size_t> rows = openRows();
  if (!rows.empty())
  {
    chunk_->cut(rows.front());
  }
  levels_.resize(1);
  open_ = 0;
  return rows.empty() ? kNoRow : rows.front();
}

std::shared_ptr<TableChunk> Filling::take()
{
  std::shared_ptr<TableChunk> rows = std::move(chunk_);
  begin();
  return rows;
}

void Filling::tidy()
{
  if (!automaton_.isFull())
  {
    return;
  }
  std::vector<uint32_t*> kept;
  for (Level& level : levels_)
  {
    kept.push_back(&level.state);
    level.move = 0;
  }
  automaton_.renew(kept);
}

} // namespace tav::inspect
