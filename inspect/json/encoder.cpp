#include "inspect/json/encoder.h"

#include <array>

#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

using namespace tav::layout;

void StreamEncoder::setForm(const Form& form)
{
  form_.swapped = conversion_.swapped.value_or(form.swapped);
  form_.root64 = conversion_.root64.value_or(form.root64);
  form_.aligned = conversion_.aligned.value_or(form.aligned);
  reorder_ = form_.swapped != form.swapped;
  if (conversion_.eyeSize && !form_.root64)
  {
    throw Error(Problem{.sentence = "eye/size pairs need 64-bit headers", .remedy = Remedy::makeWide});
  }
}

bool StreamEncoder::isWide(const Properties& properties) const
{
  if (groups_.empty())
  {
    return remake_ ? form_.root64 : properties.wide.value_or(form_.root64);
  }
  const bool wide = hasChildren64(groups_.back().header);
  if (!remake_ && properties.wide.value_or(wide) != wide)
  {
    throw BuildError(std::string("the group around it has children with ") + (wide ? "64" : "32") + "-bit headers");
  }
  return wide;
}

uint16_t StreamEncoder::groupType(const Properties& properties, bool wide) const
{
  const uint16_t usual = wide ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32;
  const bool decided = remake_ && (conversion_.root64 || !wide);
  return decided ? usual : properties.type.value_or(usual);
}

TAVHeader StreamEncoder::header(const Properties& properties, bool wide, uint16_t type, uint64_t size) const
{
  if (!properties.elm)
  {
    throw BuildError(properties.unknown.empty() ? "the node has no element" : properties.unknown);
  }
  TAVHeader header{};
  if (!remake_ && properties.size)
  {
    size = *properties.size;
    const bool unknown = size == TAV_SIZE_UNKNOWN;
    if (!wide && size > kSizeUnknown32 && !unknown)
    {
      throw BuildError(std::to_string(size) + " does not fit the size of a 32-bit header");
    }
    size = !wide && unknown ? kSizeUnknown32 : size;
  }
  else if (!wide && size >= kSizeUnknown32)
  {
    throw BuildError(byteText(size) + " are too many for a 32-bit header");
  }
  header.hdrType = wide ? TAV_HDR_64 : TAV_HDR_32;
  if (!wide)
  {
    if (!remake_ && properties.eyeSize)
    {
      throw BuildError("only 64-bit headers can announce an eye/size pair");
    }
    header.hdr32 = {static_cast<uint32_t>(size), type, *properties.elm};
    return header;
  }
  const uint32_t usual = form_.aligned ? TAV_INFO_ALIGNED8 : 0;
  uint32_t info = properties.info.value_or(usual);
  if (remake_)
  {
    info = (info & ~uint32_t{TAV_INFO_ALIGNED8}) | usual;
  }
  info |= properties.eyeSize || conversion_.eyeSize ? TAV_INFO_EYE_SIZE : 0;
  header.hdr64 = {size, info, type, *properties.elm};
  return header;
}

void StreamEncoder::putHeader(const TAVHeader& header)
{
  std::array<uint8_t, kHeaderSize64> bytes{};
  const auto length = static_cast<size_t>(encodeHeader(header, form_.swapped, bytes.data()));
  file_.append(std::span<const uint8_t>(bytes).first(length));
}

void StreamEncoder::beginGroup(const Properties& properties)
{
  Group group;
  group.properties = properties;
  // The element may come behind the children; the header is written again when the group ends.
  Properties now = properties;
  now.elm = properties.elm.value_or(uint16_t{0});
  now.size = 0;
  const bool wide = isWide(properties);
  group.properties.wide = wide;
  group.properties.type = groupType(properties, wide);
  group.header = header(now, wide, *group.properties.type, 0);
  group.header.nodeOffset = file_.length();
  putHeader(group.header);
  group.payload = file_.length();
  groups_.push_back(group);
}

void StreamEncoder::putEndElement(const Group& group)
{
  const bool wide = hasChildren64(group.header);
  const auto pair = encodeEyeSize(groupDistance(file_.length() - group.payload, wide), form_.swapped);
  putHeader(endElement(wide, form_.aligned));
  file_.append(std::span<const uint8_t>(pair));
}

