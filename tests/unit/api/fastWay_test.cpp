/// What the fast ways leave to the operations: the answer is the same with and without one.
#include <cstdint>
#include <cstdio>
#include <functional>
#include <memory>
#include <string>
#include <utility>

#include <gtest/gtest.h>

#include "support/reading.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint16_t kStart = 1000;
constexpr uint16_t kOther = 8;

/// The code that a call gives, which must not depend on a trace.
uint32_t codeOf(const std::function<uint32_t()>& call)
{
  const uint32_t fast = call();
  const TraceLog trace;
  EXPECT_EQ(call(), fast) << "with a trace";
  return fast;
}

Bytes smallStream()
{
  StreamWriter writer;
  writer.add(group64(kStart));
  writer.add(u32(kOther, 1));
  writer.add(u32(kOther, 2));
  writer.close();
  return writer.bytes();
}

TEST(FastSearch, NeedsAStackToGoOnWith)
{
  StreamReader reader(smallStream());
  TAVHeader root = headerAt(reader.handle(), 0);
  TAVHeader resume = headerAt(reader.handle(), 16);
  TAVHeaderData out{};
  EXPECT_EQ(codeOf([&] { return tavFindElmInt(reader.handle(), &root, 0, 0, 0, kOther, &resume, nullptr, &out); }),
            TAV_RC_BAD_PARAM);
}

TEST(FastSearch, NeedsAStackThatHoldsTheParentToGoOnWith)
{
  StreamReader reader(smallStream());
  TAVHeader root = headerAt(reader.handle(), 0);
  TAVHeader resume = headerAt(reader.handle(), 16);
  TAVHdrStack stack;
  TAVHeaderData out{};
  EXPECT_EQ(codeOf([&] { return tavFindElmInt(reader.handle(), &root, 0, 0, 0, kOther, &resume, &stack, &out); }),
            TAV_RC_BAD_PARAM);
}

TEST(FastSearch, FindsNothingInABlockThatIsNotThere)
{
  StreamReader reader(smallStream());
  TAVHeader root = headerAt(reader.handle(), 0);
  reader.handle()->pDirectData = nullptr;
  TAVHeaderData out{};
  EXPECT_EQ(codeOf([&] { return tavFindElmInt(reader.handle(), &root, 0, 0, 0, kOther, nullptr, nullptr, &out); }),
            TAV_RC_NOT_FOUND);
}

TEST(FastSearch, FindsNothingBehindANodeOfTheOtherForm)
{
  StreamReader reader(smallStream());
  TAVHeader root = headerAt(reader.handle(), 0);
  TAVHeader resume = header32(4, TAV_TYPE_UINT32, kOther, 16);
  TAVHdrStack stack;
  ASSERT_EQ(stack.push(&root), TAV_RC_OK);
  TAVHeaderData out{};
  EXPECT_EQ(codeOf([&] { return tavFindElmInt(reader.handle(), &root, 0, 0, 0, kOther, &resume, &stack, &out); }),
            TAV_RC_NOT_FOUND);
  EXPECT_EQ(stack.count, 1U);
}

TEST(FastStep, NeedsTheRingOfAHandleThatIsNotDirect)
{
  StreamReader reader(smallStream(), {.buffered = true});
  TAVHeader root = headerAt(reader.handle(), 0);
  const WithoutRing without(reader.handle());
  TAVHeaderData out{};
  EXPECT_EQ(codeOf([&] { return tavGetNextChild(0, reader.handle(), &root, nullptr, &out); }), TAV_RC_NO_CIRCULAR_BUF);
}

TEST(FastAdd, NeedsHandleAndDescriptor)
{
  for (const bool buffered : {false, true})
  {
    StreamWriter writer({.buffered = buffered});
    writer.add(group64(kStart));
    EXPECT_EQ(codeOf([&] { return tavAddElement(0, writer.handle(), nullptr); }), TAV_RC_BAD_PARAM);
  }
  Element node = u32(kOther, 1);
  TAVHeaderData data = node.data();
  EXPECT_EQ(codeOf([&] { return tavAddElement(0, nullptr, &data); }), TAV_RC_BAD_PARAM);
}

TEST(FastAdd, NeedsTheRingOfAHandleThatIsNotDirect)
{
  StreamWriter writer({.buffered = true});
  writer.add(group64(kStart));
  const WithoutRing without(writer.handle());
  for (Element node : {group64(kOther), u32(kOther, 1)})
  {
    TAVHeaderData data = node.data();
    EXPECT_EQ(codeOf([&] { return tavAddElement(0, writer.handle(), &data); }), TAV_RC_NO_CIRCULAR_BUF);
  }
}

