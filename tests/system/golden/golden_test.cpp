#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <fstream>
#include <functional>
#include <map>
#include <ostream>
#include <sstream>
#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/platform.h"
#include "support/writing.h"
#include "tav/tav.h"

// Streams and their printed forms, written down byte by byte in the files beside this one. Each NAME.hex holds the
// stream with comments and lines of `#: key value`; NAME.txt and NAME.xml are what it prints as.
namespace
{

using namespace test;

struct NodeRow
{
  uint64_t depth;
  uint64_t offset;
  uint64_t size;
  uint64_t type;
  uint64_t elm;
  bool operator==(const NodeRow&) const = default;
};

std::ostream& operator<<(std::ostream& out, const NodeRow& row)
{
  return out << "node " << row.depth << ' ' << row.offset << ' ' << row.size << ' ' << row.type << ' ' << row.elm;
}

struct Vector
{
  Form form;
  Bytes bytes;
  std::vector<NodeRow> nodes;
  std::string text;
  std::string xml;
  uint64_t textOptions = 0;
  uint64_t xmlOptions = 0;
  uint32_t printCode = TAV_RC_OK;
  bool endsOpen = false; // the walk does not come to an orderly end
  std::string host;      // "little" or "big": written on such a machine alone, read and printed everywhere
};

std::string contentOf(const std::string& name)
{
  std::ifstream file("golden/" + name, std::ios::binary);
  if (!file)
  {
    throw std::runtime_error("golden/" + name + " is missing: run in the tests folder");
  }
  std::ostringstream content;
  content << file.rdbuf();
  return content.str();
}

void readSetting(Vector& vector, std::string& prints, std::istringstream line)
{
  std::string key;
  std::string value;
  line >> key;
  if (key == "node")
  {
    NodeRow row{};
    line >> row.depth >> row.offset >> row.size >> row.type >> row.elm;
    vector.nodes.push_back(row);
    return;
  }
  line >> value;
  const std::map<std::string, std::function<void()>> settings{
      {"order", [&] { vector.form.swap = (value == "big") != kBigEndianHost; }},
      {"align", [&] { vector.form.align = value == "yes"; }},
      {"text", [&] { vector.textOptions = std::stoull(value, nullptr, 16); }},
      {"xml", [&] { vector.xmlOptions = std::stoull(value, nullptr, 16); }},
      {"code", [&] { vector.printCode = static_cast<uint32_t>(std::stoull(value, nullptr, 16)); }},
      {"prints", [&] { prints = value; }},
      {"ends", [&] { vector.endsOpen = value == "open"; }},
      {"host", [&] { vector.host = value; }},
  };
  settings.at(key)();
}

/// What prints, of which the bytes of that number are the only ones that machines have in another order.
std::string onThisMachine(std::string text)
{
  const std::string low = "000102030405060708090A0B0C0D0E0F";
  const size_t at = text.find(low);
  return at == std::string::npos || !kBigEndianHost ? text
                                                    : text.replace(at, low.size(), "0F0E0D0C0B0A09080706050403020100");
}

Vector load(const std::string& name)
{
  const std::string content = contentOf(name + ".hex");
  Vector vector;
  vector.form.swap = kBigEndianHost;
  vector.bytes = hex(content);
  std::string prints = name;
  std::istringstream lines(content);
  for (std::string line; std::getline(lines, line);)
  {
    if (line.starts_with("#: "))
    {
      readSetting(vector, prints, std::istringstream(line.substr(3)));
    }
  }
  vector.text = onThisMachine(contentOf(prints + ".txt"));
  vector.xml = onThisMachine(contentOf(prints + ".xml"));
  return vector;
}

/// A 128-bit number as this machine has it: the byte 0F is its highest.
Bytes bytesOfLong()
{
  Bytes bytes = hex("00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F");
  if (kBigEndianHost)
  {
    std::reverse(bytes.begin(), bytes.end());
  }
  return bytes;
}

// How each stream is made. Groups of unknown or wrong size show that closing writes the size.

void writeNested32(StreamWriter& writer)
{
  writer.add(group32(TAV_ELM_CMN_DOC_ROOT));
  writer.add(group32(TAV_ELM_CMN_SYSTEM, 0xFFFFFFFF));
  writer.add(ascii(TAV_ELM_CMN_HOST_NAME, "ab", false));
  writer.close();
  writer.add(element(false, TAV_TYPE_UINT16, TAV_ELM_CMN_CPU_TOTAL, bytesOfValue(uint16_t{258})));
  writer.close();
}

void writeNested64(StreamWriter& writer)
{
  writer.add(group64(TAV_ELM_CMN_DOC_ROOT));
  writer.add(group64(TAV_ELM_CMN_CPU, TAV_TYPE_HEADER64, 7, 0));
  writer.add(u32(TAV_ELM_CMN_CPU_SPEED, 3000));
  writer.close();
  writer.close();
}

void writeMixed(StreamWriter& writer)
{
  writer.add(group64(TAV_ELM_CMN_DOC_ROOT));
  writer.add(group64(TAV_ELM_CMN_MEMORY, TAV_TYPE_HEADER32, TAV_INFO_EYE_SIZE));
  writer.add(element(false, TAV_TYPE_UINT8, TAV_ELM_CMN_MEM_TOTAL, {0x5A}));
  writer.add(u64(TAV_ELM_CMN_MEM_FREE, 0x100000000, false));
  writer.close();
  writer.add(element(true, TAV_TYPE_UINT16, TAV_ELM_CMN_CPU_TOTAL, bytesOfValue(uint16_t{7})));
  writer.close();
}

void writePairs(StreamWriter& writer)
{
  writer.add(group64(TAV_ELM_CMN_DOC_ROOT, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.add(ascii(TAV_ELM_CMN_HOST_NAME, "host", true, TAV_INFO_EYE_SIZE));
  writer.add(binary(TAV_ELM_CMN_MACHINE_ID, {1, 2, 3, 4, 5, 6, 7, 8, 9}, true, TAV_INFO_EYE_SIZE));
  writer.add(element(true, TAV_TYPE_UINT16, TAV_ELM_CMN_CPU_TOTAL, bytesOfValue(uint16_t{515})));
  writer.add(group64(TAV_ELM_CMN_OS, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.close();
  writer.close();
}

void writeAbandoned(StreamWriter& writer)
{
  writer.add(group64(TAV_ELM_CMN_DOC_ROOT));
  writer.add(group64(TAV_ELM_CMN_OS, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.add(ascii(TAV_ELM_CMN_OS_NAME, "does not stay"));
  writer.add(group64(TAV_ELM_CMN_CPU, TAV_TYPE_HEADER32));
  writer.add(u32(TAV_ELM_CMN_CPU_SPEED, 1, false));
  writer.abandon();
  writer.abandon();
  writer.add(element(true, TAV_TYPE_SINT32, TAV_ELM_CMN_CPU_TOTAL, bytesOfValue(int32_t{-5})));
  writer.close();
}

void writeTypes(StreamWriter& writer)
{
  const auto add = [&writer](uint16_t type, uint16_t elm, Bytes payload) {
    writer.add(element(false, type, elm, std::move(payload)));
  };
  writer.add(group32(TAV_ELM_CMN_DOC_ROOT));
  add(TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME, bytesOfText("tav"));
  add(TAV_TYPE_UINT8, TAV_ELM_CMN_CPU_TOTAL, {0xA5});
  add(TAV_TYPE_SINT8, TAV_ELM_CMN_CPU_ONLINE, {'B'});
  add(TAV_TYPE_UINT16, TAV_ELM_CMN_CPU_CONFIG, bytesOfValue(uint16_t{258}));
  add(TAV_TYPE_SINT16, TAV_ELM_CMN_CPU_SPEED, bytesOfValue(int16_t{-2}));
  add(TAV_TYPE_UINT32, TAV_ELM_CMN_MEM_TOTAL, bytesOfValue(uint32_t{4294967040}));
  add(TAV_TYPE_SINT32, TAV_ELM_CMN_MEM_FREE, bytesOfValue(int32_t{-3}));
  add(TAV_TYPE_UINT64, TAV_ELM_CMN_MEM_AVAIL, bytesOfValue(uint64_t{72623859790382856}));
  add(TAV_TYPE_SINT64, TAV_ELM_CMN_SWAP_MEM_TOTAL, bytesOfValue(int64_t{-4}));
  add(TAV_TYPE_UTC_TIMESTAMP, TAV_ELM_CMN_SWAP_MEM_FREE, bytesOfValue(TAVTimeStamp{1705311000, 5000, 7, 0, 60}));
  add(TAV_TYPE_BINARY, TAV_ELM_CMN_MACHINE_ID, {0x00, 0x7F, 0xFF});
  add(TAV_TYPE_UINT128, TAV_ELM_CMN_VIRT_MEM_TOTAL, bytesOfLong());
  add(TAV_TYPE_BYTE, 64999, {'X'});
  Bytes array = bytesOfValue(uint64_t{1});
  const Bytes second = bytesOfValue(uint64_t{258});
  array.insert(array.end(), second.begin(), second.end());
  add(TAV_TYPE_UINT64_ARRAY, TAV_ELM_CMN_CPU_TOTAL_USAGE, array);
  writer.close();
}

void writeStrings(StreamWriter& writer)
{
  writer.add(group64(TAV_ELM_CMN_DOC_ROOT));
  writer.addString(ascii(TAV_ELM_CMN_HOST_NAME, "ab", true, TAV_INFO_EYE_SIZE), TAV_CODE_PAGE_ASCII);
  Bytes text = bytesOfText("xyz!?");
  TAVHeaderData data{header64(3, TAV_TYPE_UTF8_STRING, TAV_ELM_CMN_OS_NAME), text.data(), text.size(), 0};
  check(tavAddString(0, writer.handle(), &data, 1208), "tavAddString");
  writer.close();
}

void writeSint128(StreamWriter& writer)
{
  writer.add(group32(TAV_ELM_CMN_DOC_ROOT));
  writer.add(element(false, TAV_TYPE_UINT8, TAV_ELM_CMN_CPU_TOTAL, {7}));
  writer.add(element(false, TAV_TYPE_SINT128, TAV_ELM_CMN_VIRT_MEM_TOTAL,
                     bytesOfLong()));
  writer.add(element(false, TAV_TYPE_UINT8, TAV_ELM_CMN_CPU_ONLINE, {8}));
  writer.close();
}

struct Sample
{
  const char* name;
  void (*write)(StreamWriter&);
  bool root32;
};

void PrintTo(const Sample& sample, std::ostream* out)
{
  *out << sample.name;
}

constexpr Sample kSamples[] = {
    {"nested32", writeNested32, true},
    {"nested64Big", writeNested64, false},
    {"mixedAligned", writeMixed, false},
    {"pairsAlignedBig", writePairs, false},
    {"abandoned", writeAbandoned, false},
    {"types", writeTypes, true},
    {"typesBig", writeTypes, true},
    {"strings", writeStrings, false},
    {"stringsBig", writeStrings, false},
    {"stringsOfBigHost", writeStrings, false},
    {"stringsBigOfBigHost", writeStrings, false},
    {"sint128", writeSint128, true},
};

class Golden : public ::testing::TestWithParam<std::tuple<Sample, bool>>
{
protected:
  void SetUp() override
  {
    const auto& [sample, buffered] = GetParam();
    vector = load(sample.name);
    vector.form.buffered = buffered;
    vector.form.root32 = sample.root32;
  }

  void expectPrint(uint64_t options, const std::string& expected)
  {
    StreamReader reader(vector.bytes, vector.form);
    CaughtStream stream;
    TAVPrintParam param{0, nullptr, 0, stream.get()};
    uint64_t count = 0;
    EXPECT_EQ(tavPrintSubtree(options, reader.handle(), nullptr, &param, &count), vector.printCode);
    EXPECT_EQ(stream.text(), expected);
    EXPECT_EQ(count, expected.size());
  }

  Vector vector;
};

TEST_P(Golden, IsWhatIsWritten)
{
  if (vector.host == (kBigEndianHost ? "little" : "big"))
  {
    GTEST_SKIP() << "holds words in the order of another machine";
  }
  StreamWriter writer(vector.form);
  fillStorage(writer, 0xEE);
  std::get<0>(GetParam()).write(writer);
  EXPECT_EQ(writer.length(), vector.bytes.size());
  EXPECT_EQ(toHex(writer.bytes()), toHex(vector.bytes));
}

/// Collects a group's children and what is below them; stops when all rows of the vector are there.
void walk(const Vector& vector, TAVHandle* handle, TAVHeader parent, uint64_t depth, std::vector<NodeRow>& found)
{
  std::vector<TAVHeader> seen;
  for (uint32_t rc = TAV_RC_OK; rc == TAV_RC_OK;)
  {
    if (vector.endsOpen && found.size() == vector.nodes.size())
    {
      return;
    }
    TAVHeaderData node{};
    TAVHeader previous = seen.empty() ? TAVHeader{} : seen.back();
    rc = tavGetNextChild(0, handle, &parent, seen.empty() ? nullptr : &previous, &node);
    if (rc != TAV_RC_OK)
    {
      EXPECT_EQ(rc, TAV_RC_NO_MORE_CHILDREN);
      return;
    }
    const Element form{node.header, {}};
    found.push_back({depth, node.header.nodeOffset, form.size(), form.type(), form.elm()});
    if (form.type() == TAV_TYPE_HEADER32 || form.type() == TAV_TYPE_HEADER64)
    {
      walk(vector, handle, node.header, depth + 1, found);
    }
    else
    {
      const uint64_t start = node.header.nodeOffset + (node.header.hdrType == TAV_HDR_64 ? 16 : 8);
      const auto first = vector.bytes.begin() + static_cast<ptrdiff_t>(start);
      EXPECT_EQ(Bytes(node.pDataBuf, node.pDataBuf + form.size()),
                Bytes(first, first + static_cast<ptrdiff_t>(form.size())));
    }
    seen.push_back(node.header);
  }
}

TEST_P(Golden, ReadsBackNodeByNode)
{
  StreamReader reader(vector.bytes, vector.form);
  TAVHeaderData root{};
  ASSERT_EQ(tavGetNextChild(0, reader.handle(), nullptr, nullptr, &root), TAV_RC_OK);
  const Element form{root.header, {}};
  std::vector<NodeRow> found{{0, root.header.nodeOffset, form.size(), form.type(), form.elm()}};
  walk(vector, reader.handle(), root.header, 1, found);
  EXPECT_EQ(found, vector.nodes);
}

TEST_P(Golden, PrintsAsText)
{
  expectPrint(vector.textOptions, vector.text);
}

TEST_P(Golden, PrintsAsXml)
{
  expectPrint(vector.xmlOptions, vector.xml);
}

INSTANTIATE_TEST_SUITE_P(Vectors, Golden, ::testing::Combine(::testing::ValuesIn(kSamples), ::testing::Bool()),
                         [](const auto& instance) {
                           return std::string(std::get<0>(instance.param).name) +
                                  (std::get<1>(instance.param) ? "Buffered" : "Direct");
                         });

} // namespace
