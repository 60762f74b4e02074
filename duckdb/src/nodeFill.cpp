#include "duckdb/src/nodeFill.h"

#include <algorithm>
#include <cstring>

#include "tav/cpp/decode.hpp"
#include "tav/cpp/header.hpp"
#include "tav/cpp/valueText.hpp"
#include "tav/inspect/jsonText.hpp"

namespace tav::sql
{

namespace
{

using inspect::NodeColumns;
using inspect::ValueKind;

struct Rows
{
  const NodeRows& rows;
  const NodeColumns& all;
  size_t from;
  size_t count;
};

template<class T>
void copy(Vector& to, const NodeColumns::Column<T>& column, const Rows& rows)
{
  std::memcpy(to.all<T>(), column.data() + rows.from, rows.count * sizeof(T));
}

void fillParents(Vector& to, const Rows& rows)
{
  for (size_t i = 0; i < rows.count; ++i)
  {
    const int64_t parent = rows.all.parent[rows.from + i];
    if (parent == NodeColumns::kNoParent)
    {
      to.putNull(i);
      continue;
    }
    to.put(i, parent < 0 ? static_cast<uint64_t>(rows.rows.around[static_cast<size_t>(-2 - parent)])
                         : static_cast<uint64_t>(parent) + (rows.rows.isPart ? rows.rows.first : 0));
  }
}

bool isSigned(uint16_t type)
{
  return tav::detail::isIntegerType(type) && (type - TAV_TYPE_UINT8) % 2 != 0;
}

/// A number of 128 bits; false where a signed one does not hold it.
bool wideOf(const tav::detail::RawValue& raw, uint64_t& high, uint64_t& low)
{
  if (raw.type == TAV_TYPE_SINT128)
  {
    tav::Sint128 number;
    static_cast<void>(tav::detail::decode(raw, number));
    high = static_cast<uint64_t>(number.high);
    low = number.low;
    return true;
  }
  tav::Uint128 number;
  static_cast<void>(tav::detail::decode(raw, number));
  high = number.high;
  low = number.low;
  return (high >> 63U) == 0;
}

void fillNumbers(Vector& to, const Rows& rows)
{
  for (size_t i = 0; i < rows.count; ++i)
  {
    const size_t row = rows.from + i;
    uint64_t low = rows.all.number[row];
    uint64_t high = isSigned(rows.all.type[row]) && (low >> 63U) != 0 ? ~uint64_t{0} : 0;
    const ValueKind kind = rows.all.kind[row];
    const bool isThere =
        kind == ValueKind::number || (kind == ValueKind::wide && wideOf(rows.all.rest(row), high, low));
    isThere ? to.putHuge(i, low, high) : to.putNull(i);
  }
}

std::string_view textOf(const tav::detail::RawValue& raw)
{
  const size_t page = raw.type == TAV_TYPE_UTF8_STRING ? sizeof(uint16_t) : 0; // the code page before the text
  return {reinterpret_cast<const char*>(raw.bytes) + page, raw.length() - page};
}

void fillTexts(Vector& to, const Rows& rows)
{
  for (size_t i = 0; i < rows.count; ++i)
  {
    const size_t row = rows.from + i;
    const ValueKind kind = rows.all.kind[row];
    uint64_t high = 0;
    uint64_t low = 0;
    if (kind == ValueKind::text)
    {
      to.putText(i, textOf(rows.all.rest(row)));
    }
    else if (kind == ValueKind::wide && !wideOf(rows.all.rest(row), high, low))
    {
      to.putText(i, tav::detail::longText(tav::Uint128{.high = high, .low = low}));
    }
    else
    {
      to.putNull(i);
    }
  }
}

void fillTimes(Vector& to, const Rows& rows)
{
  for (size_t i = 0; i < rows.count; ++i)
  {
    const bool isThere = rows.all.kind[rows.from + i] == ValueKind::time;
    isThere ? to.put(i, rows.all.time[rows.from + i]) : to.putNull(i);
  }
}

/// Words of an array are in this machine's order, all else is as it is stored.
void fillBytes(Vector& to, const Rows& rows)
{
  std::vector<uint64_t> words;
  for (size_t i = 0; i < rows.count; ++i)
  {
    const size_t row = rows.from + i;
    if (rows.all.kind[row] != ValueKind::bytes)
    {
      to.putNull(i);
      continue;
    }
    const tav::detail::RawValue raw = rows.all.rest(row);
    std::string_view bytes(reinterpret_cast<const char*>(raw.bytes), raw.length());
    if (raw.type == TAV_TYPE_UINT64_ARRAY && raw.swap && raw.size % sizeof(uint64_t) == 0)
    {
      words.resize(raw.length() / sizeof(uint64_t));
      std::copy(bytes.begin(), bytes.end(), reinterpret_cast<char*>(words.data()));
      std::transform(words.begin(), words.end(), words.begin(), [](uint64_t word) { return kor::byteswap64(word); });
      bytes = {reinterpret_cast<const char*>(words.data()), raw.length()};
    }
    to.putBytes(i, bytes);
  }
}

void fillPaths(Vector& to, const Rows& rows)
{
  const NodeColumns::Texts& paths = rows.all.paths;
  to.putJoined(rows.count, paths.joined(rows.from, rows.count), [&](idx_t i) { return paths[rows.from + i].size(); });
}

} // namespace

void NodeNames::begin()
{
  ++chunk_;
}

template<class NameOf>
void NodeNames::putName(std::vector<Last>& known, Vector& to, idx_t row, uint16_t number, const NameOf& nameOf) const
{
  known.resize(kNumbers);
  Last& last = known[number];
  if (last.chunk == chunk_) [[likely]]
  {
    to.repeat(row, last.row);
    return;
  }
  const auto name = nameOf(number);
  if (name.empty())
  {
    to.putNull(row);
    return;
  }
  to.putText(row, name);
  last = {chunk_, row};
}

void NodeNames::putTag(Vector& to, idx_t row, uint16_t id)
{
  putName(tags_, to, row, id, [this](uint16_t number) { return dictionary_.tagOf(number); });
}

void NodeNames::putType(Vector& to, idx_t row, uint16_t type)
{
  putName(types_, to, row, type,
          [](uint16_t number) { return inspect::jsonTypeName(number).value_or(std::to_string(number)); });
}

void fillColumn(Vector& to, size_t column, const NodeRows& nodes, size_t from, size_t count, NodeNames& names)
{
  const Rows rows{nodes, *nodes.columns, from, count};
  const auto each = [&](const auto& put) {
    for (size_t i = 0; i < count; ++i)
    {
      put(i, from + i);
    }
  };
  switch (column)
  {
  case kFile: each([&](size_t i, size_t) { i == 0 ? to.putText(i, nodes.file) : to.repeat(i, 0); }); break;
  case kOrd: each([&](size_t i, size_t row) { to.put(i, nodes.first + row); }); break;
  case kParent: fillParents(to, rows); break;
  case kDepth: copy(to, rows.all.depth, rows); break;
  case kOffset: copy(to, rows.all.offset, rows); break;
  case kSize: copy(to, rows.all.size, rows); break;
  case kId: copy(to, rows.all.id, rows); break;
  case kTag: each([&](size_t i, size_t row) { names.putTag(to, i, rows.all.id[row]); }); break;
  case kType: each([&](size_t i, size_t row) { names.putType(to, i, rows.all.type[row]); }); break;
  case kKey: copy(to, rows.all.key, rows); break;
  case kNumber: fillNumbers(to, rows); break;
  case kText: fillTexts(to, rows); break;
  case kTime: fillTimes(to, rows); break;
  case kBytes: fillBytes(to, rows); break;
  default: fillPaths(to, rows);
  }
}

} // namespace tav::sql
