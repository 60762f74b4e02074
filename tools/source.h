/// @file source.h
/// The bytes of a stream by offset, from a file or a pipe of any size, in bounded memory.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <unordered_map>
#include <vector>

#include "tav/tav.h"

namespace tav::tool
{

inline constexpr uint64_t kDefaultRing = uint64_t{10} * 1024 * 1024;
inline constexpr uint64_t kDefaultSpool = uint64_t{16} * 1024 * 1024 * 1024;

/// How much may be taken for a file's bytes.
struct SourceLimits
{
  uint64_t ring = kDefaultRing;   ///< of memory, at least two pages
  uint64_t spool = kDefaultSpool; ///< of a temporary file for a pipe; 0 is no limit
};

/// Opens a new file in the folder for temporary files and returns its path. The name is tried until nobody else has it.
std::string openTemporary(KORHFile& file);

/// A file that is read at any offset, through pages that are kept while they are used. Standard input, pipes and files
/// that tell a wrong size, as those of /proc do, are copied to a temporary file first, so that everything works on
/// them. Used by one thread.
class ByteSource
{
public:
  static constexpr uint64_t kPage = uint64_t{16} * 1024;
  static constexpr uint64_t kLongRead = uint64_t{64} * kPage; ///< what is read at once when reading goes straight on

  /// Opens a file, "-" for standard input. What stands before `from` is left out, and all offsets count from there.
  /// Throws Failure when that does not work, also because a limit is reached.
  static std::unique_ptr<ByteSource> open(const std::string& path, const SourceLimits& limits = {}, uint64_t from = 0);
  ~ByteSource();
  ByteSource(const ByteSource&) = delete;
  ByteSource& operator=(const ByteSource&) = delete;

  /// As it is called in messages.
  const std::string& name() const { return name_; }

  /// Where in the file it begins.
  uint64_t from() const { return from_; }

  /// Bytes in the file from there on, as it was when it was opened.
  uint64_t size() const { return size_; }

  /// Copies bytes; fewer than asked only at the end of the file. Throws Failure when the file cannot be read.
  size_t read(uint64_t offset, std::span<uint8_t> to);

  /// The bytes from `offset` on as far as they are at hand, at least one unless `offset` is at or behind the end.
  /// Valid until the next call of any function of this object.
  std::span<const uint8_t> view(uint64_t offset);

  /// Names who is told, by offset, of each piece that is fetched while reading goes straight on; nobody when empty.
  void tellOfPieces(std::function<void(uint64_t)> told) { told_ = std::move(told); }

  /// Bytes fetched from the file so far.
  uint64_t bytesRead() const { return bytesRead_; }
  /// Calls of the file's `read` so far.
  uint64_t readCalls() const { return readCalls_; }

  /// The storage underneath, for a handle of the library. Its cursor is shared: this object may be used again when
  /// the handle is done.
  TAVSideStorage& storage() { return window_ != nullptr ? *window_ : static_cast<TAVSideStorage&>(*file_); }

private:
  struct Page
  {
    uint64_t number = 0;
    uint64_t used = 0; ///< when it was used last
    std::vector<uint8_t> bytes{};
  };

  ByteSource(std::string name, std::string path, const SourceLimits& limits, uint64_t from);
  void startAt();
  const Page& page(uint64_t number);
  Page& slotFor(uint64_t number);
  void fetch(uint64_t number, uint64_t count);

  std::string name_;
  std::string temporary_{}; ///< to be removed at the end
  std::unique_ptr<TAVSSFile> file_{};
  std::unique_ptr<TAVSideStorage> window_{}; ///< on the file, where it is not read from its first byte on
  uint64_t from_;
  uint64_t size_ = 0;
  uint64_t bytesRead_ = 0;
  uint64_t readCalls_ = 0;
  size_t maxPages_;
  uint64_t clock_ = 0;
  uint64_t expected_ = 0; ///< the page that comes next when reading goes straight on
  uint64_t run_ = 0;      ///< pages read one after the other
  std::vector<Page> pages_{};
  std::unordered_map<uint64_t, size_t> places_{};
  std::vector<uint8_t> buffer_{};
  std::function<void(uint64_t)> told_{};
};

} // namespace tav::tool
