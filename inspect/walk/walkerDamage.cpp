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
  // Writers fill up to a page, and the next stream begins behind that. Fewer zeros can be a part of a damaged header.
  constexpr uint64_t fewest = kHeaderSize64;
  if (frames_.size() > 1 || position_ == 0)
  {
    return false;
  }
  uint64_t end = position_;
  for (auto bytes = source_.view(end); !bytes.empty(); bytes = source_.view(end))
  {
    const auto other = std::find_if(bytes.begin(), bytes.end(), [](uint8_t byte) { return byte != 0; });
    end += static_cast<uint64_t>(other - bytes.begin());
    if (other != bytes.end())
    {
      break;
    }
    end = source_.zerosUntil(end);
  }
  // A root's header can itself begin with zeros.
  for (uint64_t back = 0; back < fewest && back <= end - position_; ++back)
  {
    if (rootBegins(end - back))
    {
      end -= back;
      break;
    }
  }
  if (end - position_ < fewest)
  {
    return false;
  }
  queue(What::zeros, position_, end - position_);
  shared_.node = {};
  position_ = end;
  return true;
}

bool Walker::rootBegins(uint64_t offset)
{
  for (const bool wide : {form_.root64, !form_.root64})
  {
    TAVHeader root{};
    if (prober_->header(offset, wide, source_.size(), root) && isGroup(root) &&
        prober_->judge(offset, wide, source_.size()) >= Belief::named)
    {
      return true;
    }
  }
  return otherStreamAt(source_, form_, offset).has_value();
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
