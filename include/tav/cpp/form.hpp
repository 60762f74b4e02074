/// @file form.hpp
/// What nothing in a stream says of it.
#pragma once

namespace tav::detail
{

/// How the bytes of a stream are to be taken.
struct StreamForm
{
  bool swapped = false;
  bool wide = true; ///< the root has a 64-bit header
  bool aligned = false;
};

} // namespace tav::detail
