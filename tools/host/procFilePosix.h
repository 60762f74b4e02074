/// @file procFilePosix.h
/// Files in which the system tells of itself, as those below /proc.
#pragma once

#include <charconv>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tav::host
{
/// The whole of a file, empty when it cannot be read.
std::string contentOf(const char* path);
/// The same in a folder that is open, by its descriptor.
std::string contentOf(const char* path, int folder);

/// Takes words, which blanks separate, and lines from the front of a text.
class Words
{
public:
  explicit Words(std::string_view text)
      : text_(text) {}

  bool nextLine(Words& line)
  {
    if (text_.empty())
    {
      return false;
    }
    const size_t end = text_.find('\n');
    line = Words(text_.substr(0, end));
    text_.remove_prefix(end == std::string_view::npos ? text_.size() : end + 1);
    return true;
  }
  std::string_view next()
  {
    const size_t begin = text_.find_first_not_of(" \t");
    text_.remove_prefix(begin == std::string_view::npos ? text_.size() : begin);
    const std::string_view word = text_.substr(0, text_.find_first_of(" \t\n"));
    text_.remove_prefix(word.size());
    return word;
  }
  std::optional<uint64_t> number()
  {
    const std::string_view word = next();
    uint64_t value = 0;
    const auto [end, failure] = std::from_chars(word.data(), word.data() + word.size(), value);
    return failure == std::errc() ? std::optional<uint64_t>(value) : std::nullopt;
  }
  void skip(unsigned count)
  {
    while (count-- != 0) next();
  }

private:
  std::string_view text_;
};

/// The number behind a word at the start of a line.
inline std::optional<uint64_t> numberAfter(const std::string& text, std::string_view word)
{
  Words lines(text);
  for (Words line{{}}; lines.nextLine(line);)
    if (line.next() == word)
    {
      return line.number();
    }
  return std::nullopt;
}

inline std::optional<uint64_t> times(std::optional<uint64_t> number, uint64_t factor)
{
  if (number)
  {
    *number *= factor;
  }
  return number;
}
} // namespace tav::host
