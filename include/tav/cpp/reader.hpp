/// @file reader.hpp
/// Reading streams.
#pragma once

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <optional>
#include <span>
#include <string_view>
#include <type_traits>
#include <vector>

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
  bool bare = false;       ///< the value alone, of a data element; TAV_RC_BAD_PARAM for all below a group
  bool attributes = false; ///< in XML, the key elements of groups as attributes
  bool subtree = true;     ///< all below the node, too
};

namespace detail
{

/// Below a data element there is nothing, which the operation takes for misuse.
inline uint64_t printBits(const PrintOptions& options, const HeaderView& node) noexcept
{
  return (options.subtree && node.isGroup() ? TAV_PRINT_SUBTREE : 0) | (options.headers ? TAV_PRINT_HEADERS : 0) |
         (options.data ? TAV_PRINT_DATA : 0) | (options.descriptors ? TAV_PRINT_DESCRIPTORS : 0) |
         (options.bare ? TAV_PRINT_BARE : 0) | (options.xml ? TAV_PRINT_XML : 0) |
         (options.attributes ? TAV_PRINT_ATTRIBUTES : 0);
}

/// Bytes in an object that ends with the call: a stream over them could not be read.
template<class T>
concept TemporaryBytes = !std::is_lvalue_reference_v<T> && BytesView<std::remove_cvref_t<T>> &&
                         !std::ranges::borrowed_range<T>;

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
  explicit Reader(T&& bytes, const StreamOptions& options = {}) = delete;
  template<detail::TemporaryBytes T>
  Reader(T&& bytes, const StreamOptions& options, std::error_code& ec) = delete;

  /// Over a file, through a ring.
  explicit Reader(const std::filesystem::path& path, const StreamOptions& options = {})
      : Reader()
  {
    detail::demand(openPath(path, options), "opening for reading", [&path] { return detail::fileText(path); });
  }
  Reader(const std::filesystem::path& path, const StreamOptions& options, std::error_code& ec)
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

  /// The node at an offset. Nothing in the stream tells which header form stands there.
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

  /// The first node whose path from the root, the root's own name first, matches: "/system/host/hostName".
  [[nodiscard]] std::optional<Node> path(std::string_view path) const&
  {
    std::error_code ec;
    std::optional<Node> node = this->path(path, ec);
    detail::demand(codeOf(ec), "searching", [path] { return std::string(path); });
    return node;
  }
  [[nodiscard]] std::optional<Node> path(std::string_view path, std::error_code& ec) const&
  {
    std::optional<Node> found;
    const auto keep = [&found](const Node& node) {
      found = node;
      return false;
    };
    visit(path, keep, ec);
    return found;
  }
  std::optional<Node> path(std::string_view path) const&& = delete;
  std::optional<Node> path(std::string_view path, std::error_code& ec) const&& = delete;

  /// All of them, in stream order.
  [[nodiscard]] std::vector<Node> all(std::string_view path) const&
  {
    std::error_code ec;
    std::vector<Node> nodes = all(path, ec);
    detail::demand(codeOf(ec), "searching", [path] { return std::string(path); });
    return nodes;
  }
  [[nodiscard]] std::vector<Node> all(std::string_view path, std::error_code& ec) const&
  {
    std::vector<Node> found;
    const auto keep = [&found](const Node& node) {
      found.push_back(node);
      return true;
    };
    visit(path, keep, ec);
    return found;
  }
  std::vector<Node> all(std::string_view path) const&& = delete;
  std::vector<Node> all(std::string_view path, std::error_code& ec) const&& = delete;

  /// Prints the stream to a stream of the C library, standard output when null; returns the characters.
  /// TAV_RC_NO_MEMORY when there is nothing to print, as for a group without its header and what is below.
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
    state_->isQuick = false; // a plain operation can give the handle another storage
    return use();
  }

private:
  Reader()
      : state_(std::make_unique<detail::ReaderState>())
  {
  }

  uint32_t open(TAVSideStorage* storage, const StreamOptions& options) noexcept
  {
    const uint32_t rc = detail::openHandle(storage, TAV_OPT_READ, options, state_->handle);
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
    state_->owned = std::make_unique<TAVSSMemory>(block, bytes.size());
    return open(state_->owned.get(), options);
  }

  uint32_t openPath(const std::filesystem::path& path, const StreamOptions& options)
  {
    const uint32_t rc = detail::openFile(path, KOR_FILE_READ, state_->owned);
    return rc != TAV_RC_OK ? rc : open(state_->owned.get(), options);
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
    return read(node, [=](TAVHandle& used, TAVHeaderData& data) {
      return tavReadNodeInt(0, &used, offset, width == Width::bits64, &data);
    });
  }

  uint32_t findEnding(uint64_t offset, std::optional<Node>& found) const noexcept
  {
    Node node;
    const uint32_t rc = read(node, [=](TAVHandle& used, TAVHeaderData& data) {
      return tavFindNodeFromIndex(0, &used, offset, 0, &data);
    });
    if (rc == TAV_RC_OK)
    {
      found = node;
    }
    return rc == TAV_RC_NOT_FOUND ? TAV_RC_OK : rc;
  }

  /// Calls `keep(node)` for the matches of a path that begins with the root's name.
  template<class Keep>
  void visit(std::string_view path, Keep& keep, std::error_code& ec) const
  {
    const Path parsed(path, ec);
    const Node first = ec ? Node() : root(ec);
    if (ec || !parsed.beginsWith(first))
    {
      return;
    }
    const Path rest = parsed.rest();
    if (rest.empty())
    {
      keep(first);
      return;
    }
    rest.visitBelow(first, keep, ec);
  }

  uint32_t printNode(FILE* stream, const Node& node, const PrintOptions& options, uint64_t& characters) const noexcept
  {
    TAVHandle* const used = use();
    if (used == nullptr || node.state_ != state_.get())
    {
      return TAV_RC_BAD_PARAM;
    }
    TAVHeaderData start{};
    const uint32_t rc = tavReadNodeInt(0, used, node.offset(), node.width() == Width::bits64, &start);
    TAVPrintParam param{0, nullptr, 0, stream};
    return rc == TAV_RC_OK ? tavPrintSubtree(detail::printBits(options, node), used, &start, &param, &characters) : rc;
  }

  uint32_t check() const noexcept
  {
    Node first;
    const uint32_t rc = readRoot(first);
    TAVHeader header = first.header();
    return rc == TAV_RC_OK ? tavValidateHierarchy(0, use(), &header) : rc;
  }

  std::unique_ptr<detail::ReaderState> state_;
};

} // namespace tav
