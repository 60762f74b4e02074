/// @file endings.h
/// Groups whose header is damaged, by the end elements that still lead back to it.
#pragma once

#include <cstdint>
#include <vector>

#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// A group as its end element describes it.
struct Ending
{
  uint64_t start = 0; ///< of the group's header, which has 64 bits
  uint64_t end = 0;   ///< behind the end element
  bool wide = false;  ///< the children have 64-bit headers
};

/// Reads a whole end element, header and pair, at `offset`; false when there is none.
bool readEnding(ByteSource& source, const Form& form, uint64_t offset, bool wide, uint64_t limit, Ending& out);

/// Whether the header at an ending's start says the same as the ending.
bool headerAgrees(ByteSource& source, const Form& form, const Ending& ending);

/// Searches all bytes from `from` to the end of the file for eye catchers, and keeps the end elements whose groups
/// begin at `from` or later with a header that says something else. Sorted by start, outer groups first. A bounded
/// number is kept. `threads` search in stretches of the file, with the same outcome for any number.
std::vector<Ending> findEndings(ByteSource& source, const Form& form, uint64_t from, unsigned threads = 1);

} // namespace tav::inspect
