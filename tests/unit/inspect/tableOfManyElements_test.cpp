/// A table of streams with more different elements at more levels than what is known of them may take.
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"
#include "tav/inspect/table.hpp"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;

namespace
{

constexpr uint16_t kMany = 36000;   ///< elements of a group, each with its own id
constexpr uint16_t kWanted = 36500; ///< is none of them
constexpr uint16_t kGroup = 36501;

void addNumber(ByteRows& rows, uint16_t elm, uint32_t number)
{
  rows.h64(4, 0, TAV_TYPE_UINT32, elm).number(number, 4);
}

void addGroup(ByteRows& rows, uint16_t elm, const Bytes& content)
{
  rows.h64(content.size(), 0, TAV_TYPE_HEADER64, elm).data(content);
}

/// Groups in each other, each with many elements before and a wanted one behind what is in it.
Bytes nested(bool swap, unsigned levels, uint32_t number)
{
  ByteRows rows(swap);
  for (uint16_t elm = 1; elm <= kMany; ++elm)
  {
    addNumber(rows, elm, elm);
  }
  if (levels > 1)
  {
    addGroup(rows, kGroup, nested(swap, levels - 1, number + 1));
  }
  addNumber(rows, kWanted, number);
  return rows.bytes;
}

/// Three rows: the first and the last have many elements at several levels.
Bytes stream(bool swap)
{
  ByteRows middle(swap);
  ByteRows inner(swap);
  addNumber(inner, kWanted, 7);
  addGroup(middle, kGroup, inner.bytes);
  ByteRows all(swap);
  addGroup(all, TAV_ELM_CMN_HOST, nested(swap, 4, 1));
  addGroup(all, TAV_ELM_CMN_HOST, middle.bytes);
  addGroup(all, TAV_ELM_CMN_HOST, nested(swap, 4, 11));
  ByteRows root(swap);
  addGroup(root, TAV_ELM_CMN_SYSTEM, all.bytes);
  return root.bytes;
}

std::vector<std::string> cellsOf(const Bytes& bytes, bool swap, const TableOptions& options)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const Form form{.swapped = swap, .root64 = true, .aligned = false};
  const std::string wanted = "#" + std::to_string(kWanted);
  const std::string group = "#" + std::to_string(kGroup);
  const TableQuery query("/system/host", {{"any", ".//" + wanted},
                                          {"own", wanted},
                                          {"third", group + "/" + group + "/" + wanted},
                                          {"last", "#" + std::to_string(kMany)}});
  const Table table = readTable(source, form, query, options);
  std::vector<std::string> cells;
  for (uint64_t row = 0; row < table.rows(); ++row)
  {
    std::string text;
    for (size_t column = 0; column < table.columns().size(); ++column)
    {
      text += (column == 0 ? "" : " ") + cellText(table.cell(column, row));
    }
    cells.push_back(text);
  }
  return cells;
}

} // namespace

TEST(TableOfManyElements, HasTheSameValuesWhenWhatIsKnownOfThemIsMadeAnew)
{
  for (const bool swap : {false, true})
  {
    const Bytes bytes = stream(swap);
    // The first in the order of the stream is the innermost one.
    const auto expected = testing::ElementsAre("4 1 3 36000", "7   ", "14 11 13 36000");
    EXPECT_THAT(cellsOf(bytes, swap, {}), expected);
    EXPECT_THAT(cellsOf(bytes, swap, {.onlyWalker = true}), expected);
  }
}
