/// @file pathCompletion.h
/// The steps of a path that a shell offers while a command line is typed.
#pragma once

#include <string>
#include <vector>

namespace tav::tool
{

/// The words behind "complete-words": a shell's name, and those of a command line without the program's, up to the one
/// that is typed. Prints what that can be when it is a path in the file that the line names, a line each.
///
/// @return the exit status: 0, also when there is nothing to offer; 1 when the word is no path
/// Cost: looks at the first megabytes of a file for a part of a second at most.
int completeWords(const std::vector<std::string>& words);

/// Whether a value that help calls so is a path.
bool isPathValue(const std::string& value);

} // namespace tav::tool
