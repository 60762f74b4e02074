#include "tav/inspect/collect.hpp"

#include <algorithm>
#include <optional>

#include "inspect/json/encoder.h"
#include "inspect/path/selection.h"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr size_t kPiece = size_t{64} * 1024; ///< a multiple of 8, since arrays are turned by units of 8

void requireGroup(const ByteSource& source, const Walker& walker, const Event& event)
{
  if (!event.node.isGroup())
  {
    throw Error(Problem{.file = source.name(),
                        .offset = event.offset,
                        .path = walker.path(event, PathStyle::brief),
                        .sentence = "is no group: only groups can stand for themselves"});
  }
}

} // namespace

class Collector::Work
{
public:
  Work(PatchFile& out, const CollectOptions& options)
      : out_(out), options_(options) {}

  /// The source of the nodes that follow.
  void begin(ByteSource& source, const Form& form);
  /// An event of a subtree whose topmost node has this depth.
  void add(const Event& event, uint64_t top);
  void finish();

  uint64_t roots = 0;
  uint64_t nodes = 0;

private:
  void beginNode(const Node& node, bool isRoot);
  void beginRoot(const Node& node);
  void addData(const Node& node);
  void endGroup(bool isRoot);
  void closeEmpty(bool somethingFollows);
  Properties propertiesOf(const Node& node) const;

  PatchFile& out_;
  CollectOptions options_;
  ByteSource* source_ = nullptr;
  Form form_{};                            ///< of the source
  std::optional<StreamEncoder> encoder_{}; ///< of one root
  Problem place_{};                        ///< where in the source the root is
  bool wide_ = false;                      ///< the root gets a 64-bit header
  bool narrows_ = false;                   ///< instead of one of 64 bits it gets one of 32
  bool paired_ = false;                    ///< it asks for an end element
  bool empty_ = false;                     ///< it is a group without anything in it, and still to be closed
  uint64_t payload_ = 0;                   ///< where its children begin
};

void Collector::Work::begin(ByteSource& source, const Form& form)
{
  FormChoice& choice = options_.form;
  choice.swapped = choice.swapped.value_or(form.swapped);
  choice.aligned = choice.aligned.value_or(form.aligned);
  choice.root64 = choice.root64.value_or(form.root64);
  source_ = &source;
  form_ = form;
}

void Collector::Work::add(const Event& event, uint64_t top)
{
  const bool begins = event.what == What::nodeBegin;
  if (!(begins || event.what == What::nodeEnd) || isEndPiece(event))
  {
    return;
  }
  try
  {
    if (begins)
    {
      beginNode(event.node, event.depth == top);
    }
    else if (event.node.isGroup())
    {
      endGroup(event.depth == top);
    }
  }
  catch (const BuildError& error)
  {
    throw Error(Problem{.file = source_->name(), .offset = event.node.offset(), .sentence = error.what()});
  }
}

void Collector::Work::beginNode(const Node& node, bool isRoot)
{
  if (isRoot)
  {
    closeEmpty(true);
    beginRoot(node);
  }
  ++nodes;
  if (!node.isGroup())
  {
    addData(node);
    return;
  }
  encoder_->beginGroup(propertiesOf(node));
  if (isRoot)
  {
    payload_ = out_.length();
  }
}

void Collector::Work::beginRoot(const Node& node)
{
  ++roots;
  wide_ = options_.ownWidths ? node.is64() : *options_.form.root64;
  narrows_ = node.is64() && !wide_;
  paired_ = wide_ && hasEyeSize(node.header);
  place_ = {.file = source_->name(), .offset = node.offset()};
  Conversion conversion{.swapped = options_.form.swapped, .aligned = options_.form.aligned};
  if (wide_ != node.is64())
  {
    conversion.root64 = wide_; // of all headers in it
  }
  Form form = form_;
  form.root64 = node.is64();
  encoder_.emplace(out_, conversion);
  encoder_->setForm(form);
}

Properties Collector::Work::propertiesOf(const Node& node) const
{
  const uint32_t lost = node.info() & ~uint32_t{TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE};
  if (narrows_ && lost != 0)
  {
    throw BuildError("a 32-bit header has no room for the info bits " + hexOffset(lost));
  }
  Properties properties;
  properties.elm = node.elm();
  properties.type = node.type();
  if (node.is64())
  {
    properties.info = node.info();
  }
  return properties;
}

void Collector::Work::addData(const Node& node)
{
  Draft draft;
  draft.properties = propertiesOf(node);
  draft.given = Given::bytes;
  std::vector<uint8_t> piece(static_cast<size_t>(std::min<uint64_t>(kPiece, node.size())));
  for (uint64_t at = 0; at < node.size(); at += piece.size())
  {
    piece.resize(static_cast<size_t>(std::min<uint64_t>(piece.size(), node.size() - at)));
    if (source_->read(node.payloadOffset() + at, piece) != piece.size())
    {
      throw Error(Problem{.file = source_->name(), .sentence = "the file became shorter while it was read"});
    }
    if (at != 0)
    {
      encoder_->addValue(draft);
    }
    draft.value.append(reinterpret_cast<const char*>(piece.data()), piece.size());
  }
  encoder_->finish(draft);
}

void Collector::Work::endGroup(bool isRoot)
{
  // A root of size 0 reads as one that was never closed where another one follows, which is not known yet.
  empty_ = isRoot && !paired_ && out_.length() == payload_;
  if (!empty_)
  {
    encoder_->endGroup();
  }
}

void Collector::Work::closeEmpty(bool somethingFollows)
{
  if (!empty_)
  {
    return;
  }
  empty_ = false;
  if (somethingFollows && !wide_)
  {
    place_.sentence = "an empty group with a 32-bit header can only stand at the end: before another one it reads as a "
                      "group that was never closed";
    throw Error(place_);
  }
  encoder_->group().eyeSize = somethingFollows; // with an end element it is not empty
  encoder_->endGroup();
}

void Collector::Work::finish()
{
  closeEmpty(false);
}

Collector::Collector(PatchFile& out, const CollectOptions& options)
    : work_(std::make_unique<Work>(out, options))
{
}

Collector::~Collector() = default;

void Collector::add(ByteSource& source, const Form& form, const Seen& seen)
{
  work_->begin(source, form);
  Walker walker(source, form);
  for (Event event; walker.next(event);)
  {
    if (seen)
    {
      seen(walker, event);
    }
    work_->add(event, 0);
  }
}

void Collector::addFound(ByteSource& source, const Form& form, const Path& path, const Seen& seen)
{
  work_->begin(source, form);
  Selection selection(std::span(&path, 1));
  Walker walker(source, form);
  std::optional<uint64_t> top; // depth of the group that is being copied
  for (Event event; walker.next(event);)
  {
    if (seen)
    {
      seen(walker, event);
    }
    if (!top && event.what == What::nodeBegin)
    {
      if (selection.at(walker, event))
      {
        requireGroup(source, walker, event);
        top = event.depth;
      }
      else if (event.node.isGroup() && !selection.reachesBelow())
      {
        walker.skip();
      }
    }
    if (top)
    {
      work_->add(event, *top);
      top = event.what == What::nodeEnd && event.depth == *top ? std::nullopt : top;
    }
  }
  if (selection.found(0) == 0)
  {
    throw Error(noMatch(path, source.name()), Trouble::notFound);
  }
}

void Collector::finish()
{
  work_->finish();
}

uint64_t Collector::roots() const
{
  return work_->roots;
}

uint64_t Collector::nodes() const
{
  return work_->nodes;
}

} // namespace tav::inspect
