#include "inspect/recover/rebuild.h"

#include <algorithm>
#include <array>

#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

using namespace tav::layout;

void Rebuilder::putHeader(TAVHeader& header)
{
  if (is64(header) && form_.aligned)
  {
    header.hdr64.info |= TAV_INFO_ALIGNED8;
  }
  header.nodeOffset = out_.length();
  std::array<uint8_t, kHeaderSize64> bytes{};
  const uint64_t length = encodeHeader(header, form_.swapped, bytes.data());
  out_.append(std::span<const uint8_t>(bytes).first(static_cast<size_t>(length)));
}

void Rebuilder::open(TAVHeader header)
{
  if (is64(header))
  {
    header.hdr64.size = 0;
  }
  else
  {
    header.hdr32.size = 0;
    header.hdr32.type = TAV_TYPE_HEADER32;
  }
  putHeader(header);
  groups_.push_back(header);
}

bool Rebuilder::isEmpty() const
{
  const TAVHeader& group = groups_.back();
  return !hasEyeSize(group) && out_.length() == group.nodeOffset + headerLength(group.hdrType);
}

void Rebuilder::copy(uint64_t offset, uint64_t count)
{
  while (count != 0)
  {
    reading_(offset);
    const auto piece = source_.view(offset);
    const uint64_t now = std::min<uint64_t>(piece.size(), count);
    if (now == 0)
    {
      throw Error("the file became shorter while it was read");
    }
    out_.append(piece.first(static_cast<size_t>(now)));
    offset += now;
    count -= now;
  }
}

void Rebuilder::add(const FoundData& data)
{
  TAVHeader header = data.header;
  putHeader(header);
  const uint64_t size = sizeOf(header);
  copy(data.header.nodeOffset + headerLength(header.hdrType), size + (data.extra ? 2 : 0));
  if (form_.aligned || (infoOf(header) & TAV_INFO_ALIGNED8) != 0)
  {
    out_.appendZeros((8 - size % 8) % 8);
  }
  if (hasEyeSize(header))
  {
    out_.append(std::span<const uint8_t>(encodeEyeSize(dataDistance(size), form_.swapped != data.otherOrder)));
  }
}

void Rebuilder::close()
{
  TAVHeader group = groups_.back();
  const uint64_t start = group.nodeOffset + headerLength(group.hdrType);
  if (hasEyeSize(group))
  {
    ++endElements_;
    const bool wide = hasChildren64(group);
    const uint64_t before = out_.length() - start;
    TAVHeader end = endElement(wide, form_.aligned);
    putHeader(end);
    out_.append(std::span<const uint8_t>(encodeEyeSize(groupDistance(before, wide), form_.swapped)));
  }
  const uint64_t size = out_.length() - start;
  if (!is64(group) && size >= kSizeUnknown32)
  {
    throw Error(Problem{.sentence = "a group with a 32-bit header would get more than 4 GiB",
                        .hint = "the stream was no 32-bit one",
                        .remedy = Remedy::readWide});
  }
  is64(group) ? void(group.hdr64.size = size) : void(group.hdr32.size = static_cast<uint32_t>(size));
  std::array<uint8_t, kHeaderSize64> bytes{};
  const uint64_t length = encodeHeader(group, form_.swapped, bytes.data());
  out_.patch(group.nodeOffset, std::span<const uint8_t>(bytes).first(static_cast<size_t>(length)));
  groups_.pop_back();
}

} // namespace tav::inspect
