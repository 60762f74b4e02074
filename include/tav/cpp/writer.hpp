/// @file writer.hpp
/// Writing streams: groups that close themselves, values by their C++ type.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <utility>

#include "tav/cpp/storage.hpp"

namespace tav
{

class Group;

/// What a data element may have beside its value.
struct NodeOptions
{
  bool eyeSize = false; ///< ends with an eye/size pair, so that it can be found from behind; 64-bit headers only
  uint32_t info = 0;    ///< further bits of `info`, a search key among them; 64-bit headers only
};

/// How a group is opened.
struct GroupOptions
{
  Width width = Width::bits64;    ///< of a root group's own header; below, the open group decides
  Width children = Width::bits64; ///< of the headers of its children; always 32-bit under a 32-bit header
  bool eyeSize = false;           ///< ends with an end element, so that it can be found from behind
  uint32_t info = 0;
};

namespace detail
{

/// What a writer and its groups share. Kept by a plain count: all of them belong to one thread.
struct WriterState
{
  uint32_t users = 1;
  TAVHandle* handle = nullptr;
  TAVSideStorage* storage = nullptr;
  std::unique_ptr<TAVSideStorage> owned;
  std::unique_ptr<GrowingBlock> block;
  uint32_t openGroups = 0;
  Width children = Width::bits64; ///< of the innermost open group
  uint32_t deferred = TAV_RC_OK;  ///< the first failure that a destructor could not report

  ~WriterState()
  {
    closeHandle();
  }

  void closeHandle()
  {
    if (handle != nullptr)
    {
      tavTermHandle(&handle);
    }
  }

  /// The failure that is to be reported before anything else.
  uint32_t takeDeferred()
  {
    return std::exchange(deferred, TAV_RC_OK);
  }

  uint32_t reserve(uint64_t bytes)
  {
    constexpr uint64_t around = 128; // header, padding, pair, an end element
    if (block == nullptr)
    {
      return TAV_RC_OK;
    }
    return layout::addChecked(bytes, around) ? block->reserve(handle, handle->streamBytes, bytes) : TAV_RC_NO_MEMORY;
  }

  /// Appends a node with the header form that the open group prescribes.
  uint32_t append(Width width, uint16_t type, uint16_t elm, uint32_t info, const uint8_t* bytes, uint64_t size)
  {
    if (handle == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    if (const uint32_t rc = takeDeferred(); rc != TAV_RC_OK)
    {
      return rc;
    }
    const bool group = layout::isGroupType(type);
    if (const uint32_t rc = reserve(group ? 0 : size); rc != TAV_RC_OK)
    {
      return rc;
    }
    static constexpr uint8_t nothing = 0;
    TAVHeaderData node;
    if (width == Width::bits64)
    {
      node.header.hdr64 = {size, info, type, elm};
      node.header.hdrType = TAV_HDR_64;
    }
    else if (!group && size > UINT32_MAX)
    {
      return TAV_RC_BAD_PARAM;
    }
    else
    {
      node.header.hdr32 = {static_cast<uint32_t>(size), type, elm};
      node.header.hdrType = TAV_HDR_32;
    }
    node.pDataBuf = group ? nullptr : const_cast<uint8_t*>(bytes != nullptr ? bytes : &nothing); // only read
    node.dataBufSize = group ? 0 : size;
    return tavAddElement(0, handle, &node);
  }
};

/// One use of the shared state.
class WriterRef
{
public:
  explicit WriterRef(WriterState* state)
      : state_(state)
  {
  }
  WriterRef(const WriterRef& other)
      : state_(other.state_)
  {
    ++state_->users;
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
      delete state_;
    }
  }

