/// The fast way of appending and closing, without the operations that follow it: "not here" has stored nothing.
#include <array>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "core/append.h"
#include "core/close.h"
#include "support/reading.h"
#include "support/streams.h"

namespace
{

using namespace test;
using tav::core::kNotHere;

constexpr uint16_t kRoot = 1000;
constexpr uint16_t kChild = 1001;

template<class Form>
uint32_t append(TAVHandle& handle, TAVHeaderData& node)
{
  using Block = tav::core::BlockBytes<Form>;
  using Ring = tav::core::RingBytes<Form>;
  return tav::core::isDirect(handle) ? tav::core::append<true>(Block(handle), handle, node)
                                     : tav::core::append<true>(Ring(handle), handle, node);
}

/// Pages that hold all of the stream.
Form formOf(bool buffered)
{
  return {.buffered = buffered, .pageBytes = 4096, .ringBytes = 4 * 4096};
}

class FastAppend : public testing::TestWithParam<bool>
{
protected:
  FastAppend() { writer.add(group64(kRoot)); }

  /// What of the handle an append changes, and the bytes of the block or the ring.
  std::string state()
  {
    TAVHandle& handle = *writer.handle();
    const bool direct = handle.pCircularBuf == nullptr;
    const uint8_t* const bytes = direct ? handle.pDirectData : handle.pCircularBuf->pRing;
    const uint64_t size = direct ? handle.directDataSize : handle.pCircularBuf->ringSize;
    return bytesOf(handle) + std::to_string(handle.pHdrStack->count) +
           std::string(reinterpret_cast<const char*>(bytes), size);
  }

  template<class Form>
  void expectNotHere(Element element)
  {
    TAVHeaderData node = element.data();
    expectNotHere<Form>(node);
  }

  template<class Form>
  void expectNotHere(TAVHeaderData& node)
  {
    const std::string header = bytesOf(node);
    const std::string before = state();
    EXPECT_EQ(append<Form>(*writer.handle(), node), kNotHere);
    EXPECT_EQ(state(), before);
    EXPECT_EQ(bytesOf(node), header);
  }

