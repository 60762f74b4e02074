#include <cstring>
#include <optional>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "tav/inspect/arrow.hpp"
#include "tav/inspect/table.hpp"

using namespace tav::inspect;
using test::Bytes;
using testing::ElementsAre;

namespace
{

/// A consumer that knows the interface alone.
class Batch
{
public:
  Batch(const ArrowSchema& schema, const ArrowArray& array)
      : schema_(schema), array_(array) {}

  /// Cells as text; "-" where there is none.
  std::vector<std::string> column(int64_t index) const
  {
    const ArrowSchema& type = *schema_.children[index];
    const ArrowArray& values = *array_.children[index];
    std::vector<std::string> cells;
    int64_t missing = 0;
    for (int64_t i = 0; i < values.length; ++i)
    {
      const auto* const bits = static_cast<const uint8_t*>(values.buffers[0]);
      const bool isThere = bits == nullptr || (bits[i / 8] >> i % 8 & 1) != 0;
      missing += isThere ? 0 : 1;
      cells.push_back(isThere ? cell(type, values, i) : "-");
    }
    EXPECT_EQ(values.length, array_.length);
    EXPECT_EQ(values.null_count, missing);
    EXPECT_EQ(values.offset, 0);
    return cells;
  }

private:
  template<class Number>
  static Number at(const void* buffer, int64_t index)
  {
    Number number{};
    std::memcpy(&number, static_cast<const char*>(buffer) + index * static_cast<int64_t>(sizeof number), sizeof number);
    return number;
  }

  static std::string cell(const ArrowSchema& type, const ArrowArray& values, int64_t i)
  {
    const std::string format = type.format;
    if (type.dictionary != nullptr)
    {
      EXPECT_EQ(format, "i");
      return cell(*type.dictionary, *values.dictionary, at<int32_t>(values.buffers[1], i));
    }
    if (format == "L")
    {
      return std::to_string(at<uint64_t>(values.buffers[1], i));
    }
    if (format == "l" || format == "tsn:UTC")
    {
      return std::to_string(at<int64_t>(values.buffers[1], i));
    }
    if (format == "d:38,0")
    {
      std::array<uint8_t, 16> number = at<std::array<uint8_t, 16>>(values.buffers[1], i);
      return int128Text(number, true);
    }
    EXPECT_TRUE(format == "u" || format == "z") << format;
    const auto begin = at<int32_t>(values.buffers[1], i);
    const auto end = at<int32_t>(values.buffers[1], i + 1);
    const std::string text(static_cast<const char*>(values.buffers[2]) + begin, static_cast<size_t>(end - begin));
    return format == "z" ? hexText(std::span(reinterpret_cast<const uint8_t*>(text.data()), text.size())) : text;
  }

  const ArrowSchema& schema_;
  const ArrowArray& array_;
};

/// All batches of a table: the formats of its columns, and their cells, column after column.
struct Consumed
{
  std::vector<std::string> names;
  std::vector<std::string> formats;
  std::vector<std::vector<std::string>> columns;
  std::vector<int64_t> lengths;
};

Consumed consume(const Table& table, const ArrowOptions& options = {})
{
  Consumed all;
  ArrowArrayStream stream{};
  toArrow(table, &stream, options);
  ArrowSchema schema{};
  EXPECT_EQ(stream.get_schema(&stream, &schema), 0);
  EXPECT_STREQ(schema.format, "+s");
  for (int64_t i = 0; i < schema.n_children; ++i)
  {
    const ArrowSchema& child = *schema.children[i];
    EXPECT_EQ(child.flags, ARROW_FLAG_NULLABLE);
    all.names.emplace_back(child.name);
    all.formats.push_back(child.format + std::string(child.dictionary != nullptr ? child.dictionary->format : ""));
  }
  all.columns.resize(all.names.size());
  std::vector<ArrowArray> batches;
  for (ArrowArray array{}; stream.get_next(&stream, &array) == 0 && array.release != nullptr;)
  {
    batches.push_back(array);
  }
  EXPECT_EQ(stream.get_last_error(&stream), nullptr);
  stream.release(&stream); // which batches and schemas outlive
  EXPECT_EQ(stream.release, nullptr);
  for (ArrowArray& array : batches)
  {
    all.lengths.push_back(array.length);
    for (int64_t i = 0; i < array.n_children; ++i)
    {
      const auto cells = Batch(schema, array).column(i);
      auto& to = all.columns[static_cast<size_t>(i)];
      to.insert(to.end(), cells.begin(), cells.end());
    }
    array.release(&array);
    EXPECT_EQ(array.release, nullptr);
  }
  schema.release(&schema);
  return all;
}

/// Rows with the columns cpuOnline and hostName, of which `add` says what they have.
template<class Add>
Table tableOf(int rows, const Add& add)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (int i = 0; i < rows; ++i)
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      add(host, i);
    }
  }
  writer.finish();
  return readTable(Document(writer.bytes(), {.form = {.swapped = false}}),
                   {"//host", {{"n", "cpuOnline"}, {"text", "hostName"}}});
}

} // namespace