  WriterState* operator->() const
  {
    return state_;
  }
  explicit operator bool() const
  {
    return state_ != nullptr;
  }

private:
  WriterState* state_;
};

inline uint32_t infoOf(bool eyeSize, uint32_t info)
{
  return info | (eyeSize ? TAV_INFO_EYE_SIZE : 0);
}

} // namespace detail

/// An open group. Close it, abandon it, or let it go: its destructor closes it. Groups nest: only the innermost open
/// one takes nodes. A failure in a destructor is kept and comes up at the writer's next operation or its finish().
/// Move-only. A group kept past its writer answers TAV_RC_BAD_PARAM.
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
    if (level_ == 0)
    {
      return;
    }
    const uint32_t rc = end(0);
    if (state_->deferred == TAV_RC_OK && state_->handle != nullptr)
    {
      state_->deferred = rc;
    }
  }

  /// Appends a data element whose type follows from the value's.
  template<class T>
  void add(uint16_t elm, const T& value, const NodeOptions& options = {})
  {
    std::error_code ec;
    add(elm, value, options, ec);
    raiseIf(ec, "adding an element");
  }
  template<class T>
  void add(uint16_t elm, const T& value, std::error_code& ec)
  {
    add(elm, value, NodeOptions{}, ec);
  }
  template<class T>
  void add(uint16_t elm, const T& value, const NodeOptions& options, std::error_code& ec)
  {
    static_assert(detail::Addable<T>, "a value of this type has no type in the stream: use a sized integer, std::byte, "
                                      "text, tav::Utf8, bytes, 64-bit words, tav::Uint128, a timestamp or a system time");
    if constexpr (detail::Addable<T>)
    {
      ec = makeError(detail::withPayload(value, [&](uint16_t type, const uint8_t* bytes, uint64_t size) { return append(type, elm, options, bytes, size); }));
    }
  }

  /// Appends an integer as a given type: `add<TAV_TYPE_UINT8>(elm, 5)`. A number that the type cannot hold is refused
  /// with TAV_RC_OUTSIDE_PARENT.
  template<uint16_t Type, std::integral T>
  void add(uint16_t elm, T value, const NodeOptions& options = {})
  {
    std::error_code ec;
    add<Type>(elm, value, options, ec);
    raiseIf(ec, "adding an element");
  }
  template<uint16_t Type, std::integral T>
  void add(uint16_t elm, T value, const NodeOptions& options, std::error_code& ec)
  {
    using Number = detail::IntegerOf<Type>;
    static_assert(!std::is_void_v<Number>, "not the code of an integer type");
    if (!std::in_range<Number>(value))
    {
      ec = makeError(TAV_RC_OUTSIDE_PARENT);
      return;
    }
    const auto number = static_cast<Number>(value);
    ec = makeError(append(Type, elm, options, detail::bytesOf(&number), sizeof number));
  }

  /// Appends a data element of any type with its payload in this machine's byte order.
  void addRaw(uint16_t type, uint16_t elm, std::span<const std::byte> payload, const NodeOptions& options = {})
  {
    std::error_code ec;
    addRaw(type, elm, payload, options, ec);
    raiseIf(ec, "adding an element");
  }
  void addRaw(uint16_t type, uint16_t elm, std::span<const std::byte> payload, const NodeOptions& options,
              std::error_code& ec)
  {
    ec = layout::isGroupType(type)
             ? makeError(TAV_RC_BAD_PARAM)
             : makeError(append(type, elm, options, detail::bytesOf(payload.data()), payload.size()));
  }

  /// Appends nodes that are encoded already.
  void addStream(std::span<const std::byte> nodes)
  {
    std::error_code ec;
    addStream(nodes, ec);
    raiseIf(ec, "adding encoded nodes");
  }
  void addStream(std::span<const std::byte> nodes, std::error_code& ec)
  {
    uint32_t rc = check();
    if (rc == TAV_RC_OK)
    {
      rc = state_->reserve(nodes.size());
    }
    if (rc == TAV_RC_OK && !nodes.empty())
    {
      rc = tavAddStream(0, state_->handle, static_cast<uint32_t>(state_->children),
                        const_cast<uint8_t*>(detail::bytesOf(nodes.data())), nodes.size());
    }
    ec = makeError(rc);
  }

  /// Opens a group inside.
  Group group(uint16_t elm, const GroupOptions& options = {}) &
  {
    std::error_code ec;
    Group inner = group(elm, options, ec);
    raiseIf(ec, "opening a group");
    return inner;
  }
  Group group(uint16_t elm, const GroupOptions& options, std::error_code& ec) &
  {
    return open(state_, level_, state_ ? state_->children : Width::bits64, elm, options, ec);
  }
  Group group(uint16_t, const GroupOptions& = {}) && = delete;
  Group group(uint16_t, const GroupOptions&, std::error_code&) && = delete;

  /// Closes the group; afterwards it takes nothing more.
  void close()
  {
    std::error_code ec;
    close(ec);
    raiseIf(ec, "closing a group");
  }
  void close(std::error_code& ec)
  {
    ec = makeError(end(0));
  }

  /// Takes back the group and all in it: the next node is written in its place.
  void abandon()
  {
    std::error_code ec;
    abandon(ec);
    raiseIf(ec, "abandoning a group");
  }
  void abandon(std::error_code& ec)
  {
    ec = makeError(end(1));
  }

  /// Whether the group is open. A group whose opening or closing failed may still be.
  [[nodiscard]] bool isOpen() const
  {
    return level_ != 0;
  }

