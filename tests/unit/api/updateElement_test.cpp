#include <cstdint>
#include <ostream>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "format/layout.h"
#include "support/rows.h"
#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace
{

using namespace tav;
using namespace tav::inside;
using namespace test;

constexpr uint16_t kCpu = 60110; // 0xEACE

using UpdateElement = OverForms;
INSTANTIATE_TEST_SUITE_P(Forms, UpdateElement, ::testing::ValuesIn(allForms()), kFormName);

/// What lies before a node's payload and behind it must stay.
void expectPayload(const Bytes& before, const Bytes& after, uint64_t start, const std::string& payload)
{
  Bytes expected = before;
  const Bytes bytes = hex(payload);
  std::copy(bytes.begin(), bytes.end(), expected.begin() + static_cast<ptrdiff_t>(start));
  EXPECT_EQ(toHex(after), toHex(expected));
}

TEST_P(UpdateElement, ReplacesThePayloadOfA64BitNodeAlone)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE);
  writer.add(group64(kRoot));
  Element node = u32(kCpu, 1, true, TAV_INFO_EYE_SIZE);
  node.header = writer.add(node);
  writer.add(binary(kBlob, {1, 2, 3}));
  const Bytes before = writer.bytes();
  node.payload = bytesOfValue(uint32_t{0x11223344});
  TAVHeaderData data = node.data();
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
  EXPECT_EQ(writer.length(), before.size());
  EXPECT_EQ(writer.handle()->pHdrStack->count, 1U);
  expectPayload(before, writer.bytes(), 32, isBigEndian(GetParam()) ? "11 22 33 44" : "44 33 22 11");
}

TEST_P(UpdateElement, ReplacesThePayloadOfA32BitNodeAlone)
{
  StreamWriter writer(GetParam());
  fillStorage(writer, 0xEE);
  writer.add(group32(kRoot));
  Element node = element(false, TAV_TYPE_UINT16, kCpu, {1, 2});
  node.header = writer.add(node);
  writer.add(binary(kBlob, {1, 2, 3}, false));
  writer.close();
  const Bytes before = writer.bytes();
  node.payload = bytesOfValue(uint16_t{0x1122});
  TAVHeaderData data = node.data();
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
  expectPayload(before, writer.bytes(), 16, isBigEndian(GetParam()) ? "11 22" : "22 11");
}

TEST_P(UpdateElement, ReachesANodeThatLiesFarBack)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  Element node = u32(kCpu, 1);
  node.header = writer.add(node);
  for (int i = 0; i < 50; ++i)
  {
    writer.add(binary(kBlob, Bytes(48)));
  }
  const Bytes before = writer.bytes();
  node.payload = bytesOfValue(uint32_t{0x11223344});
  TAVHeaderData data = node.data();
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
  expectPayload(before, writer.bytes(), 32, isBigEndian(GetParam()) ? "11 22 33 44" : "44 33 22 11");
  EXPECT_EQ(writer.add(binary(kBlob, {1})).nodeOffset, before.size());
}

TEST_P(UpdateElement, OfNoBytesChangesNothing)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  uint8_t nothing = 0;
  TAVHeaderData data{header64(0, TAV_TYPE_BINARY, kBlob), &nothing, 0, 0};
  check(tavAddElement(0, writer.handle(), &data), "tavAddElement");
  writer.add(u32(kCpu, 1));
  const Bytes before = writer.bytes();
  data.pDataBuf = nullptr;
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
  EXPECT_EQ(writer.bytes(), before);
}

TEST_P(UpdateElement, IsReadBackInTheHostsOrder)
{
  StreamWriter writer(GetParam());
  writer.add(group64(kRoot));
  Element node = element(true, TAV_TYPE_UINT64_ARRAY, kBlob, Bytes(16));
  node.header = writer.add(node);
  node.payload = hex("01 02 03 04 05 06 07 08 11 12 13 14 15 16 17 18");
  TAVHeaderData data = node.data();
  ASSERT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
  const Bytes all = writer.bytes();
  EXPECT_EQ(toHex({all.begin() + 32, all.begin() + 48}),
            rows(GetParam().swap ? "08 07 06 05 04 03 02 01 18 17 16 15 14 13 12 11"
                                 : "01 02 03 04 05 06 07 08 11 12 13 14 15 16 17 18"));
}

