/// @file json.h
/// Answers of the module: JSON text, built piece by piece.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "tav/inspect.hpp"

namespace tav::web
{

/// Writes one JSON value. Keys and items come in the order in which they are put; commas are its business.
class Json
{
public:
  Json& begin(char bracket)
  {
    separate();
    text_ += bracket;
    first_ = true;
    return *this;
  }

  Json& end(char bracket)
  {
    text_ += bracket;
    first_ = false;
    return *this;
  }

  Json& key(std::string_view name)
  {
    separate();
    inspect::appendJsonString(text_, name);
    text_ += ':';
    first_ = true;
    return *this;
  }

  /// Offsets and sizes are numbers as far as those of the page are exact, which is 8 PiB; others are texts.
  Json& number(uint64_t value)
  {
    constexpr uint64_t exact = uint64_t{1} << 53U;
    separate();
    const std::string digits = std::to_string(value);
    text_ += value < exact ? digits : '"' + digits + '"';
    return *this;
  }

  Json& boolean(bool value)
  {
    separate();
    text_ += value ? "true" : "false";
    return *this;
  }

  Json& null()
  {
    separate();
    text_ += "null";
    return *this;
  }

  /// A text of any bytes: those that are no UTF-8 are escapes.
  Json& string(std::string_view value)
  {
    separate();
    if (inspect::isUtf8(value))
    {
      inspect::appendJsonString(text_, value);
    }
    else
    {
      inspect::appendJsonString(text_, inspect::forTerminal(value));
    }
    return *this;
  }

  Json& field(std::string_view name, uint64_t value) { return key(name).number(value); }
  Json& field(std::string_view name, std::string_view value) { return key(name).string(value); }
  Json& field(std::string_view name, const char* value) { return key(name).string(value); }
  Json& flag(std::string_view name, bool value) { return key(name).boolean(value); }

  const std::string& text() const { return text_; }
  void clear()
  {
    text_.clear();
    first_ = true;
  }

private:
  void separate()
  {
    if (!first_)
    {
      text_ += ',';
    }
    first_ = false;
  }

  std::string text_{};
  bool first_ = true;
};

} // namespace tav::web