private:
  friend class Writer;

  Group(detail::WriterRef state, uint32_t level, Width outer)
      : state_(std::move(state)), level_(level), outer_(outer)
  {
  }

  static void raiseIf(const std::error_code& ec, const char* what)
  {
    detail::demand(codeOf(ec), what);
  }

  static Group open(const detail::WriterRef& state, uint32_t outerLevel, Width width, uint16_t elm,
                    const GroupOptions& options, std::error_code& ec)
  {
    if (!state || state->handle == nullptr || state->openGroups != outerLevel)
    {
      ec = makeError(TAV_RC_BAD_PARAM);
      return Group(detail::WriterRef(nullptr), 0, width);
    }
    const Width children = width == Width::bits32 ? Width::bits32 : options.children;
    const uint64_t unknown = width == Width::bits64 ? TAV_SIZE_UNKNOWN : layout::kSizeUnknown32;
    const uint32_t rc = state->append(width, static_cast<uint16_t>(children), elm,
                                      detail::infoOf(options.eyeSize, options.info), nullptr, unknown);
    ec = makeError(rc);
    if (rc != TAV_RC_OK)
    {
      return Group(detail::WriterRef(nullptr), 0, width);
    }
    ++state->openGroups;
    const Width outer = std::exchange(state->children, children);
    return Group(state, state->openGroups, outer);
  }

  /// Only the innermost open group takes nodes.
  [[nodiscard]] uint32_t check() const
  {
    const bool innermost = state_ && level_ != 0 && state_->handle != nullptr && state_->openGroups == level_;
    return innermost ? state_->takeDeferred() : TAV_RC_BAD_PARAM;
  }

  uint32_t append(uint16_t type, uint16_t elm, const NodeOptions& options, const uint8_t* bytes, uint64_t size)
  {
    const uint32_t rc = check();
    return rc != TAV_RC_OK ? rc
                           : state_->append(state_->children, type, elm, detail::infoOf(options.eyeSize, options.info),
                                            bytes, size);
  }

  uint32_t end(uint64_t how)
  {
    uint32_t rc = check();
    if (rc == TAV_RC_OK)
    {
      rc = state_->reserve(0);
    }
    if (rc == TAV_RC_OK)
    {
      rc = tavCloseHeader(how, state_->handle);
    }
    if (rc == TAV_RC_OK)
    {
      --state_->openGroups;
      state_->children = outer_;
      level_ = 0;
    }
    return rc;
  }

  detail::WriterRef state_;
  uint32_t level_; ///< 1 for the root; 0 when closed
  Width outer_;    ///< header form in the group outside
};

/// Writes one stream. Owns its handle, its file or its buffer; used by one thread at a time. Move-only.
/// Call finish() at the end: a writer that is merely destroyed cannot tell that its last pages could not be written.
class Writer
{
public:
  /// Into a buffer of its own that grows; see bytes().
  explicit Writer(const StreamOptions& options = {})
      : Writer(Unopened{})
  {
    detail::demand(openBuffer(options), "opening a stream in memory");
  }
  Writer(const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened{})
  {
    ec = makeError(openBuffer(options));
  }

  /// Into the caller's block, which outlives the writer. Its last byte is not used.
  explicit Writer(std::span<std::byte> block, const StreamOptions& options = {})
      : Writer(Unopened{})
  {
    detail::demand(openBlock(block, options), "opening a stream in a block");
  }
  Writer(std::span<std::byte> block, const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened{})
  {
    ec = makeError(openBlock(block, options));
  }

  /// Into a file, through a ring. An existing file is refused unless it is to be overwritten.
  explicit Writer(const std::filesystem::path& path, const FileOptions& file = {}, const StreamOptions& options = {})
      : Writer(Unopened{})
  {
    detail::demand(openPath(path, file, options), "opening a file for writing");
  }
  Writer(const std::filesystem::path& path, const FileOptions& file, const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened{})
  {
    ec = makeError(openPath(path, file, options));
  }

