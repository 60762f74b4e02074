#include "inspect/diff/index.h"

#include <algorithm>
#include <cstring>

#include "inspect/path/selection.h"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr uint64_t kRow = sizeof(Row);
constexpr size_t kWindow = 256; ///< rows read at once
constexpr uint64_t kPiece = uint64_t{64} * 1024;
constexpr size_t kMaxSteps = 64; ///< deeper nodes are named by their offset

/// Elements by which groups of one kind are told apart, with their values.
constexpr std::array<uint16_t, 3> kKeys = {307, 321, TAV_ELM_CMN_HOST_NAME};

void mix(uint64_t& hash, uint64_t value)
{
  hash = (hash ^ value) * 0x9E3779B97F4A7C15u;
  hash ^= hash >> 29;
}

Node nodeOf(const Row& row)
{
  Node node;
  node.header.hdrType = TAV_HDR_64;
  node.header.hdr64 = {row.size, 0, row.type, row.elm};
  // So that the payload begins where it does, whatever header is before it.
  node.header.nodeOffset = row.payload - kHeaderSize64;
  node.limit = row.payload + row.size;
  return node;
}

} // namespace

DiffIndex::DiffIndex(const DiffInput& input, const DiffOptions& options,
                     const std::function<void(const Walker&, const Event&)>& seen)
    : source_(input.source), form_(input.form), scratch_(options.makeFile()), file_(scratch_->file()),
      keys_(options.keys.empty() ? std::vector<uint16_t>(kKeys.begin(), kKeys.end()) : options.keys)
{
  walk(input, options, seen);
}

void DiffIndex::walk(const DiffInput& input, const DiffOptions& options,
                     const std::function<void(const Walker&, const Event&)>& seen)
{
  Selection ignored(options.ignored);
  std::optional<Selection> wanted;
  if (input.path)
  {
    wanted.emplace(std::span(&*input.path, 1));
  }
  std::optional<uint64_t> top; // depth of the node that the path leads to
  Walker walker(source_, form_);
  for (Event event; walker.next(event);)
  {
    seen(walker, event);
    const bool begins = event.what == What::nodeBegin && ignoredDepth_ == kNoRow;
    const bool ignore = begins && ignored.at(walker, event).has_value();
    if (wanted && !top)
    {
      if (!begins || !wanted->at(walker, event))
      {
        begins&& event.node.isGroup() && !wanted->reachesBelow() ? void(walker.skip()) : void();
        continue;
      }
      top = event.depth;
      begin(walker, event);
    }
    add(event, ignore);
    if (top && event.what == What::nodeEnd && event.depth == *top)
    {
      return;
    }
  }
  if (wanted && !top)
  {
    throw Error(noMatch(*input.path, source_.name()), Trouble::notFound);
  }
}

/// The first row is inside of groups that are none.
void DiffIndex::begin(const Walker& walker, const Event& event)
{
  prefixSteps_ = event.depth;
  if (prefixSteps_ <= kMaxSteps)
  {
    prefix_ = walker.path(event);
    prefix_.resize(prefix_.rfind('/'));
  }
}

Row DiffIndex::rowOf(const Event& event) const
{
  const Node& node = event.node;
  Row row;
  row.offset = event.offset;
  row.parent = open_.empty() ? kNoRow : open_.back().number;
  row.size = event.what == What::damaged ? event.length : node.isGroup() ? 0
                                                                         : node.size();
  row.payload = event.what == What::damaged ? event.offset : node.payloadOffset();
  row.ordinal = node.ordinal;
  if (event.what != What::damaged)
  {
    row.info = node.info() & ~uint32_t{TAV_INFO_ALIGNED8 | TAV_INFO_EYE_SIZE};
    row.type = node.isGroup() ? TAV_TYPE_HEADER64 : node.type();
    row.elm = node.elm();
  }
  return row;
}

void DiffIndex::add(const Event& event, bool ignore)
{
  if (ignoredDepth_ != kNoRow)
  {
    ignoredDepth_ = event.what == What::nodeEnd && event.depth == ignoredDepth_ ? kNoRow : ignoredDepth_;
    return;
  }
  if (event.what == What::nodeEnd && event.node.isGroup())
  {
    endGroup(event.offset);
  }
  if (event.what == What::damaged)
  {
    addData(rowOf(event));
  }
  if (event.what != What::nodeBegin)
  {
    return;
  }
  // End elements say nothing but where a group ends.
  if (ignore || isEndNode(event.node))
  {
    ignoredDepth_ = event.depth;
    return;
  }
  if (!event.node.isGroup())
  {
    addData(rowOf(event));
    return;
  }
  Open open;
  open.row = rowOf(event);
  open.number = count_;
  open.keys.resize(keys_.size());
  open_.push_back(open);
  append(open.row);
}

