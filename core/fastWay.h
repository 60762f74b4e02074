/// When a call may take its fast way.
#pragma once

#include <cstdint>

#include "kor/shared.h"
#include "tav/core/fastWay.hpp"
#include "trace/traceFrame.h"

namespace tav::core
{
using namespace inside;

/// Whether a call may take the fast way: it has no options, and nothing is traced.
inline bool isFastCall(uint64_t options)
{
  return options == 0 && !tracing();
}

/// The same in one look, for calls of a program that has never traced.
[[gnu::always_inline]] inline bool isFastCallAtOnce(uint64_t options)
{
  return (reinterpret_cast<uintptr_t>(kor::loadRelaxed(g_pWTCB)) | options) == 0;
}

} // namespace tav::core
