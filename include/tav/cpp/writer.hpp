/// @file writer.hpp
/// Writing streams: groups that close themselves, values by their C++ type.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <utility>

#include "tav/cpp/append.hpp"
#include "tav/cpp/durable.hpp"
#include "tav/cpp/group.hpp"
#include "tav/cpp/updater.hpp"

namespace tav
{

namespace detail
{
// NOLINTNEXTLINE(cppcoreguidelines-virtual-class-destructor): as where it is defined
class Recording;
} // namespace detail

/// Writes one stream. Owns its handle, its file or its buffer; used by one thread at a time. Move-only.
/// Call finish() at the end: a writer that is merely destroyed cannot tell that its last pages could not be written.
class Writer
{
public:
  /// Into a buffer of its own that grows; see bytes().
  explicit Writer(const StreamOptions& options = {})
      : Writer(Unopened::state)
  {
    detail::demand(openBuffer(options), "opening a stream in memory");
  }
  Writer(const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened::state)
  {
    detail::report(openBuffer(options), ec);
  }

  /// Into the caller's block, which outlives the writer. Its last byte is not used.
  explicit Writer(std::span<std::byte> block, const StreamOptions& options = {})
      : Writer(Unopened::state)
  {
    detail::demand(openBlock(block, options), "opening a stream in a block");
  }
  Writer(std::span<std::byte> block, const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened::state)
  {
    detail::report(openBlock(block, options), ec);
  }

  /// Into a file, through a ring. An existing file is refused unless it is to be overwritten, and one that another
  /// writer has locked with KOR_RC_LOCKED. Until finish() a file that is overwritten stays as it is: the stream is
  /// written beside it, and takes its place, its mode and, where that is allowed, its owner. See FileOptions.
  /// With FileOptions::append it goes on behind the last stream of an existing file, in that file's form: options that
  /// are given must agree with it. A file of another form, a damaged one or one that is no stream is refused, and stays
  /// as it is. See docs/producers.md for what is looked at, and what that costs.
  explicit Writer(const FilePath& path, const FileOptions& file = {})
      : Writer(Unopened::state)
  {
    demandPath(path, file, nullptr);
  }
  explicit Writer(const FilePath& path, const FileOptions& file, const StreamOptions& options)
      : Writer(Unopened::state)
  {
    demandPath(path, file, &options);
  }
  Writer(const FilePath& path, const FileOptions& file, std::error_code& ec)
      : Writer(Unopened::state)
  {
    detail::report(openPath(path, file, nullptr).code, ec);
  }
  Writer(const FilePath& path, const FileOptions& file, const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened::state)
  {
    detail::report(openPath(path, file, &options).code, ec);
  }

  /// Into any storage, which outlives the writer.
  explicit Writer(TAVSideStorage& storage, const StreamOptions& options = {})
      : Writer(Unopened::state)
  {
    detail::demand(open(&storage, options), "opening a storage for writing");
  }
  Writer(TAVSideStorage& storage, const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened::state)
  {
    detail::report(open(&storage, options), ec);
  }

  Writer(Writer&&) noexcept = default;
  Writer& operator=(Writer&& other) noexcept
  {
    Writer former(std::move(*this)); // ends here, with its handle
    state_ = std::move(other.state_);
    isResumed_ = other.isResumed_;
    isAppended_ = other.isAppended_;
    canShrink_ = other.canShrink_;
    durable_ = std::move(other.durable_);
    return *this;
  }
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;
  ~Writer()
  {
    if (state_)
    {
      state_->letGo(); // groups that are still there answer errors from now on
    }
  }

  /// Opens the stream's root group, with the header form of StreamOptions::root.
  Group group(ElementId elm, const GroupOptions& options = {}) &
  {
    uint32_t rc = TAV_RC_OK;
    Group root = Group::open(state_, 0, elm, options, rc);
    detail::demand(rc, "opening the group", [&] { return Group::tellOf(state_, 0, rc, elm, options, nullptr); });
    return root;
  }
  Group group(ElementId elm, const GroupOptions& options, std::error_code& ec) & noexcept
  {
    uint32_t rc = TAV_RC_OK;
    Group root = Group::open(state_, 0, elm, options, rc);
    detail::report(rc, ec);
    return root;
  }
  Group group(ElementId elm, std::error_code& ec) & noexcept
  {
    return group(elm, GroupOptions{}, ec);
  }
  /// The root that OpenRoot::resume found open, to go on in it; a closed group when there is none. Without this call it
  /// is closed by the next group() or by finish().
  Group resumed() & noexcept
  {
    const bool isThere = isResumed_ && state_ && state_->handle != nullptr && state_->orphans == 1;
    isResumed_ = false;
    if (!isThere || state_->innermost != 0)
    {
      return Group(detail::WriterRef(nullptr), 0, 0);
    }
    state_->orphans = 0;
    state_->innermost = 1;
    state_->settle();
    return Group(state_, 1, 0);
  }
  Group resumed() && = delete;

