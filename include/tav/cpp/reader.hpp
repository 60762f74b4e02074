/// @file reader.hpp
/// Reading streams.
#pragma once

#include <cstdint>
#include <cstdio>
#include <memory>
#include <optional>
#include <span>

#include "tav/cpp/path.hpp"

namespace tav
{

/// What tav::Reader::print shows.
struct PrintOptions
{
  bool xml = false;
  bool data = true;
  bool headers = false;
  bool descriptors = false;
  bool bare = false;       ///< values alone
  bool attributes = false; ///< in XML, the key elements of groups as attributes
  bool subtree = true;     ///< all below the node, too
};

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
    ec = makeError(openBytes(bytes, options));
  }

  /// Over a file, through a ring.
  explicit Reader(const std::filesystem::path& path, const StreamOptions& options = {})
      : Reader()
  {
    detail::demand(openPath(path, options), "opening a file for reading");
  }
  Reader(const std::filesystem::path& path, const StreamOptions& options, std::error_code& ec)
      : Reader()
  {
    ec = makeError(openPath(path, options));
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
    ec = makeError(open(&storage, options));
  }

  /// The stream's first node.
  [[nodiscard]] Node root() const
  {
    std::error_code ec;
    const Node node = root(ec);
    detail::demand(codeOf(ec), "reading the first node");
    return node;
  }
  [[nodiscard]] Node root(std::error_code& ec) const
  {
    return read([this](TAVHeaderData& data) { return tavGetNextChild(0, state_->handle, nullptr, nullptr, &data); },
                ec);
  }

  /// The node at an offset. Nothing in the stream tells which header form stands there.
  [[nodiscard]] Node at(uint64_t offset, Width width = Width::bits64) const
  {
    std::error_code ec;
    const Node node = at(offset, width, ec);
    detail::demand(codeOf(ec), "reading a node");
    return node;
  }
  [[nodiscard]] Node at(uint64_t offset, Width width, std::error_code& ec) const
  {
    return read([=, this](TAVHeaderData& data) { return tavReadNodeInt(0, state_->handle, offset, width == Width::bits64, &data); }, ec);
  }

  /// The node that ends at the next eye/size pair at or behind an offset; nothing when there is none.
  [[nodiscard]] std::optional<Node> endingAfter(uint64_t offset) const
  {
    std::error_code ec;
    std::optional<Node> node = endingAfter(offset, ec);
    detail::demand(codeOf(ec), "searching a node by its pair");
    return node;
  }
  [[nodiscard]] std::optional<Node> endingAfter(uint64_t offset, std::error_code& ec) const
  {
    const Node node = read([=, this](TAVHeaderData& data) { return tavFindNodeFromIndex(0, state_->handle, offset, 0, &data); }, ec);
    const bool missing = codeOf(ec) == TAV_RC_NOT_FOUND;
    if (missing)
    {
      ec.clear();
    }
    return missing || ec ? std::nullopt : std::optional(node);
  }

  /// The first node whose path from the root, the root's own name first, matches: "/system/host/hostName".
  [[nodiscard]] std::optional<Node> path(std::string_view path) const
  {
    std::error_code ec;
    std::optional<Node> node = this->path(path, ec);
    detail::demand(codeOf(ec), "searching a path");
    return node;
  }
  [[nodiscard]] std::optional<Node> path(std::string_view path, std::error_code& ec) const
  {
    std::optional<Node> found;
    const Path parsed(path, ec);
    if (ec)
    {
      return found;
    }
    const Node first = root(ec);
    if (ec || !parsed.beginsWith(first))
    {
      return found;
    }
    const Path rest = parsed.rest();
    if (rest.empty())
    {
      return first;
    }
    rest.visitBelow(
        first,
        [&found](const Node& node) {
          found = node;
          return false;
        },
        ec);
    return found;
  }

  /// Prints a node, the first one by default, to a stream of the C library; returns the characters.
  uint64_t print(FILE* stream, const PrintOptions& options = {}) const
  {
    std::error_code ec;
    const uint64_t characters = print(stream, root(), options, ec);
    detail::demand(codeOf(ec), "printing");
    return characters;
  }
  uint64_t print(FILE* stream, const Node& node, const PrintOptions& options, std::error_code& ec) const
  {
    const std::pair<bool, uint64_t> bits[] = {
        {options.subtree, TAV_PRINT_SUBTREE}, {options.headers, TAV_PRINT_HEADERS}, {options.data, TAV_PRINT_DATA}, {options.descriptors, TAV_PRINT_DESCRIPTORS}, {options.bare, TAV_PRINT_BARE}, {options.xml, TAV_PRINT_XML}, {options.attributes, TAV_PRINT_ATTRIBUTES}};
    uint64_t all = 0;
    for (const auto& [chosen, bit] : bits)
    {
      all |= chosen ? bit : 0;
    }
    TAVHeaderData start{};
    uint32_t rc = ++state_->fetches != 0
                      ? tavReadNodeInt(0, state_->handle, node.offset(), node.width() == Width::bits64, &start)
                      : TAV_RC_OK;
    TAVPrintParam param{0, nullptr, 0, stream};
    uint64_t characters = 0;
    if (rc == TAV_RC_OK)
    {
      rc = tavPrintSubtree(all, state_->handle, &start, &param, &characters);
    }
    ec = makeError(rc);
    return characters;
  }

  /// Walks every node: throws, or sets `ec`, when one cannot be reached or read.
  void validate() const
  {
    std::error_code ec;
    validate(ec);
    detail::demand(codeOf(ec), "validating a stream");
  }
  void validate(std::error_code& ec) const
  {
    const Node first = root(ec);
    if (!ec)
    {
      TAVHeader header = first.header();
      ++state_->fetches;
      ec = makeError(tavValidateHierarchy(0, state_->handle, &header));
    }
  }

  /// The handle, for the plain operations. Not owned; payloads fetched before a plain operation may be gone after it.
  [[nodiscard]] TAVHandle* handle() const
  {
    ++state_->fetches;
    return state_->handle;
  }

private:
  Reader()
      : state_(std::make_unique<detail::ReaderState>())
  {
  }

  uint32_t open(TAVSideStorage* storage, const StreamOptions& options)
  {
    return detail::openHandle(storage, TAV_OPT_READ, options, state_->handle);
  }

  uint32_t openBytes(std::span<const std::byte> bytes, const StreamOptions& options)
  {
    auto* const block = const_cast<std::byte*>(bytes.data()); // a handle for reading writes nothing
    state_->owned = std::make_unique<TAVSSMemory>(block, bytes.size());
    return bytes.data() != nullptr ? open(state_->owned.get(), options) : TAV_RC_BAD_PARAM;
  }

  uint32_t openPath(const std::filesystem::path& path, const StreamOptions& options)
  {
    const uint32_t rc = detail::openFile(path, KOR_FILE_READ, state_->owned);
    return rc != TAV_RC_OK ? rc : open(state_->owned.get(), options);
  }

  /// A node from a plain operation.
  template<class Operation>
  Node read(Operation&& operation, std::error_code& ec) const
  {
    if (state_ == nullptr || state_->handle == nullptr)
    {
      ec = makeError(TAV_RC_BAD_PARAM);
      return {};
    }
    TAVHeaderData data{};
    ++state_->fetches;
    ec = makeError(operation(data));
    return ec ? Node() : Node(*state_, data);
  }

  std::unique_ptr<detail::ReaderState> state_;
};

} // namespace tav