TEST(TableByArrow, HasATypeForEachKindOfColumn)
{
  const auto one = [](const auto& first, const auto& second) {
    const Table table = tableOf(3, [&](tav::Group& host, int i) {
      if (i == 0)
      {
        host.add(TAV_ELM_CMN_CPU_ONLINE, first);
      }
      if (i == 2)
      {
        host.add(TAV_ELM_CMN_CPU_ONLINE, second);
      }
    });
    const Consumed all = consume(table);
    EXPECT_THAT(all.names, ElementsAre("n", "text"));
    EXPECT_EQ(all.formats[1], "u");
    EXPECT_THAT(all.columns[1], ElementsAre("-", "-", "-"));
    EXPECT_EQ(all.columns[0][1], "-");
    return std::vector<std::string>{all.formats[0], all.columns[0][0], all.columns[0][2]};
  };
  constexpr tav::Uint128 most38{.high = 0x4B3B4CA85A86C47A, .low = 0x098A223FFFFFFFFF};
  constexpr tav::Uint128 least39{.high = 0x4B3B4CA85A86C47A, .low = 0x098A224000000000};
  EXPECT_THAT(one(uint8_t{1}, ~uint64_t{0}), ElementsAre("L", "1", "18446744073709551615"));
  EXPECT_THAT(one(uint8_t{1}, int64_t{INT64_MIN}), ElementsAre("l", "1", "-9223372036854775808"));
  EXPECT_THAT(one(~uint64_t{0}, int8_t{-1}), ElementsAre("d:38,0", "18446744073709551615", "-1"));
  EXPECT_THAT(one(most38, tav::Sint128{.high = -2, .low = 1}),
              ElementsAre("d:38,0", std::string(38, '9'), "-36893488147419103231"));
  EXPECT_THAT(one(least39, uint8_t{1}), ElementsAre("u", '1' + std::string(38, '0'), "1"));
  EXPECT_THAT(one(tav::Uint128{.high = ~uint64_t{0}, .low = ~uint64_t{0}}, uint8_t{1}),
              ElementsAre("u", "340282366920938463463374607431768211455", "1"));
  constexpr int64_t mostNegative = -0x4B3B4CA85A86C47B;
  EXPECT_THAT(one(tav::Sint128{.high = mostNegative, .low = 0xF675DDC000000001}, uint8_t{1}),
              ElementsAre("d:38,0", '-' + std::string(38, '9'), "1"));
  EXPECT_THAT(one(tav::Sint128{.high = mostNegative, .low = 0xF675DDC000000000}, uint8_t{1}),
              ElementsAre("u", "-1" + std::string(38, '0'), "1"));
  EXPECT_THAT(one(TAVTimeStamp{3, 4, 5, 0, 90}, TAVTimeStamp{}), ElementsAre("tsn:UTC", "3004005000", "0"));
  EXPECT_THAT(one("x", "\u00e4"), ElementsAre("u", "x", "\u00e4"));
  EXPECT_THAT(one("x", uint8_t{1}), ElementsAre("u", "x", "1"));
  EXPECT_THAT(one(std::vector<std::byte>(2), std::vector<std::byte>(0)), ElementsAre("z", "0000", ""));
}

