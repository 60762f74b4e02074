/// @file node.hpp
/// A node of a stream that is read, its value, and copies of it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <string_view>
#include <utility>
#include <vector>

#include "tav/core/step.hpp"
#include "tav/cpp/decode.hpp"
#include "tav/cpp/error.hpp"
#include "tav/cpp/header.hpp"
#include "tav/cpp/payload.hpp"

namespace tav
{

class ChildRange;
class DescendantRange;
class FindRange;
class Path;
class RootRange;
namespace detail
{
class Printer;
class IndexParts;
class IndexWalk;
class NodeIndex;
struct NodeTree;
template<class Walk>
class WalkIterator;
} // namespace detail

/// Whether a walk shows the elements that only end a group (ids 65000 and 65001).
enum class EndElements : uint8_t
{
  skip,
  show
};

namespace detail
{

/// Says of a type that cannot be read that it cannot.
template<class T>
constexpr bool checkReadable() noexcept
{
  static_assert(
      Readable<T>,
      "as<T>() takes a sized integer, std::byte, std::string, std::string_view, std::u8string, std::u8string_view, "
      "tav::Utf8, tav::Utf8Text, std::vector<std::byte>, std::span<const std::byte>, "
      "std::vector<uint64_t>, tav::Uint128, tav::Sint128, TAVTimeStamp or a std::chrono::sys_time");
  return Readable<T>;
}

template<class T>
[[gnu::noinline, gnu::cold]] Told tellReading(uint32_t rc, const HeaderView& node, bool isGroup)
{
  return {nodeText(node), readingRefusal<T>(rc, node, isGroup)};
}

} // namespace detail

/// A node with a copy of its payload: independent of the reader it came from.
class OwnedNode : public HeaderView
{
public:
  // cppcheck-suppress passedByValue ; it is moved from
  OwnedNode(const TAVHeader& header, std::vector<std::byte> bytes, bool swapped) noexcept
      : HeaderView(header), bytes_(std::move(bytes)), swapped_(swapped)
  {
  }

  [[nodiscard]] std::span<const std::byte> payload() const& noexcept
  {
    return bytes_;
  }
  std::span<const std::byte> payload() const&& = delete;

  /// The value, as Node::as. Views live as long as the node.
  template<class T>
  [[nodiscard]] T as() const&
  {
    if constexpr (detail::checkReadable<T>())
    {
      T value{};
      const uint32_t rc = read(value);
      detail::demand(rc, "reading", [&] { return detail::tellReading<T>(rc, *this, isGroup()); });
      return value;
    }
  }
  template<class T>
  [[nodiscard]] T as(std::error_code& ec) const&
  {
    if constexpr (detail::checkReadable<T>())
    {
      T value{};
      detail::report(read(value), ec);
      return value;
    }
  }
  template<class T>
  requires(!detail::isView<T>) [[nodiscard]] T as() const&&
  {
    return as<T>();
  }
  template<class T>
  requires(!detail::isView<T>) [[nodiscard]] T as(std::error_code& ec) const&&
  {
    return as<T>(ec);
  }
  template<Readable T>
  requires(detail::isView<T>) T as()
  const&& = delete;
  template<Readable T>
  requires(detail::isView<T>) T as(std::error_code& ec)
  const&& = delete;

  /// The number, as Node::asNumber.
  template<StreamInteger T>
  [[nodiscard]] T asNumber() const
  {
    T value{};
    const uint32_t rc = readNumber(value);
    detail::demand(rc, "reading", [&] { return detail::tellReading<T>(rc, *this, isGroup()); });
    return value;
  }
  template<StreamInteger T>
  [[nodiscard]] T asNumber(std::error_code& ec) const noexcept
  {
    T value{};
    detail::report(readNumber(value), ec);
    return value;
  }

private:
  [[nodiscard]] detail::RawValue raw() const noexcept
  {
    return {type(), detail::bytesOf(bytes_.data()), bytes_.size(), swapped_};
  }
  template<class T>
  uint32_t read(T& value) const
  {
    return isGroup() ? TAV_RC_NOT_SUPPORTED : detail::decode(raw(), value);
  }
  template<class T>
  uint32_t readNumber(T& value) const noexcept
  {
    return isGroup() ? TAV_RC_NOT_SUPPORTED : detail::decodeNumber(raw(), value);
  }

