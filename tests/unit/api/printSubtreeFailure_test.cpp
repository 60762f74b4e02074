#include <cstdint>
#include <cstdio>
#include <cstring>
#include <optional>
#include <string>
#include <utility>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/elements.h"
#include "support/failingNew.h"
#include "support/printing.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;

/// A root with one number.
Bytes tinyStream()
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(u32(60111, 7));
  writer.close();
  return writer.bytes();
}

TEST(SubtreeWithoutMemory, ForItsContextIsNothingPrinted)
{
  StreamReader reader(tinyStream());
  TAVPrintParam param{0, nullptr, 0, nullptr};
  uint64_t count = 0xBAD;
  TraceLog trace;
  uint32_t rc = 0;
  {
    const allocations::FailNth fail(1);
    rc = tavPrintSubtree(0x41, reader.handle(), nullptr, &param, &count);
    EXPECT_TRUE(allocations::FailNth::happened());
  }
  EXPECT_EQ(rc, TAV_RC_NO_MEMORY);
  EXPECT_EQ(count, 0U);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::printSubtree, 50, TAV_RC_NO_MEMORY}));
}

/// tavPrintSubtree to a stream while the nth allocation fails; nothing may be left behind.
Printed printWhileFailing(uint64_t nth, TAVHandle* handle, bool& happened)
{
  CaughtStream stream;
  TAVPrintParam param{0, nullptr, 0, stream.get()};
  uint64_t count = 0xBAD;
  uint32_t rc = 0;
  const int64_t before = allocations::live();
  {
    const allocations::FailNth fail(nth);
    rc = tavPrintSubtree(0x1, handle, nullptr, &param, &count);
    happened = allocations::FailNth::happened();
  }
  EXPECT_EQ(allocations::live(), before);
  return {rc, count, stream.text()};
}

const std::string kTinyText = "  0|TAV_ELM_CMN_DOC_ROOT\n"
                              "  0|{\n"
                              "  1|   TAV_ELM_CMN_CPU_ONLINE\n"
                              "  1|   {\n"
                              "  1|   }\n"
                              "  0|}\n";

TEST(SubtreeWithoutMemory, AtEachAllocationInTurnLeavesNothingBehind)
{
  StreamReader reader(tinyStream());
  const Printed outcomes[] = {
      printed(TAV_RC_NO_MEMORY, ""),                                     // the context
      printed(TAV_RC_NO_HDR_STACK, "  0|TAV_ELM_CMN_DOC_ROOT\n  0|{\n"), // the header stack
      printed(TAV_RC_OK, kTinyText),                                     // its entries, which grow then
  };
  bool happened = false;
  uint64_t nth = 1;
  for (const Printed& outcome : outcomes)
  {
    EXPECT_EQ(printWhileFailing(nth++, reader.handle(), happened), outcome);
    EXPECT_TRUE(happened);
  }
  EXPECT_EQ(printWhileFailing(nth, reader.handle(), happened), printed(TAV_RC_OK, kTinyText));
  EXPECT_FALSE(happened);
}

TEST(SubtreeWithoutMemory, ForAnyEntryEndsBehindItsOpening)
{
  // Fails the allocation of the first growth, which follows the failed one of the entries.
  std::optional<allocations::FailNth> second;
  const auto sink = [](void* context, const KORTraceRecord* record) {
    if (record->kind == KOR_TRACE_ENTRY && record->probe == probe::hdrStackGrow)
    {
      static_cast<std::optional<allocations::FailNth>*>(context)->emplace(1);
    }
  };
  StreamReader reader(tinyStream());
  ASSERT_EQ(korTraceStart(sink, &second), TAV_RC_OK);
  bool happened = false;
  const Printed outcome = printWhileFailing(3, reader.handle(), happened);
  korTraceStop();
  second.reset();
  EXPECT_TRUE(happened);
  EXPECT_EQ(outcome, printed(TAV_RC_NO_MEMORY, "  0|TAV_ELM_CMN_DOC_ROOT\n  0|{\n"));
}

/// Groups within groups, each the only child of the one around it.
Bytes nestedStream(uint64_t levels)
{
  Bytes bytes(levels * sizeof(TAVHeader64));
  for (uint64_t level = 0; level < levels; ++level)
  {
    const uint64_t at = level * sizeof(TAVHeader64);
    const TAVHeader64 header{bytes.size() - at - sizeof(TAVHeader64), 0, TAV_TYPE_HEADER64, 60100};
    std::memcpy(bytes.data() + at, &header, sizeof header);
  }
  return bytes;
}

/// Prints nested groups in XML for the count alone.
std::pair<uint32_t, uint64_t> printNested(uint64_t levels)
{
  StreamReader reader(nestedStream(levels));
  FILE* const nowhere = std::fopen(nullDevice(), "w");
  TAVPrintParam param{0, nullptr, 0, nowhere};
  uint64_t count = 0;
  const uint32_t rc = tavPrintSubtree(0x41, reader.handle(), nullptr, &param, &count);
  std::fclose(nowhere);
  return {rc, count};
}

