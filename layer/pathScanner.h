/// @file pathScanner.h
/// The characters of a path, one token after the other, and what is wrong with them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>
#include <utility>

#include "tav/path/decimal.hpp"
#include "tav/path/path.hpp"

namespace tav::detail::paths
{

class Scanner
{
public:
  Scanner(std::string_view text, PathFault& fault) noexcept
      : text_(text), fault_(fault)
  {
  }

protected:
  [[nodiscard]] char peek(size_t ahead = 0) const noexcept
  {
    return at_ + ahead < text_.size() ? text_[at_ + ahead] : '\0';
  }
  void passBlanks() noexcept
  {
    while (at_ < text_.size() && isBlank(text_[at_]))
    {
      ++at_;
    }
  }
  bool take(std::string_view token) noexcept
  {
    passBlanks();
    const bool found = text_.substr(at_).starts_with(token);
    at_ += found ? token.size() : 0;
    return found;
  }
  static bool beginsName(char c) noexcept
  {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_' || static_cast<uint8_t>(c) >= 0x80;
  }
  static bool isInName(char c) noexcept
  {
    return beginsName(c) || isDigit(c) || c == '-' || c == '.';
  }
  /// A name from here on; with stars, of a pattern. Empty when there is none.
  std::string_view takeName(bool stars) noexcept
  {
    const size_t from = at_;
    const auto fits = [stars](char c, bool first) {
      return (stars && c == '*') || (first ? beginsName(c) : isInName(c));
    };
    while (at_ < text_.size() && fits(text_[at_], at_ == from))
    {
      ++at_;
    }
    return text_.substr(from, at_ - from);
  }
  std::string_view takeDigits() noexcept
  {
    const size_t from = at_;
    while (isDigit(peek()))
    {
      ++at_;
    }
    return text_.substr(from, at_ - from);
  }
  /// `and` or `or`, where an operand has ended.
  bool takeWord(std::string_view word) noexcept
  {
    passBlanks();
    const bool found = text_.substr(at_).starts_with(word) && !isInName(peek(word.size()));
    at_ += found ? word.size() : 0;
    return found;
  }

  // Faults: the first is told; that it is no path at all goes before a name that no element has.

  /// A sentence in pieces.
  [[gnu::noinline, gnu::cold]] bool fail(size_t at, std::initializer_list<std::string_view> pieces)
  {
    std::string sentence;
    for (const std::string_view piece : pieces)
    {
      sentence += piece;
    }
    tell(PathFault::Kind::malformed, at, std::move(sentence));
    return false;
  }
  [[gnu::noinline, gnu::cold]] bool fail(size_t at, std::string_view sentence) { return fail(at, {sentence}); }
  [[gnu::noinline, gnu::cold]] void tell(PathFault::Kind kind, size_t at, std::string sentence)
  {
    size_t column = 1;
    for (const char c : text_.substr(0, at))
    {
      column += (static_cast<uint8_t>(c) & 0xC0U) != 0x80U ? 1 : 0;
    }
    fault_ = {kind, column, std::move(sentence), {}};
  }
  /// What is here continues no path.
  [[gnu::noinline, gnu::cold]] bool failHere()
  {
    passBlanks();
    if (at_ >= text_.size())
    {
      return fail(at_, "the path ends too early");
    }
    size_t end = at_ + 1;
    while (end < text_.size() && (static_cast<uint8_t>(text_[end]) & 0xC0U) == 0x80U)
    {
      ++end;
    }
    return fail(at_, {"'", text_.substr(at_, end - at_), "' does not belong here"});
  }
  static std::string quoted(std::string_view text)
  {
    constexpr size_t most = 80;
    std::string quoted = "'";
    quoted += text.substr(0, most);
    quoted += text.size() > most ? "...'" : "'";
    return quoted;
  }

  std::string_view text_;
  PathFault& fault_;
  size_t at_ = 0;
};

} // namespace tav::detail::paths
