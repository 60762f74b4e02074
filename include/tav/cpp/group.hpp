/// @file group.hpp
/// Open groups of a stream that is written.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <utility>

#include "tav/cpp/encode.hpp"
#include "tav/cpp/header.hpp"
#include "tav/cpp/writerState.hpp"

namespace tav
{

/// An open group. Close it, abandon it, or let it go: its destructor closes it. Groups nest: only the innermost open
/// one takes nodes, another answers TAV_RC_BAD_PARAM, and so does a group that outlives its writer. A failure in a
/// destructor is kept: the next operation on the writer or a group of it reports it, at the latest finish(). Move-only.
class [[nodiscard]] Group
{
public:
  Group(Group&& other) noexcept
      : state_(std::move(other.state_)), level_(std::exchange(other.level_, 0)), outer_(other.outer_)
  {
  }
  Group& operator=(Group&&) = delete;
  ~Group()
  {
    if (level_ != 0 && state_->handle != nullptr)
    {
      closeForGood();
    }
  }

  /// Appends a data element whose type follows from the value's; gives its header, by which Writer::update finds it.
  template<class T>
  HeaderView add(ElementId elm, const T& value, const NodeOptions& options = {})
  {
    TAVHeaderData node;
    if (putValue(node, elm, value, options)) [[likely]]
    {
      return HeaderView(node.header);
    }
    return addElsewhere(elm, detail::kept(value), NodeOptions(options));
  }
  template<class T>
  HeaderView add(ElementId elm, const T& value, std::error_code& ec) noexcept
  {
    return add(elm, value, NodeOptions{}, ec);
  }
  template<class T>
  HeaderView add(ElementId elm, const T& value, const NodeOptions& options, std::error_code& ec) noexcept
  {
    TAVHeaderData node{};
    const bool isPut = putValue(node, elm, value, options);
    detail::report(isPut ? TAV_RC_OK : append(node, elm, value, options), ec);
    return HeaderView(node.header);
  }

  /// Appends an integer as a given type: `add<TAV_TYPE_UINT8>(elm, 5)`. A number that the type cannot hold is refused
  /// with TAV_RC_OUTSIDE_PARENT.
  template<uint16_t Type, class T>
  HeaderView add(ElementId elm, T value, const NodeOptions& options = {})
  {
    TAVHeaderData node;
    if (putValueAs<Type>(node, elm, value, options)) [[likely]]
    {
      return HeaderView(node.header);
    }
    return addElsewhereAs<Type>(elm, value, NodeOptions(options));
  }
  template<uint16_t Type, class T>
  HeaderView add(ElementId elm, T value, std::error_code& ec) noexcept
  {
    return add<Type>(elm, value, NodeOptions{}, ec);
  }
  template<uint16_t Type, class T>
  HeaderView add(ElementId elm, T value, const NodeOptions& options, std::error_code& ec) noexcept
  {
    TAVHeaderData node{};
    const bool isPut = putValueAs<Type>(node, elm, value, options);
    detail::report(isPut ? TAV_RC_OK : appendAs<Type>(node, elm, value, options), ec);
    return HeaderView(node.header);
  }

  /// Appends a data element of any type with its payload in this machine's byte order.
  HeaderView addRaw(uint16_t type, ElementId elm, std::span<const std::byte> payload, const NodeOptions& options = {})
  {
    TAVHeaderData node{};
    const uint32_t rc = appendRaw(node, type, elm, payload, options);
    const char* const refusal = layout::isGroupType(type) ? "the type is a group's: group() opens one" : nullptr;
    detail::demand(rc, "adding", [&] { return tell(rc, elm, options, refusal); });
    return HeaderView(node.header);
  }
  HeaderView addRaw(uint16_t type, ElementId elm, std::span<const std::byte> payload, const NodeOptions& options,
                    std::error_code& ec) noexcept
  {
    TAVHeaderData node{};
    detail::report(appendRaw(node, type, elm, payload, options), ec);
    return HeaderView(node.header);
  }

