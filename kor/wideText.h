/// @file wideText.h
/// Windows takes UTF-16 where this project has UTF-8.
#pragma once

#include <string>

namespace tav::kor
{
/// The UTF-16 form of a UTF-8 text. The system's error, 0 for none: ERROR_NO_UNICODE_TRANSLATION for bytes that are no
/// UTF-8, ERROR_NOT_ENOUGH_MEMORY.
unsigned long widen(const char* pText, std::wstring& wide);

/// The UTF-8 form of a UTF-16 text; what has none becomes U+FFFD.
std::string narrow(const wchar_t* pText);
} // namespace tav::kor
