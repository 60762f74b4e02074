#include <bit>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/elements.h"
#include "support/printing.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;

/// A host with its name and a number, and within it a node with its number.
Bytes sampleStream(const Form& form)
{
  const bool wide = !form.root32;
  StreamWriter writer(form);
  writer.add(groupOf(wide, 20));
  writer.add(groupOf(wide, 60102));
  writer.add(u32(60111, 7, wide));
  writer.add(ascii(60103, "box", wide));
  writer.add(groupOf(wide, 45000));
  writer.add(u16(307, 3, wide));
  writer.close();
  writer.close();
  writer.close();
  return writer.bytes();
}

class AttributeForm : public ::testing::TestWithParam<Form>
{
protected:
  StreamReader reader_{sampleStream(GetParam()), GetParam()};
};

TEST_P(AttributeForm, OpensGroupsWithTheirKeysAndWalksAllChildrenAfterwards)
{
  EXPECT_EQ(printSubtree(0xC5, reader_.handle()),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <host hostName=box>\n"
                                         "      <cpuOnline>7</cpuOnline>\n"
                                         "      <hostName>box</hostName>\n"
                                         "      <node node_number=3>\n"
                                         "         <node_number>3</node_number>\n"
                                         "      </node>\n"
                                         "   </host>\n"
                                         "</docRoot>\n"));
}

TEST_P(AttributeForm, ShowsKeysWithoutTheDataOption)
{
  EXPECT_EQ(printSubtree(0xC1, reader_.handle()),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <host hostName=box>\n"
                                         "      <cpuOnline></cpuOnline>\n"
                                         "      <hostName></hostName>\n"
                                         "      <node node_number=3>\n"
                                         "         <node_number></node_number>\n"
                                         "      </node>\n"
                                         "   </host>\n"
                                         "</docRoot>\n"));
}

TEST_P(AttributeForm, ReadsTheGroupAgainByTheWidthOfItsHeader)
{
  const uint64_t width = GetParam().root32 ? 2 : 1;
  TraceLog trace;
  ASSERT_EQ(printSubtree(0xC1, reader_.handle()).rc, TAV_RC_OK);
  std::vector<std::string> widths;
  for (const Record& record : trace.recordsOf(probe::findNodeFromIndex))
  {
    if (record.kind == KOR_TRACE_VAR && record.point == 0)
    {
      widths.push_back(record.items.at(0));
    }
  }
  EXPECT_THAT(widths, ElementsAre(bytesOf(width), bytesOf(width)));
  EXPECT_THAT(trace.failuresOf(probe::findNodeFromIndex), IsEmpty());
}

TEST_P(AttributeForm, IsLeftOutWithoutEachOfItsThreeOptions)
{
  const Printed plain = printSubtree(0x45, reader_.handle());
  EXPECT_EQ(plain.text.find("hostName="), std::string::npos);
  EXPECT_EQ(printSubtree(0x85, reader_.handle()), printSubtree(0x5, reader_.handle()));
  TAVHeaderData root{};
  ASSERT_EQ(tavGetNextChild(0, reader_.handle(), nullptr, nullptr, &root), TAV_RC_OK);
  TAVHeaderData host{};
  ASSERT_EQ(tavGetNextChild(0, reader_.handle(), &root.header, nullptr, &host), TAV_RC_OK);
  EXPECT_EQ(printSubtree(0xC6, reader_.handle(), &host), printSubtree(0x46, reader_.handle(), &host));
}

TEST_P(AttributeForm, IsNotThatOfTheStartNode)
{
  TAVHeaderData root{};
  ASSERT_EQ(tavGetNextChild(0, reader_.handle(), nullptr, nullptr, &root), TAV_RC_OK);
  TAVHeaderData host{};
  ASSERT_EQ(tavGetNextChild(0, reader_.handle(), &root.header, nullptr, &host), TAV_RC_OK);
  EXPECT_EQ(printSubtree(0xC5, reader_.handle(), &host),
            printed(TAV_RC_OK, kProlog + "<host>\n"
                                         "   <cpuOnline>7</cpuOnline>\n"
                                         "   <hostName>box</hostName>\n"
                                         "   <node node_number=3>\n"
                                         "      <node_number>3</node_number>\n"
                                         "   </node>\n"
                                         "</host>\n"));
}

