/// The bytes of one input. Its first bytes choose what is done, the rest is what it is done with.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>

#include "support/streams.h"

/// What libFuzzer calls, and the driver that stands for it in other builds.
extern "C" int LLVMFuzzerInitialize(int* argc, char*** argv);
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

namespace fuzz
{

/// Larger inputs reach nothing that smaller ones do not, only slower.
inline constexpr size_t kLargest = 4096;

/// Ends the target with a sentence unless what it says of the library holds.
inline void demand(bool holds, std::string_view what)
{
  if (!holds) [[unlikely]]
  {
    throw std::runtime_error(std::string(what));
  }
}

/// Takes bytes from the front; behind the end there are zeros.
class Input
{
public:
  Input(const uint8_t* data, size_t size)
      : bytes_(data, size) {}

  uint8_t byte()
  {
    if (bytes_.empty())
    {
      return 0;
    }
    const uint8_t first = bytes_.front();
    bytes_ = bytes_.subspan(1);
    return first;
  }

  /// A text of up to `longest` bytes, with its length in front.
  std::string text(size_t longest)
  {
    const size_t length = std::min({size_t{byte()}, longest, bytes_.size()});
    std::string taken(reinterpret_cast<const char*>(bytes_.data()), length);
    bytes_ = bytes_.subspan(length);
    return taken;
  }

  [[nodiscard]] std::span<const uint8_t> rest() const { return bytes_; }
  [[nodiscard]] test::Bytes copyOfRest() const { return {bytes_.begin(), bytes_.end()}; }

private:
  std::span<const uint8_t> bytes_;
};

/// How the stream is read: four bytes. All zero: over memory, in the host's byte order, packed, a 64-bit root.
inline test::Form takeForm(Input& input)
{
  const uint8_t flags = input.byte();
  const uint8_t page = input.byte();
  const uint8_t pages = input.byte();
  const uint8_t transfer = input.byte();
  test::Form form;
  form.swap = (flags & 1U) != 0;
  form.align = (flags & 2U) != 0;
  form.root32 = (flags & 4U) != 0;
  form.buffered = page != 0;
  form.pageBytes = form.buffered ? page : 64U;
  const uint64_t rounded = (form.pageBytes + 7) / 8 * 8;
  form.ringBytes = rounded * (1U + pages % 12U);
  form.longestTransfer = transfer != 0 ? uint64_t{transfer} : ~uint64_t{0};
  return form;
}

} // namespace fuzz