  std::vector<std::byte> bytes_;
  bool swapped_;
};

/// A node of a stream. A small value; must not outlive its reader.
class Node : public HeaderView
{
public:
  /// A node of no stream, to be assigned to.
  Node() = default;

  /// As HeaderView::isGroup; what comes with a payload is told from a group by that.
  [[nodiscard]] bool isGroup() const noexcept
  {
    const bool hasPayload = layout::is64(data_.header) && data_.pDataBuf != nullptr;
    return !hasPayload && HeaderView::isGroup();
  }

  /// The children of a group, in order: `for (const tav::Node& child : node.children())`. Damage on the way throws, or
  /// ends the walk and sets `ec`, which outlives the range. A data element has none.
  [[nodiscard]] ChildRange children(EndElements endElements = EndElements::skip) const;
  [[nodiscard]] ChildRange children(std::error_code& ec, EndElements endElements = EndElements::skip) const;

  /// The nodes behind this one in its group. For a node whose group is not known (of Reader::at and
  /// Reader::endingAfter) TAV_RC_NOT_SUPPORTED.
  [[nodiscard]] ChildRange siblings(EndElements endElements = EndElements::skip) const;
  [[nodiscard]] ChildRange siblings(std::error_code& ec, EndElements endElements = EndElements::skip) const;

  /// All nodes below, depth first in stream order. Always ends: a step that does not lead forward in the stream is
  /// TAV_RC_OUTSIDE_PARENT.
  [[nodiscard]] DescendantRange descendants(EndElements endElements = EndElements::skip) const;
  [[nodiscard]] DescendantRange descendants(std::error_code& ec, EndElements endElements = EndElements::skip) const;

  /// The next node of the same group, as the first of siblings().
  [[nodiscard]] std::optional<Node> next() const;
  [[nodiscard]] std::optional<Node> next(std::error_code& ec) const;

  /// The node that ends right before this one, by its eye/size pair; nothing when there is no pair.
  [[nodiscard]] std::optional<Node> previous() const
  {
    std::optional<Node> node;
    detail::demand(stepBack(node), "reading the previous node");
    return node;
  }
  [[nodiscard]] std::optional<Node> previous(std::error_code& ec) const noexcept
  {
    std::optional<Node> node;
    detail::report(stepBack(node), ec);
    return node;
  }

  /// The first node that a path leads to from here, as "host/hostName", "host[2]/*", "..//cpu[cpuOnline > 4]"; with a
  /// leading slash from the stream's first node. See tav/path/path.hpp. Always ends. TAV_RC_BAD_PARAM for a path that
  /// is none.
  [[nodiscard]] std::optional<Node> path(std::string_view path) const;
  [[nodiscard]] std::optional<Node> path(std::string_view path, std::error_code& ec) const;
  [[nodiscard]] std::optional<Node> path(const Path& path) const;
  [[nodiscard]] std::optional<Node> path(const Path& path, std::error_code& ec) const;
  /// All of them, in stream order.
  [[nodiscard]] std::vector<Node> all(std::string_view path) const;
  [[nodiscard]] std::vector<Node> all(std::string_view path, std::error_code& ec) const;
  [[nodiscard]] std::vector<Node> all(const Path& path) const;
  [[nodiscard]] std::vector<Node> all(const Path& path, std::error_code& ec) const;
  /// The same one after the other, as a walk: `for (const tav::Node& cpu : node.find("host/cpu"))`. Damage on the way
  /// throws, or ends the walk and sets `ec`, which outlives the range.
  [[nodiscard]] FindRange find(std::string_view path) const;
  [[nodiscard]] FindRange find(std::string_view path, std::error_code& ec) const;
  [[nodiscard]] FindRange find(const Path& path) const;
  [[nodiscard]] FindRange find(const Path& path, std::error_code& ec) const;

