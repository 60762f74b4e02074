/// @file source.hpp
/// The bytes of a stream by offset, from a file, a storage or memory of any size, in bounded memory.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/dictionary.hpp"
#include "tav/tav.h"

namespace tav::inspect
{

inline constexpr uint64_t kDefaultRing = uint64_t{10} * 1024 * 1024;

/// Bytes that are read at any offset, through pages that are kept while they are used; what lies in memory is read
/// where it lies. Used by one thread.
class ByteSource
{
public:
  static constexpr uint64_t kPage = uint64_t{16} * 1024;
  static constexpr uint64_t kLongRead = uint64_t{64} * kPage; ///< what is read at once when reading goes straight on

  /// Opens a regular file by its path, UTF-8. At most `ringBytes` (and at least two pages) are kept in memory. What
  /// is before `from` is left out, and all offsets count from there. Throws Error when that does not work.
  TAV_INSPECT_API static std::unique_ptr<ByteSource> open(const std::string& path, uint64_t ringBytes = kDefaultRing,
                                                          uint64_t from = 0);

  /// The same over an open storage. `name` is how messages call it; `keep` is let go of after the storage. Throws
  /// Error.
  TAV_INSPECT_API ByteSource(std::string name, std::unique_ptr<TAVSideStorage> storage,
                             uint64_t ringBytes = kDefaultRing, uint64_t from = 0, std::shared_ptr<void> keep = {});

  /// Over bytes in memory, which outlive this object.
  TAV_INSPECT_API ByteSource(std::string name, std::span<const uint8_t> bytes);

  TAV_INSPECT_API ~ByteSource();
  ByteSource(const ByteSource&) = delete;
  ByteSource& operator=(const ByteSource&) = delete;

  /// As it is called in messages.
  const std::string& name() const { return name_; }

  /// What own elements in it are called, wherever nodes of it are named; those that are handed out by `window`, too.
  const Dictionary& dictionary() const { return dictionary_; }
  void setDictionary(Dictionary dictionary) { dictionary_ = std::move(dictionary); }

  /// Where in the storage it begins.
  uint64_t from() const { return from_; }

  /// Bytes from there on, as many as there were when it was opened.
  uint64_t size() const { return size_; }

  /// Whether they lie in memory, where `view` gives all from an offset on for as long as they are there.
  bool isMemory() const { return !memory_.empty(); }

  /// Copies bytes; fewer than asked only at the end. Throws Error when they cannot be read.
  TAV_INSPECT_API size_t read(uint64_t offset, std::span<uint8_t> to);

  /// The bytes from `offset` on as far as they are at hand, at least one unless `offset` is at or behind the end.
  /// Valid until the next call of any function of this object.
  TAV_INSPECT_API std::span<const uint8_t> view(uint64_t offset);

  /// The first place at or behind an offset where something else than zeros can be, as far as that is known without
  /// reading: the end of a sparse file's hole. The offset itself where nothing is known; the size at the most.
  TAV_INSPECT_API uint64_t zerosUntil(uint64_t offset);

  /// The same backwards: from where on, `from` at the earliest, nothing but zeros can be up to `end`; `end` where
  /// nothing is known.
  TAV_INSPECT_API uint64_t zerosBefore(uint64_t end, uint64_t from);

  /// Where a search goes on that has come to `offset` through the bytes `seen`: there, or, when they were all zeros and
  /// more are known to follow, `margin` bytes before those end.
  TAV_INSPECT_API uint64_t pastHole(uint64_t offset, std::span<const uint8_t> seen, uint64_t margin = 0);

  /// The same bytes from an offset on, through pages of its own. This object outlives it.
  TAV_INSPECT_API std::unique_ptr<ByteSource> window(uint64_t from, uint64_t ringBytes = kDefaultRing);

  /// Names who is told, by offset, of each piece that is fetched while reading goes straight on; nobody when empty.
  void tellOfPieces(std::function<void(uint64_t)> told) { told_ = std::move(told); }

  /// Bytes fetched from the storage so far.
  uint64_t bytesRead() const { return bytesRead_; }
  /// Calls of the storage's `read` so far.
  uint64_t readCalls() const { return readCalls_; }
  /// Counts what another object has read of the same storage.
  void countReads(const ByteSource& other)
  {
    bytesRead_ += other.bytesRead_;
    readCalls_ += other.readCalls_;
  }
  /// Memory for pages.
  uint64_t ringBytes() const { return uint64_t{maxPages_} * kPage; }

  /// The storage underneath, for a handle of the library. Its cursor is shared: this object may be used again when
  /// the handle is done.
  TAVSideStorage& storage() { return window_ != nullptr ? *window_ : *storage_; }

private:
  struct Page
  {
    uint64_t number = 0;
    uint64_t used = 0; ///< when it was used last
    std::vector<uint8_t> bytes{};
  };

  void startAt();
  const Page& page(uint64_t number);
  Page& slotFor(uint64_t number);
  void fetch(uint64_t number, uint64_t count);

  std::string name_;
  Dictionary dictionary_{};
  std::shared_ptr<void> keep_{};
  std::unique_ptr<TAVSideStorage> storage_{};
  std::unique_ptr<TAVSideStorage> window_{}; ///< on the storage, where it is not read from its first byte on
  uint64_t from_ = 0;
  std::span<const uint8_t> memory_{}; ///< all bytes, where they are at hand
  uint64_t size_ = 0;
  uint64_t bytesRead_ = 0;
  uint64_t readCalls_ = 0;
  size_t maxPages_;
  uint64_t clock_ = 0;
  uint64_t expected_ = 0; ///< the page that comes next when reading goes straight on
  uint64_t run_ = 0;      ///< pages read one after the other
  std::vector<Page> pages_{};
  size_t last_ = 0; ///< the page that was asked for last, which is mostly asked for again
  std::unordered_map<uint64_t, size_t> places_{};
  std::vector<uint8_t> buffer_{};
  std::function<void(uint64_t)> told_{};
  KORHFile* file_ = nullptr; ///< under the storage, for its holes; offsets in it are `inFile_` more
  uint64_t inFile_ = 0;
  uint64_t holeFrom_ = 0; ///< the hole that was found last
  uint64_t holeTo_ = 0;
};

} // namespace tav::inspect