struct Reversal : Row
{
  uint16_t type;
  const char* payload;
  const char* reversed;
};

constexpr Reversal kReversals[] = {
    {"AsciiString", 50, "61 62 63", "61 62 63"},
    {"Sint16", 54, "01 02", "02 01"},
    {"Sint32", 56, "01 02 03 04", "04 03 02 01"},
    {"Sint64", 58, "01 02 03 04 05 06 07 08", "08 07 06 05 04 03 02 01"},
    {"Timestamp", 100, "00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F",
     "07 06 05 04 03 02 01 00 09 08 0B 0A 0D 0C 0F 0E"},
    {"Binary", 101, "01 02 03", "01 02 03"},
    {"Utf8String", 102, "01 02 61 62", "02 01 61 62"},
    {"Uint128", 103, "00 01 02 03 04 05 06 07 08 09 0A 0B 0C 0D 0E 0F",
     "0F 0E 0D 0C 0B 0A 09 08 07 06 05 04 03 02 01 00"},
    {"LongUint32", 55, "01 02 03 04 05 06", "04 03 02 01 05 06"},
    {"ShortUint32", 55, "01 02 03", "01 02 03"},
    {"ArrayWithAnIncompleteUnit", 106, "01 02 03 04 05 06 07 08 11", "08 07 06 05 04 03 02 01 11"},
};

class UpdatedPayload : public ::testing::TestWithParam<Reversal>
{
};

TEST_P(UpdatedPayload, IsReversedAsTheWriterReversesIt)
{
  for (const bool swap : {false, true})
  {
    StreamWriter writer({false, swap});
    writer.add(group64(kRoot));
    const Bytes payload = hex(GetParam().payload);
    Element node = element(true, GetParam().type, kBlob, Bytes(payload.size()));
    node.header = writer.add(node);
    node.payload = payload;
    TAVHeaderData data = node.data();
    ASSERT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
    const Bytes all = writer.bytes();
    EXPECT_EQ(toHex({all.begin() + 32, all.end()}), rows(swap ? GetParam().reversed : GetParam().payload));
  }
}

INSTANTIATE_TEST_SUITE_P(Types, UpdatedPayload, ::testing::ValuesIn(kReversals),
                         kRowName);

// A node of 4 bytes, type 55, id kCpu is in the stream.
struct Claim : Row
{
  uint32_t size;
  uint16_t type;
  uint16_t elm;
  uint32_t code;
  uint32_t point;
};

constexpr Claim kClaims[] = {
    {"Same", 4, 55, kCpu, TAV_RC_OK, 0},
    {"OtherElement", 4, 55, kBlob, TAV_RC_BAD_PARAM, 70},
    {"OtherTypeOfTheSameSize", 4, 56, kCpu, TAV_RC_BAD_PARAM, 70},
    {"Shorter", 3, 55, kCpu, TAV_RC_BAD_PARAM, 70},
    {"Longer", 5, 55, kCpu, TAV_RC_BAD_PARAM, 70},
    {"GroupOfType1", 4, 1, kCpu, TAV_RC_BAD_PARAM, 50},
    {"GroupOfType2", 4, 2, kCpu, TAV_RC_BAD_PARAM, 50},
};

class UpdateClaim : public ::testing::TestWithParam<std::tuple<Claim, bool>>
{
};

TEST_P(UpdateClaim, MatchesTheStoredNodeOrIsRefused)
{
  const auto& [row, wide] = GetParam();
  StreamWriter writer;
  writer.add(wide ? group64(kRoot) : group32(kRoot));
  const TAVHeader stored = writer.add(u32(kCpu, 7, wide));
  const Bytes before = writer.bytes();
  Bytes payload{1, 2, 3, 4, 5};
  TAVHeaderData data{wide ? header64(row.size, row.type, row.elm, 0, stored.nodeOffset)
                          : header32(row.size, row.type, row.elm, stored.nodeOffset),
                     payload.data(), payload.size(), 0};
  TraceLog trace;
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), row.code);
  if (row.code == TAV_RC_OK)
  {
    EXPECT_THAT(trace.failures(), IsEmpty());
    return;
  }
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::updateElement, row.point, row.code}));
  EXPECT_EQ(writer.bytes(), before);
}

