#include "format/eyeMatcher.h"

namespace tav
{
namespace
{

using EyeBytes = std::array<uint8_t, kEyeLength>;
constexpr auto kNative = std::bit_cast<EyeBytes>(TAV_EYE_CATCHER);
constexpr EyeBytes kReversed{kNative[7], kNative[6], kNative[5], kNative[4],
                             kNative[3], kNative[2], kNative[1], kNative[0]};

} // namespace

const uint8_t* EyeMatcher::scan(const uint8_t* at, const uint8_t* end)
{
  while (at != end && !found())
  {
    if (native_ == 0 && reversed_ == 0 && *at != kNative[0] && *at != kReversed[0]) [[likely]]
    {
      ++at;
      continue;
    }
    native_ = *at == kNative[native_] ? native_ + 1 : 0;
    reversed_ = *at == kReversed[reversed_] ? reversed_ + 1 : 0;
    ++at;
  }
  return at;
}

} // namespace tav