  /// The payload as stored in the stream; empty for a group.
  [[nodiscard]] PayloadView payload() const
  {
    detail::demand(refresh(), "reading", [this] { return detail::nodeText(*this); });
    return view();
  }
  [[nodiscard]] PayloadView payload(std::error_code& ec) const noexcept
  {
    const uint32_t rc = refresh();
    detail::report(rc, ec);
    return rc == TAV_RC_OK ? view() : PayloadView();
  }

  /// The value in this machine's byte order. `T` must be the type's own: a sized integer, std::byte, std::string,
  /// std::string_view, std::u8string, std::u8string_view, tav::Utf8, tav::Utf8Text, std::vector<std::byte>,
  /// std::span<const std::byte>, std::vector<uint64_t>, a 128-bit integer, TAVTimeStamp or a std::chrono::sys_time.
  /// Views live as long as payload(), and are not checked.
  /// @throws std::system_error TAV_RC_NOT_SUPPORTED for another type, TAV_RC_OUTSIDE_PARENT for a size or a number
  ///         that does not fit
  template<class T>
  [[nodiscard]] T as() const
  {
    if constexpr (kHasFastWay<T>)
    {
      if (isFast<T>()) [[likely]]
      {
        return readFast<T>();
      }
    }
    if constexpr (detail::checkReadable<T>())
    {
      return readWhole<T>();
    }
  }
  template<class T>
  [[nodiscard]] T as(std::error_code& ec) const
  {
    if constexpr (kHasFastWay<T>)
    {
      if (isFast<T>()) [[likely]]
      {
        ec.clear();
        return readFast<T>();
      }
    }
    if constexpr (detail::checkReadable<T>())
    {
      T value{};
      detail::report(read(value), ec);
      return value;
      // cppcheck-suppress missingReturn ; checkReadable() is false only where it does not compile
    }
  }

  /// The number in a node of any integer type, when `T` can hold it: else TAV_RC_OUTSIDE_PARENT.
  template<StreamInteger T>
  [[nodiscard]] T asNumber() const
  {
    T value{};
    const uint32_t rc = readNumber(value);
    detail::demand(rc, "reading", [&] { return detail::tellReading<T>(rc, *this, isGroup()); });
    return value;
  }
  template<StreamInteger T>
  [[nodiscard]] T asNumber(std::error_code& ec) const noexcept
  {
    T value{};
    detail::report(readNumber(value), ec);
    return value;
  }

  /// A copy that needs no reader.
  [[nodiscard]] OwnedNode copy() const
  {
    const PayloadView bytes = payload();
    return {data_.header, std::vector<std::byte>(bytes.begin(), bytes.end()), state_->isSwapped()};
  }
  /// An error leaves a copy with an empty payload.
  [[nodiscard]] OwnedNode copy(std::error_code& ec) const
  {
    const PayloadView bytes = payload(ec);
    return {data_.header, std::vector<std::byte>(bytes.begin(), bytes.end()), state_ != nullptr && state_->isSwapped()};
  }

private:
  friend class Reader;
  friend class ChildRange;
  friend class DescendantRange;
  friend class RootRange;
  template<class Walk>
  friend class detail::WalkIterator;
  friend class detail::Printer;
  friend class detail::NodeIndex;
  friend class detail::IndexParts;
  friend class detail::IndexWalk;
  friend struct detail::NodeTree;

  /// A node of no known group.
  Node(detail::ReaderState& state, const TAVHeaderData& data) noexcept
      : HeaderView(data), state_(&state), fetch_(state.fetches), isFast_(state.isFast)
  {
  }
  /// A node that a walk is at: the walk moves it on.
  explicit Node(detail::ReaderState* state) noexcept
      : state_(state), isFast_(state != nullptr && state->isFast)
  {
  }
  /// Where a group's content ends, if its children have 64-bit headers and it was closed; else 0, which leaves every
  /// step to the operation.
  static uint64_t endOf(const TAVHeader& group) noexcept
  {
    const core::Level level = core::levelBelowClosed(core::NodeAt<true>{group});
    return layout::hasChildren64(group) && level.fits ? level.end : 0;
  }

