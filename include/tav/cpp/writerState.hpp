/// @file writerState.hpp
/// What a writer and its groups share.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <utility>

#include "tav/core/append.hpp"
#include "tav/cpp/header.hpp"
#include "tav/cpp/storage.hpp"

namespace tav
{

/// What a data element may have beside its value. Nodes with 32-bit headers have none of it.
struct NodeOptions
{
  bool eyeSize = false; ///< ends with an eye/size pair, so that it can be found from behind
  uint32_t info = 0;    ///< further bits of `info`; whether a payload is padded is the writer's to say
  uint16_t infoKey = 0; ///< a search key of 11 bits, in `info`
};

/// How a group is opened. Its own header has the form that the open group, or StreamOptions::root, asks for.
struct GroupOptions
{
  Width children = Width::bits64; ///< of the headers of its children; always 32-bit under a 32-bit header
  bool eyeSize = false;           ///< ends with an end element, to be found from behind; 64-bit headers only
  uint32_t info = 0;              ///< as in NodeOptions
  uint16_t infoKey = 0;           ///< as in NodeOptions
};

namespace detail
{

template<class Options>
uint32_t infoOf(const Options& options) noexcept
{
  return (options.info & ~TAV_INFO_ALIGNED8) | options.infoKey | (options.eyeSize ? TAV_INFO_EYE_SIZE : 0);
}

/// The code of an operation, or what made it refuse: through a ring a small write whose page could not be brought in
/// answers TAV_RC_BAD_PARAM, and the ring knows why.
[[gnu::noinline, gnu::cold]] inline uint32_t causeOf(uint32_t code, const TAVHandle* handle) noexcept
{
  const bool canTell = handle != nullptr && handle->pCircularBuf != nullptr;
  const uint32_t cause = canTell ? handle->pCircularBuf->takeWriteFailure() : TAV_RC_OK;
  return code == TAV_RC_BAD_PARAM && cause != TAV_RC_OK ? cause : code;
}

/// Who is asked before anything is done in an open group, and told when a root is closed. What they answer is what the
/// operation does.
class Watch
{
public:
  virtual uint32_t beforeAdding() noexcept = 0;
  virtual uint32_t afterRoot() noexcept = 0;

protected:
  Watch() = default;
  Watch(const Watch&) = default;
  Watch& operator=(const Watch&) = default;
  ~Watch() = default;
};

/// Kept by a plain count: a writer and its groups belong to one thread.
struct WriterState
{
  static constexpr uint32_t kNoLevel = ~uint32_t{0}; ///< that no group has

  uint32_t users = 1;
  TAVHandle* handle = nullptr;
  Owner<Replacement> replacement; ///< a file that stays until the stream is complete
  Owner<TAVSideStorage> owned;
  Owner<GrowingBlock> block;
  Width root = Width::bits64;
  InPlace inPlace = InPlace::no;       ///< of the handle
  uint32_t here = kNoLevel;            ///< level of a group that takes data elements in place
  uint32_t fast = kNoLevel;            ///< level of a group that takes 64-bit nodes without a further look
  uint32_t innermost = 0;              ///< level of the innermost Group that is there and open; 1 for the root
  uint32_t orphans = 0;                ///< groups inside it that are still open, their Group objects gone
  uint32_t deferred = TAV_RC_OK;       ///< the first failure that a destructor could not report
  bool toldDeferred = false;           ///< the last operation has reported it
  std::span<const std::byte> finished; ///< the stream, when it was in memory, after its end
  uint64_t finishedSize = 0;
  bool isFinished = false;
  uint32_t unclosed = TAV_RC_OK; ///< what closing the file answered
  Watch* watch = nullptr;        ///< then nothing takes the fast way
  bool tookBack = false;         ///< a group: in a file bytes of it can stand behind the stream
  bool isShared = false;         ///< the handle was given away: plain operations can open and close groups

  WriterState() = default;
  WriterState(const WriterState&) = delete;
  WriterState& operator=(const WriterState&) = delete;
  ~WriterState()
  {
    closeHandle();
  }

  void closeHandle() noexcept
  {
    if (handle != nullptr)
    {
      tavTermHandle(&handle);
    }
    settle();
  }

  /// The end of a writer that was not finished: of a file that was to be replaced nothing is left but the old one.
  void letGo() noexcept
  {
    closeHandle();
    owned.reset();
    replacement.reset();
  }

  /// After whatever `enter` and `width` look at has changed: nodes are added by the dozen in between.
  void settle() noexcept
  {
    const bool plain =
        handle != nullptr && !isShared && deferred == TAV_RC_OK && orphans == 0 && innermost != 0 && watch == nullptr;
    const bool wide = plain && depth() == innermost && width() == Width::bits64;
    here = wide && inPlace != InPlace::no ? innermost : kNoLevel;
    fast = wide && block == nullptr ? innermost : kNoLevel;
  }

  /// The fast level is another one.
  void goTo(uint32_t level) noexcept
  {
    here = inPlace != InPlace::no ? level : kNoLevel;
    fast = level;
  }

