/// Contracts that surprise and that stay, as streams and programs rely on them: docs/safety.md names each.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/elements.h"
#include "support/reading.h"
#include "support/streams.h"
#include "support/vectorStorage.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint16_t kRoot = 1000;
constexpr uint16_t kBlob = 7;
constexpr uint16_t kOther = 8;
constexpr uint64_t kContainment = 1;

const auto kForms = testing::Values(Form{}, Form{.swap = true}, Form{.buffered = true},
                                    Form{.buffered = true, .swap = true});

class KeptContract : public testing::TestWithParam<Form>
{
};
INSTANTIATE_TEST_SUITE_P(Forms, KeptContract, kForms, kFormName);

TEST_P(KeptContract, ADescriptorThatAnAlignedHandleTookMisleadsReadersOfAnotherStream)
{
  Form aligned = GetParam();
  aligned.align = true;
  StreamWriter first(aligned);
  first.add(group64(kRoot));
  Element node = binary(kBlob, {1, 2, 3});
  TAVHeaderData data = node.data();
  ASSERT_EQ(tavAddElement(0, first.handle(), &data), TAV_RC_OK);
  EXPECT_EQ(data.header.hdr64.info, TAV_INFO_ALIGNED8);

  StreamWriter second(GetParam());
  second.add(group64(kRoot));
  ASSERT_EQ(tavAddElement(0, second.handle(), &data), TAV_RC_OK);
  const TAVHeader sibling = second.add(u32(kOther, 1));
  second.add(binary(kBlob, Bytes(64, 0)));
  second.close();
  EXPECT_EQ(sibling.nodeOffset, 16U + 16 + 3) << "no padding was written";

  StreamReader reader(second.bytes(), GetParam());
  TAVHeader root = headerAt(reader.handle(), 0);
  TAVHeader blob = headerAt(reader.handle(), 16);
  TAVHeaderData out{};
  tavGetNextChild(0, reader.handle(), &root, &blob, &out);
  EXPECT_EQ(out.header.nodeOffset, 16U + 16 + 8) << "but padding is skipped";
}

/// An open root with an element and an open group in it.
Bytes openStream(const Form& form)
{
  StreamWriter writer(form);
  writer.add(group64(kRoot));
  writer.add(u32(kOther, 1));
  writer.add(group64(kBlob));
  return writer.bytes();
}

TEST_P(KeptContract, ContainmentRefusesEveryOpenGroupButOneAtTheStart)
{
  StreamReader reader(openStream(GetParam()), GetParam());
  TAVHeader root = headerAt(reader.handle(), 0);
  EXPECT_EQ(root.hdr64.size, TAV_SIZE_UNKNOWN);
  EXPECT_EQ(tavValidateSubtreeInt(kContainment, reader.handle(), &root), TAV_RC_OUTSIDE_PARENT);
  EXPECT_NE(tavValidateSubtreeInt(0, reader.handle(), &root), TAV_RC_OUTSIDE_PARENT);
}

TEST_P(KeptContract, AWalkToTheEndOfAnOpenGroupEndsWithTheStorage)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  TAVHeader last = writer.add(u32(kOther, 1));
  StreamReader reader(writer.bytes(), GetParam());
  TAVHeader root = headerAt(reader.handle(), 0);
  TAVHeaderData out{};
  EXPECT_EQ(tavGetNextChild(0, reader.handle(), &root, &last, &out),
            GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY);
  EXPECT_EQ(tavValidateHierarchy(0, reader.handle(), &root),
            GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY);
}

TEST(KeptContractOfOptions, ACallersOwnDirectBitOverARingIsBelieved)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  writer.close();
  VectorStorage storage(64, writer.bytes(), VectorStorage::kReadOnly);
  Handle handle(storage, TAV_OPT_READ | TAV_OPT_DIRECT, {.buffered = true});
  TAVHeaderData out{};
  EXPECT_EQ(tavReadNodeInt(0, handle.get(), 0, true, &out), TAV_RC_NO_MEMORY) << "there is no block";
  Handle usual(storage, TAV_OPT_READ, {.buffered = true});
  EXPECT_EQ(tavReadNodeInt(0, usual.get(), 0, true, &out), TAV_RC_OK);
}

} // namespace