INSTANTIATE_TEST_SUITE_P(Over, AttributeForm,
                         ::testing::Values(Form{}, Form{.swap = true}, Form{.align = true}, Form{.root32 = true},
                                           Form{.buffered = true}, Form{.buffered = true, .swap = true},
                                           Form{.buffered = true, .align = true},
                                           Form{.buffered = true, .root32 = true},
                                           Form{.swap = true, .align = true, .root32 = true},
                                           Form{.buffered = true, .swap = true, .align = true, .root32 = true}),
                         kFormName);

/// A root with one group of `children`, which closes behind them.
Bytes streamOfGroup(Element group, const std::vector<Element>& children)
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(std::move(group));
  for (const Element& child : children)
  {
    writer.add(child);
  }
  writer.close();
  writer.close();
  return writer.bytes();
}

Printed printGroup(uint64_t options, Element group, const std::vector<Element>& children)
{
  StreamReader reader(streamOfGroup(std::move(group), children));
  return printSubtree(options, reader.handle());
}

TEST(GroupWithKeys, HasThemInTheStreamsOrder)
{
  EXPECT_EQ(printGroup(0xC1, group64(13),
                       {ascii(60103, "box"), u32(60111, 7), ascii(321, "SAMPLE"), u16(307, 65535),
                        ascii(321, "again")}),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <dbase hostName=box db_name=SAMPLE node_number=65535 db_name=again>\n"
                                         "      <hostName></hostName>\n"
                                         "      <cpuOnline></cpuOnline>\n"
                                         "      <db_name></db_name>\n"
                                         "      <node_number></node_number>\n"
                                         "      <db_name></db_name>\n"
                                         "   </dbase>\n"
                                         "</docRoot>\n"));
}

TEST(GroupWithKeys, HasThemWithoutQuotationMarksAndAsTheyAre)
{
  EXPECT_EQ(printGroup(0xC1, group64(60102), {ascii(60103, "a \"b\" <c>")}),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <host hostName=a \"b\" <c>>\n"
                                         "      <hostName></hostName>\n"
                                         "   </host>\n"
                                         "</docRoot>\n"));
}

/// A host that is opened with its key, its header, and its first child being opened.
std::string headerOfHost(const std::string& size, const std::string& type)
{
  return "   <host hostName=box>\n"
         "      <tavHeader>\n"
         "         <tavHeader64>\n"
         "            <size>" +
         size +
         "</size>\n"
         "            <info>5</info>\n"
         "            <type>" +
         type +
         "</type>\n"
         "            <elm>TAV_ELM_CMN_HOST</elm>\n"
         "         </tavHeader64>\n"
         "         <hdrType>TAV_TYPE_HEADER64</hdrType>\n"
         "         <nodeOffset>16</nodeOffset>\n"
         "      </tavHeader>\n"
         "   </host>\n"
         "      <hostName>\n";
}

TEST(GroupWithKeys, ShowsItsHeaderAndAClosingBetweenKeysAndChildren)
{
  EXPECT_EQ(printGroup(0xC3, group64(60102, TAV_TYPE_HEADER64, 0x5), {ascii(60103, "box")}).text,
            kProlog + "<docRoot>\n"
                      "   <tavHeader>\n"
                      "      <tavHeader64>\n"
                      "         <size>35</size>\n"
                      "         <info>0</info>\n"
                      "         <type>TAV_TYPE_HEADER64</type>\n"
                      "         <elm>TAV_ELM_CMN_DOC_ROOT</elm>\n"
                      "      </tavHeader64>\n"
                      "      <hdrType>TAV_TYPE_HEADER64</hdrType>\n"
                      "      <nodeOffset>0</nodeOffset>\n"
                      "   </tavHeader>\n" +
                headerOfHost("19", "TAV_TYPE_HEADER64") +
                "         <tavHeader>\n"
                "            <tavHeader64>\n"
                "               <size>3</size>\n"
                "               <info>0</info>\n"
                "               <type>ASCII String</type>\n"
                "               <elm>TAV_ELM_CMN_HOST_NAME</elm>\n"
                "            </tavHeader64>\n"
                "            <hdrType>TAV_TYPE_HEADER64</hdrType>\n"
                "            <nodeOffset>32</nodeOffset>\n"
                "         </tavHeader>\n"
                "      </hostName>\n"
                "   </host>\n"
                "</docRoot>\n");
}

