#include <algorithm>
#include <map>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "tav/inspect/table.hpp"

using namespace tav::inspect;
using test::Bytes;
using testing::ElementsAre;

namespace
{

using Rows = std::vector<std::vector<std::string>>;

/// A cell as a test shows it: "-" is missing, texts are in quotation marks, bytes behind 0x.
std::string shownCell(const Cell& cell)
{
  switch (cell.kind)
  {
  case CellKind::missing: return "-";
  case CellKind::text: return tav::inspect::quoted(cell.text);
  case CellKind::bytes: return "0x" + cellText(cell);
  default: return cellText(cell);
  }
}

Rows rowsOf(const Table& table)
{
  Rows rows;
  for (uint64_t row = 0; row < table.rows(); ++row)
  {
    auto& cells = rows.emplace_back();
    for (size_t column = 0; column < table.columns().size(); ++column)
    {
      cells.push_back(shownCell(table.cell(column, row)));
    }
  }
  return rows;
}

TableQuery queryOf(std::string_view each, const std::vector<std::string>& paths, std::optional<std::string> joiner = {})
{
  std::vector<TableColumn> columns;
  for (const std::string& path : paths)
  {
    columns.push_back({path, path});
  }
  return {each, columns, std::move(joiner)};
}

/// Reads until nothing is left, or damage stops it.
void readOut(TableReader& reader, Table& rows, uint64_t atOnce = TableReader::kBatch)
{
  while (reader.next(rows, atOnce))
  {
  }
}

Bytes bytesOf(tav::Writer& writer)
{
  writer.finish();
  const auto bytes = writer.bytes();
  const auto* const first = reinterpret_cast<const uint8_t*>(bytes.data());
  return {first, first + bytes.size()};
}

/// A system with hosts: ada with 8 processors, grace with a name twice and none, one without anything.
Bytes hosts(bool swap, bool align, bool pairs)
{
  tav::Writer writer({.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native, .align8 = align});
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = pairs});
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST, {.eyeSize = pairs});
      host.add(TAV_ELM_CMN_HOST_NAME, "ada");
      host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8}, {.eyeSize = pairs});
      tav::Group cpu = host.group(TAV_ELM_CMN_CPU, {.eyeSize = pairs});
      cpu.add(TAV_ELM_CMN_CPU_ONLINE, int16_t{-2});
    }
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST, {.eyeSize = pairs});
      host.add(TAV_ELM_CMN_HOST_NAME, "grace");
      host.add(TAV_ELM_CMN_HOST_NAME, "");
    }
    system.group(TAV_ELM_CMN_HOST, {.eyeSize = pairs}).close();
    system.add(TAV_ELM_CMN_OS_NAME, "os\u00e4");
  }
  return bytesOf(writer);
}

struct Question
{
  const char* each;
  std::vector<std::string> columns;
  Rows rows;
  std::optional<std::string> joiner{};
};

