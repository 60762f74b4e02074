/// @file updater.hpp
/// Values of streams that are complete, changed in place.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "tav/cpp/encode.hpp"
#include "tav/cpp/header.hpp"
#include "tav/cpp/storage.hpp"
#include "tav/cpp/writerState.hpp"

namespace tav
{

namespace detail
{

/// Overwrites the payload of a data element. TAV_RC_NOT_SUPPORTED for a value of another type than the node's,
/// TAV_RC_OUTSIDE_PARENT for one of another size.
template<class T>
uint32_t updateValue(TAVHandle* handle, const HeaderView& node, const T& value) noexcept
{
  static_assert(Addable<T>, "a value of this type has no type in the stream");
  if constexpr (Addable<T>)
  {
    const auto write = [&](uint16_t type, const uint8_t* bytes, uint64_t size) {
      if (type != node.type())
      {
        return TAV_RC_NOT_SUPPORTED;
      }
      if (size != node.size())
      {
        return TAV_RC_OUTSIDE_PARENT;
      }
      TAVHeaderData data{node.header(), const_cast<uint8_t*>(bytes), size, 0}; // only read
      const uint32_t rc = tavUpdateElement(0, handle, &data);
      return rc == TAV_RC_OK ? rc : causeOf(rc, handle);
    };
    return handle != nullptr ? withPayloadFor(node.type(), value, write) : TAV_RC_BAD_PARAM;
  }
}

/// What there is to say of an update that was refused.
template<Addable T>
[[gnu::noinline, gnu::cold]] Told tellUpdate(uint32_t rc, const HeaderView& node, const T& value)
{
  Told told{nodeText(node), {}};
  static_cast<void>(withPayloadFor(node.type(), value, [&](uint16_t type, const uint8_t*, uint64_t size) {
    if (rc == TAV_RC_NOT_SUPPORTED)
    {
      told.sentence = "the node is " + typeText(node.type()) + ", the value " + typeText(type);
    }
    if (rc == TAV_RC_OUTSIDE_PARENT)
    {
      told.sentence = "the node has " + std::to_string(node.size()) + " bytes, the value " + std::to_string(size);
    }
    return TAV_RC_OK;
  }));
  if (told.sentence.empty() && rc == TAV_RC_BAD_PARAM)
  {
    told.sentence = "the stream has no such node";
  }
  if (const char* const refusal = refusalOf(value, rc); refusal != nullptr)
  {
    told.sentence = refusal;
  }
  return told;
}

} // namespace detail

/// Changes values in a stream that exists: find a node with a Reader of the same stream, with the same options, and
/// give its new value. Type and size stay. Used by one thread at a time. Move-only.
class Updater
{
public:
  /// In the caller's block, which outlives the updater. Readers of the block see a change at once.
  explicit Updater(std::span<std::byte> block, const StreamOptions& options = {})
  {
    detail::demand(openBlock(block, options), "opening a block for updating");
  }
  Updater(std::span<std::byte> block, const StreamOptions& options, std::error_code& ec)
  {
    detail::report(openBlock(block, options), ec);
  }

  /// In a file, through a ring: a change is in the file after finish(), and a reader that has a ring of its own may
  /// show the old value until it is opened again. An element larger than the ring gives TAV_RC_DATA_TOO_LARGE.
  /// A file that a writer has locked is refused with KOR_RC_LOCKED; of the file options `lock` counts.
  explicit Updater(const FilePath& path, const StreamOptions& options = {}, const FileOptions& file = {})
  {
    const detail::FileOutcome opened = openPath(path, options, file);
    detail::demand(opened.code, "opening for updating", [&] { return detail::tellFile(path, opened); });
  }
  Updater(const FilePath& path, const StreamOptions& options, std::error_code& ec)
      : Updater(path, options, FileOptions{}, ec)
  {
  }
  Updater(const FilePath& path, const StreamOptions& options, const FileOptions& file,
          std::error_code& ec)
  {
    detail::report(openPath(path, options, file).code, ec);
  }

  /// In any storage, which outlives the updater.
  explicit Updater(TAVSideStorage& storage, const StreamOptions& options = {})
  {
    detail::demand(open(&storage, options), "opening a storage for updating");
  }
  Updater(TAVSideStorage& storage, const StreamOptions& options, std::error_code& ec)
  {
    detail::report(open(&storage, options), ec);
  }

  Updater(Updater&& other) noexcept
      : owned_(std::move(other.owned_)), handle_(std::exchange(other.handle_, nullptr))
  {
  }
  Updater& operator=(Updater&& other) noexcept
  {
    Updater taken(std::move(other));
    std::swap(owned_, taken.owned_);
    std::swap(handle_, taken.handle_);
    return *this;
  }
  ~Updater()
  {
    if (handle_ != nullptr)
    {
      tavTermHandle(&handle_);
    }
  }

  /// Gives a data element a new value, of the same type and size: TAV_RC_NOT_SUPPORTED for another type,
  /// TAV_RC_OUTSIDE_PARENT for another size, TAV_RC_BAD_PARAM when the stream does not have this node.
  template<class T>
  void update(const HeaderView& node, const T& value)
  {
    const uint32_t rc = detail::updateValue(handle_, node, value);
    detail::demand(rc, "updating", [&] { return detail::tellUpdate(rc, node, value); });
  }
  template<class T>
  void update(const HeaderView& node, const T& value, std::error_code& ec) noexcept
  {
    detail::report(detail::updateValue(handle_, node, value), ec);
  }

  /// Writes what a ring still holds. Changes can go on.
  void finish()
  {
    detail::demand(flush(), "finishing updates");
  }
  void finish(std::error_code& ec) noexcept
  {
    detail::report(flush(), ec);
  }

private:
  /// Update mode is for direct memory; through a ring the writing mode does the same.
  uint32_t open(TAVSideStorage* storage, const StreamOptions& options) noexcept
  {
    const bool direct = storage->hasAttributes(TAV_ATTR_DIRECT);
    return detail::openHandle(storage, direct ? TAV_OPT_UPDATE : TAV_OPT_WRITE, options, handle_);
  }

  uint32_t openBlock(std::span<std::byte> block, const StreamOptions& options)
  {
    owned_.reset(new TAVSSMemory(block.data(), block.size()));
    return block.empty() ? TAV_RC_BAD_PARAM : open(owned_.get(), options);
  }

  detail::FileOutcome openPath(const FilePath& path, const StreamOptions& options,
                               const FileOptions& file)
  {
    detail::Owner<TAVSSFile> storage;
    const detail::FileOutcome opened = detail::openLocked(path, KOR_FILE_UPDATE, file.lock, storage);
    owned_ = std::move(storage);
    return opened.code != TAV_RC_OK ? opened : detail::FileOutcome{open(owned_.get(), options)};
  }

  uint32_t flush() noexcept
  {
    if (handle_ == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    return handle_->pCircularBuf != nullptr ? handle_->pCircularBuf->reset() : TAV_RC_OK;
  }

  detail::Owner<TAVSideStorage> owned_;
  TAVHandle* handle_ = nullptr;
};

} // namespace tav
