/// @file header.hpp
/// What a node's header says.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "tav/cpp/chars.hpp"
#include "tav/cpp/text.hpp"
#include "tav/cpp/values.hpp"

namespace tav
{

/// A node's header: what writing a node gives, and what nodes that are read and their copies share.
class HeaderView
{
public:
  HeaderView() = default;
  explicit HeaderView(const TAVHeader& header) noexcept
      : data_{header, nullptr, 0, 0}
  {
  }

  [[nodiscard]] const TAVHeader& header() const noexcept
  {
    return data_.header;
  }
  /// Offset of the header's first byte in the stream.
  [[nodiscard]] uint64_t offset() const noexcept
  {
    return data_.header.nodeOffset;
  }
  /// Bytes of the payload; all ones in the width of the header for a group that was never closed.
  [[nodiscard]] uint64_t size() const noexcept
  {
    return layout::sizeOf(data_.header);
  }
  [[nodiscard]] uint16_t type() const noexcept
  {
    return layout::typeOf(data_.header);
  }
  [[nodiscard]] uint16_t elm() const noexcept
  {
    return layout::elmOf(data_.header);
  }
  [[nodiscard]] Width width() const noexcept
  {
    return layout::is64(data_.header) ? Width::bits64 : Width::bits32;
  }
  /// The flag bits, 0 for a 32-bit header.
  [[nodiscard]] uint32_t info() const noexcept
  {
    return layout::infoOf(data_.header);
  }
  [[nodiscard]] uint16_t infoKey() const noexcept
  {
    return static_cast<uint16_t>(info() & TAV_INFO_KEY_MASK);
  }
  [[nodiscard]] bool isGroup() const noexcept
  {
    return layout::isGroup(data_.header);
  }
  /// Whether this is a group that was never closed.
  [[nodiscard]] bool isOpen() const noexcept
  {
    return isGroup() && layout::isSizeUnknown(data_.header);
  }
  /// The element's enum name, empty for an unknown id.
  [[nodiscard]] std::string_view name() const noexcept
  {
    return detail::nameOf(elm());
  }
  /// The element's tag name, empty for an unknown id.
  [[nodiscard]] std::string_view tag() const noexcept
  {
    return detail::tagOf(elm());
  }

protected:
  explicit HeaderView(const TAVHeaderData& data) noexcept
      : data_(data)
  {
  }

  /// Whole, so that a walk can read its next node right into the present one. Mutable for the payload's place, which a
  /// node renews when it is asked for a payload that a ring no longer holds.
  mutable TAVHeaderData data_{};
};

namespace detail
{

/// "hostName (60104)", or "element 7" for an unknown id: what messages call an element.
inline std::string elementText(uint16_t elm)
{
  const std::string_view tag = tagOf(elm);
  const std::string number = std::to_string(elm);
  return tag.empty() ? "element " + number : std::string(tag) + " (" + number + ')';
}

/// An id as it was given: "hostName (60104)", "element -1".
inline std::string elementText(ElementId elm)
{
  return elm.isValid() ? elementText(elm.id()) : "element " + std::to_string(static_cast<int64_t>(elm.number()));
}

/// "hostName (60104) at 0x28"
inline std::string placeText(const HeaderView& node)
{
  return elementText(node.elm()) + " at 0x" + hexDigits(node.offset(), "0123456789abcdef");
}

/// "hostName (60104) at 0x28, type 50, 3 bytes"
inline std::string nodeText(const HeaderView& node)
{
  const std::string size = node.isOpen() ? "open" : std::to_string(node.size()) + " bytes";
  return placeText(node) + ", type " + std::to_string(node.type()) + ", " + size;
}

/// "Uint32"; empty for a type that nobody knows, and for groups.
inline std::string_view typeName(uint16_t type)
{
  const layout::TypeInfo& known = layout::typeInfo(type);
  if (!known.known || layout::isGroupType(type))
  {
    return {};
  }
  return known.printName != nullptr ? known.printName // two are printed without a name
         : type == TAV_TYPE_BYTE    ? "Byte"
                                    : "Uint64 array";
}

/// "a Uint32", "a group", "of type 7"
inline std::string typeText(uint16_t type)
{
  if (layout::isGroupType(type))
  {
    return "a group";
  }
  const std::string name(typeName(type));
  if (name.empty())
  {
    return "of type " + std::to_string(type);
  }
  return (type == TAV_TYPE_ASCII_STRING ? "an " : "a ") + name;
}

} // namespace detail

} // namespace tav