  Group group(ElementId, const GroupOptions& = {}) && = delete;
  Group group(ElementId, const GroupOptions&, std::error_code&) && = delete;
  Group group(ElementId, std::error_code&) && = delete;

  /// Gives a data element of this stream another value, of the same type and size: what Updater::update does.
  template<class T>
  void update(const HeaderView& node, const T& value)
  {
    TAVHandle* const handle = state_ ? state_->handle : nullptr;
    const uint32_t rc = detail::updateValue(handle, node, value);
    detail::demand(rc, "updating", [&] { return detail::tellUpdate(rc, node, value); });
  }
  template<class T>
  void update(const HeaderView& node, const T& value, std::error_code& ec) noexcept
  {
    detail::report(detail::updateValue(state_ ? state_->handle : nullptr, node, value), ec);
  }

  /// Returns when the system has all nodes that were added so far, also in groups that are open: they outlive this
  /// process, but not the machine. What a destructor could not report comes up here, too.
  void flush()
  {
    detail::demand(pushOut(), "flushing a stream", [this] { return tellPushing(); });
  }
  void flush(std::error_code& ec) noexcept
  {
    detail::report(pushOut(), ec);
  }

  /// Returns when the device has all nodes that were added so far, and the name of a file that is new. From then on
  /// `tav recover` brings them back whatever becomes of the machine; those in closed groups are read without it.
  /// TAV_RC_NOT_SUPPORTED where there is no file. After a failure all further ones fail. See docs/producers.md.
  void sync()
  {
    const uint32_t rc = makeDurable();
    detail::demand(rc, "syncing a stream", [&] {
      detail::Told told = tellPushing();
      told.sentence = told.sentence.empty() ? durable_.refusal(rc) : told.sentence;
      return told;
    });
  }
  void sync(std::error_code& ec) noexcept
  {
    detail::report(makeDurable(), ec);
  }

  /// Ends the stream: reports what a destructor could not, writes what a ring still holds, and lets the storage go;
  /// a file is closed. TAV_RC_BAD_PARAM while a group is open. bytes() and size() stay; nothing more can be written.
  /// After a failure it can be called again, and after a success it does nothing.
  void finish()
  {
    detail::demand(end(), "finishing a stream", [this] {
      return detail::Told{{}, state_ ? state_->refusal(0) : "the writer was moved from"};
    });
  }
  void finish(std::error_code& ec)
  {
    detail::report(end(), ec);
  }

  /// Bytes of the stream so far.
  [[nodiscard]] uint64_t size() const noexcept
  {
    if (!state_)
    {
      return 0;
    }
    return state_->handle != nullptr ? state_->handle->streamBytes : state_->finishedSize;
  }

  /// The stream so far, when it is in memory; empty over files and storages. Valid until the next node is added.
  [[nodiscard]] std::span<const std::byte> bytes() const& noexcept
  {
    return state_ ? state_->bytes() : std::span<const std::byte>();
  }
  std::span<const std::byte> bytes() const&& = delete;

  /// The handle, for the plain operations; null after finish(). Not owned.
  [[nodiscard]] TAVHandle* handle() const noexcept
  {
    if (!state_)
    {
      return nullptr;
    }
    state_->share();
    return state_->handle;
  }

private:
  friend class detail::Recording;

  enum class Unopened : uint8_t
  {
    state
  };
  explicit Writer(Unopened)
      : state_(new detail::WriterState)
  {
  }

  uint32_t open(TAVSideStorage* storage, const StreamOptions& options) noexcept
  {
    state_->root = options.root;
    const uint32_t rc = detail::openHandle(storage, TAV_OPT_WRITE, options, state_->handle);
    if (rc == TAV_RC_OK)
    {
      state_->lookAtHandle();
    }
    return rc;
  }

  uint32_t openBuffer(const StreamOptions& options)
  {
    state_->block.reset(new detail::GrowingBlock);
    const uint32_t rc = state_->block->reserve(nullptr, 0, 0);
    if (rc == TAV_RC_OK && options.align8)
    {
      state_->block->clearGaps(0);
    }
    return rc != TAV_RC_OK ? rc : open(&state_->block->storage(), options);
  }

  uint32_t openBlock(std::span<std::byte> block, const StreamOptions& options)
  {
    state_->owned.reset(new TAVSSMemory(block.data(), block.size()));
    return block.empty() ? TAV_RC_BAD_PARAM : open(state_->owned.get(), options);
  }

  void demandPath(const FilePath& path, const FileOptions& file, const StreamOptions* options)
  {
    const detail::FileOutcome opened = openPath(path, file, options);
    detail::demand(opened.code, "opening for writing", [&] { return detail::tellFile(path, opened); });
  }

