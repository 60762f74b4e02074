#include "inspect/table/automaton.h"

#include <algorithm>
#include <functional>
#include <utility>

#include "inspect/walk/order.h"
#include "tav/layout.hpp"

namespace tav::inspect
{

using detail::paths::Axis;
using detail::paths::Step;

namespace
{

constexpr int kByPath = -1; ///< the rows' path says whether a node is one

uint32_t keyOf(uint16_t elm, int isRow)
{
  return static_cast<uint32_t>(isRow + 1) << 16U | elm;
}

} // namespace

/// What a node is found to be.
struct Automaton::Met
{
  Key key{};
  std::vector<Target> targets{};
  bool isRow = false;
};

Automaton::Automaton(const CompiledQuery& query)
    : query_(query), eachRoutes_(static_cast<uint32_t>(query.eachRoutes.size()))
{
  begin();
}

void Automaton::begin()
{
  Met met;
  for (uint32_t route = 0; route < eachRoutes_; ++route)
  {
    addEach(route, 0, true, met);
  }
  stateOf(std::move(met.key));
}

void Automaton::addEach(uint32_t route, uint32_t taken, bool star, Met& met) const
{
  const std::vector<Step>& steps = stepsOf(route);
  met.key.threads.push_back({0, route, taken});
  if (taken < steps.size() && steps[taken].axis == Axis::descendantOrSelf && star)
  {
    met.key.threads.push_back({0, route, ++taken});
  }
  met.isRow = met.isRow || taken == steps.size();
}

void Automaton::stepEach(const Thread& thread, uint16_t elm, Met& met) const
{
  const std::vector<Step>& steps = stepsOf(thread.route);
  const bool star = !layout::isEndElement(elm);
  if (thread.taken > 0 && steps[thread.taken - 1].axis == Axis::descendantOrSelf && star)
  {
    addEach(thread.route, thread.taken, star, met);
  }
  if (thread.taken < steps.size() && steps[thread.taken].axis == Axis::child && steps[thread.taken].matches(elm))
  {
    addEach(thread.route, thread.taken + 1, star, met);
  }
}

void Automaton::stepColumn(const Thread& thread, uint16_t elm, Met& met) const
{
  const std::vector<Step>& steps = stepsOf(thread.route);
  if (thread.taken > 0 && steps[thread.taken - 1].axis == Axis::descendantOrSelf && !layout::isEndElement(elm))
  {
    addColumn({thread.up + 1, thread.route, thread.taken}, met);
  }
  if (steps[thread.taken].axis != Axis::child || !steps[thread.taken].matches(elm))
  {
    return;
  }
  if (thread.taken + 1 == steps.size())
  {
    met.targets.push_back({thread.up + 1, query_.chains[thread.route - eachRoutes_].column});
    return;
  }
  addColumn({thread.up + 1, thread.route, thread.taken + 1}, met);
}

/// The last step is one to a child.
void Automaton::addColumn(Thread thread, Met& met) const
{
  const std::vector<Step>& steps = stepsOf(thread.route);
  met.key.threads.push_back(thread);
  for (; steps[thread.taken].axis == Axis::descendantOrSelf; ++thread.taken)
  {
    met.key.threads.push_back({thread.up, thread.route, thread.taken + 1});
  }
}

void Automaton::beginRow(Met& met) const
{
  for (uint32_t i = 0; i < query_.chains.size(); ++i)
  {
    if (query_.chains[i].steps->empty())
    {
      met.targets.push_back({0, query_.chains[i].column});
      continue;
    }
    addColumn({0, eachRoutes_ + i, 0}, met);
  }
  met.key.watched = met.key.watched || !query_.sought.empty();
}

uint32_t Automaton::makeMove(uint32_t state, uint16_t elm, int isRow)
{
  Met met;
  met.key.watched = states_[state].key->watched;
  for (const Thread& thread : states_[state].key->threads)
  {
    thread.route < eachRoutes_ ? stepEach(thread, elm, met) : stepColumn(thread, elm, met);
  }
  met.isRow = isRow == kByPath ? met.isRow : isRow != 0;
  if (met.isRow)
  {
    beginRow(met);
  }
  // Two routes of a column can lead to the same node. They stand side by side: threads are in order, routes by columns.
  const auto isSame = [](const Target& a, const Target& b) { return a.up == b.up && a.column == b.column; };
  met.targets.erase(std::unique(met.targets.begin(), met.targets.end(), isSame), met.targets.end());
  Move move{.elm = elm, .isRow = met.isRow, .targetCount = static_cast<uint32_t>(met.targets.size())};
  if (!met.targets.empty())
  {
    move.target = met.targets.front();
    move.moreTargets = static_cast<uint32_t>(targets_.size());
    targets_.insert(targets_.end(), met.targets.begin() + 1, met.targets.end());
  }
  size_ += 8 + met.targets.size();
  move.state = stateOf(std::move(met.key));
  State& from = states_[state];
  const auto place = static_cast<uint32_t>(from.moves.size());
  from.moves.push_back(move);
  from.places.emplace(keyOf(elm, isRow), place);
  return place;
}

uint32_t Automaton::stateOf(Key key)
{
  putInOrder(key.threads, std::less<>());
  key.threads.erase(std::unique(key.threads.begin(), key.threads.end()), key.threads.end());
  const auto [found, isNew] = numbers_.try_emplace(std::move(key), static_cast<uint32_t>(states_.size()));
  if (isNew)
  {
    State& state = states_.emplace_back();
    state.key = &found->first;
    const std::vector<Thread>& threads = state.key->threads;
    state.dead = threads.empty() && !state.key->watched;
    const auto goesOn = [this](const Thread& thread) {
      return thread.route < eachRoutes_ &&
             (thread.taken < stepsOf(thread.route).size() ||
              stepsOf(thread.route)[thread.taken - 1].axis == Axis::descendantOrSelf);
    };
    state.findsRows = std::any_of(threads.begin(), threads.end(), goesOn);
    state.moves.emplace_back();
    size_ += 8 + threads.size();
  }
  return found->second;
}

uint32_t Automaton::placeOf(uint32_t state, uint16_t elm, int isRow)
{
  const auto found = states_[state].places.find(keyOf(elm, isRow));
  return found != states_[state].places.end() ? found->second : makeMove(state, elm, isRow);
}

const Automaton::Move& Automaton::otherMove(uint32_t state, uint16_t elm, uint32_t& before)
{
  const uint32_t place = placeOf(state, elm, kByPath);
  states_[state].moves[before].next = place;
  before = place;
  return states_[state].moves[place];
}

const Automaton::Move& Automaton::move(uint32_t state, uint16_t elm, bool isRow)
{
  const uint32_t place = placeOf(state, elm, isRow ? 1 : 0); // which can move the states
  return states_[state].moves[place];
}

void Automaton::renew(std::span<uint32_t*> kept)
{
  std::vector<Key> keys;
  for (const uint32_t* const number : kept)
  {
    keys.push_back(*states_[*number].key);
  }
  numbers_.clear();
  states_.clear();
  targets_.clear();
  size_ = 0;
  begin();
  for (size_t i = 0; i < keys.size(); ++i)
  {
    *kept[i] = stateOf(std::move(keys[i]));
  }
}

} // namespace tav::inspect
