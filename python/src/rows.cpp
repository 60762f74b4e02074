#include "python/src/rows.h"

#include <algorithm>

#include "python/src/values.h"
#include "python/src/walkBelow.h"

namespace tav::python
{

/// The widest values come first, so that each column is aligned where the one before it ends.
template<class Use>
void Rows::eachColumn(const Use& use)
{
  use(parent);
  use(offset);
  use(size);
  use(number);
  use(time);
  use(depth);
  use(place_);
  use(id);
  use(type);
  use(key);
  use(kind);
}

void Rows::grow()
{
  constexpr size_t bytesOfRow = 24; // of most nodes, in a stream
  constexpr size_t mostAtFirst = size_t{1} << 20U;
  constexpr size_t few = 64;
  const size_t room = room_ == 0 ? std::min(opened_->bytes.size() / bytesOfRow, mostAtFirst) + few : room_ * 2;
  size_t width = 0;
  eachColumn([&](auto& column) { width += sizeof(column[0]); });
  auto* const block = static_cast<uint8_t*>(std::malloc(room * width));
  if (block == nullptr)
  {
    throw std::bad_alloc();
  }
  uint8_t* place = block;
  eachColumn([&](auto& column) { column.move(place, room, count_); });
  std::free(std::exchange(block_, block));
  room_ = room;
}

template<class Number>
Kind Rows::takeNumber(const tav::detail::RawValue& raw, size_t row)
{
  Number value{};
  if (tav::detail::decode(raw, value) != TAV_RC_OK)
  {
    return Kind::bytes;
  }
  number[row] = static_cast<uint64_t>(static_cast<int64_t>(value));
  if constexpr (std::is_signed_v<Number>)
  {
    hasNegative |= value < 0;
  }
  else if constexpr (sizeof(Number) == sizeof(uint64_t))
  {
    number[row] = value;
    hasUpper |= (value >> 63U) != 0;
  }
  return Kind::number;
}

Kind Rows::takeTime(const tav::detail::RawValue& raw, size_t row)
{
  TAVTimeStamp stamp{};
  if (tav::detail::decode(raw, stamp) != TAV_RC_OK)
  {
    return Kind::bytes;
  }
  int64_t nanoseconds = 0;
  const bool fits = nanosecondsFit(stamp, nanoseconds);
  time[row] = fits ? nanoseconds : kNoTime;
  return fits ? Kind::time : Kind::none;
}

inline Kind Rows::classify(const tav::detail::RawValue& raw, size_t row)
{
  switch (raw.type)
  {
  case TAV_TYPE_UINT8:
    return takeNumber<uint8_t>(raw, row);
  case TAV_TYPE_SINT8:
    return takeNumber<int8_t>(raw, row);
  case TAV_TYPE_UINT16:
    return takeNumber<uint16_t>(raw, row);
  case TAV_TYPE_SINT16:
    return takeNumber<int16_t>(raw, row);
  case TAV_TYPE_UINT32:
    return takeNumber<uint32_t>(raw, row);
  case TAV_TYPE_SINT32:
    return takeNumber<int32_t>(raw, row);
  case TAV_TYPE_UINT64:
    return takeNumber<uint64_t>(raw, row);
  case TAV_TYPE_SINT64:
    return takeNumber<int64_t>(raw, row);
  case TAV_TYPE_UINT128:
  case TAV_TYPE_SINT128:
    return raw.size == 2 * sizeof(uint64_t) ? Kind::wide : Kind::bytes;
  case TAV_TYPE_BYTE:
    number[row] = raw.size == 1 ? *raw.bytes : 0;
    return raw.size == 1 ? Kind::number : Kind::bytes;
  case TAV_TYPE_UTC_TIMESTAMP:
    return takeTime(raw, row);
  case TAV_TYPE_ASCII_STRING:
    return Kind::text;
  case TAV_TYPE_UTF8_STRING:
    return raw.size >= sizeof(uint16_t) ? Kind::text : Kind::bytes;
  default:
    return Kind::bytes;
  }
}

inline void Rows::add(const Step& step, int64_t parentRow, bool swapped)
{
  if (count_ == room_)
  {
    grow();
  }
  const size_t row = count_++;
  const TAVHeader& header = step.header;
  const uint64_t bytesOf = layout::sizeOf(header);
  const uint16_t typeOf = layout::typeOf(header);
  parent[row] = parentRow;
  depth[row] = static_cast<uint32_t>(step.depth);
  offset[row] = header.nodeOffset;
  size[row] = bytesOf;
  id[row] = layout::elmOf(header);
  type[row] = typeOf;
  key[row] = static_cast<uint16_t>(layout::infoOf(header) & TAV_INFO_KEY_MASK);
  number[row] = 0;
  time[row] = kNoTime;
  if (step.path != nullptr)
  {
    paths.push_back(*step.path);
  }
  if (step.payload == nullptr)
  {
    kind[row] = Kind::none;
    return;
  }
  const Kind found = classify({typeOf, step.payload, bytesOf, swapped}, row);
  kind[row] = found;
  if (found == Kind::text || found == Kind::bytes || found == Kind::wide)
  {
    place_[row] = static_cast<uint32_t>(rests_.size());
    rests_.push_back({step.payload, swapped});
    hasWide |= found == Kind::wide;
    if (found != Kind::wide)
    {
      (found == Kind::text ? texts : bytes).push_back(row);
    }
  }
}

tav::detail::RawValue Rows::rest(size_t row) const
{
  const Rest& found = rests_[place_[row]];
  return {type[row], found.payload, size[row], found.swapped};
}

void Rows::fill(inspect::ByteSource& source, bool withPaths, Pass& pass)
{
  for (const WalkRoot& root : rootsOf(*opened_))
  {
    const tav::Reader reader(std::as_bytes(opened_->bytes), layerOptions(root.form.swapped, root.form.aligned));
    std::vector<int64_t> open{static_cast<int64_t>(count_)}; // the groups around, by depth
    const TAVHeader& header = root.node.header();
    const bool isGroup = root.node.isGroup();
    std::string path = withPaths ? opened_->document.pathOf(root.node) : std::string();
    const uint8_t* const payload = isGroup ? nullptr : payloadIn(opened_->bytes, header);
    add(Step{header, payload, 0, isGroup, withPaths ? &path : nullptr}, -1, root.form.swapped);
    walkBelow(*opened_, source, reader, root, withPaths, [&](const Step& step) {
      const auto level = static_cast<size_t>(step.depth);
      if (open.size() != level)
      {
        open.resize(level);
      }
      const int64_t around = open.back();
      if (step.isGroup)
      {
        open.push_back(static_cast<int64_t>(count_));
      }
      pass.at(step.header.nodeOffset);
      add(step, around, root.form.swapped);
    });
  }
}

} // namespace tav::python
