/// Validation and a plain checker say the same of random streams, sound and damaged.
#include <gtest/gtest.h>

#include <map>
#include <random>

#include "support/environment.h"
#include "support/plainChecker.h"
#include "support/reading.h"
#include "support/streams.h"

namespace
{

using namespace test;

/// A random tree in bytes, and where its headers are.
class RandomStream
{
public:
  RandomStream(uint64_t seed, const Form& form)
      : random_(seed), form_(form)
  {
    rootWide = !form.root32;
    addGroup(rootWide, 4, true);
    put(0, 8); // so that a pair at the stream's very end counts
    put(0, 8);
  }

  void damage()
  {
    for (uint64_t i = pick(3) + 1; i > 0 && !bytes.empty(); --i)
    {
      damageOnce();
    }
  }

  uint64_t pick(uint64_t below) { return random_() % below; }

  Bytes bytes;
  bool rootWide = true;

private:
  struct Place
  {
    uint64_t offset;
    bool wide;
  };

  void store(uint64_t at, uint64_t value, uint64_t length)
  {
    for (uint64_t i = 0; i < length && at + i < bytes.size(); ++i)
    {
      bytes[at + i] = static_cast<uint8_t>(value >> 8 * (form_.swap != kBigEndianHost ? length - 1 - i : i));
    }
  }

  void put(uint64_t value, uint64_t length)
  {
    bytes.resize(bytes.size() + length);
    store(bytes.size() - length, value, length);
  }

  void putHeader(bool wide, uint64_t size, uint32_t info, uint16_t type, uint16_t elm)
  {
    headers_.push_back({bytes.size(), wide});
    put(size, wide ? 8 : 4);
    if (wide)
    {
      put(info, 4);
    }
    put(type, 2);
    put(elm, 2);
  }

  void putPair(uint64_t distance)
  {
    put(0xC0DED5EEDDEC0DED, 8);
    put(distance, 8);
  }

  void addGroup(bool wide, uint64_t levels, bool root)
  {
    const uint16_t type = wide && pick(3) != 0 ? 2 : 1;
    const bool pair = wide && pick(3) == 0;
    const uint64_t start = bytes.size();
    const uint64_t content = start + (wide ? 16 : 8);
    putHeader(wide, 0, pair ? 0x00400000 : 0, type, static_cast<uint16_t>(pick(100)));
    for (uint64_t i = pick(5) + (root ? 1 : 0); i > 0; --i)
    {
      addNode(wide && type == 2, levels - 1);
    }
    if (pair)
    {
      const uint64_t before = bytes.size() - content;
      putHeader(type == 2, 16, 0, 101, 65001);
      putPair(before + (type == 2 ? 32 : 16));
    }
    const bool open = pair && pick(4) == 0;
    store(start, open ? ~uint64_t{0} : bytes.size() - content, wide ? 8 : 4);
  }

  void addNode(bool wide, uint64_t levels)
  {
    if (levels != 0 && pick(3) == 0)
    {
      addGroup(wide, levels, false);
      return;
    }
    static constexpr uint16_t types[] = {50, 51, 53, 55, 57, 101, 102, 106};
    const uint64_t size = pick(4) == 0 ? 0 : pick(40);
    const bool aligned = form_.align || (wide && pick(4) == 0);
    const bool pair = wide && pick(4) == 0;
    putHeader(wide, size, (aligned ? 0x00100000U : 0) | (pair ? 0x00400000U : 0), types[pick(std::size(types))],
              static_cast<uint16_t>(pick(100)));
    for (uint64_t i = 0; i < size; ++i)
    {
      put(pick(256), 1);
    }
    while (aligned && (bytes.size() - headers_.back().offset) % 8 != 0)
    {
      put(0, 1);
    }
    if (pair)
    {
      putPair(size + 16);
    }
  }