INSTANTIATE_TEST_SUITE_P(Rows, UpdateClaim, ::testing::Combine(::testing::ValuesIn(kClaims), ::testing::Bool()),
                         kRowNameUnder);

TEST(UpdateElementHeader, MayDifferInItsInfo)
{
  StreamWriter writer(lowFirst());
  writer.add(group64(kRoot));
  Element node = u32(kCpu, 7, true, 0x123);
  node.header = writer.add(node);
  node.header.hdr64.info = TAV_INFO_EYE_SIZE;
  TAVHeaderData data = node.data();
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
  EXPECT_EQ(writer.handle()->pDirectData[24], 0x23);
  EXPECT_EQ(writer.length(), 36U); // no pair
}

TEST(UpdateElementHeader, OfAnUnknownFormMatchesNoNode)
{
  StreamWriter writer;
  writer.add(group32(kRoot));
  Element node = u32(kCpu, 7, false);
  node.header = writer.add(node);
  node.header.hdrType = 3;
  const Bytes before = writer.bytes();
  TAVHeaderData data = node.data();
  TraceLog trace;
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::updateElement, 70, TAV_RC_BAD_PARAM}));
  EXPECT_EQ(writer.bytes(), before);
}

TEST(UpdateElementMode, OfUpdatingChangesAStreamThatIsThere)
{
  Bytes block = hex("14 00 00 00 00 00 00 00 00 00 00 00 02 00 14 00"
                    "04 00 00 00 00 00 00 00 00 00 00 00 37 00 CE EA 01 00 00 00 00");
  TAVSSMemory storage(block.data(), block.size());
  Handle handle(storage, TAV_OPT_UPDATE, lowFirst());
  Bytes payload{9, 9, 9, 9};
  TAVHeaderData data{header64(4, TAV_TYPE_UINT32, kCpu, 0, 16), payload.data(), 4, 0};
  EXPECT_EQ(tavUpdateElement(0, handle.get(), &data), TAV_RC_OK);
  EXPECT_EQ(handle->streamBytes, 0U);
  EXPECT_EQ(toHex(block), rows("14 00 00 00 00 00 00 00 00 00 00 00 02 00 14 00"
                               "04 00 00 00 00 00 00 00 00 00 00 00 37 00 CE EA 09 09 09 09 00"));
}

TEST(UpdateElementPayload, IsAsLongAsTheHeaderSaysWhateverTheBufferSize)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  Element node = u32(kCpu, 7);
  node.header = writer.add(node);
  TAVHeaderData data = node.data();
  data.dataBufSize = 1;
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
}

TEST(UpdateElementPayload, MayBeTheStreamsOwnBytes)
{
  StreamWriter writer({false, true}); // in the other byte order, so that they are read and written crosswise
  writer.add(group64(kRoot));
  const TAVHeader header = writer.add(u32(kCpu, 0x11223344));
  TAVHeaderData data{};
  ASSERT_EQ(tavReadNodeInt(0, writer.handle(), header.nodeOffset, true, &data), TAV_RC_OK);
  ASSERT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
  EXPECT_EQ(Bytes(writer.handle()->pDirectData + 32, writer.handle()->pDirectData + 36),
            bytesOfValue(uint32_t{0x11223344}));
}

TEST(UpdateElementPayload, MissingIsRefused)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  const TAVHeader header = writer.add(u32(kCpu, 7));
  TAVHeaderData data{header, nullptr, 4, 0};
  TraceLog trace;
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::updateElement, 80, TAV_RC_BAD_PARAM}));
}

