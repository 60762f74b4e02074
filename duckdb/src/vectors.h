/// Columns of the engine's chunks as they are filled.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <string_view>

#include "duckdb/src/engine.h"
#include "tav/inspect/value.hpp"

namespace tav::sql
{

/// One column of a chunk.
class Vector
{
public:
  Vector(duckdb_data_chunk chunk, idx_t column)
      : vector_(duckdb_data_chunk_get_vector(chunk, column)), data_(duckdb_vector_get_data(vector_)) {}

  template<class T>
  void put(idx_t row, T value)
  {
    static_cast<T*>(data_)[row] = value;
  }
  template<class T>
  T* all()
  {
    return static_cast<T*>(data_);
  }
  void putNull(idx_t row)
  {
    if (validity_ == nullptr)
    {
      duckdb_vector_ensure_validity_writable(vector_);
      validity_ = duckdb_vector_get_validity(vector_);
    }
    validity_[row / 64] &= ~(uint64_t{1} << row % 64);
  }
  void putHuge(idx_t row, uint64_t low, uint64_t high)
  {
    put(row, duckdb_hugeint{low, static_cast<int64_t>(high)});
  }
  void putBytes(idx_t row, std::string_view bytes)
  {
    if (bytes.size() <= kInlined)
    {
      putInlined(row, bytes);
      return;
    }
    duckdb_vector_assign_string_element_len(vector_, row, bytes.data(), bytes.size());
  }
  /// Texts or bytes of the first rows, `joined` one behind the other; `sizeOf` tells how long each is. The engine is
  /// handed all of them at once, and each row's value is a part of that.
  template<class SizeOf>
  void putJoined(idx_t rows, std::string_view joined, const SizeOf& sizeOf)
  {
    if (rows == 0 || joined.size() <= kInlined || joined.size() > kMostJoined)
    {
      for (idx_t row = 0; row < rows; ++row)
      {
        putBytes(row, joined.substr(0, sizeOf(row)));
        joined.remove_prefix(sizeOf(row));
      }
      return;
    }
    duckdb_vector_assign_string_element_len(vector_, 0, joined.data(), joined.size());
    const char* at = static_cast<duckdb_string_t*>(data_)->value.pointer.ptr;
    for (idx_t row = 0; row < rows; ++row)
    {
      at = putPart(row, at, sizeOf(row));
    }
  }
  /// The same text or bytes as a row before.
  void repeat(idx_t row, idx_t before) { put(row, static_cast<duckdb_string_t*>(data_)[before]); }
  /// What is no UTF-8 stands as escapes.
  void putText(idx_t row, std::string_view text)
  {
    if (inspect::isUtf8(text))
    {
      putBytes(row, text);
      return;
    }
    const std::string escaped = inspect::quoted(text);
    putBytes(row, std::string_view(escaped).substr(1, escaped.size() - 2));
  }

private:
  static constexpr size_t kInlined = sizeof(duckdb_string_t::value.inlined.inlined);
  static constexpr size_t kMostJoined = size_t{1} << 30U; ///< bytes; the engine's texts have less than twice as many

  void putInlined(idx_t row, std::string_view bytes)
  {
    duckdb_string_t text{};
    text.value.inlined.length = static_cast<uint32_t>(bytes.size());
    if (!bytes.empty())
    {
      std::memcpy(text.value.inlined.inlined, bytes.data(), bytes.size());
    }
    put(row, text);
  }
  /// A value that lies in memory of the vector. Returns where it ends.
  const char* putPart(idx_t row, const char* at, size_t size)
  {
    if (size <= kInlined)
    {
      putInlined(row, {at, size});
      return at + size;
    }
    duckdb_string_t text{};
    text.value.pointer.length = static_cast<uint32_t>(size);
    std::memcpy(text.value.pointer.prefix, at, sizeof(text.value.pointer.prefix));
    text.value.pointer.ptr = const_cast<char*>(at);
    put(row, text);
    return at + size;
  }

  duckdb_vector vector_;
  void* data_;
  uint64_t* validity_ = nullptr;
};

} // namespace tav::sql
