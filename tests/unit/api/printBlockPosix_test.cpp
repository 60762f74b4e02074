// Output that is collected for a stream, against output that goes out piece by piece as it does under a trace.
#include <cstdint>
#include <cstdio>
#include <memory>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "support/elements.h"
#include "support/printing.h"
#include "support/streams.h"
#include "support/traceLog.h"

namespace
{

using namespace test;

/// A stream that refuses the bytes from one place to another, as a device that is full for a while.
class RefusingStream
{
public:
  RefusingStream(uint64_t from, uint64_t refusals, int buffering)
      : from_(from), refusals_(refusals),
        file_(fopencookie(this, "w", {nullptr, &RefusingStream::write, nullptr, nullptr}))
  {
    std::setvbuf(file_, nullptr, buffering, BUFSIZ);
  }
  ~RefusingStream() { close(); }
  RefusingStream(const RefusingStream&) = delete;
  RefusingStream& operator=(const RefusingStream&) = delete;

  FILE* get() { return file_; }

  /// All that was taken.
  const std::string& close()
  {
    if (file_ != nullptr)
    {
      std::fclose(std::exchange(file_, nullptr));
    }
    return text_;
  }

private:
  static ssize_t write(void* cookie, const char* bytes, size_t size)
  {
    auto& self = *static_cast<RefusingStream*>(cookie);
    const uint64_t room = self.text_.size() < self.from_ ? self.from_ - self.text_.size() : 0;
    if (self.refusals_ != 0 && room < size)
    {
      --self.refusals_; // taking less than asked is a refusal
      size = room;
    }
    self.text_.append(bytes, size);
    return static_cast<ssize_t>(size);
  }

  uint64_t from_;
  uint64_t refusals_;
  std::string text_;
  FILE* file_;
};

constexpr uint64_t kForEver = ~uint64_t{0};

Printed printRefused(const Bytes& bytes, const Form& form, uint64_t options, uint64_t from, uint64_t refusals,
                     int buffering)
{
  StreamReader reader(bytes, form);
  RefusingStream stream(from, refusals, buffering);
  TAVPrintParam param{0, nullptr, 0, stream.get()};
  uint64_t count = 0xBAD;
  const uint32_t rc = tavPrintSubtree(options, reader.handle(), nullptr, &param, &count);
  return {rc, count, stream.close()};
}

/// The same while a trace goes nowhere: then every piece goes out by itself.
Printed printPieces(const Bytes& bytes, const Form& form, uint64_t options, uint64_t from, uint64_t refusals,
                    int buffering)
{
  korTraceStart([](void*, const KORTraceRecord*) {}, nullptr);
  const Printed result = printRefused(bytes, form, options, from, refusals, buffering);
  korTraceStop();
  return result;
}

/// A tree with every kind of value, texts longer than a block among them.
Bytes mixedTree()
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(group64(60102));
  writer.add(ascii(60103, "box"));
  writer.add(u32(60110, 4000000000U));
  writer.add(u64(60111, 12345678901234567890U));
  writer.add(ascii(60103, std::string("ends\0early", 10)));
  writer.close();
  writer.add(element(true, TAV_TYPE_BINARY, 60104, {1, 2, 0xAB}));
  writer.add(element(true, TAV_TYPE_UINT64_ARRAY, 60104, Bytes(24, 7)));
  writer.add(element(true, TAV_TYPE_UTC_TIMESTAMP, 60105, Bytes(16, 3)));
  writer.add(element(true, TAV_TYPE_SINT8, 60104, {0}));
  writer.add(element(true, TAV_TYPE_SINT8, 60104, {'\n'}));
  writer.add(ascii(60103, "two\nlines"));
  writer.add(group64(60109));
  writer.add(group64(60109));
  writer.add(element(true, TAV_TYPE_BYTE, 64999, {0}));
  writer.close();
  writer.close();
  writer.add(ascii(60103, std::string(5000, 'x')));
  writer.add(u32(60110, 7));
  writer.close();
  return writer.bytes();
}

/// Many lines: more than a stream's buffer holds.
Bytes longTree()
{
  StreamWriter writer;
  writer.add(group64(20));
  for (uint32_t at = 0; at < 700; ++at)
  {
    writer.add(u32(static_cast<uint16_t>(60100 + at % 28), at * 6000001U));
  }
  writer.close();
  return writer.bytes();
}

constexpr uint64_t kOptions[] = {0x1, 0x5, 0x41, 0x45, 0x47, 0x4F, 0xC5, 0xC7, 0xF};

TEST(OutputOfAWalk, IsThatOfItsPieces)
{
  for (const Bytes& bytes : {mixedTree(), longTree()})
  {
    for (const uint64_t options : kOptions)
    {
      const Printed pieces = printPieces(bytes, {}, options & ~uint64_t{8}, 0, 0, _IOFBF);
      for (const int buffering : {_IOFBF, _IOLBF, _IONBF})
      {
        ASSERT_EQ(printRefused(bytes, {}, options & ~uint64_t{8}, 0, 0, buffering), pieces) << options;
      }
      ASSERT_EQ(pieces.count, pieces.text.size());
    }
  }
}

/// P: how often the stream refuses before it takes again.
class RefusedOutput : public ::testing::TestWithParam<uint64_t>
{
};

