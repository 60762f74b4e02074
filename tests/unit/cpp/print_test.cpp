/// Printing by the layer: the plain operation's forms where that prints, and all that it does not.
#include <random>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"

using namespace test;
using namespace std::chrono_literals;
using ::testing::HasSubstr;
using ::testing::Not;

namespace
{

std::string printed(const tav::Reader& reader, const tav::PrintOptions& options, const tav::Node& node)
{
  CaughtStream stream;
  const uint64_t characters = reader.print(stream.get(), node, options);
  std::string text = stream.text();
  EXPECT_EQ(characters, text.size());
  return text;
}

std::string plainlyPrinted(const tav::Reader& reader, uint64_t bits, const tav::Node& node)
{
  CaughtStream stream;
  TAVHeaderData start{};
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), node.offset(), node.width() == tav::Width::bits64, &start), TAV_RC_OK);
  TAVPrintParam param{0, nullptr, 0, stream.get()};
  uint64_t count = 0;
  EXPECT_EQ(tavPrintSubtree(bits, reader.handle(), &start, &param, &count), TAV_RC_OK);
  return stream.text();
}

/// A group of random elements that the plain operation prints, the same in both forms.
class RandomGroup
{
public:
  explicit RandomGroup(unsigned seed)
      : random_(seed)
  {
  }

  void fill(tav::Group& group, unsigned depth)
  {
    for (unsigned left = number(6); left != 0; --left)
    {
      if (depth < 5 && number(3) == 0)
      {
        const bool narrow = number(4) == 0;
        tav::Group inner = group.group(
            element(), {.children = narrow ? tav::Width::bits32 : tav::Width::bits64, .eyeSize = number(2) == 0});
        fill(inner, depth + 1);
      }
      else
      {
        add(group);
      }
    }
  }

private:
  unsigned number(unsigned below)
  {
    return static_cast<unsigned>(random_() % below);
  }
  uint16_t element()
  {
    constexpr uint16_t some[] = {TAV_ELM_CMN_HOST, TAV_ELM_CMN_HOST_NAME, TAV_ELM_CMN_OS, SQLM_ELM_DBASE, 991, 20, 5};
    return some[number(std::size(some))];
  }

  void add(tav::Group& group)
  {
    const uint64_t value = uint64_t{random_()} << 32U | random_();
    const std::vector<std::byte> bytes(number(20), static_cast<std::byte>(value));
    const std::vector<uint64_t> words(number(4), value);
    const uint16_t elm = element();
    const tav::NodeOptions options{.eyeSize = number(2) == 0, .info = static_cast<uint32_t>(number(2) << 12U)};
    switch (number(12))
    {
    case 0: group.add(elm, static_cast<uint8_t>(value), options); break;
    case 1: group.add(elm, static_cast<int8_t>('a' + value % 26), options); break;
    case 2: group.add(elm, static_cast<uint16_t>(value), options); break;
    case 3: group.add(elm, static_cast<int16_t>(value), options); break;
    case 4: group.add(elm, static_cast<uint32_t>(value), options); break;
    case 5: group.add(elm, static_cast<int32_t>(value), options); break;
    case 6: group.add(elm, value, options); break;
    case 7: group.add(elm, static_cast<int64_t>(value), options); break;
    case 8: group.add(elm, std::string(number(30), 'x'), options); break;
    case 9: group.add(elm, bytes, options); break;
    case 10: group.add(elm, words, options); break;
    default: group.add(elm, tav::Uint128{value, ~value}, options);
    }
  }

  std::mt19937 random_;
};

struct Way
{
  tav::StreamOptions options;
  bool ring;
};

class LayerPrint : public ::testing::TestWithParam<Way>
{
};

std::string nameOf(const ::testing::TestParamInfo<Way>& row)
{
  const tav::StreamOptions& options = row.param.options;
  return std::string(options.byteOrder == tav::ByteOrder::native ? "Native" : "Swapped") +
         (options.align8 ? "Aligned" : "") + (options.root == tav::Width::bits32 ? "Root32" : "") +
         (row.param.ring ? "Ring" : "");
}

INSTANTIATE_TEST_SUITE_P(Forms, LayerPrint,
                         ::testing::Values(Way{{}, false}, Way{{.byteOrder = tav::ByteOrder::swapped}, false},
                                           Way{{.align8 = true}, false}, Way{{.root = tav::Width::bits32}, false},
                                           Way{{.ringBytes = 0x4000}, true},
                                           Way{{.byteOrder = tav::ByteOrder::swapped, .ringBytes = 0x4000}, true}),
                         nameOf);

/// A stream with one value of a kind, printed.
template<class Add>
std::string printedValue(Add&& add, const tav::PrintOptions& options)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    add(root);
  }
  writer.finish();
  const tav::Reader reader(writer.bytes());
  return printed(reader, options, reader.path("/system/*").value());
}

