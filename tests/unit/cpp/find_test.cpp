#include <algorithm>
#include <string>
#include <vector>

#include "cpp/layer.h"
#include "support/pathRows.h"

using namespace test;

namespace
{

struct Made
{
  tav::ByteOrder byteOrder;
  bool align;
  bool inFile;
};

std::string nameOf(const ::testing::TestParamInfo<Made>& made)
{
  return std::string(made.param.byteOrder == tav::ByteOrder::native ? "Native" : "Swapped") +
         (made.param.align ? "Aligned" : "") + (made.param.inFile ? "InAFile" : "InMemory");
}

/// Over memory, and over a file through a small ring.
class LayerFind : public ::testing::TestWithParam<Made>
{
protected:
  LayerFind()
  {
    const tav::StreamOptions options{.byteOrder = GetParam().byteOrder, .align8 = GetParam().align};
    stream_ = pathStream(options);
    if (GetParam().inFile)
    {
      std::FILE* const file = std::fopen(file_.path.string().c_str(), "wb");
      EXPECT_EQ(std::fwrite(stream_.data(), 1, stream_.size(), file), stream_.size());
      std::fclose(file);
      reader_.emplace(file_.path, options);
    }
    else
    {
      reader_.emplace(std::span<const std::byte>(stream_), options);
    }
    const tav::Node root = reader_->root();
    places_.push_back(root.offset());
    for (const tav::Node& node : root.descendants(tav::EndElements::show))
    {
      places_.push_back(node.offset());
    }
  }

  /// The numbers of the nodes that a range gives.
  std::string numbersOf(tav::FindRange&& range) const
  {
    std::string numbers;
    for (const tav::Node& node : range)
    {
      const auto place = std::find(places_.begin(), places_.end(), node.offset());
      numbers += (numbers.empty() ? "" : " ") + std::to_string(place - places_.begin());
    }
    return numbers;
  }
  static std::string firstOf(const std::string& numbers)
  {
    return numbers.substr(0, numbers.find(' '));
  }

  TemporaryPath file_;
  std::vector<std::byte> stream_;
  std::optional<tav::Reader> reader_;
  std::vector<uint64_t> places_;
};

} // namespace

TEST_P(LayerFind, LeadsToTheNodesOfTheRow)
{
  for (const PathRow& row : kPathRows)
  {
    SCOPED_TRACE(row.path);
    if (row.nodes == nullptr)
    {
      EXPECT_EQ(thrownBy([&] { static_cast<void>(reader_->find(row.path)); }), TAV_RC_BAD_PARAM);
      continue;
    }
    EXPECT_EQ(numbersOf(reader_->find(row.path)), row.nodes);
    const auto first = reader_->path(row.path);
    EXPECT_EQ(first ? numbersOf(first->find(".")) : "", firstOf(row.nodes));
  }
}

TEST_P(LayerFind, LeadsFromANodeToThoseOfTheRow)
{
  const tav::Node host = *reader_->path("/system/host[2]");
  for (const PathRow& row : kPathRowsFromNode)
  {
    SCOPED_TRACE(row.path);
    EXPECT_EQ(numbersOf(host.find(row.path)), row.nodes);
    const auto first = host.path(row.path);
    EXPECT_EQ(first ? numbersOf(first->find(".")) : "", firstOf(row.nodes));
    EXPECT_EQ(host.all(row.path).size(), countOf(host.find(row.path)));
  }
}

INSTANTIATE_TEST_SUITE_P(EveryKind, LayerFind,
                         ::testing::Values(Made{tav::ByteOrder::native, false, false},
                                           Made{tav::ByteOrder::native, true, false},
                                           Made{tav::ByteOrder::swapped, false, false},
                                           Made{tav::ByteOrder::native, false, true},
                                           Made{tav::ByteOrder::swapped, true, true}),
                         nameOf);

