#include <algorithm>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "inspect/streams.h"
#include "support/pathRows.h"

namespace
{

using namespace tav::inspect;

struct Made
{
  bool swap;
  bool align;
};

class InspectedPath : public ::testing::TestWithParam<Made>
{
protected:
  InspectedPath()
      : bytes_(test::pathStream({.byteOrder = GetParam().swap ? tav::ByteOrder::swapped : tav::ByteOrder::native,
                                 .align8 = GetParam().align})),
        source_("x", std::span(reinterpret_cast<const uint8_t*>(bytes_.data()), bytes_.size())),
        form_{.swapped = GetParam().swap, .aligned = GetParam().align}
  {
    Walker walker(source_, form_);
    for (Event event; walker.next(event);)
    {
      if (event.what == What::nodeBegin)
      {
        places_.push_back(event.offset);
      }
    }
  }

  std::string numbersOf(const char* text)
  {
    std::string numbers;
    PathSearch search(source_, form_, pathOf(text));
    for (Event event; search.next(event);)
    {
      const auto place = std::find(places_.begin(), places_.end(), event.offset);
      numbers += (numbers.empty() ? "" : " ") + std::to_string(place - places_.begin());
    }
    return numbers;
  }

  std::vector<std::byte> bytes_;
  ByteSource source_;
  Form form_;
  std::vector<uint64_t> places_{};
};

} // namespace

TEST_P(InspectedPath, LeadsToTheNodesOfTheRow)
{
  for (const test::PathRow& row : test::kPathRows)
  {
    SCOPED_TRACE(row.path);
    if (row.nodes == nullptr)
    {
      EXPECT_THROW(pathOf(row.path), Error);
      continue;
    }
    EXPECT_EQ(numbersOf(row.path), row.nodes);
  }
}

INSTANTIATE_TEST_SUITE_P(EveryForm, InspectedPath,
                         ::testing::Values(Made{false, false}, Made{true, false}, Made{false, true}, Made{true, true}));
