/// @file api.hpp
/// What libtav-inspect exports.
#pragma once

#include "tav/kor.h"

#if defined(TAV_STATIC)
#define TAV_INSPECT_API
#elif defined(TAV_INSPECT_BUILDING)
#define TAV_INSPECT_API KOR_DECL_EXPORT
#else
#define TAV_INSPECT_API KOR_DECL_IMPORT
#endif