  /// Appends nodes that are encoded already, with headers of a width, byte for byte. TAV_RC_BAD_CHILD_HDR when the
  /// group takes the other width.
  void addStream(Width width, std::span<const std::byte> nodes)
  {
    detail::demand(appendStream(width, nodes), "adding encoded nodes", [this] { return tell(); });
  }
  void addStream(Width width, std::span<const std::byte> nodes, std::error_code& ec) noexcept
  {
    detail::report(appendStream(width, nodes), ec);
  }

  /// Opens a group inside.
  Group group(ElementId elm, const GroupOptions& options = {}) &
  {
    uint32_t rc = TAV_RC_OK;
    Group inner = open(state_, own(), elm, options, rc);
    detail::demand(rc, "opening the group", [&] { return tell(rc, elm, options, nullptr); });
    return inner;
  }
  Group group(ElementId elm, const GroupOptions& options, std::error_code& ec) & noexcept
  {
    uint32_t rc = TAV_RC_OK;
    Group inner = open(state_, own(), elm, options, rc);
    detail::report(rc, ec);
    return inner;
  }
  Group group(ElementId elm, std::error_code& ec) & noexcept
  {
    return group(elm, GroupOptions{}, ec);
  }
  Group group(ElementId, const GroupOptions& = {}) && = delete;
  Group group(ElementId, const GroupOptions&, std::error_code&) && = delete;
  Group group(ElementId, std::error_code&) && = delete;

  /// Closes the group; afterwards it takes nothing more. After a failure it is still open, but for a Recorder's root
  /// that is closed and cannot be synced.
  void close()
  {
    const uint32_t before = level_;
    detail::demand(end(0), "closing a group", [&] { return before == level_ ? tell() : detail::Told{}; });
  }
  void close(std::error_code& ec) noexcept
  {
    detail::report(end(0), ec);
  }

  /// Takes back the group and all in it: the next node is written in its place.
  void abandon()
  {
    detail::demand(end(1), "abandoning a group", [this] { return tell(); });
  }
  void abandon(std::error_code& ec) noexcept
  {
    detail::report(end(1), ec);
  }

  /// Whether nodes can still be added. False for a group whose opening failed.
  [[nodiscard]] bool isOpen() const noexcept
  {
    return level_ != 0 && state_->handle != nullptr;
  }

private:
  friend class Writer;

  Group(detail::WriterRef state, uint32_t level, uint32_t outer) noexcept
      : state_(std::move(state)), level_(level), outer_(outer)
  {
  }

  static Group open(const detail::WriterRef& state, uint32_t outer, ElementId elm, const GroupOptions& options,
                    uint32_t& rc) noexcept
  {
    const bool fast = state && state->fast == outer;
    rc = fast ? TAV_RC_OK : state ? state->enter(outer)
                                  : TAV_RC_BAD_PARAM;
    if (rc == TAV_RC_OK)
    {
      rc = state->openGroup(elm, options);
    }
    if (rc != TAV_RC_OK)
    {
      return Group(detail::WriterRef(nullptr), 0, 0);
    }
    state->innermost = state->depth();
    if (fast && options.children == Width::bits64)
    {
      state->goTo(state->innermost);
    }
    else
    {
      state->settle();
    }
    return Group(state, state->innermost, outer);
  }

  /// What there is to say of a failure; `refusal` is why the value itself was refused, or null.
  template<class Options>
  [[gnu::noinline, gnu::cold]] detail::Told tell(uint32_t rc, ElementId elm, const Options& options,
                                                 const char* refusal) const
  {
    return tellOf(state_, own(), rc, elm, options, refusal);
  }
  [[gnu::noinline, gnu::cold]] detail::Told tell() const
  {
    return {{}, state_ ? state_->refusal(own()) : "the group was moved from, or could not be opened"};
  }

  template<class Options>
  static detail::Told tellOf(const detail::WriterRef& state, uint32_t level, uint32_t rc, ElementId elm,
                             const Options& options, const char* refusal)
  {
    detail::Told told{detail::elementText(elm),
                      state ? state->refusal(level) : "the group was moved from, or could not be opened"};
    const bool isMisuse = rc == TAV_RC_BAD_PARAM || rc == TAV_RC_OUTSIDE_PARENT;
    if (told.sentence.empty() && isMisuse)
    {
      const char* const id = elm.isValid() ? nullptr : "ids of elements go from 0 to 65535";
      const char* const key = options.infoKey <= TAV_INFO_KEY_MASK ? nullptr : "the key does not fit 11 bits";
      const char* const sentence = id != nullptr ? id : key != nullptr ? key
                                                                       : refusal;
      told.sentence = sentence != nullptr ? sentence : "";
    }
    return told;
  }

