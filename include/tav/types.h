/// @file types.h
/// The types of data elements and the bits of `info`, by name. C and C++.
#pragma once

#if defined(__cplusplus)
#include <cstdint>
#else
#include <stdint.h>
#endif

#include "tav/decl.h"

TAV_CONSTANT uint16_t TAV_TYPE_HEADER32 = 1; ///< a group whose children have 32-bit headers
TAV_CONSTANT uint16_t TAV_TYPE_HEADER64 = 2; ///< a group whose children have 64-bit headers
TAV_CONSTANT uint16_t TAV_TYPE_ASCII_STRING = 50;
TAV_CONSTANT uint16_t TAV_TYPE_UINT8 = 51;
TAV_CONSTANT uint16_t TAV_TYPE_SINT8 = 52;
TAV_CONSTANT uint16_t TAV_TYPE_UINT16 = 53;
TAV_CONSTANT uint16_t TAV_TYPE_SINT16 = 54;
TAV_CONSTANT uint16_t TAV_TYPE_UINT32 = 55;
TAV_CONSTANT uint16_t TAV_TYPE_SINT32 = 56;
TAV_CONSTANT uint16_t TAV_TYPE_UINT64 = 57;
TAV_CONSTANT uint16_t TAV_TYPE_SINT64 = 58;
TAV_CONSTANT uint16_t TAV_TYPE_UTC_TIMESTAMP = 100;
TAV_CONSTANT uint16_t TAV_TYPE_BINARY = 101;
TAV_CONSTANT uint16_t TAV_TYPE_UTF8_STRING = 102; ///< a 16-bit code page, then the bytes
TAV_CONSTANT uint16_t TAV_TYPE_UINT128 = 103;
TAV_CONSTANT uint16_t TAV_TYPE_SINT128 = 104;
TAV_CONSTANT uint16_t TAV_TYPE_BYTE = 105;
TAV_CONSTANT uint16_t TAV_TYPE_UINT64_ARRAY = 106;

TAV_CONSTANT uint32_t TAV_INFO_ALIGNED8 = 0x00100000; ///< the payload is padded to a multiple of 8
TAV_CONSTANT uint32_t TAV_INFO_EYE_SIZE = 0x00400000; ///< the node ends with an eye/size pair
TAV_CONSTANT uint32_t TAV_INFO_KEY_MASK = 0x7FF;      ///< the bits of `info` that searches compare
