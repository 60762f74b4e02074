/// @file reader.hpp
/// Reading streams.
#pragma once

#include <cstdint>
#include <cstdio>
#include <new>
#include <optional>
#include <span>
#include <string_view>
#include <type_traits>
#include <vector>

#include "tav/cpp/path.hpp"
#include "tav/cpp/print.hpp"
#include "tav/cpp/roots.hpp"

namespace tav
{

namespace detail
{

/// Bytes in an object that ends with the call: a stream over them could not be read.
template<class T>
concept TemporaryBytes = !std::is_lvalue_reference_v<T> && BytesView<std::remove_cvref_t<T>> &&
                         !std::ranges::enable_borrowed_range<std::remove_cvref_t<T>>;

} // namespace detail

/// Reads one stream. Owns its handle and its file; used by one thread at a time. Move-only. Nodes must not outlive it.
class Reader
{
public:
  /// Over the caller's bytes, which outlive the reader.
  explicit Reader(std::span<const std::byte> bytes, const StreamOptions& options = {})
      : Reader()
  {
    detail::demand(openBytes(bytes, options), "opening a stream in memory");
  }
  Reader(std::span<const std::byte> bytes, const StreamOptions& options, std::error_code& ec)
      : Reader()
  {
    detail::report(openBytes(bytes, options), ec);
  }
  template<detail::TemporaryBytes T>
  // NOLINTNEXTLINE(bugprone-forwarding-reference-overload): readers are no bytes
  explicit Reader(T&& bytes, const StreamOptions& options = {}) = delete;
  template<detail::TemporaryBytes T>
  Reader(T&& bytes, const StreamOptions& options, std::error_code& ec) = delete;

  /// Over a file: mapped, or through a ring, as `options.access` says.
  explicit Reader(const FilePath& path, const StreamOptions& options = {})
      : Reader()
  {
    detail::demand(openPath(path, options), "opening for reading", [&path] { return path.text(); });
  }
  Reader(const FilePath& path, const StreamOptions& options, std::error_code& ec)
      : Reader()
  {
    detail::report(openPath(path, options), ec);
  }

  /// Over any storage, which outlives the reader.
  explicit Reader(TAVSideStorage& storage, const StreamOptions& options = {})
      : Reader()
  {
    detail::demand(open(&storage, options), "opening a storage for reading");
  }
  Reader(TAVSideStorage& storage, const StreamOptions& options, std::error_code& ec)
      : Reader()
  {
    detail::report(open(&storage, options), ec);
  }

  /// The stream's first node. TAV_RC_NO_MORE_CHILDREN for an empty stream.
  [[nodiscard]] Node root() const&
  {
    Node node;
    detail::demand(readRoot(node), "reading the first node");
    return node;
  }
  [[nodiscard]] Node root(std::error_code& ec) const& noexcept
  {
    Node node;
    detail::report(readRoot(node), ec);
    return node;
  }
  Node root() const&& = delete;
  Node root(std::error_code& ec) const&& = delete;

  /// The roots of all streams in the file, one behind another: see RootRange.
  [[nodiscard]] RootRange roots() const&
  {
    return {state_.get(), nullptr};
  }
  [[nodiscard]] RootRange roots(std::error_code& ec) const& noexcept
  {
    ec.clear();
    return {state_.get(), &ec};
  }
  RootRange roots() const&& = delete;
  RootRange roots(std::error_code& ec) const&& = delete;

  /// The node at an offset. Nothing in the stream says which header form is there.
  [[nodiscard]] Node at(uint64_t offset, Width width = Width::bits64) const&
  {
    Node node;
    detail::demand(readAt(offset, width, node), "reading a node");
    return node;
  }
  [[nodiscard]] Node at(uint64_t offset, Width width, std::error_code& ec) const& noexcept
  {
    Node node;
    detail::report(readAt(offset, width, node), ec);
    return node;
  }
  Node at(uint64_t offset, Width width = Width::bits64) const&& = delete;
  Node at(uint64_t offset, Width width, std::error_code& ec) const&& = delete;

