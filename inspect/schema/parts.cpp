// The shape of a stream from the shapes of its parts.
#include <algorithm>
#include <array>
#include <iterator>
#include <memory>
#include <utility>

#include "inspect/plan/partChain.h"
#include "tav/inspect/schema.hpp"

namespace tav::inspect
{

/// What goes on from a sure place goes into the whole at once; so does what was found in a part when its turn comes.
class Schema::Job
{
public:
  struct Walk
  {
    bool step()
    {
      if (!walker_.next(event))
      {
        return false;
      }
      if (watch)
      {
        watch->see(walker_, event);
        reach(event.offset);
      }
      schema->see(walker_.source(), walker_.form(), event);
      return true;
    }
    const Walker& walker() const { return walker_; }
    /// Only damage is told of with its path.
    bool isSpoilt() const
    {
      return isToldOfDamage && (event.what == What::damaged ||
                                (event.what == What::nodeEnd && event.node.isGroup() && event.node.has(kOverrun)));
    }
    static bool isPlain() { return true; }
    bool leansOnDamage() const { return walker_.leansOnDamage(); }
    void reach(uint64_t offset) const
    {
      if (*progress)
      {
        (*progress)(offset);
      }
    }

    Walker walker_;
    bool isToldOfDamage;
    const std::function<void(uint64_t)>* progress;
    std::unique_ptr<Schema> own{}; ///< of a part
    Schema* schema = nullptr;
    std::unique_ptr<DamageWatch> watch{};
    Event event{};
  };

  Job(Schema& whole, const Form& form, const SchemaWork& work)
      : whole_(whole), form_(form), work_(work) {}

  std::unique_ptr<Walk> tryFrom(ByteSource& source, const Walker::State& state) const
  {
    auto walk = begin(source, state);
    walk->own = std::make_unique<Schema>(whole_.options_);
    walk->own->isPart_ = true;
    walk->schema = walk->own.get();
    walk->schema->enter(state);
    return walk;
  }

  std::unique_ptr<Walk> goOnFrom(ByteSource& source, const Walker::State& state)
  {
    auto walk = begin(source, state);
    walk->schema = &whole_;
    whole_.enter(state);
    walk->watch = std::make_unique<DamageWatch>(
        source, form_, work_.passed ? work_.passed : [](const PassedOver&) {});
    for (size_t i = 1; i < state.frames.size(); ++i)
    {
      Event group;
      group.what = What::nodeBegin;
      group.node = state.frames[i].node;
      group.depth = group.node.depth;
      walk->watch->see(walk->walker_, group);
    }
    return walk;
  }

  void take(const Walk& walk)
  {
    if (walk.own)
    {
      whole_.merge(*walk.own);
    }
  }

  void reached(uint64_t offset) const
  {
    if (work_.progress)
    {
      work_.progress(offset);
    }
  }

private:
  std::unique_ptr<Walk> begin(ByteSource& source, const Walker::State& state) const
  {
    // NOLINTNEXTLINE(modernize-make-unique): clang 14 makes no aggregate of arguments in parentheses
    return std::unique_ptr<Walk>(
        new Walk{Walker::from(source, form_, state), static_cast<bool>(work_.passed), &work_.progress});
  }

  Schema& whole_;
  Form form_;
  const SchemaWork& work_;
};

void Schema::add(ByteSource& source, const Form& form, const SchemaWork& work)
{
  dictionary_ = dictionary_.over(source.dictionary());
  const std::vector<Part> parts = partsFor(source, form, work.threads, work.partBytes);
  Job job(*this, form, work);
  if (!parts.empty())
  {
    PartChain<Job>(source, parts, job).run(work.threads);
    return;
  }
  walkThrough(source, form, job);
}

/// Stands in the groups around a place.
void Schema::enter(const Walker::State& state)
{
  open_.clear();
  for (size_t i = 1; i < state.frames.size(); ++i)
  {
    open_.push_back(childOf(open_.empty() ? 0 : open_.back(), state.frames[i].node.elm()));
  }
}

void Schema::merge(const Schema& part)
{
  std::vector<uint32_t> here(part.nodes_.size(), 0); ///< where the part's paths are in this one
  std::vector<uint32_t> levels{0};
  while (!levels.empty())
  {
    const uint32_t parent = levels.back();
    levels.pop_back();
    for (uint32_t at = part.nodes_[parent].firstChild; at != 0; at = part.nodes_[at].next)
    {
      here[at] = childOf(here[parent], part.nodes_[at].elm);
      mergePath(part.nodes_[at], nodes_[here[at]]);
      levels.push_back(at);
    }
  }
}

void Schema::mergePath(const PathNode& part, PathNode& path) const
{
  path.count += part.count;
  std::vector<uint16_t> types;
  std::set_union(path.types.begin(), path.types.end(), part.types.begin(), part.types.end(), std::back_inserter(types));
  path.types = std::move(types);
  if (part.bounds && !path.bounds)
  {
    path.bounds = std::make_unique<std::array<Bound, 2>>(*part.bounds);
  }
  else if (part.bounds)
  {
    const auto& [least, greatest] = *part.bounds;
    auto& bounds = *path.bounds;
    bounds[0] = least.rank < bounds[0].rank ? least : bounds[0];
    bounds[1] = greatest.rank > bounds[1].rank ? greatest : bounds[1];
  }
  if (part.texts)
  {
    path.texts = path.texts ? std::move(path.texts) : std::make_unique<Texts>();
    mergeTexts(*part.texts, *path.texts);
  }
}

/// As if the texts of the part had come one after another. Where there were too many in it, there are too many in all.
void Schema::mergeTexts(const Texts& part, Texts& texts) const
{
  const uint64_t room = roomForTexts();
  for (const NewText& next : part.inOrder)
  {
    if (texts.more)
    {
      return;
    }
    const std::string& text = *next.text;
    bool ends = next.size > room - texts.bytes;
    if (!ends && !texts.seen.contains(text))
    {
      ends = text.size() > room - texts.bytes || texts.count == options_.mostTexts;
      texts.bytes += ends ? 0 : text.size();
      texts.count += ends ? 0 : 1;
      texts.seen.insert(text);
    }
    if (ends || next.repeat > room - texts.bytes)
    {
      endTexts(texts);
    }
  }
  if (part.more && !texts.more)
  {
    endTexts(texts);
  }
}

} // namespace tav::inspect