  /// Into any storage, which outlives the writer.
  explicit Writer(TAVSideStorage& storage, const StreamOptions& options = {})
      : Writer(Unopened{})
  {
    detail::demand(open(&storage, options), "opening a storage for writing");
  }
  Writer(TAVSideStorage& storage, const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened{})
  {
    ec = makeError(open(&storage, options));
  }

  Writer(Writer&&) noexcept = default;
  Writer& operator=(Writer&&) = delete;
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;
  ~Writer()
  {
    if (state_)
    {
      state_->closeHandle(); // groups that are still there answer errors from now on
    }
  }

  /// Opens the stream's root group. The group must not outlive the writer.
  Group group(uint16_t elm, const GroupOptions& options = {}) &
  {
    std::error_code ec;
    Group root = group(elm, options, ec);
    detail::demand(codeOf(ec), "opening a group");
    return root;
  }
  Group group(uint16_t elm, const GroupOptions& options, std::error_code& ec) &
  {
    return Group::open(state_, 0, options.width, elm, options, ec);
  }
  Group group(uint16_t, const GroupOptions& = {}) && = delete;
  Group group(uint16_t, const GroupOptions&, std::error_code&) && = delete;

  /// Ends the stream: reports what a destructor could not, and writes what a ring still holds. Groups must be closed:
  /// TAV_RC_BAD_PARAM. bytes() and size() stay.
  void finish()
  {
    std::error_code ec;
    finish(ec);
    detail::demand(codeOf(ec), "finishing a stream");
  }
  void finish(std::error_code& ec)
  {
    uint32_t rc = state_ && state_->handle != nullptr ? state_->takeDeferred() : TAV_RC_BAD_PARAM;
    if (rc == TAV_RC_OK && state_->openGroups != 0)
    {
      rc = TAV_RC_BAD_PARAM;
    }
    if (rc == TAV_RC_OK && state_->handle->pCircularBuf != nullptr)
    {
      rc = state_->handle->pCircularBuf->reset();
    }
    ec = makeError(rc);
  }

  /// Bytes of the stream so far.
  [[nodiscard]] uint64_t size() const
  {
    return state_ && state_->handle != nullptr ? state_->handle->streamBytes : 0;
  }

  /// The stream so far, when it is in memory; empty over files and storages. Valid until the next node is added.
  [[nodiscard]] std::span<const std::byte> bytes() const
  {
    const bool direct = size() != 0 && (state_->handle->options & TAV_OPT_DIRECT) != 0;
    return direct ? std::span(reinterpret_cast<const std::byte*>(state_->handle->pDirectData),
                              static_cast<size_t>(size()))
                  : std::span<const std::byte>();
  }

  /// The handle, for the plain operations. Not owned.
  [[nodiscard]] TAVHandle* handle() const
  {
    return state_ ? state_->handle : nullptr;
  }

private:
  struct Unopened
  {
  };
  explicit Writer(Unopened) : state_(new detail::WriterState) {}

  uint32_t open(TAVSideStorage* storage, const StreamOptions& options)
  {
    state_->storage = storage;
    return detail::openHandle(storage, TAV_OPT_WRITE, options, state_->handle);
  }

  uint32_t openBuffer(const StreamOptions& options)
  {
    state_->block = std::make_unique<detail::GrowingBlock>();
    const uint32_t rc = state_->block->reserve(nullptr, 0, 0);
    return rc != TAV_RC_OK ? rc : open(&state_->block->storage(), options);
  }

  uint32_t openBlock(std::span<std::byte> block, const StreamOptions& options)
  {
    state_->owned = std::make_unique<TAVSSMemory>(block.data(), block.size());
    return open(state_->owned.get(), options);
  }

  uint32_t openPath(const std::filesystem::path& path, const FileOptions& file, const StreamOptions& options)
  {
    const uint64_t existing = file.overwrite ? KOR_FILE_TRUNCATE : KOR_FILE_EXCLUSIVE;
    const uint32_t rc = detail::openFile(path, KOR_FILE_UPDATE | KOR_FILE_CREATE | existing, state_->owned);
    return rc != TAV_RC_OK ? rc : open(state_->owned.get(), options);
  }

  detail::WriterRef state_;
};

} // namespace tav