TEST(FastAdd, NeedsTheBlockOfADirectHandle)
{
  StreamWriter writer;
  writer.add(group64(kStart));
  uint8_t* const block = std::exchange(writer.handle()->pDirectData, nullptr);
  for (Element node : {group64(kOther), u32(kOther, 1)})
  {
    TAVHeaderData data = node.data();
    EXPECT_EQ(codeOf([&] { return tavAddElement(0, writer.handle(), &data); }), TAV_RC_NO_MEMORY);
  }
  EXPECT_EQ(codeOf([&] { return tavCloseHeader(0, writer.handle()); }), TAV_RC_NO_MEMORY);
  writer.handle()->pDirectData = block;
}

TEST(FastClose, NeedsAHandle)
{
  EXPECT_EQ(codeOf([] { return tavCloseHeader(0, nullptr); }), TAV_RC_BAD_PARAM);
}

TEST(FastAdd, IsRefusedByAReader)
{
  StreamReader reader(smallStream());
  Element node = u32(kOther, 1);
  TAVHeaderData data = node.data();
  EXPECT_EQ(codeOf([&] { return tavAddElement(0, reader.handle(), &data); }), TAV_RC_WRONG_MODE);
}

TEST(FastAdd, RefusesAHeaderOfNoKnownForm)
{
  StreamWriter writer;
  writer.add(group64(kStart));
  Element node = u32(kOther, 1);
  node.header.hdrType = 7;
  TAVHeaderData data = node.data();
  EXPECT_EQ(codeOf([&] { return tavAddElement(0, writer.handle(), &data); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(writer.length(), 16U);
}

TEST(FastAdd, TakesNothingBeforeAnEmptyStackForTheOpenGroup)
{
  for (const bool buffered : {false, true})
  {
    StreamWriter writer({.buffered = buffered});
    TAVHdrStack& stack = *writer.handle()->pHdrStack;
    TAVHeader entries[2] = {group64(kStart).header, {}};
    TAVHeader* const own = std::exchange(stack.pEntries, &entries[1]);
    Element node = u32(kOther, 1);
    TAVHeaderData data = node.data();
    EXPECT_EQ(codeOf([&] { return tavAddElement(0, writer.handle(), &data); }), TAV_RC_BAD_CHILD_HDR);
    stack.pEntries = own;
  }
}

/// A payload that is turned in pieces, of which the ring is smaller than one.
uint32_t addTurned(StreamWriter& writer)
{
  Bytes payload(4096, 5);
  TAVHeaderData data{header64(payload.size(), TAV_TYPE_UINT64_ARRAY, kOther), payload.data(), payload.size(), 0};
  return tavAddElement(0, writer.handle(), &data);
}

TEST(AddInPieces, EndsWithTheStoragesCodeAtAnyPiece)
{
  uint64_t told = 0;
  uint32_t code = kStorageCode;
  for (uint64_t nth = 1; code != TAV_RC_OK; ++nth)
  {
    StreamWriter writer({.buffered = true, .swap = true});
    writer.add(group64(kStart));
    writer.vectorStorage().failAt(nth, kStorageCode);
    code = addTurned(writer);
    told += code == kStorageCode ? 1 : 0;
    EXPECT_EQ(writer.length(), code == TAV_RC_OK ? 16U + 16 + 4096 : 16U) << "call " << nth;
  }
  EXPECT_GE(told, 4U) << "each of the pieces";
}

/// A stream printed to a file.
std::string printed(const Bytes& bytes, uint64_t options)
{
  StreamReader reader(bytes);
  TAVHeaderData start{};
  EXPECT_EQ(tavReadNodeInt(0, reader.handle(), 0, true, &start), TAV_RC_OK);
  const std::unique_ptr<std::FILE, int (*)(std::FILE*)> file(std::tmpfile(), &std::fclose);
  TAVPrintParam param{0, nullptr, 0, file.get()};
  uint64_t count = 0;
  EXPECT_EQ(tavPrintSubtree(options, reader.handle(), &start, &param, &count), TAV_RC_OK);
  std::string text(count, '\0');
  std::rewind(file.get());
  EXPECT_EQ(std::fread(text.data(), 1, text.size(), file.get()), count);
  return text;
}

TEST(FastPrint, IndentsDeepNodesAsTheTracedOne)
{
  StreamWriter writer;
  constexpr int deep = 60;
  for (int i = 0; i < deep; ++i)
  {
    writer.add(group64(TAV_ELM_CMN_SYSTEM));
    writer.add(u32(TAV_ELM_CMN_CPU_SPEED, 1));
  }
  for (int i = 0; i < deep; ++i) writer.close();
  for (const uint64_t options : {0x7U, 0x45U, 0x47U, 0xC7U})
  {
    const std::string fast = printed(writer.bytes(), options);
    const TraceLog trace;
    EXPECT_EQ(fast, printed(writer.bytes(), options));
  }
}

} // namespace