  /// Reads the node behind `reference`, which may be this one's own header, or the first one below the parent. `end`:
  /// endOf the parent.
  template<bool First>
  [[gnu::always_inline]] uint32_t readNext(TAVHeader* reference, uint64_t end) noexcept
  {
    detail::ReaderState& state = *state_;
    if (state.inPlace == detail::InPlace::block && core::hasNeverTraced()) [[likely]]
    {
      const uint32_t rc = step<First, detail::BlockInPlace>(*state.handle, reference, end);
      return rc != core::kNotHere ? rc : readElsewhere(reference);
    }
    if (!isFast_)
    {
      fetch_ = ++state.fetches;
    }
    if (state.inPlace == detail::InPlace::ring && core::hasNeverTraced()) [[likely]]
    {
      const uint32_t rc = step<First, detail::RingInPlace>(*state.handle, reference, end);
      return rc != core::kNotHere ? rc : readElsewhere(reference);
    }
    return readElsewhere(reference);
  }

  /// The place of the sibling for a walk that steps in place; past every level where only readNext finds it.
  [[nodiscard]] uint64_t behind() const noexcept
  {
    return layout::is64(data_.header) ? core::behind(core::NodeAt<true>{data_.header}) : ~uint64_t{0};
  }

  template<bool First, class Bytes>
  [[gnu::always_inline]] uint32_t step(TAVHandle& handle, const TAVHeader* reference, uint64_t end) noexcept
  {
    const uint64_t start = First ? parent_.nodeOffset + layout::kHeaderSize64 : 0; // fits where the end does
    const core::Level level{start, end, true, true};
    return core::nextOnLevel<true, First>(Bytes(handle), handle, level, reference, data_);
  }

  [[gnu::noinline]] uint32_t readElsewhere(TAVHeader* reference) noexcept
  {
    if (reference != nullptr && state_->isBuffered())
    {
      if (const uint32_t rc = goBehind(*reference); rc != TAV_RC_OK)
      {
        return rc;
      }
    }
    return tavGetNextChild(0, state_->handle, &parent_, reference, &data_);
  }

  /// Brings a ring to the sibling of a node, if its group goes on there; that of an open group is searched through all
  /// that is between.
  uint32_t goBehind(const TAVHeader& header) const noexcept
  {
    const core::Node node = core::nodeOf(header);
    uint64_t length = 0;
    if (!core::isOpen(node) && core::lengthOf(state_->handle->alignMode == 1, node, length) &&
        layout::addChecked(length, node.offset()) && length < core::levelBelow(core::nodeOf(parent_)).end)
    {
      return state_->goTo(length);
    }
    return TAV_RC_OK;
  }

  /// Before a walk that somebody asks for.
  void beginWalk() const noexcept
  {
    if (state_ != nullptr)
    {
      state_->walk();
    }
  }
  /// The nodes below, for a path, which may look at few of them.
  [[nodiscard]] DescendantRange below(std::error_code& ec) const;

  /// Surely no end element, in one look: those have the largest ids.
  [[nodiscard]] bool isSurelyNoEnd() const noexcept
  {
    return layout::is64(data_.header) && data_.header.hdr64.elm < TAV_ELM_CMN_END_HDR_MARKER;
  }

  [[nodiscard]] bool hasParent() const noexcept
  {
    return parent_.hdrType != 0;
  }

  [[nodiscard]] PayloadView view() const noexcept
  {
    return isGroup() ? PayloadView() : PayloadView(data_.pDataBuf, size(), state_);
  }

