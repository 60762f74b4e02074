/// The file of W7, made once and removed at the end.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace file
{

inline constexpr size_t kFileBytes = size_t{1} << 30;
inline constexpr size_t kPageBytes = size_t{1} << 20;
inline constexpr size_t kPieceBytes = 40; ///< a small node

/// In BENCH_DIR, or else in /tmp: kFileBytes of it, in the page cache.
const std::string& path();

/// The sum of the 64-bit words: what a reader does with what it read.
uint64_t sumWords(const char* bytes, size_t size);

} // namespace file
