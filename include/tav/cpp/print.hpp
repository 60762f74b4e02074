/// @file print.hpp
/// Printing of streams, as Reader::print does it: the forms of tavPrintSubtree for every value that can be written.
#pragma once

#include <cstdint>
#include <cstdio>

#include "tav/cpp/node.hpp"

namespace tav
{

/// What tav::Reader::print shows.
struct PrintOptions
{
  bool xml = false;
  bool data = true;
  bool headers = false;
  bool descriptors = false;
  bool bare = false;       ///< the value alone, of a data element; TAV_RC_BAD_PARAM for all below a group
  bool attributes = false; ///< in XML, the key elements of groups as attributes
  bool subtree = true;     ///< all below the node, too
};

namespace detail
{

/// Prints one node and all below it. The text form is that of tavPrintSubtree. So is the XML, but that it is always
/// well-formed: texts are escaped, what XML cannot hold is in hexadecimal digits with encoding="hex".
TAV_API uint32_t printNode(FILE* stream, const PrintOptions& options, const Node& start, bool swapped,
                           uint64_t& characters);

} // namespace detail

} // namespace tav