  /// Reads the payload again when the ring may have moved on since. The stream may have changed, too: then
  /// TAV_RC_OUTSIDE_PARENT.
  uint32_t refresh() const noexcept
  {
    if (state_ == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    if (!state_->isBuffered() || isGroup() || fetch_ == state_->fetches)
    {
      return TAV_RC_OK;
    }
    TAVHeaderData again{};
    ++state_->fetches;
    uint32_t rc = state_->goTo(offset());
    rc = rc == TAV_RC_OK ? tavReadNodeInt(0, state_->handle, offset(), layout::is64(data_.header), &again) : rc;
    if (rc == TAV_RC_OK && (layout::sizeOf(again.header) != size() || layout::typeOf(again.header) != type()))
    {
      rc = TAV_RC_OUTSIDE_PARENT;
    }
    if (rc == TAV_RC_OK)
    {
      data_.pDataBuf = again.pDataBuf;
      fetch_ = state_->fetches;
    }
    return rc;
  }

  /// No decoder takes the type of a group.
  template<class Decode>
  uint32_t withRaw(Decode&& decode) const
  {
    const uint32_t rc = refresh();
    return rc == TAV_RC_OK ? decode(detail::RawValue{type(), data_.pDataBuf, size(), state_->isSwapped()}) : rc;
  }
  /// Types that are read without a look at anything else, from a fast stream and a 64-bit header.
  template<class T>
  static constexpr bool kHasFastWay =
      StreamInteger<T> || std::same_as<T, TAVTimeStamp> || std::same_as<T, std::string_view>;

  /// Whether the payload is still where a ring in this machine's order had it.
  [[nodiscard]] bool isFresh() const noexcept
  {
    return state_ != nullptr && state_->inPlace == detail::InPlace::ring && fetch_ == state_->fetches;
  }

  /// Whether a value can be taken as it is.
  template<class T>
  [[gnu::always_inline]] bool isFast() const noexcept
  {
    return isFast<T>(isFast_);
  }
  template<class T>
  [[gnu::always_inline]] bool isFast(bool isReady) const noexcept
  {
    const TAVHeader64& header = data_.header.hdr64;
    if constexpr (std::same_as<T, std::string_view>)
    {
      return layout::is64(data_.header) && header.type == TAV_TYPE_ASCII_STRING && isReady;
    }
    else
    {
      return layout::is64(data_.header) && header.type == detail::fixedType<T>() && header.size == sizeof(T) && isReady;
    }
  }
  template<class T>
  [[gnu::always_inline]] T readFast() const noexcept
  {
    if constexpr (std::same_as<T, std::string_view>)
    {
      return {reinterpret_cast<const char*>(data_.pDataBuf), static_cast<size_t>(data_.header.hdr64.size)};
    }
    else
    {
      T value;
      std::memcpy(&value, data_.pDataBuf, sizeof value);
      return value;
    }
  }
  /// Out of line for the types that have a fast way, which rarely come here.
  template<class T>
  [[gnu::noinline]] T readWhole() const
  {
    if constexpr (kHasFastWay<T>)
    {
      if (isFast<T>(isFresh()))
      {
        return readFast<T>();
      }
    }
    T value{};
    const uint32_t rc = read(value);
    detail::demand(rc, "reading", [&] { return detail::tellReading<T>(rc, *this, isGroup()); });
    return value;
  }
  template<class T>
  uint32_t read(T& value) const
  {
    return withRaw([&value](const detail::RawValue& raw) { return detail::decode(raw, value); });
  }
  template<class T>
  uint32_t readNumber(T& value) const noexcept
  {
    return withRaw([&value](const detail::RawValue& raw) { return detail::decodeNumber(raw, value); });
  }

  uint32_t stepBack(std::optional<Node>& node) const noexcept
  {
    if (state_ == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    TAVHeaderData reference{data_.header, nullptr, 0, 0};
    TAVHeaderData data{};
    if (offset() < layout::kEyeSizeLength)
    {
      return TAV_RC_OK;
    }
    ++state_->fetches;
    const uint32_t rc = tavGetPrevNode(0, state_->handle, &reference, &data);
    if (rc == TAV_RC_OK)
    {
      // A pair that leads past the group's start is damage, or chance; what it leads to is in no known group.
      const bool inside = hasParent() && data.header.nodeOffset > parent_.nodeOffset;
      node = Node(*state_, data);
      node->parent_ = inside ? parent_ : TAVHeader{};
    }
    return rc == TAV_RC_NOT_FOUND ? TAV_RC_OK : rc;
  }

  detail::ReaderState* state_ = nullptr;
  mutable uint64_t fetch_ = 0;
  TAVHeader parent_{}; ///< header type 0: not known, or none
  bool isRoot_ = false;
  bool isFast_ = false; ///< of a stream that was fast when the node was read
};

} // namespace tav
