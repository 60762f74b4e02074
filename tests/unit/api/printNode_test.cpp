#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "api/printer.h"
#include "support/elements.h"
#include "support/printing.h"
#include "support/rows.h"
#include "support/traceLog.h"
#include "tav/probes.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;

enum class Kind
{
  element32,
  element64,
  group32,
  group64
};

/// A node at offset 24 with all fields of its descriptor set. The elements hold an "A".
struct Subject
{
  explicit Subject(Kind kind)
  {
    switch (kind)
    {
    case Kind::element32: node.header = header32(1, TAV_TYPE_SINT8, 60103, 24); break;
    case Kind::element64: node.header = header64(1, TAV_TYPE_SINT8, 60103, 0xC0FFEE, 24); break;
    case Kind::group32: node.header = header32(4294967295, TAV_TYPE_HEADER32, 60102, 24); break;
    case Kind::group64: node.header = header64(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, 60102, 0x500000, 24); break;
    }
    node.pDataBuf = value;
    node.dataBufSize = 77;
    node.dataBufOffset = 9;
  }

  uint8_t value[1] = {'A'};
  TAVHeaderData node{};
};

/// tavPrintNode to a stream.
Printed printNode(uint64_t options, TAVHeaderData& node, bool open, bool body, bool close, int64_t depth = 0,
                  bool attributes = false)
{
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get(), options);
  ctx.depth = depth;
  ctx.attributeForm = attributes ? 1 : 0;
  uint64_t count = 0xBAD;
  const uint32_t rc = tavPrintNode(&ctx, &node, open, body, close, &count);
  EXPECT_EQ(ctx.bytesWritten, count);
  return {rc, count, stream.text()};
}

struct Form
{
  Kind kind;
  const char* name;
  bool group;
  std::string textHeader;
  std::string xmlHeader;
};

const Form kForms[] = {
    {Kind::element32, "Element32", false,
     "  0|   TAVHeader\n"
     "  0|   {\n"
     "  0|      TAVHeader32\n"
     "  0|      {\n"
     "  0|         size = 1\n"
     "  0|         type = 52 ( Sint8 )\n"
     "  0|         elm  = 60103 ( TAV_ELM_CMN_HOST_NAME )\n"
     "  0|      }\n"
     "  0|      hdrType    = 1 ( TAV_TYPE_HEADER32 )\n"
     "  0|      nodeOffset = 24\n"
     "  0|   }\n",
     "   <tavHeader>\n"
     "      <tavHeader32>\n"
     "         <size>1</size>\n"
     "         <type>Sint8</type>\n"
     "         <elm>TAV_ELM_CMN_HOST_NAME</elm>\n"
     "      </tavHeader32>\n"
     "      <hdrType>TAV_TYPE_HEADER32</hdrType>\n"
     "      <nodeOffset>24</nodeOffset>\n"
     "   </tavHeader>\n"},
    {Kind::element64, "Element64", false,
     "  0|   TAVHeader\n"
     "  0|   {\n"
     "  0|      TAVHeader64\n"
     "  0|      {\n"
     "  0|         size = 1\n"
     "  0|         info = C0FFEE\n"
     "  0|         type = 52 ( Sint8 )\n"
     "  0|         elm  = 60103 ( TAV_ELM_CMN_HOST_NAME )\n"
     "  0|      }\n"
     "  0|      hdrType    = 2 ( TAV_TYPE_HEADER64 )\n"
     "  0|      nodeOffset = 24\n"
     "  0|   }\n",
     "   <tavHeader>\n"
     "      <tavHeader64>\n"
     "         <size>1</size>\n"
     "         <info>C0FFEE</info>\n"
     "         <type>Sint8</type>\n"
     "         <elm>TAV_ELM_CMN_HOST_NAME</elm>\n"
     "      </tavHeader64>\n"
     "      <hdrType>TAV_TYPE_HEADER64</hdrType>\n"
     "      <nodeOffset>24</nodeOffset>\n"
     "   </tavHeader>\n"},
    {Kind::group32, "Group32", true,
     "  0|   TAVHeader\n"
     "  0|   {\n"
     "  0|      TAVHeader32\n"
     "  0|      {\n"
     "  0|         size = 4294967295\n"
     "  0|         type = 1 ( TAV_TYPE_HEADER32 )\n"
     "  0|         elm  = 60102 ( TAV_ELM_CMN_HOST )\n"
     "  0|      }\n"
     "  0|      hdrType    = 1 ( TAV_TYPE_HEADER32 )\n"
     "  0|      nodeOffset = 24\n"
     "  0|   }\n",
     "   <tavHeader>\n"
     "      <tavHeader32>\n"
     "         <size>4294967295</size>\n"
     "         <type>TAV_TYPE_HEADER32</type>\n"
     "         <elm>TAV_ELM_CMN_HOST</elm>\n"
     "      </tavHeader32>\n"
     "      <hdrType>TAV_TYPE_HEADER32</hdrType>\n"
     "      <nodeOffset>24</nodeOffset>\n"
     "   </tavHeader>\n"},
    {Kind::group64, "Group64", true,
     "  0|   TAVHeader\n"
     "  0|   {\n"
     "  0|      TAVHeader64\n"
     "  0|      {\n"
     "  0|         size = 18446744073709551615\n"
     "  0|         info = 500000\n"
     "  0|         type = 2 ( TAV_TYPE_HEADER64 )\n"
     "  0|         elm  = 60102 ( TAV_ELM_CMN_HOST )\n"
     "  0|      }\n"
     "  0|      hdrType    = 2 ( TAV_TYPE_HEADER64 )\n"
     "  0|      nodeOffset = 24\n"
     "  0|   }\n",
     "   <tavHeader>\n"
     "      <tavHeader64>\n"
     "         <size>18446744073709551615</size>\n"
     "         <info>500000</info>\n"
     "         <type>TAV_TYPE_HEADER64</type>\n"
     "         <elm>TAV_ELM_CMN_HOST</elm>\n"
     "      </tavHeader64>\n"
     "      <hdrType>TAV_TYPE_HEADER64</hdrType>\n"
     "      <nodeOffset>24</nodeOffset>\n"
     "   </tavHeader>\n"},
};