void StreamEncoder::endGroup()
{
  const Group& group = groups_.back();
  const Properties& properties = group.properties;
  const bool wide = is64(group.header);
  TAVHeader done = header(properties, wide, *properties.type, 0);
  if (!isGroup(done) || hasChildren64(done) != hasChildren64(group.header))
  {
    throw BuildError("the type of a group must stand before its children");
  }
  if (hasEyeSize(done) && (remake_ || properties.endElement))
  {
    putEndElement(group);
  }
  done = header(properties, wide, *properties.type, file_.length() - group.payload);
  std::array<uint8_t, kHeaderSize64> bytes{};
  const auto length = static_cast<size_t>(encodeHeader(done, form_.swapped, bytes.data()));
  file_.patch(group.header.nodeOffset, std::span<const uint8_t>(bytes).first(length));
  groups_.pop_back();
}

bool StreamEncoder::isLeftOut(const Draft& draft)
{
  if (!remake_)
  {
    return false;
  }
  // What cannot be explained cannot be converted; end elements are made anew.
  return draft.isRaw() || (draft.properties.elm && isEndElement(*draft.properties.elm));
}

void StreamEncoder::addRaw(Draft& draft)
{
  if (remake_)
  {
    leftOut_ += draft.given != Given::zeros && !draft.begun ? 1 : 0;
    leftOutBytes_ += draft.given != Given::zeros ? draft.value.size() : 0;
  }
  else
  {
    file_.append(draft.value);
    file_.appendZeros(draft.count);
  }
  draft.value.clear();
  draft.count = 0;
  draft.begun = true;
}

void StreamEncoder::begin(Draft& draft)
{
  const Properties& properties = draft.properties;
  const uint16_t type = properties.type ? *properties.type : typeFor(draft);
  if (isGroupType(type) && draft.given != Given::nothing)
  {
    throw BuildError("a group has children and no value");
  }
  Properties now = properties;
  now.size = 0;
  now.elm = properties.elm.value_or(uint16_t{0});
  draft.properties.type = type;
  draft.properties.wide = isWide(properties);
  header_ = header(now, *draft.properties.wide, type, 0);
  headerAt_ = file_.length();
  putHeader(header_);
}

void StreamEncoder::addValue(Draft& draft)
{
  if (draft.isRaw())
  {
    addRaw(draft);
    return;
  }
  if (isLeftOut(draft))
  {
    draft.value.clear();
    draft.begun = true;
    return;
  }
  if (!draft.begun)
  {
    begin(draft);
  }
  // Arrays are reversed by units of 8, so that a part of one is left for the next time.
  const bool array = typeInfo(*draft.properties.type).swapRule == SwapRule::all64;
  std::string rest = array ? draft.value.substr(draft.value.size() / 8 * 8) : std::string();
  draft.value.resize(draft.value.size() - rest.size());
  file_.append(payloadFor(draft, *draft.properties.type, form_.swapped, reorder_));
  draft.value = std::move(rest);
  draft.begun = true;
}

void StreamEncoder::finish(Draft& draft)
{
  if (isLeftOut(draft) || draft.isRaw())
  {
    draft.isRaw() ? addRaw(draft) : void();
    return;
  }
  if (!draft.begun)
  {
    begin(draft);
  }
  file_.append(payloadFor(draft, *draft.properties.type, form_.swapped, reorder_));
  const uint64_t size = file_.length() - headerAt_ - headerLength(header_.hdrType);
  const TAVHeader done = header(draft.properties, *draft.properties.wide, *draft.properties.type, size);
  std::array<uint8_t, kHeaderSize64> bytes{};
  const auto length = static_cast<size_t>(encodeHeader(done, form_.swapped, bytes.data()));
  file_.patch(headerAt_, std::span<const uint8_t>(bytes).first(length));
  header_ = done;
  putBehind(draft, size);
}

void StreamEncoder::putBehind(Draft& draft, uint64_t size)
{
  if (draft.extra && !remake_)
  {
    file_.append(*draft.extra);
  }
  if (draft.padding && !remake_)
  {
    file_.append(*draft.padding);
  }
  else if (form_.aligned || (infoOf(header_) & TAV_INFO_ALIGNED8) != 0)
  {
    uint64_t end = size;
    roundUp8Checked(end);
    file_.appendZeros(end - size);
  }
  if (draft.pair && !remake_)
  {
    file_.append(*draft.pair);
  }
  else if (hasEyeSize(header_))
  {
    file_.append(std::span<const uint8_t>(encodeEyeSize(dataDistance(size), form_.swapped)));
  }
}

} // namespace tav::inspect
