// What rows of nodes say of values, and the rows of a file's parts.
#include <bit>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/streams.h"
#include "tav/inspect/nodeColumns.hpp"
#include "tav/inspect/plan.hpp"

using namespace tav::inspect;
using test::Bytes;

namespace
{

std::string asText(ValueKind kind, uint64_t number, const Bytes& bytes)
{
  return std::to_string(static_cast<unsigned>(kind)) + ' ' + std::to_string(number) + ' ' +
         std::string(bytes.begin(), bytes.end());
}

/// The value in a row.
std::string valueOf(const NodeColumns& columns, size_t row)
{
  switch (columns.kind[row])
  {
  case ValueKind::none: return asText(ValueKind::none, 0, {});
  case ValueKind::number: return asText(ValueKind::number, columns.number[row], {});
  case ValueKind::time: return asText(ValueKind::time, static_cast<uint64_t>(columns.time[row]), {});
  default: break;
  }
  const tav::detail::RawValue raw = columns.rest(row);
  return asText(columns.kind[row], 0, {raw.bytes, raw.bytes + raw.length()});
}

/// An integer of any width, its sign carried on to 64 bits.
uint64_t integerIn(const Bytes& payload, size_t from, size_t length, bool swapped, bool isSigned)
{
  const bool isLittle = (std::endian::native == std::endian::little) != swapped;
  uint64_t value = 0;
  for (size_t i = 0; i < length; ++i)
  {
    value = value << 8U | payload[from + (isLittle ? length - 1 - i : i)];
  }
  const bool isNegative = isSigned && (value >> (8 * length - 1)) != 0;
  return isNegative && length < 8 ? value | ~uint64_t{0} << (8 * length) : value;
}

/// A timestamp's seconds, milliseconds and microseconds, where nanoseconds hold them.
std::string timeIn(const Bytes& payload, bool swapped)
{
  const uint64_t seconds = integerIn(payload, 0, 8, swapped, false);
  const uint64_t fraction =
      integerIn(payload, 8, 2, swapped, false) * 1'000'000 + integerIn(payload, 10, 2, swapped, false) * 1000;
  return seconds <= (uint64_t{INT64_MAX} - fraction) / 1'000'000'000
             ? asText(ValueKind::time, seconds * 1'000'000'000 + fraction, {})
             : asText(ValueKind::none, 0, {});
}

/// The value that a node's bytes are.
std::string valueIn(const Bytes& payload, uint16_t type, bool swapped)
{
  struct Integer
  {
    uint16_t type;
    size_t length;
    bool isSigned;
  };
  constexpr Integer integers[] = {
      {TAV_TYPE_UINT8, 1, false},
      {TAV_TYPE_SINT8, 1, true},
      {TAV_TYPE_UINT16, 2, false},
      {TAV_TYPE_SINT16, 2, true},
      {TAV_TYPE_UINT32, 4, false},
      {TAV_TYPE_SINT32, 4, true},
      {TAV_TYPE_UINT64, 8, false},
      {TAV_TYPE_SINT64, 8, true},
      {TAV_TYPE_BYTE, 1, false},
  };
  for (const Integer& integer : integers)
  {
    if (integer.type == type && integer.length == payload.size())
    {
      return asText(ValueKind::number, integerIn(payload, 0, integer.length, swapped, integer.isSigned), {});
    }
  }
  const bool isWide = (type == TAV_TYPE_UINT128 || type == TAV_TYPE_SINT128) && payload.size() == 16;
  const bool isText = type == TAV_TYPE_ASCII_STRING || (type == TAV_TYPE_UTF8_STRING && payload.size() >= 2);
  if (type == TAV_TYPE_UTC_TIMESTAMP && payload.size() == sizeof(TAVTimeStamp))
  {
    return timeIn(payload, swapped);
  }
  return asText(isWide ? ValueKind::wide : isText ? ValueKind::text
                                                  : ValueKind::bytes,
                0, payload);
}

/// The values of all nodes, by a walk; those that are not whole are none.
std::vector<std::string> valuesByWalk(const Bytes& bytes, const Form& form)
{
  std::vector<std::string> values;
  ByteSource source("x", std::span<const uint8_t>(bytes));
  StreamWalk walk(source, form, [](const PassedOver&) {});
  for (Event event; walk.next(event);)
  {
    if (event.what != What::nodeBegin || isEndPiece(event))
    {
      continue;
    }
    const tav::inspect::Node& node = event.node;
    const uint64_t from = std::min<uint64_t>(node.payloadOffset(), bytes.size());
    const bool isWhole = !node.isGroup() && node.size() <= bytes.size() - from;
    const auto first = bytes.begin() + static_cast<ptrdiff_t>(from);
    values.push_back(isWhole ? valueIn({first, first + static_cast<ptrdiff_t>(node.size())}, node.type(),
                                       walk.walker().form().swapped)
                             : asText(ValueKind::none, 0, {}));
  }
  return values;
}

/// A source of bytes in memory, or one that reads them in pages as it does a file's.
std::unique_ptr<ByteSource> sourceOf(const Bytes& bytes, bool inMemory)
{
  if (inMemory)
  {
    return std::make_unique<ByteSource>("x", std::span<const uint8_t>(bytes));
  }
  auto storage = std::make_unique<TAVSSMemory>(const_cast<uint8_t*>(bytes.data()), bytes.size());
  return std::make_unique<ByteSource>("x", std::move(storage));
}

struct Row
{
  int64_t parent = 0;
  uint64_t offset = 0;
  uint64_t depth = 0;
  std::string value{};

  bool operator==(const Row&) const = default;
};

struct RowsOfAPart
{
  std::vector<Row> rows{};
  std::vector<int64_t> open{};
  PartEnd end{};
};

RowsOfAPart rowsOf(NodeReader& reader, size_t atOnce)
{
  RowsOfAPart found;
  NodeColumns columns;
  while (reader.next(columns, atOnce))
  {
  }
  for (size_t row = 0; row < columns.count(); ++row)
  {
    found.rows.push_back({columns.parent[row], columns.offset[row], columns.depth[row], valueOf(columns, row)});
  }
  found.open = reader.open();
  found.end = reader.end();
  return found;
}

/// The rows of all parts, one after another, with parents as in the whole file.
std::vector<Row> joined(const std::vector<RowsOfAPart>& parts)
{
  std::vector<Row> all;
  std::vector<int64_t> around;
  for (const RowsOfAPart& part : parts)
  {
    const auto before = static_cast<int64_t>(all.size());
    const auto inFile = [&](int64_t row) {
      const bool isAround = row < NodeColumns::kNoParent;
      return row >= 0 ? before + row : isAround ? around.at(static_cast<size_t>(-2 - row))
                                                : row;
    };
    for (Row row : part.rows)
    {
      row.parent = inFile(row.parent);
      all.push_back(row);
    }
    std::vector<int64_t> behind;
    for (const int64_t row : part.open)
    {
      behind.push_back(inFile(row));
    }
    around = std::move(behind);
  }
  return all;
}

std::vector<Row> rowsInParts(ByteSource& source, const Form& form, uint64_t target)
{
  std::vector<Part> parts =
      plan(source,
           {.targetBytes = target, .form = {.swapped = form.swapped, .root64 = form.root64, .aligned = form.aligned}});
  std::vector<RowsOfAPart> found(parts.size());
  std::vector<PartEnd> ends(parts.size());
  const auto read = [&](size_t i) {
    NodeReader reader(source, parts[i], {.onDamage = OnDamage::skip});
    found[i] = rowsOf(reader, 3);
    ends[i] = found[i].end;
    EXPECT_EQ(found[i].open.size(), ends[i].behind.around.size());
  };
  for (size_t i = 0; i < parts.size(); ++i)
  {
    read(i);
  }
  while (const auto i = mendParts(parts, ends))
  {
    read(*i);
  }
  return joined(found);
}

struct Stream
{
  Bytes bytes;
  Form form;
};

/// Sound and damaged streams, of elements that are all different and of such that are named again and again.
std::vector<Stream> streamsOf(uint64_t seed)
{
  std::vector<Stream> streams;
  const test::Tree tree = test::randomTree(seed, {.depth = 6, .width = 12});
  streams.push_back({test::bytesOfTree(tree), test::readForm(tree.form)});
  const Form named{.swapped = seed % 2 == 0, .root64 = true, .aligned = seed % 3 == 0};
  streams.push_back({test::namedStream(seed, named.swapped, named.aligned), named});
  streams.push_back({test::damaged(streams[0].bytes, seed), streams[0].form});
  streams.push_back({test::damaged(streams[1].bytes, seed), named});
  return streams;
}

} // namespace

TEST(NodeRows, HaveTheValuesThatTheBytesAre)
{
  for (uint64_t seed = 1; seed <= 60; ++seed)
  {
    SCOPED_TRACE(seed);
    for (const Stream& stream : streamsOf(seed))
    {
      const std::vector<std::string> expected = valuesByWalk(stream.bytes, stream.form);
      for (const bool inMemory : {true, false})
      {
        const auto source = sourceOf(stream.bytes, inMemory);
        NodeReader reader(*source, stream.form, {.onDamage = OnDamage::skip});
        std::vector<std::string> found;
        for (const Row& row : rowsOf(reader, 5).rows)
        {
          found.push_back(row.value);
        }
        ASSERT_EQ(found, expected);
      }
    }
  }
}

TEST(NodeRows, HaveTimesAsFarAsNanosecondsReach)
{
  constexpr uint64_t lastSecond = 9223372036; // of which 854,775,807 ns can be told
  const std::vector<std::pair<TAVTimeStamp, bool>> stamps = {{{lastSecond, 854, 775, 0, 0}, true},
                                                             {{lastSecond, 854, 776, 0, 0}, false},
                                                             {{lastSecond - 1, 999, 999, 0, 0}, true},
                                                             {{lastSecond + 1, 0, 0, 0, 0}, false},
                                                             {{0, 0, 0, 0, 0}, true}};
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (const auto& [stamp, fits] : stamps)
    {
      system.add(TAV_ELM_CMN_HOST_NAME, stamp);
    }
  }
  writer.finish();
  const Bytes bytes = test::bytesOf(writer.bytes());
  ByteSource source("x", std::span<const uint8_t>(bytes));
  NodeReader reader(source, Form{});
  NodeColumns columns;
  ASSERT_TRUE(reader.next(columns));
  ASSERT_EQ(columns.count(), stamps.size() + 1);
  for (size_t i = 0; i < stamps.size(); ++i)
  {
    const auto& [stamp, fits] = stamps[i];
    const uint64_t time =
        stamp.seconds * 1'000'000'000 + stamp.fractionA * uint64_t{1'000'000} + stamp.fractionB * uint64_t{1000};
    EXPECT_EQ(columns.kind[i + 1], fits ? ValueKind::time : ValueKind::none) << i;
    EXPECT_EQ(columns.time[i + 1], fits ? static_cast<int64_t>(time) : NodeColumns::kNoTime) << i;
  }
}

TEST(NodeRows, OfAllPartsAreThoseOfTheFile)
{
  for (uint64_t seed = 1; seed <= 40; ++seed)
  {
    SCOPED_TRACE(seed);
    for (const Stream& stream : streamsOf(seed))
    {
      const auto source = sourceOf(stream.bytes, seed % 2 == 0);
      NodeReader reader(*source, stream.form, {.onDamage = OnDamage::skip});
      const std::vector<Row> whole = rowsOf(reader, NodeReader::kBatch).rows;
      for (const uint64_t target : {uint64_t{1}, uint64_t{60}, uint64_t{500}})
      {
        ASSERT_EQ(rowsInParts(*source, stream.form, target), whole) << target;
      }
    }
  }
}
