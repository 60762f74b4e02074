/// @file elementNames.h
/// The names of elements as the library itself looks them up. The table of tav/dictionary.hpp, which is for programs,
/// would make libtav half a megabyte longer, with 170 KB of pointers that each process has to adjust when it loads it.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "tav/dictionary.hpp"

namespace tav::detail
{

/// The tag name of an id, and its enum name; empty when it has no entry. They live for ever.
std::string_view elementTag(uint16_t id) noexcept;
std::string_view elementName(uint16_t id) noexcept;

/// The ids that bear a name, ascending: several elements can share a tag. Empty when no element has it.
std::vector<uint16_t> idsNamed(std::string_view name, dictionary::OwnNames own = {});

/// The id of the one element that has this tag and that nothing else is called; nothing where there are others or none.
std::optional<uint16_t> onlyTagged(std::string_view tag) noexcept;

/// The ids whose tags a pattern describes, ascending; those of elements that only end a group where there is no other.
std::vector<uint16_t> idsLike(std::string_view pattern, dictionary::OwnNames own = {});

/// The tag that comes nearest to a name that no element has, of the dictionary's and the own ones; empty when none is
/// near.
std::string_view nearestTag(std::string_view name, dictionary::OwnNames own = {}) noexcept;

} // namespace tav::detail
