/// @file diff.hpp
/// What two streams do not have in common.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/scratch.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// How far apart two numbers may be.
struct Tolerance
{
  double amount = 0;
  bool percent = false; ///< of the larger one
};

/// A stream and how it is read.
struct DiffInput
{
  ByteSource& source;
  Form form{};
  std::optional<Path> path{}; ///< compare only the first node that it leads to, with all below it
};

struct DiffOptions
{
  std::vector<Path> ignored{}; ///< nodes that one of them leads to are left out, with all below them
  Tolerance tolerance{};
  /// Elements by whose values groups of one name are matched; none: 307 (node_number), 321 (db_name) and the host name.
  std::vector<uint16_t> keys{};
  bool contents = false;                    ///< tell each node of a group that only one side has
  uint64_t mostValue = uint64_t{64} * 1024; ///< bytes of a payload that a side's value shows
  ScratchMaker makeFile = makeScratch;      ///< for the nodes of either stream
  /// Is told of every event while either stream is read, the first one first.
  std::function<void(ByteSource&, const Walker&, const Event&)> seen{};
};

/// A node, or damaged bytes, on one side of a difference.
struct DiffSide
{
  std::string path{};
  uint64_t offset = 0;
  std::string type{};                 ///< "Uint32", "group", "damaged"
  std::optional<std::string> value{}; ///< nothing for a group
  uint32_t info = 0;                  ///< without the bits that only tell of padding and pairs
};

enum class Change : uint8_t
{
  removed, ///< only the first stream has it
  added,   ///< only the second has it
  changed
};

struct Difference
{
  Change change = Change::changed;
  std::optional<DiffSide> before{}; ///< in the first stream
  std::optional<DiffSide> after{};  ///< in the second
  std::string sentence{};           ///< "Uint32  7 -> 8"
};

/// Compares two streams and reports each difference; true when there is one. Byte order, header widths, padding, pairs
/// and end elements are none; nor is the order of elements with different names. Groups of one name are matched by
/// their keys where they have some; other elements of one name by what is equal in their order, and else one after the
/// other. In memory are only the children of the groups on the way to the place that is compared, 200,000 of a group
/// at a time. Throws Error, with Trouble::notFound where
/// the path of an input leads nowhere. Where both have paths, the two nodes stand for each other whatever their names.
TAV_INSPECT_API bool diff(const DiffInput& a, const DiffInput& b, const DiffOptions& options,
                          const std::function<void(const Difference&)>& found);

} // namespace tav::inspect
