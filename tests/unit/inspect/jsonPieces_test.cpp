/// Values and damaged bytes that documents hold in pieces, and the ways in which a document may write them.
#include <algorithm>
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;
using testing::HasSubstr;

namespace
{

std::string jsonOf(const Bytes& bytes, const Form& form, const ToJsonOptions& options = {})
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  test::Kept kept;
  toJson(source, form, kept, options);
  return kept.text;
}

/// A document with one system, which has these children.
std::string systemWith(const std::string& children, bool big)
{
  return std::string(R"({"form": {"byteOrder": ")") + (big ? "big" : "little") +
         R"("}, "nodes": [{"element": "system", "children": [)" + children + "]}]}";
}

Form formOf(bool big)
{
  return {.swapped = big != test::kBigEndianHost, .root64 = true, .aligned = false};
}

class JsonPieces : public testing::TestWithParam<bool>
{
protected:
  Bytes bytesOf(const std::string& children) { return test::bytesOfJson(systemWith(children, GetParam())); }

  Form form = formOf(GetParam());
};

} // namespace

INSTANTIATE_TEST_SUITE_P(ByteOrders, JsonPieces, testing::Bool());

TEST_P(JsonPieces, CountZerosInsteadOfWritingThem)
{
  // Blocks of 4,096 bytes: zeros, bytes, zeros, bytes in the last block alone.
  Bytes value(100'000, 0);
  std::fill(value.begin() + 8192, value.begin() + 12288, uint8_t{0xAB});
  value.back() = 0x01;
  const Bytes bytes = bytesOf(R"({"id": 1, "type": "Binary", "bytes": ")" + hexText(value) + R"("})");
  const std::string text = jsonOf(bytes, form, {.style = JsonStyle::compact});
  EXPECT_THAT(text, HasSubstr(R"("bytes":[8192,"abab)"));
  EXPECT_THAT(text, HasSubstr("abab\",86016,\"00"));
  EXPECT_THAT(text, HasSubstr("0001\"]"));
  EXPECT_LT(text.size(), 12'000U) << "most of it is counted";
  EXPECT_EQ(test::bytesOfJson(text), bytes);
  EXPECT_EQ(test::bytesOfJson(jsonOf(bytes, form, {.style = JsonStyle::lines})), bytes);
}

TEST_P(JsonPieces, AreCutWhereAPieceWouldBeLong)
{
  Bytes value(200'000);
  for (size_t i = 0; i < value.size(); ++i)
  {
    value[i] = static_cast<uint8_t>(1 + i % 255);
  }
  const Bytes bytes = bytesOf(R"({"id": 1, "type": "Binary", "bytes": ")" + hexText(value) + R"("})");
  const std::string text = jsonOf(bytes, form, {.style = JsonStyle::compact});
  for (size_t at = 0, end = 0; (at = text.find('"', at)) != std::string::npos; at = end + 1)
  {
    end = text.find('"', at + 1);
    ASSERT_NE(end, std::string::npos);
    EXPECT_LE(end - at, size_t{2} * (48 + 4) * 1024);
  }
  EXPECT_EQ(test::bytesOfJson(text), bytes);
}

TEST_P(JsonPieces, OfDamagedBytesGiveTheSameBytesAgain)
{
  Bytes bytes = bytesOf(R"({"id": 1, "type": "Uint32", "value": 7})");
  bytes.resize(bytes.size() + 5000, 0x77);
  bytes.resize(bytes.size() + 20'000, 0);
  bytes.resize(bytes.size() + 5000, 0x78);
  for (const JsonStyle style : {JsonStyle::readable, JsonStyle::compact, JsonStyle::lines})
  {
    EXPECT_EQ(test::bytesOfJson(jsonOf(bytes, form, {.style = style})), bytes);
  }
}

TEST_P(JsonPieces, AreLeftOutWhereDamagedBytesAreConverted)
{
  Bytes bytes = bytesOf(R"({"id": 1, "type": "Uint32", "value": 7})");
  bytes.resize(bytes.size() + 300'000, 0x77);
  const std::string text = jsonOf(bytes, form);
  MemoryText document("document", text);
  test::Made made;
  const LeftOut leftOut = fromJson(document, made.file(), {.swapped = !form.swapped});
  EXPECT_EQ(leftOut.places, 1U);
  EXPECT_EQ(leftOut.bytes, 300'000U);
  EXPECT_EQ(made.bytes().size(), 16U + 16U + 4U);
}

TEST_P(JsonPieces, WriteNumbersThatADoubleCannotHoldAsTexts)
{
  const Bytes bytes = bytesOf(R"({"id": 1, "type": "Uint64", "value": 9007199254740992},
                                 {"id": 2, "type": "Uint64", "value": 9007199254740993},
                                 {"id": 3, "type": "Sint64", "value": -9007199254740992},
                                 {"id": 4, "type": "Sint64", "value": -9007199254740993},
                                 {"id": 5, "type": "Uint32", "value": 4294967295})");
  const std::string safe = jsonOf(bytes, form, {.style = JsonStyle::compact, .safe = true});
  EXPECT_THAT(safe, HasSubstr(R"("value":9007199254740992})"));
  EXPECT_THAT(safe, HasSubstr(R"("value":"9007199254740993"})"));
  EXPECT_THAT(safe, HasSubstr(R"("value":-9007199254740992})"));
  EXPECT_THAT(safe, HasSubstr(R"("value":"-9007199254740993"})"));
  EXPECT_THAT(safe, HasSubstr(R"("value":4294967295})"));
  EXPECT_EQ(test::bytesOfJson(safe), bytes);
  const std::string plain = jsonOf(bytes, form, {.style = JsonStyle::compact});
  EXPECT_THAT(plain, HasSubstr(R"("value":9007199254740993})"));
}

TEST_P(JsonPieces, MayBeGivenInTheShortWay)
{
  const Bytes bytes = bytesOf(R"({"element": "hostName", "type": "Binary", "bytes": "00000000ff"})");
  const std::string opening = std::string(R"({"form": {"byteOrder": ")") + (GetParam() ? "big" : "little") + R"("}, )";
  const std::string host = R"("system": {"hostName": {"$type": "Binary", )";
  EXPECT_EQ(test::bytesOfJson(opening + host + R"("$bytes": ["0000", 2, "ff"]}}})"), bytes);
  EXPECT_EQ(test::bytesOfJson(opening + host + R"("$bytes": [4, "ff"]}}})"), bytes);
  const Bytes two = bytesOf(R"({"element": "hostName", "value": "ada"}, {"element": "cpuOnline", "value": 7})");
  EXPECT_EQ(test::bytesOfJson(opening + R"("system": {"$children": [{"element": "hostName", "value": "ada"},
                                                                 {"element": "cpuOnline", "value": 7}]}})"),
            two);
  EXPECT_EQ(test::bytesOfJson(opening + R"("nodes": [{"element": "system",
                                        "children": {"hostName": "ada", "cpuOnline": 7}}]})"),
            two);
}

TEST_P(JsonPieces, OfTypesMayBearTheirConstantsNames)
{
  const Bytes bytes = bytesOf(R"({"id": 1, "type": "Uint32", "value": 7})");
  for (const char* const name : {"TAV_TYPE_UINT32", "uint32", "UINT 32", "Uint_32"})
  {
    EXPECT_EQ(bytesOf(R"({"id": 1, "type": ")" + std::string(name) + R"(", "value": 7})"), bytes) << name;
  }
}

TEST_P(JsonPieces, OfDatesMayLackDigits)
{
  const Bytes bytes = bytesOf(R"({"id": 1, "type": "UTC Timestamp", "value": "2024-02-29T10:30:00.120000+01:00"})");
  for (const char* const date : {"2024-02-29T10:30:00.12+01:00", "2024-02-29T10:30:00.1200+01:00"})
  {
    EXPECT_EQ(bytesOf(R"({"id": 1, "type": "UTC Timestamp", "value": ")" + std::string(date) + R"("})"), bytes);
  }
  for (const char* const date : {"1969-12-31T23:59:59Z", "1970-01-01T00:30:00+01:00", "2024-02-2xT10:30:00Z",
                                 "2024-02-29T10:30:00.Z", "2024-02-29", "2024-13-01T00:00:00Z"})
  {
    EXPECT_THROW(bytesOf(R"({"id": 1, "type": "UTC Timestamp", "value": ")" + std::string(date) + R"("})"), Error)
        << date;
  }
}

TEST_P(JsonPieces, WithoutATypeGetOneByTheirKind)
{
  const std::vector<std::pair<const char*, const char*>> cases{
      {R"("value": [1, 2])", R"("type": "Uint64 array", "value": [1, 2])"},
      {R"("value": {"seconds": 1709202600, "fractionA": 123, "fractionB": 456, "offsetMinutes": 60})",
       R"("type": "UTC Timestamp", "value": "2024-02-29T11:30:00.123456+01:00")"},
      {R"("bytes": "00ff")", R"("type": "Binary", "bytes": "00ff")"},
      {R"("value": -2147483649)", R"("type": "Sint64", "value": -2147483649)"},
      {R"("value": -2147483648)", R"("type": "Sint32", "value": -2147483648)"},
  };
  for (const auto& [without, with] : cases)
  {
    EXPECT_EQ(bytesOf(R"({"id": 1, )" + std::string(without) + "}"), bytesOf(R"({"id": 1, )" + std::string(with) + "}"))
        << without;
  }
}

TEST_P(JsonPieces, AreToldOfByTheirOffsets)
{
  const Bytes bytes = bytesOf(R"({"id": 1, "type": "Uint32", "value": 7}, {"id": 2, "type": "Uint32", "value": 7})");
  std::vector<uint64_t> offsets;
  jsonOf(bytes, form, {.progress = [&](uint64_t offset) { offsets.push_back(offset); }});
  EXPECT_TRUE(std::is_sorted(offsets.begin(), offsets.end()));
  EXPECT_THAT(offsets, testing::IsSupersetOf({0U, 16U, 36U}));
}

TEST(Json, CutsNoCharacterOfATextInTwo)
{
  const std::vector<Bytes> characters{{0x41}, {0xC3, 0xBC}, {0xE2, 0x82, 0xAC}, {0xF0, 0x9F, 0x99, 0x82}};
  for (const Bytes& character : characters)
  {
    for (const size_t shift : {0U, 1U, 2U, 3U})
    {
      std::string value(shift, 'a');
      while (value.size() < 200'000)
      {
        value.append(character.begin(), character.end());
      }
      const Bytes bytes = test::bytesOfJson(R"({"system": {"hostName": ")" + value + "\"}}");
      const std::string text = jsonOf(bytes, {}, {.style = JsonStyle::compact});
      EXPECT_TRUE(isUtf8(text));
      EXPECT_EQ(text.find("\\u"), std::string::npos) << "all of it can stand as it is";
      EXPECT_EQ(test::bytesOfJson(text), bytes);
    }
  }
}
