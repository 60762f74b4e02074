/// @file similar.h
/// What somebody may have meant by a word that is not known.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace tav::tool
{

/// How many letters have to be put in, left out or replaced to make one word of the other; case does not count.
size_t editDistance(std::string_view a, std::string_view b);

/// The most changes of a word that still count as a slip of the fingers.
size_t mostSlips(std::string_view word);

/// The nearest of the known words; of equally near ones the first. Empty when none is near and none begins with it.
std::string nearest(std::string_view word, const std::vector<std::string>& known);

} // namespace tav::tool