const std::vector<Question> kQuestions = {
    {"/system/host", {"hostName", "cpuOnline"}, {{"\"ada\"", "8"}, {"\"grace\"", "-"}, {"-", "-"}}},
    {"system/host", {"cpu/cpuOnline"}, {{"-2"}, {"-"}, {"-"}}},
    {"/system", {"host/hostName", "host/cpuOnline", "osName"}, {{"\"ada\"", "8", "\"os\u00e4\""}}},
    {"/system", {"host/hostName", "osName"}, {{"\"ada|grace|\"", "\"os\u00e4\""}}, "|"},
    {"/system/host", {"cpuOnline", "*/cpuOnline"}, {{"\"8\"", "\"-2\""}, {"-", "-"}, {"-", "-"}}, "|"},
    {"/system/host", {"../osName", "cpu"}, {{"\"os\u00e4\"", "-"}, {"\"os\u00e4\"", "-"}, {"\"os\u00e4\"", "-"}}},
    {"//hostName", {".", "../cpuOnline"}, {{"\"ada\"", "8"}, {"\"grace\"", "-"}, {"\"\"", "-"}}},
    {"//host", {"hostName[2]", "hostName[last()]"}, {{"-", "\"ada\""}, {"\"\"", "\"\""}, {"-", "-"}}},
    {"//host[cpuOnline]", {"hostName", ".//cpuOnline"}, {{"\"ada\"", "8"}}},
    {"//host[not(cpuOnline)]", {"hostName"}, {{"\"grace\""}, {"-"}}},
    {"/system/host[2] | /system/osName", {". | hostName"}, {{"\"grace\""}, {"\"os\u00e4\""}}},
    {"//*", {"cpuOnline"}, {{"-"}, {"8"}, {"-"}, {"-"}, {"-2"}, {"-"}, {"-"}, {"-"}, {"-"}, {"-"}, {"-"}}},
    {"/system/host/cpu", {"../../host/hostName", "/system/osName"}, {{"\"ada\"", "\"os\u00e4\""}}},
    {"/system/cpu", {"cpuOnline"}, {}},
    {"/", {"osName", "host/cpu/cpuOnline | host/cpuOnline"}, {{"\"os\u00e4\"", "8"}}},
    {"/system/host/*", {"."}, {{"\"ada\""}, {"8"}, {"-"}, {"\"grace\""}, {"\"\""}}},
    {"/system/host", {"hostName | * | hostName"}, {{"\"ada|8\""}, {"\"grace|\""}, {"-"}}, "|"},
    {"/system", {"../osName", "../../system/osName", "../*[1]", "osName"}, {{"-", "-", "-", "\"os\u00e4\""}}},
    {"/system",
     {"../../*[osName]/osName", "../../../system[osName]/osName", "../system[osName]/osName"},
     {{"-", "-", "-"}}},
    {"/system/host/cpu", {"../../../osName", "../../../../system/osName | cpuOnline"}, {{"-", "-2"}}},
};

} // namespace

class TableOfAForm : public testing::TestWithParam<std::tuple<bool, bool, bool>>
{
};

INSTANTIATE_TEST_SUITE_P(Forms, TableOfAForm, testing::Combine(testing::Bool(), testing::Bool(), testing::Bool()));

TEST_P(TableOfAForm, HasTheRowsThatItsPathsLeadTo)
{
  const auto [swap, align, pairs] = GetParam();
  const Bytes bytes = hosts(swap, align, pairs);
  const tav::inspect::Form form{.swapped = swap, .root64 = true, .aligned = align};
  for (const Question& question : kQuestions)
  {
    for (const bool onlyWalker : {false, true})
    {
      SCOPED_TRACE(std::string(question.each) + (onlyWalker ? " by the walker" : ""));
      ByteSource source("x", std::span<const uint8_t>(bytes));
      const Table table = readTable(source, form, queryOf(question.each, question.columns, question.joiner),
                                    {.onlyWalker = onlyWalker});
      EXPECT_EQ(rowsOf(table), question.rows);
      ByteSource pages("x", std::make_unique<TAVSSMemory>(const_cast<uint8_t*>(bytes.data()), bytes.size()));
      EXPECT_EQ(rowsOf(readTable(pages, form, queryOf(question.each, question.columns, question.joiner),
                                 {.onlyWalker = onlyWalker})),
                question.rows);
    }
  }
}

namespace
{

/// One row for each value, in the order of the values.
template<class... Values>
Table columnOf(const Values&... values)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    (system.add(TAV_ELM_CMN_CPU_ONLINE, values), ...);
  }
  const Bytes bytes = bytesOf(writer);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  return readTable(source, {}, queryOf("/system/*", {"."}));
}

constexpr tav::Uint128 kHuge{.high = ~uint64_t{0}, .low = 5};

} // namespace

TEST(TableOfValues, WidensAColumnToWhatHoldsAllOfThem)
{
  using tav::Sint128;
  using tav::Uint128;
  constexpr uint64_t most = ~uint64_t{0};
  EXPECT_EQ(columnOf(uint8_t{1}, uint64_t{most}).type(0), CellKind::unsigned64);
  EXPECT_EQ(columnOf(int8_t{1}).type(0), CellKind::signed64);
  EXPECT_EQ(columnOf(int8_t{1}, uint32_t{7}).type(0), CellKind::signed64);
  EXPECT_EQ(columnOf(int8_t{1}, uint64_t{most}).type(0), CellKind::signed128);
  EXPECT_EQ(columnOf(uint8_t{1}, Uint128{.high = 1}).type(0), CellKind::unsigned128);
  EXPECT_EQ(columnOf(int8_t{1}, Uint128{.high = 1}).type(0), CellKind::signed128);
  EXPECT_EQ(columnOf(uint64_t{most}, Sint128{.high = -1}).type(0), CellKind::signed128);
  EXPECT_EQ(columnOf(int8_t{1}, kHuge).type(0), CellKind::text);
  EXPECT_EQ(columnOf(int8_t{1}, "x").type(0), CellKind::text);
  EXPECT_EQ(columnOf("x").type(0), CellKind::text);
  EXPECT_EQ(columnOf(std::vector<std::byte>(3)).type(0), CellKind::bytes);
  EXPECT_EQ(columnOf(std::vector<std::byte>(3), "x").type(0), CellKind::text);
  EXPECT_EQ(columnOf().type(0), CellKind::text);
}

