#include <algorithm>
#include <array>
#include <cstdint>
#include <functional>
#include <span>
#include <utility>

#include "inspect/columns/addRow.h"
#include "inspect/path/names.h"
#include "inspect/plan/partState.h"
#include "inspect/walk/exactWalk.h"
#include "inspect/walk/mostCounts.h"
#include "tav/inspect/path.hpp"

namespace tav::inspect
{

namespace
{

constexpr uint64_t kMostAtOnce = uint64_t{4} * 1024 * 1024; ///< bytes of a group that is read by the exact steps
constexpr uint64_t kRowsUntold = 4096;
constexpr size_t kMostGrowth = 16;                     ///< of the rows' room at once
constexpr size_t kMostText = size_t{16} * 1024 * 1024; ///< of paths that are handed out at once

uint16_t keyOf(uint32_t info)
{
  return static_cast<uint16_t>(info & TAV_INFO_KEY_MASK);
}

/// What steps of paths begin with: names are looked up once, as long as no other takes the place.
class StepNames
{
public:
  explicit StepNames(const Dictionary& dictionary)
      : dictionary_(dictionary) {}

  /// A slash and the name.
  const std::string& of(uint16_t elm)
  {
    Known& known = known_[elm % known_.size()];
    if (known.elm != elm || known.step.empty())
    {
      known.elm = elm;
      known.step = '/';
      appendElementText(known.step, elm, dictionary_);
    }
    return known.step;
  }

private:
  struct Known
  {
    uint16_t elm = 0;
    std::string step{};
  };

  Dictionary dictionary_;
  std::array<Known, 128> known_{};
};

/// The paths of nodes, one after another: of each the last step is new.
class Paths
{
public:
  explicit Paths(const Dictionary& dictionary)
      : names_(dictionary) {}

  /// The path of a node at a depth, whose place among its siblings is known.
  const std::string& of(const Node& node, size_t depth)
  {
    lengths_.resize(std::min(lengths_.size(), depth + 1));
    return add(node.elm(), node.ordinal, node.offset(), node.isGroup());
  }

  /// What follows is below the last node, and the places are counted here, as a Walker counts them.
  void beginCounting()
  {
    counts_.clear();
    starts_.assign(1, 0);
  }
  const std::string& counted(const core::Node& node, uint64_t offset)
  {
    const uint64_t ordinal = count(node.elm());
    if (node.group())
    {
      starts_.push_back(counts_.size());
    }
    return add(node.elm(), ordinal, offset, node.group());
  }
  /// So many groups are around the group whose children come next.
  void backTo(size_t depth) { lengths_.resize(std::min(lengths_.size(), depth + 2)); }
  void leave()
  {
    counts_.resize(starts_.back());
    starts_.pop_back();
    lengths_.pop_back();
  }

private:
  struct Count
  {
    uint16_t elm;
    uint64_t count;
  };

  /// A child of the group whose path is the last of `lengths_`.
  const std::string& add(uint16_t elm, uint64_t ordinal, uint64_t offset, bool isGroup)
  {
    path_.resize(lengths_.back());
    path_ += names_.of(elm);
    if (ordinal != 1)
    {
      appendPlace(path_, ordinal, offset);
    }
    if (isGroup)
    {
      lengths_.push_back(path_.size());
    }
    return path_;
  }

  uint64_t count(uint16_t elm)
  {
    for (size_t i = starts_.back(); i < counts_.size(); ++i)
    {
      if (counts_[i].elm == elm)
      {
        return ++counts_[i].count;
      }
    }
    const bool isFull = counts_.size() - starts_.back() == kMostCounts;
    isFull ? void() : counts_.push_back({elm, 1});
    return isFull ? 0 : 1;
  }

  StepNames names_;
  std::string path_{};
  std::vector<size_t> lengths_{0}; ///< of the paths of the groups around, by level
  std::vector<Count> counts_{};
  std::vector<size_t> starts_{}; ///< where the counts of a level begin
};

} // namespace

class NodeReader::State
{
public:
  State(ByteSource& source, const Part& part, const NodeReaderOptions& options)
      : source_(source), options_(options), paths_(source.dictionary()), exact_(told_), begin_(part.offset),
        end_(part.end()), walk_(source, part, [this](const PassedOver& passed) { passOver(passed); })
  {
    for (size_t level = 0; level < part.around.size(); ++level)
    {
      open_.push_back(-2 - static_cast<int64_t>(level));
    }
  }

  bool read(NodeColumns& out, size_t rows)
  {
    columns_ = &out;
    const size_t before = out.count();
    wanted_ = before == 0 ? rows : SIZE_MAX; // who adds to what is there wants them all in the end
    texts_ = 0;
    while (!done_ && out.count() - before < rows && texts_ < kMostText)
    {
      done_ = !step();
    }
    return out.count() != before;
  }

