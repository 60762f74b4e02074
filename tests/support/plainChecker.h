/// A second opinion on what validation says: recursive, from the byte layout alone, without the library.
#pragma once

#include <cstdint>
#include <optional>

#include "support/elements.h"
#include "support/streams.h"

namespace test
{

class PlainChecker
{
public:
  PlainChecker(const Bytes& bytes, const Form& form)
      : bytes_(bytes), form_(form)
  {
  }

  /// The code that validating the group at an offset gives; nothing when a walk takes more than `kMostSteps`.
  std::optional<uint32_t> check(uint64_t offset, bool wide, bool containment)
  {
    containment_ = containment;
    steps_ = 0;
    Node start;
    if (read(offset, wide, start) != kOk)
    {
      return std::nullopt;
    }
    const uint32_t code = walk(start, 1);
    return steps_ <= kMostSteps ? std::optional(code) : std::nullopt;
  }

private:
  static constexpr uint64_t kMostSteps = 20000;
  static constexpr uint32_t kMostOpen = 4000;
  static constexpr uint32_t kOk = 0;
  static constexpr uint32_t kTooFewBytes = 0x90000002;
  static constexpr uint32_t kNotSupported = 0x90000005;
  static constexpr uint32_t kBadParam = 0x9000000C;
  static constexpr uint32_t kEndOfStorage = 0x90000021;
  static constexpr uint32_t kNoMoreChildren = 0x90000596;
  static constexpr uint32_t kOutside = 0x90000597;
  static constexpr uint32_t kTooLarge = 0x90000599;
  static constexpr uint32_t kNotFound = 0x9000059B;

  __extension__ using Wide = unsigned __int128; // sums of 64-bit numbers, which cannot wrap

  struct Node
  {
    bool wide = false;
    uint64_t offset = 0;
    uint64_t size = 0;
    uint32_t info = 0;
    uint16_t type = 0;
    uint16_t elm = 0;

    [[nodiscard]] uint64_t header() const { return wide ? 16 : 8; }
    [[nodiscard]] bool group() const { return type == 1 || type == 2; }
    [[nodiscard]] bool open() const { return size == (wide ? ~uint64_t{0} : uint64_t{0xFFFFFFFF}); }
    [[nodiscard]] bool wideChildren() const { return wide && type != 1; }
    [[nodiscard]] Wide end() const { return open() ? Wide{size} : Wide{offset} + header() + size; }
  };

  struct Eye
  {
    uint64_t offset = 0;
    uint64_t distance = 0;
  };

  [[nodiscard]] uint64_t word(uint64_t at, int length, bool swap) const
  {
    uint64_t value = 0;
    for (int i = 0; i < length; ++i)
    {
      const int byte = swap != kBigEndianHost ? i : length - 1 - i;
      value = value << 8 | bytes_[at + static_cast<uint64_t>(byte)];
    }
    return value;
  }

  uint32_t read(uint64_t offset, bool wide, Node& node) const
  {
    node.wide = wide;
    node.offset = offset;
    if (offset > bytes_.size() || bytes_.size() - offset < node.header())
    {
      return form_.buffered ? kEndOfStorage : kTooFewBytes;
    }
    const int sizeLength = wide ? 8 : 4;
    const uint64_t rest = offset + (wide ? 12 : 4);
    node.size = word(offset, sizeLength, form_.swap);
    node.info = wide ? static_cast<uint32_t>(word(offset + 8, 4, form_.swap)) : 0;
    node.type = static_cast<uint16_t>(word(rest, 2, form_.swap));
    node.elm = static_cast<uint16_t>(word(rest + 2, 2, form_.swap));
    if (node.group() || node.size == 0)
    {
      return kOk;
    }
    const uint64_t there = bytes_.size() - offset - node.header();
    if (form_.buffered && there == 0)
    {
      return kEndOfStorage;
    }
    return node.size > there || (form_.buffered && node.size > form_.ringBytes) ? kTooLarge : kOk;
  }

