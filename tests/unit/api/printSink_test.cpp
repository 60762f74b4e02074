#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "api/printer.h"
#include "support/elements.h"
#include "support/platform.h"
#include "support/printing.h"

namespace
{

using namespace test;
using namespace std::string_literals;

/// A context over a caller's buffer whose bytes are all '#'.
class BufferSink
{
public:
  explicit BufferSink(uint64_t size, uint64_t options = 0)
      : bytes(size + 8, '#'), ctx(printContext(nullptr, options))
  {
    ctx.pBuffer = bytes.data();
    ctx.bufferSize = size;
  }
  [[nodiscard]] std::string held() const
  {
    return {bytes.begin(), std::find(bytes.begin(), bytes.end(), '\0')};
  }

  std::vector<char> bytes;
  TAVPrintCtx ctx;
};

TEST(SinkToAStream, WritesEveryPieceBehindTheOther)
{
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get());
  EXPECT_EQ(tavPrintf(&ctx, "one%d", 1), 4U);
  EXPECT_EQ(tavPrintf(&ctx, "%s", "two"), 3U);
  EXPECT_EQ(tavPrintf(&ctx, "%s", ""), 0U);
  EXPECT_EQ(stream.text(), "one1two");
  EXPECT_EQ(ctx.bytesWritten, 7U);
}

TEST(SinkToAStream, TakesAPieceOfAnyLength)
{
  for (const size_t length : {size_t{510}, size_t{511}, size_t{512}, size_t{513}, size_t{100000}})
  {
    CaughtStream stream;
    TAVPrintCtx ctx = printContext(stream.get());
    const std::string text(length, 'x');
    EXPECT_EQ(tavPrintf(&ctx, "%s", text.c_str()), length);
    EXPECT_EQ(stream.text(), text);
  }
}

TEST(SinkToAStream, LeavesTheBufferAlone)
{
  CaughtStream stream;
  BufferSink sink(4);
  sink.ctx.pStream = stream.get();
  EXPECT_EQ(tavPrintf(&sink.ctx, "longer than the buffer"), 22U);
  EXPECT_EQ(stream.text(), "longer than the buffer");
  EXPECT_EQ(sink.held(), std::string(12, '#'));
}

TEST(SinkToAStream, CountsNothingThatTheStreamRefuses)
{
  FILE* const readOnly = std::fopen(nullDevice(), "r");
  ASSERT_NE(readOnly, nullptr);
  TAVPrintCtx ctx = printContext(readOnly);
  EXPECT_EQ(tavPrintf(&ctx, "lost"), 0U);
  EXPECT_EQ(ctx.bytesWritten, 0U);
  std::fclose(readOnly);
}

TEST(SinkToABuffer, HoldsTheLastPieceAndCountsAll)
{
  BufferSink sink(16);
  EXPECT_EQ(tavPrintf(&sink.ctx, "first piece"), 11U);
  EXPECT_EQ(sink.held(), "first piece");
  EXPECT_EQ(tavPrintf(&sink.ctx, "2nd"), 3U);
  EXPECT_EQ(sink.held(), "2nd");
  EXPECT_EQ(sink.ctx.bytesWritten, 14U);
}

TEST(SinkToABuffer, NeverMovesItsPointer)
{
  BufferSink sink(16);
  tavPrintf(&sink.ctx, "piece");
  EXPECT_EQ(sink.ctx.pBuffer, sink.bytes.data());
  EXPECT_EQ(sink.ctx.bufferSize, 16U);
}

struct CutRow
{
  uint64_t size;
  uint64_t count;
  const char* held;
};

class CutPiece : public ::testing::TestWithParam<CutRow>
{
};

TEST_P(CutPiece, LeavesRoomForTheNul)
{
  BufferSink sink(GetParam().size);
  EXPECT_EQ(tavPrintf(&sink.ctx, "%s", "12345"), GetParam().count);
  EXPECT_EQ(sink.held(), GetParam().held);
  EXPECT_EQ(sink.ctx.bytesWritten, GetParam().count);
  EXPECT_EQ(sink.bytes[GetParam().size], '#');
}

INSTANTIATE_TEST_SUITE_P(InABuffer, CutPiece,
                         ::testing::Values(CutRow{1, 0, ""}, CutRow{2, 1, "1"}, CutRow{4, 3, "123"},
                                           CutRow{5, 4, "1234"},
                                           CutRow{6, 5, "12345"}, CutRow{7, 5, "12345"}),
                         [](const auto& row) { return "OfSize" + std::to_string(row.param.size); });

TEST(SinkToABuffer, OfSizeZeroWritesNothing)
{
  BufferSink sink(0);
  EXPECT_EQ(tavPrintf(&sink.ctx, "%s", "12345"), 0U);
  EXPECT_EQ(sink.held(), "########");
  EXPECT_EQ(sink.ctx.bytesWritten, 0U);
}

