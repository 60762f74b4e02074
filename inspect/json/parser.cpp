#include "inspect/json/parser.h"

#include <algorithm>
#include <array>

#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

bool isDigit(int c)
{
  return c >= '0' && c <= '9';
}

/// Characters of a string that stand for themselves.
constexpr auto kPlain = []() {
  std::array<bool, 256> table{};
  for (size_t byte = 0x20; byte < table.size(); ++byte)
  {
    table[byte] = byte != '"' && byte != '\\';
  }
  return table;
}();

void appendUtf8(std::string& text, uint32_t point)
{
  const auto put = [&text](uint32_t byte) { text += static_cast<char>(byte); };
  if (point < 0x80)
  {
    put(point);
    return;
  }
  if (point < 0x800)
  {
    put(0xC0 | point >> 6);
  }
  else if (point < 0x10000)
  {
    put(0xE0 | point >> 12);
    put(0x80 | (point >> 6 & 0x3F));
  }
  else
  {
    put(0xF0 | point >> 18);
    put(0x80 | (point >> 12 & 0x3F));
    put(0x80 | (point >> 6 & 0x3F));
  }
  put(0x80 | (point & 0x3F));
}

} // namespace

void JsonParser::fail(const std::string& expected)
{
  const int found = peek();
  std::string text = "the text ends";
  if (found != TextSource::kEnd)
  {
    const char character = static_cast<char>(found);
    text = quoted(std::string_view(&character, 1)) + " stands";
  }
  throw JsonSyntaxError(text + " where " + expected + " is expected");
}

int JsonParser::peekBehindBlanks()
{
  text_.skipBlanks();
  return peek();
}

void JsonParser::parseValue()
{
  while (startValue() || endContainers())
  {
  }
}

/// Reads what begins with a value's first character; true when a container began and its first value is to be read.
bool JsonParser::startValue()
{
  switch (peekBehindBlanks())
  {
  case '{':
    startContainer(true);
    if (peekBehindBlanks() == '}')
    {
      endContainer();
      return false;
    }
    readKey();
    return true;
  case '[':
    startContainer(false);
    if (peekBehindBlanks() == ']')
    {
      endContainer();
      return false;
    }
    return true;
  case '"':
    readString();
    handler_.string(token_);
    return false;
  case 'n':
    readWord("null");
    handler_.null();
    return false;
  case 't':
    readWord("true");
    handler_.boolean(true);
    return false;
  case 'f':
    readWord("false");
    handler_.boolean(false);
    return false;
  default: readNumber(); return false;
  }
}

/// Behind a value: ends the containers that end here; true when another value follows.
bool JsonParser::endContainers()
{
  while (!objects_.empty())
  {
    const bool object = objects_.back();
    const int c = peekBehindBlanks();
    if (c == ',')
    {
      text_.take();
      if (object)
      {
        readKey();
      }
      return true;
    }
    if (c != (object ? '}' : ']'))
    {
      fail(object ? "a comma or the end of the object" : "a comma or the end of the array");
    }
    endContainer();
  }
  return false;
}

void JsonParser::startContainer(bool object)
{
  text_.take();
  objects_.push_back(object);
  object ? handler_.startObject() : handler_.startArray();
}

void JsonParser::endContainer()
{
  text_.take();
  const bool object = objects_.back();
  objects_.pop_back();
  object ? handler_.endObject() : handler_.endArray();
}

void JsonParser::readKey()
{
  if (peekBehindBlanks() != '"')
  {
    fail("a key");
  }
  readString();
  handler_.key(token_); // here, so that what is said of a key gives its place
  if (peekBehindBlanks() != ':')
  {
    fail("a colon");
  }
  text_.take();
}