// What is wrong in a row is wrong in the rows above it, too.
TEST(UpdateElementChecks, AreMadeOneAfterAnotherBeforeReading)
{
  StreamReader reader(Bytes(64));
  StreamWriter writer;
  TAVHeaderData group{header64(4, TAV_TYPE_HEADER64, kCpu, 0, ~uint64_t{0}), nullptr, 0, 0};
  const struct
  {
    uint64_t options;
    TAVHandle* handle;
    TAVHeaderData* node;
    uint32_t code;
    uint32_t point;
  } checks[] = {
      {1, nullptr, nullptr, TAV_RC_BAD_PARAM, 10},
      {1, reader.handle(), nullptr, TAV_RC_BAD_PARAM, 20},
      {1, reader.handle(), &group, TAV_RC_WRONG_MODE, 30},
      {1, writer.handle(), &group, TAV_RC_BAD_OPTIONS, 40},
      {0, writer.handle(), &group, TAV_RC_BAD_PARAM, 50},
  };
  for (const auto& check : checks)
  {
    TraceLog trace;
    EXPECT_EQ(tavUpdateElement(check.options, check.handle, check.node), check.code) << check.point;
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::updateElement, check.point, check.code}));
  }
}

TEST(UpdateElementReading, OutsideTheBlockHandsTheReadersCodeUp)
{
  StreamWriter writer({}, 64);
  Bytes payload(4);
  for (const uint64_t offset : {uint64_t{49}, uint64_t{64}, ~uint64_t{0}, ~uint64_t{0} - 16})
  {
    TAVHeaderData data{header64(4, TAV_TYPE_UINT32, kCpu, 0, offset), payload.data(), 4, 0};
    TraceLog trace;
    EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_NO_MEMORY);
    EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::readNode, 60, TAV_RC_NO_MEMORY},
                                              Failure{probe::updateElement, 60, TAV_RC_NO_MEMORY}));
  }
}

TEST(UpdateElementReading, BehindTheStorageHandsTheReadersCodeUp)
{
  StreamWriter writer({.buffered = true});
  writer.add(group64(kRoot));
  Bytes payload(4);
  TAVHeaderData data{header64(4, TAV_TYPE_UINT32, kCpu, 0, 100000), payload.data(), 4, 0};
  TraceLog trace;
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failuresOf(probe::updateElement),
              ElementsAre(Failure{probe::updateElement, 60, TAV_RC_END_OF_STORAGE}));
}

TEST(UpdateElementReading, NeedsTheElementToFitIntoTheRing)
{
  StreamWriter writer({.buffered = true});
  writer.add(group64(kRoot));
  Element node = binary(kBlob, Bytes(641)); // the ring has 640
  node.header = writer.add(node);
  TAVHeaderData data = node.data();
  TraceLog trace;
  EXPECT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_DATA_TOO_LARGE);
  EXPECT_THAT(trace.failuresOf(probe::updateElement),
              ElementsAre(Failure{probe::updateElement, 60, TAV_RC_DATA_TOO_LARGE}));
}

TEST(UpdateElementReading, WithoutSinkHandsTheReadersCodeUp)
{
  Bytes payload(4);
  TAVHeaderData data{header64(4, TAV_TYPE_UINT32, kCpu), payload.data(), 4, 0};
  StreamWriter direct;
  direct.handle()->pDirectData = nullptr;
  EXPECT_EQ(tavUpdateElement(0, direct.handle(), &data), TAV_RC_NO_MEMORY);
  StreamWriter buffered({.buffered = true});
  const WithoutRing guard(buffered.handle());
  TraceLog trace;
  EXPECT_EQ(tavUpdateElement(0, buffered.handle(), &data), TAV_RC_NO_CIRCULAR_BUF);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::readNode, 30, TAV_RC_NO_CIRCULAR_BUF},
                                            Failure{probe::updateElement, 60, TAV_RC_NO_CIRCULAR_BUF}));
}

/// A block whose last byte is a node's.
struct FullBlock
{
  FullBlock(const Bytes& stream, const Form& form)
      : bytes(stream), storage(bytes.data(), bytes.size()), handle(storage, TAV_OPT_UPDATE, form)
  {
  }
  Bytes bytes;
  TAVSSMemory storage;
  Handle handle;
};