void PrintTo(const Form& form, std::ostream* out)
{
  *out << form.name;
}

class NodeBody : public ::testing::TestWithParam<Form>
{
protected:
  /// The body alone, as text or as XML.
  Printed body(uint64_t options)
  {
    return printNode(options, subject_.node, false, true, false);
  }
  [[nodiscard]] std::string textDescriptor() const
  {
    return "  0|   pDataBuf      = " + addressText(subject_.value) + "\n" +
           "  0|   dataBufSize   = 77\n"
           "  0|   dataBufOffset = 9\n";
  }
  [[nodiscard]] std::string xmlDescriptor() const
  {
    return "   <pDataBuf>" + addressText(subject_.value) + "</pDataBuf>\n" +
           "   <dataBufSize>77</dataBufSize>\n"
           "   <dataBufOffset>9</dataBufOffset>\n";
  }

  Subject subject_{GetParam().kind};
};

TEST_P(NodeBody, IsEmptyWithoutOptions)
{
  EXPECT_EQ(body(0x0), printed(TAV_RC_OK, ""));
  EXPECT_EQ(body(0x40), printed(TAV_RC_OK, ""));
}

TEST_P(NodeBody, IsEmptyWithDescriptorsAloneAndUnusedBits)
{
  for (const uint64_t options : {0x8U, 0x20U, 0x80U, 0x1U, 0xA9U})
  {
    EXPECT_EQ(body(options), printed(TAV_RC_OK, ""));
    EXPECT_EQ(body(options | 0x40), printed(TAV_RC_OK, ""));
  }
}

TEST_P(NodeBody, IsWhatTheOptionsAskForInThisOrder)
{
  struct Row
  {
    const char* name;
    uint64_t options;
    std::string text;
  };
  const std::string& textHeader = GetParam().textHeader;
  const std::string& xmlHeader = GetParam().xmlHeader;
  const std::string textData = GetParam().group ? "" : "  0|   A\n";
  const std::string bareData = GetParam().group ? "" : "A";
  const std::string xmlData = GetParam().group ? "   <tavData></tavData>\n" : "   <tavData>A</tavData>\n";
  const Row rows[] = {
      {"as text the header", 0x2, textHeader},
      {"as text no descriptors without data", 0xA, textHeader},
      {"as text the data on a line of its own", 0x4, textData},
      {"as text the header, then the data", 0x6, textHeader + textData},
      {"as text the descriptors before the data", 0xC, textDescriptor() + textData},
      {"as text all three", 0xE, textHeader + textDescriptor() + textData},
      {"as XML the header", 0x42, xmlHeader},
      {"as XML no descriptors without data", 0x4A, xmlHeader},
      {"as XML the data without decoration", 0x44, bareData},
      {"as XML the header, then wrapped data", 0x46, xmlHeader + xmlData},
      {"as XML the descriptors before wrapped data", 0x4C, xmlDescriptor() + xmlData},
      {"as XML all three", 0x4E, xmlHeader + xmlDescriptor() + xmlData},
  };
  for (const Row& row : rows)
  {
    EXPECT_EQ(body(row.options), printed(TAV_RC_OK, row.text)) << row.name;
  }
}