/// Appends the characters that belong to a token to it, and goes past them.
template<class Belongs>
void JsonParser::take(Belongs belongs)
{
  for (bool more = true; more && peek() != TextSource::kEnd;)
  {
    const std::string_view bytes = text_.atHand();
    const auto end = std::find_if_not(bytes.begin(), bytes.end(), belongs);
    token_.append(bytes.begin(), end);
    text_.skip(static_cast<size_t>(end - bytes.begin()));
    more = end == bytes.end();
  }
}

void JsonParser::readString()
{
  text_.take();
  token_.clear();
  const auto plain = [](char c) { return kPlain[static_cast<uint8_t>(c)]; };
  for (take(plain); peek() != '"'; take(plain))
  {
    if (peek() != '\\') // a control character, or the end
    {
      fail(peek() == TextSource::kEnd ? "the end of a string"
                                      : "a character of a string; control characters are written as \\u00..");
    }
    text_.take();
    readEscape();
  }
  text_.take();
  if (!isUtf8(token_))
  {
    throw JsonSyntaxError("a string is no UTF-8");
  }
}

void JsonParser::readEscape()
{
  static constexpr std::string_view letters = "\"\\/bfnrt";
  static constexpr std::string_view characters = "\"\\/\b\f\n\r\t";
  const int c = peek();
  constexpr size_t none = std::string_view::npos;
  if (const size_t at = c == TextSource::kEnd ? none : letters.find(static_cast<char>(c)); at != none)
  {
    text_.take();
    token_ += characters[at];
    return;
  }
  if (c != 'u')
  {
    fail("an escape");
  }
  text_.take();
  uint32_t point = readHex4();
  if (point >= 0xD800 && point < 0xDC00)
  {
    if (peek() != '\\' || peekBehind() != 'u')
    {
      fail("the second half of a surrogate pair");
    }
    text_.take();
    const uint32_t low = readHex4();
    if (low < 0xDC00 || low >= 0xE000)
    {
      fail("the second half of a surrogate pair before this");
    }
    point = 0x10000 + ((point - 0xD800) << 10) + (low - 0xDC00);
  }
  else if (point >= 0xDC00 && point < 0xE000)
  {
    fail("the first half of a surrogate pair before this");
  }
  appendUtf8(token_, point);
}

uint32_t JsonParser::readHex4()
{
  uint32_t value = 0;
  for (int i = 0; i < 4; ++i)
  {
    const int c = peek();
    const bool small = c >= 'a' && c <= 'f';
    if (!isDigit(c) && !small && !(c >= 'A' && c <= 'F'))
    {
      fail("a hexadecimal digit");
    }
    const int digit = isDigit(c) ? c - '0' : c - (small ? 'a' : 'A') + 10;
    value = value << 4 | static_cast<uint32_t>(digit);
    text_.take();
  }
  return value;
}

void JsonParser::readDigits()
{
  if (!isDigit(peek()))
  {
    fail("a digit");
  }
  take([](char c) { return isDigit(c); });
}

void JsonParser::readNumber()
{
  token_.clear();
  const auto takeOne = [&] { token_ += static_cast<char>(text_.take()); };
  if (const int c = peek(); c != '-' && !isDigit(c))
  {
    fail("a value");
  }
  if (peek() == '-')
  {
    takeOne();
  }
  if (peek() == '0')
  {
    takeOne();
  }
  else
  {
    readDigits();
  }
  bool whole = true;
  if (peek() == '.')
  {
    whole = false;
    takeOne();
    readDigits();
  }
  if (peek() == 'e' || peek() == 'E')
  {
    whole = false;
    takeOne();
    if (peek() == '+' || peek() == '-')
    {
      takeOne();
    }
    readDigits();
  }
  if (!whole)
  {
    handler_.fraction(token_);
    return;
  }
  handler_.integer(token_ == "-0" ? std::string_view("0") : token_);
}

void JsonParser::readWord(const char* word)
{
  for (const char* letter = word; *letter != '\0'; ++letter)
  {
    if (peek() != *letter)
    {
      fail(std::string("the word ") + word);
    }
    text_.take();
  }
}

} // namespace tav::inspect
