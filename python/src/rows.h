/// The nodes of streams as rows, column by column.
#pragma once

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <new>
#include <string>
#include <vector>

#include "python/src/reader.h"

namespace tav::python
{

/// The values of a column, in the rows' block.
template<class T>
class Column
{
public:
  T& operator[](size_t at) { return items_[at]; }
  const T& operator[](size_t at) const { return items_[at]; }
  T* data() { return items_; }

  /// Goes on in a new block, behind what is there already; keeps its first values.
  void move(uint8_t*& place, size_t room, size_t count)
  {
    auto* const items = reinterpret_cast<T*>(place);
    if (count != 0)
    {
      std::memcpy(items, items_, count * sizeof(T));
    }
    items_ = items;
    place += room * sizeof(T);
  }

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
  Rows(const Rows&) = delete;
  Rows& operator=(const Rows&) = delete;
  ~Rows() { std::free(block_); }

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
  template<class Use>
  void eachColumn(const Use& use);
  void add(const Step& step, int64_t parentRow, bool swapped);
  Kind classify(const tav::detail::RawValue& raw, size_t row);
  template<class Number>
  Kind takeNumber(const tav::detail::RawValue& raw, size_t row);
  Kind takeTime(const tav::detail::RawValue& raw, size_t row);

  std::shared_ptr<Opened> opened_;
  size_t count_ = 0;
  size_t room_ = 0;
  uint8_t* block_ = nullptr; ///< of all columns: one, which the allocator keeps at hand for the next rows
  Column<uint32_t> place_{}; ///< of the rest
  std::vector<Rest> rests_{};
};

} // namespace tav::python