TEST(TableByArrow, ComesInBatchesWithOneDictionary)
{
  const Table table = tableOf(1000, [](tav::Group& host, int i) {
    host.add(TAV_ELM_CMN_CPU_ONLINE, static_cast<uint32_t>(i));
    if (i % 5 != 0)
    {
      host.add(TAV_ELM_CMN_HOST_NAME, i % 2 == 0 ? "an even host" : "an odd host");
    }
  });
  Table twice = table;
  twice.append(table);
  const Consumed all = consume(twice, {.columns = {1, 0}, .batchRows = 300});
  EXPECT_THAT(all.names, ElementsAre("text", "n"));
  EXPECT_THAT(all.formats, ElementsAre("iu", "L"));
  EXPECT_THAT(all.lengths, ElementsAre(300, 300, 300, 300, 300, 300, 200));
  const Consumed plain = consume(twice, {.dictionaries = false});
  EXPECT_THAT(plain.formats, ElementsAre("L", "u"));
  EXPECT_EQ(plain.columns[0], all.columns[1]);
  EXPECT_EQ(plain.columns[1], all.columns[0]);
  for (int i = 0; i < 2000; ++i)
  {
    const auto row = static_cast<size_t>(i);
    ASSERT_EQ(plain.columns[0][row], std::to_string(i % 1000));
    ASSERT_EQ(plain.columns[1][row], i % 5 == 0 ? "-" : i % 2 == 0 ? "an even host"
                                                                   : "an odd host");
  }
}

TEST(TableByArrow, WritesNoDictionaryWhereTextsDiffer)
{
  const Table table =
      tableOf(3000, [](tav::Group& host, int i) { host.add(TAV_ELM_CMN_HOST_NAME, std::to_string(i)); });
  EXPECT_THAT(consume(table).formats, ElementsAre("u", "u"));
}

TEST(TableByArrow, HasWellFormedTexts)
{
  const auto header = [](Bytes& to, uint64_t size, uint16_t type, uint16_t elm) {
    const TAVHeader64 fields{size, 0, type, elm};
    const auto* const first = reinterpret_cast<const uint8_t*>(&fields);
    to.insert(to.end(), first, first + sizeof fields);
  };
  Bytes bytes;
  header(bytes, 16 + 3, TAV_TYPE_HEADER64, TAV_ELM_CMN_HOST);
  header(bytes, 3, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME);
  bytes.insert(bytes.end(), {'a', 0xFF, '"'});
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const Table table = readTable(source, {}, {"/host", {{"text", "hostName"}}});
  EXPECT_EQ(cellText(table.cell(0, 0)), "a\xFF\"");
  EXPECT_THAT(consume(table).columns[0], ElementsAre("a\\xff\\\""));
}

TEST(TableByArrow, LetsAChildBeTakenOut)
{
  const Table table = tableOf(2, [](tav::Group& host, int i) { host.add(TAV_ELM_CMN_CPU_ONLINE, i); });
  ArrowArrayStream stream{};
  toArrow(table, &stream);
  ArrowArray batch{};
  ASSERT_EQ(stream.get_next(&stream, &batch), 0);
  ArrowArray child = *batch.children[0];
  batch.children[0]->release = nullptr; // moved
  batch.release(&batch);
  stream.release(&stream);
  EXPECT_EQ(child.length, 2);
  int64_t second = 0;
  std::memcpy(&second, static_cast<const char*>(child.buffers[1]) + sizeof second, sizeof second);
  EXPECT_EQ(second, 1);
  child.release(&child);
}

TEST(TableByArrow, HasNoBatchWithoutRows)
{
  const Consumed all = consume(tableOf(0, [](tav::Group&, int) {}));
  EXPECT_TRUE(all.lengths.empty());
  EXPECT_THAT(all.formats, ElementsAre("u", "u"));
}
