#include "tav/inspect/schema.hpp"

#include <algorithm>
#include <cstring>

#include "inspect/walk/pathSteps.h"
#include "tav/inspect/path.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

constexpr uint64_t kMostNumber = 64; ///< bytes of the longest value that is one number or date

template<class Number>
Number load(const std::vector<uint8_t>& bytes)
{
  Number value{};
  std::memcpy(&value, bytes.data(), std::min(sizeof value, bytes.size()));
  return value;
}

/// A whole number as two words that sort with those of other widths when the sign is known.
template<class Number>
std::array<uint64_t, 3> wordsOf(const std::vector<uint8_t>& bytes)
{
  const auto value = load<Number>(bytes);
  const bool negative = value < Number{0};
  return {negative ? 0u : 1u, negative ? ~uint64_t{0} : 0, static_cast<uint64_t>(value)};
}

std::array<uint64_t, 3> wordsOf128(const std::vector<uint8_t>& bytes, bool isSigned)
{
  const auto words = load<std::array<uint64_t, 2>>(bytes);
  const uint64_t high = words[kor::isLittleEndian ? 1 : 0];
  const uint64_t low = words[kor::isLittleEndian ? 0 : 1];
  const bool negative = isSigned && (high >> 63) != 0;
  return {negative ? 0u : 1u, high, low};
}

/// Seconds with what the fractions hold above one, and the rest in microseconds.
std::array<uint64_t, 3> wordsOfTime(const TAVTimeStamp& stamp)
{
  constexpr uint64_t second = 1'000'000;
  const uint64_t fraction = uint64_t{stamp.fractionA} * 1000 + stamp.fractionB;
  const uint64_t seconds = stamp.seconds + fraction / second;
  return {seconds < stamp.seconds ? 1u : 0u, seconds, fraction % second};
}

} // namespace

Schema::Schema(SchemaOptions options)
    : options_(options)
{
  nodes_.emplace_back();
}

Schema::~Schema() = default;

void Schema::add(ByteSource& source, const Form& form, const std::function<void(const Walker&, const Event&)>& seen)
{
  open_.clear();
  dictionary_ = dictionary_.over(source.dictionary());
  Walker walker(source, form);
  Event event;
  while (walker.next(event))
  {
    if (seen)
    {
      seen(walker, event);
    }
    see(source, form, event);
  }
}

void Schema::see(ByteSource& source, const Form& form, const Event& event)
{
  if (event.what == What::nodeBegin && (options_.ends || !isEndNode(event.node)))
  {
    addNode(source, form, event.node);
  }
}

uint32_t Schema::childOf(uint32_t parent, uint16_t elm)
{
  const auto [found, isNew] =
      children_.try_emplace(uint64_t{parent} << 16 | elm, static_cast<uint32_t>(nodes_.size()));
  if (isNew)
  {
    nodes_.emplace_back();
    nodes_.back().elm = elm;
    uint32_t& last = nodes_[parent].lastChild;
    (last == 0 ? nodes_[parent].firstChild : nodes_[last].next) = found->second;
    last = found->second;
  }
  return found->second;
}

void Schema::addNode(ByteSource& source, const Form& form, const Node& node)
{
  open_.resize(static_cast<size_t>(node.depth));
  const uint32_t at = childOf(open_.empty() ? 0 : open_.back(), node.elm());
  open_.push_back(at);
  PathNode& path = nodes_[at];
  ++path.count;
  const auto place = std::lower_bound(path.types.begin(), path.types.end(), node.type());
  if (place == path.types.end() || *place != node.type())
  {
    path.types.insert(place, node.type());
  }
  if (!node.isGroup())
  {
    addValue(source, form, node, path);
  }
}

std::optional<Schema::Rank> Schema::rankOf(ByteSource& source, const Form& form, const Node& node)
{
  const uint16_t type = node.type();
  const bool wide = type == TAV_TYPE_UINT128 || type == TAV_TYPE_SINT128;
  const bool number = type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64;
  const uint64_t size = wide ? 16 : layout::typeInfo(type).valueSize;
  if (!(wide || number || type == TAV_TYPE_UTC_TIMESTAMP) || node.size() != size)
  {
    return std::nullopt;
  }
  const std::vector<uint8_t> bytes = payloadBytes(source, form, node, size);
  std::array<uint64_t, 3> words{};
  switch (type)
  {
  case TAV_TYPE_UINT8: words = wordsOf<uint8_t>(bytes); break;
  case TAV_TYPE_SINT8: words = wordsOf<int8_t>(bytes); break;
  case TAV_TYPE_UINT16: words = wordsOf<uint16_t>(bytes); break;
  case TAV_TYPE_SINT16: words = wordsOf<int16_t>(bytes); break;
  case TAV_TYPE_UINT32: words = wordsOf<uint32_t>(bytes); break;
  case TAV_TYPE_SINT32: words = wordsOf<int32_t>(bytes); break;
  case TAV_TYPE_UINT64: words = wordsOf<uint64_t>(bytes); break;
  case TAV_TYPE_SINT64: words = wordsOf<int64_t>(bytes); break;
  case TAV_TYPE_UTC_TIMESTAMP: words = wordsOfTime(load<TAVTimeStamp>(bytes)); break;
  default: words = wordsOf128(bytes, type == TAV_TYPE_SINT128); break;
  }
  return Rank{type == TAV_TYPE_UTC_TIMESTAMP ? 1u : 0u, words[0], words[1], words[2]};
}