TEST(SubtreeOfDeepNesting, PrintsThreeLevels)
{
  StreamReader reader(nestedStream(3));
  EXPECT_EQ(printSubtree(0x41, reader.handle()),
            printed(TAV_RC_OK, kProlog + "<system>\n"
                                         "   <system>\n"
                                         "      <system>\n"
                                         "      </system>\n"
                                         "   </system>\n"
                                         "</system>\n"));
}

// A level costs 9 characters to open, 10 to close, and three blanks a level above it in front of either.
TEST(SubtreeOfDeepNesting, Prints1001Levels)
{
  EXPECT_EQ(printNested(1001), std::pair(TAV_RC_OK, uint64_t{40 + 1001 * 19 + 6 * 500500}));
}

TEST(SubtreeOfDeepNesting, Prints4000Levels)
{
  EXPECT_EQ(printNested(4000), std::pair(TAV_RC_OK, uint64_t{40 + 4000 * 19 + 6 * 7998000}));
}

TEST(SubtreeOfDeepNesting, EndsInACodeBehindTheOpeningOfLevel4001)
{
  EXPECT_EQ(printNested(4001), std::pair(TAV_RC_NO_MEMORY, uint64_t{40 + 4001 * 9 + 3 * 8002000}));
  EXPECT_EQ(printNested(5000), std::pair(TAV_RC_NO_MEMORY, uint64_t{40 + 4001 * 9 + 3 * 8002000}));
}

TEST(SubtreeOfDeepNesting, EndsInACodeWhenTheStackCannotGrow)
{
  StreamReader reader(nestedStream(1001));
  bool happened = false;
  const Printed outcome = printWhileFailing(4, reader.handle(), happened);
  EXPECT_TRUE(happened);
  EXPECT_EQ(outcome.rc, TAV_RC_NO_MEMORY);
  EXPECT_EQ(outcome.count, outcome.text.size());
  EXPECT_TRUE(outcome.text.ends_with("1000|" + std::string(3000, ' ') + "{\n"));
}

/// What a failing child leaves: all before it, and its own opening.
Printed printFailingChild(uint64_t options, Element failing)
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(u32(60110, 7));
  writer.add(std::move(failing));
  writer.add(u32(60111, 8));
  writer.close();
  StreamReader reader(writer.bytes());
  return printSubtree(options, reader.handle());
}

const std::string kBeforeFailing = kProlog + "<docRoot>\n   <cpuTotal>7</cpuTotal>\n";

TEST(SubtreeWithAFailingValue, StopsAtAUtf8String)
{
  const Element text = element(true, TAV_TYPE_UTF8_STRING, 60103, {0xB8, 0x04, 'x'});
  EXPECT_EQ(printFailingChild(0x45, text), printed(TAV_RC_NOT_SUPPORTED, kBeforeFailing + "   <hostName>"));
  EXPECT_EQ(printFailingChild(0x5, text), printed(TAV_RC_NOT_SUPPORTED, "  0|TAV_ELM_CMN_DOC_ROOT\n"
                                                                        "  0|{\n"
                                                                        "  1|   TAV_ELM_CMN_CPU_TOTAL\n"
                                                                        "  1|   {\n"
                                                                        "  1|      7\n"
                                                                        "  1|   }\n"
                                                                        "  1|   TAV_ELM_CMN_HOST_NAME\n"
                                                                        "  1|   {\n"
                                                                        "  1|      "));
}

TEST(SubtreeWithAFailingValue, StopsAtASint128)
{
  EXPECT_EQ(printFailingChild(0x45, element(true, TAV_TYPE_SINT128, 60103, Bytes(16, 1))),
            printed(TAV_RC_NOT_SUPPORTED, kBeforeFailing + "   <hostName>"));
}

TEST(SubtreeWithAFailingValue, StopsAtASizeThatDoesNotFit)
{
  EXPECT_EQ(printFailingChild(0x45, element(true, TAV_TYPE_UINT16, 60103, Bytes(3, 1))),
            printed(TAV_RC_OUTSIDE_PARENT, kBeforeFailing + "   <hostName>"));
}

TEST(SubtreeWithAFailingValue, StopsAtAnUnknownType)
{
  EXPECT_EQ(printFailingChild(0x45, element(true, 77, 60103, Bytes(3, 1))),
            printed(TAV_RC_NOT_SUPPORTED, kBeforeFailing + "   <hostName>"));
}