TEST(UpdateElementRoom, EndsBeforeTheLastByteOfTheBlock)
{
  // The second node ends at the block's end: it can be read, not updated.
  FullBlock block(hex("02 00 00 00 35 00 CE EA 01 02 02 00 00 00 35 00 CE EA 03 04"), lowFirst());
  Bytes payload{9, 9};
  TAVHeaderData last{header32(2, TAV_TYPE_UINT16, kCpu, 10), payload.data(), 2, 0};
  TraceLog trace;
  EXPECT_EQ(tavUpdateElement(0, block.handle.get(), &last), TAV_RC_END_OF_STORAGE);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 30, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::updateElement, 80, TAV_RC_END_OF_STORAGE}));
  TAVHeaderData first{header32(2, TAV_TYPE_UINT16, kCpu, 0), payload.data(), 2, 0};
  EXPECT_EQ(tavUpdateElement(0, block.handle.get(), &first), TAV_RC_OK);
  EXPECT_EQ(toHex(block.bytes), rows("02 00 00 00 35 00 CE EA 09 09 02 00 00 00 35 00 CE EA 03 04"));
}

TEST(UpdateElementRoom, IsAskedForAWholeArrayBeforeAnyOfItIsReversed)
{
  constexpr uint64_t size = 4096;
  constexpr bool swap = true;
  Bytes before(16 + size, 0xAA); // ends with the array
  tav::layout::encodeHeader(header64(size, TAV_TYPE_UINT64_ARRAY, kBlob), swap, before.data());
  FullBlock block(before, {.swap = swap});
  Bytes payload(size, 0x55);
  TAVHeaderData data{header64(size, TAV_TYPE_UINT64_ARRAY, kBlob), payload.data(), size, 0};
  const TraceLog trace;
  EXPECT_EQ(tavUpdateElement(0, block.handle.get(), &data), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(block.bytes, before);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::rawWrite, 30, TAV_RC_END_OF_STORAGE},
                                            Failure{probe::updateElement, 80, TAV_RC_END_OF_STORAGE}));
}

TEST(UpdateElementRoom, IsNeededByANodeOfNoBytesToo)
{
  FullBlock block(hex("00 00 00 00 65 00 61 EA"), lowFirst());
  uint8_t nothing = 0;
  TAVHeaderData data{header32(0, TAV_TYPE_BINARY, kBlob), &nothing, 0, 0};
  EXPECT_EQ(tavUpdateElement(0, block.handle.get(), &data), TAV_RC_END_OF_STORAGE);
}

TEST(UpdateElementTrace, ShowsArgumentsAndThePosition)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  Element node = u32(kCpu, 7);
  node.header = writer.add(node);
  TAVHandle* const handle = writer.handle();
  TAVHeaderData data = node.data();
  TraceLog trace;
  ASSERT_EQ(tavUpdateElement(0, handle, &data), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::updateElement, 0).items,
              ElementsAre(bytesOf(uint64_t{0}), bytesOf(handle), "tav element data", bytesOf(data)));
  EXPECT_THAT(trace.dump(probe::updateElement, 100).items, ElementsAre(bytesOf(uint64_t{36})));
  EXPECT_THAT(trace.stepsOf(probe::updateElement),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::updateElement, 0}, Step{KOR_TRACE_VAR, probe::updateElement, 0},
                          Step{KOR_TRACE_VAR, probe::updateElement, 100},
                          Step{KOR_TRACE_EXIT, probe::updateElement, 0}));
}

TEST(UpdateElementTrace, ReadsTheNodeWithoutOptions)
{
  StreamWriter writer;
  writer.add(group64(kRoot));
  Element node = u32(kCpu, 7);
  node.header = writer.add(node);
  TAVHeaderData data = node.data();
  TraceLog trace;
  ASSERT_EQ(tavUpdateElement(0, writer.handle(), &data), TAV_RC_OK);
  const Record read = trace.dump(probe::readNode, 0);
  EXPECT_EQ(read.items.at(0), bytesOf(uint64_t{0}));
  EXPECT_EQ(read.items.at(2), bytesOf(uint64_t{16}));
  EXPECT_EQ(read.items.at(3), bytesOf(true));
}

TEST(UpdateElementTrace, CarriesItsProbe)
{
  EXPECT_EQ(probe::updateElement, 0x088A0008U);
}

} // namespace
