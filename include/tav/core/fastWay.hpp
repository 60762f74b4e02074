/// @file fastWay.hpp
/// The fast way of an operation: the same steps under a frame that has no records. It may answer "not here" at any
/// check, having stored nothing; the operation with its frame runs then, which alone decides about codes.
#pragma once

#include <concepts>
#include <cstdint>

#include "tav/codes.h"
#include "tav/kor.h"

namespace tav::core
{

/// No operation returns it: the fast way does not lead there.
inline constexpr uint32_t kNotHere = ~uint32_t{0};

/// A code that is surely another one: a call that ends the fast way can be a jump then.
[[gnu::always_inline]] inline uint32_t isHere(uint32_t code)
{
  if (code == kNotHere)
  {
    __builtin_unreachable();
  }
  return code;
}

/// Whether this program has never traced, in one look. One that has asks the operations, which look twice.
[[gnu::always_inline]] inline bool hasNeverTraced() noexcept
{
  return __atomic_load_n(&g_pWTCB, __ATOMIC_RELAXED) == nullptr;
}

/// The frame of the fast way. It knows one code, that of a level's end; every other failure is "not here".
class FastFrame
{
public:
  [[nodiscard]] bool require(uint32_t /*point*/, bool holds, uint32_t code)
  {
    if (!holds) [[unlikely]]
    {
      code_ = code == TAV_RC_NO_MORE_CHILDREN ? code : kNotHere;
    }
    return holds;
  }

  [[nodiscard]] uint32_t code() const
  {
    return code_;
  }

private:
  uint32_t code_ = TAV_RC_OK;
};

template<class Frame>
inline constexpr bool isFast = std::same_as<Frame, FastFrame>;

} // namespace tav::core