TEST_P(NodeBody, WithBareIsTheValueWhateverElseIsAsked)
{
  for (uint64_t options = 0; options < 0x100; ++options)
  {
    if ((options & 0x10) != 0)
    {
      EXPECT_EQ(body(options), GetParam().group ? printed(TAV_RC_BAD_PARAM, "") : printed(TAV_RC_OK, "A")) << options;
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Of, NodeBody, ::testing::ValuesIn(kForms),
                         kRowName);

/// Which parts are printed, and what comes out for the element of Subject.
struct PartsRow
{
  bool open, body, close;
  uint64_t options;
  std::string text;
};

void PrintTo(const PartsRow& row, std::ostream* out)
{
  *out << "open " << row.open << " body " << row.body << " close " << row.close << " options " << row.options;
}

const std::string kTextHeader = kForms[0].textHeader;
const std::string kXmlHeader = kForms[0].xmlHeader;
const std::string kXmlData = "   <tavData>A</tavData>\n";

const PartsRow kTextParts[] = {
    {false, false, false, 0x4, ""},
    {true, false, false, 0x4, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n"},
    {false, true, false, 0x4, "  0|   A\n"},
    {true, true, false, 0x4, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n  0|   A\n"},
    {false, false, true, 0x4, "  0|}\n"},
    {true, false, true, 0x4, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n  0|}\n"},
    {false, true, true, 0x4, "  0|   A\n  0|}\n"},
    {true, true, true, 0x4, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n  0|   A\n  0|}\n"},
    {true, true, true, 0x0, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n  0|}\n"},
    {true, true, true, 0x2, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n" + kTextHeader + "  0|}\n"},
    {true, true, true, 0x10, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\nA  0|}\n"},
};

const PartsRow kXmlParts[] = {
    {false, false, false, 0x44, ""},
    {true, false, false, 0x44, "<hostName>\n"},
    {false, true, false, 0x44, "A"},
    {true, true, false, 0x44, "<hostName>\nA"},
    {false, false, true, 0x44, "</hostName>\n"},
    {true, false, true, 0x44, "<hostName></hostName>\n"},
    {false, true, true, 0x44, "A</hostName>\n"},
    {true, true, true, 0x44, "<hostName>A</hostName>\n"},
    {true, true, true, 0x40, "<hostName></hostName>\n"},
    {true, true, true, 0x50, "<hostName>A</hostName>\n"},
    {false, false, false, 0x46, ""},
    {true, false, false, 0x46, "<hostName>\n"},
    {false, true, false, 0x46, kXmlHeader + kXmlData},
    {true, true, false, 0x46, "<hostName>\n" + kXmlHeader + kXmlData},
    {false, false, true, 0x46, "</hostName>\n"},
    {true, false, true, 0x46, "<hostName>\n</hostName>\n"},
    {false, true, true, 0x46, kXmlHeader + kXmlData + "</hostName>\n"},
    {true, true, true, 0x46, "<hostName>\n" + kXmlHeader + kXmlData + "</hostName>\n"},
    {true, true, true, 0x42, "<hostName>\n" + kXmlHeader + "</hostName>\n"},
    {true, true, true, 0x52, "<hostName>\nA</hostName>\n"},
};

class NodeParts : public ::testing::TestWithParam<PartsRow>
{
};

TEST_P(NodeParts, ArePrintedAsAsked)
{
  Subject subject(Kind::element32);
  EXPECT_EQ(printNode(GetParam().options, subject.node, GetParam().open, GetParam().body, GetParam().close),
            printed(TAV_RC_OK, GetParam().text));
}

INSTANTIATE_TEST_SUITE_P(AsText, NodeParts, ::testing::ValuesIn(kTextParts));
INSTANTIATE_TEST_SUITE_P(AsXml, NodeParts, ::testing::ValuesIn(kXmlParts));

class AttributeParts : public ::testing::TestWithParam<PartsRow>
{
};

TEST_P(AttributeParts, ArePrintedAsAsked)
{
  for (const uint64_t decoration : {0x00U, 0x02U, 0x04U, 0x0EU, 0x10U})
  {
    Subject subject(Kind::element32);
    EXPECT_EQ(printNode(GetParam().options | decoration, subject.node, GetParam().open, GetParam().body,
                        GetParam().close, 0, true),
              printed(TAV_RC_OK, GetParam().text))
        << decoration;
  }
}

const PartsRow kAttributeParts[] = {
    {false, false, false, 0xC1, ""},
    {true, false, false, 0xC1, "<hostName"},
    {false, true, false, 0xC1, " hostName=A"},
    {true, true, false, 0xC1, "<hostName hostName=A"},
    {false, false, true, 0xC1, ">\n"},
    {true, false, true, 0xC1, "<hostName>\n"},
    {false, true, true, 0xC1, " hostName=A>\n"},
    {true, true, true, 0xC1, "<hostName hostName=A>\n"},
};

INSTANTIATE_TEST_SUITE_P(AsAttributes, AttributeParts, ::testing::ValuesIn(kAttributeParts));

TEST(NodeInTheTextForm, KnowsNoAttributeForm)
{
  Subject subject(Kind::element32);
  EXPECT_EQ(printNode(0x84, subject.node, true, true, true, 0, true),
            printed(TAV_RC_OK, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n  0|   A\n  0|}\n"));
}

struct AtADepth
{
  const char* name;
  uint64_t options;
  bool isOpened; ///< and has its value; else only its end is printed
  uint32_t depth;
  std::string text;
};

void PrintTo(const AtADepth& row, std::ostream* out)
{
  *out << row.name;
}

class NodeAtADepth : public ::testing::TestWithParam<AtADepth>
{
};

TEST_P(NodeAtADepth, HasItsBlanks)
{
  const AtADepth& row = GetParam();
  const bool asAttributes = (row.options & 0x80) != 0;
  Subject subject(Kind::element32);
  EXPECT_EQ(printNode(row.options, subject.node, row.isOpened, row.isOpened, true, row.depth, asAttributes),
            printed(TAV_RC_OK, row.text));
}

const AtADepth kAtADepth[] = {
    {"HasDepthAndBlanksOnEveryLine", 0x6, true, 2,
     "  2|      TAV_ELM_CMN_HOST_NAME\n  2|      {\n" + moved(kForms[0].textHeader, "  0|", "  2|      ") +
         "  2|         A\n  2|      }\n"},
    {"InXmlHasBlanksOnlyAndNoneBehindTheValue", 0x44, true, 2, "      <hostName>A</hostName>\n"},
    {"InXmlWithHeaderHasBlanksOnEveryLine", 0x46, true, 1,
     "   <hostName>\n" + moved(kForms[0].xmlHeader, "", "   ") + "      <tavData>A</tavData>\n   </hostName>\n"},
    {"InXmlIndentsAClosingOfItsOwn", 0x44, false, 2, "      </hostName>\n"},
    {"AsAttributesIndentsItsOpening", 0xC5, true, 1, "   <hostName hostName=A>\n"},
};

INSTANTIATE_TEST_SUITE_P(Rows, NodeAtADepth, ::testing::ValuesIn(kAtADepth), kRowName);

TEST(NodeInXmlWithDescriptors, ClosesBehindTheDataWithoutBlanks)
{
  Subject subject(Kind::element32);
  EXPECT_EQ(printNode(0x4C, subject.node, true, true, true, 1),
            printed(TAV_RC_OK, "   <hostName>      <pDataBuf>" + addressText(subject.value) +
                                   "</pDataBuf>\n"
                                   "      <dataBufSize>77</dataBufSize>\n"
                                   "      <dataBufOffset>9</dataBufOffset>\n"
                                   "      <tavData>A</tavData>\n"
                                   "</hostName>\n"));
}

TEST(NodeWithoutData, HasNoValueLine)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.size = 0;
  EXPECT_EQ(printNode(0x4, subject.node, true, true, true),
            printed(TAV_RC_OK, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n  0|}\n"));
}

TEST(NodeWithoutData, HasEmptyDataInXml)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.size = 0;
  EXPECT_EQ(printNode(0x44, subject.node, true, true, true), printed(TAV_RC_OK, "<hostName></hostName>\n"));
}

TEST(NodeWithoutData, DoesNotLookAtItsPointer)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.size = 0;
  subject.node.pDataBuf = nullptr;
  EXPECT_EQ(printNode(0x44, subject.node, true, true, true), printed(TAV_RC_OK, "<hostName></hostName>\n"));
}

TEST(NodeWithoutData, ShowsANullPointer)
{
  Subject subject(Kind::group64);
  subject.node.pDataBuf = nullptr;
  subject.node.dataBufSize = ~uint64_t{0};
  subject.node.dataBufOffset = 0;
  EXPECT_EQ(printNode(0xC, subject.node, false, true, false),
            printed(TAV_RC_OK, "  0|   pDataBuf      = 0000000000000000\n"
                               "  0|   dataBufSize   = 18446744073709551615\n"
                               "  0|   dataBufOffset = 0\n"));
}

TEST(NodeOfAnUnknownElement, IsNamedSo)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.elm = 64999;
  EXPECT_EQ(printNode(0x4, subject.node, true, true, true),
            printed(TAV_RC_OK, "  0|Unknown Element\n  0|{\n  0|   A\n  0|}\n"));
  EXPECT_EQ(printNode(0x44, subject.node, true, true, true),
            printed(TAV_RC_OK, "<Unknown Element>A</Unknown Element>\n"));
}

/// The type line of a header dump: the code that the printer finds, and its name.
std::string typeLine(uint16_t type)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.type = type;
  const std::string text = printNode(0x2, subject.node, false, true, false).text;
  const size_t start = text.find("type = ") + 7;
  return text.substr(start, text.find('\n', start) - start);
}

TEST(NodeType, IsNamedByItsPrintName)
{
  EXPECT_EQ(typeLine(1), "1 ( TAV_TYPE_HEADER32 )");
  EXPECT_EQ(typeLine(2), "2 ( TAV_TYPE_HEADER64 )");
  EXPECT_EQ(typeLine(50), "50 ( ASCII String )");
  EXPECT_EQ(typeLine(51), "51 ( Uint8 )");
  EXPECT_EQ(typeLine(52), "52 ( Sint8 )");
  EXPECT_EQ(typeLine(53), "53 ( Uint16 )");
  EXPECT_EQ(typeLine(54), "54 ( Sint16 )");
  EXPECT_EQ(typeLine(55), "55 ( Uint32 )");
  EXPECT_EQ(typeLine(56), "56 ( Sint32 )");
  EXPECT_EQ(typeLine(57), "57 ( Uint64 )");
  EXPECT_EQ(typeLine(58), "58 ( Sint64 )");
  EXPECT_EQ(typeLine(100), "100 ( UTC Timestamp )");
  EXPECT_EQ(typeLine(101), "101 ( Binary )");
  EXPECT_EQ(typeLine(102), "102 ( UTF8 String )");
  EXPECT_EQ(typeLine(103), "103 ( Uint128 )");
  EXPECT_EQ(typeLine(104), "104 ( Sint128 )");
}

TEST(NodeType, WithoutAPrintNameIsAnInvalidHeaderType)
{
  for (const int type : {0, 3, 49, 59, 99, 105, 106, 107, 109, 110, 111, 65535})
  {
    EXPECT_EQ(typeLine(static_cast<uint16_t>(type)), std::to_string(type) + " ( Invalid header type )");
  }
}

TEST(NodeType, IsNamedInXmlToo)
{
  Subject subject(Kind::element32);
  subject.node.header.hdr32.type = TAV_TYPE_BYTE;
  EXPECT_THAT(printNode(0x42, subject.node, false, true, false).text,
              ::testing::HasSubstr("         <type>Invalid header type</type>\n"));
}

TEST(NodeNumbers, AreShownWhole)
{
  Subject subject(Kind::group64);
  subject.node.header.hdr64.info = 0xFFFFFFFF;
  subject.node.header.nodeOffset = ~uint64_t{0};
  const std::string text = printNode(0x2, subject.node, false, true, false).text;
  EXPECT_THAT(text, ::testing::HasSubstr("|         info = FFFFFFFF\n"));
  EXPECT_THAT(text, ::testing::HasSubstr("|      nodeOffset = 18446744073709551615\n"));
  subject.node.header.hdr64.info = 0;
  EXPECT_THAT(printNode(0x2, subject.node, false, true, false).text, ::testing::HasSubstr("|         info = 0\n"));
}

TEST(NodeWhoseValueFails, EndsWithTheCodeAndWithoutAClosing)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.type = TAV_TYPE_UTF8_STRING;
  TraceLog trace;
  EXPECT_EQ(printNode(0x4, subject.node, true, true, true),
            printed(TAV_RC_NOT_SUPPORTED, "  0|TAV_ELM_CMN_HOST_NAME\n  0|{\n  0|   "));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printValue, 60, TAV_RC_NOT_SUPPORTED},
                                            Failure{probe::printNode, 30, TAV_RC_NOT_SUPPORTED}));
}