TEST(SubtreeWithAFailingValue, ThatIsEmptyGoesOn)
{
  Bytes nothing;
  nothing.reserve(1); // the writer wants a pointer
  EXPECT_EQ(printFailingChild(0x45, element(true, TAV_TYPE_UTF8_STRING, 60103, std::move(nothing))),
            printed(TAV_RC_OK, kBeforeFailing + "   <hostName></hostName>\n   <cpuOnline>8</cpuOnline>\n</docRoot>\n"));
}

TEST(SubtreeWithAFailingValue, WithoutDataGoesOn)
{
  EXPECT_EQ(printFailingChild(0x41, element(true, TAV_TYPE_UTF8_STRING, 60103, Bytes(9, 1))),
            printed(TAV_RC_OK, kProlog + "<docRoot>\n"
                                         "   <cpuTotal></cpuTotal>\n"
                                         "   <hostName></hostName>\n"
                                         "   <cpuOnline></cpuOnline>\n"
                                         "</docRoot>\n"));
}

/// tinyStream with its sizes changed, direct and through a ring.
class DamagedSubtree : public ::testing::TestWithParam<Form>
{
protected:
  Printed printDamaged(uint64_t rootSize, uint64_t childSize, size_t length)
  {
    Bytes bytes = tinyStream();
    std::memcpy(bytes.data(), &rootSize, sizeof rootSize);
    std::memcpy(bytes.data() + 16, &childSize, sizeof childSize);
    bytes.resize(length);
    StreamReader reader(bytes, GetParam());
    return printSubtree(0x45, reader.handle());
  }
};

const std::string kOneChild = kProlog + "<docRoot>\n   <cpuOnline>7</cpuOnline>\n";

TEST_P(DamagedSubtree, IsWholeWithoutDamage)
{
  EXPECT_EQ(printDamaged(20, 4, 36), printed(TAV_RC_OK, kOneChild + "</docRoot>\n"));
}

TEST_P(DamagedSubtree, WhoseChildOverrunsItStopsBehindTheChild)
{
  EXPECT_EQ(printDamaged(19, 4, 36), printed(TAV_RC_OUTSIDE_PARENT, kOneChild));
}

TEST_P(DamagedSubtree, ThatEndsWithinTheNextHeaderStopsBehindTheChild)
{
  const uint32_t code = GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY;
  EXPECT_EQ(printDamaged(30, 4, 40), printed(code, kOneChild));
}

TEST_P(DamagedSubtree, WhoseDataIsCutStopsBeforeTheChild)
{
  EXPECT_EQ(printDamaged(20, 5, 36), printed(TAV_RC_DATA_TOO_LARGE, kProlog + "<docRoot>\n"));
}

TEST_P(DamagedSubtree, WhoseChildHasAnEndlessSizeStopsBeforeTheChild)
{
  const Printed outcome = printDamaged(20, ~uint64_t{0} - 3, 36);
  EXPECT_EQ(outcome.text, kProlog + "<docRoot>\n");
  EXPECT_EQ(outcome.rc, TAV_RC_DATA_TOO_LARGE);
}

TEST_P(DamagedSubtree, ThatWasNeverClosedStopsAtTheEndOfTheStream)
{
  const uint32_t code = GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY;
  EXPECT_EQ(printDamaged(TAV_SIZE_UNKNOWN, 4, 36), printed(code, kOneChild));
}

INSTANTIATE_TEST_SUITE_P(Over, DamagedSubtree, ::testing::Values(Form{}, Form{.buffered = true}),
                         kFormName);

TEST(SubtreeOverAFailingStorage, HandsUpTheCodeAndKeepsWhatWasPrinted)
{
  const Form form{.buffered = true, .pageBytes = 16, .ringBytes = 32};
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(u32(60110, 7));
  writer.add(group64(60102));
  writer.add(ascii(60103, "box"));
  writer.close();
  writer.add(u64(60111, 8));
  writer.close();
  const Bytes bytes = writer.bytes();
  StreamReader whole(bytes, form);
  const std::string text = printSubtree(0x45, whole.handle()).text;
  ASSERT_TRUE(text.ends_with("</docRoot>\n"));
  for (uint64_t nth = 1;; ++nth)
  {
    StreamReader reader(bytes, form);
    const uint64_t before = reader.vectorStorage().calls();
    reader.vectorStorage().failAt(nth, KOR_RC_IO_ERROR);
    const Printed outcome = printSubtree(0x45, reader.handle());
    if (reader.vectorStorage().calls() - before < nth)
    {
      ASSERT_GT(nth, 5U);
      EXPECT_EQ(outcome, printed(TAV_RC_OK, text));
      break;
    }
    EXPECT_EQ(outcome.rc, outcome.count == 0 ? TAV_RC_NO_MEMORY : KOR_RC_IO_ERROR) << nth;
    EXPECT_EQ(outcome.count, outcome.text.size()) << nth;
    EXPECT_TRUE(text.starts_with(outcome.text)) << nth;
  }
}

} // namespace