namespace
{

struct Fault
{
  const char* path;
  size_t column;
  const char* sentence; ///< how it begins
  bool isName = false;
};

std::ostream& operator<<(std::ostream& out, const Fault& fault)
{
  return out << fault.path;
}

class PathFaults : public ::testing::TestWithParam<Fault>
{
};

} // namespace

TEST_P(PathFaults, AreToldWithTheColumn)
{
  tav::PathFault fault;
  const tav::Path path(GetParam().path, fault);
  EXPECT_EQ(fault.kind, GetParam().isName ? tav::PathFault::Kind::unknownName : tav::PathFault::Kind::malformed);
  EXPECT_EQ(fault.column, GetParam().column);
  EXPECT_EQ(fault.sentence.substr(0, std::string(GetParam().sentence).size()), GetParam().sentence);
  EXPECT_TRUE(path.empty());
}

INSTANTIATE_TEST_SUITE_P(
    Rows, PathFaults,
    ::testing::Values(
        Fault{"", 1, "a step is empty"}, Fault{"//", 3, "a step is empty"}, Fault{"host/", 6, "a step is empty"},
        Fault{"host///cpu", 7, "a step is empty"}, Fault{"[1]", 1, "a step is empty"}, Fault{"|", 1, "a step is empty"},
        Fault{"host |", 7, "a step is empty"}, Fault{"host cpu", 6, "'c' does not belong here"},
        Fault{"host]", 5, "']' does not belong here"}, Fault{"host::cpu", 5, "':' does not belong here"},
        Fault{"host/@type", 6, "'@' does not belong here"}, Fault{"(host)", 1, "'(' does not belong here"},
        Fault{"host[", 6, "a value or a condition is missing"}, Fault{"host[]", 6, "a value or a condition is missing"},
        Fault{"host[1", 5, "a [ without a ]"}, Fault{"host[0]", 6, "'0' is no place"},
        Fault{"host[1.5]", 6, "'1.5' is no place"}, Fault{"host[99999999999999999999]", 6, "'9999"},
        Fault{"host[1x]", 6, "'1x' is no number"}, Fault{"host[hostName=]", 15, "a value or a condition is missing"},
        Fault{"host[hostName='x]", 15, "a text without a quotation mark"},
        Fault{"host[1=1=1]", 9, "a comparison of a comparison"}, Fault{"host[not(os)=1]", 6, "only values"},
        Fault{"host[(os and os) = 1]", 6, "only values"}, Fault{"host[os+1]", 6, "only whole numbers"},
        Fault{"host[/system]", 6, "a path in brackets"}, Fault{"host[//cpu]", 6, "a path in brackets"},
        Fault{"host[text()]", 6, "no function is called 'text'"}, Fault{"host[os/text()]", 9, "no function 'text'"},
        Fault{"host/text()", 6, "no function 'text'"},
        Fault{"host[count(cpu) > 1]", 6, "no function is called 'count'"},
        Fault{"host[last]", 6, "no element is called 'last'", true}, Fault{"host[last(1)]", 11, "'1' does not"},
        Fault{"host[contains(os)]", 17, "')' does not"}, Fault{"host[not(os]", 12, "']' does not"},
        Fault{"host[@typ]", 7, "no attribute is called 'typ'"}, Fault{"host[@]", 7, "']' does not"},
        Fault{"host[@0xg]", 6, "an offset looks like"}, Fault{"..[1]", 3, "brackets stand behind names"},
        Fault{"host/.[os]", 7, "brackets stand behind names"}, Fault{"**[2]", 3, "** takes no brackets"},
        Fault{"***", 1, "'***' is no pattern"}, Fault{"#", 1, "'#' is no id"}, Fault{"#x", 1, "'#x' is no id"},
        Fault{"host/70000", 6, "'70000' is no id"}, Fault{"12ab", 1, "'12ab' is no id"},
        Fault{"hots", 1, "no element is called 'hots'; did you mean host?", true},
        Fault{"/system/hostt", 9, "no element is called 'hostt'; did you mean host?", true},
        Fault{"//host[cpuOnlin > 4]", 8, "no element is called 'cpuOnlin'; did you mean cpuOnline?", true},
        Fault{"hots[", 6, "a value or a condition is missing"}, Fault{"qqqq*", 1, "no element is called 'qqqq*'", true},
        Fault{"host[1=not(2)]", 8, "only values can be compared"}, Fault{"host[@", 7, "the path ends too early"},
        Fault{"host[hostName \xC2\xA7]", 15, "'\xC2\xA7' does not belong here"},
        Fault{"h\xC3\xB6st/[", 6, "a step is empty"},
        Fault{"/h\xC3\xB6st/\xC3\xA4", 2, "no element is called 'h\xC3\xB6st'; did you mean host?", true}));