TEST(TableOfValues, KeepsTextsApartThatLieBehindEachOther)
{
  const Table table = columnOf("abcdefgh", "ijklmnop", "abcdefgh", "abcdefgh", "ijklmno");
  std::vector<std::string> texts;
  for (uint64_t row = 0; row < table.rows(); ++row)
  {
    texts.emplace_back(table.cell(0, row).text);
  }
  EXPECT_THAT(texts, ElementsAre("abcdefgh", "ijklmnop", "abcdefgh", "abcdefgh", "ijklmno"));
}

TEST(TableOfValues, KeepsEachOfThem)
{
  const Table table = columnOf(~uint64_t{0}, int64_t{INT64_MIN}, kHuge, tav::Sint128{.high = -1, .low = 3},
                               TAVTimeStamp{1714559430, 123, 4567, 9, -90}, TAVTimeStamp{9300000000, 0, 0, 0, 60},
                               TAVTimeStamp{~uint64_t{0}, 0, 0, 0, 0}, std::vector<std::byte>(2, std::byte{0xAB}),
                               "t\u00e4xt", "", uint16_t{65535}, int8_t{-128});
  std::vector<std::string> cells;
  for (const auto& row : rowsOf(table))
  {
    cells.push_back(row[0]);
  }
  EXPECT_THAT(cells, ElementsAre("18446744073709551615", "-9223372036854775808",
                                 "340282366920938463444927863358058659845", "-18446744073709551613",
                                 "2024-05-01T10:30:30.127567Z", "\"2264-09-14T21:20:00.000000Z\"",
                                 "\"18446744073709551615 s\"", "0xabab", "\"t\u00e4xt\"", "\"\"", "65535", "-128"));
  EXPECT_EQ(table.type(0), CellKind::text);
  EXPECT_EQ(static_cast<int64_t>(table.cell(0, 4).number), 1714559430127567000);
}

