/// @file elements.h
/// The element ids as named constants: `TAV_ELM_CMN_…` for the common elements, `SQLM_…` for monitor elements.
/// Id 20 has two constants, TAV_ELM_CMN_DOC_ROOT and SQLM_ELM_COLLECTED; a printed stream shows the first.
/// C and C++.
#pragma once

#if defined(__cplusplus)
#include <cstdint>
#else
#include <stdint.h>
#endif

#include "tav/decl.h"

/// One constant for each named element of elements.def. Unused ids have none.
#define TAV_ELEMENT(id, constant, enumName, tagName) TAV_CONSTANT uint16_t constant = id;
#include "tav/elements.def"