TEST(GroupWithKeys, OfA64BitHeaderOver32BitChildrenIsReadAgainWith64Bits)
{
  const std::string text = printGroup(0xC3, group64(60102, TAV_TYPE_HEADER32, 0x5), {ascii(60103, "box", false)}).text;
  EXPECT_THAT(text, ::testing::HasSubstr(headerOfHost("11", "TAV_TYPE_HEADER32")));
}

TEST(GroupWithKeys, ShowsItsDescriptorsWithItsHeader)
{
  EXPECT_THAT(printGroup(0xCF, group64(60102), {}).text,
              ::testing::EndsWith("         <nodeOffset>16</nodeOffset>\n"
                                  "      </tavHeader>\n"
                                  "      <pDataBuf>0000000000000000</pDataBuf>\n"
                                  "      <dataBufSize>0</dataBufSize>\n"
                                  "      <dataBufOffset>0</dataBufOffset>\n"
                                  "      <tavData></tavData>\n"
                                  "   </host>\n"
                                  "   </host>\n"
                                  "</docRoot>\n"));
}

TEST(GroupWithKeys, TakesThemFromItsOwnChildrenOnly)
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(group64(60102));
  writer.add(group64(60109));
  writer.add(ascii(60103, "deep"));
  writer.close();
  writer.close();
  writer.add(ascii(60103, "beside"));
  writer.close();
  StreamReader reader(writer.bytes());
  EXPECT_EQ(printSubtree(0xC1, reader.handle()),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <host>\n"
                                         "      <cpu>\n"
                                         "         <hostName></hostName>\n"
                                         "      </cpu>\n"
                                         "   </host>\n"
                                         "   <hostName></hostName>\n"
                                         "</docRoot>\n"));
}

TEST(GroupWithoutKeys, HasNoAttributes)
{
  EXPECT_EQ(printGroup(0xC5, group64(60102), {u32(60111, 7)}),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <host>\n"
                                         "      <cpuOnline>7</cpuOnline>\n"
                                         "   </host>\n"
                                         "</docRoot>\n"));
}

TEST(GroupWithoutKeys, MayBeEmpty)
{
  EXPECT_EQ(printGroup(0xC5, group64(45000), {}),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n   <node>\n   </node>\n</docRoot>\n"));
}

TEST(GroupOfAnotherElement, HasNoAttributes)
{
  EXPECT_EQ(printGroup(0xC5, group64(60109), {ascii(60103, "box")}),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <cpu>\n"
                                         "      <hostName>box</hostName>\n"
                                         "   </cpu>\n"
                                         "</docRoot>\n"));
}

TEST(DataElementOfAKeyedId, IsPrintedAsAnyOther)
{
  for (const auto& [elm, tag] : {std::pair<uint16_t, std::string>{13, "dbase"}, {45000, "node"}, {60102, "host"}})
  {
    EXPECT_EQ(printGroup(0xC5, group64(60109), {u32(elm, 7)}),
              printed(TAV_RC_OK, kProlog + "<docRoot>\n   <cpu>\n      <" + tag + ">7</" + tag +
                                     ">\n   </cpu>\n</docRoot>\n"));
  }
}

const std::string kUpToTheKey = kProlog + "<docRoot>\n   <host hostName=box db_name=";

/// A key that fails behind one that prints.
Printed printFailingKey(Element key)
{
  return printGroup(0xC1, group64(60102), {ascii(60103, "box"), std::move(key), u16(307, 3)});
}

