/// @file writer.hpp
/// Writing streams: groups that close themselves, values by their C++ type.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <span>
#include <utility>

#include "tav/cpp/group.hpp"
#include "tav/cpp/updater.hpp"

namespace tav
{

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

  /// Into a file, through a ring. An existing file is refused unless it is to be overwritten.
  explicit Writer(const std::filesystem::path& path, const FileOptions& file = {}, const StreamOptions& options = {})
      : Writer(Unopened::state)
  {
    detail::demand(openPath(path, file, options), "opening for writing", [&path] { return detail::fileText(path); });
  }
  Writer(const std::filesystem::path& path, const FileOptions& file, const StreamOptions& options, std::error_code& ec)
      : Writer(Unopened::state)
  {
    detail::report(openPath(path, file, options), ec);
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
    return *this;
  }
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;
  ~Writer()
  {
    if (state_)
    {
      state_->closeHandle(); // groups that are still there answer errors from now on
    }
  }

  /// Opens the stream's root group, with the header form of StreamOptions::root.
  Group group(uint16_t elm, const GroupOptions& options = {}) &
  {
    uint32_t rc = TAV_RC_OK;
    Group root = Group::open(state_, 0, elm, options, rc);
    detail::demand(rc, "opening the group", [elm] { return detail::elementText(elm); });
    return root;
  }
  Group group(uint16_t elm, const GroupOptions& options, std::error_code& ec) & noexcept
  {
    uint32_t rc = TAV_RC_OK;
    Group root = Group::open(state_, 0, elm, options, rc);
    detail::report(rc, ec);
    return root;
  }
  Group group(uint16_t elm, std::error_code& ec) & noexcept
  {
    return group(elm, GroupOptions{}, ec);
  }
  Group group(uint16_t, const GroupOptions& = {}) && = delete;
  Group group(uint16_t, const GroupOptions&, std::error_code&) && = delete;
  Group group(uint16_t, std::error_code&) && = delete;

  /// Gives a data element of this stream another value, of the same type and size: what Updater::update does.
  template<class T>
  void update(const HeaderView& node, const T& value)
  {
    TAVHandle* const handle = state_ ? state_->handle : nullptr;
    detail::demand(detail::updateValue(handle, node, value), "updating", [&node] { return detail::nodeText(node); });
  }
  template<class T>
  void update(const HeaderView& node, const T& value, std::error_code& ec) noexcept
  {
    detail::report(detail::updateValue(state_ ? state_->handle : nullptr, node, value), ec);
  }

  /// Ends the stream: reports what a destructor could not, writes what a ring still holds, and lets the storage go;
  /// a file is closed. TAV_RC_BAD_PARAM while a group is open. bytes() and size() stay; nothing more can be written.
  /// After a failure it can be called again, and after a success it does nothing.
  void finish()
  {
    detail::demand(end(), "finishing a stream");
  }
  void finish(std::error_code& ec) noexcept
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
    state_->isShared = true;
    state_->settle();
    return state_->handle;
  }

private:
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
    return block.empty() ? TAV_RC_BAD_PARAM : open(state_->owned.get(), options);
  }

  uint32_t openPath(const std::filesystem::path& path, const FileOptions& file, const StreamOptions& options)
  {
    const uint64_t existing = file.overwrite ? KOR_FILE_TRUNCATE : KOR_FILE_EXCLUSIVE;
    const uint32_t rc = detail::openFile(path, KOR_FILE_UPDATE | KOR_FILE_CREATE | existing, state_->owned);
    return rc != TAV_RC_OK ? rc : open(state_->owned.get(), options);
  }

  uint32_t end() noexcept
  {
    if (!state_)
    {
      return TAV_RC_BAD_PARAM;
    }
    if (state_->handle == nullptr)
    {
      return state_->isFinished ? TAV_RC_OK : TAV_RC_BAD_PARAM;
    }
    uint32_t rc = state_->enter(0);
    if (rc == TAV_RC_OK && state_->handle->pCircularBuf != nullptr)
    {
      rc = state_->handle->pCircularBuf->reset(); // tavTermHandle would hide a failure
    }
    return rc == TAV_RC_OK ? letGo() : rc;
  }

  /// Closes the handle and the file.
  uint32_t letGo() noexcept
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
    const uint32_t rc = static_cast<TAVSSFile&>(*state.owned).pFile->close();
    state.owned.reset();
    return rc;
  }

  detail::WriterRef state_;
};

} // namespace tav
