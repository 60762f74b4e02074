/// How much speaks for a place being a node.
#include <gtest/gtest.h>

#include "inspect/judged.h"
#include "inspect/walk/prober.h"

using namespace tav::inspect;

namespace
{

class Probing : public test::BothOrders
{
protected:
  /// Of a text with so many bytes between it and its pair.
  Belief beliefOf(uint16_t type, uint64_t between)
  {
    test::ByteRows text(GetParam());
    text.h64(5, TAV_INFO_EYE_SIZE, type, TAV_ELM_CMN_HOST_NAME).fill(5, 'a').fill(between, 0x5A).pair(16 + 5);
    ByteSource source("x", std::span<const uint8_t>(text.bytes));
    return Prober(source, form, 0).judge(0, true, text.bytes.size());
  }
};

} // namespace

INSTANTIATE_TEST_SUITE_P(Swapped, Probing, testing::Bool());

TEST_P(Probing, ATextMayHaveTwoBytesBeforeItsPairThatItDoesNotCount)
{
  EXPECT_EQ(beliefOf(TAV_TYPE_UTF8_STRING, 0), Belief::followed);
  EXPECT_EQ(beliefOf(TAV_TYPE_UTF8_STRING, 2), Belief::followed);
  for (const uint64_t between : {1U, 3U, 4U})
  {
    EXPECT_LT(beliefOf(TAV_TYPE_UTF8_STRING, between), Belief::followed) << between;
  }
  EXPECT_EQ(beliefOf(TAV_TYPE_ASCII_STRING, 0), Belief::followed);
  EXPECT_LT(beliefOf(TAV_TYPE_ASCII_STRING, 2), Belief::followed) << "only texts of a code page have them";
}
