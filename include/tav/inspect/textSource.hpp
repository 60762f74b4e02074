/// @file textSource.hpp
/// The text of a document, from front to back.
#pragma once

#include <cstdint>
#include <span>
#include <streambuf>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tav/inspect/api.hpp"

namespace tav::inspect
{

/// A text that knows where it is being read. Used by one thread.
class TAV_INSPECT_API TextSource : public std::streambuf
{
public:
  /// `name` is how messages call it.
  explicit TextSource(std::string name);
  ~TextSource() override;
  TextSource(const TextSource&) = delete;
  TextSource& operator=(const TextSource&) = delete;

  const std::string& name() const { return name_; }
  uint64_t position() const { return base_ + static_cast<uint64_t>(gptr() - eback()); }
  uint64_t line() const;
  /// What comes next, as far as it is at hand; nothing when that has to be fetched first, and at the end of the text.
  std::string_view atHand() const { return {gptr(), static_cast<size_t>(egptr() - gptr())}; }
  /// Goes past characters that are at hand.
  void skip(size_t count) { gbump(static_cast<int>(count)); }
  /// Skips blanks; false at the end of the text.
  bool skipBlanks();

protected:
  /// Copies what comes next, at least one byte unless the text has ended. Throws Error.
  virtual size_t fetch(std::span<char> to) = 0;

  int_type underflow() override;

private:
  std::string name_;
  uint64_t base_ = 0;
  uint64_t lines_ = 0; ///< before the buffer
  std::vector<char> buffer_;
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
