/// @file index.hpp
/// An index of what lies below a node, for programs that look up many paths in one stream.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "tav/cpp/owner.hpp"
#include "tav/cpp/path.hpp"

namespace tav
{

namespace detail
{

/// What an index knows; the library has it.
class IndexTable
{
public:
  /// What a look-up gives: the nodes one after the other, until it answers false.
  struct Taker
  {
    void* to;
    bool (*take)(void* to, const Node& node);
  };

  virtual ~IndexTable() = default;
  IndexTable& operator=(const IndexTable&) = delete;

  [[nodiscard]] virtual IndexTable* copy() const = 0;
  /// Whether a path is looked up here; else it takes a walk.
  [[nodiscard]] virtual bool knows(const paths::Compiled& path) const noexcept = 0;
  virtual uint32_t find(const paths::Compiled& path, const Taker& taker) const = 0;
  [[nodiscard]] virtual size_t size() const noexcept = 0;
  [[nodiscard]] virtual size_t memory() const noexcept = 0;

protected:
  IndexTable() = default;
  IndexTable(const IndexTable&) = default;
};

/// Where a part of the walk through a node may begin: at a node in the groups from the start inwards, by their offsets.
/// One that the walk does not come by is found out.
struct IndexSeam
{
  std::span<const uint64_t> around;
  uint64_t offset;
};

/// How the walk is shared among threads, which the library has none of.
struct IndexWork
{
  std::span<const IndexSeam> seams{}; ///< by their offsets
  void* to = nullptr;
  /// Calls `piece(of, i)` for each `i` below `count`, in any order, by as many threads as there are; null: in their
  /// order, by the caller's. Returns when all have returned.
  void (*run)(void* to, size_t count, void (*piece)(void* of, size_t i), void* of) = nullptr;
};

/// The bytes that a node's reader reads, where several readers can read them at a time: in memory, or of a mapped file.
struct IndexBytes
{
  std::span<const std::byte> bytes{}; ///< empty where they cannot
  StreamOptions options{};            ///< that another reader needs, but for the root's header
};
TAV_API IndexBytes indexBytesOf(const Node& start) noexcept;

/// The first match alone; false for a path that takes a walk.
TAV_API bool findFirst(const IndexTable& table, const paths::Compiled& path, std::optional<Node>& found, uint32_t& rc);

/// Makes an index by a walk; after a failure it has what comes before the damage.
TAV_API IndexTable* makeIndex(const Node& start, uint32_t& rc);
/// The same by a walk in parts, for a node whose bytes several readers can read.
TAV_API IndexTable* makeIndex(const Node& start, const IndexWork& work, uint32_t& rc);

} // namespace detail

/// All nodes below a node, found by their ids: made by one walk, 32 bytes a node at the most. A step of a path takes
/// the same time then, however many siblings there are and whether it leads anywhere; only `*`, and a name that several
/// ids share, look at all children, and `//` at all that is below. Without `[n]` a step is tried under every node that
/// the one before has found.
///
/// Answers are those of Node::path and Node::all for the node that the index was made of. From the index come those for
/// paths of names, `*` and `//`, each step with `[n]` or without; for all others, which lead up or to the roots, ask
/// conditions, name elements that end a group, have several ways or more than 64 steps, the stream is walked from the
/// node as Node::path does.
///
/// The reader must outlive it, and the stream must stay as it is: what was added since is not found. The header of what
/// is found is read anew; where another id is there by now, a look-up answers TAV_RC_OUTSIDE_PARENT. Look-ups read
/// through the reader: they are for one thread at a time, as it is.
class Index
{
public:
  /// @throws std::system_error for what a walk finds damaged, TAV_RC_NO_MEMORY for more than 4,294,967,294 nodes
  explicit Index(const Node& start)
      : start_(start)
  {
    uint32_t rc = TAV_RC_OK;
    table_.reset(detail::makeIndex(start, rc));
    detail::demand(rc, "indexing", [&start] { return detail::placeText(start); });
  }
  /// With an error the index holds what comes before the damage.
  Index(const Node& start, std::error_code& ec)
      : start_(start)
  {
    uint32_t rc = TAV_RC_OK;
    table_.reset(detail::makeIndex(start, rc));
    detail::report(rc, ec);
  }
  /// The same as of one walk, from a walk in parts: see tav::inspect::indexOf, which has threads for them.
  Index(const Node& start, const detail::IndexWork& work)
      : start_(start)
  {
    uint32_t rc = TAV_RC_OK;
    table_.reset(detail::makeIndex(start, work, rc));
    detail::demand(rc, "indexing", [&start] { return detail::placeText(start); });
  }
  Index(const Node& start, const detail::IndexWork& work, std::error_code& ec)
      : start_(start)
  {
    uint32_t rc = TAV_RC_OK;
    table_.reset(detail::makeIndex(start, work, rc));
    detail::report(rc, ec);
  }
  Index(const Index& other)
      : start_(other.start_), table_(other.table_->copy())
  {
  }
  Index(Index&&) noexcept = default;
  Index& operator=(Index other) noexcept
  {
    start_ = other.start_;
    table_ = std::move(other.table_);
    return *this;
  }
  ~Index() = default;

