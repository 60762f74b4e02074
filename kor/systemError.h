/// @file systemError.h
#pragma once

#include <cstdint>

namespace tav::kor
{
/// The code for the number by which the system says why it refuses: the one table of each platform.
uint32_t codeOfSystemError(int64_t error);
} // namespace tav::kor
