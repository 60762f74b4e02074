/// @file sentences.h
#pragma once

#include <cstdint>
#include <string>

#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

/// Whether it is a data element of a type that readers know.
inline bool isDataType(const TAVHeader& header)
{
  return !layout::isGroup(header) && layout::typeInfo(layout::typeOf(header)).known;
}

/// What is said of a size that its type does not have.
inline std::string sizeSentence(const TAVHeader& header)
{
  return "has " + counted(layout::sizeOf(header), "byte") + ", which does not suit its type, " +
         typeText(layout::typeOf(header));
}

/// What is said of a node that claims more than there is.
inline std::string endsPast(uint64_t by, const char* what)
{
  return "ends " + counted(by, "byte") + " past " + what;
}

} // namespace tav::inspect
