/// @file api.hpp
/// What libtav-inspect exports.
#pragma once

#include "tav/kor.h"

#if defined(TAV_INSPECT_BUILDING)
#define TAV_INSPECT_API KOR_DECL_EXPORT
#elif defined(TAV_STATIC)
#define TAV_INSPECT_API
#else
#define TAV_INSPECT_API KOR_DECL_IMPORT
#endif
