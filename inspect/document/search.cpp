#include "inspect/document/search.h"

#include <utility>

#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

namespace
{

constexpr uint64_t kToldEvery = 4096; // nodes, of which a search tells how far it is

/// A group that says that it is empty can be one that was never closed, which only what is around it tells.
WalkStart startAt(DocumentState& state, const TAVHeader& node)
{
  const bool saysEmpty = layout::isGroup(node) && layout::sizeOf(node) == 0;
  return {.offset = node.nodeOffset,
          .wide = layout::is64(node),
          .inside = saysEmpty && state.isEmptyAt(node.nodeOffset)};
}

Form formOf(const SearchStart& start)
{
  Form form = start.form;
  form.root64 = layout::is64(start.node); // which a walk from the first byte on takes from the form
  return form;
}

/// A walk that begins at a node and ends where the group around it does at the latest, as far as that is known.
StreamWalk walkFrom(DocumentState& state, const SearchStart& start, DamageWatch::Sink told)
{
  const WalkStart begin = startAt(state, start.node);
  const uint64_t end = state.endAt(start.node.nodeOffset);
  if (end == kNoOffset)
  {
    return {*state.source, formOf(start), std::move(told), begin};
  }
  Walker::State there = Walker(*state.source, formOf(start), begin).state();
  there.frames.front().limit = end;
  return {*state.source, formOf(start), std::move(told), there, begin.offset, false};
}

} // namespace

Search::Search(DocumentState& state, std::string_view path, OnDamage onDamage)
    : Search(state, {}, false, PathMatcher(pathOf(path, state.source->dictionary())), onDamage)
{
}

Search::Search(DocumentState& state, const SearchStart& start, std::string_view path, OnDamage onDamage)
    : Search(state, start, pathOf(path, state.source->dictionary()), onDamage)
{
}

/// Most paths lead down: then the walk begins at the node.
Search::Search(DocumentState& state, const SearchStart& start, const Path& path, OnDamage onDamage)
    : Search(state, start, !PathMatcher::leavesStart(path),
             PathMatcher::leavesStart(path) ? PathMatcher(path, *state.source, start.form, start.node.nodeOffset)
                                            : PathMatcher::below(path),
             onDamage)
{
}

Search::Search(DocumentState& state, const SearchStart& start, bool isBelow, PathMatcher matcher, OnDamage onDamage)
    : state_(state), matcher_(std::move(matcher)), onDamage_(onDamage),
      walk_(isBelow ? walkFrom(state, start, [this](const PassedOver& passed) { passOver(passed); })
                    : StreamWalk(*state.source, state.recognition.form,
                                 [this](const PassedOver& passed) { passOver(passed); })),
      start_(start.node.nodeOffset), isBelow_(isBelow)
{
}

void Search::passOver(const PassedOver& passed)
{
  if (onDamage_ == OnDamage::skip)
  {
    state_.add(passed);
    return;
  }
  throw Error(Problem{.file = state_.source->name(),
                      .offset = passed.offset,
                      .path = isBelow_ ? wholePath(passed.path) : passed.path,
                      .sentence = passed.reason,
                      .code = passed.code});
}

/// A path that begins with the node where the walk does, as one that begins at the roots.
std::string Search::wholePath(const std::string& path) const
{
  const std::string start = state_.pathAt(start_, PathStyle::brief);
  const size_t below = path.find('/', 1);
  return start.empty() ? path : start + (below == std::string::npos ? "" : path.substr(below));
}

bool Search::next()
{
  while (!isDone_ && walk_.next(event_))
  {
    const bool isOuter = isBelow_ && event_.depth == 0;
    if (event_.what == What::nodeEnd && isOuter)
    {
      break; // what is behind the node is not searched
    }
    if (event_.what != What::nodeBegin)
    {
      continue;
    }
    if (++seen_ % kToldEvery == 0 && state_.told)
    {
      state_.told(event_.offset);
    }
    if (event_.depth == 0 && !isBelow_)
    {
      state_.learn(event_.offset, form());
    }
    state_.learnEnd(event_.node);
    const auto depth = static_cast<size_t>(event_.depth);
    around_.resize(depth);
    around_.push_back(event_.node.header);
    if (matcher_.matches(walk_.walker(), event_))
    {
      return true;
    }
    if (event_.node.isGroup() && !matcher_.reachesBelow())
    {
      walk_.skip();
    }
  }
  isDone_ = true;
  return false;
}

tav::Node Search::read()
{
  std::error_code ec;
  const Node& node = found();
  const tav::Node read = state_.readerOf(form()).at(node.offset(), node.is64() ? Width::bits64 : Width::bits32, ec);
  if (ec)
  {
    const uint32_t code = codeOf(ec);
    const bool isLarge = code == TAV_RC_DATA_TOO_LARGE;
    throw Error(Problem{.file = state_.source->name(),
                        .offset = node.offset(),
                        .path = walk_.walker().path(event_, PathStyle::brief),
                        .sentence = std::string(codeSentence(code)),
                        .code = code,
                        .hint = isLarge ? "DocumentOptions::ringBytes is the most that a data element can have" : ""});
  }
  return read;
}

} // namespace tav::inspect