  /// The node that ends at the next eye/size pair at or behind an offset; nothing when there is none, or when the pair
  /// leads elsewhere: it does not count the padding of an element.
  [[nodiscard]] std::optional<Node> endingAfter(uint64_t offset) const&
  {
    std::optional<Node> node;
    detail::demand(findEnding(offset, node), "searching a node by its pair");
    return node;
  }
  [[nodiscard]] std::optional<Node> endingAfter(uint64_t offset, std::error_code& ec) const& noexcept
  {
    std::optional<Node> node;
    detail::report(findEnding(offset, node), ec);
    return node;
  }
  std::optional<Node> endingAfter(uint64_t offset) const&& = delete;
  std::optional<Node> endingAfter(uint64_t offset, std::error_code& ec) const&& = delete;

  /// The first node that a path leads to, from the stream's first node, its own name first: "/system/host/hostName".
  /// See tav/path/path.hpp.
  [[nodiscard]] std::optional<Node> path(std::string_view path) const&
  {
    const std::optional<Node> node = findStraight(path);
    return node ? node : this->path(Path(path, "searching"));
  }
  [[nodiscard]] std::optional<Node> path(std::string_view path, std::error_code& ec) const&
  {
    if (std::optional<Node> node = findStraight(path))
    {
      ec.clear();
      return node;
    }
    const Path parsed(path, ec);
    return ec ? std::nullopt : this->path(parsed, ec);
  }
  [[nodiscard]] std::optional<Node> path(const Path& path) const&
  {
    std::optional<Node> node = findStraight(path.compiled());
    return node ? node : detail::firstOf(find(path));
  }
  [[nodiscard]] std::optional<Node> path(const Path& path, std::error_code& ec) const&
  {
    ec.clear();
    std::optional<Node> node = findStraight(path.compiled());
    return node ? node : detail::firstOf(find(path, ec));
  }
  std::optional<Node> path(std::string_view path) const&& = delete;
  std::optional<Node> path(std::string_view path, std::error_code& ec) const&& = delete;
  std::optional<Node> path(const Path& path) const&& = delete;
  std::optional<Node> path(const Path& path, std::error_code& ec) const&& = delete;

  /// All of them, in stream order.
  [[nodiscard]] std::vector<Node> all(std::string_view path) const&
  {
    return detail::collect(find(path));
  }
  [[nodiscard]] std::vector<Node> all(std::string_view path, std::error_code& ec) const&
  {
    return detail::collect(find(path, ec));
  }
  std::vector<Node> all(std::string_view path) const&& = delete;
  std::vector<Node> all(std::string_view path, std::error_code& ec) const&& = delete;

  /// The same one after the other, as a walk: `for (const tav::Node& host : reader.find("//host[cpuOnline > 4]"))`.
  /// Damage on the way throws, or ends the walk and sets `ec`, which outlives the range.
  [[nodiscard]] FindRange find(std::string_view path) const&
  {
    return find(Path(path, "searching"));
  }
  [[nodiscard]] FindRange find(std::string_view path, std::error_code& ec) const&
  {
    const Path parsed(path, ec);
    return ec ? FindRange() : find(parsed, ec);
  }
  [[nodiscard]] FindRange find(const Path& path) const&
  {
    detail::demand(use() == nullptr ? TAV_RC_BAD_PARAM : TAV_RC_OK, "searching", [&path] { return path.text(); });
    return {*state_, nullptr, path, nullptr};
  }
  [[nodiscard]] FindRange find(const Path& path, std::error_code& ec) const&
  {
    detail::report(use() == nullptr ? TAV_RC_BAD_PARAM : TAV_RC_OK, ec);
    return ec ? FindRange() : FindRange(*state_, nullptr, path, &ec);
  }
  FindRange find(std::string_view path) const&& = delete;
  FindRange find(std::string_view path, std::error_code& ec) const&& = delete;
  FindRange find(const Path& path) const&& = delete;
  FindRange find(const Path& path, std::error_code& ec) const&& = delete;