TEST(TableOfValues, HasTimesAsFarAsNanosecondsReachWithAnyFractions)
{
  constexpr uint64_t last = INT64_MAX / 1'000'000'000 - 100; // the two fractions reach a minute farther at most
  const Table table = columnOf(TAVTimeStamp{last, 65535, 65535, 0, 0}, TAVTimeStamp{last + 1, 0, 0, 0, 0});
  EXPECT_EQ(table.cell(0, 0).kind, CellKind::time);
  EXPECT_EQ(table.cell(0, 0).number, (last * 1'000'000 + 65'535'000 + 65'535) * 1000);
  EXPECT_EQ(table.cell(0, 1).kind, CellKind::text);
}

namespace
{

/// The table of `//*` with a column `.`, and the nodes that a walk of its own finds.
void expectWalkedValues(const Bytes& bytes, const tav::inspect::Form& form)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const TableQuery query = queryOf("//*", {".", "cpuOnline", "host/memTotal"});
  const Table table = readTable(source, form, query, {.onDamage = OnDamage::skip});
  Walker walker(source, form);
  uint64_t row = 0;
  struct Around
  {
    uint64_t row;
    uint16_t elm;
  };
  std::vector<Around> line;
  std::vector<std::array<std::optional<std::string>, 3>> expected;
  for (Event event; walker.next(event);)
  {
    if (event.what != What::nodeBegin || isEndPiece(event))
    {
      continue;
    }
    line.resize(static_cast<size_t>(event.depth));
    line.push_back({row++, event.node.elm()});
    expected.emplace_back();
    if (event.node.isGroup())
    {
      continue;
    }
    std::string text = plainText(source, form, event.node, ~uint64_t{0}).value();
    expected.back()[0] = text;
    const size_t size = line.size();
    if (size > 1 && event.node.elm() == TAV_ELM_CMN_CPU_ONLINE && !expected[line[size - 2].row][1])
    {
      expected[line[size - 2].row][1] = text;
    }
    if (size > 2 && event.node.elm() == TAV_ELM_CMN_MEM_TOTAL && line[size - 2].elm == TAV_ELM_CMN_HOST &&
        !expected[line[size - 3].row][2])
    {
      expected[line[size - 3].row][2] = text;
    }
  }
  ASSERT_EQ(table.rows(), row);
  for (uint64_t i = 0; i < row; ++i)
  {
    for (size_t column = 0; column < 3; ++column)
    {
      const Cell cell = table.cell(column, i);
      ASSERT_EQ(cell.kind != CellKind::missing, expected[i][column].has_value()) << "row " << i;
      const bool isText = cell.kind != CellKind::time; // which is shown in UTC here
      ASSERT_TRUE(!isText || cell.kind == CellKind::missing || cellText(cell) == expected[i][column] ||
                  cell.text.ends_with("Z"))
          << "row " << i << ": " << cellText(cell) << " is not " << *expected[i][column];
    }
  }
}

/// What a table of a stream is by the exact steps and by the Walker alone, which are the same.
void expectSameWays(const Bytes& bytes, const tav::inspect::Form& form, const TableQuery& query, OnDamage onDamage)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  std::array<Rows, 2> rows;
  std::array<std::vector<std::string>, 2> told;
  for (const bool onlyWalker : {false, true})
  {
    Table table(query);
    TableReader reader(source, form, query,
                       {.onDamage = onDamage, .onlyWalker = onlyWalker, .passedOver = [&](const PassedOver& passed) {
                          told[onlyWalker ? 1 : 0].push_back(hexOffset(passed.offset) + passed.sentence);
                        }});
    readOut(reader, table, 3);
    rows[onlyWalker ? 1 : 0] = rowsOf(table);
    if (reader.stopped())
    {
      told[onlyWalker ? 1 : 0].push_back(problemLine(*reader.stopped()));
    }
  }
  ASSERT_EQ(rows[0], rows[1]);
  ASSERT_EQ(told[0], told[1]);
}

const std::vector<TableQuery>& queries()
{
  static const std::vector<TableQuery> all = {
      queryOf("//*", {".", "cpuOnline"}),
      queryOf("//*", {".", "host/*", "*"}, "+"),
      queryOf("//host", {"hostName", "memTotal", "host/cpuOnline"}),
      queryOf("/*/*", {"cpuOnline", "../memTotal"}),
      queryOf("//host[cpuOnline]", {"memTotal", ".//hostName"}),
      queryOf("/*", {"*", "*/*", "*/*/*"}, ","),
      queryOf("/*/*//.", {".", ".//."}, "+"),
      queryOf("/system", {"host//.", ".//host/.", "cpuOnline"}, "+"),
  };
  return all;
}

} // namespace

TEST(TableOfRandomTrees, HasTheValuesThatAWalkFinds)
{
  const test::Cases cases = test::casesOf(300);
  for (uint64_t seed = cases.first; seed < cases.first + cases.count; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed, {});
    expectWalkedValues(test::bytesOfTree(tree), test::readForm(tree.form));
    const Bytes named = test::namedStream(seed, seed % 2 == 0, seed % 3 == 0);
    expectWalkedValues(named, {.swapped = seed % 2 == 0, .root64 = true, .aligned = seed % 3 == 0});
  }
}

TEST(TableOfRandomTrees, IsTheSameByTheExactStepsAndByTheWalkerWhateverTheDamage)
{
  const test::Cases cases = test::casesOf(400);
  for (uint64_t seed = cases.first; seed < cases.first + cases.count; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed, {});
    const tav::inspect::Form named{.swapped = seed % 2 == 0, .root64 = true, .aligned = seed % 3 == 0};
    for (const TableQuery& query : queries())
    {
      for (const OnDamage onDamage : {OnDamage::stop, OnDamage::skip})
      {
        expectSameWays(test::damaged(test::bytesOfTree(tree), seed), test::readForm(tree.form), query, onDamage);
        const Bytes bytes = test::namedStream(seed, named.swapped, named.aligned);
        expectSameWays(bytes, named, query, onDamage);
        expectSameWays(test::damaged(bytes, seed), named, query, onDamage);
      }
    }
  }
}