  void tellProgress(std::function<void(uint64_t)> progress)
  {
    progress_ = std::move(progress);
    tellAt_ = progress_ ? rows_ : UINT64_MAX;
  }

  const std::optional<Problem>& stopped() const { return stopped_; }
  PartEnd end() const { return walk_.end(); }

  /// Of the groups around the place, at the end.
  const std::vector<int64_t>& open()
  {
    open_.resize(std::min(open_.size(), walk_.walker().depth()));
    return open_;
  }

private:
  /// The columns as the exact steps tell them of nodes.
  struct Told
  {
    bool enter(const core::Node& group)
    {
      state.add(factsOf(group, nullptr, false), true);
      const bool goesOn = !state.options_.paths || state.addPath(group);
      goesOn ? void() : leave();
      return goesOn;
    }
    void leave()
    {
      state.open_.pop_back();
      state.options_.paths ? state.paths_.leave() : void();
    }
    [[gnu::always_inline]] void data(const core::Node& node, const uint8_t* payload, bool swap)
    {
      if (!layout::isEndElement(node.elm())) [[likely]]
      {
        state.add(factsOf(node, state.options_.values ? payload : nullptr, swap), false);
        state.options_.paths ? static_cast<void>(state.addPath(node)) : void();
      }
    }
    [[gnu::always_inline]] NodeFacts factsOf(const core::Node& node, const uint8_t* payload, bool swap) const
    {
      return {state.base_ + node.offset(), node.size(), state.open_.size(), node.elm(), node.type(), keyOf(node.info()),
              swap, payload};
    }
    State& state;
  };

  [[gnu::always_inline]] void add(const NodeFacts& facts, bool isGroup)
  {
    if (columns_->isFull()) [[unlikely]]
    {
      makeRoom(facts.offset);
    }
    columns_->addRow(facts, open_.empty() ? NodeColumns::kNoParent : open_.back());
    if (isGroup)
    {
      open_.push_back(static_cast<int64_t>(rows_));
      if (rows_ >= tellAt_) [[unlikely]]
      {
        tellAt_ = rows_ + kRowsUntold;
        progress_(facts.offset);
      }
    }
    ++rows_;
  }

  /// For as many rows as are likely to come, as close together as those so far. Rows that are moved go into memory
  /// that nobody has touched yet, which costs more than to read them. What comes may be different: room grows in steps.
  void makeRoom(uint64_t offset)
  {
    const size_t rows = columns_->count();
    const auto passed = static_cast<double>(offset - std::min(offset, begin_));
    const auto left = static_cast<double>(end_ - std::min(offset, end_));
    const double coming = passed > 0 ? 1.1 * static_cast<double>(rows_) * left / passed : 0;
    const auto most = static_cast<double>(std::min(wanted_, rows * kMostGrowth));
    const double likely = std::min(static_cast<double>(rows) + coming, most);
    columns_->makeRoom(std::max(rows * 2, static_cast<size_t>(likely)));
  }

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

  void addText(const std::string& path)
  {
    columns_->paths.add(path);
    texts_ += path.size();
  }

  /// Of a node that the exact steps have come to; false when there is too much text, and they have to give up.
  bool addPath(const core::Node& node)
  {
    if (texts_ < kMostText)
    {
      addText(paths_.counted(node, base_ + node.offset()));
      return true;
    }
    tooLong_ = true;
    if (node.group())
    {
      static_cast<void>(paths_.counted(node, base_ + node.offset())); // which is left again
    }
    return false;
  }

  bool step()
  {
    const bool more = walk_.next(event_) && !stopped_;
    if (more && event_.what == What::nodeBegin && !isEndPiece(event_))
    {
      begin();
      if (options_.paths)
      {
        addText(paths_.of(event_.node, static_cast<size_t>(event_.depth)));
      }
      if (event_.node.isGroup())
      {
        goThrough();
      }
    }
    return more;
  }

  void begin()
  {
    const Node& node = event_.node;
    const bool isGroup = node.isGroup();
    open_.resize(std::min(open_.size(), static_cast<size_t>(event_.depth)));
    const uint8_t* const payload = isGroup || !options_.values ? nullptr : payloadOf(node);
    add({node.offset(), node.size(), event_.depth, node.elm(), node.type(), keyOf(node.info()), walk_.form().swapped,
         payload},
        isGroup);
  }