template<class T>
std::string inXml(const T& value)
{
  const std::string all =
      printedValue([&value](tav::Group& root) { root.add(TAV_ELM_CMN_HOST_NAME, value); }, {.xml = true});
  const size_t line = all.find('\n') + 1;
  return all.substr(line, all.size() - line - 1);
}

template<class T>
std::string inText(const T& value)
{
  return printedValue([&value](tav::Group& root) { root.add(TAV_ELM_CMN_HOST_NAME, value); }, {.bare = true});
}

} // namespace

TEST_P(LayerPrint, IsThatOfThePlainOperationWhereThatPrints)
{
  uint64_t characters = 0;
  for (unsigned seed = 1; seed <= 12; ++seed)
  {
    const auto& [form, ring] = GetParam();
    tav::Writer writer(form);
    {
      tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = seed % 2 == 0});
      RandomGroup(seed).fill(root, 0);
    }
    writer.finish();
    VectorStorage storage(0x1000, bytesOf(writer.bytes()), VectorStorage::kReadOnly);
    const tav::Reader reader = ring ? tav::Reader(storage, form) : tav::Reader(writer.bytes(), form);
    const tav::Node root = reader.root();
    for (uint64_t bits = 0; bits < 16; ++bits)
    {
      const bool xml = (bits & 1U) != 0;
      const tav::PrintOptions options{
          .xml = xml, .data = (bits & 2U) != 0, .headers = (bits & 4U) != 0, .descriptors = !ring && (bits & 8U) != 0};
      const uint64_t plain = TAV_PRINT_SUBTREE | (xml ? TAV_PRINT_XML : 0) | (options.data ? TAV_PRINT_DATA : 0) |
                             (options.headers ? TAV_PRINT_HEADERS : 0) |
                             (options.descriptors ? TAV_PRINT_DESCRIPTORS : 0);
      const std::string text = printed(reader, options, root);
      ASSERT_EQ(text, plainlyPrinted(reader, plain, root)) << "seed " << seed << ", options " << bits;
      characters += text.size();
    }
  }
  EXPECT_GT(characters, 50'000U);
}

TEST(LayerPrintValue, EveryKindOfTextIsEscapedInXml)
{
  EXPECT_EQ(inXml(u8"gr\u00FC\u00DFe"), "<hostName>gr\xC3\xBC\xC3\x9F"
                                        "e</hostName>");
  EXPECT_EQ(inXml("gr\xC3\xBC\xC3\x9F"
                  "e"),
            "<hostName>gr\xC3\xBC\xC3\x9F"
            "e</hostName>");
  EXPECT_EQ(inXml("<a href=\"b\">&</a>\r\n\t"),
            "<hostName>&lt;a href=&quot;b&quot;&gt;&amp;&lt;/a&gt;&#13;\n\t</hostName>");
  EXPECT_EQ(inXml(""), "<hostName></hostName>");
  EXPECT_EQ(inXml(tav::Utf8{"ab", 850}), "<hostName codePage=\"850\">ab</hostName>");
}

TEST(LayerPrintValue, WhatXmlCannotHoldIsHexadecimal)
{
  EXPECT_EQ(inXml("a\x01"), "<hostName encoding=\"hex\">6101</hostName>");
  EXPECT_EQ(inXml(std::string("a\0b", 3)), "<hostName encoding=\"hex\">610062</hostName>");
  EXPECT_EQ(inXml(u8"\uFFFE"), kBigEndianHost ? "<hostName encoding=\"hex\">04B8EFBFBE</hostName>"
                                              : "<hostName encoding=\"hex\">B804EFBFBE</hostName>");
  EXPECT_EQ(inXml(int8_t{5}), "<hostName encoding=\"hex\">05</hostName>");
  EXPECT_EQ(inXml(std::byte{0x80}), "<hostName encoding=\"hex\">80</hostName>");
  EXPECT_EQ(inXml(std::byte{'<'}), "<hostName>&lt;</hostName>");
}

TEST(LayerPrintValue, TypesThatThePlainOperationRefusesArePrinted)
{
  EXPECT_EQ(inText(u8"gr\u00FC\u00DFe"), "gr\xC3\xBC\xC3\x9F"
                                         "e");
  EXPECT_EQ(inText(tav::Sint128{-1, ~uint64_t{0}}), "-1");
  EXPECT_EQ(inText(tav::Sint128{INT64_MIN, 0}), "-170141183460469231731687303715884105728");
  EXPECT_EQ(inText(tav::Sint128{INT64_MAX, ~uint64_t{0}}), "170141183460469231731687303715884105727");
  EXPECT_EQ(inText(tav::Sint128{}), "0");
  const std::array<std::byte, 3> bytes{std::byte{1}, std::byte{2}, std::byte{0xAB}};
  for (const uint16_t type : {uint16_t{999}, uint16_t{TAV_TYPE_UINT32}, uint16_t{TAV_TYPE_UINT64_ARRAY},
                              uint16_t{TAV_TYPE_SINT128}, uint16_t{TAV_TYPE_UTC_TIMESTAMP}})
  {
    const auto add = [&](tav::Group& root) { root.addRaw(type, TAV_ELM_CMN_HOST_NAME, bytes); };
    EXPECT_EQ(printedValue(add, {.bare = true}), "0102AB") << type;
    EXPECT_THAT(printedValue(add, {.xml = true}), HasSubstr("<hostName encoding=\"hex\">0102AB</hostName>")) << type;
  }
  const auto one = [](tav::Group& root) {
    root.addRaw(TAV_TYPE_UTF8_STRING, TAV_ELM_CMN_HOST_NAME, std::as_bytes(std::span("x", 1)));
  };
  EXPECT_EQ(printedValue(one, {.bare = true}), "78") << "no room for a code page";
}