TEST(NodeWhoseValueFails, EndsWithTheCodeInXml)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.type = TAV_TYPE_UINT16;
  EXPECT_EQ(printNode(0x4C, subject.node, false, true, true),
            printed(TAV_RC_OUTSIDE_PARENT, "   <pDataBuf>" + addressText(subject.value) +
                                               "</pDataBuf>\n"
                                               "   <dataBufSize>77</dataBufSize>\n"
                                               "   <dataBufOffset>9</dataBufOffset>\n"
                                               "   <tavData>"));
}

TEST(NodeWhoseValueFails, EndsWithTheCodeWhenBare)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.type = TAV_TYPE_SINT128;
  EXPECT_EQ(printNode(0x50, subject.node, true, true, true), printed(TAV_RC_NOT_SUPPORTED, "<hostName>"));
}

TEST(NodeWhoseValueFails, EndsWithTheCodeAsAttribute)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.type = TAV_TYPE_UTF8_STRING;
  EXPECT_EQ(printNode(0xC1, subject.node, false, true, true, 0, true),
            printed(TAV_RC_NOT_SUPPORTED, " hostName="));
}

TEST(NodeWhoseValueFails, IsNoFailureWithoutData)
{
  Subject subject(Kind::element64);
  subject.node.header.hdr64.type = TAV_TYPE_UTF8_STRING;
  EXPECT_EQ(printNode(0x0, subject.node, true, true, true).rc, TAV_RC_OK);
}