  /// The first node whose path matches.
  [[nodiscard]] std::optional<Node> find(std::string_view path) const
  {
    return find(Path(path));
  }
  [[nodiscard]] std::optional<Node> find(std::string_view path, std::error_code& ec) const
  {
    const Path parsed(path, ec);
    return ec ? std::nullopt : find(parsed, ec);
  }
  [[nodiscard]] std::optional<Node> find(const Path& path) const
  {
    std::optional<Node> found;
    uint32_t rc = TAV_RC_OK;
    if (!detail::findFirst(*table_, path.compiled(), found, rc)) [[unlikely]]
    {
      found = start_.path(path);
    }
    detail::demand(rc, "looking up a path");
    return found;
  }
  [[nodiscard]] std::optional<Node> find(const Path& path, std::error_code& ec) const
  {
    std::optional<Node> found;
    uint32_t rc = TAV_RC_OK;
    if (!detail::findFirst(*table_, path.compiled(), found, rc)) [[unlikely]]
    {
      return start_.path(path, ec);
    }
    detail::report(rc, ec);
    return found;
  }

  /// All of them, in stream order.
  [[nodiscard]] std::vector<Node> findAll(std::string_view path) const
  {
    return findAll(Path(path));
  }
  [[nodiscard]] std::vector<Node> findAll(std::string_view path, std::error_code& ec) const
  {
    const Path parsed(path, ec);
    return ec ? std::vector<Node>() : findAll(parsed, ec);
  }
  [[nodiscard]] std::vector<Node> findAll(const Path& path) const
  {
    if (!table_->knows(path.compiled()))
    {
      return start_.all(path);
    }
    std::vector<Node> found;
    detail::demand(findEvery(path, found), "looking up a path");
    return found;
  }
  [[nodiscard]] std::vector<Node> findAll(const Path& path, std::error_code& ec) const
  {
    if (!table_->knows(path.compiled()))
    {
      return start_.all(path, ec);
    }
    std::vector<Node> found;
    detail::report(findEvery(path, found), ec);
    return found;
  }

  /// Nodes in the index.
  [[nodiscard]] size_t size() const noexcept
  {
    return table_->size();
  }
  /// Bytes of memory that it takes.
  [[nodiscard]] size_t memory() const noexcept
  {
    return table_->memory();
  }

private:
  uint32_t findEvery(const Path& path, std::vector<Node>& found) const
  {
    const auto take = [](void* to, const Node& node) {
      static_cast<std::vector<Node>*>(to)->push_back(node);
      return true;
    };
    const uint32_t rc = table_->find(path.compiled(), {&found, take});
    if (rc != TAV_RC_OK)
    {
      found.clear();
    }
    return rc;
  }

  Node start_;
  detail::Owner<detail::IndexTable> table_;
};

} // namespace tav
