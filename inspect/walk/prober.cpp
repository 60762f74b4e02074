#include "inspect/walk/prober.h"

#include <algorithm>
#include <array>
#include <cstring>

#include "inspect/dictionary/builtIn.h"
#include "inspect/walk/sizeSuits.h"
#include "tav/inspect/form.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kMargin = kHeaderSize64; ///< bytes that a test at one offset looks at
constexpr uint64_t kWindow = uint64_t{64} * 1024;

/// A window of a source, which is filled as far as somebody looks: most searches end soon.
class Window
{
public:
  // cppcheck-suppress uninitMemberVar ; the bytes are filled before they are looked at
  explicit Window(ByteSource& source)
      : source_(source)
  {
  }

  /// To an offset. What the limit or the source ends before is zeros.
  void moveTo(uint64_t offset, uint64_t limit)
  {
    offset_ = offset;
    length_ = static_cast<size_t>(std::min<uint64_t>(bytes_.size(), limit - offset));
    filled_ = 0;
  }

  /// The bytes that a test at one offset looks at.
  const uint8_t* at(uint64_t index)
  {
    if (index + kMargin > filled_)
    {
      fill(std::clamp(2 * filled_, static_cast<size_t>(index + kMargin), bytes_.size()));
    }
    return bytes_.data() + index;
  }

  /// From an offset that at() was asked for on, how many can be tested with what is filled in.
  uint64_t ready(uint64_t index) const { return filled_ - kMargin - index + 1; }

  std::span<const uint8_t> whole()
  {
    fill(bytes_.size());
    return bytes_;
  }

private:
  void fill(size_t end)
  {
    const size_t wanted = std::min(end, length_);
    const size_t got =
        wanted > filled_ ? source_.read(offset_ + filled_, std::span(bytes_).subspan(filled_, wanted - filled_)) : 0;
    std::fill(bytes_.begin() + static_cast<ptrdiff_t>(filled_ + got), bytes_.begin() + static_cast<ptrdiff_t>(end),
              uint8_t{0});
    filled_ = end;
  }

  ByteSource& source_;
  uint64_t offset_ = 0;
  size_t length_ = 0;
  size_t filled_ = 0;
  std::array<uint8_t, kWindow + kMargin> bytes_; ///< not cleared: that took longer than most searches
};

uint16_t load16(const uint8_t* bytes, bool swap)
{
  uint16_t value = 0;
  std::memcpy(&value, bytes, sizeof value);
  return swap ? kor::byteswap16(value) : value;
}

bool isEye(const uint8_t* bytes)
{
  uint64_t word = 0;
  std::memcpy(&word, bytes, sizeof word);
  return word == TAV_EYE_CATCHER || word == kor::byteswap64(TAV_EYE_CATCHER);
}

/// A table of the answers for all 16-bit numbers: they are asked for at every byte of a damaged region.
using Answers = std::array<bool, 65536>;

const Answers& knownTypes()
{
  static const auto known = []() {
    Answers table{};
    for (size_t type = 0; type < table.size(); ++type)
    {
      const auto number = static_cast<uint16_t>(type);
      table[type] = isGroupType(number) || typeInfo(number).known;
    }
    return table;
  }();
  return known;
}

const Answers& namedElements()
{
  static const auto named = []() {
    Answers table{};
    for (size_t id = 0; id < table.size(); ++id)
    {
      table[id] = isBuiltIn(static_cast<uint16_t>(id));
    }
    return table;
  }();
  return named;
}

/// Tells where neither a header with a name nor an eye catcher can be, which is nearly everywhere.
class Passing
{
public:
  Passing(bool swap, bool wide, bool eitherWidth)
      : swap_(swap), first_(wide ? 12 : 4), second_(eitherWidth ? 16 - first_ : first_)
  {
  }

  /// How many of `count` offsets from `bytes` on can be passed over.
  uint64_t over(const uint8_t* bytes, uint64_t count) const
  {
    return swap_ ? overAs<true>(bytes, count) : overAs<false>(bytes, count);
  }

private:
  template<bool swap>
  uint64_t overAs(const uint8_t* bytes, uint64_t count) const
  {
    const auto isHeader = [&](const uint8_t* tail) {
      return types_[load16(tail, swap)] && named_[load16(tail + 2, swap)];
    };
    const uint8_t* const end = bytes + count;
    const uint8_t* at = bytes;
    while (at != end && !isHeader(at + first_) && !isHeader(at + second_) && !isEye(at))
    {
      ++at;
    }
    return static_cast<uint64_t>(at - bytes);
  }

