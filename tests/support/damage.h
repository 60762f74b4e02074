/// Seeded damage to the bytes of a stream.
#pragma once

#include <array>
#include <cstdint>
#include <random>
#include <vector>

#include "support/byteRows.h"
#include "support/elements.h"
#include "tav/tav.h"

namespace test
{

/// Damages a stream in place.
class Damage
{
public:
  Damage(Bytes& bytes, uint64_t seed)
      : bytes_(bytes), random_(seed) {}

  void flipBits()
  {
    for (uint64_t i = 0; i <= below(8); ++i)
    {
      bytes_[below(bytes_.size())] ^= static_cast<uint8_t>(1U << below(8));
    }
  }
  void setBytes()
  {
    static constexpr std::array<uint8_t, 6> values{0, 1, 2, 0x7F, 0x80, 0xFF};
    for (uint64_t i = 0; i <= below(8); ++i)
    {
      bytes_[below(bytes_.size())] = values[below(values.size())];
    }
  }
  /// Sizes and distances, narrow and wide, at their extremes and near those that would fit.
  void setSizes(const std::vector<uint64_t>& offsets)
  {
    const uint64_t length = bytes_.size();
    const std::array<uint64_t, 14> values{0, 1, 7, 8, 15, 16, length,
                                          length - 16, length + 1, 0xFFFFFFFF, 0xFFFFFFF7, ~uint64_t{0},
                                          ~uint64_t{0} - 15, uint64_t{1} << 63};
    for (uint64_t i = 0; i <= below(4); ++i)
    {
      const uint64_t at = offsets[below(offsets.size())];
      const Bytes field = ByteRows(below(2) == 0).number(values[below(values.size())], below(2) == 0 ? 4 : 8).bytes;
      put(at, field);
    }
  }
  /// Turns nodes into groups and elements of any kind, flags and ids included.
  void setHeaders(const std::vector<uint64_t>& offsets)
  {
    for (uint64_t i = 0; i <= below(4); ++i)
    {
      ByteRows rows(below(2) == 0);
      static constexpr std::array<uint16_t, 5> types{0, 1, 2, 101, 57};
      static constexpr std::array<uint16_t, 4> elms{TAV_ELM_CMN_END_HDR_MARKER, TAV_ELM_CMN_END_HDR_EYE_SIZE,
                                                    TAV_ELM_CMN_EYE_SIZE, 7};
      const uint64_t size = below(3) == 0 ? TAV_SIZE_UNKNOWN : below(64);
      rows.h64(size, static_cast<uint32_t>(random_()), types[below(types.size())], elms[below(elms.size())]);
      put(offsets[below(offsets.size())], rows.bytes);
    }
  }
  /// Pairs that lead anywhere, to headers above all.
  void plantPairs(const std::vector<uint64_t>& offsets)
  {
    for (uint64_t i = 0; i <= below(4); ++i)
    {
      const uint64_t at = below(bytes_.size());
      put(at, ByteRows(below(2) == 0).pair(at - offsets[below(offsets.size())]).bytes);
    }
  }

private:
  uint64_t below(uint64_t bound) { return random_() % bound; }
  void put(uint64_t at, const Bytes& field)
  {
    for (uint64_t i = 0; i < field.size() && at + i < bytes_.size(); ++i)
    {
      bytes_[at + i] = field[i];
    }
  }

  Bytes& bytes_;
  std::mt19937_64 random_;
};

} // namespace test