  StreamWriter writer{formOf(GetParam()), 256};
};

INSTANTIATE_TEST_SUITE_P(Access, FastAppend, testing::Bool());

TEST_P(FastAppend, OfAnyFormWritesWhatTheOperationWrites)
{
  for (Element element : {u32(kChild, 7), u32(kChild, 8, true, TAV_INFO_EYE_SIZE), group64(kChild)})
  {
    TAVHeaderData node = element.data();
    EXPECT_EQ(append<tav::core::AnyForm>(*writer.handle(), node), TAV_RC_OK);
  }
  StreamWriter operations(formOf(GetParam()), 256);
  operations.add(group64(kRoot));
  operations.add(u32(kChild, 7));
  operations.add(u32(kChild, 8, true, TAV_INFO_EYE_SIZE));
  operations.add(group64(kChild));
  EXPECT_EQ(writer.bytes(), operations.bytes());
}

TEST_P(FastAppend, InHostFormLeavesGroupsAndPairsToTheNextWay)
{
  expectNotHere<tav::core::HostForm>(group64(kChild));
  expectNotHere<tav::core::HostForm>(u32(kChild, 8, true, TAV_INFO_EYE_SIZE));
}

TEST_P(FastAppend, LeavesAPayloadThatIsNotWholeToTheOperation)
{
  Element element = u32(kChild, 7);
  TAVHeaderData node = element.data();
  node.dataBufSize = 3;
  expectNotHere<tav::core::HostForm>(node);
  expectNotHere<tav::core::AnyForm>(node);
  node.dataBufSize = 4;
  node.pDataBuf = nullptr;
  expectNotHere<tav::core::HostForm>(node);
  expectNotHere<tav::core::AnyForm>(node);
}

TEST_P(FastAppend, TakesAPayloadThatIsAllThereOrMore)
{
  for (const uint64_t more : {0U, 1U, 100U})
  {
    Element element = u32(kChild, 7);
    TAVHeaderData node = element.data();
    node.dataBufSize += more;
    EXPECT_EQ(append<tav::core::HostForm>(*writer.handle(), node), TAV_RC_OK);
    EXPECT_EQ(append<tav::core::AnyForm>(*writer.handle(), node), TAV_RC_OK);
  }
}

/// Most callers fill in the header alone: they pay no more than those who give the payload's size, too.
TEST_P(FastAppend, TakesAPayloadWhoseSizeIsLeftToTheHeader)
{
  for (Element element : {u32(kChild, 7), u64(kChild, 8), ascii(kChild, "text")})
  {
    TAVHeaderData node = element.data();
    node.dataBufSize = 0;
    EXPECT_EQ(append<tav::core::HostForm>(*writer.handle(), node), TAV_RC_OK);
    EXPECT_EQ(append<tav::core::AnyForm>(*writer.handle(), node), TAV_RC_OK);
  }
}

TEST_P(FastAppend, LeavesANodeWithoutRoomToTheOperation)
{
  for (const uint64_t size : {uint64_t{5000}, ~uint64_t{0} / 2, ~uint64_t{0} - 16, ~uint64_t{0}})
  {
    Element element = u32(kChild, 7);
    TAVHeaderData node = element.data();
    node.header.hdr64.size = size;
    node.dataBufSize = size;
    expectNotHere<tav::core::HostForm>(node);
    expectNotHere<tav::core::AnyForm>(node);
  }
}

TEST_P(FastAppend, LeavesAChildOfTheOtherFormToTheOperation)
{
  writer.add(group64(kChild, TAV_TYPE_HEADER32));
  expectNotHere<tav::core::HostForm>(u32(kChild, 7));
  expectNotHere<tav::core::AnyForm>(u32(kChild, 7));
}

TEST_P(FastAppend, LeavesAGroupForWhichTheStackHasToGrowToTheOperation)
{
  writer.handle()->pHdrStack->capacity = 1;
  expectNotHere<tav::core::AnyForm>(group64(kChild));
  writer.handle()->pHdrStack->capacity = 1000;
}

/// Turning a payload in its own place would read what is turned already.
TEST(Payload, IsApartWhereItTouchesNoByteOfItsPlace)
{
  const std::vector<uint8_t> bytes(100);
  const uint8_t* const to = bytes.data() + 40;
  constexpr uint64_t kLength = 20;
  EXPECT_TRUE(tav::core::isApart(bytes.data() + 36, 4, to, kLength));
  EXPECT_FALSE(tav::core::isApart(bytes.data() + 37, 4, to, kLength));
  EXPECT_FALSE(tav::core::isApart(bytes.data() + 45, 4, to, kLength));
  EXPECT_FALSE(tav::core::isApart(bytes.data() + 59, 4, to, kLength));
  EXPECT_TRUE(tav::core::isApart(bytes.data() + 60, 4, to, kLength));
}

TEST(Payload, IsTurnedAsItsTypeSays)
{
  const std::array<uint8_t, 6> payload{1, 2, 3, 4, 5, 6};
  std::array<uint8_t, 6> to{};
  tav::core::encodePayload(TAV_TYPE_UINT32, true, payload.data(), 4, to.data());
  EXPECT_EQ(to, (std::array<uint8_t, 6>{4, 3, 2, 1, 0, 0}));
  tav::core::encodePayload(TAV_TYPE_UINT32, false, payload.data(), 6, to.data());
  EXPECT_EQ(to, payload);
}

TEST_P(FastAppend, InTheOtherOrderLeavesAPayloadInItsOwnPlaceToTheOperation)
{
  writer.handle()->swapBytes = 1;
  Element element = u32(kChild, 7);
  TAVHeaderData node = element.data();
  TAVHandle& handle = *writer.handle();
  uint8_t* const bytes = GetParam() ? handle.pCircularBuf->pRing : handle.pDirectData;
  node.pDataBuf = bytes + handle.streamBytes + 17;
  expectNotHere<tav::core::AnyForm>(node);
  node.pDataBuf = element.payload.data();
  EXPECT_EQ(append<tav::core::AnyForm>(handle, node), TAV_RC_OK);
  writer.handle()->swapBytes = 0;
}

TEST_P(FastAppend, ClosesNoGroupWithAnEndElement)
{
  writer.add(group64(kChild, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  const std::string before = state();
  using Block = tav::core::BlockBytes<tav::core::AnyForm>;
  using Ring = tav::core::RingBytes<tav::core::AnyForm>;
  EXPECT_EQ(GetParam() ? tav::core::closeGroup<Ring>(*writer.handle()) : tav::core::closeGroup<Block>(*writer.handle()),
            kNotHere);
  EXPECT_EQ(state(), before);
}

} // namespace