  const Answers& types_ = knownTypes();
  const Answers& named_ = namedElements();
  bool swap_;
  size_t first_; ///< from the header on to its type
  size_t second_;
};

} // namespace

Prober::Prober(ByteSource& source, const Form& form, uint64_t budget)
    : source_(source), form_(form), budget_(budget)
{
}

bool Prober::isNamed(uint16_t elm)
{
  return namedElements()[elm];
}

bool Prober::header(uint64_t offset, bool wide, uint64_t limit, TAVHeader& out) const
{
  const uint64_t length = wide ? kHeaderSize64 : kHeaderSize32;
  if (limit < length || offset > limit - length)
  {
    return false;
  }
  std::array<uint8_t, kHeaderSize64> room{};
  const std::span<const uint8_t> atHand = source_.view(offset);
  const uint8_t* bytes = atHand.data();
  if (atHand.size() < length)
  {
    if (source_.read(offset, std::span(room).first(static_cast<size_t>(length))) != length)
    {
      return false;
    }
    bytes = room.data();
  }
  decodeHeader(bytes, wide, form_.swapped, out);
  out.nodeOffset = offset;
  return true;
}

uint64_t Prober::paddedSize(const TAVHeader& data) const
{
  uint64_t size = sizeOf(data);
  if (form_.aligned || (infoOf(data) & TAV_INFO_ALIGNED8) != 0)
  {
    roundUp8Checked(size);
  }
  return size;
}

bool Prober::suits(const TAVHeader& header)
{
  const uint16_t type = typeOf(header);
  return isGroupType(type) ? type == TAV_TYPE_HEADER32 || is64(header)
                           : typeInfo(type).known && sizeSuits(type, sizeOf(header));
}

Belief Prober::judgeHeader(const TAVHeader& header, uint64_t limit) const
{
  const uint64_t start = header.nodeOffset + headerLength(header.hdrType);
  const bool unknownSize = isGroup(header) && isSizeUnknown(header);
  if (!unknownSize && (start > limit || sizeOf(header) > limit - start))
  {
    return Belief::none;
  }
  if (!suits(header))
  {
    return Belief::fits;
  }
  return isNamed(elmOf(header)) ? Belief::named : Belief::typed;
}

bool Prober::isFollowedAt(uint64_t offset, bool wide, uint64_t limit) const
{
  TAVHeader next{};
  return offset == limit || (header(offset, wide, limit, next) && judgeHeader(next, limit) >= Belief::named);
}

bool Prober::isFollowed(const TAVHeader& node, uint64_t limit) const
{
  const bool wide = is64(node);
  const uint64_t start = node.nodeOffset + headerLength(node.hdrType);
  if (isGroup(node))
  {
    const uint64_t end = isSizeUnknown(node) ? limit : start + sizeOf(node);
    return end == start ? isFollowedAt(start, wide, limit) : isFollowedAt(start, hasChildren64(node), end);
  }
  const uint64_t end = addSaturated(start, paddedSize(node));
  if (hasEyeSize(node))
  {
    return pairAt(end, limit) || (typeOf(node) == TAV_TYPE_UTF8_STRING && pairAt(end + 2, limit));
  }
  if (elmOf(node) == TAV_ELM_CMN_END_HDR_EYE_SIZE)
  {
    return pairAt(start, limit).has_value();
  }
  if (end > limit)
  {
    return limit == source_.size(); // the last padding of a file was not written
  }
  return isFollowedAt(end, wide, limit) ||
         (typeOf(node) == TAV_TYPE_UTF8_STRING && isFollowedAt(end + 2, wide, limit));
}

/// Behind a node of a chain: its payload, the two bytes that may stand behind a text, and its pair.
uint64_t Prober::behindLink(const TAVHeader& node, uint64_t limit) const
{
  const bool wide = is64(node);
  const uint64_t start = node.nodeOffset + headerLength(node.hdrType);
  uint64_t end = start + (isGroup(node) ? sizeOf(node) : std::min(paddedSize(node), limit - start));
  if (typeOf(node) == TAV_TYPE_UTF8_STRING && limit - end >= 2 && !pairAt(end, limit) &&
      (end + 2 == limit || pairAt(end + 2, limit) || judge(end + 2, wide, limit) > judge(end, wide, limit)))
  {
    end += 2;
  }
  return end + (!isGroup(node) && pairAt(end, limit) ? kEyeSizeLength : 0);
}

