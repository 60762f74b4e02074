// A table from the tables of a file's parts.
#include "inspect/table/parts.h"

#include <algorithm>
#include <memory>
#include <utility>

#include "inspect/plan/partChain.h"
#include "inspect/table/query.h"
#include "inspect/table/reading.h"

namespace tav::inspect
{

namespace
{

/// Whether rows and values follow from the names of the groups around a node and from what is below a row's node, so
/// that a walk can begin inside of a root.
bool isCutInside(const CompiledQuery& query)
{
  return query.eachIsPlain && std::none_of(query.sought.begin(), query.sought.end(), [](const SoughtColumn& sought) {
           return sought.absolute || sought.above != 0;
         });
}

/// Puts together what threads have read. The rows of a part begin with those of groups around its place: what was found
/// for them goes into the rows of the part in which they began.
class TableJob
{
public:
  class Walk
  {
    TableJob* job_;
    bool looks_;
    bool spoilt_ = false;

  public:
    /// `job`: null for a part that is tried. What it would tell of damage is left to the walk that goes on.
    Walk(TableJob* job, ByteSource& source, const Form& form, const TableQuery& query, TableOptions options,
         const Walker::State& state)
        : job_(job), looks_(!query.compiled().eachIsPlain || !query.compiled().sought.empty()),
          reading(source, form, query, withSink(std::move(options)), state), inherited(reading.rows())
    {
      spoilt_ = job == nullptr && reading.isIdle(); // the walk that goes on steps over the group, if it can
    }

    bool step()
    {
      const bool goesOn = reading.step();
      if (job_ != nullptr && reading.rows() >= job_->options_.batchRows && !reading.hasOpenRows())
      {
        job_->take(*this);
      }
      return goesOn;
    }
    const Walker& walker() const { return reading.walker(); }
    bool isSpoilt() const { return spoilt_ || (job_ == nullptr && reading.hasChangedForm()); }
    bool isPlain() const { return !reading.hasChangedForm(); }
    /// What is looked up below a node may ask for the damage before it, of which no walk tells.
    bool leansOnDamage() const { return looks_ || walker().leansOnDamage(); }

    TableReading reading;
    size_t inherited; ///< rows of groups around the place where it began

  private:
    TableOptions withSink(TableOptions options)
    {
      if (job_ == nullptr)
      {
        options.onDamage = OnDamage::skip;
        options.passedOver = [this](const PassedOver&) { spoilt_ = true; };
      }
      return options;
    }
  };

  TableJob(const Form& form, const TableQuery& query, const TableOptions& options,
           const std::function<void(const Table&)>& rows)
      : form_(form), query_(query), options_(options), rows_(rows) {}

  std::unique_ptr<Walk> tryFrom(ByteSource& source, const Walker::State& state) const
  {
    return std::make_unique<Walk>(nullptr, source, form_, query_, options_, state);
  }
  std::unique_ptr<Walk> goOnFrom(ByteSource& source, const Walker::State& state)
  {
    return std::make_unique<Walk>(this, source, form_, query_, options_, state);
  }

  void take(Walk& walk)
  {
    const std::vector<size_t> open = walk.reading.openRows();
    const size_t inherited = std::exchange(walk.inherited, 0);
    const std::shared_ptr<TableChunk> chunk = walk.reading.take();
    stopped_ = walk.reading.stopped();
    if (stopped_ && walk.reading.dropped() < inherited)
    {
      dropOpenRows();
      return;
    }
    for (size_t row = 0; row < inherited; ++row)
    {
      const OpenRow& begun = open_[static_cast<size_t>(row)];
      begun.chunk->merge(begun.row, *chunk, row);
    }
    open_.resize(static_cast<size_t>(
        std::count_if(open.begin(), open.end(), [inherited](size_t row) { return row < inherited; })));
    for (const size_t row : open)
    {
      if (row >= inherited)
      {
        open_.push_back({chunk, row});
      }
    }
    chunk->dropFirst(inherited);
    ready_.push_back(chunk);
    handOut();
  }

  void reached(uint64_t offset) const
  {
    if (options_.progress)
    {
      options_.progress(offset);
    }
  }

  const std::optional<Problem>& stopped() const { return stopped_; }

private:
  /// A row whose node has not ended.
  struct OpenRow
  {
    std::shared_ptr<TableChunk> chunk;
    size_t row;
  };

  /// Rows come in the order in which their nodes begin.
  void handOut()
  {
    size_t count = 0;
    Table table(query_);
    for (; count < ready_.size() && (open_.empty() || ready_[count] != open_.front().chunk); ++count)
    {
      if (ready_[count]->rows() != 0)
      {
        table.append(ready_[count]);
      }
    }
    ready_.erase(ready_.begin(), ready_.begin() + static_cast<ptrdiff_t>(count));
    if (table.rows() != 0)
    {
      rows_(table);
    }
  }

  /// Takes the rows from the first one on away whose node has not ended.
  void dropOpenRows()
  {
    const OpenRow first = open_.front();
    first.chunk->cut(first.row);
    ready_.assign(1, first.chunk);
    open_.clear();
    handOut();
  }

  Form form_;
  const TableQuery& query_;
  const TableOptions& options_;
  const std::function<void(const Table&)>& rows_;
  std::vector<std::shared_ptr<TableChunk>> ready_{}; ///< not handed out, the first of them because it has open rows
  std::vector<OpenRow> open_{};                      ///< from the outermost inwards
  std::optional<Problem> stopped_{};
};

} // namespace

std::vector<Part> tableParts(ByteSource& source, const Form& form, const TableQuery& query,
                             const TableOptions& options)
{
  const bool inside = isCutInside(query.compiled());
  const bool isWhole = options.start.offset == 0 && options.end == kNoOffset;
  if (!isWhole || (!inside && !query.isDivisible()))
  {
    return {};
  }
  return withWhole(source, partsFor(source, form, options.threads, options.partBytes), [&](const PartGroup& group) {
    return !inside || ((group.flags & (kOpen | kOverrun)) == 0 && group.end - group.offset <= mostAtOnce(options));
  });
}

std::optional<Problem> readTableParts(ByteSource& source, const Form& form, const TableQuery& query,
                                      const TableOptions& options, const std::vector<Part>& parts,
                                      const std::function<void(const Table&)>& rows)
{
  TableJob job(form, query, options, rows);
  PartChain<TableJob>(source, parts, job).run(options.threads);
  return job.stopped();
}

} // namespace tav::inspect
