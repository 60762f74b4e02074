/// @file lineBuffered.h
/// How a standard stream passes on what is written to it. Compiled into the library that asks: libkor neither has nor
/// exports it.
#pragma once

#include <cstdio>

namespace tav::kor
{

/// Whether a stream to which something was written passes its buffer on at the end of each line. Where the system
/// cannot tell, it does: the caller then takes the slower way that is right for all.
bool isLineBuffered(std::FILE* stream);

} // namespace tav::kor
