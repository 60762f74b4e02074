/// Every test program's `operator new` and `operator delete` count, and can be made to fail.
#pragma once

#include <cstdint>
#include <vector>

namespace allocations
{

/// Blocks that are allocated now, in the whole program.
int64_t live();

/// What Painted blocks are full of.
inline constexpr uint8_t kPaint = 0x5A;

/// Makes every new block of this thread come full of kPaint for as long as it lives.
class Painted
{
public:
  Painted();
  ~Painted();
  Painted(const Painted&) = delete;
  Painted& operator=(const Painted&) = delete;
};

/// Makes every allocation of this thread fail for as long as it lives.
class AllFail
{
public:
  AllFail();
  ~AllFail();
  AllFail(const AllFail&) = delete;
  AllFail& operator=(const AllFail&) = delete;
};

/// Makes one `new (std::nothrow)` of this thread fail, the nth from now on (from 1). The library allocates in no
/// other way, and the tests' own containers in no such way, so that a trace can be recorded meanwhile.
class FailNth
{
public:
  explicit FailNth(uint64_t nth);
  ~FailNth();
  FailNth(const FailNth&) = delete;
  FailNth& operator=(const FailNth&) = delete;

  /// Whether that allocation came and failed.
  [[nodiscard]] static bool happened();
};

/// Refuses every `new (std::nothrow)` of this thread outside a range of sizes, and notes the sizes that were asked for.
class OnlySizes
{
public:
  OnlySizes(uint64_t smallest, uint64_t largest);
  ~OnlySizes();
  OnlySizes(const OnlySizes&) = delete;
  OnlySizes& operator=(const OnlySizes&) = delete;

  [[nodiscard]] static std::vector<uint64_t> asked();
};

} // namespace allocations
