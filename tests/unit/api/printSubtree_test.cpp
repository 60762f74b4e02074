#include <bit>
#include <cstdint>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/elements.h"
#include "support/printing.h"
#include "support/rows.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;

/// A document with a number, a host with its name, and a number behind it.
Bytes sampleStream(const Form& form)
{
  const bool wide = !form.root32;
  StreamWriter writer(form);
  writer.add(groupOf(!form.root32, 20));
  writer.add(u32(60110, 7, wide));
  writer.add(groupOf(!form.root32, 60102));
  writer.add(ascii(60103, "box", wide));
  writer.close();
  writer.add(u64(60111, 8, wide));
  writer.close();
  return writer.bytes();
}

class Subtree : public ::testing::TestWithParam<Form>
{
protected:
  StreamReader reader_{sampleStream(GetParam()), GetParam()};
};

TEST_P(Subtree, AsTextIsIndentedBehindItsDepth)
{
  EXPECT_EQ(printSubtree(0x5, reader_.handle()),
            printed(TAV_RC_OK, "  0|TAV_ELM_CMN_DOC_ROOT\n"
                               "  0|{\n"
                               "  1|   TAV_ELM_CMN_CPU_TOTAL\n"
                               "  1|   {\n"
                               "  1|      7\n"
                               "  1|   }\n"
                               "  1|   TAV_ELM_CMN_HOST\n"
                               "  1|   {\n"
                               "  2|      TAV_ELM_CMN_HOST_NAME\n"
                               "  2|      {\n"
                               "  2|         box\n"
                               "  2|      }\n"
                               "  1|   }\n"
                               "  1|   TAV_ELM_CMN_CPU_ONLINE\n"
                               "  1|   {\n"
                               "  1|      8\n"
                               "  1|   }\n"
                               "  0|}\n"));
}

TEST_P(Subtree, AsTextWithoutDataIsItsNames)
{
  EXPECT_EQ(printSubtree(0x1, reader_.handle()),
            printed(TAV_RC_OK, "  0|TAV_ELM_CMN_DOC_ROOT\n"
                               "  0|{\n"
                               "  1|   TAV_ELM_CMN_CPU_TOTAL\n"
                               "  1|   {\n"
                               "  1|   }\n"
                               "  1|   TAV_ELM_CMN_HOST\n"
                               "  1|   {\n"
                               "  2|      TAV_ELM_CMN_HOST_NAME\n"
                               "  2|      {\n"
                               "  2|      }\n"
                               "  1|   }\n"
                               "  1|   TAV_ELM_CMN_CPU_ONLINE\n"
                               "  1|   {\n"
                               "  1|   }\n"
                               "  0|}\n"));
}

TEST_P(Subtree, AsXmlHasElementsOnOneLineEach)
{
  EXPECT_EQ(printSubtree(0x45, reader_.handle()),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <cpuTotal>7</cpuTotal>\n"
                                         "   <host>\n"
                                         "      <hostName>box</hostName>\n"
                                         "   </host>\n"
                                         "   <cpuOnline>8</cpuOnline>\n"
                                         "</docRoot>\n"));
}

TEST_P(Subtree, FromAGroupInTheMiddleBeginsAtDepthZero)
{
  TAVHeaderData root{};
  TAVHeaderData number{};
  TAVHeaderData host{};
  ASSERT_EQ(tavGetNextChild(0, reader_.handle(), nullptr, nullptr, &root), TAV_RC_OK);
  ASSERT_EQ(tavGetNextChild(0, reader_.handle(), &root.header, nullptr, &number), TAV_RC_OK);
  ASSERT_EQ(tavGetNextChild(0, reader_.handle(), &root.header, &number.header, &host), TAV_RC_OK);
  EXPECT_EQ(printSubtree(0x45, reader_.handle(), &host),
            printed(TAV_RC_OK, kProlog + "<host>\n"
                                         "   <hostName>box</hostName>\n"
                                         "</host>\n"));
}

