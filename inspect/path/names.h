/// @file names.h
/// Names of elements as they are looked up for every node.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "tav/inspect/dictionary.hpp"

namespace tav::inspect
{

/// The tag of an element when it stands for this id alone and can be written in a path, else nothing.
std::string_view clearTagOf(uint16_t elm, const Dictionary& dictionary);

/// Appends what tells a node from its siblings of the same name: nothing for the first one, and where the place among
/// them is not known, that in the file.
void appendPlace(std::string& path, uint64_t ordinal, uint64_t offset);

/// The id that a name means; nothing where it means none or several.
std::optional<uint16_t> soleIdOf(std::string_view name, const Dictionary& dictionary);

} // namespace tav::inspect
