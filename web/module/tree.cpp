#include "web/module/tree.h"

#include <algorithm>
#include <utility>

namespace tav::web
{

using inspect::Event;
using inspect::Form;
using inspect::Walker;
using inspect::What;

Level::Level(inspect::ByteSource& source, const Form& form)
    : source_(source)
{
  const Walker walker(source, form);
  marks_.push_back({0, 0, 0, form, walker.state()});
}

Level::Level(const Walker& walker, const Event& group)
    : source_(walker.source()), group_(group.offset), depth_(group.depth + 1)
{
  place_ = walker.place();
  done_ = !walker.isBetween(); // it has no room for children
  marks_.push_back({0, walker.place(), 0, walker.form(), walker.state()});
}

Level::Cursor::Cursor(Level& level, const Mark& mark)
    : level_(level), walk_(level.source_, mark.form, {}, mark.state, mark.streamOffset, level.depth_ == 0, kBudget)
{
}

bool Level::Cursor::isRow(const Event& event) const
{
  if (event.depth != level_.depth_ || isEndPiece(event))
  {
    return false;
  }
  return event.what == What::nodeBegin || event.what == What::damaged || event.what == What::zeros ||
         event.what == What::unread;
}

/// Goes past what is below the row's node.
bool Level::Cursor::finishRow()
{
  if (!std::exchange(inRow_, false) || last_.what != What::nodeBegin)
  {
    return true;
  }
  if (last_.node.isGroup())
  {
    walk_.skip();
  }
  const uint64_t offset = last_.node.offset();
  while (walk_.next(last_))
  {
    if (last_.what == What::nodeEnd && last_.node.offset() == offset)
    {
      return true;
    }
  }
  return false;
}

bool Level::Cursor::next(Event& event)
{
  done_ = done_ || !finishRow();
  while (!done_)
  {
    if (!walk_.next(last_) ||
        (last_.what == What::nodeEnd && level_.depth_ > 0 && last_.depth + 1 == level_.depth_))
    {
      done_ = true;
    }
    else if (isRow(last_))
    {
      inRow_ = true;
      event = last_;
      return true;
    }
  }
  return false;
}

std::optional<Level::Mark> Level::Cursor::mark()
{
  done_ = done_ || !finishRow();
  const Walker& walker = walk_.walker();
  if (done_ || !walker.isBetween() || walker.depth() != level_.depth_)
  {
    return std::nullopt;
  }
  return Mark{0, walker.place(), walk_.streamOffset(), walk_.form(), walker.state()};
}

bool Level::count(uint64_t most)
{
  if (done_)
  {
    return false;
  }
  if (counting_ == nullptr)
  {
    counting_ = std::make_unique<Cursor>(*this, marks_.front());
  }
  Event event;
  for (uint64_t i = 0; i < most; ++i)
  {
    if (rows_ >= marks_.back().row + kStep)
    {
      if (auto mark = counting_->mark())
      {
        mark->row = rows_;
        marks_.push_back(std::move(*mark));
        counting_ = std::make_unique<Cursor>(*this, marks_.back()); // as whoever reads from there does
      }
    }
    if (!counting_->next(event))
    {
      done_ = true;
      counting_.reset();
      return false;
    }
    ++rows_;
    place_ = event.offset + event.length;
  }
  return true;
}

const Level::Mark& Level::markBefore(uint64_t row) const
{
  const auto isBehind = [](uint64_t wanted, const Mark& mark) { return wanted < mark.row; };
  return *std::prev(std::upper_bound(marks_.begin(), marks_.end(), row, isBehind));
}

std::optional<uint64_t> Level::rowOf(uint64_t offset)
{
  while (place_ <= offset && count(kStep))
  {
  }
  const auto isBehind = [](uint64_t wanted, const Mark& mark) { return wanted < mark.offset; };
  auto mark = std::upper_bound(marks_.begin(), marks_.end(), offset, isBehind);
  mark = mark == marks_.begin() ? mark : std::prev(mark);
  std::optional<uint64_t> found;
  uint64_t row = mark->row;
  Cursor cursor(*this, *mark);
  for (Event event; row < rows_ && cursor.next(event) && event.offset <= offset; ++row)
  {
    found = row;
  }
  return found;
}

std::unique_ptr<Level> Level::below(uint64_t row)
{
  std::unique_ptr<Level> made;
  read(row, 1, [&](const inspect::StreamWalk& walk, const Event& event) {
    if (event.what == What::nodeBegin && event.node.isGroup())
    {
      made = std::make_unique<Level>(walk.walker(), event);
    }
  });
  return made;
}

} // namespace tav::web
