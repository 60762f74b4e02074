/// Attributes of nodes as paths ask for them.
#include <algorithm>
#include <string>
#include <vector>

#include "cpp/layer.h"
#include "support/attributeRows.h"

using namespace test;

namespace
{

class LayerAttributes : public ::testing::TestWithParam<bool>
{
protected:
  LayerAttributes()
  {
    for (const tav::Node& node : reader_.find("//*"))
    {
      places_.push_back(node.offset());
    }
  }

  std::string numbersOf(const char* path)
  {
    std::string numbers;
    for (const tav::Node& node : reader_.find(path))
    {
      const auto place = std::find(places_.begin(), places_.end(), node.offset());
      numbers += (numbers.empty() ? "" : " ") + std::to_string(place - places_.begin());
    }
    return numbers;
  }

  Bytes stream_ = AttributeStream(GetParam()).bytes();
  tav::Reader reader_{std::as_bytes(std::span(stream_)),
                      {.byteOrder = GetParam() ? tav::ByteOrder::swapped : tav::ByteOrder::native}};
  std::vector<uint64_t> places_;
};

INSTANTIATE_TEST_SUITE_P(ByteOrders, LayerAttributes, ::testing::Bool());

} // namespace

TEST_P(LayerAttributes, BelongToTheNodesOfTheRow)
{
  for (const PathRow& row : kAttributeRows)
  {
    EXPECT_EQ(numbersOf(row.path), row.nodes) << row.path;
  }
}