  /// The level for the shared checks: one that no group has when this one is closed.
  [[nodiscard]] uint32_t own() const noexcept
  {
    return level_ != 0 ? level_ : detail::WriterState::kNoLevel;
  }

  [[nodiscard]] uint32_t enter(uint64_t how = 0) const noexcept
  {
    return state_ ? state_->enter(own(), how) : TAV_RC_BAD_PARAM;
  }

  /// Takes a payload to the place where the next node begins.
  struct Put
  {
    static constexpr bool isInPlace = true;

    detail::WriterState& state;
    TAVHeaderData& node;
    uint16_t elm;
    const NodeOptions& options;

    [[gnu::always_inline]] uint32_t operator()(uint16_t type, const uint8_t* bytes, uint64_t size) const noexcept
    {
      return state.put(node, type, elm, options, bytes, size);
    }
  };

  /// Appends an element in the caller's own code, without a call; false where that is not possible, or is refused.
  /// `give(write)` calls `write` with the payload.
  template<class Give>
  [[gnu::always_inline]] bool put(TAVHeaderData& node, ElementId elm, const NodeOptions& options,
                                  const Give& give) noexcept
  {
    if (!state_ || state_->here != level_ || !isPlain(elm, options) || !core::hasNeverTraced()) [[unlikely]]
    {
      return false;
    }
    return give(Put{*state_, node, elm.id(), options}) == TAV_RC_OK;
  }
  template<class T>
  [[gnu::always_inline]] bool putValue(TAVHeaderData& node, ElementId elm, const T& value,
                                       const NodeOptions& options) noexcept
  {
    if constexpr (detail::Addable<T>)
    {
      return put(node, elm, options, [&value](auto&& write) { return detail::withPayload(value, write); });
    }
    return false;
  }
  template<uint16_t Type, class T>
  [[gnu::always_inline]] bool putValueAs(TAVHeaderData& node, ElementId elm, T value,
                                         const NodeOptions& options) noexcept
  {
    if constexpr (detail::isIntegerTypeCode<Type> && StreamInteger<T>)
    {
      return put(node, elm, options, [value](auto&& write) { return detail::withPayloadAs<Type>(value, write); });
    }
    return false;
  }

  template<class T>
  [[gnu::noinline]] HeaderView addElsewhere(ElementId elm, const T& value, const NodeOptions& options)
  {
    TAVHeaderData node;
    const uint32_t rc = append(node, elm, value, options);
    detail::demand(rc, "adding", [&] { return tell(rc, elm, options, detail::refusalOf(value, rc)); });
    return HeaderView(node.header);
  }
  template<uint16_t Type, class T>
  [[gnu::noinline]] HeaderView addElsewhereAs(ElementId elm, T value, const NodeOptions& options)
  {
    TAVHeaderData node;
    const uint32_t rc = appendAs<Type>(node, elm, value, options);
    detail::demand(rc, "adding", [&] { return tell(rc, elm, options, "the number does not fit the type"); });
    return HeaderView(node.header);
  }

  template<class T>
  [[gnu::noinline]] uint32_t append(TAVHeaderData& node, ElementId elm, const T& value,
                                    const NodeOptions& options) noexcept
  {
    static_assert(detail::Addable<T>,
                  "a value of this type has no type in the stream: use a sized integer, std::byte, "
                  "text, tav::Utf8, bytes, 64-bit words, tav::Uint128, a timestamp or a system time");
    if constexpr (detail::Addable<T>)
    {
      return appendGiven(node, elm, options, [&value](auto&& write) { return detail::withPayload(value, write); });
    }
  }

  /// By the operation.
  template<class Give>
  uint32_t appendGiven(TAVHeaderData& node, ElementId elm, const NodeOptions& options, const Give& give) noexcept
  {
    const auto write = [&](uint16_t type, const uint8_t* bytes, uint64_t size) {
      return state_->appendFast(node, type, elm.id(), options, bytes, size);
    };
    const bool fast = state_ && state_->fast == level_ && isPlain(elm, options);
    return fast ? give(write) : appendSlowly(node, elm, options, give);
  }

