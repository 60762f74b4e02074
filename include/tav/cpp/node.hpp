/// @file node.hpp
/// A node of a stream that is read, its value, and copies of it.
#pragma once

#include <cassert>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <stdexcept>
#include <string_view>
#include <vector>

#include "tav/cpp/storage.hpp"
#include "tav/dictionary.hpp"

namespace tav
{

class ChildRange;
class DescendantRange;
class Node;

/// Whether a walk shows the elements that only end a group (ids 65000 and 65001).
enum class EndElements : uint8_t
{
  skip,
  show
};

namespace detail
{

/// What a reader and its nodes share.
struct ReaderState
{
  std::unique_ptr<TAVSideStorage> owned;
  TAVHandle* handle = nullptr;
  uint64_t fetches = 0; ///< payload pointers into a ring last until the next one

  ReaderState() = default;
  ReaderState(const ReaderState&) = delete;
  ReaderState& operator=(const ReaderState&) = delete;
  ~ReaderState()
  {
    if (handle != nullptr)
    {
      tavTermHandle(&handle);
    }
  }

  [[nodiscard]] bool isBuffered() const
  {
    return handle->pCircularBuf != nullptr;
  }
  [[nodiscard]] bool isSwapped() const
  {
    return handle->swapBytes != 0;
  }
};

} // namespace detail

/// A node's payload as it stands in the stream. Over memory it lives as long as the memory, over a file or another
/// storage until anything else is read through the reader: then, in debug builds, using it throws std::logic_error.
class PayloadView
{
public:
  PayloadView(const uint8_t* bytes, uint64_t size, [[maybe_unused]] const detail::ReaderState* state)
      : bytes_(bytes), size_(static_cast<size_t>(size))
  {
#if !defined(NDEBUG)
    state_ = state != nullptr && state->isBuffered() ? state : nullptr;
    fetch_ = state_ != nullptr ? state_->fetches : 0;
#endif
  }

  [[nodiscard]] const std::byte* data() const
  {
    checkAlive();
    return reinterpret_cast<const std::byte*>(bytes_);
  }
  [[nodiscard]] size_t size() const
  {
    return size_;
  }
  [[nodiscard]] bool empty() const
  {
    return size_ == 0;
  }
  [[nodiscard]] const std::byte* begin() const
  {
    return data();
  }
  [[nodiscard]] const std::byte* end() const
  {
    return data() + size_;
  }
  [[nodiscard]] std::byte operator[](size_t at) const
  {
    return data()[at];
  }
  operator std::span<const std::byte>() const // NOLINT(google-explicit-constructor): a view is a span
  {
    return {data(), size_};
  }

private:
  void checkAlive() const
  {
#if !defined(NDEBUG)
    if (state_ != nullptr && state_->fetches != fetch_)
    {
      throw std::logic_error("a payload was used after another node was read through the same ring");
    }
#endif
  }

  const uint8_t* bytes_;
  size_t size_;
#if !defined(NDEBUG)
  const detail::ReaderState* state_ = nullptr;
  uint64_t fetch_ = 0;
#endif
};

/// What a header says: shared by nodes and copies of nodes.
class HeaderView
{
public:
  HeaderView() = default;
  explicit HeaderView(const TAVHeader& header)
      : header_(header)
  {
  }

