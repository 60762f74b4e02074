/// The fast way of the steps, without the operations that follow it: what it answers, and that "not here" leaves
/// everything as it was.
#include <cstring>
#include <ostream>
#include <tuple>

#include <gtest/gtest.h>

#include "core/step.h"
#include "support/reading.h"
#include "support/streams.h"

namespace
{

using namespace test;
using tav::core::kNotHere;

constexpr uint16_t kRoot = 1000;
constexpr uint16_t kChild = 1001;

/// What is under the root of a stream, and behind its first child.
struct Case
{
  const char* name;
  Element first;
  Element second;
  uint32_t toFirst;
  uint32_t toSecond;
};

std::ostream& operator<<(std::ostream& out, const Case& one)
{
  return out << one.name;
}

template<class Bytes>
uint32_t stepOver(TAVHandle& handle, const TAVHeader& parent, const TAVHeader* before, TAVHeaderData& out)
{
  EXPECT_TRUE(Bytes::canRead(handle));
  return before == nullptr ? tav::core::nextChild<true, true>(Bytes(handle), handle, parent, nullptr, out)
                           : tav::core::nextChild<true, false>(Bytes(handle), handle, parent, before, out);
}

template<class Form>
uint32_t stepIn(TAVHandle& handle, const TAVHeader& parent, const TAVHeader* before, TAVHeaderData& out)
{
  return tav::core::isDirect(handle) ? stepOver<tav::core::BlockBytes<Form>>(handle, parent, before, out)
                                     : stepOver<tav::core::RingBytes<Form>>(handle, parent, before, out);
}

/// Takes a step that must answer so; "not here" must have stored nothing, anything else is what the operation gives.
template<class Form>
void expectStep(TAVHandle* handle, TAVHeader& parent, TAVHeader* before, uint32_t wanted)
{
  Untouched out;
  EXPECT_EQ(stepIn<Form>(*handle, parent, before, out.data), wanted);
  EXPECT_EQ(out.isUntouched(), wanted != TAV_RC_OK);
  TAVHeaderData operation{};
  const uint32_t rc = tavGetNextChild(0, handle, &parent, before, &operation);
  if (wanted == kNotHere)
  {
    return;
  }
  ASSERT_EQ(rc, wanted);
  if (rc == TAV_RC_OK)
  {
    EXPECT_EQ(bytesOf(out.data.header.hdr64), bytesOf(operation.header.hdr64));
    EXPECT_EQ(out.data.header.nodeOffset, operation.header.nodeOffset);
    EXPECT_EQ(out.data.pDataBuf, operation.pDataBuf);
    EXPECT_EQ(out.data.dataBufSize, operation.dataBufSize);
  }
}

/// For bytes in host order: behind a pair, or an element that ends a group, no sibling is here.
class FastStep : public testing::TestWithParam<std::tuple<bool, Case>>
{
};

TEST_P(FastStep, AnswersOrStoresNothing)
{
  const auto& [buffered, one] = GetParam();
  StreamWriter writer({.buffered = buffered});
  writer.add(group64(kRoot));
  TAVHeader first = writer.add(one.first);
  if (first.hdr64.type == TAV_TYPE_HEADER64 && first.hdr64.size == TAV_SIZE_UNKNOWN)
  {
    writer.close();
  }
  writer.add(one.second);
  writer.close();
  StreamReader reader(writer.bytes(), {.buffered = buffered, .pageBytes = 4096, .ringBytes = 4096});
  TAVHeader root = headerAt(reader.handle(), 0);
  first = headerAt(reader.handle(), first.nodeOffset);
  expectStep<tav::core::HostForm>(reader.handle(), root, nullptr, one.toFirst);
  expectStep<tav::core::HostForm>(reader.handle(), root, &first, one.toSecond);
  expectStep<tav::core::AnyForm>(reader.handle(), root, nullptr, TAV_RC_OK);
  expectStep<tav::core::AnyForm>(reader.handle(), root, &first,
                                 tav::layout::isEndElement(first.hdr64.elm) ? TAV_RC_NO_MORE_CHILDREN : TAV_RC_OK);
}

INSTANTIATE_TEST_SUITE_P(
    Nodes, FastStep,
    testing::Combine(testing::Bool(),
                     testing::Values(Case{"elements", u32(kChild, 1), u32(kChild, 2), TAV_RC_OK, TAV_RC_OK},
                                     Case{"group", group64(kChild), u32(kChild, 2), TAV_RC_OK, TAV_RC_OK},
                                     Case{"pair", u32(kChild, 1, true, TAV_INFO_EYE_SIZE), u32(kChild, 2), TAV_RC_OK,
                                          kNotHere},
                                     Case{"end", u32(TAV_ELM_CMN_END_HDR_MARKER, 1), u32(kChild, 2), TAV_RC_OK,
                                          kNotHere})));

class FastStepOnDamage : public testing::TestWithParam<bool>
{
protected:
  FastStepOnDamage()
      : reader(stream(), {.buffered = GetParam(), .pageBytes = 4096, .ringBytes = 4096}), root(headerAt(handle(), 0)),
        child(headerAt(handle(), 16))
  {
  }

