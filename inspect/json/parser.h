/// @file parser.h
/// Takes a JSON text apart, piece after piece, without keeping it. RFC 8259, to the letter.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "tav/inspect/textSource.hpp"

namespace tav::inspect
{

/// Why a text is no JSON; the reading position is behind the place.
struct JsonSyntaxError : std::runtime_error
{
  using std::runtime_error::runtime_error;
};

/// Is told what a JSON text consists of, in texts that are valid during the call. What it throws ends the parsing.
class JsonHandler
{
public:
  virtual ~JsonHandler() = default;
  virtual void null() = 0;
  virtual void boolean(bool value) = 0;
  virtual void integer(std::string_view digits) = 0; ///< of any length, without "-0"
  virtual void fraction(std::string_view text) = 0;  ///< a number with a point or an exponent, as it is written
  virtual void string(std::string_view text) = 0;    ///< UTF-8
  virtual void startObject() = 0;
  virtual void key(std::string_view name) = 0; ///< comes before each value of an object
  virtual void endObject() = 0;
  virtual void startArray() = 0;
  virtual void endArray() = 0;
};

/// Memory grows with the depth, a bit a level, and with the longest single text.
class JsonParser
{
public:
  JsonParser(TextSource& text, JsonHandler& handler)
      : text_(text), handler_(handler) {}

  /// Reads one value with all that is in it, and the blanks before it. Throws JsonSyntaxError.
  void parseValue();

private:
  bool startValue();
  bool endContainers();
  void startContainer(bool object);
  void endContainer();
  void readKey();
  template<class Belongs>
  void take(Belongs belongs);
  void readString();
  void readEscape();
  uint32_t readHex4();
  void readNumber();
  void readDigits();
  void readWord(const char* word);
  int peek() { return text_.peek(); }
  int peekBehind()
  {
    text_.take();
    return peek();
  }
  int peekBehindBlanks();
  [[noreturn]] void fail(const std::string& expected);

  TextSource& text_;
  JsonHandler& handler_;
  std::string token_{};         ///< the text or number that was read last
  std::vector<bool> objects_{}; ///< of each open container: whether it is an object
};

} // namespace tav::inspect