  void damageOnce()
  {
    const uint64_t any = pick(bytes.size());
    const Place header = headers_[pick(headers_.size())];
    const uint64_t width = header.wide ? 8 : 4;
    const uint64_t type = header.offset + (header.wide ? 12 : 4);
    static constexpr uint64_t sizes[] = {0, 1, 8, 100, 639, 640, 641, 0x7FFFFFFF, 0xFFFFFFFF,
                                         0x7FFFFFFFFFFFFFFF, ~uint64_t{0} - 16,
                                         ~uint64_t{0} - 1, ~uint64_t{0}};
    static constexpr uint64_t types[] = {0, 1, 2, 55, 101, 0xFFFF};
    switch (pick(9))
    {
    case 0: bytes[any] ^= static_cast<uint8_t>(1U << pick(8)); break;
    case 1: bytes[any] = static_cast<uint8_t>(pick(256)); break;
    case 2: store(header.offset, sizes[pick(std::size(sizes))], width); break;
    case 3: store(header.offset, pick(64), width); break;
    case 4: store(type, types[pick(std::size(types))], 2); break;
    case 5: store(type + 2, 65000 + pick(3), 2); break;
    case 6: store(type - 4, pick(4) << 20 | pick(0x800), header.wide ? 4 : 0); break;
    case 7: store(any, pick(2) != 0 ? 0xC0DED5EEDDEC0DED : 0xED0DECDDEED5DEC0, 8); break;
    default: bytes.resize(any); break;
    }
  }

  std::mt19937_64 random_;
  Form form_;
  std::vector<Place> headers_;
};

class ValidateAgrees : public testing::TestWithParam<Form>
{
protected:
  /// Compares both validations of one stream; returns the code of the one without containment.
  std::optional<uint32_t> compare(const RandomStream& stream)
  {
    PlainChecker checker(stream.bytes, GetParam());
    const std::optional<uint32_t> plain = checker.check(0, stream.rootWide, false);
    const std::optional<uint32_t> contained = checker.check(0, stream.rootWide, true);
    if (!plain || !contained)
    {
      return std::nullopt;
    }
    StreamReader reader(stream.bytes, GetParam());
    TAVHeader start = headerAt(reader.handle(), 0, stream.rootWide);
    EXPECT_EQ(tavValidateHierarchy(0, reader.handle(), &start), *plain);
    EXPECT_EQ(tavValidateSubtreeInt(1, reader.handle(), &start), *contained);
    return plain;
  }

  uint64_t seed = fromEnvironment("TAV_TEST_SEED", 20260401);
  uint64_t cases = fromEnvironment("TAV_TEST_CASES", 5000);
};

const auto kForms = testing::Values(Form{}, Form{.swap = true}, Form{.align = true}, Form{.swap = true, .root32 = true},
                                    Form{.buffered = true}, Form{.buffered = true, .swap = true},
                                    Form{.buffered = true, .align = true}, Form{.buffered = true, .root32 = true});
INSTANTIATE_TEST_SUITE_P(Forms, ValidateAgrees, kForms, [](const auto& form) { return formName(form.param); });

TEST_P(ValidateAgrees, OnSoundStreams)
{
  std::map<uint32_t, uint64_t> codes;
  for (uint64_t i = 0; i < cases && !HasFailure(); ++i)
  {
    SCOPED_TRACE("TAV_TEST_SEED=" + std::to_string(seed + i));
    const RandomStream stream(seed + i, GetParam());
    ++codes[compare(stream).value_or(~0U)];
  }
  EXPECT_GE(codes[TAV_RC_OK] * 10, cases * 8); // the others hold an open group whose pair does not lead back to it
}

TEST_P(ValidateAgrees, OnDamagedStreams)
{
  std::map<uint32_t, uint64_t> codes;
  for (uint64_t i = 0; i < cases && !HasFailure(); ++i)
  {
    SCOPED_TRACE("TAV_TEST_SEED=" + std::to_string(seed + i));
    RandomStream stream(seed + i, GetParam());
    stream.damage();
    ++codes[compare(stream).value_or(~0U)];
  }
  // Without these the comparison would say little.
  for (const uint32_t code : {TAV_RC_OK, TAV_RC_OUTSIDE_PARENT, TAV_RC_DATA_TOO_LARGE,
                              GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY})
  {
    EXPECT_GT(codes[code], cases / 100) << korCodeName(code);
  }
  EXPECT_LT(codes[~0U] * 10, cases); // the first node cannot be read, or the walk takes too long
}

} // namespace
