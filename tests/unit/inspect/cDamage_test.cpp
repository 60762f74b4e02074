/// What the C interface does with damaged streams, and with numbers of other types than are asked for.
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/cHandles.h"
#include "support/byteRows.h"

using namespace test;
using testing::HasSubstr;

namespace
{

/// A root with a number and a text that says that it is longer than the stream.
Bytes cutText()
{
  ByteRows rows;
  rows.h64(20 + 16 + 8, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(7, 4);
  rows.h64(8, 0, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME).data(hex("61 62 63"));
  return rows.bytes;
}

constexpr tav_form kPlain{kBigEndianHost ? uint8_t{2} : uint8_t{1}, 64, 2};

} // namespace

TEST(CDamage, EndsAStepWithAMessage)
{
  const Bytes bytes = cutText();
  const CReader reader = openMemory(bytes, &kPlain);
  tav_node root{};
  ASSERT_EQ(tav_next_root(reader.get(), nullptr, &root), TAV_RC_OK) << tav_last_message(reader.get());
  tav_node child{};
  ASSERT_EQ(tav_first_child(reader.get(), &root, &child), TAV_RC_OK);
  EXPECT_EQ(child.elm, TAV_ELM_CMN_CPU_ONLINE);
  tav_node next{};
  EXPECT_EQ(tav_next_sibling(reader.get(), &child, &next), TAV_RC_NO_MEMORY);
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("the step from this node fails"));
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("/system"));
  uint64_t number = 0;
  EXPECT_EQ(tav_get_u64(reader.get(), &child, &number), TAV_RC_OK) << "the node before it can be read all the same";
  EXPECT_EQ(number, 7U);
}

TEST(CDamage, BetweenRootsEndsTheWalkOverThem)
{
  ByteRows rows;
  rows.h64(20, 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM);
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE).number(7, 4);
  rows.fill(100, 0x77);
  const CReader reader = openMemory(rows.bytes, &kPlain);
  tav_node root{};
  ASSERT_EQ(tav_next_root(reader.get(), nullptr, &root), TAV_RC_OK);
  tav_node next{};
  const uint32_t code = tav_next_root(reader.get(), &root, &next);
  EXPECT_NE(code, uint32_t{TAV_RC_OK});
  EXPECT_NE(code, uint32_t{TAV_RC_NOT_FOUND}) << "which would say that there is nothing more";
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("no node"));
  EXPECT_THAT(tav_last_message(reader.get()), HasSubstr("0x24"));
}

TEST(CNumbers, OfSignedTypesWith128BitsAreGivenWhereTheyAreNotNegative)
{
  const Bytes bytes = bytesOfJson(R"([{"element": "system", "children": [
      {"id": 1, "type": "Sint128", "value": 170141183460469231731687303715884105727},
      {"id": 2, "type": "Sint128", "value": -1},
      {"id": 3, "type": "Sint128", "value": 18446744073709551616},
      {"id": 4, "type": "Sint64", "value": -1},
      {"id": 5, "type": "Uint8", "value": 255}]}])");
  const CReader reader = openMemory(bytes, nullptr);
  uint64_t high = 0;
  uint64_t low = 0;
  tav_node node = found(reader, "/system/#1");
  EXPECT_EQ(tav_get_u128(reader.get(), &node, &high, &low), TAV_RC_OK);
  EXPECT_EQ(high, uint64_t{INT64_MAX});
  EXPECT_EQ(low, UINT64_MAX);
  node = found(reader, "/system/#3");
  EXPECT_EQ(tav_get_u128(reader.get(), &node, &high, &low), TAV_RC_OK);
  EXPECT_EQ(high, 1U);
  EXPECT_EQ(low, 0U);
  for (const char* const path : {"/system/#2", "/system/#4"})
  {
    node = found(reader, path);
    EXPECT_EQ(tav_get_u128(reader.get(), &node, &high, &low), TAV_RC_OUTSIDE_PARENT) << path;
  }
  node = found(reader, "/system/#5");
  EXPECT_EQ(tav_get_u128(reader.get(), &node, &high, &low), TAV_RC_OK);
  EXPECT_EQ(high, 0U);
  EXPECT_EQ(low, 255U);
}
