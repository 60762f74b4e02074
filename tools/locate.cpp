#include "tools/locate.h"

#include "tools/report.h"

namespace tav::tool
{

void goToOffset(ByteSource& source, Walker& walker, Event& event, uint64_t offset)
{
  std::string around;
  while (walker.next(event) && event.offset <= offset)
  {
    if (event.what != What::nodeBegin)
    {
      continue;
    }
    if (event.offset == offset)
    {
      return;
    }
    around = "the node before it begins at " + hexOffset(event.offset) + ": " + walker.path(event);
    if (event.node.isGroup() && event.node.limit <= offset)
    {
      walker.skip();
    }
  }
  Problem problem{source.name(), offset};
  problem.sentence = offset < source.size() ? "no node begins there" : "lies behind the end of the file";
  problem.code = TAV_RC_NOT_FOUND;
  problem.hint = around;
  throw Failure(kFindings, problem);
}

bool goToMatch(Walker& walker, PathMatcher& matcher, Event& event)
{
  while (walker.next(event))
  {
    if (event.what != What::nodeBegin)
    {
      continue;
    }
    if (matcher.matches(event.node))
    {
      return true;
    }
    if (event.node.isGroup() && !matcher.reachesBelow())
    {
      walker.skip();
    }
  }
  return false;
}

} // namespace tav::tool