TEST_P(Subtree, OfAGivenRootIsThatOfNone)
{
  TAVHeaderData root{};
  ASSERT_EQ(tavGetNextChild(0, reader_.handle(), nullptr, nullptr, &root), TAV_RC_OK);
  const std::string before = bytesOf(root);
  EXPECT_EQ(printSubtree(0x7, reader_.handle(), &root), printSubtree(0x7, reader_.handle()));
  EXPECT_EQ(bytesOf(root), before);
}

TEST_P(Subtree, CanBePrintedAgain)
{
  const Printed first = printSubtree(0x47, reader_.handle());
  EXPECT_EQ(printSubtree(0x47, reader_.handle()), first);
}

INSTANTIATE_TEST_SUITE_P(Over, Subtree,
                         ::testing::Values(Form{}, Form{.swap = true}, Form{.align = true}, Form{.root32 = true},
                                           Form{.buffered = true}, Form{.buffered = true, .swap = true},
                                           Form{.buffered = true, .align = true},
                                           Form{.buffered = true, .root32 = true},
                                           Form{.swap = true, .align = true, .root32 = true},
                                           Form{.buffered = true, .swap = true, .align = true, .root32 = true}),
                         kFormName);

/// A root with one number, header by header.
Bytes tinyStream(const Form& form = {})
{
  StreamWriter writer(form);
  writer.add(groupOf(!form.root32, 20));
  writer.add(u32(60111, 7, !form.root32, 0x1F));
  writer.close();
  return writer.bytes();
}

TEST(SubtreeWithHeaders, AsTextShowsThemAll)
{
  StreamReader reader(tinyStream());
  EXPECT_EQ(printSubtree(0x7, reader.handle()),
            printed(TAV_RC_OK, "  0|TAV_ELM_CMN_DOC_ROOT\n"
                               "  0|{\n"
                               "  0|   TAVHeader\n"
                               "  0|   {\n"
                               "  0|      TAVHeader64\n"
                               "  0|      {\n"
                               "  0|         size = 20\n"
                               "  0|         info = 0\n"
                               "  0|         type = 2 ( TAV_TYPE_HEADER64 )\n"
                               "  0|         elm  = 20 ( TAV_ELM_CMN_DOC_ROOT )\n"
                               "  0|      }\n"
                               "  0|      hdrType    = 2 ( TAV_TYPE_HEADER64 )\n"
                               "  0|      nodeOffset = 0\n"
                               "  0|   }\n"
                               "  1|   TAV_ELM_CMN_CPU_ONLINE\n"
                               "  1|   {\n"
                               "  1|      TAVHeader\n"
                               "  1|      {\n"
                               "  1|         TAVHeader64\n"
                               "  1|         {\n"
                               "  1|            size = 4\n"
                               "  1|            info = 1F\n"
                               "  1|            type = 55 ( Uint32 )\n"
                               "  1|            elm  = 60111 ( TAV_ELM_CMN_CPU_ONLINE )\n"
                               "  1|         }\n"
                               "  1|         hdrType    = 2 ( TAV_TYPE_HEADER64 )\n"
                               "  1|         nodeOffset = 16\n"
                               "  1|      }\n"
                               "  1|      7\n"
                               "  1|   }\n"
                               "  0|}\n"));
}

TEST(SubtreeWithHeaders, AsXmlShowsThemAll)
{
  const Form form{.swap = true, .root32 = true};
  StreamReader reader(tinyStream(form), form);
  EXPECT_EQ(printSubtree(0x47, reader.handle()),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <tavHeader>\n"
                                         "      <tavHeader32>\n"
                                         "         <size>12</size>\n"
                                         "         <type>TAV_TYPE_HEADER32</type>\n"
                                         "         <elm>TAV_ELM_CMN_DOC_ROOT</elm>\n"
                                         "      </tavHeader32>\n"
                                         "      <hdrType>TAV_TYPE_HEADER32</hdrType>\n"
                                         "      <nodeOffset>0</nodeOffset>\n"
                                         "   </tavHeader>\n"
                                         "   <tavData></tavData>\n"
                                         "   <cpuOnline>\n"
                                         "      <tavHeader>\n"
                                         "         <tavHeader32>\n"
                                         "            <size>4</size>\n"
                                         "            <type>Uint32</type>\n"
                                         "            <elm>TAV_ELM_CMN_CPU_ONLINE</elm>\n"
                                         "         </tavHeader32>\n"
                                         "         <hdrType>TAV_TYPE_HEADER32</hdrType>\n"
                                         "         <nodeOffset>8</nodeOffset>\n"
                                         "      </tavHeader>\n"
                                         "      <tavData>7</tavData>\n"
                                         "   </cpuOnline>\n"
                                         "</docRoot>\n"));
}

