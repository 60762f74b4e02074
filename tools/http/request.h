/// @file request.h
/// The part of HTTP/1.1 that a page needs of a server on its own machine. What is not plainly right is refused.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tav::tool
{

inline constexpr size_t kLongestHead = size_t{16} * 1024;

/// What a request asks for, of the fields only those that matter here.
struct HttpRequest
{
  bool isHead = false;
  bool isLast = false; ///< of its connection
  std::string target{};
  std::string host{};
  std::string origin{};
  std::string site{}; ///< Sec-Fetch-Site: where in the browser it comes from
  std::string range{};
  std::string match{}; ///< If-Match
};

/// Reads the head of a request, with the empty line at its end. Returns 0, or the status that refuses it.
int readRequest(std::string_view head, HttpRequest& request);

/// Bytes of something, the last one included.
struct HttpRange
{
  uint64_t first = 0;
  uint64_t last = 0;
};

/// What "bytes=0-99", "bytes=100-" or "bytes=-100" means of `size` bytes. Returns 0, or the status that refuses it.
int readRange(std::string_view text, uint64_t size, HttpRange& range);

} // namespace tav::tool
