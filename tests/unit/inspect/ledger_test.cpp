/// Where every byte of a damaged stream went, and what is said of the nodes beside lost ones.
#include <string>
#include <utility>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/judged.h"
#include "inspect/recover/ledger.h"

using namespace tav::inspect;
using test::ByteRows;
using test::Bytes;

namespace
{

constexpr uint16_t kUnknownElement = 12345;

/// A ledger of these bytes, and what it told.
class Kept
{
public:
  Kept(Bytes all, const tav::inspect::Form& form)
      : it(std::move(all), form), ledger(it.source, it.place,
                                         {.loss = [this](const Loss& loss) { losses.push_back(loss); },
                                          .doubt = [this](const Doubt& doubt) { doubts.push_back(doubt); }}) {}

  TAVHeader node(uint64_t offset = 0)
  {
    TAVHeader header{};
    EXPECT_TRUE(it.judge.prober().header(offset, true, it.bytes.size(), header));
    return header;
  }

  std::vector<Loss> losses{};
  std::vector<Doubt> doubts{};
  test::Judged it;
  Ledger ledger;
};

} // namespace

class Ledgers : public test::BothOrders
{
protected:
  /// What is said of a node with this payload behind lost bytes.
  std::vector<Doubt> doubtsOf(const Bytes& payload)
  {
    ByteRows node(GetParam());
    node.h64(payload.size(), 0, TAV_TYPE_BINARY, TAV_ELM_CMN_HOST_NAME).data(payload);
    Kept kept(node.bytes, form);
    kept.ledger.setDamaged(true);
    kept.ledger.comesBack(kept.node());
    EXPECT_EQ(kept.ledger.totals().doubts, kept.doubts.size());
    return kept.doubts;
  }

  static Bytes joined(const std::vector<Bytes>& parts)
  {
    Bytes all;
    for (const Bytes& part : parts)
    {
      all.insert(all.end(), part.begin(), part.end());
    }
    return all;
  }
};

INSTANTIATE_TEST_SUITE_P(Swapped, Ledgers, testing::Bool());

TEST_P(Ledgers, DoubtAPayloadThatIsMostlyEyeCatchersOfEitherOrder)
{
  for (const bool swap : {false, true})
  {
    const Bytes eye = test::eyeBytes(swap);
    const Bytes text(8, 'a');
    EXPECT_EQ(doubtsOf(joined({eye, text})).size(), 0U) << "half of it";
    EXPECT_EQ(doubtsOf(joined({text, eye, eye})).size(), 1U);
    EXPECT_EQ(doubtsOf(joined({eye, text, eye})).size(), 1U);
    EXPECT_EQ(doubtsOf(joined({{'a'}, eye, {'a', 'a'}, eye})).size(), 1U) << "at any offset";
    EXPECT_EQ(doubtsOf({eye.begin(), eye.end() - 1}).size(), 0U);
    const std::vector<Doubt> told = doubtsOf(eye);
    ASSERT_EQ(told.size(), 1U);
    EXPECT_EQ(told[0].offset, 0U);
    EXPECT_EQ(told[0].length, 24U);
    EXPECT_THAT(told[0].reason, testing::HasSubstr("most of its payload is eye catchers"));
  }
  EXPECT_TRUE(doubtsOf({}).empty());
}

TEST_P(Ledgers, DoubtTheNodeDirectlyBeforeLostBytesOnce)
{
  number(kUnknownElement);
  rows.fill(30, 0x5A);
  for (const uint64_t end : {uint64_t{20}, uint64_t{19}})
  {
    Kept kept(rows.bytes, form);
    kept.ledger.comesBack(kept.node());
    EXPECT_TRUE(kept.doubts.empty()) << "nothing is lost yet";
    kept.ledger.cameBackTo(end);
    kept.ledger.keep(20);
    kept.ledger.lose(30, "noise");
    kept.ledger.lose(50, "more noise");
    EXPECT_EQ(kept.doubts.size(), end == 20 ? 1U : 0U);
    ASSERT_EQ(kept.losses.size(), 2U);
    EXPECT_EQ(kept.losses[0].offset, 20U);
    EXPECT_EQ(kept.losses[0].length, 10U);
    EXPECT_EQ(kept.losses[1].offset, 30U);
    EXPECT_EQ(kept.losses[1].reason, "more noise");
    EXPECT_TRUE(kept.ledger.isDamaged());
    EXPECT_EQ(kept.ledger.totals().kept, 20U);
    EXPECT_EQ(kept.ledger.totals().lost, 30U);
    EXPECT_EQ(kept.ledger.totals().losses, 2U);
  }
}

TEST_P(Ledgers, CountZerosAtTheEndAsKeptAndWhatIsNotSearchedAsUnread)
{
  number();
  rows.fill(100);
  Kept zeros(rows.bytes, form);
  zeros.ledger.keep(20);
  zeros.ledger.keepZeros(rows.at());
  EXPECT_EQ(zeros.ledger.totals().zeros, 100U);
  EXPECT_EQ(zeros.ledger.totals().kept, 120U);
  EXPECT_EQ(zeros.it.place.position(), 120U);
  Kept unread(rows.bytes, form);
  unread.ledger.keep(20);
  unread.ledger.leaveUnread();
  EXPECT_EQ(unread.ledger.totals().unread, 100U);
  EXPECT_EQ(unread.ledger.totals().kept, 20U);
  EXPECT_EQ(unread.it.place.position(), 120U);
}

TEST_P(Ledgers, SayHowFarBeforeTheFileTheGroupOfAnEndElementBegan)
{
  const auto reason = [this](bool wide, uint64_t distance, uint64_t size = 16) {
    ByteRows end(GetParam());
    wide ? end.h64(size, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE)
         : end.h32(size, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE);
    end.pair(distance);
    ByteSource source("x", std::span<const uint8_t>(end.bytes));
    return reasonOfEnd(source, form, 0, wide);
  };
  EXPECT_EQ(reason(true, 16), "") << "at the start of the file";
  EXPECT_THAT(reason(true, 17), testing::HasSubstr("began 1 byte before the file"));
  EXPECT_THAT(reason(true, 116), testing::HasSubstr("began 100 bytes before the file"));
  EXPECT_EQ(reason(true, 116, 8), "") << "an end element has the size of its pair";
  EXPECT_EQ(reason(false, 0), "");
  EXPECT_THAT(reason(false, 1), testing::HasSubstr("began 1 byte before the file"));
}