TEST(HostilePath, EndsInASentence)
{
  const auto many = [](const std::string& piece, size_t count) {
    std::string text;
    for (size_t i = 0; i < count; ++i)
    {
      text += piece;
    }
    return text;
  };
  for (const std::string& text :
       {many("[", 1 << 20), many("]", 1 << 20), "host" + many("[", 1 << 20), many("host[", 200000),
        "host[" + many("(", 1 << 20), "host[" + many("not(", 200000), many("/host", 100000), many("host|", 100000),
        "host[" + many("os or ", 100000) + "os]", "host" + many("[1]", 300000), many("//..", 1000),
        many("host/../", 1000) + "host", many("*", 1 << 20), many("*a", 1 << 19), many("a", 1 << 20),
        "host[" + many("1", 1 << 20), "host['" + many("x", 1 << 20)})
  {
    tav::PathFault fault;
    const tav::Path path(text, fault);
    EXPECT_NE(fault.kind, tav::PathFault::Kind::none) << text.substr(0, 40);
    EXPECT_LT(fault.sentence.size(), 400U);
  }
}

TEST(HostilePath, OfManyStepsOrConditionsIsFollowed)
{
  const std::vector<std::byte> stream = pathStream({});
  const tav::Reader reader{std::span<const std::byte>(stream)};
  std::string steps = "/system";
  std::string dots = "/system";
  std::string nested = "//*";
  for (int i = 0; i < 10000; ++i)
  {
    steps += i % 2 == 0 ? "//*" : "/host";
    dots += "/.";
  }
  for (int i = 0; i < 60; ++i)
  {
    nested += "[.//*";
  }
  nested += "[.//cpuConfig]" + std::string(60, ']');
  EXPECT_TRUE(reader.all(steps).empty());
  EXPECT_EQ(reader.all(dots).size(), 1U);
  EXPECT_TRUE(reader.all(nested).empty());
  EXPECT_EQ(reader.all("//*[.//*[.//*[.//cpuConfig or 1] or 1]]").size(), 7U);
}

TEST(HostilePath, InConditionsInsideOfEachOtherIsFollowedInADeepStream)
{
  // Each condition is asked at each level: asked anew each time, they would take longer than anybody waits.
  tav::Writer writer;
  {
    std::vector<tav::Group> groups;
    groups.push_back(writer.group(TAV_ELM_CMN_SYSTEM));
    for (int i = 0; i < 200; ++i)
    {
      groups.push_back(groups.back().group(TAV_ELM_CMN_HOST));
    }
    while (!groups.empty())
    {
      groups.pop_back();
    }
  }
  writer.finish();
  const tav::Reader reader(writer.bytes());
  std::string nested = "//host";
  for (int i = 0; i < 50; ++i)
  {
    nested += "[.//host";
  }
  nested += "[cpu]" + std::string(50, ']');
  EXPECT_TRUE(reader.all(nested).empty());
  EXPECT_EQ(reader.all("//host[.//host[.//host[.//host]]]").size(), 197U);
}
