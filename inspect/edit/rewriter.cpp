#include "inspect/edit/rewriter.h"

#include <algorithm>

#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

[[noreturn]] void failChanged(const ByteSource& source)
{
  throw Error(Problem{.file = source.name(), .sentence = "the file changed while it was read"});
}

} // namespace

void Rewriter::run(const std::function<void(uint64_t)>& progress)
{
  Walker walker(source_, form_);
  for (Event event; walker.next(event);)
  {
    if (progress)
    {
      progress(event.offset);
    }
    add(event);
  }
  if (next_ < places_.count() || place_)
  {
    failChanged(source_);
  }
}

void Rewriter::add(const Event& event)
{
  if (changed_)
  {
    gather(event);
    return;
  }
  if (event.what == What::nodeBegin)
  {
    beginNode(event);
    return;
  }
  if (event.what == What::nodeEnd)
  {
    event.node.isGroup() ? endGroup(event) : void();
    return;
  }
  if (event.what == What::payload && isEndElement(event.node.elm()))
  {
    putEnding(event);
    return;
  }
  copy(event.offset, event.length);
}

void Rewriter::copy(uint64_t offset, uint64_t length)
{
  while (length != 0)
  {
    const auto piece = source_.view(offset);
    const auto now = static_cast<size_t>(std::min<uint64_t>(piece.size(), length));
    if (now == 0)
    {
      failChanged(source_);
    }
    out_.append(piece.first(now));
    offset += now;
    length -= now;
  }
}

void Rewriter::beginNode(const Event& event)
{
  if (!place_ && next_ < places_.count())
  {
    place_ = places_.at(next_++);
  }
  if (place_ && place_->offset == event.offset && !event.node.isGroup())
  {
    changed_.emplace();
    changed_->place = *place_;
    changed_->payload = payloadOf_(*place_);
    place_.reset();
    return;
  }
  if (event.node.isGroup())
  {
    groups_.push_back({event.node, out_.length(), out_.length() + event.length});
  }
  copy(event.offset, event.length);
}

void Rewriter::gather(const Event& event)
{
  switch (event.what)
  {
  case What::payload: return;
  case What::extra: changed_->extra = true; return;
  case What::padding: changed_->padding = event; return;
  case What::pair: changed_->pair = event; return;
  case What::nodeEnd: finishChanged(event); return;
  default: failChanged(source_);
  }
}

void Rewriter::finishChanged(const Event& end)
{
  const ChangedNode changed = std::move(*changed_);
  changed_.reset();
  const Node& node = end.node;
  const uint64_t size = changed.payload.size();
  TAVHeader header = node.header;
  if (is64(header))
  {
    header.hdr64.size = size;
    header.hdr64.type = changed.place.type;
  }
  else
  {
    header.hdr32.size = static_cast<uint32_t>(size);
    header.hdr32.type = changed.place.type;
  }
  std::array<uint8_t, kHeaderSize64> bytes{};
  const uint64_t length = encodeHeader(header, form_.swapped, bytes.data());
  out_.append(std::span<const uint8_t>(bytes).first(static_cast<size_t>(length)));
  out_.append(changed.payload);
  // The uncounted bytes are those of a UTF-8 string.
  if (changed.extra && changed.place.type == TAV_TYPE_UTF8_STRING)
  {
    copy(node.payloadOffset() + node.size(), 2);
  }
  if (size == node.size() && changed.padding)
  {
    copy(changed.padding->offset, changed.padding->length);
  }
  else if (size != node.size() && (form_.aligned || (node.info() & TAV_INFO_ALIGNED8) != 0))
  {
    out_.appendZeros((8 - size % 8) % 8);
  }
  if (changed.pair)
  {
    putPair(*changed.pair, size);
  }
}

/// The pair behind a data element with its new size; one whose eye catcher is damaged stays as it is.
void Rewriter::putPair(const Event& pair, uint64_t size)
{
  EyeSizeBytes bytes{};
  source_.read(pair.offset, bytes);
  for (const bool swapped : {form_.swapped, !form_.swapped})
  {
    if (decodeEyeSize(bytes, swapped).eye == TAV_EYE_CATCHER)
    {
      bytes = encodeEyeSize(dataDistance(size), swapped);
      break;
    }
  }
  out_.append(std::span<const uint8_t>(bytes));
}

/// Bytes that a group has got more, modulo 2^64, up to a place in it.
uint64_t Rewriter::growth(const Group& group, uint64_t offset) const
{
  return (out_.length() - group.payload) - (offset - group.node.payloadOffset());
}

/// The pair in an end element. Its distance follows the group that it leads back to, which is the innermost one unless
/// a header between is damaged.
void Rewriter::putEnding(const Event& event)
{
  const Node& end = event.node;
  EyeSizeBytes bytes{};
  if (event.length != kEyeSizeLength || source_.read(event.offset, bytes) != bytes.size())
  {
    copy(event.offset, event.length);
    return;
  }
  const EyeSize pair = decodeEyeSize(bytes, form_.swapped);
  const auto group = std::find_if(groups_.rbegin(), groups_.rend(), [&](const Group& around) {
    return pair.distance == groupDistance(end.offset() - around.node.payloadOffset(), end.is64());
  });
  if (pair.eye == TAV_EYE_CATCHER && group != groups_.rend())
  {
    // The end element's own header is copied already and is as long as ever.
    bytes = encodeEyeSize(pair.distance + growth(*group, event.offset), form_.swapped);
  }
  out_.append(std::span<const uint8_t>(bytes));
}

void Rewriter::endGroup(const Event& event)
{
  const Group group = groups_.back();
  groups_.pop_back();
  const Node& node = group.node;
  const uint64_t more = growth(group, event.offset);
  if (more == 0 || isSizeUnknown(node.header) || (node.has(kOpen) && node.size() == 0))
  {
    return;
  }
  const uint64_t size = node.size() + more;
  TAVHeader header = node.header;
  if (!is64(header) && size >= kSizeUnknown32)
  {
    throw Error(Problem{.file = source_.name(),
                        .offset = node.offset(),
                        .sentence = byteText(size) + " are too many for a 32-bit header"});
  }
  is64(header) ? void(header.hdr64.size = size) : void(header.hdr32.size = static_cast<uint32_t>(size));
  std::array<uint8_t, kHeaderSize64> bytes{};
  const uint64_t length = encodeHeader(header, form_.swapped, bytes.data());
  out_.patch(group.header, std::span<const uint8_t>(bytes).first(static_cast<size_t>(length)));
}

} // namespace tav::inspect
