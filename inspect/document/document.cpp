#include "tav/inspect/document.hpp"

#include <algorithm>
#include <string>
#include <utility>

#include "inspect/document/search.h"
#include "inspect/document/state.h"
#include "tav/inspect/fileKind.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

namespace
{

[[noreturn]] void failAsNoStream(ByteSource& source, const std::optional<FileKind>& kind)
{
  Problem problem{.file = source.name(), .code = TAV_RC_NOT_FOUND};
  problem.sentence = kind                 ? "this is " + std::string(kind->text) + ", no stream"
                     : source.size() == 0 ? "the file is empty, no stream"
                                          : "this is no stream, or nothing of it is whole";
  throw Error(std::move(problem), Trouble::notFound);
}

[[noreturn]] void failAsAmbiguous(const ByteSource& source, const Recognition& found)
{
  Problem problem{.file = source.name(), .code = TAV_RC_BAD_PARAM};
  problem.sentence = "the form cannot be told: it can be " + formText(found.form);
  for (const Form& other : found.alternatives)
  {
    problem.sentence += ", or " + formText(other);
  }
  problem.hint = "what is known of the form decides: byte order, width of the root's header, padding";
  throw Error(std::move(problem));
}

std::string nameOf(const std::filesystem::path& path)
{
  const std::u8string name = path.u8string();
  return {name.begin(), name.end()};
}

} // namespace

StreamOptions streamOptions(const Form& form, uint64_t ringBytes)
{
  StreamOptions options;
  options.byteOrder = form.swapped ? ByteOrder::swapped : ByteOrder::native;
  options.align8 = form.aligned;
  options.ringBytes = ringBytes;
  return options;
}

tav::Reader& DocumentState::readerOf(const Form& form)
{
  auto& reader = readers[(form.swapped ? 1U : 0U) + (form.aligned ? 2U : 0U)];
  if (reader == nullptr)
  {
    reader = std::make_unique<tav::Reader>(source->storage(), streamOptions(form, options.ringBytes));
  }
  return *reader;
}

Form DocumentState::formAt(uint64_t offset) const
{
  const auto behind = forms.upper_bound(offset);
  return behind == forms.begin() ? recognition.form : std::prev(behind)->second;
}

PlaceWalk::PlaceWalk(ByteSource& source, const Form& form)
    : walk(source, form, [](const PassedOver&) {}), hasEvent(walk.next(event))
{
}

bool PlaceWalk::goTo(uint64_t offset)
{
  for (; hasEvent && event.offset <= offset; hasEvent = walk.next(event))
  {
    if (event.what == What::nodeBegin && event.offset == offset)
    {
      return true;
    }
    if (event.what == What::nodeBegin && event.node.isGroup() && event.node.limit <= offset)
    {
      walk.skip();
    }
  }
  return false;
}

std::string DocumentState::pathAt(uint64_t offset, PathStyle style) const
{
  PlaceWalk place(*source, recognition.form);
  return place.goTo(offset) ? place.walk.walker().path(place.event, style) : std::string();
}

bool DocumentState::isEmptyAt(uint64_t offset)
{
  if (!places || !places->goTo(offset))
  {
    places.emplace(*source, recognition.form); // the walk was past it, or stood at a former end
    places->goTo(offset);
  }
  const Event& event = places->event;
  return places->hasEvent && event.offset == offset && event.what == What::nodeBegin && event.depth != 0 &&
         !event.node.has(kOpen);
}

void DocumentState::learn(uint64_t offset, const Form& form)
{
  if (formAt(offset) != form)
  {
    forms[offset] = form;
  }
}

void DocumentState::learnEnd(const Node& group)
{
  const bool isCut = group.isGroup() && (group.has(kOverrun) || group.has(kOpen)) && group.limit < source->size();
  if (isCut && ends.size() < kMostDamages)
  {
    ends.emplace(group.offset(), group.limit);
  }
}

uint64_t DocumentState::endAt(uint64_t offset) const
{
  const auto known = ends.find(offset);
  return known == ends.end() ? kNoOffset : known->second;
}

