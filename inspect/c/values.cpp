// Values, names and messages of tav_c.h.
#include <array>
#include <chrono>

#include "inspect/c/node.h"
#include "inspect/dictionary/builtIn.h"
#include "tav/cpp/decode.hpp"
#include "tav/inspect/path.hpp"

using namespace tav;
using namespace tav::inspect;

namespace tav::inspect
{

namespace
{

/// Calls `use` with the node's header and form; a node of another reader is refused.
template<class Use>
uint32_t withNode(const tav_reader* reader, const tav_node* node, bool hasResults, Use&& use)
{
  if (reader == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  return guarded(&reader->failure, [&] {
    PlacedNode placed;
    if (node == nullptr || !hasResults || !take(*reader, *node, placed))
    {
      return failed(reader->failure, TAV_RC_BAD_PARAM, "an argument is null, or a node of another reader");
    }
    const uint32_t rc = layout::isGroup(placed.header) ? uint32_t{TAV_RC_NOT_SUPPORTED} : use(placed);
    if (rc != TAV_RC_OK)
    {
      reader->failure.set(Problem{.file = reader->state().source->name(),
                                  .offset = placed.header.nodeOffset,
                                  .sentence = "the value cannot be read so: " + std::string(codeSentence(rc)),
                                  .code = rc});
      reader->failure.wantsPath = true;
    }
    return rc;
  });
}

/// Calls `decode` with the bytes of a value of a fixed size. One that is larger than all of those fits none of them.
template<class Decode>
uint32_t withValue(const tav_reader* reader, const tav_node* node, bool hasResults, Decode&& decode)
{
  return withNode(reader, node, hasResults, [&](const PlacedNode& placed) {
    std::array<uint8_t, 24> bytes{};
    const uint64_t size = layout::sizeOf(placed.header);
    const auto room = std::span(bytes).first(static_cast<size_t>(std::min<uint64_t>(size, bytes.size())));
    if (reader->state().source->read(payloadOffset(placed.header), room) != room.size())
    {
      return uint32_t{TAV_RC_DATA_TOO_LARGE};
    }
    return decode(detail::RawValue{layout::typeOf(placed.header), bytes.data(), room.size(), placed.form.swapped});
  });
}

template<class Number>
uint32_t getNumber(const tav_reader* reader, const tav_node* node, Number* value)
{
  return withValue(reader, node, value != nullptr,
                   [value](const detail::RawValue& raw) { return detail::decodeNumber(raw, *value); });
}

uint32_t decodeLong(const detail::RawValue& raw, Uint128& number)
{
  if (raw.type == TAV_TYPE_UINT128)
  {
    return detail::decode(raw, number);
  }
  if (raw.type == TAV_TYPE_SINT128)
  {
    Sint128 found;
    const uint32_t rc = detail::decode(raw, found);
    number = {static_cast<uint64_t>(found.high), found.low};
    return rc == TAV_RC_OK && found.high < 0 ? uint32_t{TAV_RC_OUTSIDE_PARENT} : rc;
  }
  number.high = 0;
  return detail::decodeNumber(raw, number.low);
}

/// A payload that is handed out whole.
uint32_t wholePayload(const tav_reader& reader, const PlacedNode& placed, detail::RawValue& raw)
{
  const uint8_t* const bytes = payloadOf(reader, placed.header);
  raw = {layout::typeOf(placed.header), bytes, layout::sizeOf(placed.header), placed.form.swapped};
  return bytes != nullptr ? TAV_RC_OK : TAV_RC_DATA_TOO_LARGE;
}

uint32_t idNamed(const char* name, uint16_t* elm, const Dictionary& dictionary)
{
  return guarded(nullptr, [&] {
    if (name == nullptr || elm == nullptr)
    {
      return uint32_t{TAV_RC_BAD_PARAM};
    }
    const std::vector<uint16_t> ids = idsOf(name, dictionary);
    if (ids.empty())
    {
      return uint32_t{TAV_RC_NOT_FOUND};
    }
    *elm = ids.front();
    return uint32_t{TAV_RC_OK};
  });
}

} // namespace

} // namespace tav::inspect

uint32_t tav_get_u64(const tav_reader* reader, const tav_node* node, uint64_t* value)
{
  return getNumber(reader, node, value);
}

uint32_t tav_get_i64(const tav_reader* reader, const tav_node* node, int64_t* value)
{
  return getNumber(reader, node, value);
}

uint32_t tav_get_u128(const tav_reader* reader, const tav_node* node, uint64_t* high, uint64_t* low)
{
  return withValue(reader, node, high != nullptr && low != nullptr, [=](const detail::RawValue& raw) {
    Uint128 number;
    const uint32_t rc = decodeLong(raw, number);
    if (rc == TAV_RC_OK)
    {
      *high = number.high;
      *low = number.low;
    }
    return rc;
  });
}

uint32_t tav_get_time(const tav_reader* reader, const tav_node* node, int64_t* nanoseconds)
{
  return withValue(reader, node, nanoseconds != nullptr, [nanoseconds](const detail::RawValue& raw) {
    std::chrono::sys_time<std::chrono::duration<int64_t, std::nano>> time;
    const uint32_t rc = detail::decode(raw, time);
    if (rc == TAV_RC_OK)
    {
      *nanoseconds = time.time_since_epoch().count();
    }
    return rc;
  });
}

uint32_t tav_get_text(const tav_reader* reader, const tav_node* node, const char** text, size_t* size)
{
  return withNode(reader, node, text != nullptr && size != nullptr, [=](const PlacedNode& placed) {
    const uint16_t type = layout::typeOf(placed.header);
    if (type != TAV_TYPE_ASCII_STRING && type != TAV_TYPE_UTF8_STRING)
    {
      return uint32_t{TAV_RC_NOT_SUPPORTED};
    }
    detail::RawValue raw{};
    std::string_view found;
    uint32_t rc = wholePayload(*reader, placed, raw);
    rc = rc == TAV_RC_OK ? detail::decode(raw, found) : rc;
    if (rc == TAV_RC_OK)
    {
      *text = found.data();
      *size = found.size();
    }
    return rc;
  });
}

uint32_t tav_get_bytes(const tav_reader* reader, const tav_node* node, const void** bytes, size_t* size)
{
  return withNode(reader, node, bytes != nullptr && size != nullptr, [=](const PlacedNode& placed) {
    detail::RawValue raw{};
    const uint32_t rc = wholePayload(*reader, placed, raw);
    if (rc == TAV_RC_OK)
    {
      *bytes = raw.bytes;
      *size = raw.length();
    }
    return rc;
  });
}

uint32_t tav_read(tav_reader* reader, const tav_node* node, uint64_t from, void* to, size_t* size)
{
  return withNode(reader, node, to != nullptr && size != nullptr, [=](const PlacedNode& placed) {
    const uint64_t whole = layout::sizeOf(placed.header);
    const uint64_t wanted = std::min<uint64_t>(*size, whole - std::min(from, whole));
    const uint64_t start = layout::addSaturated(payloadOffset(placed.header), from);
    const std::span<uint8_t> room(static_cast<uint8_t*>(to), static_cast<size_t>(wanted));
    const size_t done = reader->state().source->read(start, room);
    if (done != wanted)
    {
      return uint32_t{TAV_RC_DATA_TOO_LARGE};
    }
    *size = done;
    return uint32_t{TAV_RC_OK};
  });
}

const char* tav_tag(uint16_t elm)
{
  const std::string_view tag = builtInTag(elm);
  return tag.empty() ? nullptr : tag.data();
}

uint32_t tav_id(const char* name, uint16_t* elm)
{
  return idNamed(name, elm, {});
}

const char* tav_reader_tag(const tav_reader* reader, uint16_t elm)
{
  // of either kind a text with a zero behind it
  const std::string_view tag = reader == nullptr ? std::string_view() : reader->state().source->dictionary().tagOf(elm);
  return tag.empty() ? nullptr : tag.data();
}

uint32_t tav_reader_id(const tav_reader* reader, const char* name, uint16_t* elm)
{
  return reader == nullptr ? uint32_t{TAV_RC_BAD_PARAM} : idNamed(name, elm, reader->state().source->dictionary());
}

const char* tav_message(uint32_t rc)
{
  const auto* const text = tav::detail::codeTextOf(rc);
  return text != nullptr ? text->sentence : "unknown code";
}
