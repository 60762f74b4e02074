/// @file pager.h
/// Which command shows what is longer than the terminal.
#pragma once

#include <string>

namespace tav::tool
{

/// PAGER, else less where that is installed. Empty where none is wanted: standard output is no terminal, the terminal
/// cannot move its cursor, or PAGER is empty or cat.
std::string pagerCommand();

} // namespace tav::tool
