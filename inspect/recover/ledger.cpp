#include "inspect/recover/ledger.h"

#include <algorithm>
#include <cstring>
#include <optional>
#include <utility>
#include <vector>

#include "inspect/walk/prober.h"
#include "tav/inspect/form.hpp"
#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

using namespace tav::layout;

void Ledger::keep(uint64_t to)
{
  totals_.kept += to - place_.position();
  place_.moveTo(to);
}

void Ledger::lose(uint64_t to, std::string reason)
{
  const uint64_t from = place_.position();
  if (!lastTold_ && keptTo_ == from)
  {
    doubt(last_);
  }
  totals_.lost += to - from;
  ++totals_.losses;
  if (sinks_.loss)
  {
    sinks_.loss({from, to - from, std::move(reason)});
  }
  place_.moveTo(to);
  damaged_ = true;
}

void Ledger::keepZeros(uint64_t to)
{
  totals_.zeros += to - place_.position();
  keep(to);
}

void Ledger::leaveUnread()
{
  totals_.unread = source_.size() - place_.position();
  place_.moveTo(source_.size());
}

void Ledger::comesBack(const TAVHeader& node)
{
  last_ = node;
  lastTold_ = false;
  if (damaged_)
  {
    doubt(node);
  }
}

/// Whether most of a payload, as far as one page goes, is eye catchers: a damaged size covers nodes with pairs.
bool Ledger::isMostlyEyes(const TAVHeader& data)
{
  std::vector<uint8_t> bytes(static_cast<size_t>(std::min<uint64_t>(sizeOf(data), ByteSource::kPage)));
  bytes.resize(source_.read(data.nodeOffset + headerLength(data.hdrType), bytes));
  uint64_t covered = 0;
  for (size_t i = 0; i + kEyeLength <= bytes.size();)
  {
    uint64_t word = 0;
    std::memcpy(&word, bytes.data() + i, sizeof word);
    const bool eye = word == TAV_EYE_CATCHER || word == kor::byteswap64(TAV_EYE_CATCHER);
    covered += eye ? kEyeLength : 0;
    i += eye ? kEyeLength : 1;
  }
  return covered * 2 > bytes.size();
}

/// Tells of a node beside lost bytes when its element or its payload says that it may be none.
void Ledger::doubt(const TAVHeader& node)
{
  const bool eyes = !isGroup(node) && isMostlyEyes(node);
  lastTold_ = true;
  if (Prober::isNamed(elmOf(node)) && !eyes)
  {
    return;
  }
  ++totals_.doubts;
  if (sinks_.doubt)
  {
    sinks_.doubt({node.nodeOffset, headerLength(node.hdrType) + (isGroup(node) ? 0 : sizeOf(node)),
                  eyes ? "stands beside lost bytes, and most of its payload is eye catchers"
                       : "stands beside lost bytes, and its element is not in the dictionary"});
  }
}

std::string reasonOfEnd(ByteSource& source, const Form& form, uint64_t offset, bool wide)
{
  const Prober prober(source, form, kNoOffset);
  TAVHeader header{};
  const uint64_t eye = offset + (wide ? kHeaderSize64 : kHeaderSize32);
  const std::optional<uint64_t> distance = prober.pairAt(eye, source.size());
  if (!distance || !prober.header(offset, wide, source.size(), header) || !isEndElement(elmOf(header)) ||
      sizeOf(header) != kEyeSizeLength)
  {
    return {};
  }
  const uint64_t back = addSaturated(*distance, wide ? 0 : 8); // that of a group of 32-bit children is 8 short
  return back <= eye ? std::string()
                     : "an end element whose group began " + counted(back - eye, "byte") +
                           " before the file: what is left of the group has lost its header";
}

std::string reasonAt(ByteSource& source, const Form& form, uint64_t offset)
{
  if (const auto other = otherStreamAt(source, form, offset))
  {
    return "no node is whole; " + otherStreamText(*other);
  }
  for (const bool wide : {true, false})
  {
    if (std::string reason = reasonOfEnd(source, form, offset, wide); !reason.empty())
    {
      return reason;
    }
  }
  return "no node is whole";
}

} // namespace tav::inspect