  /// Whether there is nothing to refuse.
  [[gnu::always_inline]] static bool isPlain(ElementId elm, const NodeOptions& options) noexcept
  {
    return options.infoKey <= TAV_INFO_KEY_MASK && elm.isValid();
  }

  /// When there is something to look at before. `give(write)` calls `write` with the payload.
  template<class Give>
  [[gnu::noinline, gnu::cold]] uint32_t appendSlowly(TAVHeaderData& node, ElementId elm, const NodeOptions& options,
                                                     const Give& give) noexcept
  {
    node = {};
    uint32_t rc = enter();
    if (rc == TAV_RC_OK && !elm.isValid())
    {
      rc = TAV_RC_BAD_PARAM;
    }
    const auto write = [&](uint16_t type, const uint8_t* bytes, uint64_t size) {
      return state_->append(node, type, elm.id(), options, bytes, size);
    };
    return rc == TAV_RC_OK ? give(write) : rc;
  }

  template<uint16_t Type, class T>
  [[gnu::noinline]] uint32_t appendAs(TAVHeaderData& node, ElementId elm, T value, const NodeOptions& options) noexcept
  {
    static_assert(detail::isIntegerTypeCode<Type>, "this is not the code of an integer type: use add with a value of "
                                                   "the type, or addRaw");
    static_assert(StreamInteger<T>, "only an integer can be added as an integer type");
    if constexpr (detail::isIntegerTypeCode<Type> && StreamInteger<T>)
    {
      return appendGiven(node, elm, options,
                         [value](auto&& write) { return detail::withPayloadAs<Type>(value, write); });
    }
  }

  uint32_t appendRaw(TAVHeaderData& node, uint16_t type, ElementId elm, std::span<const std::byte> payload,
                     const NodeOptions& options) noexcept
  {
    uint32_t rc = enter();
    if (rc == TAV_RC_OK && (layout::isGroupType(type) || !elm.isValid()))
    {
      rc = TAV_RC_BAD_PARAM;
    }
    return rc == TAV_RC_OK
               ? state_->append(node, type, elm.id(), options, detail::bytesOf(payload.data()), payload.size())
               : rc;
  }

  uint32_t appendStream(Width width, std::span<const std::byte> nodes) noexcept
  {
    uint32_t rc = enter();
    if (rc == TAV_RC_OK)
    {
      rc = state_->reserve(nodes.size());
    }
    if (rc == TAV_RC_OK && !nodes.empty())
    {
      auto* const bytes = const_cast<uint8_t*>(detail::bytesOf(nodes.data())); // only read
      rc = state_->told(tavAddStream(0, state_->handle, static_cast<uint32_t>(width), bytes, nodes.size()));
    }
    return rc;
  }

  uint32_t end(uint64_t how) noexcept
  {
    const bool fast = state_ && state_->fast == level_;
    uint32_t rc = fast ? TAV_RC_OK : enter(how);
    if (rc == TAV_RC_OK)
    {
      rc = state_->endInnermost(how);
    }
    if (rc == TAV_RC_OK)
    {
      level_ = 0;
      state_->innermost = outer_;
      if (fast && outer_ != 0)
      {
        state_->goTo(outer_); // a group of 64-bit headers is in one
      }
      else
      {
        state_->settle();
        rc = outer_ == 0 && state_->watch != nullptr ? state_->watch->afterRoot() : TAV_RC_OK;
      }
    }
    return rc;
  }

  /// What can still go wrong is kept for the next call that can report it.
  void closeForGood() noexcept
  {
    detail::WriterState& state = *state_;
    const bool last = state.innermost == level_;
    const uint32_t rc = state.deferred != TAV_RC_OK ? state.deferred : end(0);
    if (rc == TAV_RC_OK)
    {
      return;
    }
    state.deferred = rc;
    if (last && level_ != 0) // what came after the closing can fail, too
    {
      ++state.orphans;
      state.innermost = outer_;
    }
    state.settle();
  }

  detail::WriterRef state_;
  uint32_t level_; ///< 1 for the root; 0 when closed
  uint32_t outer_; ///< level of the group around it
};

} // namespace tav
