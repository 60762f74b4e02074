/// @file rebuild.h
/// Writes a sound stream of nodes that were found in another one.
#pragma once

#include <cstdint>
#include <functional>
#include <vector>

#include "tav/inspect/node.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// A data element as stored in the damaged stream.
struct FoundData
{
  TAVHeader header{};
  bool extra = false;      ///< two uncounted bytes stand behind it
  bool otherOrder = false; ///< its pair is in the other byte order, as the string operation leaves it
};

/// Sizes, paddings, pairs and end elements are made anew; payloads are copied in pieces. Memory grows with the depth.
class Rebuilder
{
public:
  /// `reading` is told where bytes are copied from, piece by piece.
  Rebuilder(ByteSource& source, const Form& form, PatchFile& out, std::function<void(uint64_t)> reading)
      : source_(source), form_(form), out_(out), reading_(std::move(reading)) {}

  /// Opens a group; its size is set when it is closed. A group of 32-bit headers never announces 64-bit ones.
  void open(TAVHeader header);
  void add(const FoundData& data);
  void close();

  /// End elements written so far.
  uint64_t endElements() const { return endElements_; }
  uint64_t depth() const { return groups_.size(); }
  /// Whether the innermost group would have size 0 if it were closed now.
  bool isEmpty() const;
  /// Whether children of the innermost group have 64-bit headers; of the file: its roots.
  bool wideChildren() const { return groups_.empty() ? form_.root64 : layout::hasChildren64(groups_.back()); }

private:
  void putHeader(TAVHeader& header);
  void copy(uint64_t offset, uint64_t count);

  ByteSource& source_;
  Form form_;
  PatchFile& out_;
  std::function<void(uint64_t)> reading_;
  std::vector<TAVHeader> groups_{};
  uint64_t endElements_ = 0;
};

} // namespace tav::inspect
