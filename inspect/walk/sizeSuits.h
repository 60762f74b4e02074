/// @file sizeSuits.h
#pragma once

#include <cstdint>

#include "tav/layout.hpp"

namespace tav::inspect
{

/// Whether data of a type can have a size; of a type that nobody knows, any.
inline bool sizeSuits(uint16_t type, uint64_t size)
{
  const layout::TypeInfo& info = layout::typeInfo(type);
  switch (type)
  {
  case TAV_TYPE_UTF8_STRING: return size >= 2;
  case TAV_TYPE_UINT64_ARRAY: return size % 8 == 0;
  case TAV_TYPE_UINT128:
  case TAV_TYPE_SINT128: return size == 16;
  default: return info.valueSize == 0 || info.valueSize == size;
  }
}

} // namespace tav::inspect