TEST(KeyThatFails, StopsAtAUtf8String)
{
  EXPECT_EQ(printFailingKey(element(true, TAV_TYPE_UTF8_STRING, 321, {0xB8, 0x04, 'x'})),
            printed(TAV_RC_NOT_SUPPORTED, kUpToTheKey));
}

TEST(KeyThatFails, StopsAtASint128)
{
  EXPECT_EQ(printFailingKey(element(true, TAV_TYPE_SINT128, 321, Bytes(16, 1))),
            printed(TAV_RC_NOT_SUPPORTED, kUpToTheKey));
}

TEST(KeyThatFails, StopsAtASizeThatDoesNotFit)
{
  EXPECT_EQ(printFailingKey(element(true, TAV_TYPE_UINT16, 321, Bytes(3, 1))),
            printed(TAV_RC_OUTSIDE_PARENT, kUpToTheKey));
}

TEST(KeyThatFails, StopsAtAnEmptyNumber)
{
  Bytes nothing;
  nothing.reserve(1); // the writer wants a pointer
  EXPECT_EQ(printGroup(0xC1, group64(60102), {ascii(60103, "box")}).rc, TAV_RC_OK);
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(group64(60102));
  writer.add(element(true, TAV_TYPE_UINT32, 321, std::move(nothing)));
  writer.add(ascii(60103, "box"));
  writer.close();
  writer.close();
  StreamReader reader(writer.bytes());
  EXPECT_EQ(printSubtree(0xC1, reader.handle()),
            printed(TAV_RC_OUTSIDE_PARENT, kProlog + "<docRoot>\n   <host db_name="));
}

TEST(KeyThatFails, StopsAtAGroup)
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(group64(60102));
  writer.add(group64(321));
  writer.close();
  writer.close();
  writer.close();
  StreamReader reader(writer.bytes());
  TraceLog trace;
  EXPECT_EQ(printSubtree(0xC1, reader.handle()),
            printed(TAV_RC_BAD_PARAM, kProlog + "<docRoot>\n   <host db_name="));
  EXPECT_THAT(trace.failuresOf(probe::printValue), ElementsAre(Failure{probe::printValue, 20, TAV_RC_BAD_PARAM}));
}

TEST(KeyedGroupThatIsDamaged, StopsBehindTheKeysBeforeTheDamage)
{
  Bytes bytes = streamOfGroup(group64(60102), {ascii(60103, "box"), u32(60111, 7)});
  ASSERT_EQ(bytes.size(), 71U);
  bytes[51 + (std::endian::native == std::endian::little ? 0 : 7)] = 5; // the number's size: past the host's end
  StreamReader reader(bytes, {}, 16);
  EXPECT_EQ(printSubtree(0xC5, reader.handle()),
            printed(TAV_RC_OUTSIDE_PARENT, kProlog + "<docRoot>\n   <host hostName=box"));
}

TEST(KeyedGroupThatIsDamaged, StopsWhereTheStreamIsCut)
{
  Bytes bytes = streamOfGroup(group64(60102), {ascii(60103, "box"), u32(60111, 7)});
  bytes.resize(60);
  StreamReader reader(bytes);
  EXPECT_EQ(printSubtree(0xC5, reader.handle()),
            printed(TAV_RC_NO_MEMORY, kProlog + "<docRoot>\n   <host hostName=box"));
}

TEST(AttributesInABuffer, LeaveTheLastPieceAndCountAll)
{
  StreamReader reader(sampleStream({}));
  const Printed whole = printSubtree(0xC5, reader.handle());
  std::vector<char> buffer(200, '#');
  TAVPrintParam param{0, buffer.data(), buffer.size(), nullptr};
  uint64_t count = 0;
  EXPECT_EQ(tavPrintSubtree(0xC5, reader.handle(), nullptr, &param, &count), TAV_RC_OK);
  EXPECT_STREQ(buffer.data(), "</docRoot>\n");
  EXPECT_EQ(count, whole.text.size());
}

} // namespace
