#include "tav/kor.h"

#include "support/failingNew.h"

#include <array>
#include <cstdio>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

namespace
{
using testing::Each;
using testing::SizeIs;

using testing::HasSubstr;

/// A file that a sink writes to and that can be read back.
class TextFile
{
public:
  TextFile()
      : file_(std::tmpfile(), &std::fclose) {}

  std::FILE* stream() { return file_.get(); }

  std::string text()
  {
    std::string text;
    std::array<char, 4096> part{};
    std::rewind(file_.get());
    for (;;)
    {
      const std::size_t count = std::fread(part.data(), 1, part.size(), file_.get());
      if (count == 0)
      {
        return text;
      }
      text.append(part.data(), count);
    }
  }

private:
  std::unique_ptr<std::FILE, int (*)(std::FILE*)> file_;
};

KORTraceRecord recordOf(KORTraceKind kind, uint32_t point, uint32_t code)
{
  return {kind, 4711, 0x088A0012, point, code, nullptr, 0};
}

std::string lineOf(const KORTraceRecord& record)
{
  TextFile file;
  korTraceTextSink(file.stream(), &record);
  return file.text();
}

/// How the line of a record of variables shows one item.
std::string shown(const void* data, uint64_t length)
{
  const KORTraceItem item{data, length};
  KORTraceRecord record = recordOf(KOR_TRACE_VAR, 0, 0);
  record.pItems = &item;
  record.itemCount = 1;
  const std::string line = lineOf(record);
  const std::string head = "var   thread 4711 probe 0x088A0012 point 0 ";
  if (line.rfind(head, 0) != 0 || line.back() != '\n')
  {
    return "not a line of variables: " + line;
  }
  return line.substr(head.size(), line.size() - head.size() - 1);
}

template<class Number>
std::string shownNumber(Number number)
{
  return shown(&number, sizeof number);
}

TEST(TraceText, AnEntryIsALine)
{
  EXPECT_EQ(lineOf(recordOf(KOR_TRACE_ENTRY, 0, 0)), "entry thread 4711 probe 0x088A0012 point 0\n");
}

TEST(TraceText, AnExitShowsItsCodeWithTheName)
{
  EXPECT_EQ(lineOf(recordOf(KOR_TRACE_EXIT, 0, TAV_RC_OK)),
            "exit  thread 4711 probe 0x088A0012 point 0 code 0x00000000 TAV_RC_OK\n");
}

TEST(TraceText, AnErrorShowsPointAndCodeOnce)
{
  const uint32_t code = TAV_RC_NOT_FOUND;
  const KORTraceItem item{&code, sizeof code};
  KORTraceRecord record = recordOf(KOR_TRACE_ERROR, 60, code);
  record.pItems = &item;
  record.itemCount = 1;
  EXPECT_EQ(lineOf(record), "error thread 4711 probe 0x088A0012 point 60 code 0x9000059B TAV_RC_NOT_FOUND\n");
}

TEST(TraceText, ACodeWithoutANameSaysSo)
{
  EXPECT_EQ(lineOf(recordOf(KOR_TRACE_EXIT, 0, 0x12)),
            "exit  thread 4711 probe 0x088A0012 point 0 code 0x00000012 unknown code\n");
}

TEST(TraceText, VariablesStandInTheirOrder)
{
  const uint32_t number = 7;
  const std::array<KORTraceItem, 3> items = {{{"name", 4}, {&number, sizeof number}, {nullptr, 0}}};
  KORTraceRecord record = recordOf(KOR_TRACE_VAR, 100, 0);
  record.pItems = items.data();
  record.itemCount = 3;
  EXPECT_EQ(lineOf(record), "var   thread 4711 probe 0x088A0012 point 100 \"name\", 7, null\n");
}

TEST(TraceText, PrintableBytesAreAText)
{
  EXPECT_EQ(shown("system time", 11), "\"system time\"");
}

TEST(TraceText, FourPrintableBytesAreATextToo)
{
  EXPECT_EQ(shown("root", 4), "\"root\"");
}

TEST(TraceText, QuotesInATextAreMarked)
{
  EXPECT_EQ(shown("a\"b\\c", 5), "\"a\\\"b\\\\c\"");
}

TEST(TraceText, AnItemOfNoBytesIsAnEmptyText)
{
  EXPECT_EQ(shown("", 0), "\"\"");
}

TEST(TraceText, NumbersOfEveryWidthAreDecimal)
{
  EXPECT_EQ(shownNumber(uint8_t{200}), "200");
  EXPECT_EQ(shownNumber(uint16_t{65535}), "65535");
  EXPECT_EQ(shownNumber(uint32_t{4000000000u}), "4000000000");
  EXPECT_EQ(shownNumber(UINT64_MAX), "18446744073709551615");
}

TEST(TraceText, OtherBytesAreHex)
{
  const std::array<uint8_t, 3> bytes = {0x00, 0xAB, 0x0C};
  EXPECT_EQ(shown(bytes.data(), bytes.size()), "hex 00AB0C");
}

TEST(TraceText, SixtyFourBytesOfHexAreWhole)
{
  const std::vector<uint8_t> bytes(64, 0xEE);
  std::string digits;
  for (int i = 0; i < 64; ++i) digits += "EE";
  EXPECT_EQ(shown(bytes.data(), bytes.size()), "hex " + digits);
}

TEST(TraceText, LongerHexIsCutAndItsLengthTold)
{
  const std::vector<uint8_t> bytes(65, 0xEE);
  std::string digits;
  for (int i = 0; i < 64; ++i) digits += "EE";
  EXPECT_EQ(shown(bytes.data(), bytes.size()), "hex " + digits + "... (65 bytes)");
}

TEST(TraceText, ALongTextIsCutAndItsLengthTold)
{
  const std::string text(257, 'x');
  std::string cut = "\"";
  cut.append(256, 'x').append("\"... (257 bytes)");
  EXPECT_EQ(shown(text.data(), text.size()), cut);
}

TEST(TraceText, OneByteThatIsNotPrintableMakesALongItemHex)
{
  std::string text(300, 'x');
  text.back() = '\n';
  EXPECT_THAT(shown(text.data(), text.size()), testing::StartsWith("hex 7878"));
}

TEST(TraceText, NullIsNamedWhateverItsLength)
{
  EXPECT_EQ(shown(nullptr, 0), "null");
  EXPECT_EQ(shown(nullptr, 32), "null");
}

TEST(TraceText, WithoutMemoryTheRecordIsLostAndNothingElse)
{
  TextFile file;
  const KORTraceRecord record = recordOf(KOR_TRACE_EXIT, 0, TAV_RC_OK);
  {
    const allocations::AllFail fail;
    korTraceTextSink(file.stream(), &record);
  }
  EXPECT_EQ(file.text(), "");
  korTraceTextSink(file.stream(), &record);
  EXPECT_NE(file.text(), "");
}

TEST(TraceText, WithoutAFileTheRecordIsDropped)
{
  const KORTraceRecord record = recordOf(KOR_TRACE_ENTRY, 0, 0);
  EXPECT_NO_THROW(korTraceTextSink(nullptr, &record));
}

TEST(TraceText, LinesOfThreadsDoNotMix)
{
  TextFile file;
  ASSERT_EQ(korTraceStart(korTraceTextSink, file.stream()), TAV_RC_OK);
  std::vector<std::thread> threads;
  threads.reserve(8);
  for (int t = 0; t < 4; ++t)
  {
    threads.emplace_back([] {
      const std::string text(200, 'y');
      for (int i = 0; i < 250; ++i)
        _wtraceVar(4711, 0x088A0012, 0, 3, 1, uint32_t{0}, uint64_t{200}, static_cast<const void*>(text.data()));
    });
  }
  for (std::thread& thread : threads) thread.join();
  ASSERT_EQ(korTraceStop(), TAV_RC_OK);

  std::vector<std::string> lines;
  std::istringstream text(file.text());
  for (std::string line; std::getline(text, line);) lines.push_back(line);
  EXPECT_THAT(lines, SizeIs(1000));
  EXPECT_THAT(lines, Each("var   thread 4711 probe 0x088A0012 point 0 \"" + std::string(200, 'y') + "\""));
}
TEST(TraceText, ShowsARecordOfNoKnownKindAllTheSame)
{
  TextFile file;
  const KORTraceRecord record{static_cast<KORTraceKind>(9), 1, 0x088A0007, 10, 0, nullptr, 0};
  korTraceTextSink(file.stream(), &record);
  EXPECT_THAT(file.text(), testing::AllOf(HasSubstr("?"), testing::EndsWith("\n")));
}
} // namespace