TEST(SubtreeWithDescriptors, ShowsWhereTheDataLie)
{
  StreamReader reader(tinyStream());
  const uint8_t* const block = reader.handle()->pDirectData;
  EXPECT_EQ(printSubtree(0x4D, reader.handle()),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <pDataBuf>0000000000000000</pDataBuf>\n"
                                         "   <dataBufSize>0</dataBufSize>\n"
                                         "   <dataBufOffset>0</dataBufOffset>\n"
                                         "   <tavData></tavData>\n"
                                         "   <cpuOnline>      <pDataBuf>" +
                                   addressText(block + 32) +
                                   "</pDataBuf>\n"
                                   "      <dataBufSize>4</dataBufSize>\n"
                                   "      <dataBufOffset>0</dataBufOffset>\n"
                                   "      <tavData>7</tavData>\n"
                                   "</cpuOnline>\n"
                                   "</docRoot>\n"));
}

TEST(SubtreeOfOneGroup, IsOpenedAndClosed)
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.close();
  StreamReader reader(writer.bytes());
  EXPECT_EQ(printSubtree(0x5, reader.handle()), printed(TAV_RC_OK, "  0|TAV_ELM_CMN_DOC_ROOT\n  0|{\n  0|}\n"));
  EXPECT_EQ(printSubtree(0x45, reader.handle()), printed(TAV_RC_OK, kProlog + "<docRoot>\n</docRoot>\n"));
}

TEST(SubtreeOfBothHeaderForms, IsWalkedThrough)
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(group64(60102, TAV_TYPE_HEADER32));
  writer.add(ascii(60103, "box", false));
  writer.add(group32(60109));
  writer.add(u32(60110, 4, false));
  writer.close();
  writer.close();
  writer.add(u32(60111, 7));
  writer.close();
  StreamReader reader(writer.bytes());
  EXPECT_EQ(printSubtree(0x45, reader.handle()),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <host>\n"
                                         "      <hostName>box</hostName>\n"
                                         "      <cpu>\n"
                                         "         <cpuTotal>4</cpuTotal>\n"
                                         "      </cpu>\n"
                                         "   </host>\n"
                                         "   <cpuOnline>7</cpuOnline>\n"
                                         "</docRoot>\n"));
}

