/// The nodes of streams as rows, column by column.
#pragma once

#include <array>
#include <bit>
#include <cstdint>
#include <cstdlib>
#include <new>
#include <string>
#include <vector>

#include "python/src/reader.h"

namespace tav::python
{

/// Plain values one behind the other, which are not cleared before they are written.
template<class T>
class Column
{
public:
  Column() = default;
  Column(const Column&) = delete;
  Column& operator=(const Column&) = delete;
  ~Column() { std::free(items_); }

  void reserve(size_t room)
  {
    auto* const larger = static_cast<T*>(std::realloc(items_, room * sizeof(T)));
    if (larger == nullptr)
    {
      throw std::bad_alloc();
    }
    items_ = larger;
  }
  T& operator[](size_t at) { return items_[at]; }
  const T& operator[](size_t at) const { return items_[at]; }
  T* data() { return items_; }

private:
  T* items_ = nullptr;
};

/// Which of the value's columns a row has.
enum class Kind : uint8_t
{
  none,
  number,
  wide, ///< a number that 64 bits do not hold
  text,
  time,
  bytes
};

/// Rows of nodes. What does not fit a word is left in the stream, which stays as long as the rows.
class Rows
{
public:
  static constexpr int64_t kNoTime = INT64_MIN; // NumPy's NaT

  explicit Rows(std::shared_ptr<Opened> opened)
      : opened_(std::move(opened)) {}

  /// Walks all streams. Called without the interpreter.
  void fill(inspect::ByteSource& source, bool withPaths, Pass& pass);

  size_t count() const { return count_; }
  /// A value that is left in the stream: of a row of kind wide, text or bytes.
  tav::detail::RawValue rest(size_t row) const;

  Column<int64_t> parent{};
  Column<uint32_t> depth{};
  Column<uint64_t> offset{};
  Column<uint64_t> size{};
  Column<uint16_t> id{};
  Column<uint16_t> type{};
  Column<uint16_t> key{};
  Column<Kind> kind{};
  Column<uint64_t> number{}; ///< of a negative number its two's complement
  Column<int64_t> time{};    ///< nanoseconds since 1970
  std::vector<size_t> texts{};
  std::vector<size_t> bytes{};
  std::vector<std::string> paths{};
  bool hasNegative = false;
  bool hasUpper = false; ///< numbers that only unsigned 64 bits hold
  bool hasWide = false;

private:
  struct Rest
  {
    const uint8_t* payload;
    bool swapped;
  };

  void grow();
  void add(const Step& step, int64_t parentRow, bool swapped);
  Kind classify(const tav::detail::RawValue& raw, size_t row);
  template<class Number>
  Kind takeNumber(const tav::detail::RawValue& raw, size_t row);
  Kind takeTime(const tav::detail::RawValue& raw, size_t row);

  std::shared_ptr<Opened> opened_;
  size_t count_ = 0;
  size_t room_ = 0;
  Column<uint32_t> place_{}; ///< of the rest
  std::vector<Rest> rests_{};
};

} // namespace tav::python
