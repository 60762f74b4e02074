/// @file elements.h
/// The element ids as named constants: `TAV_ELM_CMN_…` for the common elements, `SQLM_…` for monitor elements.
/// Id 20 has two constants, TAV_ELM_CMN_DOC_ROOT and SQLM_ELM_COLLECTED; a printed stream shows the first.
#pragma once

#include <cstdint>

/// One constant for each named element of elements.def. Unused ids have none.
#define TAV_ELEMENT(id, constant, enumName, tagName) inline constexpr uint16_t constant = id;
#include "tav/elements.def"