TEST(SinkToABuffer, OfAnEmptyPieceHoldsAnEmptyText)
{
  BufferSink sink(4);
  EXPECT_EQ(tavPrintf(&sink.ctx, "%s", ""), 0U);
  EXPECT_EQ(sink.held(), "");
}

TEST(SinkWithoutStreamAndBuffer, WritesToStandardOutput)
{
  CaughtStdout out;
  TAVPrintCtx ctx = printContext(nullptr);
  const uint64_t count = tavPrintf(&ctx, "to %s", "stdout");
  EXPECT_EQ(out.text(), "to stdout");
  EXPECT_EQ(count, 9U);
  EXPECT_EQ(ctx.bytesWritten, 9U);
}

TEST(SinkWithoutStreamAndBuffer, DoesNotLookAtTheBufferSize)
{
  CaughtStdout out;
  TAVPrintCtx ctx = printContext(nullptr);
  ctx.bufferSize = 3;
  tavPrintf(&ctx, "whole text");
  EXPECT_EQ(out.text(), "whole text");
}

/// The blanks before a line of XML.
size_t blanksAt(int64_t depth)
{
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get(), TAV_PRINT_XML);
  ctx.depth = depth;
  tav::inside::print::line(ctx, {"x"});
  EXPECT_EQ(ctx.bytesWritten, stream.text().size());
  return stream.text().find('x');
}

TEST(Indentation, IsThreeBlanksALevel)
{
  EXPECT_EQ(blanksAt(1), 3U);
  EXPECT_EQ(blanksAt(2), 6U);
  EXPECT_EQ(blanksAt(100), 300U);
  EXPECT_EQ(blanksAt(4000), 12000U);
}

TEST(Indentation, AtTheTopIsNone)
{
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get(), TAV_PRINT_XML);
  ctx.depth = 1;
  ctx.depth = 0;
  tav::inside::print::line(ctx, {"line\n"});
  EXPECT_EQ(stream.text(), "line\n");
}

TEST(Line, OfTextBeginsWithTheDepth)
{
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get());
  for (const int64_t depth : {0, 1, 10, 100, 1000})
  {
    ctx.depth = depth;
    tav::inside::print::line(ctx, {"x", "1\n"});
  }
  EXPECT_EQ(stream.text(), "  0|x1\n  1|   x1\n 10|" + std::string(30, ' ') + "x1\n100|" + std::string(300, ' ') +
                               "x1\n1000|" + std::string(3000, ' ') + "x1\n");
}

TEST(Line, OfXmlHasNoDepth)
{
  CaughtStream stream;
  TAVPrintCtx ctx = printContext(stream.get(), TAV_PRINT_XML);
  ctx.depth = 2;
  tav::inside::print::line(ctx, {"<", "host", ">\n"});
  EXPECT_EQ(stream.text(), "      <host>\n");
}

TEST(Line, OfTextIsAPieceBehindItsDepth)
{
  BufferSink sink(16);
  sink.ctx.depth = 1;
  tav::inside::print::line(sink.ctx, {"ab\n"});
  EXPECT_EQ(sink.held(), "   ab\n");
  EXPECT_EQ(sink.ctx.bytesWritten, 10U);
}

TEST(Line, IsCutPieceByPiece)
{
  BufferSink sink(3);
  sink.ctx.depth = 1;
  tav::inside::print::line(sink.ctx, {"ab\n"});
  EXPECT_EQ(sink.held(), "  ");
  EXPECT_EQ(sink.ctx.bytesWritten, 4U); // two of "  1|", two of "   ab\n"
}

/// A Uint32 of value 7.
class Seven
{
public:
  TAVHeaderData* node()
  {
    return &data_;
  }

private:
  Element element_ = u32(60111, 7);
  TAVHeaderData data_ = element_.data();
};

/// tavPrintSubtree of Seven into a buffer: code, count and what the buffer holds.
std::tuple<uint32_t, uint64_t, std::string> printSevenTo(std::vector<char>& buffer, uint64_t options)
{
  Seven seven;
  TAVPrintParam param{0, buffer.data(), buffer.size(), nullptr};
  uint64_t count = 0xBAD;
  const uint32_t rc = tavPrintSubtree(options, nullptr, seven.node(), &param, &count);
  return {rc, count, buffer.data()};
}

TEST(SubtreeToABuffer, LeavesItsLastPiece)
{
  std::vector<char> buffer(100, '#');
  EXPECT_EQ(printSevenTo(buffer, 0x44), std::tuple(TAV_RC_OK, uint64_t{41}, "7"s)); // 40 of the first line
}

TEST(SubtreeToABuffer, EndsWithTheLineEndInTheTextForm)
{
  std::vector<char> buffer(100, '#');
  EXPECT_EQ(printSevenTo(buffer, 0x4), std::tuple(TAV_RC_OK, uint64_t{9}, "\n"s)); // "  0|", "   ", "7", "\n"
}