Prober::Chain Prober::chain(uint64_t offset, bool wide, uint64_t limit, uint64_t most, Belief least) const
{
  Chain found{.end = offset};
  while (found.nodes < most && found.end != limit)
  {
    TAVHeader node{};
    found.isBroken = !header(found.end, wide, limit, node) || judgeHeader(node, limit) < least ||
                     (typeOf(node) == 0 && sizeOf(node) == 0);
    found.isOpen = !found.isBroken && isGroup(node) && isSizeUnknown(node);
    if (found.isBroken || found.isOpen)
    {
      return found;
    }
    found.end = behindLink(node, limit);
    ++found.nodes;
  }
  return found;
}

bool Prober::isChain(uint64_t offset, bool wide, uint64_t limit, bool toTheEnd) const
{
  constexpr uint64_t kEnough = 16;
  const Chain found = chain(offset, wide, limit, kEnough, Belief::fits);
  if (found.isOpen)
  {
    return found.nodes > 2 || (!toTheEnd && judge(found.end, wide, limit) == Belief::followed);
  }
  return !found.isBroken && (!toTheEnd || found.end == limit);
}

bool Prober::isWholeChain(uint64_t offset, bool wide, uint64_t limit) const
{
  return chain(offset, wide, limit, kNoOffset, Belief::typed).end == limit;
}

Belief Prober::judge(uint64_t offset, bool wide, uint64_t limit) const
{
  TAVHeader node{};
  if (!header(offset, wide, limit, node))
  {
    return Belief::none;
  }
  const Belief belief = judgeHeader(node, limit);
  return belief == Belief::named && isFollowed(node, limit) ? Belief::followed : belief;
}

std::optional<uint64_t> Prober::pairAt(uint64_t offset, uint64_t limit) const
{
  EyeSizeBytes bytes{};
  if (limit < bytes.size() || offset > limit - bytes.size() || source_.read(offset, bytes) != bytes.size())
  {
    return std::nullopt;
  }
  for (const bool swap : {form_.swapped, !form_.swapped})
  {
    const EyeSize pair = decodeEyeSize(bytes, swap);
    if (pair.eye == TAV_EYE_CATCHER)
    {
      return pair.distance;
    }
  }
  return std::nullopt;
}

bool Prober::pairEnds(uint64_t offset, uint64_t limit, const TAVHeader& group) const
{
  const std::optional<uint64_t> distance = pairAt(offset, limit);
  // The distance of a 64-bit group of type 1 is 8 short, as the writer makes it.
  const uint64_t missing = is64(group) && !hasChildren64(group) ? 8 : 0;
  return distance && offset - group.nodeOffset == addSaturated(*distance, missing);
}

bool Prober::isNamedHeader(const uint8_t* bytes, bool wide) const
{
  const uint8_t* const tail = bytes + (wide ? 12 : 4);
  return knownTypes()[load16(tail, form_.swapped)] && isNamed(load16(tail + 2, form_.swapped));
}

bool Prober::restartAt(const uint8_t* bytes, uint64_t offset, bool wide, uint64_t limit)
{
  if (!isNamedHeader(bytes, wide))
  {
    return false;
  }
  const Belief belief = judge(offset, wide, limit);
  // A size that is exactly its type's says enough where what follows is damaged as well.
  return belief == Belief::followed ||
         (belief == Belief::named && typeInfo(load16(bytes + (wide ? 12 : 4), form_.swapped)).valueSize != 0);
}

std::optional<uint64_t> Prober::nodeOfPair(uint64_t eye, uint64_t distance, uint64_t from, uint64_t limit) const
{
  // What the distance leaves out: nothing, the 8 of a group of type 1, padding and the extra bytes of a string.
  for (uint64_t missing = 0; missing <= 9; ++missing)
  {
    TAVHeader node{};
    uint64_t start = 0;
    if (!nodeBefore(eye, addSaturated(distance, missing), start) || start < from || !header(start, true, limit, node))
    {
      continue;
    }
    const uint64_t behind = start + kHeaderSize64;
    const bool group = isGroup(node) && (isSizeUnknown(node) || addSaturated(behind, sizeOf(node)) == eye + 16) &&
                       (missing == 0 || missing == 8);
    const bool data = !isGroup(node) && hasEyeSize(node) && dataDistance(sizeOf(node)) == distance &&
                      (eye == behind + paddedSize(node) || eye == behind + paddedSize(node) + 2);
    if (group || data)
    {
      return start;
    }
  }
  return std::nullopt;
}