TEST(SubtreeWithAnEndElement, PrintsItAsItsLastChild)
{
  for (const bool swap : {false, true})
  {
    const Form form{.swap = swap};
    StreamWriter writer(form);
    writer.add(group64(20, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
    writer.close();
    StreamReader reader(writer.bytes(), form);
    const bool littleInStream = (std::endian::native == std::endian::little) != swap;
    const std::string pair =
        littleInStream ? "ED0DECDDEED5DEC02000000000000000" : "C0DED5EEDDEC0DED0000000000000020";
    EXPECT_EQ(printSubtree(0x45, reader.handle()),
              printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                           "   <endHdrEyeSize>" +
                                     pair +
                                     "</endHdrEyeSize>\n"
                                     "</docRoot>\n"));
  }
}

TEST(SubtreeOfUnknownElements, NamesThemSo)
{
  StreamWriter writer;
  writer.add(group64(64999));
  writer.add(u32(64998, 7));
  writer.close();
  StreamReader reader(writer.bytes());
  EXPECT_EQ(printSubtree(0x1, reader.handle()),
            printed(TAV_RC_OK, "  0|Unknown Element\n"
                               "  0|{\n"
                               "  1|   Unknown Element\n"
                               "  1|   {\n"
                               "  1|   }\n"
                               "  0|}\n"));
  EXPECT_EQ(printSubtree(0x45, reader.handle()),
            printed(TAV_RC_OK, kProlog + "<Unknown Element>\n"
                                         "   <Unknown Element>7</Unknown Element>\n"
                                         "</Unknown Element>\n"));
}

/// A data element and a group to print alone.
struct Alone
{
  Element element = u32(60111, 7);
  TAVHeaderData number = element.data();
  TAVHeaderData group{header64(0, TAV_TYPE_HEADER64, 20), nullptr, 0, 0};
};

TEST(NodeAlone, IsItsBodyOnly)
{
  Alone alone;
  EXPECT_EQ(printSubtree(0x4, nullptr, &alone.number), printed(TAV_RC_OK, "  0|   7\n"));
  EXPECT_EQ(printSubtree(0x14, nullptr, &alone.number), printed(TAV_RC_OK, "7"));
  EXPECT_EQ(printSubtree(0x44, nullptr, &alone.number), printed(TAV_RC_OK, kProlog + "7"));
  EXPECT_EQ(printSubtree(0x50, nullptr, &alone.number), printed(TAV_RC_OK, kProlog + "7"));
  EXPECT_EQ(printSubtree(0x46, nullptr, &alone.number),
            printed(TAV_RC_OK, kProlog + "   <tavHeader>\n"
                                         "      <tavHeader64>\n"
                                         "         <size>4</size>\n"
                                         "         <info>0</info>\n"
                                         "         <type>Uint32</type>\n"
                                         "         <elm>TAV_ELM_CMN_CPU_ONLINE</elm>\n"
                                         "      </tavHeader64>\n"
                                         "      <hdrType>TAV_TYPE_HEADER64</hdrType>\n"
                                         "      <nodeOffset>0</nodeOffset>\n"
                                         "   </tavHeader>\n"
                                         "   <tavData>7</tavData>\n"));
}

TEST(NodeAlone, OfTheOtherByteOrderIsTurnedByItsHandle)
{
  const Form form{.swap = true};
  StreamReader reader(tinyStream(form), form);
  TAVHeaderData number{};
  ASSERT_EQ(tavReadNodeInt(0, reader.handle(), 16, true, &number), TAV_RC_OK);
  EXPECT_EQ(printSubtree(0x4, reader.handle(), &number), printed(TAV_RC_OK, "  0|   7\n"));
  EXPECT_EQ(printSubtree(0x4, nullptr, &number), printed(TAV_RC_OK, "  0|   117440512\n"));
}

TEST(NodeAlone, WithoutABodyIsNothingPrinted)
{
  Alone alone;
  EXPECT_EQ(printSubtree(0x0, nullptr, &alone.number), printed(TAV_RC_NO_MEMORY, ""));
  EXPECT_EQ(printSubtree(0x8, nullptr, &alone.number), printed(TAV_RC_NO_MEMORY, ""));
  EXPECT_EQ(printSubtree(0x4, nullptr, &alone.group), printed(TAV_RC_NO_MEMORY, ""));
}

TEST(NodeAlone, WithoutABodyInXmlIsTheFirstLine)
{
  Alone alone;
  EXPECT_EQ(printSubtree(0x40, nullptr, &alone.number), printed(TAV_RC_NO_MEMORY, kProlog));
  EXPECT_EQ(printSubtree(0x44, nullptr, &alone.group), printed(TAV_RC_NO_MEMORY, kProlog));
}

TEST(NodeAlone, ThatIsBareAndAGroupIsNothingPrinted)
{
  Alone alone;
  EXPECT_EQ(printSubtree(0x10, nullptr, &alone.group), printed(TAV_RC_NO_MEMORY, ""));
  EXPECT_EQ(printSubtree(0x50, nullptr, &alone.group), printed(TAV_RC_NO_MEMORY, kProlog));
}

TEST(NodeAlone, OfASizeThatDoesNotFitFails)
{
  Alone alone;
  alone.number.header.hdr64.type = TAV_TYPE_UINT16;
  alone.number.header.hdr64.size = 3;
  TraceLog trace;
  EXPECT_EQ(printSubtree(0x4, nullptr, &alone.number), printed(TAV_RC_OUTSIDE_PARENT, "  0|   "));
  EXPECT_THAT(trace.failuresOf(probe::printSubtree),
              ElementsAre(Failure{probe::printSubtree, 60, TAV_RC_OUTSIDE_PARENT}));
}

TEST(NodeAlone, ThatPrintsNothingHidesItsOwnCode)
{
  Alone alone;
  alone.number.header.hdr64.type = TAV_TYPE_UTF8_STRING;
  EXPECT_EQ(printSubtree(0x4, nullptr, &alone.number), printed(TAV_RC_NOT_SUPPORTED, "  0|   "));
  EXPECT_EQ(printSubtree(0x10, nullptr, &alone.number), printed(TAV_RC_NO_MEMORY, ""));
  EXPECT_EQ(printSubtree(0x44, nullptr, &alone.number), printed(TAV_RC_NO_MEMORY, kProlog));
}

TEST(NodeAlone, OfAnUnknownHeaderTypeIsNothingPrinted)
{
  Alone alone;
  alone.number.header.hdrType = 3;
  TraceLog trace;
  EXPECT_EQ(printSubtree(0x6, nullptr, &alone.number), printed(TAV_RC_NO_MEMORY, ""));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printNode, 20, TAV_RC_BAD_HDR_TYPE},
                                            Failure{probe::printSubtree, 60, TAV_RC_NO_MEMORY}));
}

