/// What of the C interface's writer waits for the C++ layer: going on in a file, and bringing bytes to it before the
/// end. Each function is to become the one call that its comment names.
#pragma once

#include <filesystem>
#include <memory>

#include "tav/tav.hpp"

namespace tav::inspect
{

/// Writer(path, {.append = true}, options).
inline uint32_t openToAppend(const std::filesystem::path&, const StreamOptions&, std::unique_ptr<Writer>&)
{
  return TAV_RC_NOT_SUPPORTED;
}

/// Writer::flush().
inline uint32_t flush(Writer&)
{
  return TAV_RC_NOT_SUPPORTED;
}

/// Writer::sync().
inline uint32_t sync(Writer&)
{
  return TAV_RC_NOT_SUPPORTED;
}

} // namespace tav::inspect