  /// Prints the stream to a stream of the C library, standard output when null; returns the characters. Every value
  /// that a Group can add is printed, as tavPrintSubtree does it where it can: UTF-8 texts as they are, times with
  /// their zone as ISO 8601, other types as the digits of their bytes. XML is well-formed and escaped; texts that it
  /// cannot hold are digits, with encoding="hex". TAV_RC_NO_MEMORY when there is nothing to print, as for a group
  /// without its header and what is below, and for more than 4,000 levels; KOR_RC_IO_ERROR when the stream refuses.
  uint64_t print(FILE* stream, const PrintOptions& options = {}) const
  {
    return print(stream, root(), options);
  }
  uint64_t print(FILE* stream, const PrintOptions& options, std::error_code& ec) const noexcept
  {
    const Node first = root(ec);
    return ec ? 0 : print(stream, first, options, ec);
  }
  /// Prints a node of this reader.
  uint64_t print(FILE* stream, const Node& node, const PrintOptions& options = {}) const
  {
    uint64_t characters = 0;
    detail::demand(printNode(stream, node, options, characters), "printing");
    return characters;
  }
  uint64_t print(FILE* stream, const Node& node, const PrintOptions& options, std::error_code& ec) const noexcept
  {
    uint64_t characters = 0;
    detail::report(printNode(stream, node, options, characters), ec);
    return characters;
  }

  /// Walks every node: throws, or sets `ec`, when one cannot be reached or read.
  void validate() const
  {
    detail::demand(check(), "validating a stream");
  }
  void validate(std::error_code& ec) const noexcept
  {
    detail::report(check(), ec);
  }

  /// The handle, for the plain operations. Not owned; payloads fetched before a plain operation may be gone after it.
  [[nodiscard]] TAVHandle* handle() const noexcept
  {
    if (state_ == nullptr)
    {
      return nullptr;
    }
    state_->share();
    return use();
  }

private:
  Reader()
      : state_(new detail::ReaderState)
  {
  }

  uint32_t open(TAVSideStorage* storage, const StreamOptions& options) noexcept
  {
    const uint32_t rc = detail::openHandle(storage, TAV_OPT_READ, options, state_->handle);
    if (rc == TAV_RC_OK && state_->isBuffered())
    {
      // A ring over a writable storage writes back all that it held, over what another handle has written since.
      state_->handle->pCircularBuf->storageWritable = 0;
    }
    state_->settle();
    return rc;
  }

  /// The handle for an operation of this reader; null without one.
  [[nodiscard]] TAVHandle* use() const noexcept
  {
    if (state_ == nullptr)
    {
      return nullptr;
    }
    ++state_->fetches;
    return state_->handle;
  }

  uint32_t openBytes(std::span<const std::byte> bytes, const StreamOptions& options)
  {
    static constexpr std::byte none{};
    auto* const block = const_cast<std::byte*>(bytes.empty() ? &none : bytes.data()); // reading writes nothing
    state_->owned.reset(new TAVSSMemory(block, bytes.size()));
    return open(state_->owned.get(), options);
  }

  uint32_t openPath(const FilePath& path, const StreamOptions& options)
  {
    detail::Owner<TAVSSFile> storage;
    uint32_t rc = detail::openFile(path, KOR_FILE_READ, storage);
    if (rc != TAV_RC_OK)
    {
      return rc;
    }
    if (options.access != Access::ring)
    {
      KORFileMapping& mapping = state_->mapping;
      rc = mapping.map(*storage->pFile);
      if (rc == TAV_RC_OK)
      {
        state_->readsAhead = false;
        state_->file = storage->pFile;
        state_->mapped = std::move(storage);
        return openBytes({static_cast<const std::byte*>(mapping.bytes()), static_cast<size_t>(mapping.size())},
                         options);
      }
      if (options.access == Access::mapped)
      {
        return rc;
      }
    }
    // A walk reads as fast by small pages as by large ones, and a look at one place reads less.
    constexpr uint64_t page = uint64_t{64} * 1024;
    storage->ioUnit = page;
    state_->file = storage->pFile;
    state_->owned = std::move(storage);
    return open(state_->owned.get(), options);
  }

  /// A node from a plain operation.
  template<class Operation>
  uint32_t read(Node& node, Operation&& operation) const noexcept
  {
    TAVHandle* const used = use();
    if (used == nullptr)
    {
      return TAV_RC_BAD_PARAM;
    }
    TAVHeaderData data{};
    const uint32_t rc = operation(*used, data);
    if (rc == TAV_RC_OK)
    {
      node = Node(*state_, data);
    }
    return rc;
  }