TEST(LayerPrintValue, LongerThanWhatIsHandedOverAtOnceIsWhole)
{
  const auto print = [](const std::string& value) {
    tav::Writer writer;
    {
      tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
      system.add(TAV_ELM_CMN_HOST_NAME, value);
      system.add(TAV_ELM_CMN_CPU_ONLINE, 7U);
    }
    writer.finish();
    const tav::Reader reader(writer.bytes());
    return printed(reader, {.xml = true}, reader.root());
  };
  std::string value;
  for (unsigned i = 0; i < 50000; ++i) value += std::to_string(i);
  std::string expected = print("@");
  EXPECT_EQ(print(value), expected.replace(expected.find('@'), 1, value));
}

TEST(LayerPrintValue, MomentsAreSecondsMillisecondsAndMicroseconds)
{
  const std::chrono::sys_seconds leapDay{1709164800s}; // 29 February 2024
  EXPECT_EQ(inText(leapDay + 123456us), "2024-02-29T00:00:00.123456+00:00");
  EXPECT_EQ(inText(std::chrono::sys_seconds(1735689599s)), "2024-12-31T23:59:59.000000+00:00");
  EXPECT_EQ(inText(TAVTimeStamp{1709164800, 123, 456, 0, -90}), "2024-02-28T22:30:00.123456-01:30");
  EXPECT_EQ(inText(TAVTimeStamp{1709164800, 1500, 65535, 0, 60}), "2024-02-29T01:00:01.565535+01:00");
  EXPECT_EQ(inText(TAVTimeStamp{~uint64_t{0}, 0, 0, 0, 0}), "18446744073709551615 s");
}

TEST(LayerPrintXml, OfUnknownElementsIsWellFormed)
{
  const auto add = [](tav::Group& root) { root.add(40001, "x"); };
  EXPECT_THAT(printedValue(add, {.xml = true}), HasSubstr("<element id=\"40001\">x</element>"));
}

TEST(LayerPrintXml, HasKeysAsQuotedAttributesOnce)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    tav::Group host = root.group(TAV_ELM_CMN_HOST);
    host.add(TAV_ELM_CMN_HOST_NAME, "<a \"b\">\n");
    host.add(TAV_ELM_CMN_HOST_NAME, "second");
  }
  writer.finish();
  const tav::Reader reader(writer.bytes());
  const std::string xml = printed(reader, {.xml = true, .attributes = true}, reader.root());
  EXPECT_THAT(xml, HasSubstr("   <host hostName=\"&lt;a &quot;b&quot;&gt;&#10;\">\n"));
  EXPECT_THAT(xml, HasSubstr("<hostName>second</hostName>"));
  EXPECT_THAT(xml, Not(HasSubstr("hostName=\"second\"")));
}

TEST(LayerPrintXml, OfOneNodeIsADocument)
{
  tav::Writer writer;
  writer.group(TAV_ELM_CMN_SYSTEM).close();
  writer.finish();
  const tav::Reader reader(writer.bytes());
  EXPECT_EQ(printed(reader, {.xml = true, .subtree = false}, reader.root()),
            "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n<system>\n</system>\n");
}

TEST(LayerPrintFailure, IsToldByItsCode)
{
  tav::Writer writer;
  writer.group(TAV_ELM_CMN_SYSTEM).close();
  writer.finish();
  const tav::Reader reader(writer.bytes());
  CaughtStream stream;
  EXPECT_EQ(thrownBy([&] { reader.print(stream.get(), reader.root(), {.bare = true}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { reader.print(stream.get(), reader.root(), {.subtree = false}); }), TAV_RC_NO_MEMORY)
      << "nothing to print";
  EXPECT_EQ(stream.text(), "");
}

TEST(LayerPrintFailure, NestsAsDeepAsEverywhere)
{
  Bytes bytes;
  for (unsigned level = 0; level < 4001; ++level)
  {
    const Bytes header = hex("FF FF FF FF 01 00 F6 EA");
    bytes.insert(bytes.end(), header.begin(), header.end());
  }
  const tav::Reader reader(spanOf(bytes), {.byteOrder = kLowFirst, .root = tav::Width::bits32});
  CaughtStream stream;
  EXPECT_EQ(thrownBy([&] { reader.print(stream.get(), reader.root(), {.xml = true, .data = false}); }),
            TAV_RC_NO_MEMORY);
}
