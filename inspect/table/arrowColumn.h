/// A table's columns as Arrow has them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "inspect/table/chunk.h"
#include "tav/inspect/arrow.hpp"

namespace tav::inspect
{

/// The different texts of a column, in the order in which they came.
class TextNumbers
{
public:
  /// The number of a text; made where there is none.
  uint32_t numberOf(const std::string& text)
  {
    const auto [found, isNew] = numbers_.try_emplace(text, static_cast<uint32_t>(texts_.size()));
    if (isNew)
    {
      texts_.push_back(found->first);
      bytes_ += text.size();
    }
    return found->second;
  }
  uint32_t known(const std::string& text) const { return numbers_.find(text)->second; }
  const std::vector<std::string_view>& texts() const { return texts_; }
  uint64_t bytes() const { return bytes_; }

private:
  std::unordered_map<std::string, uint32_t> numbers_{};
  std::vector<std::string_view> texts_{}; ///< which stay where they are in the map
  uint64_t bytes_ = 0;
};

/// A run of a table's rows.
struct RowRun
{
  const TableChunk* chunk;
  size_t first;
  size_t count;
};

class ArrowColumn
{
public:
  ArrowColumn(const Table& table, size_t column, bool dictionaries);

  /// Fill what is to be released by its `release`.
  void schema(ArrowSchema& out) const;
  void array(const std::vector<RowRun>& rows, ArrowArray& out) const;

private:
  enum class Layout : uint8_t
  {
    words,   ///< 64 bits each
    decimal, ///< 128 bits each
    texts,
    bytes,
    numbers ///< of texts in the dictionary
  };

  void chooseText(const Table& table, bool dictionaries);
  std::string textOf(const TableChunk& chunk, size_t row) const;
  void fillWords(const std::vector<RowRun>& rows, std::vector<uint8_t>& out) const;
  void fillDecimals(const std::vector<RowRun>& rows, std::vector<uint8_t>& out) const;
  void fillNumbers(const std::vector<RowRun>& rows, std::vector<uint8_t>& out) const;
  template<class Offset>
  void fillTexts(const std::vector<RowRun>& rows, std::vector<uint8_t>& offsets, std::vector<uint8_t>& out) const;
  void dictionary(ArrowArray& out) const;

  size_t column_;
  std::string name_;
  std::string format_{};
  Layout layout_ = Layout::words;
  bool large_ = false; ///< offsets have 64 bits
  std::shared_ptr<const TextNumbers> numbers_{};
};

/// The structure of a schema or of a batch. Children and a dictionary are filled afterwards, and released with it.
void makeSchema(ArrowSchema& out, std::string name, std::string format, size_t children, bool hasDictionary);
/// `buffers`: the first is the bitmap of those that are there; empty when all are.
void makeArray(ArrowArray& out, uint64_t length, uint64_t missing, std::vector<std::vector<uint8_t>> buffers,
               size_t children, bool hasDictionary);

} // namespace tav::inspect
