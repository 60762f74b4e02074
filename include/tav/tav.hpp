/// @file tav.hpp
/// The C++ layer of libtav: writers and readers that own what they use, groups that close themselves,
/// values by their C++ type, ranges, paths, and errors as std::error_code. Every operation comes in a form that throws
/// std::system_error and in one with a std::error_code at the end, which throws nothing but what an allocation throws.
#pragma once

#if (defined(_MSVC_LANG) ? _MSVC_LANG : __cplusplus) < 202002L
#error "tav/tav.hpp needs C++20: -std=c++20 or later; tav/tav.h is the library without the layer"
#else

#include "tav/cpp/error.hpp"
#include "tav/cpp/index.hpp"
#include "tav/cpp/reader.hpp"
#include "tav/cpp/recorder.hpp"
#include "tav/cpp/updater.hpp"
#include "tav/cpp/writer.hpp"
#include "tav/tav.h"

#endif
