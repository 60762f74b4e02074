/// Reads a dictionary file.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "inspect/json/parser.h"
#include "tav/inspect/dictionary.hpp"

namespace tav::inspect
{

/// The elements that one text gives. The text is kept, as what is wrong may be behind what is read.
class DictionaryReader final : private JsonHandler
{
public:
  /// `name` is how messages call the text, which outlives this object.
  DictionaryReader(const std::string& name, std::string_view text)
      : name_(name), text_(text), source_(name, text) {}

  /// Throws Error with line and column.
  std::vector<OwnElement> read();

private:
  void null() override { refuse(); }
  void boolean(bool) override { refuse(); }
  void integer(std::string_view) override { refuse(); }
  void fraction(std::string_view) override { refuse(); }
  void string(std::string_view text) override;
  void startObject() override;
  void key(std::string_view name) override;
  void endObject() override;
  void startArray() override { refuse(); }
  void endArray() override {}

  [[noreturn]] void refuse() const;
  [[noreturn]] void fail(size_t at, const std::string& sentence) const;
  size_t tokenStart() const;
  std::string placeOf(size_t at) const;
  std::string nextPlace(size_t at);
  void startElement(std::string_view id);
  void setKind(std::string_view name);
  void endElement();

  /// A place in the text, as people count it.
  struct Place
  {
    size_t at = 0;
    size_t line = 1;
    size_t column = 1;
  };
  void goTo(size_t at, Place& place) const;
  std::string textOf(const Place& place) const;

  const std::string& name_;
  std::string_view text_;
  Place reached_{}; ///< the last element, so that a long text is counted once
  MemoryText source_;
  size_t behind_ = 0; ///< the last piece of JSON
  size_t depth_ = 0;
  std::string key_{};               ///< within an element
  std::vector<std::string> seen_{}; ///< keys of the element so far
  OwnElement element_{};
  size_t elementAt_ = 0;
  size_t tagAt_ = 0;
  std::vector<OwnElement> elements_{};
  std::unordered_map<uint16_t, std::string> ids_{};     ///< and where they are given
  std::unordered_map<std::string, std::string> tags_{}; ///< likewise
};

} // namespace tav::inspect