  uint32_t readRoot(Node& node) const noexcept
  {
    const uint32_t rc = read(node, [](TAVHandle& used, TAVHeaderData& data) {
      return tavGetNextChild(0, &used, nullptr, nullptr, &data);
    });
    node.isRoot_ = rc == TAV_RC_OK;
    return rc;
  }

  uint32_t readAt(uint64_t offset, Width width, Node& node) const noexcept
  {
    return read(node, [=, this](TAVHandle& used, TAVHeaderData& data) {
      const uint32_t rc = state_->goTo(offset);
      return rc != TAV_RC_OK ? rc : tavReadNodeInt(0, &used, offset, width == Width::bits64, &data);
    });
  }

  /// The node that ends with a mapped file, when its pair is the first at or behind an offset: over memory the
  /// operation does not see a pair that ends with the block.
  uint32_t readLast(uint64_t offset, Node& node) const noexcept
  {
    uint64_t eye = 0;
    uint64_t distance = 0;
    bool swapped = false;
    // It says so of an eye catcher, and of nothing else in the block, when its distance ends there.
    const uint32_t first = tavFindEyeSizeComboInt(use(), offset, 0, false, &eye, &distance, &swapped);
    const uint64_t end = state_->mapping.size();
    if (first != TAV_RC_NO_MEMORY || offset >= end)
    {
      return TAV_RC_NOT_FOUND;
    }
    TAVHeaderData behind{};
    behind.header.nodeOffset = end;
    behind.header.hdrType = TAV_HDR_64;
    const uint32_t rc = read(node, [&behind](TAVHandle& used, TAVHeaderData& data) {
      return tavGetPrevNode(0, &used, &behind, &data);
    });
    return rc == TAV_RC_OK ? rc : TAV_RC_NOT_FOUND;
  }

  uint32_t findEnding(uint64_t offset, std::optional<Node>& found) const noexcept
  {
    Node node;
    uint32_t rc = read(node, [=](TAVHandle& used, TAVHeaderData& data) {
      return tavFindNodeFromIndex(0, &used, offset, 0, &data);
    });
    if (rc == TAV_RC_NOT_FOUND && state_->mapping.size() != 0)
    {
      rc = readLast(offset, node);
    }
    if (rc == TAV_RC_OK)
    {
      found = node;
    }
    return rc == TAV_RC_NOT_FOUND ? TAV_RC_OK : rc;
  }

  /// As detail::findStraight, from the stream's first node on, by a path's text or what it was compiled to.
  template<class AnyPath>
  [[nodiscard]] std::optional<Node> findStraight(const AnyPath& path) const noexcept
  {
    Node root;
    Node found;
    const bool isFound = state_ != nullptr && state_->isFast && readRoot(root) == TAV_RC_OK &&
                         detail::findStraightFromRoot(path, root, found);
    return isFound ? std::optional(found) : std::nullopt;
  }

  uint32_t printNode(FILE* stream, const Node& node, const PrintOptions& options, uint64_t& characters) const noexcept
  {
    TAVHandle* const used = use();
    if (used == nullptr || node.state_ != state_.get())
    {
      return TAV_RC_BAD_PARAM;
    }
    try
    {
      Node start;
      const uint32_t rc = readAt(node.offset(), node.width(), start);
      return rc == TAV_RC_OK ? detail::printNode(stream != nullptr ? stream : stdout, options, start,
                                                 state_->isSwapped(), characters)
                             : rc;
    }
    catch (const std::bad_alloc&)
    {
      return TAV_RC_NO_MEMORY;
    }
  }

  uint32_t check() const noexcept
  {
    if (state_ != nullptr)
    {
      state_->walk();
    }
    Node first;
    const uint32_t rc = readRoot(first);
    TAVHeader header = first.header();
    return rc == TAV_RC_OK ? tavValidateHierarchy(0, use(), &header) : rc;
  }

  detail::Owner<detail::ReaderState> state_;
};

} // namespace tav