  static Bytes stream()
  {
    StreamWriter writer({.buffered = GetParam()});
    writer.add(group64(kRoot));
    writer.add(u32(kChild, 1));
    writer.add(u32(kChild, 2));
    writer.close();
    return writer.bytes();
  }

  TAVHandle* handle() { return reader.handle(); }

  /// The step to the sibling in either form.
  void expectSibling(uint32_t wanted)
  {
    expectStep<tav::core::HostForm>(handle(), root, &child, wanted);
    expectStep<tav::core::AnyForm>(handle(), root, &child, wanted);
  }

  StreamReader reader;
  TAVHeader root;
  TAVHeader child;
};

INSTANTIATE_TEST_SUITE_P(Access, FastStepOnDamage, testing::Bool());

TEST_P(FastStepOnDamage, EndsWhereTheParentEnds)
{
  child.nodeOffset = root.hdr64.size - 4;
  expectSibling(TAV_RC_NO_MORE_CHILDREN);
}

TEST_P(FastStepOnDamage, LeavesASiblingPastTheParentToTheOperation)
{
  child.hdr64.size = root.hdr64.size;
  expectSibling(kNotHere);
}

TEST_P(FastStepOnDamage, LeavesSumsPast64BitsToTheOperation)
{
  for (const uint64_t size : {TAV_SIZE_UNKNOWN, TAV_SIZE_UNKNOWN - 15, TAV_SIZE_UNKNOWN - 16, TAV_SIZE_UNKNOWN - 31})
  {
    child.hdr64.size = size;
    expectSibling(kNotHere);
  }
  child.hdr64.size = 4;
  for (const uint64_t size : {TAV_SIZE_UNKNOWN, TAV_SIZE_UNKNOWN - 1, TAV_SIZE_UNKNOWN - 15})
  {
    root.hdr64.size = size;
    expectSibling(kNotHere);
  }
}

TEST_P(FastStepOnDamage, LeavesAnOpenGroupToTheOperation)
{
  child.hdr64 = {TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, kChild};
  expectSibling(kNotHere);
  child.hdr64.elm = TAV_ELM_CMN_END_HDR_EYE_SIZE; // which is asked after the size
  expectSibling(kNotHere);
}

TEST_P(FastStepOnDamage, LeavesAReferenceOfTheOtherFormToTheOperation)
{
  child.hdrType = TAV_HDR_32;
  expectSibling(kNotHere);
}

TEST_P(FastStepOnDamage, LeavesDataThatAreNotThereToTheOperation)
{
  const uint64_t large = 5000;
  uint8_t* const size = (GetParam() ? handle()->pCircularBuf->pRing : handle()->pDirectData) + 16 + 20;
  std::memcpy(size, &large, sizeof large);
  expectSibling(kNotHere);
}

} // namespace
