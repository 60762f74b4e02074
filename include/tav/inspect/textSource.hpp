/// @file textSource.hpp
/// The text of a document, from front to back.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tav/inspect/api.hpp"

namespace tav::inspect
{

/// A text that knows where it is being read. Used by one thread.
class TAV_INSPECT_API TextSource
{
public:
  static constexpr int kEnd = -1; ///< in the place of a character behind the last one

  /// `name` is how messages call it.
  explicit TextSource(std::string name);
  virtual ~TextSource();
  TextSource(const TextSource&) = delete;
  TextSource& operator=(const TextSource&) = delete;

  const std::string& name() const { return name_; }
  uint64_t position() const { return base_ + at_; }
  uint64_t line() const;
  /// The next character, 0 to 255, or kEnd.
  int peek() { return at_ < end_ || fetchMore() ? static_cast<unsigned char>(buffer_[at_]) : kEnd; }
  /// The same, and goes past it.
  int take()
  {
    const int character = peek();
    at_ += character == kEnd ? 0 : 1;
    return character;
  }
  /// What comes next, as far as it is at hand; nothing when that has to be fetched first, and at the end of the text.
  std::string_view atHand() const { return {buffer_.data() + at_, end_ - at_}; }
  /// Goes past characters that are at hand.
  void skip(size_t count) { at_ += count; }
  /// Skips blanks; false at the end of the text.
  bool skipBlanks();

protected:
  /// Copies what comes next, at least one byte unless the text has ended. Throws Error.
  virtual size_t fetch(std::span<char> to) = 0;

private:
  bool fetchMore();

  std::string name_;
  uint64_t base_ = 0;
  uint64_t lines_ = 0; ///< before the buffer
  std::vector<char> buffer_;
  size_t at_ = 0;  ///< in the buffer
  size_t end_ = 0; ///< of what is in it
};

/// A text in memory, which outlives this object.
class TAV_INSPECT_API MemoryText final : public TextSource
{
public:
  MemoryText(std::string name, std::string_view text)
      : TextSource(std::move(name)), rest_(text) {}

protected:
  size_t fetch(std::span<char> to) override;

private:
  std::string_view rest_;
};

} // namespace tav::inspect
