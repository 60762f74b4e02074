/// The types that columns have over several tables.
#include <cstdint>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "tav/inspect/table.hpp"

using namespace tav::inspect;
using test::Bytes;

namespace
{

struct Column
{
  std::vector<const char*> tables; ///< type and value of the one cell in each of the tables
  CellKind kind;
  bool exceedsSigned = false;
};

Table tableOf(const TableQuery& query, const std::string& node)
{
  const Bytes bytes = test::bytesOfJson(R"([{"element": "system", "children": [{"id": 1, )" + node + "}]}]");
  ByteSource source("x", std::span<const uint8_t>(bytes));
  return readTable(source, {}, query);
}

} // namespace

TEST(TableTypes, AreThoseOfAllTablesTogether)
{
  constexpr const char* small = R"("type": "Uint32", "value": 7)";
  constexpr const char* large = R"("type": "Uint64", "value": 9223372036854775808)";
  constexpr const char* most = R"("type": "Uint64", "value": 9223372036854775807)";
  constexpr const char* negative = R"("type": "Sint64", "value": -1)";
  constexpr const char* wide = R"("type": "Uint128", "value": 170141183460469231731687303715884105727)";
  constexpr const char* wider = R"("type": "Uint128", "value": 170141183460469231731687303715884105728)";
  constexpr const char* wideNegative = R"("type": "Sint128", "value": -1)";
  constexpr const char* text = R"("type": "ASCII String", "value": "a")";
  constexpr const char* time = R"("type": "UTC Timestamp", "value": "2024-02-29T10:30:00Z")";
  const std::vector<Column> columns{
      {{}, CellKind::text},
      {{small}, CellKind::unsigned64},
      {{large}, CellKind::unsigned64},
      {{negative}, CellKind::signed64},
      {{small, negative}, CellKind::signed64},
      {{most, negative}, CellKind::signed64},
      {{large, negative}, CellKind::signed128},
      {{negative, large, small}, CellKind::signed128},
      {{small, wide}, CellKind::unsigned128},
      {{wide, negative}, CellKind::signed128},
      {{wider}, CellKind::unsigned128, true},
      {{wider, small}, CellKind::unsigned128, true},
      {{wider, negative}, CellKind::text, true},
      {{wider, wideNegative}, CellKind::text, true},
      {{wideNegative}, CellKind::signed128},
      {{wideNegative, small}, CellKind::signed128},
      {{text}, CellKind::text},
      {{text, small}, CellKind::text},
      {{time}, CellKind::time},
      {{time, time}, CellKind::time},
      {{time, small}, CellKind::text},
  };
  const TableQuery query("/system", {{"value", "#1"}});
  for (size_t i = 0; i < columns.size(); ++i)
  {
    SCOPED_TRACE(i);
    TableTypes types(query);
    Table whole(query);
    for (const char* const node : columns[i].tables)
    {
      const Table table = tableOf(query, node);
      ASSERT_EQ(table.rows(), 1U);
      types.see(table);
      whole.append(table);
    }
    EXPECT_EQ(types.type(0), columns[i].kind);
    EXPECT_EQ(whole.type(0), columns[i].kind) << "the table of all rows";
    EXPECT_EQ(types.exceedsSigned(0), columns[i].exceedsSigned);
  }
}

TEST(TableTypes, OfColumnsAreIndependent)
{
  const Bytes bytes = test::bytesOfJson(R"([{"element": "system", "children": [
      {"id": 1, "type": "Uint32", "value": 7}, {"id": 2, "type": "ASCII String", "value": "a"}]}])");
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const TableQuery query("/system", {{"first", "#1"}, {"second", "#2"}, {"third", "#3"}});
  TableTypes types(query);
  types.see(readTable(source, {}, query));
  EXPECT_EQ(types.type(0), CellKind::unsigned64);
  EXPECT_EQ(types.type(1), CellKind::text);
  EXPECT_EQ(types.type(2), CellKind::text) << "which has no cell";
}
