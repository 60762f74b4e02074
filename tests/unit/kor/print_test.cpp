#include "tav/kor.h"

#include <algorithm>
#include <array>
#include <cinttypes>
#include <gtest/gtest.h>
#include <string>

namespace
{
/// A buffer that shows which of its bytes were written.
class Buffer
{
public:
  Buffer() { bytes_.fill(kUntouched); }

  char* data() { return bytes_.data(); }
  std::string text() const { return bytes_.data(); }
  bool isUntouchedFrom(std::size_t place) const
  {
    return std::all_of(bytes_.begin() + static_cast<std::ptrdiff_t>(place), bytes_.end(),
                       [](char byte) { return byte == kUntouched; });
  }

private:
  static constexpr char kUntouched = '#';
  std::array<char, 64> bytes_{};
};

TEST(Print, FormatsWhatFits)
{
  Buffer buffer;
  EXPECT_EQ(korSnprintf(buffer.data(), 64, "%s %" PRIu64 " 0x%04X", "node", UINT64_MAX, 0xABu), TAV_RC_OK);
  EXPECT_EQ(buffer.text(), "node 18446744073709551615 0x00AB");
  EXPECT_TRUE(buffer.isUntouchedFrom(33));
}

TEST(Print, ATextIsCutWhereTheRoomEnds)
{
  struct Row
  {
    uint64_t room;
    uint32_t code;
    const char* text;
  };
  for (const Row& row : {Row{6, TAV_RC_OK, "12345"}, Row{5, TAV_RC_NO_MEMORY, "1234"}, Row{1, TAV_RC_NO_MEMORY, ""}})
  {
    Buffer buffer;
    EXPECT_EQ(korSnprintf(buffer.data(), row.room, "%s", "12345"), row.code) << row.room;
    EXPECT_EQ(buffer.text(), row.text);
    EXPECT_TRUE(buffer.isUntouchedFrom(row.room)) << row.room;
  }
}

TEST(Print, NoRoomAtAllWritesNothing)
{
  Buffer buffer;
  EXPECT_EQ(korSnprintf(buffer.data(), 0, "%s", "12345"), TAV_RC_NO_MEMORY);
  EXPECT_TRUE(buffer.isUntouchedFrom(0));
}

TEST(Print, NeedsABuffer)
{
  EXPECT_EQ(korSnprintf(nullptr, 0, "%s", "12345"), TAV_RC_BAD_PARAM);
  EXPECT_EQ(korSnprintf(nullptr, 64, "%s", "12345"), TAV_RC_BAD_PARAM);
}

TEST(Print, NeedsAFormat)
{
  Buffer buffer;
  const char* const none = nullptr;
  EXPECT_EQ(korSnprintf(buffer.data(), 64, none), TAV_RC_BAD_PARAM);
  EXPECT_EQ(buffer.text(), "");
  EXPECT_TRUE(buffer.isUntouchedFrom(1));
}
} // namespace
