// The worked example of the format page is the stream that the library writes.
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>

#include "support/streams.h"

namespace
{

using namespace test;

/// The bytes of the table between the page's two markers, whose offsets must follow one another.
Bytes bytesOfPage(const std::string& path)
{
  std::ifstream page(path);
  std::stringstream text;
  text << page.rdbuf();
  const std::string all = text.str();
  const size_t begin = all.find("<!-- worked-example -->");
  const size_t end = all.find("<!-- /worked-example -->");
  EXPECT_NE(begin, std::string::npos);
  EXPECT_NE(end, std::string::npos);
  Bytes bytes;
  std::istringstream lines(all.substr(begin, end - begin));
  for (std::string line; std::getline(lines, line);)
  {
    if (!line.starts_with("| 0x"))
    {
      continue;
    }
    EXPECT_EQ(std::stoul(line.substr(2), nullptr, 16), bytes.size()) << line;
    const size_t first = line.find('`') + 1;
    std::istringstream cells(line.substr(first, line.find('`', first) - first));
    for (std::string byte; cells >> byte;)
    {
      bytes.push_back(static_cast<uint8_t>(std::stoul(byte, nullptr, 16)));
    }
  }
  return bytes;
}

TEST(FormatPage, ItsWorkedExampleIsWhatTheLibraryWrites)
{
  StreamWriter writer;
  writer.add(group64(TAV_ELM_CMN_HOST, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.add(u32(TAV_ELM_CMN_CPU_TOTAL, 8, true, TAV_INFO_EYE_SIZE));
  writer.close();
  const Bytes page = bytesOfPage("../docs/format.md");
  ASSERT_EQ(page.size(), 84U);
  EXPECT_EQ(writer.bytes(), page);
}

} // namespace