bool Prober::restartByPair(const uint8_t* bytes, uint64_t offset, uint64_t from, uint64_t limit, Restart& restart)
{
  if (!isEye(bytes))
  {
    return false;
  }
  const std::optional<uint64_t> distance = pairAt(offset, limit);
  if (!distance)
  {
    return false;
  }
  if (const std::optional<uint64_t> start = nodeOfPair(offset, *distance, from, limit))
  {
    restart = {*start, true};
    return true;
  }
  // The node that it ends began before the damage, or its header is damaged; the next node begins behind it.
  const uint64_t behind = offset + kEyeSizeLength;
  if (behind == limit || judge(behind, true, limit) >= Belief::typed || judge(behind, false, limit) >= Belief::named)
  {
    restart = {behind, true};
    return true;
  }
  return false;
}

Restart Prober::findRestart(uint64_t from, bool wide, bool eitherWidth, uint64_t limit)
{
  Window window(source_);
  const Passing passing(form_.swapped, wide, eitherWidth);
  Restart restart{limit};
  if (spent_ > budget_)
  {
    restart.gaveUp = true;
    return restart;
  }
  for (uint64_t at = from; at < limit;)
  {
    window.moveTo(at, limit);
    const uint64_t tests = std::min<uint64_t>(kWindow, limit - at);
    for (uint64_t i = 0; i < tests; ++i)
    {
      const uint8_t* bytes = window.at(i);
      const uint64_t ready = std::min(window.ready(i), tests - i);
      const uint64_t passed = passing.over(bytes, ready);
      if (passed == ready)
      {
        i += passed - 1;
        continue;
      }
      i += passed;
      bytes += passed;
      const uint64_t offset = at + i;
      if (offset > from && (restartAt(bytes, offset, wide, limit) ||
                            (eitherWidth && restartAt(bytes, offset, !wide, limit))))
      {
        return {offset};
      }
      if (restartByPair(bytes, offset, from + 1, limit, restart))
      {
        return restart;
      }
    }
    spent_ += tests;
    at = limit - at == tests ? limit : std::min(limit, source_.pastHole(at + tests, window.whole(), kMargin));
    if (spent_ > budget_)
    {
      restart.gaveUp = at < limit;
      return restart;
    }
  }
  return restart;
}

bool Prober::zerosToEnd(uint64_t offset, bool& gaveUp)
{
  gaveUp = false;
  while (offset < source_.size())
  {
    if (offset < nonZeroAt_)
    {
      return false;
    }
    const auto bytes = source_.view(offset);
    spent_ += bytes.size();
    const auto found = std::find_if(bytes.begin(), bytes.end(), [](uint8_t byte) { return byte != 0; });
    if (found != bytes.end())
    {
      nonZeroAt_ = offset + static_cast<uint64_t>(found - bytes.begin()) + 1;
      return false;
    }
    offset = source_.zerosUntil(offset + bytes.size());
    if (spent_ > budget_)
    {
      gaveUp = offset < source_.size();
      return !gaveUp;
    }
  }
  return true;
}

uint64_t Prober::behindZeros(uint64_t offset) const
{
  // Writers fill up to a page, and the next stream begins behind that.
  constexpr uint64_t fewest = kHeaderSize64;
  uint64_t end = offset;
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
  for (uint64_t back = 0; back < fewest && back <= end - offset; ++back)
  {
    if (rootBegins(end - back))
    {
      end -= back;
      break;
    }
  }
  return end - offset < fewest ? offset : end;
}

bool Prober::rootBegins(uint64_t offset) const
{
  for (const bool wide : {form_.root64, !form_.root64})
  {
    TAVHeader root{};
    if (header(offset, wide, source_.size(), root) && isGroup(root) &&
        judge(offset, wide, source_.size()) >= Belief::named)
    {
      return true;
    }
  }
  return otherStreamAt(source_, form_, offset).has_value();
}

uint64_t Prober::zerosStart(uint64_t from)
{
  constexpr uint64_t worthTelling = 8;
  uint64_t end = source_.size();
  while (end > from)
  {
    const uint64_t start = std::max(from, (end - 1) / ByteSource::kPage * ByteSource::kPage);
    const auto bytes = source_.view(start).first(static_cast<size_t>(end - start));
    const auto found = std::find_if(bytes.rbegin(), bytes.rend(), [](uint8_t byte) { return byte != 0; });
    spent_ += bytes.size();
    end -= static_cast<uint64_t>(found - bytes.rbegin());
    if (found != bytes.rend() || spent_ > budget_)
    {
      break;
    }
    end = source_.zerosBefore(end, from);
  }
  return source_.size() - end >= worthTelling ? end : source_.size();
}

} // namespace tav::inspect