void DocumentState::add(const PassedOver& passed)
{
  const Damage place{passed.offset, passed.length, passed.rule};
  const auto isBefore = [](const Damage& a, const Damage& b) {
    return a.offset != b.offset ? a.offset < b.offset : a.rule < b.rule;
  };
  const auto at = std::lower_bound(damage.begin(), damage.end(), place, isBefore);
  const bool isKnown = at != damage.end() && at->offset == place.offset && at->rule == place.rule;
  if (!isKnown && damage.size() < kMostDamages)
  {
    damage.insert(at, place);
  }
}

NodeRange::NodeRange(std::unique_ptr<Search> search)
    : search_(std::move(search))
{
}

NodeRange::NodeRange(NodeRange&&) noexcept = default;
NodeRange& NodeRange::operator=(NodeRange&&) noexcept = default;
NodeRange::~NodeRange() = default;

bool NodeRange::advance()
{
  done_ = true; // at the end, too, when the step throws
  if (search_->next())
  {
    current_ = search_->read();
    done_ = false;
  }
  return !done_;
}

Document::Document(const std::filesystem::path& path, const DocumentOptions& options)
{
  open(ByteSource::open(nameOf(path), options.ringBytes, options.from), options);
  state_->path = options.from == 0 ? nameOf(path) : std::string();
}

Document::Document(std::span<const std::byte> bytes, const DocumentOptions& options)
{
  const std::span<const uint8_t> all(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size());
  if (options.from > all.size())
  {
    throw Error(Problem{.file = "memory", .offset = options.from, .sentence = "lies behind the end of the bytes"});
  }
  open(std::make_unique<ByteSource>("memory", all.subspan(static_cast<size_t>(options.from))), options);
}

Document::Document(std::unique_ptr<ByteSource> source, const DocumentOptions& options)
{
  open(std::move(source), options);
}

Document::Document(Document&&) noexcept = default;
Document& Document::operator=(Document&&) noexcept = default;
Document::~Document() = default;

void Document::open(std::unique_ptr<ByteSource> source, const DocumentOptions& options)
{
  state_ = std::make_unique<DocumentState>();
  DocumentState& state = *state_;
  state.source = std::move(source);
  state.options = options;
  state.source->setDictionary(options.dictionary.over(state.source->dictionary()));
  state.recognition = recognise(*state.source, options.form);
  const FormChoice& given = options.form;
  const bool isGiven = given.swapped || given.root64 || given.aligned;
  const auto kind = isGiven ? std::nullopt : otherKindOf(*state.source, state.recognition);
  if (!state.recognition.isStream || kind)
  {
    failAsNoStream(*state.source, kind);
  }
  if (state.recognition.ambiguous())
  {
    failAsAmbiguous(*state.source, state.recognition);
  }
}

NodeRange Document::roots(OnDamage onDamage) const&
{
  return find("/", onDamage);
}

NodeRange Document::find(std::string_view path, OnDamage onDamage) const&
{
  return NodeRange(std::make_unique<Search>(*state_, path, onDamage));
}

NodeRange Document::find(const tav::Node& from, std::string_view path, OnDamage onDamage) const&
{
  const SearchStart start{from.header(), state_->formAt(from.offset())};
  return NodeRange(std::make_unique<Search>(*state_, start, path, onDamage));
}

std::span<const Damage> Document::damage() const noexcept
{
  return state_->damage;
}

Form Document::formOf(const tav::Node& node) const noexcept
{
  Form form = state_->formAt(node.offset());
  form.root64 = node.width() == Width::bits64;
  return form;
}

uint64_t Document::boundOf(const tav::Node& group) const noexcept
{
  return std::min(state_->endAt(group.offset()), state_->source->size());
}

std::string Document::pathOf(const tav::Node& node, PathStyle style) const
{
  return state_->pathAt(node.offset(), style);
}

void Document::tellProgress(std::function<void(uint64_t)> told) const
{
  state_->told = std::move(told);
}

const Form& Document::form() const noexcept
{
  return state_->recognition.form;
}

const Recognition& Document::recognition() const noexcept
{
  return state_->recognition;
}

ByteSource& Document::source() const noexcept
{
  return *state_->source;
}

} // namespace tav::inspect
