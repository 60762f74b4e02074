#include "inspect/recover/nesting.h"

namespace tav::inspect
{

using namespace tav::layout;

TAVHeader madeHeader(bool wideHeader, bool wideChildren, bool eye)
{
  TAVHeader header{};
  const uint16_t type = wideChildren ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32;
  header.hdrType = wideHeader ? TAV_HDR_64 : TAV_HDR_32;
  if (wideHeader)
  {
    header.hdr64 = {0, eye ? TAV_INFO_EYE_SIZE : 0, type, TAV_ELM_CMN_DOC_ROOT};
  }
  else
  {
    header.hdr32 = {0, type, TAV_ELM_CMN_DOC_ROOT};
  }
  return header;
}

void Nesting::open(const OpenGroup& group, const TAVHeader& header)
{
  OpenGroup inner = group;
  inner.hidden = rebuilder_.depth() >= kMostNested && hasChildren64(header) == rebuilder_.wideChildren();
  place_.enter(inner);
  if (!inner.hidden)
  {
    rebuilder_.open(header);
  }
}

bool Nesting::isTooDeep(bool wideChildren) const
{
  return rebuilder_.depth() >= kMostNested && wideChildren != rebuilder_.wideChildren();
}

/// Whether the innermost group, if it were closed now, would read as one that was never closed: a root of size 0 that
/// something follows.
bool Nesting::wouldReadAsOpen() const
{
  const OpenGroup& top = place_.top();
  return place_.depth() == 2 && !top.hidden && top.wide == form_.root64 &&
         place_.position() < place_.group(0).limit && rebuilder_.isEmpty();
}

/// Lets the innermost group take what comes behind it, up to the end of the file.
void Nesting::keepOpen()
{
  countClosed();
  place_.openTop();
}

/// A root that seemed to end too soon was right where nothing of it came back from behind its end.
void Nesting::settleClaim()
{
  OpenGroup& top = place_.top();
  if (top.claim != 0 && ledger_.keptTo() > top.claim)
  {
    countClosed();
  }
  top.claim = 0;
}

void Nesting::close()
{
  settleClaim();
  if (!place_.top().hidden)
  {
    rebuilder_.close();
  }
  place_.leave();
}

void Nesting::closeAll()
{
  while (!place_.inFile())
  {
    close();
  }
}

void Nesting::closeFinished()
{
  while (!place_.inFile() && place_.top().limit <= place_.position())
  {
    wouldReadAsOpen() ? keepOpen() : close();
  }
}

void Nesting::closeTo(size_t at, uint64_t end)
{
  while (place_.depth() > at)
  {
    OpenGroup& top = place_.top();
    if (wouldReadAsOpen()) // of a root that asks for no end element none is kept
    {
      keepOpen();
      return;
    }
    const bool right = top.claim != 0 ? top.claim == end : !top.open && top.limit == end;
    if (!right)
    {
      countClosed();
    }
    top.claim = 0;
    close();
  }
}

void Nesting::closeOpen()
{
  if (wouldReadAsOpen())
  {
    keepOpen();
    return;
  }
  countClosed();
  close();
}

/// Puts a group of its own around what has lost its own.
void Nesting::makeParent(bool wide)
{
  const uint64_t limit = place_.top().limit;
  const OpenGroup group{.start = place_.position(), .limit = limit, .wide = wide, .open = true, .counted = true};
  open(group, madeHeader(rebuilder_.wideChildren(), wide, false));
  ++ledger_.totals().made;
}

void Nesting::fit(bool wide, bool isRoot)
{
  while (wide && !place_.top().wide)
  {
    countClosed();
    close();
  }
  if (place_.top().wide != wide || (place_.inFile() && (!isRoot || ledger_.isDamaged())))
  {
    makeParent(wide);
  }
}

} // namespace tav::inspect