  [[nodiscard]] const TAVHeader& header() const
  {
    return header_;
  }
  /// Offset of the header's first byte in the stream.
  [[nodiscard]] uint64_t offset() const
  {
    return header_.nodeOffset;
  }
  /// Bytes of the payload; all ones in the width of the header for a group that was never closed.
  [[nodiscard]] uint64_t size() const
  {
    return layout::sizeOf(header_);
  }
  [[nodiscard]] uint16_t type() const
  {
    return layout::typeOf(header_);
  }
  [[nodiscard]] uint16_t elm() const
  {
    return layout::elmOf(header_);
  }
  [[nodiscard]] Width width() const
  {
    return layout::is64(header_) ? Width::bits64 : Width::bits32;
  }
  /// The flag bits, 0 for a 32-bit header.
  [[nodiscard]] uint32_t info() const
  {
    return layout::infoOf(header_);
  }
  [[nodiscard]] uint16_t infoKey() const
  {
    return static_cast<uint16_t>(info() & TAV_INFO_KEY_MASK);
  }
  [[nodiscard]] bool isGroup() const
  {
    return layout::isGroup(header_);
  }
  /// Whether the group was never closed.
  [[nodiscard]] bool isOpen() const
  {
    return isGroup() && layout::isSizeUnknown(header_);
  }
  /// The element's enum name, empty for an unknown id.
  [[nodiscard]] std::string_view name() const
  {
    return dictionary::nameOf(elm());
  }
  /// The element's tag name, empty for an unknown id.
  [[nodiscard]] std::string_view tag() const
  {
    return dictionary::tagOf(elm());
  }

protected:
  TAVHeader header_{};
};

/// A node with a copy of its payload: independent of the reader it came from.
class OwnedNode : public HeaderView
{
public:
  OwnedNode(const TAVHeader& header, std::vector<std::byte> bytes, bool swapped)
      : HeaderView(header), bytes_(std::move(bytes)), swapped_(swapped)
  {
  }

  [[nodiscard]] std::span<const std::byte> payload() const
  {
    return bytes_;
  }

  /// The value, as Node::as.
  template<detail::Readable T>
  [[nodiscard]] T as() const
  {
    std::error_code ec;
    T value = as<T>(ec);
    detail::demand(codeOf(ec), "reading a value");
    return value;
  }
  template<detail::Readable T>
  [[nodiscard]] T as(std::error_code& ec) const
  {
    T value{};
    const detail::RawValue raw{type(), detail::bytesOf(bytes_.data()), bytes_.size(), swapped_};
    ec = makeError(isGroup() ? TAV_RC_NOT_SUPPORTED : detail::decode(raw, value));
    return value;
  }

private:
  std::vector<std::byte> bytes_;
  bool swapped_;
};

/// A node of a stream. A small value; must not outlive its reader.
class Node : public HeaderView
{
public:
  /// A node of no stream, to be assigned to.
  Node() = default;

  /// The children of a group, in order: `for (tav::Node child : node.children())`. Damage on the way throws, or ends
  /// the walk and sets `ec`. A data element has none.
  [[nodiscard]] ChildRange children(EndElements endElements = EndElements::skip) const;
  [[nodiscard]] ChildRange children(std::error_code& ec, EndElements endElements = EndElements::skip) const;

  /// All nodes below, depth first in stream order. Always ends: a step that does not lead forward in the stream is
  /// TAV_RC_OUTSIDE_PARENT.
  [[nodiscard]] DescendantRange descendants(EndElements endElements = EndElements::skip) const;
  [[nodiscard]] DescendantRange descendants(std::error_code& ec, EndElements endElements = EndElements::skip) const;

  /// The node that ends right before this one, by its eye/size pair; nothing when there is no pair.
  [[nodiscard]] std::optional<Node> previous() const
  {
    std::error_code ec;
    std::optional<Node> node = previous(ec);
    detail::demand(codeOf(ec), "reading the previous node");
    return node;
  }
  [[nodiscard]] std::optional<Node> previous(std::error_code& ec) const
  {
    TAVHeaderData reference{header_, nullptr, 0, 0};
    TAVHeaderData data{};
    uint32_t rc = TAV_RC_NOT_FOUND;
    if (offset() >= layout::kEyeSizeLength)
    {
      ++state_->fetches;
      rc = tavGetPrevNode(0, state_->handle, &reference, &data);
    }
    ec = makeError(rc == TAV_RC_NOT_FOUND ? TAV_RC_OK : rc);
    return rc == TAV_RC_OK ? std::optional(Node(*state_, data)) : std::nullopt;
  }