TEST(SubtreeOfBareValues, FailsAtItsFirstGroup)
{
  StreamReader reader(tinyStream());
  EXPECT_EQ(printSubtree(0x11, reader.handle()), printed(TAV_RC_BAD_PARAM, "  0|TAV_ELM_CMN_DOC_ROOT\n  0|{\n"));
  EXPECT_EQ(printSubtree(0x51, reader.handle()), printed(TAV_RC_BAD_PARAM, kProlog + "<docRoot>\n"));
}

TEST(SubtreeOfADataElement, FailsBehindItsBody)
{
  Alone alone;
  StreamReader reader(tinyStream());
  TraceLog trace;
  EXPECT_EQ(printSubtree(0x5, reader.handle(), &alone.number),
            printed(TAV_RC_BAD_PARAM, "  0|TAV_ELM_CMN_CPU_ONLINE\n  0|{\n  0|   7\n"));
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printSubtree, 60, TAV_RC_BAD_PARAM}));
}

TEST(SubtreeWithoutAHandle, FailsBehindItsOpening)
{
  Alone alone;
  EXPECT_EQ(printSubtree(0x5, nullptr, &alone.group),
            printed(TAV_RC_BAD_PARAM, "  0|TAV_ELM_CMN_DOC_ROOT\n  0|{\n"));
}

struct ArgumentsRow : Row
{
  bool handle, start, param, count;
  uint64_t options;
  uint32_t point;
};

class SubtreeArguments : public ::testing::TestWithParam<ArgumentsRow>
{
};

TEST_P(SubtreeArguments, AreCheckedInOrderAndNothingIsPrinted)
{
  Alone alone;
  StreamReader reader(tinyStream());
  CaughtStream stream;
  TAVPrintParam param{0, nullptr, 0, stream.get()};
  uint64_t count = 0xBAD;
  TraceLog trace;
  EXPECT_EQ(tavPrintSubtree(GetParam().options, GetParam().handle ? reader.handle() : nullptr,
                            GetParam().start ? &alone.group : nullptr, GetParam().param ? &param : nullptr,
                            GetParam().count ? &count : nullptr),
            TAV_RC_NO_MEMORY);
  EXPECT_EQ(count, GetParam().count ? 0U : 0xBADU);
  EXPECT_EQ(stream.text(), "");
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printSubtree, GetParam().point, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(trace.records().back().kind, KOR_TRACE_EXIT);
  EXPECT_EQ(trace.records().back().code, TAV_RC_NO_MEMORY);
}

