#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/byteRows.h"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;
using testing::HasSubstr;
using testing::Not;

namespace
{

struct Xml
{
  explicit Xml(const Bytes& bytes, const tav::inspect::Form& form = {})
  {
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Kept kept;
    damaged = toXml(source, form, kept, {.passedOver = [&](PassedOver one) { passed.push_back(std::move(one)); }});
    text = kept.text;
  }

  std::string text;
  std::vector<PassedOver> passed;
  bool damaged = false;
};

/// Whether all tags are closed in the right order, and nothing is outside of the one element around all.
bool isNested(const std::string& text)
{
  std::vector<std::string> open;
  size_t roots = 0;
  for (size_t at = text.find('<', text.find("?>")); at != std::string::npos; at = text.find('<', at + 1))
  {
    const size_t end = text.find('>', at);
    if (end == std::string::npos)
    {
      return false;
    }
    const std::string tag = text.substr(at + 1, end - at - 1);
    if (tag.front() == '/')
    {
      if (open.empty() || open.back() != tag.substr(1))
      {
        return false;
      }
      open.pop_back();
      continue;
    }
    roots += open.empty() ? 1 : 0;
    if (tag.back() != '/')
    {
      open.push_back(tag.substr(0, tag.find(' ')));
    }
  }
  return open.empty() && roots == 1;
}

} // namespace

/// A group with one value, in this machine's byte order and in the other one.
class XmlOfValue : public testing::TestWithParam<bool>
{
protected:
  ByteRows rows{GetParam()};