  /// Behind the last stream of a file.
  detail::FileOutcome openEnd(const FilePath& path, const FileOptions& file, const StreamOptions* given)
  {
    detail::Owner<TAVSSFile> storage;
    detail::FileEnd found = detail::openToAppend(path, file, given, storage);
    state_->owned = std::move(storage);
    if (found.outcome.code != TAV_RC_OK)
    {
      return found.outcome;
    }
    StreamOptions options = given != nullptr ? *given : StreamOptions{};
    options.byteOrder = found.form.swapped ? ByteOrder::swapped : ByteOrder::native;
    options.root = found.form.wide ? Width::bits64 : Width::bits32;
    options.align8 = found.form.aligned;
    found.outcome.code = open(state_->owned.get(), options);
    isResumed_ = file.openRoot == OpenRoot::resume && !found.open.empty();
    if (found.outcome.code == TAV_RC_OK)
    {
      found.outcome.code = detail::continueAt(*state_->handle, found, isResumed_ ? 1 : 0);
    }
    if (found.outcome.code != TAV_RC_OK)
    {
      state_->letGo();
      return found.outcome;
    }
    state_->orphans = isResumed_ ? 1 : 0;
    isAppended_ = true;
    durable_.name(path);
    return found.outcome;
  }

  detail::FileOutcome openPath(const FilePath& path, const FileOptions& file, const StreamOptions* given)
  {
    if (file.append)
    {
      return openEnd(path, file, given);
    }
    const StreamOptions options = given != nullptr ? *given : StreamOptions{};
    detail::Owner<TAVSSFile> storage;
    const detail::FileOutcome opened = detail::openForWriting(path, file, storage, state_->replacement);
    state_->owned = std::move(storage);
    if (state_->replacement == nullptr)
    {
      durable_.name(path);
    }
    canShrink_ = !korIsDevice(path.c_str());
    return opened.code != TAV_RC_OK ? opened : detail::FileOutcome{open(state_->owned.get(), options)};
  }

  uint32_t pushOut() noexcept
  {
    if (!state_ || state_->handle == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    detail::WriterState& state = *state_;
    state.toldDeferred = state.deferred != TAV_RC_OK;
    if (state.toldDeferred)
    {
      const uint32_t rc = std::exchange(state.deferred, TAV_RC_OK);
      state.settle();
      return rc;
    }
    return state.handle->pCircularBuf != nullptr ? state.handle->pCircularBuf->reset() : TAV_RC_OK;
  }

  uint32_t makeDurable() noexcept
  {
    const uint32_t rc = pushOut();
    return rc == TAV_RC_OK ? durable_.sync(*state_->handle->pSideStorage) : rc;
  }

  [[nodiscard]] detail::Told tellPushing() const
  {
    const bool isGone = !state_ || state_->handle == nullptr || state_->toldDeferred;
    return {{}, !isGone ? "" : state_ ? state_->refusal(0)
                                      : "the writer was moved from"};
  }

  uint32_t end()
  {
    if (!state_)
    {
      return TAV_RC_BAD_PARAM;
    }
    if (state_->handle == nullptr)
    {
      return state_->isFinished ? takePlace() : TAV_RC_BAD_PARAM;
    }
    uint32_t rc = state_->enter(0);
    if (rc == TAV_RC_OK && state_->handle->pCircularBuf != nullptr)
    {
      rc = state_->handle->pCircularBuf->reset(); // tavTermHandle would hide a failure
    }
    if (rc == TAV_RC_OK && (isAppended_ || (state_->tookBack && canShrink_)))
    {
      rc = static_cast<TAVSSFile&>(*state_->owned).pFile->setSize(state_->handle->streamBytes);
    }
    if (rc == TAV_RC_OK && state_->replacement != nullptr)
    {
      rc = state_->replacement->prepare(static_cast<TAVSSFile&>(*state_->owned));
    }
    return rc == TAV_RC_OK ? letGo() : rc;
  }

  /// Closes the handle and the file.
  uint32_t letGo()
  {
    detail::WriterState& state = *state_;
    state.finished = state.bytes();
    state.finishedSize = state.handle->streamBytes;
    state.isFinished = true;
    state.closeHandle();
    if (state.owned == nullptr || state.owned->kind != TAV_STORAGE_FILE)
    {
      return TAV_RC_OK;
    }
    state.unclosed = static_cast<TAVSSFile&>(*state.owned).pFile->close();
    state.owned.reset();
    return takePlace();
  }

  /// The file that was written beside another one takes its place; one whose last bytes are lost does not.
  uint32_t takePlace()
  {
    detail::WriterState& state = *state_;
    if (state.unclosed != TAV_RC_OK || state.replacement == nullptr)
    {
      return state.replacement == nullptr ? std::exchange(state.unclosed, TAV_RC_OK) : state.unclosed;
    }
    const uint32_t rc = state.replacement->commit();
    if (rc == TAV_RC_OK)
    {
      state.replacement.reset();
    }
    return rc;
  }

  detail::WriterRef state_;
  bool isResumed_ = false;
  bool isAppended_ = false; ///< to a file, which ends with the stream
  bool canShrink_ = false;  ///< a file that was opened by its path, and no device
  detail::Durable durable_;
};

} // namespace tav