  /// After opening.
  void lookAtHandle() noexcept
  {
    inPlace = BlockInPlace::canWrite(*handle)  ? InPlace::block
              : RingInPlace::canWrite(*handle) ? InPlace::ring
                                               : InPlace::no;
  }

  /// The handle is given away: plain operations can do what this does not know.
  void share() noexcept
  {
    if (handle != nullptr && block != nullptr && !isShared)
    {
      block->clearGaps(handle->streamBytes);
    }
    isShared = true;
    settle();
  }

  /// Groups that are open in the stream.
  [[nodiscard]] uint32_t depth() const noexcept
  {
    return handle->pHdrStack->count;
  }

  /// The header form that the innermost open group prescribes.
  [[nodiscard]] Width width() const noexcept
  {
    const TAVHdrStack& stack = *handle->pHdrStack;
    const bool wide = stack.count == 0 ? root == Width::bits64 : layout::hasChildren64(stack.pEntries[stack.count - 1]);
    return wide ? Width::bits64 : Width::bits32;
  }

  [[nodiscard]] std::span<const std::byte> bytes() const noexcept
  {
    const bool direct = handle != nullptr && (handle->options & TAV_OPT_DIRECT) != 0 && handle->streamBytes != 0;
    return direct ? std::span(reinterpret_cast<const std::byte*>(handle->pDirectData),
                              static_cast<size_t>(handle->streamBytes))
                  : finished;
  }