TEST(TableOfRandomTrees, HasWhatIsAnyNumberOfLevelsBelowARow)
{
  // A condition that always holds makes the reader look each column up by itself.
  struct Column
  {
    std::string path;
    std::string sought;
  };
  std::vector<Column> columns = {{"host//.", "host[@type] | host//*[@type]"}, {".//.", ". | .//*[@type]"}};
  for (const std::string path : {".//cpuOnline", "host//hostName", ".//host/*", ".//host//memTotal", ".//*", "*//*",
                                 ".//*//*", ".//system//*"})
  {
    columns.push_back({path, path + "[@type]"});
  }
  const auto rows = [&](ByteSource& source, const tav::inspect::Form& form, const char* each, bool sought,
                        const std::optional<std::string>& joiner) {
    std::vector<std::string> paths;
    for (const Column& column : columns)
    {
      paths.push_back(sought ? column.sought : column.path);
    }
    return rowsOf(readTable(source, form, queryOf(each, paths, joiner), {.onDamage = OnDamage::skip}));
  };
  const test::Cases cases = test::casesOf(100);
  for (uint64_t seed = cases.first; seed < cases.first + cases.count; ++seed)
  {
    SCOPED_TRACE(seed);
    const tav::inspect::Form form{.swapped = seed % 2 == 0, .root64 = true, .aligned = seed % 3 == 0};
    const Bytes sound = test::namedStream(seed, form.swapped, form.aligned);
    for (const Bytes& bytes : {sound, test::damaged(sound, seed)})
    {
      ByteSource source("x", std::span<const uint8_t>(bytes));
      for (const char* const each : {"/*", "/*/*", "/system/host", "/system | /system/host", "//host"})
      {
        SCOPED_TRACE(each);
        for (const auto& joiner : {std::optional<std::string>(), std::optional<std::string>("+")})
        {
          ASSERT_EQ(rows(source, form, each, false, joiner), rows(source, form, each, true, joiner));
        }
      }
    }
  }
}

TEST(TableAtDamage, HasTheRowsBeforeItAndSaysWhereItIs)
{
  Bytes bytes = hosts(false, false, false);
  const size_t second = 16 + (16 + (16 + 3) + (16 + 4) + (16 + 16 + 2)); // the second host
  bytes[second + 16 + 3] = 0xFF;                                         // the size of its first name
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const TableQuery query = queryOf("/system/host", {"hostName"});
  Table rows(query);
  TableReader reader(source, {}, query);
  readOut(reader, rows);
  EXPECT_EQ(rowsOf(rows), (Rows{{"\"ada\""}}));
  ASSERT_TRUE(reader.stopped().has_value());
  EXPECT_EQ(reader.stopped()->offset, second + 16);
  EXPECT_EQ(reader.stopped()->path, "/system/host[2]");
  std::vector<uint64_t> passed;
  const Table skipped = readTable(
      source, {}, query,
      {.onDamage = OnDamage::skip, .passedOver = [&](const PassedOver& place) { passed.push_back(place.offset); }});
  EXPECT_EQ(rowsOf(skipped), (Rows{{"\"ada\""}, {"\"\""}, {"-"}}));
  EXPECT_THAT(passed, ElementsAre(second + 16));
}

TEST(TableAtDamage, IsWholeWhereNothingIsSoughtInWhatIsDamaged)
{
  Bytes bytes = hosts(false, false, false);
  const size_t inCpu = 16 + 16 + (16 + 3) + (16 + 4) + 16; // what the first host's cpu holds
  bytes[inCpu + 3] = 0xFF;                                 // its size
  ByteSource source("x", std::span<const uint8_t>(bytes));
  for (const bool onlyWalker : {false, true})
  {
    const TableQuery query = queryOf("/system/host", {"hostName"});
    Table rows(query);
    TableReader reader(source, {}, query, {.onlyWalker = onlyWalker});
    readOut(reader, rows);
    EXPECT_EQ(rowsOf(rows), (Rows{{"\"ada\""}, {"\"grace\""}, {"-"}}));
    EXPECT_FALSE(reader.stopped().has_value());
  }
  const TableQuery deeper = queryOf("/system/host", {"cpu/cpuOnline"});
  TableReader reader(source, {}, deeper);
  Table rows(deeper);
  readOut(reader, rows);
  EXPECT_TRUE(reader.stopped().has_value());
}