  /// The first node below whose path matches: tags, enum names or ids, as "host/hostName", "os/60105", "host[2]/*".
  /// Always ends. TAV_RC_BAD_PARAM for a path that is none.
  [[nodiscard]] std::optional<Node> path(std::string_view path) const;
  [[nodiscard]] std::optional<Node> path(std::string_view path, std::error_code& ec) const;
  /// All of them, in stream order.
  [[nodiscard]] std::vector<Node> all(std::string_view path) const;
  [[nodiscard]] std::vector<Node> all(std::string_view path, std::error_code& ec) const;

  /// The payload as it stands in the stream; empty for a group.
  [[nodiscard]] PayloadView payload() const
  {
    std::error_code ec;
    const PayloadView view = payload(ec);
    detail::demand(codeOf(ec), "reading a payload");
    return view;
  }
  [[nodiscard]] PayloadView payload(std::error_code& ec) const
  {
    ec = makeError(refresh());
    return {bytes_, bytes_ != nullptr ? size() : 0, state_};
  }

  /// The value in this machine's byte order. `T` must be the type's own: a sized integer, std::byte, std::string,
  /// std::string_view, tav::Utf8Text, std::vector<std::byte>, std::span<const std::byte>, std::vector<uint64_t>,
  /// tav::Uint128, tav::Sint128, TAVTimeStamp or a std::chrono::sys_time. Views live as long as payload().
  /// @throws std::system_error TAV_RC_NOT_SUPPORTED for another type, TAV_RC_OUTSIDE_PARENT for a size or a number
  ///         that does not fit
  template<detail::Readable T>
  [[nodiscard]] T as() const
  {
    T value{};
    detail::demand(decodeInto([&value](const detail::RawValue& raw) { return detail::decode(raw, value); }),
                   "reading a value");
    return value;
  }
  template<detail::Readable T>
  [[nodiscard]] T as(std::error_code& ec) const
  {
    T value{};
    ec = makeError(decodeInto([&value](const detail::RawValue& raw) { return detail::decode(raw, value); }));
    return value;
  }

  /// The number in a node of any integer type, when `T` can hold it.
  template<std::integral T>
  [[nodiscard]] T asNumber() const
  {
    std::error_code ec;
    const T number = asNumber<T>(ec);
    detail::demand(codeOf(ec), "reading a number");
    return number;
  }
  template<std::integral T>
  [[nodiscard]] T asNumber(std::error_code& ec) const
  {
    T value{};
    ec = makeError(decodeInto([&value](const detail::RawValue& raw) { return detail::decodeNumber(raw, value); }));
    return value;
  }

  /// A copy that needs no reader.
  [[nodiscard]] OwnedNode copy() const
  {
    const PayloadView view = payload();
    return {header_, std::vector<std::byte>(view.begin(), view.end()), state_->isSwapped()};
  }

private:
  friend class Reader;
  friend class ChildRange;
  friend class DescendantRange;

  Node(detail::ReaderState& state, const TAVHeaderData& data)
      : HeaderView(data.header), state_(&state), bytes_(data.pDataBuf), fetch_(state.fetches)
  {
  }

  /// Reads the payload again when the ring may have moved on since.
  uint32_t refresh() const
  {
    if (state_ == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    if (isGroup() || !state_->isBuffered() || fetch_ == state_->fetches)
    {
      return TAV_RC_OK;
    }
    TAVHeaderData again{};
    fetch_ = ++state_->fetches;
    const uint32_t rc = tavReadNodeInt(0, state_->handle, offset(), layout::is64(header_), &again);
    bytes_ = rc == TAV_RC_OK ? again.pDataBuf : nullptr;
    return rc;
  }

  template<class Decode>
  uint32_t decodeInto(Decode&& decode) const
  {
    if (isGroup())
    {
      return TAV_RC_NOT_SUPPORTED;
    }
    const uint32_t rc = refresh();
    return rc == TAV_RC_OK ? decode(detail::RawValue{type(), bytes_, size(), state_->isSwapped()}) : rc;
  }

  detail::ReaderState* state_ = nullptr;
  mutable const uint8_t* bytes_ = nullptr;
  mutable uint64_t fetch_ = 0;
};

} // namespace tav