  /// What is before every operation on the group at a level; 0 stands for the stream. What a destructor could not
  /// report comes first; then groups that a destructor could not end are ended, in the way in which this one is.
  uint32_t enter(uint32_t level, uint64_t how = 0) noexcept
  {
    toldDeferred = deferred != TAV_RC_OK;
    if (handle == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    if (toldDeferred) [[unlikely]]
    {
      const uint32_t rc = std::exchange(deferred, TAV_RC_OK);
      settle();
      return rc;
    }
    if (innermost != level || depth() != level + orphans) [[unlikely]]
    {
      return TAV_RC_BAD_PARAM;
    }
    while (orphans != 0) [[unlikely]]
      {
        if (const uint32_t rc = endInnermost(how); rc != TAV_RC_OK)
        {
          return rc;
        }
        --orphans;
        settle();
      }
    return watch != nullptr && level != 0 ? watch->beforeAdding() : TAV_RC_OK;
  }

  /// Why `enter` has refused an operation on the group at a level, or on the stream; empty when it has not.
  [[nodiscard]] std::string refusal(uint32_t level) const
  {
    if (handle == nullptr)
    {
      return isFinished ? "the stream is finished" : "the writer is gone";
    }
    if (toldDeferred)
    {
      return "a group that went out of scope before could not be closed";
    }
    if (level == kNoLevel)
    {
      return "the group is closed";
    }
    if (depth() < level + orphans)
    {
      return "groups were closed by plain operations";
    }
    if (innermost == level && depth() == level + orphans)
    {
      return {};
    }
    const TAVHdrStack& stack = *handle->pHdrStack;
    const std::string open = placeText(HeaderView(stack.pEntries[stack.count - 1]));
    const uint32_t others = depth() - level - 1;
    return "the group " + open + (others == 0 ? "" : " and " + std::to_string(others) + " around it") +
           (level == 0 ? "" : ", inside it,") + (others == 0 ? " is" : " are") + " still open";
  }

  uint32_t reserve(uint64_t bytes) noexcept
  {
    constexpr uint64_t around = 128; // header, padding, pair, an end element
    if (block == nullptr)
    {
      return TAV_RC_OK;
    }
    return layout::addChecked(bytes, around) ? block->reserve(handle, handle->streamBytes, bytes) : TAV_RC_NO_MEMORY;
  }

  /// Appends a data element in place; kNotHere where that is not possible.
  [[gnu::always_inline]] uint32_t put(TAVHeaderData& node, uint16_t type, uint16_t elm, const NodeOptions& options,
                                      const uint8_t* bytes, uint64_t size) noexcept
  {
    const layout::HeaderFields fields{size, infoOf(options), type, elm};
    if ((fields.info & TAV_INFO_EYE_SIZE) != 0) [[unlikely]]
    {
      return core::kNotHere;
    }
    layout::setHeader(fields, true, node.header);
    node.pDataBuf = const_cast<uint8_t*>(bytes); // only read
    TAVHandle& used = *handle;
    if (inPlace == InPlace::block) [[likely]]
    {
      return core::appendElement<true>(BlockInPlace(used), used, node, fields);
    }
    return core::appendElement<true>(RingInPlace(used), used, node, fields);
  }

  /// Appends a data element to the group of the fast way.
  [[gnu::always_inline]] uint32_t appendFast(TAVHeaderData& node, uint16_t type, uint16_t elm,
                                             const NodeOptions& options, const uint8_t* bytes,
                                             uint64_t size) noexcept
  {
    static constexpr uint8_t nothing = 0;
    fillHeader(node, true, type, elm, infoOf(options), size);
    node.pDataBuf = const_cast<uint8_t*>(bytes != nullptr ? bytes : &nothing); // only read
    node.dataBufSize = size;
    return told(tavAddElement(0, handle, &node));
  }

  /// Appends a data element with the header form that the open group prescribes.
  uint32_t append(TAVHeaderData& node, uint16_t type, uint16_t elm, const NodeOptions& options, const uint8_t* bytes,
                  uint64_t size) noexcept
  {
    const bool wide = width() == Width::bits64;
    if (options.infoKey > TAV_INFO_KEY_MASK || (!wide && size >= layout::kSizeUnknown32))
    {
      return TAV_RC_BAD_PARAM;
    }
    if (const uint32_t rc = reserve(size); rc != TAV_RC_OK)
    {
      return rc;
    }
    static constexpr uint8_t nothing = 0;
    fillHeader(node, wide, type, elm, infoOf(options), size);
    node.pDataBuf = const_cast<uint8_t*>(bytes != nullptr ? bytes : &nothing); // only read
    node.dataBufSize = size;
    return told(tavAddElement(0, handle, &node));
  }

  /// Opens a group of unknown size.
  uint32_t openGroup(ElementId elm, const GroupOptions& options) noexcept
  {
    if (options.infoKey > TAV_INFO_KEY_MASK || !elm.isValid())
    {
      return TAV_RC_BAD_PARAM;
    }
    if (const uint32_t rc = reserve(0); rc != TAV_RC_OK)
    {
      return rc;
    }
    const bool wide = fast != kNoLevel || width() == Width::bits64;
    const auto type = static_cast<uint16_t>(wide ? options.children : Width::bits32);
    TAVHeaderData node{};
    fillHeader(node, wide, type, elm.id(), infoOf(options), wide ? TAV_SIZE_UNKNOWN : layout::kSizeUnknown32);
    const uint64_t start = handle->streamBytes;
    const uint32_t rc = told(tavAddElement(0, handle, &node));
    if (rc != TAV_RC_OK)
    {
      handle->streamBytes = start; // a group that is nested too deeply has left its header
    }
    return rc;
  }

  /// Closes (0) or abandons (1) the innermost open group.
  uint32_t endInnermost(uint64_t how) noexcept
  {
    const uint64_t end = handle->streamBytes;
    uint32_t rc = reserve(0);
    if (rc == TAV_RC_OK)
    {
      rc = told(endGroup(*handle, how));
      tookBack = tookBack || (rc == TAV_RC_OK && how != 0);
    }
    if (rc == TAV_RC_OK && block != nullptr && handle->streamBytes < end)
    {
      block->takeBack(handle->streamBytes, end);
    }
    return rc;
  }

  /// tavCloseHeader, with the size by which it does what is wanted here. Of a group whose size is not known it would
  /// keep it to itself that the size could not be written; a group that is taken back has none again.
  static uint32_t endGroup(TAVHandle& of, uint64_t how) noexcept
  {
    const TAVHdrStack& stack = *of.pHdrStack;
    if (stack.count != 0)
    {
      TAVHeader& group = stack.pEntries[stack.count - 1];
      if (layout::is64(group))
      {
        group.hdr64.size = how == 0 ? 0 : TAV_SIZE_UNKNOWN;
      }
      else
      {
        group.hdr32.size = how == 0 ? 0 : layout::kSizeUnknown32;
      }
    }
    return tavCloseHeader(how, &of);
  }

  /// The code of a plain operation, and the cause where the code hides it.
  [[gnu::always_inline]] uint32_t told(uint32_t code) const noexcept
  {
    return code == TAV_RC_OK ? code : causeOf(code, handle);
  }

  static void fillHeader(TAVHeaderData& node, bool wide, uint16_t type, uint16_t elm, uint32_t info,
                         uint64_t size) noexcept
  {
    if (wide)
    {
      node.header.hdr64 = {size, info, type, elm};
      node.header.hdrType = TAV_HDR_64;
      return;
    }
    node.header.hdr32 = {static_cast<uint32_t>(size), type, elm};
    node.header.hdrType = TAV_HDR_32;
  }
};

/// One use of the shared state.
class WriterRef
{
public:
  explicit WriterRef(WriterState* state) noexcept
      : state_(state)
  {
  }
  WriterRef(const WriterRef& other) noexcept
      : state_(other.state_)
  {
    if (state_ != nullptr)
    {
      ++state_->users;
    }
  }
  WriterRef(WriterRef&& other) noexcept
      : state_(std::exchange(other.state_, nullptr))
  {
  }
  WriterRef& operator=(WriterRef other) noexcept
  {
    std::swap(state_, other.state_);
    return *this;
  }
  ~WriterRef()
  {
    if (state_ != nullptr && --state_->users == 0)
    {
      destroy(state_);
    }
  }

  WriterState& operator*() const noexcept
  {
    return *state_;
  }
  WriterState* operator->() const noexcept
  {
    return state_;
  }
  explicit operator bool() const noexcept
  {
    return state_ != nullptr;
  }

private:
  /// Out of line: optimisers that lose count of the users warn of a use behind it.
  [[gnu::noinline]] static void destroy(WriterState* state) noexcept
  {
    delete state;
  }

  WriterState* state_;
};

} // namespace detail

} // namespace tav
