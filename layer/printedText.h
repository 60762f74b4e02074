/// Text on its way to a stream of the C library.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <memory>
#include <string_view>
#include <utility>

namespace tav::detail
{

/// Appends as std::string does, but in the caller's code: most pieces of a print are a few characters long, for which a
/// call costs more than the copy.
class PrintedText
{
public:
  [[nodiscard]] const char* data() const noexcept
  {
    return text_.get();
  }
  [[nodiscard]] size_t size() const noexcept
  {
    return size_;
  }
  void clear() noexcept
  {
    size_ = 0;
  }

  PrintedText& append(const char* piece, size_t length)
  {
    char* const to = take(length);
    if (length != 0)
    {
      std::memcpy(to, piece, length);
    }
    return *this;
  }
  PrintedText& append(std::string_view piece)
  {
    return append(piece.data(), piece.size());
  }
  PrintedText& append(size_t count, char c)
  {
    std::fill_n(take(count), count, c);
    return *this;
  }
  PrintedText& operator+=(std::string_view piece)
  {
    return append(piece);
  }
  PrintedText& operator+=(char c)
  {
    *take(1) = c;
    return *this;
  }

private:
  /// The place of what comes next.
  char* take(size_t length)
  {
    if (length > capacity_ - size_) [[unlikely]]
    {
      grow(length);
    }
    char* const place = text_.get() + size_;
    size_ += length;
    return place;
  }

  [[gnu::noinline]] void grow(size_t length)
  {
    constexpr size_t least = size_t{64} * 1024;
    const size_t capacity = std::max(least, 2 * (size_ + length));
    std::unique_ptr<char[]> larger(new char[capacity]);
    if (size_ != 0)
    {
      std::memcpy(larger.get(), text_.get(), size_);
    }
    text_ = std::move(larger);
    capacity_ = capacity;
  }

  std::unique_ptr<char[]> text_;
  size_t size_ = 0;
  size_t capacity_ = 0;
};

} // namespace tav::detail