void DiffIndex::addData(const Row& given)
{
  Row row = given;
  row.next = count_ + 1;
  row.hash = payloadHash(row);
  if (!open_.empty())
  {
    mix(open_.back().row.hash, row.hash);
    for (size_t i = 0; i < keys_.size(); ++i)
    {
      uint64_t& key = open_.back().keys[i];
      key = row.elm == keys_[i] && !row.isDamaged() && key == 0 ? row.hash : key;
    }
  }
  append(row);
}

void DiffIndex::endGroup(uint64_t end)
{
  Open open = open_.back();
  open_.pop_back();
  open.row.next = count_;
  open.row.size = end - open.row.payload;
  mix(open.row.hash, open.row.elm);
  mix(open.row.hash, open.row.info);
  for (const uint64_t key : open.keys)
  {
    if (key != 0)
    {
      mix(open.row.key, key);
    }
  }
  if (!open_.empty())
  {
    mix(open_.back().row.hash, open.row.hash);
  }
  put(open.number, open.row);
}

uint64_t DiffIndex::payloadHash(const Row& row)
{
  uint64_t hash = 14695981039346656037u;
  mix(hash, row.elm);
  mix(hash, row.type ^ uint64_t{row.info} << 32);
  mix(hash, row.size);
  for (uint64_t at = 0; at < row.size;)
  {
    const std::span<const uint8_t> bytes = piece(row, at, kPiece);
    if (bytes.empty())
    {
      break;
    }
    for (size_t i = 0; i < bytes.size(); i += 8)
    {
      uint64_t word = 0;
      std::memcpy(&word, bytes.data() + i, std::min<size_t>(8, bytes.size() - i));
      mix(hash, word);
    }
    at += bytes.size();
  }
  return hash == 0 ? 1 : hash;
}

std::span<const uint8_t> DiffIndex::piece(const Row& row, uint64_t at, uint64_t most)
{
  piece_.resize(static_cast<size_t>(std::min({most, row.size - at, source_.size()})));
  piece_.resize(source_.read(row.payload + at, piece_));
  const SwapRule rule = typeInfo(row.type).swapRule;
  if (!form_.swapped || row.isDamaged() || (at != 0 && rule != SwapRule::all64))
  {
    return piece_;
  }
  const uint64_t prefix = row.size < swapUnitLength(rule) ? 0 : swappedPrefix(rule, piece_.size());
  const std::vector<uint8_t> stored(piece_.begin(), piece_.begin() + static_cast<ptrdiff_t>(prefix));
  swapPayload(rule, stored.data(), piece_.data(), prefix);
  return piece_;
}

void DiffIndex::append(const Row& row)
{
  file_.append(std::span(reinterpret_cast<const uint8_t*>(&row), sizeof row));
  ++count_;
}

void DiffIndex::put(uint64_t number, const Row& row)
{
  file_.patch(number * kRow, std::span(reinterpret_cast<const uint8_t*>(&row), sizeof row));
}

Row DiffIndex::row(uint64_t number)
{
  if (number < windowStart_ || number - windowStart_ >= window_.size())
  {
    window_.resize(static_cast<size_t>(std::min<uint64_t>(kWindow, count_ - number)));
    file_.read(number * kRow, std::span(reinterpret_cast<uint8_t*>(window_.data()), window_.size() * sizeof(Row)));
    windowStart_ = number;
  }
  return window_[static_cast<size_t>(number - windowStart_)];
}

std::string DiffIndex::path(uint64_t number)
{
  std::vector<Row> steps;
  Row at = row(number);
  if (!at.isDamaged())
  {
    steps.push_back(at);
  }
  while (at.parent != kNoRow && steps.size() <= kMaxSteps)
  {
    at = row(at.parent);
    steps.push_back(at);
  }
  std::string text = prefix_;
  if (steps.size() + prefixSteps_ > kMaxSteps)
  {
    steps.resize(1);           // damaged bytes: the group around them
    steps.front().ordinal = 0; // makes it be named by its offset
    text = "/**";
  }
  std::for_each(steps.rbegin(), steps.rend(), [this, &text](const auto& step) {
    Node node = nodeOf(step);
    node.ordinal = step.ordinal;
    node.header.nodeOffset = step.offset;
    appendStep(text, node, source_.dictionary());
  });
  return text.empty() ? "/" : text; // damaged bytes have the path of the group around them
}

std::string DiffIndex::value(const Row& row, uint64_t most)
{
  if (row.isDamaged())
  {
    const std::string bytes = hexText(piece(row, 0, std::min<uint64_t>(most, 32)));
    return bytes + (row.size > 32 ? " ..." : "");
  }
  return valueText(source_, form_, nodeOf(row), most);
}

std::string DiffIndex::kindText(const Row& row)
{
  return row.isDamaged() ? "damaged at " + hexOffset(row.offset) : typeText(row.type);
}

std::string DiffIndex::text(uint64_t number)
{
  constexpr uint64_t most = 200;
  const Row at = row(number);
  if (at.isGroup())
  {
    return "group of " + counted(at.next - number - 1, "node");
  }
  return kindText(at) + "  " + value(at, most);
}

} // namespace tav::inspect