void Schema::addValue(ByteSource& source, const Form& form, const Node& node, PathNode& path) const
{
  const auto rank = rankOf(source, form, node);
  if (!rank)
  {
    addText(source, form, node, path);
    return;
  }
  const bool first = !path.bounds;
  if (first)
  {
    path.bounds = std::make_unique<std::array<Bound, 2>>();
  }
  auto& [least, greatest] = *path.bounds;
  const auto put = [&](Bound& bound) {
    bound = {*rank, plainText(source, form, node, kMostNumber).value_or(""), node.type()};
  };
  if (first || *rank < least.rank)
  {
    put(least);
  }
  if (first || *rank > greatest.rank)
  {
    put(greatest);
  }
}

void Schema::addText(ByteSource& source, const Form& form, const Node& node, PathNode& path) const
{
  if (!path.texts)
  {
    path.texts = std::make_unique<Texts>();
  }
  Texts& texts = *path.texts;
  if (texts.more)
  {
    return;
  }
  const uint64_t room = roomForTexts();
  // Bytes are told apart as they are shown, which is twice as long.
  auto text = plainText(source, form, node, room - texts.bytes);
  if (text && texts.seen.contains(*text))
  {
    if (isPart_)
    {
      texts.inOrder.back().repeat = std::max(texts.inOrder.back().repeat, node.size());
    }
    return;
  }
  if (!text || text->size() > room - texts.bytes || texts.count == options_.mostTexts)
  {
    endTexts(texts);
    return;
  }
  texts.bytes += text->size();
  ++texts.count;
  const auto place = texts.seen.insert(std::move(*text)).first;
  if (isPart_)
  {
    texts.inOrder.push_back({&*place, node.size(), 0});
  }
}

uint64_t Schema::roomForTexts() const
{
  return options_.mostTexts > ~uint64_t{0} / kBytesOfText ? ~uint64_t{0} : options_.mostTexts * kBytesOfText;
}

void Schema::endTexts(Texts& texts) const
{
  texts.more = true;
  if (!isPart_)
  {
    texts.seen = {};
  }
}

SchemaEntry Schema::entryOf(const PathNode& path)
{
  SchemaEntry entry;
  entry.count = path.count;
  entry.types = path.types;
  if (path.bounds)
  {
    const auto& [least, greatest] = *path.bounds;
    entry.least = least.text;
    entry.leastType = least.type;
    entry.greatest = greatest.text;
    entry.greatestType = greatest.type;
  }
  if (path.texts)
  {
    entry.distinct = path.texts->count;
    entry.more = path.texts->more;
  }
  return entry;
}

std::string Schema::pathText(const std::vector<uint16_t>& steps, PathStyle style, uint64_t mostSteps) const
{
  if (style == PathStyle::whole && steps.size() > mostSteps)
  {
    return "/**/" + elementText(steps.back(), dictionary_);
  }
  return textOfSteps(steps.size(), style, [this, &steps](std::string& text, uint64_t i) {
    text += "/" + elementText(steps[static_cast<size_t>(i)], dictionary_);
  });
}

void Schema::each(PathStyle style, const std::function<void(const SchemaEntry&)>& told, uint64_t mostSteps) const
{
  std::vector<uint32_t> way{0};
  std::vector<uint16_t> steps;
  uint32_t at = nodes_.front().firstChild;
  while (at != 0)
  {
    const PathNode& path = nodes_[at];
    steps.push_back(path.elm);
    SchemaEntry entry = entryOf(path);
    entry.path = pathText(steps, style, mostSteps);
    told(entry);
    way.push_back(at);
    uint32_t next = path.firstChild;
    while (next == 0 && way.size() > 1)
    {
      next = nodes_[way.back()].next;
      way.pop_back();
      steps.pop_back();
    }
    at = next;
  }
}

} // namespace tav::inspect