const ArgumentsRow kArguments[] = {
    {"NoStartWithoutSubtree", true, false, true, true, 0x46, 10},
    {"NoStartWithoutHandle", false, false, true, true, 0x47, 10},
    {"NothingAtAll", false, false, false, false, 0x0, 10},
    {"NoStartBeforeNoParam", true, false, false, true, 0x0, 10},
    {"NoCount", true, true, true, false, 0x47, 20},
    {"NoCountBeforeNoParam", true, true, false, false, 0x47, 20},
    {"NoCountFromTheRoot", true, false, true, false, 0x47, 20},
    {"NoParam", true, true, false, true, 0x47, 30},
    {"NoParamFromTheRoot", true, false, false, true, 0x47, 30},
};

INSTANTIATE_TEST_SUITE_P(Misused, SubtreeArguments, ::testing::ValuesIn(kArguments),
                         kRowName);

void expectNothingPrinted(TAVHandle* handle, uint32_t cause)
{
  TraceLog trace;
  EXPECT_EQ(printSubtree(0x41, handle), printed(TAV_RC_NO_MEMORY, ""));
  EXPECT_THAT(trace.failuresOf(probe::printSubtree), ElementsAre(Failure{probe::printSubtree, 40, cause}));
}

TEST(SubtreeFromTheRoot, OfAnEmptyStreamIsNothingPrinted)
{
  StreamReader reader(Bytes{});
  expectNothingPrinted(reader.handle(), TAV_RC_NO_MORE_CHILDREN);
}

TEST(SubtreeFromTheRoot, OfAHandleForWritingIsNothingPrinted)
{
  StreamWriter writer;
  writer.add(group64(20));
  expectNothingPrinted(writer.handle(), TAV_RC_WRONG_MODE);
}

TEST(SubtreeOfAHandleForWriting, EndsBehindItsOpening)
{
  Alone alone;
  StreamWriter writer;
  EXPECT_EQ(printSubtree(0x1, writer.handle(), &alone.group),
            printed(TAV_RC_WRONG_MODE, "  0|TAV_ELM_CMN_DOC_ROOT\n  0|{\n"));
}

TEST(SubtreeTrace, ShowsArgumentsAndTotal)
{
  Alone alone;
  StreamReader reader(tinyStream());
  TAVHandle* const handle = reader.handle();
  CaughtStream stream;
  TAVPrintParam param{0, nullptr, 0, stream.get()};
  uint64_t count = 0;
  uint64_t* const pCount = &count;
  const uint64_t options = 0x4;
  TraceLog trace;
  ASSERT_EQ(tavPrintSubtree(options, handle, &alone.number, &param, pCount), TAV_RC_OK);
  EXPECT_EQ(probe::printSubtree, 0x088A0017U);
  EXPECT_THAT(trace.stepsOf(probe::printSubtree),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::printSubtree, 0}, Step{KOR_TRACE_VAR, probe::printSubtree, 0},
                          Step{KOR_TRACE_VAR, probe::printSubtree, 100},
                          Step{KOR_TRACE_EXIT, probe::printSubtree, 0}));
  EXPECT_THAT(trace.dump(probe::printSubtree, 0).items,
              ElementsAre(bytesOf(options), bytesOf(handle), bytesOf(alone.number), bytesOf(param), bytesOf(pCount)));
  EXPECT_THAT(trace.dump(probe::printSubtree, 100).items, ElementsAre(bytesOf(count)));
  EXPECT_THAT(trace.failures(), IsEmpty());
}

TEST(SubtreeTrace, ShowsEveryGroupThatIsEntered)
{
  StreamReader reader(sampleStream({}));
  TraceLog trace;
  ASSERT_EQ(printSubtree(0x5, reader.handle()).rc, TAV_RC_OK);
  EXPECT_EQ(probe::hdrStackPush, 0x088A001DU);
  size_t entries = 0;
  for (const Step& step : trace.stepsOf(probe::hdrStackPush))
  {
    entries += step.kind == KOR_TRACE_ENTRY ? 1 : 0;
  }
  EXPECT_EQ(entries, 2U);
}

} // namespace
