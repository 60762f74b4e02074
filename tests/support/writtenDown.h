/// Events of a walk as text, to be compared.
#pragma once

#include <string>

#include "tav/inspect/walker.hpp"

namespace test
{

/// All of an event but the place of its node among siblings.
inline std::string writtenDown(const tav::inspect::Event& event)
{
  std::string text;
  for (const uint64_t number : {static_cast<uint64_t>(event.what), event.offset, event.length,
                                static_cast<uint64_t>(event.end), event.depth, uint64_t{event.code}})
  {
    text += std::to_string(number) + " ";
  }
  if (event.node.header.hdrType != 0)
  {
    for (const uint64_t number : {event.node.offset(), event.node.size(), uint64_t{event.node.type()},
                                  uint64_t{event.node.elm()}, event.node.depth, event.node.parentOffset,
                                  event.node.limit, uint64_t{event.node.flags}})
    {
      text += std::to_string(number) + " ";
    }
  }
  return text + event.reason;
}

} // namespace test