namespace
{

/// The rows of all parts, each by a reader of its own, as engines elsewhere put them together. `mended` counts the
/// parts whose beginnings were no places of the walk.
Rows rowsInParts(ByteSource& source, const TableQuery& query, uint64_t target, OnDamage onDamage, size_t& mended)
{
  Rows rows;
  Part behind;
  for (const Part& planned : planTable(source, query, {.targetBytes = target}))
  {
    Part part = planned;
    for (bool isSure = false; !isSure;)
    {
      Table table(query);
      TableReader reader(source, query, part, {.onDamage = onDamage});
      readOut(reader, table);
      EXPECT_FALSE(reader.stopped().has_value());
      isSure = part.offset == 0 || holdsBehind(behind, part, reader.end());
      if (!isSure)
      {
        const uint64_t end = std::max(part.end(), behind.offset);
        part = behind;
        part.size = end - part.offset;
        mended += 1;
        continue;
      }
      part.around = part.offset == 0 ? part.around : behind.around;
      behind = behindOf(part, reader.end());
      const Rows found = rowsOf(table);
      rows.insert(rows.end(), found.begin(), found.end());
    }
  }
  return rows;
}

} // namespace

TEST_P(TableOfAForm, InPartsIsTheWholeAlsoWhereItIsDamaged)
{
  const auto [swap, align, pairs] = GetParam();
  Bytes bytes;
  for (int i = 0; i < 3; ++i)
  {
    const Bytes more = hosts(swap, align, pairs);
    bytes.insert(bytes.end(), more.begin(), more.end());
  }
  std::mt19937_64 random(20);
  size_t parts = 0;
  size_t again = 0;
  for (int round = 0; round < 4; ++round)
  {
    const uint64_t target = 16 + random() % 300;
    for (const Question& question : kQuestions)
    {
      SCOPED_TRACE(std::string(question.each) + " by " + std::to_string(target) + ", round " + std::to_string(round));
      const TableQuery query = queryOf(question.each, question.columns, question.joiner);
      ByteSource source("x", std::span<const uint8_t>(bytes));
      parts += planTable(source, query, {.targetBytes = target}).size() - 1;
      const Recognition found = recognise(source);
      EXPECT_EQ(rowsInParts(source, query, target, OnDamage::skip, again),
                rowsOf(readTable(source, found.form, query, {.onDamage = OnDamage::skip})));
    }
    bytes[100 + random() % (bytes.size() - 100)] = static_cast<uint8_t>(random());
  }
  EXPECT_GT(parts, 100U);
}

TEST(TableInParts, FindsOutASeamThatIsForgedInAPayload)
{
  tav::Writer inner;
  for (int i = 0; i < 200; ++i)
  {
    inner.group(TAV_ELM_CMN_HOST).add(TAV_ELM_CMN_HOST_NAME, "forged");
  }
  const Bytes forged = bytesOf(inner);
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (int i = 0; i < 3000; ++i)
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_HOST_NAME, std::to_string(i));
      if (i % 100 == 50)
      {
        host.add(1002, std::as_bytes(std::span(forged)));
      }
    }
  }
  const Bytes bytes = bytesOf(writer);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const TableQuery query = queryOf("/system/host", {"hostName"});
  size_t again = 0;
  for (const uint64_t target : {3000U, 5000U, 20000U})
  {
    EXPECT_EQ(rowsInParts(source, query, target, OnDamage::stop, again), rowsOf(readTable(source, {}, query)));
  }
  EXPECT_GT(again, 0U);
}

