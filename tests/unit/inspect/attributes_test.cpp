/// Attributes of nodes as paths ask for them.
#include <algorithm>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "inspect/streams.h"
#include "support/attributeRows.h"

using namespace tav::inspect;

namespace
{

std::vector<uint64_t> offsetsOf(ByteSource& source, const Form& form, const char* path)
{
  std::vector<uint64_t> offsets;
  PathSearch search(source, form, pathOf(path));
  for (Event event; search.next(event);)
  {
    offsets.push_back(event.offset);
  }
  return offsets;
}

} // namespace

TEST(InspectedAttributes, BelongToTheNodesOfTheRow)
{
  for (const bool swap : {false, true})
  {
    const test::Bytes bytes = test::AttributeStream(swap).bytes();
    ByteSource source("x", std::span<const uint8_t>(bytes));
    const Form form{.swapped = swap};
    const std::vector<uint64_t> all = offsetsOf(source, form, "//*");
    for (const test::PathRow& row : test::kAttributeRows)
    {
      std::string numbers;
      for (const uint64_t offset : offsetsOf(source, form, row.path))
      {
        const auto place = std::find(all.begin(), all.end(), offset);
        numbers += (numbers.empty() ? "" : " ") + std::to_string(place - all.begin());
      }
      EXPECT_EQ(numbers, row.nodes) << row.path;
    }
  }
}
