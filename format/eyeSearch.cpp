#include "format/eyeSearch.h"

#include <cstddef>
#include <cstring>

namespace tav::inside
{
namespace
{

// By value: to g++ std::min is a choice between two addresses, of which it makes no vector instruction.
constexpr uint8_t lesser(uint8_t one, uint8_t other)
{
  return one < other ? one : other;
}

constexpr uint8_t greater(uint8_t one, uint8_t other)
{
  return one < other ? other : one;
}

/// The middle bytes of an eye catcher. They mirror each other, so in either byte order they are the same two.
constexpr size_t kMiddle = kEyeLength / 2 - 1;
constexpr uint8_t kLower = lesser(kNativeEye[kMiddle], kNativeEye[kMiddle + 1]);
constexpr uint8_t kHigher = greater(kNativeEye[kMiddle], kNativeEye[kMiddle + 1]);

constexpr auto kLength = static_cast<ptrdiff_t>(kEyeLength);
constexpr ptrdiff_t kBlock = 512; // what a block costs beside its bytes is then lost among them
constexpr ptrdiff_t kPart = 32;

bool isEye(const uint8_t* at)
{
  uint64_t word = 0;
  std::memcpy(&word, at, sizeof word);
  return word == TAV_EYE_CATCHER || word == kor::byteswap64(TAV_EYE_CATCHER);
}

/// Whether the middle bytes of an eye catcher stand side by side where one would have them that begins among the next
/// `count` bytes. No branch and a known count: compilers make vector instructions of it, as wide as the function that
/// it is inlined into may use.
template<ptrdiff_t count>
[[gnu::always_inline]] inline bool hasMiddle(const uint8_t* at)
{
  const uint8_t* const left = at + kMiddle;
  const uint8_t* const right = left + 1;
  uint8_t nearest = 0xFF;
  for (ptrdiff_t i = 0; i < count; ++i)
  {
    const auto lower = static_cast<uint8_t>(lesser(left[i], right[i]) ^ kLower);
    const auto higher = static_cast<uint8_t>(greater(left[i], right[i]) ^ kHigher);
    nearest = lesser(nearest, static_cast<uint8_t>(lower | higher));
  }
  return nearest == 0;
}

/// Looks at the next `count` bytes for the first byte of an eye catcher; null when there is none.
template<ptrdiff_t count>
[[gnu::always_inline]] inline const uint8_t* findAmong(const uint8_t* at)
{
  if (!hasMiddle<count>(at)) [[likely]]
  {
    return nullptr;
  }
  constexpr ptrdiff_t step = count > kPart ? kPart : 1;
  for (const uint8_t* const end = at + count; at != end; at += step)
  {
    if constexpr (step == kPart)
    {
      const uint8_t* const eye = findAmong<kPart>(at);
      if (eye != nullptr)
      {
        return eye;
      }
    }
    else if (isEye(at))
    {
      return at;
    }
  }
  return nullptr;
}

[[gnu::always_inline]] inline const uint8_t* find(const uint8_t* at, const uint8_t* end)
{
  const uint8_t* eye = nullptr;
  while (eye == nullptr && end - at >= kBlock + kLength)
  {
    eye = findAmong<kBlock>(at);
    at += kBlock;
  }
  while (eye == nullptr && end - at >= kPart + kLength)
  {
    eye = findAmong<kPart>(at);
    at += kPart;
  }
  for (; eye == nullptr && end - at >= kLength; ++at)
  {
    eye = isEye(at) ? at : nullptr;
  }
  return eye != nullptr ? eye : end;
}

#if defined(__x86_64__) && defined(__GNUC__)

[[gnu::target("avx2")]] const uint8_t* findWithAvx2(const uint8_t* at, const uint8_t* end)
{
  return find(at, end);
}

const uint8_t* findWithWidest(const uint8_t* at, const uint8_t* end)
{
  return __builtin_cpu_supports("avx2") != 0 ? findWithAvx2(at, end) : find(at, end);
}

#else

const uint8_t* findWithWidest(const uint8_t* at, const uint8_t* end)
{
  return find(at, end);
}

#endif

} // namespace

const uint8_t* findEye(const uint8_t* at, const uint8_t* end)
{
  return findWithWidest(at, end);
}

const uint8_t* findEyeOnAnyProcessor(const uint8_t* at, const uint8_t* end)
{
  return find(at, end);
}

} // namespace tav::inside
