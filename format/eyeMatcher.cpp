#include "format/eyeMatcher.h"

#include <algorithm>

#include "format/eyeSearch.h"

namespace tav::inside
{
namespace
{

/// Whether an eye catcher has a byte of this value. Both byte orders have the same eight.
bool isOfEye(uint8_t byte)
{
  return std::find(kNativeEye.begin(), kNativeEye.end(), byte) != kNativeEye.end();
}

/// Where to begin so as to know at `at` how far each match has come: behind a byte that no eye catcher has, or at
/// `start`, where none is under way.
const uint8_t* lastPlaceWithoutMatch(const uint8_t* start, const uint8_t* at)
{
  while (at != start && isOfEye(at[-1]))
  {
    --at;
  }
  return at;
}

} // namespace

const uint8_t* EyeMatcher::scan(const uint8_t* at, const uint8_t* end)
{
  while (at != end && !found())
  {
    if (native_ != 0 || reversed_ != 0)
    {
      at = follow(at, at + 1);
      continue;
    }
    // Only a whole eye catcher can complete a match. Which of them do, depends on the bytes before.
    const uint8_t* const eye = findEye(at, end);
    at = follow(lastPlaceWithoutMatch(at, eye), eye != end ? eye + kEyeLength : end);
  }
  return at;
}

const uint8_t* EyeMatcher::follow(const uint8_t* at, const uint8_t* end)
{
  while (at != end && !found())
  {
    native_ = *at == kNativeEye[native_] ? native_ + 1 : 0;
    reversed_ = *at == kReversedEye[reversed_] ? reversed_ + 1 : 0;
    ++at;
  }
  return at;
}

} // namespace tav::inside
