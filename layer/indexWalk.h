/// The walk that an index is made of, or a part of it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <system_error>
#include <utility>
#include <vector>

#include "tav/cpp/ranges.hpp"

namespace tav::detail
{

/// A node as the walk comes by.
struct IndexSeen
{
  uint64_t offset;
  uint32_t parent; ///< its group: see IndexWalk::groups
  uint16_t elm;
  bool isWide;
  bool isGroup;
};

/// Nodes in the order of a walk, in pieces that stay where they are: of a long stream, a vector would copy more than
/// the walk reads.
class IndexSeenList
{
public:
  [[gnu::always_inline]] void push(const IndexSeen& node)
  {
    if (next_ == end_) [[unlikely]]
    {
      grow();
    }
    *next_++ = node;
  }
  [[nodiscard]] size_t size() const noexcept
  {
    return pieces_.size() * kPiece - static_cast<size_t>(end_ - next_);
  }
  void clear() noexcept
  {
    pieces_.clear();
    next_ = nullptr;
    end_ = nullptr;
  }
  /// Calls `take(node)` for each.
  template<class Take>
  void each(const Take& take) const
  {
    for (const auto& piece : pieces_)
    {
      const IndexSeen* const end = &piece == &pieces_.back() ? next_ : piece.get() + kPiece;
      for (const IndexSeen* node = piece.get(); node != end; ++node)
      {
        take(*node);
      }
    }
  }

private:
  static constexpr size_t kPiece = 4096;

  void grow()
  {
    pieces_.emplace_back(new IndexSeen[kPiece]);
    next_ = pieces_.back().get();
    end_ = next_ + kPiece;
  }

  std::vector<std::unique_ptr<IndexSeen[]>> pieces_{};
  IndexSeen* next_ = nullptr;
  IndexSeen* end_ = nullptr;
};

/// What is known of the children of a group, as the walk comes by them.
struct IndexGroup
{
  uint32_t count = 0;
  uint32_t idCount = 0; ///< of different ids, while they rise
  uint32_t first = 0;   ///< where they begin among the entries
  uint32_t next = 0;    ///< where the next of them goes
  uint16_t firstId = 0;
  uint16_t lastId = 0;
  bool rises = true;        ///< no id is smaller than that before it
  bool holdsGroups = false; ///< among them

  [[gnu::always_inline]] void see(uint16_t elm) noexcept
  {
    firstId = count == 0 ? elm : firstId;
    rises = rises && elm >= lastId;
    idCount += count == 0 || elm != lastId ? 1 : 0;
    lastId = elm;
    ++count;
  }

  /// Adds what another part of the walk has seen of the same group.
  void see(const IndexGroup& more) noexcept
  {
    if (more.count == 0)
    {
      return;
    }
    rises = rises && more.rises && more.firstId >= lastId;
    idCount += more.idCount - (count != 0 && more.firstId == lastId ? 1 : 0);
    firstId = count == 0 ? more.firstId : firstId;
    lastId = more.lastId;
    count += more.count;
    holdsGroups = holdsGroups || more.holdsGroups;
  }
};

/// Where a walk stands: at a node in the groups from the start inwards, all told by their offsets. The bytes of these
/// are all that goes on from there depends on.
struct IndexStand
{
  std::vector<uint64_t> around{};
  uint64_t offset = 0;

  bool operator==(const IndexStand&) const = default;
};

/// One part of the walk, by exact steps: from the start, or from where another part of it stands, to the first node at
/// or behind `stop`.
class IndexWalk
{
public:
  static constexpr size_t kMostNodes = ~uint32_t{0}; ///< of a part, and of all
  /// The part that begins with the start.
  IndexWalk() = default;
  explicit IndexWalk(IndexStand from)
      : from_(std::move(from))
  {
  }

  /// Walks through the part, anew if it was walked before. `start`: of the index, by a reader of the caller's thread.
  /// Throws std::bad_alloc.
  void run(const Node& start, uint64_t stop);

  /// Whether it came to the end of what is below the start, or to damage.
  [[nodiscard]] bool isAtEnd() const noexcept
  {
    return isAtEnd_;
  }
  /// Of a part that is at its end.
  [[nodiscard]] uint32_t code() const noexcept
  {
    return rc_;
  }
  /// Where it began; without groups around: at the start.
  [[nodiscard]] const IndexStand& from() const noexcept
  {
    return from_;
  }
  /// Where it stands, when it is not at its end.
  [[nodiscard]] const IndexStand& behind() const noexcept
  {
    return behind_;
  }
  /// What it knows the groups around `behind` by.
  [[nodiscard]] const std::vector<uint32_t>& open() const noexcept
  {
    return open_;
  }

  IndexSeenList seen{};
  /// Those around the part, then those in it, with what of their children is in it.
  std::vector<IndexGroup> groups{};

private:
  void begin(const Node& start);
  DescendantRange goOn(const Node& start, std::error_code& ec, uint32_t& rc) const;
  bool walk(DescendantRange& nodes, uint64_t stop, uint32_t& rc);
  void take(const Node& node, size_t depth);
  void takeElements(DescendantRange& nodes, uint64_t stop);

  IndexStand from_{};
  IndexStand behind_{};
  std::vector<uint32_t> open_{};   ///< the group around each level
  std::vector<uint64_t> places_{}; ///< of these
  uint32_t rc_ = TAV_RC_OK;
  bool isAtEnd_ = false;
};

} // namespace tav::detail
