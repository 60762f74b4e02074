#include <algorithm>
#include <span>
#include <utility>

#include "inspect/document/state.h"
#include "inspect/document/streamWalk.h"
#include "inspect/path/walkedTree.h"
#include "inspect/walk/exactWalk.h"
#include "inspect/table/filling.h"
#include "tav/inspect/table.hpp"

namespace tav::inspect
{

namespace
{

constexpr uint64_t kMostAtOnce = uint64_t{16} * 1024 * 1024; ///< bytes of a group that is read by the exact steps

} // namespace

class TableReader::State
{
public:
  State(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options)
      : source_(source), query_(query), sought_(query.compiled().sought), options_(options), matcher_(compiled().each),
        filling_(compiled()), exact_(told_),
        walk_(
            source, form, [this](const PassedOver& passed) { passOver(passed); }, options.start),
        line_(1), known_(sought_.size())
  {
    tree_.source = &source;
    tree_.looks = true;
  }

  /// Whether there are rows.
  bool read(uint64_t rows)
  {
    while (!done_ && (filling_.hasOpenRows() || filling_.chunk().rows() < rows))
    {
      done_ = !step();
    }
    return filling_.chunk().rows() != 0;
  }

  std::shared_ptr<const TableChunk> take()
  {
    std::fill(known_.begin(), known_.end(), Known{});
    return filling_.take();
  }

  const std::optional<Problem>& stopped() const { return stopped_; }

private:
  using Place = WalkedTree::Place;
  /// The node that a column's value was looked up from last, and the row that has it.
  struct Known
  {
    uint64_t offset = kNoOffset;
    uint64_t row = 0;
  };

  /// The filling as the exact steps tell it of nodes.
  struct Told
  {
    bool enter(const core::Node& group)
    {
      const Automaton::Move move = filling.meet(group.elm());
      const bool isWanted = !filling.automaton().isDead(move.state);
      if (isWanted || move.isRow)
      {
        filling.enter(move);
        isWanted ? void() : filling.leave();
      }
      return isWanted;
    }
    void leave() { filling.leave(); }
    [[gnu::always_inline]] void data(const core::Node& node, const uint8_t* payload, bool swap)
    {
      filling.data(filling.meet(node.elm()), {node.type(), payload, node.size(), swap});
    }
    Filling& filling;
  };

  const CompiledQuery& compiled() const { return query_.compiled(); }

  void passOver(const PassedOver& passed)
  {
    if (options_.onDamage == OnDamage::skip)
    {
      options_.passedOver ? options_.passedOver(passed) : void();
    }
    else if (!stopped_)
    {
      stopped_ = Problem{.file = source_.name(),
                         .offset = passed.offset,
                         .path = passed.path,
                         .sentence = passed.reason,
                         .code = passed.code};
    }
  }

  bool step()
  {
    const bool more = walk_.next(event_);
    if (stopped_)
    {
      filling_.dropOpenRows();
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
    return true;
  }

  void begin()
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
    const uint64_t row = filling_.chunk().rows(); // if it is one
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

  void takeData(const Automaton::Move& move)
  {
    if (move.isRow || move.targetCount != 0)
    {
      const RawCell value = valueOf(event_.node);
      // Of a size that suits its type, or of another one: as bytes.
      const bool suits = layout::typeInfo(value.type).known && sizeSuits(value.type, value.size);
      filling_.data(move, suits ? value : RawCell{TAV_TYPE_BINARY, value.bytes, value.size, false});
    }
  }

  RawCell valueOf(const Node& node)
  {
    const uint64_t size = std::min(node.size(), node.limit - std::min(node.limit, node.payloadOffset()));
    buffer_.resize(static_cast<size_t>(std::min(size, source_.size())));
    buffer_.resize(source_.read(node.payloadOffset(), buffer_));
    return {node.type(), buffer_.data(), buffer_.size(), walk_.form().swapped};
  }

  void goBelow(uint32_t state)
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

  /// Reads a group by the exact steps, unless it is one that they are known to give up in. Of a group around it the
  /// Walker then goes on, so that each byte is gone through twice at the most.
  void goThrough()
  {
    const Node& node = event_.node;
    const uint64_t size = node.limit - node.offset();
    const bool fails = node.offset() <= failed_ && failed_ < node.limit;
    if (node.has(kOpen) || node.has(kOverrun) || size > kMostAtOnce || fails || node.offset() < notBefore_)
    {
      return;
    }
    const std::span<const uint8_t> bytes = bytesOf(node.offset(), size);
    while (!tryExact(bytes) && exact_.expectMore())
    {
    }
  }

  bool tryExact(std::span<const uint8_t> bytes)
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

  std::span<const uint8_t> bytesOf(uint64_t offset, uint64_t size)
  {
    if (source_.isMemory())
    {
      return source_.view(offset).first(static_cast<size_t>(size));
    }
    buffer_.resize(static_cast<size_t>(size));
    buffer_.resize(source_.read(offset, buffer_));
    return buffer_;
  }

  /// Looks the row's columns up whose paths are not plain.
  void seek(uint64_t row)
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

  void search(const SoughtColumn& sought, uint64_t row)
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

  /// Whether more values are wanted.
  bool take(uint32_t column, uint64_t row, const Place& place)
  {
    if (!place.node.isGroup())
    {
      filling_.chunk().putAny(column, row, valueOf(place.node));
    }
    return place.node.isGroup() || query_.compiled().joiner.has_value();
  }

  ByteSource& source_;
  TableQuery query_;
  const std::vector<SoughtColumn>& sought_;
  TableOptions options_;
  PathMatcher matcher_; ///< of the rows, when they are not plain
  Filling filling_;
  Told told_{filling_};
  ExactWalk<Told> exact_;
  StreamWalk walk_;
  Event event_{};
  WalkedTree tree_{};
  std::vector<Place> line_; ///< with columns to look up: above the roots, the groups around the node, the node
  std::vector<Known> known_;
  std::vector<uint8_t> buffer_{};
  std::optional<Problem> stopped_{};
  uint64_t failed_ = kNoOffset; ///< where the exact steps gave up last
  uint64_t notBefore_ = 0;      ///< they are not tried before
  bool done_ = false;
};

TableReader::TableReader(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options)
    : state_(std::make_unique<State>(source, form, query, options))
{
}

TableReader::~TableReader() = default;

bool TableReader::next(Table& out, uint64_t rows)
{
  if (!state_->read(std::max<uint64_t>(rows, 1)))
  {
    return false;
  }
  out.append(state_->take());
  return true;
}

const std::optional<Problem>& TableReader::stopped() const noexcept
{
  return state_->stopped();
}

Table readTable(ByteSource& source, const Form& form, const TableQuery& query, const TableOptions& options)
{
  Table table(query);
  TableReader reader(source, form, query, options);
  while (reader.next(table))
  {
  }
  if (reader.stopped())
  {
    throw Error(*reader.stopped());
  }
  return table;
}

Table readTable(const Document& document, const TableQuery& query, OnDamage onDamage)
{
  DocumentState& state = DocumentState::of(document);
  return readTable(*state.source, state.recognition.form, query,
                   {.onDamage = onDamage, .passedOver = [&state](const PassedOver& passed) { state.add(passed); }});
}

} // namespace tav::inspect
