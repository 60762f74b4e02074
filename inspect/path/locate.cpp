#include "tav/inspect/locate.hpp"

#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

std::optional<std::string> findOffset(ByteSource& source, Walker& walker, Event& event, uint64_t offset,
                                      const Seen& seen)
{
  std::string before;
  while (walker.next(event) && event.offset <= offset)
  {
    if (seen)
    {
      seen(event);
    }
    const bool begins = event.what == What::nodeBegin;
    if (begins && event.offset == offset)
    {
      return std::nullopt;
    }
    if (begins)
    {
      before = "the node before it begins at " + hexOffset(event.offset) + ": " + walker.path(event, PathStyle::brief);
    }
    if (offset - event.offset < event.length)
    {
      return before;
    }
    if (begins && event.node.isGroup() && event.node.limit <= offset)
    {
      walker.skip();
    }
  }
  Problem problem{source.name(), offset};
  problem.sentence = "lies behind the end of the file";
  problem.code = TAV_RC_NOT_FOUND;
  problem.hint = before;
  throw Error(problem, Trouble::notFound);
}

void goToOffset(ByteSource& source, Walker& walker, Event& event, uint64_t offset, const Seen& seen)
{
  const auto before = findOffset(source, walker, event, offset, seen);
  if (before)
  {
    Problem problem{source.name(), offset};
    problem.sentence = "no node begins there";
    problem.code = TAV_RC_NOT_FOUND;
    problem.hint = *before;
    problem.remedy = Remedy::showBytes;
    throw Error(problem, Trouble::notFound);
  }
}

namespace
{

const Walker& walkerOf(const Walker& walker)
{
  return walker;
}
const Walker& walkerOf(const StreamWalk& walk)
{
  return walk.walker();
}

template<class Walk>
bool goOnToMatch(Walk& walk, PathMatcher& matcher, Event& event, const Seen& seen)
{
  while (walk.next(event))
  {
    if (seen)
    {
      seen(event);
    }
    if (event.what != What::nodeBegin)
    {
      continue;
    }
    if (matcher.matches(walkerOf(walk), event))
    {
      return true;
    }
    if (event.node.isGroup() && !matcher.reachesBelow())
    {
      walk.skip();
    }
  }
  return false;
}

} // namespace

bool goToMatch(Walker& walker, PathMatcher& matcher, Event& event, const Seen& seen)
{
  return goOnToMatch(walker, matcher, event, seen);
}

bool goToMatch(StreamWalk& walk, PathMatcher& matcher, Event& event, const Seen& seen)
{
  return goOnToMatch(walk, matcher, event, seen);
}

} // namespace tav::inspect
