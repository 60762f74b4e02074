/// @file xml.hpp
/// Streams as well-formed XML: one element a node, named by its tag.
#pragma once

#include <cstdint>
#include <functional>

#include "tav/inspect/api.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/sink.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

struct ToXmlOptions
{
  bool ends = false;                        ///< also elements that only end a group
  DamageWatch::Sink passedOver{};           ///< is told of what has no node, and of groups that were cut
  std::function<void(uint64_t)> progress{}; ///< is told by offset how far the work is
};

/// Writes a whole stream; true when some bytes of it are no node. Texts are escaped; what XML cannot hold, bytes, and
/// values whose size their type does not have are hexadecimal, with `encoding="hex"`. Paddings and pairs are told with
/// what they belong to, end elements are left out unless asked for. Throws Error, and what the sink throws.
TAV_INSPECT_API bool toXml(ByteSource& source, const Form& form, Sink& out, const ToXmlOptions& options = {});

} // namespace tav::inspect