TEST(PrintNodeArguments, NullNodeIsABadArgument)
{
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get());
  uint64_t count = 0xBAD;
  TraceLog trace;
  EXPECT_EQ(tavPrintNode(&ctx, nullptr, 1, 1, 1, &count), TAV_RC_BAD_PARAM);
  EXPECT_EQ(count, 0U);
  EXPECT_EQ(stream.text(), "");
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printNode, 10, TAV_RC_BAD_PARAM}));
}

TEST(PrintNodeArguments, OtherHeaderTypesAreRefused)
{
  for (const int hdrType : {0, 3, 52, 65535})
  {
    for (const uint64_t options : {0x6U, 0x46U})
    {
      Subject subject(Kind::element64);
      subject.node.header.hdrType = static_cast<uint16_t>(hdrType);
      TraceLog trace;
      EXPECT_EQ(printNode(options, subject.node, true, true, true), printed(TAV_RC_BAD_HDR_TYPE, ""));
      EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printNode, 20, TAV_RC_BAD_HDR_TYPE}));
    }
  }
}

TEST(PrintNodeCount, IsOfThisNodeAlone)
{
  Subject subject(Kind::element32);
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get(), 0x44);
  uint64_t count = 0;
  ASSERT_EQ(tavPrintNode(&ctx, &subject.node, 1, 1, 1, &count), TAV_RC_OK);
  ASSERT_EQ(tavPrintNode(&ctx, &subject.node, 0, 1, 0, &count), TAV_RC_OK);
  EXPECT_EQ(count, 1U);
  EXPECT_EQ(ctx.bytesWritten, stream.text().size());
}