TEST(SubtreeToABuffer, TakesAnOpeningTagAndItsLineEndAsTwoPieces)
{
  Element number = u32(SQLM_ELM_NODE_NUMBER, 7);
  TAVHeaderData node = number.data();
  for (const auto& [size, counted] : {std::pair<size_t, uint64_t>{64, 40 + 13 + 1}, {8, 7 + 7 + 1}})
  {
    std::vector<char> buffer(size, '#');
    TAVPrintParam param{0, buffer.data(), buffer.size(), nullptr};
    uint64_t count = 0;
    EXPECT_EQ(tavPrintSubtree(0x41, nullptr, &node, &param, &count), TAV_RC_BAD_PARAM) << "walks need a handle";
    EXPECT_EQ(count, counted); // of the first line, "<node_number>" and "\n"
    EXPECT_STREQ(buffer.data(), "\n");
  }
}

TEST(SubtreeToABuffer, CountsOnlyWhatFitted)
{
  std::vector<char> buffer(5, '#');
  EXPECT_EQ(printSevenTo(buffer, 0x44), std::tuple(TAV_RC_OK, uint64_t{5}, "7"s)); // four of the first line
}

TEST(SubtreeToABuffer, OfSizeOneIsNothingPrinted)
{
  for (const uint64_t options : {0x4U, 0x44U, 0x14U, 0x6U, 0x4EU})
  {
    std::vector<char> buffer(1, '#');
    EXPECT_EQ(printSevenTo(buffer, options), std::tuple(TAV_RC_NO_MEMORY, uint64_t{0}, ""s)) << options;
  }
}

TEST(SubtreeToABuffer, OfSizeZeroIsNothingPrinted)
{
  Seven seven;
  char untouched = '#';
  TAVPrintParam param{0, &untouched, 0, nullptr};
  uint64_t count = 0xBAD;
  EXPECT_EQ(tavPrintSubtree(0x44, nullptr, seven.node(), &param, &count), TAV_RC_NO_MEMORY);
  EXPECT_EQ(count, 0U);
  EXPECT_EQ(untouched, '#');
}

TEST(SubtreeToABuffer, HasTheExactBufferToItself)
{
  Seven seven;
  const std::unique_ptr<char[]> exact(new char[12]); // seen by the address sanitizer
  TAVPrintParam param{0, exact.get(), 12, nullptr};
  uint64_t count = 0;
  EXPECT_EQ(tavPrintSubtree(0xE, nullptr, seven.node(), &param, &count), TAV_RC_OK);
  EXPECT_STREQ(exact.get(), "\n");
}

TEST(SubtreeToAStream, DoesNotTouchTheBuffer)
{
  Seven seven;
  CaughtStream stream;
  std::vector<char> buffer(8, '#');
  TAVPrintParam param{0, buffer.data(), buffer.size(), stream.get()};
  uint64_t count = 0;
  EXPECT_EQ(tavPrintSubtree(0x4, nullptr, seven.node(), &param, &count), TAV_RC_OK);
  EXPECT_EQ(stream.text(), "  0|   7\n");
  EXPECT_EQ(buffer, std::vector<char>(8, '#'));
}

TEST(SubtreeToAStream, DoesNotReadTheFirstWord)
{
  Seven seven;
  CaughtStream stream;
  TAVPrintParam param{~uint64_t{0}, nullptr, 0, stream.get()};
  uint64_t count = 0;
  EXPECT_EQ(tavPrintSubtree(0x4, nullptr, seven.node(), &param, &count), TAV_RC_OK);
  EXPECT_EQ(param.reserved, ~uint64_t{0});
  EXPECT_EQ(stream.text(), "  0|   7\n");
}

TEST(SubtreeToAStream, ThatRefusesIsNothingPrinted)
{
  Seven seven;
  FILE* const readOnly = std::fopen(nullDevice(), "r");
  ASSERT_NE(readOnly, nullptr);
  TAVPrintParam param{0, nullptr, 0, readOnly};
  uint64_t count = 0xBAD;
  EXPECT_EQ(tavPrintSubtree(0x44, nullptr, seven.node(), &param, &count), TAV_RC_NO_MEMORY);
  EXPECT_EQ(count, 0U);
  std::fclose(readOnly);
}

TEST(SubtreeToStandardOutput, IsTheWholeText)
{
  Seven seven;
  CaughtStdout out;
  TAVPrintParam param{0, nullptr, 0, nullptr};
  uint64_t count = 0;
  const uint32_t rc = tavPrintSubtree(0x44, nullptr, seven.node(), &param, &count);
  EXPECT_EQ(out.text(), "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n7");
  EXPECT_EQ(rc, TAV_RC_OK);
  EXPECT_EQ(count, 41U);
}

} // namespace
