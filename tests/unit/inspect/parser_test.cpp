#include <random>
#include <string>
#include <string_view>
#include <utility>

#include <gmock/gmock.h>
#include <nlohmann/json.hpp>

#include "inspect/json/parser.h"

using namespace tav::inspect;

namespace
{

/// Writes down what it is told, in the order in which it comes.
class Notes final : public JsonHandler
{
public:
  void null() override { text += "null "; }
  void boolean(bool value) override { text += value ? "true " : "false "; }
  void integer(std::string_view digits) override { text += "i" + std::string(digits) + " "; }
  void fraction(std::string_view given) override { text += "f" + std::string(given) + " "; }
  void string(std::string_view given) override { text += "'" + std::string(given) + "' "; }
  void startObject() override { text += "{ "; }
  void key(std::string_view name) override { text += std::string(name) + ": "; }
  void endObject() override { text += "} "; }
  void startArray() override { text += "[ "; }
  void endArray() override { text += "] "; }

  std::string text;
};

/// What a handler is told of a text; "" and the reason when it is no JSON.
std::pair<std::string, std::string> parsed(const std::string& text)
{
  MemoryText buffer("text", text);
  Notes notes;
  try
  {
    JsonParser parser(buffer, notes);
    parser.parseValue();
  }
  catch (const JsonSyntaxError& error)
  {
    return {"", error.what()};
  }
  return {notes.text, ""};
}

struct Case
{
  const char* text;
  const char* told;
};

struct Refusal
{
  const char* text;
  const char* reason;
};

/// Whether a text is one JSON value and nothing else.
bool isAccepted(const std::string& text)
{
  MemoryText buffer("text", text);
  Notes notes;
  try
  {
    JsonParser(buffer, notes).parseValue();
  }
  catch (const JsonSyntaxError&)
  {
    return false;
  }
  return !buffer.skipBlanks();
}

} // namespace

class JsonText : public testing::TestWithParam<Case>
{
};

TEST_P(JsonText, IsToldPieceByPiece)
{
  const auto [told, reason] = parsed(GetParam().text);
  EXPECT_EQ(told, GetParam().told) << reason;
}

INSTANTIATE_TEST_SUITE_P(
    Table, JsonText,
    testing::Values(Case{"null", "null "}, Case{" true ", "true "}, Case{"false", "false "}, Case{"0", "i0 "},
                    Case{"-0", "i0 "}, Case{"-17", "i-17 "},
                    Case{"340282366920938463463374607431768211455", "i340282366920938463463374607431768211455 "},
                    Case{"1.50", "f1.50 "}, Case{"1e3", "f1e3 "}, Case{"-2.5E-7", "f-2.5E-7 "}, Case{"\"\"", "'' "},
                    Case{"\"a\\\"\\\\\\/\\b\\f\\n\\r\\t\"", "'a\"\\/\b\f\n\r\t' "}, Case{"\"\\u00e9\"", "'\xC3\xA9' "},
                    Case{"\"\\u20AC\"", "'\xE2\x82\xAC' "}, Case{"\"\\uD834\\uDD1E\"", "'\xF0\x9D\x84\x9E' "},
                    Case{"[]", "[ ] "}, Case{"{}", "{ } "},
                    Case{"[1,[2,{}],{\"a\":[]}]", "[ i1 [ i2 { } ] { a: [ ] } ] "},
                    Case{"{\"a\" : 1 , \"a\" : {\"b\":null}}", "{ a: i1 a: { b: null } } "}));

class NoJsonText : public testing::TestWithParam<Refusal>
{
};

TEST_P(NoJsonText, IsRefusedWithWhatWasExpected)
{
  const auto [told, reason] = parsed(GetParam().text);
  EXPECT_EQ(told, "");
  EXPECT_THAT(reason, testing::HasSubstr(GetParam().reason));
}

INSTANTIATE_TEST_SUITE_P(
    Table, NoJsonText,
    testing::Values(Refusal{"", "the text ends where a value"}, Refusal{"nul", "the text ends where the word null"},
                    Refusal{"tru e", "the word true"}, Refusal{"+1", "\"+\" stands where a value"},
                    Refusal{"-", "a digit"}, Refusal{"1.", "a digit"}, Refusal{"1e", "a digit"},
                    Refusal{".5", "a value"}, Refusal{"[1 2]", "a comma or the end of the array"},
                    Refusal{"[1,]", "a value"}, Refusal{"{\"a\":1,}", "a key"}, Refusal{"{\"a\" 1}", "a colon"},
                    Refusal{"{1:2}", "a key"}, Refusal{"{\"a\":1]", "the end of the object"},
                    Refusal{"\"a", "the end of a string"}, Refusal{"\"a\nb\"", "control characters"},
                    Refusal{"\"\\x\"", "an escape"}, Refusal{"\"\\u12g4\"", "a hexadecimal digit"},
                    Refusal{"\"\\ud800\"", "surrogate"}, Refusal{"\"\\ud800\\u0041\"", "surrogate"},
                    Refusal{"\"\\udc00\"", "surrogate"}, Refusal{"\"\xFF\"", "no UTF-8"},
                    Refusal{"\"\xC0\xAF\"", "no UTF-8"}, Refusal{"\"\xED\xA0\x80\"", "no UTF-8"},
                    Refusal{"'a'", "a value"}, Refusal{"// c\n1", "a value"}));

TEST(JsonParser, ReadsOneValueAndLeavesWhatStandsBehindIt)
{
  MemoryText buffer("text", "[1] {\"a\": 2}");
  Notes notes;
  JsonParser parser(buffer, notes);
  parser.parseValue();
  EXPECT_EQ(notes.text, "[ i1 ] ");
  parser.parseValue();
  EXPECT_EQ(notes.text, "[ i1 ] { a: i2 } ");
}

TEST(JsonParser, TakesAMillionLevelsWithoutRecursion)
{
  constexpr size_t depth = 1'000'000;
  const std::string text = std::string(depth, '[') + std::string(depth, ']');
  MemoryText buffer("text", text);
  Notes notes;
  JsonParser(buffer, notes).parseValue();
  EXPECT_EQ(notes.text.size(), depth * 4);
}

TEST(JsonParser, AcceptsWhatAnotherParserAccepts)
{
  static constexpr std::string_view pieces[] = {"{", "}", "[", "]", ",", ":", "\"a\"", "\"\\n\"", "1",
                                                "-0.5", "1e-9", "00", "nan", " ", "\n", "null", "true", "\"",
                                                "\\", "\\u0", "\x7F", "\x01", "0x1", "\xC3\xA9", "-", "E"};
  std::mt19937 random(20);
  size_t accepted = 0;
  for (int i = 0; i < 200'000; ++i)
  {
    std::string text;
    for (size_t n = 1 + random() % 7; n != 0; --n)
    {
      text += pieces[random() % std::size(pieces)];
    }
    const bool expected = nlohmann::json::accept(text);
    ASSERT_EQ(isAccepted(text), expected) << text;
    accepted += expected ? 1 : 0;
  }
  EXPECT_GT(accepted, 5000U);
}