TEST_P(RefusedOutput, OfAnUnbufferedStreamIsThatOfItsPiecesWhereverItRefuses)
{
  const Bytes bytes = mixedTree();
  for (const uint64_t options : kOptions)
  {
    const uint64_t length = printRefused(bytes, {}, options, 0, 0, _IOFBF).text.size();
    for (uint64_t from = 0; from < length; from += from < 300 ? 1 : 97)
    {
      ASSERT_EQ(printRefused(bytes, {}, options & ~uint64_t{8}, from, GetParam(), _IONBF),
                printPieces(bytes, {}, options & ~uint64_t{8}, from, GetParam(), _IONBF))
          << "options " << options << ", refused from " << from;
    }
  }
}

TEST_P(RefusedOutput, OfABufferedStreamIsThatOfItsPieces)
{
  const Bytes bytes = longTree();
  for (const uint64_t options : {0x5U, 0x45U, 0x47U})
  {
    const uint64_t length = printRefused(bytes, {}, options, 0, 0, _IOFBF).text.size();
    for (uint64_t from = 0; from < length; from += 4099)
    {
      ASSERT_EQ(printRefused(bytes, {}, options, from, GetParam(), _IOFBF),
                printPieces(bytes, {}, options, from, GetParam(), _IOFBF))
          << "options " << options << ", refused from " << from;
    }
  }
}

TEST_P(RefusedOutput, OfALineBufferedStreamIsThatOfItsPiecesWhereverItRefuses)
{
  const Bytes bytes = mixedTree();
  for (const uint64_t options : kOptions)
  {
    const uint64_t length = printRefused(bytes, {}, options, 0, 0, _IOFBF).text.size();
    for (uint64_t from = 0; from < length; from += from < 300 ? 1 : 97)
    {
      ASSERT_EQ(printRefused(bytes, {}, options & ~uint64_t{8}, from, GetParam(), _IOLBF),
                printPieces(bytes, {}, options & ~uint64_t{8}, from, GetParam(), _IOLBF))
          << "options " << options << ", refused from " << from;
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Refusing, RefusedOutput, ::testing::Values(1, 2, 3, 10, kForEver));

/// Code and count of printing to a device that takes nothing.
std::pair<uint32_t, uint64_t> printToFullDevice(uint64_t options, int buffering, bool traced)
{
  StreamReader reader(longTree(), {});
  FILE* const full = std::fopen("/dev/full", "w");
  std::setvbuf(full, nullptr, buffering, BUFSIZ);
  TAVPrintParam param{0, nullptr, 0, full};
  uint64_t count = 0xBAD;
  if (traced)
  {
    korTraceStart([](void*, const KORTraceRecord*) {}, nullptr);
  }
  const uint32_t rc = tavPrintSubtree(options, reader.handle(), nullptr, &param, &count);
  korTraceStop();
  std::fclose(full);
  return {rc, count};
}

TEST(OutputToAFullDevice, IsThatOfItsPieces)
{
  for (const int buffering : {_IOFBF, _IOLBF, _IONBF})
  {
    for (const uint64_t options : kOptions)
    {
      EXPECT_EQ(printToFullDevice(options & ~uint64_t{8}, buffering, false),
                printToFullDevice(options & ~uint64_t{8}, buffering, true))
          << "buffering " << buffering << ", options " << options;
    }
  }
  EXPECT_GT(printToFullDevice(0x45, _IOFBF, true).second, 0U);
}

TEST(OutputToAFullDevice, OfXmlIsRefusedWithTheFirstTagThatEndsALine)
{
  for (const bool traced : {false, true})
  {
    EXPECT_EQ(printToFullDevice(0x45, _IONBF, traced), std::pair(TAV_RC_NO_MEMORY, uint64_t{0}));
    EXPECT_EQ(printToFullDevice(0x45, _IOLBF, traced).first, TAV_RC_NO_MEMORY);
  }
}

TEST(OutputToALineBufferedStream, CountsNoLineThatIsRefused)
{
  StreamWriter writer;
  writer.add(group64(20));
  writer.add(u32(60110, 7));
  writer.close();
  for (const bool traced : {false, true})
  {
    const Printed lines = (traced ? printPieces : printRefused)(writer.bytes(), {}, 0x45, 0, kForEver, _IOLBF);
    EXPECT_EQ(lines.rc, TAV_RC_NO_MEMORY);
    EXPECT_EQ(lines.text, "");
    EXPECT_EQ(lines.count, std::string("<docRoot>   <cpuTotal>7").size()) << "what does not end a line is buffered";
  }
}

TEST(OutputOfAWalk, IsNotHeldBackOnceATraceHasBegun)
{
  StreamReader reader(longTree(), {});
  CaughtStream stream;
  TAVPrintParam param{0, nullptr, 0, stream.get()};
  uint64_t count = 0;
  TraceLog trace;
  ASSERT_EQ(tavPrintSubtree(0x45, reader.handle(), nullptr, &param, &count), TAV_RC_OK);
  EXPECT_EQ(count, stream.text().size());
  EXPECT_EQ(trace.stepsOf(0x88A0089).size(), 4U * 702U); // entry, arguments, count, exit of every node and the closing
}

} // namespace