  /// The element of a host's name with this type and payload, which follows what is there.
  std::string valueOf(uint16_t type, const Bytes& payload, uint16_t elm = TAV_ELM_CMN_HOST_NAME)
  {
    ByteRows whole(GetParam());
    whole.h64(16 + payload.size(), 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
    whole.h64(payload.size(), 0, type, elm).data(payload);
    const Xml xml(whole.bytes, {.swapped = GetParam()});
    EXPECT_FALSE(xml.damaged);
    EXPECT_TRUE(xml.passed.empty());
    EXPECT_TRUE(isNested(xml.text)) << xml.text;
    const size_t from = xml.text.find("\n  <") + 3;
    return xml.text.substr(from, xml.text.find('\n', from) - from);
  }
  std::string valueOfText(const std::string& text)
  {
    return valueOf(TAV_TYPE_ASCII_STRING, {text.begin(), text.end()});
  }
  Bytes number(uint64_t value, unsigned width) { return ByteRows(GetParam()).number(value, width).bytes; }
};

INSTANTIATE_TEST_SUITE_P(Swapped, XmlOfValue, testing::Bool());

TEST_P(XmlOfValue, BeginsWithTheFormAndTheRoot)
{
  rows.h64(0, TAV_INFO_ALIGNED8, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  const Xml xml(rows.bytes, {.swapped = GetParam()});
  const std::string order = GetParam() != tav::kor::isLittleEndian ? "little" : "big";
  EXPECT_EQ(xml.text,
            "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<tav byteOrder=\"" + order +
                "\" root=\"64\" aligned=\"false\">\n"
                " <system type=\"group64\" header=\"64\" info=\"0x100000\" size=\"0\">\n </system>\n</tav>\n");
}

TEST_P(XmlOfValue, NumbersAreDecimal)
{
  EXPECT_EQ(valueOf(TAV_TYPE_UINT32, number(7, 4)), "<hostName type=\"Uint32\">7</hostName>");
  EXPECT_EQ(valueOf(TAV_TYPE_SINT64, number(~uint64_t{0}, 8)), "<hostName type=\"Sint64\">-1</hostName>");
  EXPECT_EQ(valueOf(TAV_TYPE_SINT128, Bytes(16, 0xFF)), "<hostName type=\"Sint128\">-1</hostName>");
  Bytes array = number(1, 8);
  const Bytes second = number(2, 8);
  array.insert(array.end(), second.begin(), second.end());
  EXPECT_THAT(valueOf(TAV_TYPE_UINT64_ARRAY, array), HasSubstr(">1 2</hostName>"));
}

TEST_P(XmlOfValue, TextsAreEscaped)
{
  EXPECT_EQ(valueOfText("a<b>&\"c'\t\r"), "<hostName type=\"ASCII String\">a&lt;b&gt;&amp;\"c'\t&#13;</hostName>");
  Bytes text = number(1252, 2);
  text.push_back('x');
  EXPECT_EQ(valueOf(TAV_TYPE_UTF8_STRING, text), "<hostName type=\"UTF8 String\" codePage=\"1252\">x</hostName>");
  std::string many;
  for (int i = 0; i < 100'000; ++i)
  {
    many += "&lt;";
  }
  EXPECT_EQ(valueOfText(std::string(100'000, '<')), "<hostName type=\"ASCII String\">" + many + "</hostName>");
}

TEST_P(XmlOfValue, WhatXmlCannotHoldIsHexadecimal)
{
  EXPECT_EQ(valueOfText(std::string("a\0b", 3)),
            "<hostName type=\"ASCII String\" encoding=\"hex\">610062</hostName>");
  EXPECT_THAT(valueOfText("\x1b[31m"), HasSubstr("encoding=\"hex\""));
  EXPECT_THAT(valueOfText("x\xEF\xBF\xBF"), HasSubstr("encoding=\"hex\">78efbfbf<"));
  EXPECT_THAT(valueOfText("\xED\xA0\x80"), HasSubstr("encoding=\"hex\""));
  EXPECT_EQ(valueOf(TAV_TYPE_BINARY, {0xAB, 0xCD}), "<hostName type=\"Binary\" encoding=\"hex\">abcd</hostName>");
}

TEST_P(XmlOfValue, ADateThatItsTextDoesNotTellHasItsFields)
{
  Bytes stamp = number(1709164800, 8);
  stamp.resize(16);
  EXPECT_THAT(valueOf(TAV_TYPE_UTC_TIMESTAMP, stamp), HasSubstr("\">2024-02-29T00:00:00.000000+00:00</hostName>"));
  const Bytes further = number(3, 2);
  std::copy(further.begin(), further.end(), stamp.begin() + 12);
  EXPECT_THAT(valueOf(TAV_TYPE_UTC_TIMESTAMP, stamp), HasSubstr("further=\"3\""));
}

TEST_P(XmlOfValue, AnElementWithoutANameIsTold)
{
  EXPECT_EQ(valueOf(TAV_TYPE_UINT8, {5}, 12345), "<element id=\"12345\" type=\"Uint8\">5</element>");
}

TEST_P(XmlOfValue, DamagedBytesStandWithTheirReason)
{
  rows.h64(60, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(9, 4);
  rows.fill(20, 0xEE);
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(8, 4);
  const Xml xml(rows.bytes, {.swapped = GetParam()});
  EXPECT_TRUE(xml.damaged);
  EXPECT_THAT(xml.text, HasSubstr("<damaged offset=\"0x24\" length=\"20\" reason=\""));
  EXPECT_THAT(xml.text, HasSubstr("encoding=\"hex\">" + hexText(Bytes(20, 0xEE)) + "</damaged>"));
  EXPECT_THAT(xml.text, HasSubstr(">8</cpuOnline>"));
  ASSERT_EQ(xml.passed.size(), 1U);
  EXPECT_EQ(xml.passed[0].offset, 36U);
  EXPECT_EQ(xml.passed[0].length, 20U);
  EXPECT_EQ(xml.passed[0].path, "/system");
}

TEST(Xml, HasAnElementForAGroupWithTheIdOfAnEndElement)
{
  const Xml xml(test::streamWithGroupNamedAsAnEnd(1));
  EXPECT_TRUE(isNested(xml.text));
  const size_t group = xml.text.find("<endHdrEyeSize ");
  EXPECT_LT(group, xml.text.find("<cpuOnline"));
  EXPECT_LT(xml.text.find("<cpuOnline"), xml.text.find("</endHdrEyeSize>"));
}

TEST(Xml, IsNestedWhateverTheStreamHolds)
{
  size_t damages = 0;
  for (uint64_t seed = 0; seed < 600; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed);
    const Xml xml(test::damaged(test::bytesOfTree(tree), seed), test::readForm(tree.form));
    EXPECT_TRUE(isNested(xml.text)) << xml.text;
    EXPECT_TRUE(isUtf8(xml.text));
    EXPECT_EQ(xml.damaged, xml.text.find("<damaged ") != std::string::npos);
    damages += xml.damaged ? 1 : 0;
  }
  EXPECT_GT(damages, 200U);
}

TEST(Xml, HasAnElementForEveryNodeButEndElements)
{
  for (uint64_t seed = 0; seed < 200; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = test::namedStream(seed, seed % 2 != 0, seed % 4 > 1);
    const tav::inspect::Form form{.swapped = seed % 2 != 0, .aligned = seed % 4 > 1};
    ByteSource source("x", std::span<const uint8_t>(bytes));
    Walker walker(source, form);
    size_t nodes = 0;
    Event event;
    while (walker.next(event))
    {
      nodes += event.what == What::nodeBegin && !isEndPiece(event) ? 1 : 0;
    }
    const std::string text = Xml(bytes, form).text;
    EXPECT_THAT(text, Not(HasSubstr("<damaged")));
    size_t elements = 0;
    for (size_t at = text.find(" type=\""); at != std::string::npos; at = text.find(" type=\"", at + 1))
    {
      ++elements;
    }
    EXPECT_EQ(elements, nodes);
  }
}

TEST(Xml, TellsHowFarItIsAndEndsWithWhatIsThrownFromThere)
{
  const Bytes bytes = test::namedStream(3);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  test::Kept kept;
  uint64_t last = 0;
  toXml(source, {}, kept, {.progress = [&](uint64_t offset) {
          EXPECT_GE(offset, last);
          last = offset;
        }});
  EXPECT_EQ(last, bytes.size());
  const std::string whole = kept.text;
  kept.text.clear();
  EXPECT_THROW(toXml(source, {}, kept, {.progress = [&](uint64_t) { throw Error("enough"); }}), Error);
  EXPECT_LT(kept.text.size(), whole.size());
}