  /// The next eye catcher within `length` bytes, 0 for any number.
  uint32_t findEye(uint64_t start, uint64_t length, Eye& eye) const
  {
    static constexpr uint8_t low[] = {0xED, 0x0D, 0xEC, 0xDD, 0xEE, 0xD5, 0xDE, 0xC0};
    static constexpr uint8_t high[] = {0xC0, 0xDE, 0xD5, 0xEE, 0xDD, 0xEC, 0x0D, 0xED};
    const auto& native = kBigEndianHost ? high : low;
    if (start > bytes_.size())
    {
      return form_.buffered ? kEndOfStorage : kTooFewBytes;
    }
    uint64_t left = length != 0 ? length : ~uint64_t{0};
    int forward = 0;
    int reversed = 0;
    uint64_t at = start;
    for (; left != 0 && forward != 8 && reversed != 8; ++at, --left)
    {
      if (at == bytes_.size())
      {
        return form_.buffered ? kEndOfStorage : kNotFound;
      }
      forward = bytes_[at] == native[forward] ? forward + 1 : 0;
      reversed = bytes_[at] == native[7 - reversed] ? reversed + 1 : 0;
    }
    if (forward != 8 && reversed != 8)
    {
      return kNotFound;
    }
    const uint64_t there = bytes_.size() - at;
    if (form_.buffered ? there < 8 : there <= 8) // a block that ends with the pair does not count as holding it
    {
      return form_.buffered ? kEndOfStorage : kTooFewBytes;
    }
    eye = {at - 8, word(at, 8, forward != 8)};
    return kOk;
  }

  /// The sibling of a group of unknown size: the node after the pair that leads back to the group.
  uint32_t afterOpen(const Node& parent, const Node& group, Node& out) const
  {
    Eye eye;
    for (uint64_t position = group.offset;; position = eye.offset + 16)
    {
      uint32_t code = findEye(position, parent.size - position, eye);
      if (code != kOk)
      {
        return code;
      }
      Node node;
      code = eye.distance <= eye.offset ? read(eye.offset - eye.distance, true, node) : kTooFewBytes;
      if (code != kOk)
      {
        return code;
      }
      if (node.group() && node.size == group.size && node.offset == group.offset)
      {
        break;
      }
    }
    for (uint64_t position = eye.offset; findEye(position, 0, eye) == kOk; position = eye.offset + 8)
    {
      if (read(eye.offset + 16, true, out) == kOk)
      {
        return kOk;
      }
    }
    return kNotFound;
  }

  uint32_t sibling(const Node& parent, const Node& node, Node& out) const
  {
    if (node.open())
    {
      return node.group() ? afterOpen(parent, node, out) : kNotSupported;
    }
    if (node.wide != parent.wideChildren() || parent.end() <= node.offset)
    {
      return kBadParam;
    }
    if (node.elm == 65000 || node.elm == 65001)
    {
      return kNoMoreChildren;
    }
    Wide length = node.size;
    if (!node.group() && (form_.align || (node.info & 0x00100000) != 0))
    {
      length = (length + 7) / 8 * 8;
    }
    length += node.header();
    if (!node.group() && (node.info & 0x00400000) != 0)
    {
      length += 16;
    }
    return at(Wide{node.offset} + length, parent, out);
  }

  uint32_t at(Wide start, const Node& parent, Node& out) const
  {
    if (start >> 64 != 0 || parent.end() >> 64 != 0 || start > parent.end())
    {
      return kOutside;
    }
    return start == parent.end() ? kNoMoreChildren : read(static_cast<uint64_t>(start), parent.wideChildren(), out);
  }

  [[nodiscard]] static bool contains(const Node& parent, const Node& child)
  {
    const Wide end = Wide{parent.offset} + parent.size; // without the header, as it has always been
    return end >> 64 == 0 && child.offset < end && child.offset > parent.offset &&
           Wide{child.offset} + child.size <= end;
  }

  uint32_t walk(const Node& parent, uint32_t openGroups)
  {
    Node child;
    uint32_t code = at(Wide{parent.offset} + parent.header(), parent, child);
    while (code == kOk && ++steps_ <= kMostSteps)
    {
      if (containment_ && !contains(parent, child))
      {
        return kOutside;
      }
      if (child.group())
      {
        code = openGroups < kMostOpen ? walk(child, openGroups + 1) : kTooFewBytes;
        if (code != kOk)
        {
          return code;
        }
      }
      const Node reference = child;
      code = sibling(parent, reference, child);
    }
    return code == kNoMoreChildren ? kOk : code;
  }

  const Bytes& bytes_;
  Form form_;
  bool containment_ = false;
  uint64_t steps_ = 0;
};

} // namespace test