TEST(TableInParts, AreCutOnlyWhereTheRowsBehindFollowFromTheBytesBehind)
{
  tav::Writer writer;
  for (int i = 0; i < 4; ++i)
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (int k = 0; k < 100; ++k)
    {
      system.group(TAV_ELM_CMN_HOST).add(TAV_ELM_CMN_HOST_NAME, std::to_string(k));
    }
  }
  const Bytes bytes = bytesOf(writer);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const auto partsOf = [&](const TableQuery& query) { return planTable(source, query, {.targetBytes = 500}).size(); };
  EXPECT_GT(partsOf(queryOf("/system/host", {"hostName"})), 8U);
  EXPECT_EQ(partsOf(queryOf("/system", {"host/hostName"})), 4U);
  EXPECT_EQ(partsOf(queryOf("/system/host", {"hostName", "../osName"})), 4U);
  EXPECT_EQ(partsOf(queryOf("/system/host[3]", {"hostName"})), 4U);
  EXPECT_EQ(partsOf(queryOf("/system[2]/host", {"hostName"})), 1U);
  for (const Part& part : planTable(source, queryOf("/host/system", {"hostName"}), {.targetBytes = 500}))
  {
    EXPECT_TRUE(part.around.empty()); // no part begins in a group that has no rows
  }

  const auto parts = planTable(source, queryOf("/system/host", {"hostName"}), {.targetBytes = 500});
  ASSERT_FALSE(parts[1].around.empty());
  EXPECT_THROW(TableReader(source, queryOf("/system", {"host/hostName"}), parts[1]), Error);
}

TEST(TableInParts, SayWhereDamageIsWithoutAPathThatTheyCannotKnow)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint32_t i = 0; i < 100; ++i)
    {
      system.group(TAV_ELM_CMN_HOST).add(TAV_ELM_CMN_CPU_ONLINE, i);
    }
  }
  Bytes bytes = bytesOf(writer);
  const TableQuery query = queryOf("/system/host", {"cpuOnline"});
  ByteSource sound("x", std::span<const uint8_t>(bytes));
  const auto parts = planTable(sound, query, {.targetBytes = 500});
  ASSERT_GT(parts.size(), 2U);
  const auto inHost = static_cast<size_t>(parts[1].offset) + 16;
  bytes[inHost + 2] = 0xFF; // a byte of the size
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const auto stopped = [&](TableReader reader) {
    Table rows(query);
    readOut(reader, rows);
    return reader.stopped();
  };
  const auto inPart = stopped(TableReader(source, query, parts[1]));
  ASSERT_TRUE(inPart.has_value());
  EXPECT_EQ(inPart->offset, inHost);
  EXPECT_EQ(inPart->path, "");
  const auto inWhole = stopped(TableReader(source, {}, query));
  ASSERT_TRUE(inWhole.has_value());
  EXPECT_EQ(inWhole->offset, inHost);
  EXPECT_THAT(inWhole->path, testing::StartsWith("/system/host["));

  bytes[16 + 16 + 2] = 0xFF; // what the first host holds
  const auto inFirst = stopped(TableReader(source, query, parts[0]));
  ASSERT_TRUE(inFirst.has_value());
  EXPECT_EQ(inFirst->path, "/system/host");
}

TEST(TableInParts, IsTheWholeWhenTheyAreAppended)
{
  Bytes bytes = hosts(false, false, true);
  const size_t one = bytes.size();
  for (int i = 0; i < 2; ++i)
  {
    const Bytes more = hosts(false, false, true);
    bytes.insert(bytes.end(), more.begin(), more.end());
  }
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const TableQuery query = queryOf("/system/host", {"hostName", "../osName"});
  ASSERT_TRUE(query.isDivisible());
  Table parts = readTable(source, {}, query, {.end = one});
  EXPECT_EQ(parts.rows(), 3U);
  EXPECT_EQ(rowsOf(readTable(source, {}, query, {.end = 1})), rowsOf(parts)); // a root that begins before is read whole
  parts.append(readTable(source, {}, query, {.start = {.offset = one}}));
  EXPECT_EQ(rowsOf(parts), rowsOf(readTable(source, {}, query)));
  EXPECT_EQ(parts.rows(), 9U);
  EXPECT_FALSE(queryOf("/system[2]", {"host"}).isDivisible());
  EXPECT_FALSE(queryOf("/system", {"/system/osName"}).isDivisible());
}

TEST(TableOfAPath, ThatIsNoneIsRefused)
{
  EXPECT_THROW(queryOf("/system[", {"host"}), Error);
  EXPECT_THROW(queryOf("/system", {"hostt"}), Error);
}
