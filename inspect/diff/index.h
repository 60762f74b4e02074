/// @file diff_index.h
/// The nodes of a stream as rows of a temporary file, so that two streams can be compared level by level in one walk
/// each and in bounded memory.
#pragma once

#include <array>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "tav/inspect/diff.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/scratch.hpp"

namespace tav::inspect
{

inline constexpr uint64_t kNoRow = ~uint64_t{0};

/// One node, or one run of damaged bytes.
struct Row
{
  uint64_t offset = 0;
  uint64_t size = 0; ///< of the payload, to the end of a group, or of the damaged bytes
  uint64_t next = 0; ///< the row behind the node and all below it
  uint64_t parent = kNoRow;
  uint64_t ordinal = 0;
  uint64_t hash = 0; ///< of everything that is compared, children included
  uint64_t key = 0;  ///< of the values that tell a group from its siblings; 0: there is none
  uint32_t info = 0; ///< without the bits that only tell of padding and pairs
  uint16_t type = 0; ///< one for both kinds of groups; 0: damaged bytes
  uint16_t elm = 0;
  uint64_t payload = 0;

  bool isGroup() const { return type == TAV_TYPE_HEADER64; }
  bool isDamaged() const { return type == 0; }
};

class DiffIndex
{
public:
  /// Walks the stream, or what the input's path leads to. Nodes that a path of the options' `ignored` leads to are left
  /// out, with all below them. Rows are kept in a file of `makeFile`; `seen` is told of every event.
  DiffIndex(const DiffInput& input, const DiffOptions& options,
            const std::function<void(const Walker&, const Event&)>& seen);

  uint64_t rows() const { return count_; }
  const Form& form() const { return form_; }
  Row row(uint64_t number);

  /// A part of a payload in host order, valid until the next call; pieces must be asked for from the front, in
  /// multiples of 8 bytes.
  std::span<const uint8_t> piece(const Row& row, uint64_t at, uint64_t most);

  std::string path(uint64_t number);
  /// "Uint32 8", "group of 3 nodes"; values are cut.
  std::string text(uint64_t number);
  static std::string kindText(const Row& row);
  std::string value(const Row& row, uint64_t most);
  std::string name() const { return source_.name(); }

private:
  struct Open
  {
    Row row{};
    uint64_t number = 0;
    std::vector<uint64_t> keys{}; ///< the hash of each key's first value; 0: there was none
  };

  void walk(const DiffInput& input, const DiffOptions& options,
            const std::function<void(const Walker&, const Event&)>& seen);
  void begin(const Walker& walker, const Event& event);
  void add(const Event& event, bool ignore);
  void addData(const Row& given);
  void endGroup(uint64_t end);
  Row rowOf(const Event& event) const;
  uint64_t payloadHash(const Row& row);
  void append(const Row& row);
  void put(uint64_t number, const Row& row);

  ByteSource& source_;
  Form form_;
  std::unique_ptr<Scratch> scratch_;
  PatchFile file_;
  uint64_t count_ = 0;
  std::vector<uint16_t> keys_;
  std::string prefix_{}; ///< the path of the group around the first row
  uint64_t prefixSteps_ = 0;
  uint64_t ignoredDepth_ = kNoRow; ///< of the node that is being left out
  std::vector<Open> open_{};
  std::vector<uint8_t> piece_{};
  std::vector<Row> window_{}; ///< rows at hand, from `windowStart_` on
  uint64_t windowStart_ = 0;
};

} // namespace tav::inspect
