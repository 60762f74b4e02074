/// @file documentOptions.hpp
/// What is known of a file beforehand, and how much memory it may take.
#pragma once

#include <cstdint>

#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

struct DocumentOptions
{
  FormChoice form{};                 ///< what is known of the form; the rest is found out
  uint64_t ringBytes = kDefaultRing; ///< memory for a file's pages, once for walks and once for nodes
  uint64_t from = 0;                 ///< what is before it in a file is left out, and offsets count from there
  Dictionary dictionary{};           ///< what paths, and paths in messages, call own elements
};

} // namespace tav::inspect