TEST(PrintNodeTrace, IsEntryArgumentsResultAndExit)
{
  Subject subject(Kind::element32);
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get());
  uint64_t count = 0;
  TraceLog trace;
  ASSERT_EQ(tavPrintNode(&ctx, &subject.node, 1, 0, 0, &count), TAV_RC_OK);
  EXPECT_THAT(trace.steps(),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::printNode, 0}, Step{KOR_TRACE_VAR, probe::printNode, 0},
                          Step{KOR_TRACE_VAR, probe::printNode, 100}, Step{KOR_TRACE_EXIT, probe::printNode, 0}));
  TAVPrintCtx* const pCtx = &ctx;
  const uint8_t yes = 1;
  const uint8_t no = 0;
  EXPECT_THAT(trace.dump(probe::printNode, 0).items,
              ElementsAre(bytesOf(pCtx), bytesOf(subject.node), bytesOf(yes), bytesOf(no), bytesOf(no)));
  EXPECT_THAT(trace.dump(probe::printNode, 100).items, ElementsAre(bytesOf(count)));
  EXPECT_EQ(trace.records().back().code, TAV_RC_OK);
}

TEST(PrintNodeTrace, CarriesItsProbe)
{
  EXPECT_EQ(probe::printNode, 0x088A0089U);
}

} // namespace
