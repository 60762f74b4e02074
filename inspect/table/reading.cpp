#include "inspect/table/reading.h"

#include <utility>

#include "inspect/table/cut.h"
#include "inspect/text/bytes.h"

namespace tav::inspect
{

TableReading::TableReading(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options)
    : source_(source), query_(query), sought_(query.compiled().sought), options_(options), matcher_(compiled().each),
      filling_(compiled()), exact_(told_),
      walk_(
          source, form, [this](const PassedOver& passed) { passOver(passed); }, options.start),
      line_(1), known_(sought_.size()), begin_(options.start.offset)
{
  tree_.source = &source;
  tree_.looks = true;
}

TableReading::TableReading(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options,
                           const Walker::State& state, uint64_t streamOffset)
    : source_(source), query_(query), sought_(query.compiled().sought), options_(options), matcher_(compiled().each),
      filling_(compiled()), exact_(told_),
      walk_(
          source, form, [this](const PassedOver& passed) { passOver(passed); }, state, streamOffset, true),
      line_(1), known_(sought_.size())
{
  tree_.source = &source;
  tree_.looks = true;
  for (const Event& group : groupsAround(state))
  {
    walk_.see(group);
    filling_.enter(Automaton::Move(filling_.meet(group.node.elm())));
  }
}

void TableReading::confineTo(const Part& part, const Walker::State& state)
{
  if (!stateAtCut(filling_.automaton(), compiled(), state))
  {
    throw Error(Problem{.file = source_.name(),
                        .offset = part.offset,
                        .sentence = "a table of these rows cannot be cut here",
                        .code = TAV_RC_BAD_PARAM});
  }
  options_.end = ~uint64_t{0};
  knowsPaths_ = part.offset == 0;
  partEnd_ = part.end();
}

std::shared_ptr<TableChunk> TableReading::take()
{
  std::fill(known_.begin(), known_.end(), Known{});
  return filling_.take();
}

void TableReading::passOver(const PassedOver& passed)
{
  if (options_.onDamage == OnDamage::skip)
  {
    options_.passedOver ? options_.passedOver(passed) : void();
  }
  else if (!stopped_)
  {
    stopped_ = Problem{.file = source_.name(),
                       .offset = passed.offset,
                       .path = knowsPaths_ ? passed.path : std::string(),
                       .sentence = passed.reason,
                       .code = passed.code};
  }
}

bool TableReading::isBehindPart() const
{
  const Walker& walker = walk_.walker();
  return walker.place() >= partEnd_ && partEnd_ < source_.size() && walker.isBetween() && !filling_.hasOpenRows() &&
         (walker.depth() == 0 || cutsInGroups(compiled()));
}

bool TableReading::step()
{
  if (done_ || isBehindPart())
  {
    return false;
  }
  done_ = true; // unless it goes on
  const bool more = walk_.next(event_);
  if (stopped_)
  {
    dropped_ = filling_.dropOpenRows();
    return false;
  }
  if (!more)
  {
    return false;
  }
  if (event_.what == What::nodeEnd)
  {
    filling_.leaveTo(static_cast<size_t>(event_.depth));
  }
  else if (event_.what == What::nodeBegin)
  {
    if (event_.depth == 0 && event_.offset >= options_.end)
    {
      return false;
    }
    begin();
  }
  done_ = false;
  return true;
}

void TableReading::begin()
{
  const Node& node = event_.node;
  filling_.tidy();
  const Automaton::Move move =
      compiled().eachIsPlain
          ? filling_.meet(node.elm())
          : filling_.automaton().move(filling_.top().state, node.elm(), matcher_.matches(walk_.walker(), event_));
  if (!sought_.empty())
  {
    tree_.form = walk_.form();
    line_.resize(static_cast<size_t>(event_.depth) + 1);
    line_.push_back(tree_.placeOf(walk_.walker(), event_));
  }
  const size_t row = filling_.chunk().rows(); // if it is one
  node.isGroup() ? static_cast<void>(filling_.enter(move)) : takeData(move);
  if (move.isRow)
  {
    seek(row);
  }
  if (node.isGroup())
  {
    goBelow(move.state);
  }
}

void TableReading::takeData(const Automaton::Move& move)
{
  if (move.isRow || move.targetCount != 0)
  {
    const RawCell value = valueOf(event_.node);
    // Of a size that suits its type, or of another one: as bytes.
    const bool suits = layout::typeInfo(value.type).known && sizeSuits(value.type, value.size);
    filling_.data(move, suits ? value : RawCell{TAV_TYPE_BINARY, value.bytes, value.size, false});
  }
}

RawCell TableReading::valueOf(const Node& node)
{
  const uint64_t size = std::min(node.size(), node.limit - std::min(node.limit, node.payloadOffset()));
  buffer_.resize(lengthInMemory(source_, node.payloadOffset(), std::min(size, source_.size())));
  buffer_.resize(source_.read(node.payloadOffset(), buffer_));
  return {node.type(), buffer_.data(), buffer_.size(), walk_.form().swapped};
}

void TableReading::goBelow(uint32_t state)
{
  const bool findsRows = compiled().eachIsPlain ? filling_.automaton().findsRows(state) : matcher_.reachesBelow();
  if (!findsRows && filling_.automaton().isDead(state))
  {
    walk_.skip();
    return;
  }
  const bool rowsAreSteps = compiled().eachIsPlain && sought_.empty();
  if (!options_.onlyWalker && (rowsAreSteps || !findsRows))
  {
    goThrough();
  }
}

void TableReading::goThrough()
{
  const Node& node = event_.node;
  const uint64_t size = node.limit - node.offset();
  const bool fails = node.offset() <= failed_ && failed_ < node.limit;
  const bool isCut = node.limit > partEnd_ && partEnd_ < source_.size();
  if (node.has(kOpen) || node.has(kOverrun) || size > mostAtOnce(options_) || fails || isCut ||
      node.offset() < notBefore_)
  {
    return;
  }
  const std::span<const uint8_t> bytes = bytesOf(node.offset(), size);
  while (!tryExact(bytes) && exact_.expectMore())
  {
  }
}

bool TableReading::tryExact(std::span<const uint8_t> bytes)
{
  const Node& node = event_.node;
  TableChunk& chunk = filling_.chunk();
  const TableChunk::Mark mark = chunk.mark();
  const bool done = exact_.through(bytes, walk_.form(), node.is64());
  if (done && walk_.skip())
  {
    chunk.forgetMark();
    return true;
  }
  failed_ = done ? failed_ : node.offset() + exact_.reached();
  notBefore_ = done ? node.limit : notBefore_;
  filling_.leaveTo(static_cast<size_t>(event_.depth) + 1);
  chunk.goBack(mark);
  return done;
}

std::span<const uint8_t> TableReading::bytesOf(uint64_t offset, uint64_t size)
{
  if (source_.isMemory())
  {
    return source_.view(offset).first(static_cast<size_t>(size));
  }
  buffer_.resize(static_cast<size_t>(size));
  buffer_.resize(source_.read(offset, buffer_));
  return buffer_;
}

void TableReading::seek(size_t row)
{
  for (size_t i = 0; i < sought_.size(); ++i)
  {
    const SoughtColumn& sought = sought_[i];
    if (sought.bound == 0)
    {
      search(sought, row);
      continue;
    }
    if (line_.size() <= sought.bound + 1)
    {
      continue; // above the roots is nothing
    }
    const uint64_t from = line_[line_.size() - 1 - sought.bound].node.offset();
    if (known_[i].offset == from)
    {
      filling_.chunk().copy(sought.column, known_[i].row, row);
      continue;
    }
    search(sought, row);
    known_[i] = {from, row};
  }
}

void TableReading::search(const SoughtColumn& sought, size_t row)
{
  const size_t levels = std::min(sought.above, line_.size() - 1);
  const size_t top = sought.absolute ? 0 : line_.size() - 1 - levels;
  const std::span<const Place> line = std::span<const Place>(line_).subspan(top);
  paths::Matcher<WalkedTree> matcher(tree_, *sought.path);
  matcher.begin(line);
  bool more = !matcher.give(line.front(), 0) || take(sought.column, row, line.front());
  if (!more || !matcher.reachesBelow())
  {
    return;
  }
  for (WalkedTree::Walk walk(tree_, line.front()); more && walk.next();)
  {
    more = !matcher.give(walk.place(), walk.depth()) || take(sought.column, row, walk.place());
    if (!matcher.reachesBelow())
    {
      walk.skip();
    }
  }
}

bool TableReading::take(uint32_t column, size_t row, const Place& place)
{
  if (!place.node.isGroup())
  {
    filling_.chunk().putAny(column, row, valueOf(place.node));
  }
  return place.node.isGroup() || query_.compiled().joiner.has_value();
}

} // namespace tav::inspect