  /// The payload, where it is whole: in memory, or in what the columns keep. Numbers are only looked at.
  const uint8_t* payloadOf(const Node& node)
  {
    const uint64_t from = node.payloadOffset();
    const uint64_t size = node.size();
    if (from > source_.size() || size > source_.size() - from)
    {
      return nullptr;
    }
    if (source_.isMemory())
    {
      static constexpr uint8_t nothing = 0; // for what is empty, and ends the source
      return size == 0 ? &nothing : source_.view(from).data();
    }
    uint8_t* to = small_.data();
    const bool isSmall = size <= small_.size() && isWord(node.type(), size);
    if (!isSmall)
    {
      auto kept = std::make_shared<std::vector<uint8_t>>(static_cast<size_t>(size) + 1);
      to = kept->data();
      columns_->keep(std::move(kept));
    }
    return source_.read(from, std::span(to, static_cast<size_t>(size))) == size ? to : nullptr;
  }

  /// Whether the value goes into a column as it is read.
  static bool isWord(uint16_t type, uint64_t size)
  {
    const bool isNumber = type == TAV_TYPE_BYTE || (tav::detail::isIntegerType(type) && type != TAV_TYPE_UINT128 &&
                                                    type != TAV_TYPE_SINT128);
    return (isNumber || type == TAV_TYPE_UTC_TIMESTAMP) && sizeSuits(type, size);
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
    while (bytes.size() == size && !tryExact(bytes) && exact_.expectMore())
    {
    }
  }

  bool tryExact(std::span<const uint8_t> bytes)
  {
    const Node& node = event_.node;
    const size_t count = columns_->count();
    const uint64_t rows = rows_;
    const size_t texts = texts_;
    base_ = node.offset();
    tooLong_ = false;
    paths_.beginCounting();
    const bool done = exact_.through(bytes, walk_.form(), node.is64()) && !tooLong_;
    open_.resize(static_cast<size_t>(event_.depth) + 1);
    paths_.backTo(static_cast<size_t>(event_.depth));
    if (done && walk_.skip())
    {
      return true;
    }
    failed_ = done || tooLong_ ? failed_ : node.offset() + exact_.reached();
    notBefore_ = done || tooLong_ ? node.limit : notBefore_;
    columns_->cut(count);
    rows_ = rows;
    texts_ = texts;
    return done || tooLong_;
  }

  std::span<const uint8_t> bytesOf(uint64_t offset, uint64_t size)
  {
    if (source_.isMemory())
    {
      return source_.view(offset).first(static_cast<size_t>(size));
    }
    auto bytes = std::make_shared<std::vector<uint8_t>>(static_cast<size_t>(size));
    bytes->resize(source_.read(offset, *bytes));
    const std::span<const uint8_t> all = *bytes;
    columns_->keep(std::move(bytes));
    return all;
  }

  ByteSource& source_;
  NodeReaderOptions options_;
  NodeColumns* columns_ = nullptr;
  Paths paths_;
  Told told_{*this};
  ExactWalk<Told> exact_;
  uint64_t begin_; ///< of the part
  uint64_t end_;
  size_t wanted_ = SIZE_MAX; ///< rows in the columns, as far as is known
  std::optional<Problem> stopped_{};
  std::function<void(uint64_t)> progress_{};
  PartWalk walk_;
  Event event_{};
  std::vector<int64_t> open_{};  ///< the rows of the groups around, by level
  uint64_t rows_ = 0;            ///< so far
  uint64_t tellAt_ = UINT64_MAX; ///< the place is told at the first group from this row on
  uint64_t base_ = 0;            ///< of the group that the exact steps are in
  uint64_t failed_ = kNoOffset;  ///< where the exact steps gave up last
  uint64_t notBefore_ = 0;       ///< they are not tried before
  std::array<uint8_t, 16> small_{};
  size_t texts_ = 0;     ///< bytes of the paths that are handed out next
  bool tooLong_ = false; ///< the exact steps came to too many of them
  bool done_ = false;
};

NodeReader::NodeReader(ByteSource& source, const Form& form, const NodeReaderOptions& options)
    : NodeReader(source, wholeOf(source, form), options)
{
}

NodeReader::NodeReader(ByteSource& source, const Part& part, const NodeReaderOptions& options)
    : state_(std::make_unique<State>(source, part, options))
{
}

NodeReader::~NodeReader() = default;

void NodeReader::tellProgress(std::function<void(uint64_t)> progress)
{
  state_->tellProgress(std::move(progress));
}

bool NodeReader::next(NodeColumns& out, size_t rows)
{
  return state_->read(out, std::max<size_t>(rows, 1));
}

const std::optional<Problem>& NodeReader::stopped() const noexcept
{
  return state_->stopped();
}

PartEnd NodeReader::end() const
{
  return state_->end();
}

const std::vector<int64_t>& NodeReader::open() const noexcept
{
  return state_->open();
}

} // namespace tav::inspect
