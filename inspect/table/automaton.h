/// Where a walk stands in all plain paths of a table at once.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <span>
#include <tuple>
#include <unordered_map>
#include <vector>

#include "inspect/table/query.h"

namespace tav::inspect
{

/// What a node's element leads to, from a group in a known state. States are made as they are met; those that a group's
/// children lead to are remembered in the order in which they came, since the next group has them in the same.
class Automaton
{
public:
  /// A column that a data element has a value for: that of the row so many levels above it.
  struct Target
  {
    uint32_t up = 0;
    uint32_t column = 0;
  };

  struct Move
  {
    uint16_t elm = 0;
    bool isRow = false;
    uint32_t targetCount = 0;
    Target target{};          ///< the first
    uint32_t moreTargets = 0; ///< where the others begin
    uint32_t state = 0;       ///< of the node
    uint32_t next = 0;        ///< the move that came behind it the last time
  };

  static constexpr uint32_t kAbove = 0; ///< the state of the place above the roots

  explicit Automaton(const CompiledQuery& query);

  /// The move of a child with this element. `before` is the place of the move of the child before, or of any; the
  /// move's own place is put there.
  const Move& move(uint32_t state, uint16_t elm, uint32_t& before)
  {
    State& from = states_[state];
    const uint32_t expected = from.moves[before].next;
    if (from.moves[expected].elm == elm && expected != 0) [[likely]]
    {
      before = expected;
      return from.moves[expected];
    }
    return otherMove(state, elm, before);
  }

  /// The same for a node of which is known that it is a row, or that it is none.
  const Move& move(uint32_t state, uint16_t elm, bool isRow);

  std::span<const Target> others(const Move& move) const
  {
    return std::span(targets_).subspan(move.moreTargets, move.targetCount - 1);
  }

  /// Whether nothing below such a group is wanted.
  bool isDead(uint32_t state) const { return states_[state].dead; }
  /// Whether rows can begin below.
  bool findsRows(uint32_t state) const { return states_[state].findsRows; }

  /// Whether so much has been made that it has to be thrown away, at a place where `renew` can be called.
  bool isFull() const { return size_ > kMostSize; }
  /// Forgets all states but these, which get new numbers.
  void renew(std::span<uint32_t*> kept);

private:
  static constexpr size_t kMostSize = size_t{1} << 20U;

  /// A place in a route: so many steps of it have been taken.
  struct Thread
  {
    uint32_t up = 0;    ///< the row is so many levels above; of the rows' own routes 0
    uint32_t route = 0; ///< those of the rows come first
    uint32_t taken = 0;
    // NOLINTNEXTLINE(modernize-use-nullptr): the zero is in the comparison that the compiler makes
    auto operator<=>(const Thread&) const = default;
  };
  struct Key
  {
    std::vector<Thread> threads{};
    bool watched = false; ///< inside a row with columns that are looked up
    /// By its parts: not every standard library has the three-way comparison of vectors.
    bool operator<(const Key& other) const
    {
      return std::tie(threads, watched) < std::tie(other.threads, other.watched);
    }
  };
  struct State
  {
    const Key* key = nullptr;
    bool dead = false;
    bool findsRows = false;
    std::vector<Move> moves{}; ///< the first is none
    std::unordered_map<uint32_t, uint32_t> places{};
  };
  struct Met;

  const Move& otherMove(uint32_t state, uint16_t elm, uint32_t& before);
  uint32_t placeOf(uint32_t state, uint16_t elm, int isRow);
  uint32_t makeMove(uint32_t state, uint16_t elm, int isRow);
  uint32_t stateOf(Key key);
  void begin();
  void stepEach(const Thread& thread, uint16_t elm, Met& met) const;
  void addEach(uint32_t route, uint32_t taken, bool star, Met& met) const;
  void stepColumn(const Thread& thread, uint16_t elm, Met& met) const;
  void addColumn(Thread thread, Met& met) const;
  void beginRow(Met& met) const;

  const std::vector<detail::paths::Step>& stepsOf(uint32_t route) const
  {
    return route < eachRoutes_ ? *query_.eachRoutes[route] : *query_.chains[route - eachRoutes_].steps;
  }

  const CompiledQuery& query_;
  uint32_t eachRoutes_;
  std::map<Key, uint32_t> numbers_{};
  std::vector<State> states_{};
  std::vector<Target> targets_{};
  size_t size_ = 0;
};

} // namespace tav::inspect
