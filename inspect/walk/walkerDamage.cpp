// What the walker does where no node begins: damaged bytes, and zeros behind a root.
#include <algorithm>
#include <utility>

#include "inspect/walk/prober.h"
#include "tav/inspect/form.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

using namespace tav::layout;

std::string Walker::whyNot(const TAVHeader& header, uint64_t limit) const
{
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  if (sizeOf(header) == 0 && typeOf(header) == 0)
  {
    return "zeros where a node should begin";
  }
  if (sizeOf(header) > limit - start && !isSizeUnknown(header))
  {
    const bool file = limit == source_.size();
    return "no node: it would end " + counted(sizeOf(header) - (limit - start), "byte") + " past " +
           (file ? "the end of the file" : "its parent");
  }
  if (isSizeUnknown(header))
  {
    return isGroup(header) ? "no node: a group without an end and without a child" : "no node: its size is all ones";
  }
  const std::string type = std::to_string(typeOf(header));
  return "no node: " +
         (typeInfo(typeOf(header)).known ? "a size of " + std::to_string(sizeOf(header)) + " does not suit type " + type
                                         : "type " + type + " is unknown") +
         ", and no node follows";
}

bool Walker::endByZeros()
{
  bool gaveUp = false;
  if (!prober_->zerosToEnd(position_, gaveUp) && !gaveUp)
  {
    return false;
  }
  if (frames_.size() > 1)
  {
    endGroup(End::byFile);
    return true;
  }
  queue(gaveUp ? What::unread : What::zeros, position_, source_.size() - position_);
  shared_.node = {};
  position_ = source_.size();
  return true;
}

bool Walker::passZeros()
{
  const uint64_t end = frames_.size() == 1 && position_ != 0 ? prober_->behindZeros(position_) : position_;
  if (end == position_)
  {
    return false;
  }
  queue(What::zeros, position_, end - position_);
  shared_.node = {};
  position_ = end;
  return true;
}

void Walker::damage(uint64_t from, uint32_t code, std::string reason)
{
  Frame& top = frames_.back();
  const Restart restart = prober_->findRestart(from, top.wide, frames_.size() == 1, top.limit);
  uint64_t to = restart.offset;
  if (!restart.gaveUp && to == top.limit && top.open && to == source_.size())
  {
    to = std::max(from + 1, prober_->zerosStart(from)); // zeros at the end belong to the file, not to the damage
  }
  queue(restart.gaveUp ? What::unread : What::damaged, from, to - from);
  shared_.node = {};
  shared_.code = code;
  const auto other = frames_.size() == 1 ? otherStreamAt(source_, form_, from) : std::nullopt;
  shared_.reason = other ? otherStreamText(*other) : std::move(reason);
  position_ = to;
  top.lastDamage = to;
  afterDamage_ = true;
}

} // namespace tav::inspect
