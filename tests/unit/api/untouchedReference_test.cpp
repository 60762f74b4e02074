/// What a failure leaves of the nodes that a call was given: all of them, also where the answer was to go to the same
/// descriptor. So the same call can be taken again.
#include <algorithm>
#include <cstdint>
#include <cstring>
#include <ostream>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/reading.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "support/writing.h"
#include "tav/layout.hpp"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint16_t kGroup = 60102;
constexpr uint16_t kValue = 60110;
constexpr uint16_t kLast = 60111;
constexpr uint32_t kRefusal = 0x90000777; // no code of the library

/// What a header says, and where it is.
std::vector<uint64_t> contentOf(const TAVHeader& header)
{
  return {header.hdrType, header.nodeOffset, tav::layout::sizeOf(header), tav::layout::infoOf(header),
          tav::layout::typeOf(header), tav::layout::elmOf(header)};
}

/// A stream whose root has 20 values below it, then an open group with its end, then a group with one value.
struct Sample
{
  Bytes bytes;
  TAVHeader root{};
  TAVHeader firstValue{};
  TAVHeader lastValue{};
  TAVHeader openGroup{};
};

Sample sampleOf(const Form& form)
{
  Form memory = form;
  memory.buffered = false;
  StreamWriter writer(memory);
  Sample sample;
  sample.root = writer.add(group64(kRoot));
  for (uint64_t i = 0; i < 20; ++i)
  {
    sample.lastValue = writer.add(u64(i == 19 ? kLast : kValue, i, true, TAV_INFO_EYE_SIZE));
    if (i == 0)
    {
      sample.firstValue = sample.lastValue;
    }
  }
  sample.openGroup = writer.add(group64(kGroup, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.add(binary(kValue, Bytes(40, 7)));
  writer.close();
  writer.add(group64(kGroup));
  writer.add(u64(kLast, 21));
  writer.close();
  writer.close();
  sample.bytes = writer.bytes();
  std::fill_n(sample.bytes.begin() + static_cast<ptrdiff_t>(sample.openGroup.nodeOffset), 8, uint8_t{0xFF});
  sample.root.hdr64.size = sample.bytes.size() - 16;
  return sample;
}

/// A call that is given a node in the descriptor that its answer goes to.
struct Operation
{
  const char* name;
  const TAVHeader Sample::*given;
  uint32_t (*run)(TAVHandle* handle, const Sample& sample, TAVHeaderData& node);
};

uint32_t firstChild(TAVHandle* handle, const Sample&, TAVHeaderData& node)
{
  return tavGetNextChild(0, handle, &node.header, nullptr, &node);
}

uint32_t sibling(TAVHandle* handle, const Sample& sample, TAVHeaderData& node)
{
  TAVHeader parent = sample.root;
  return tavGetNextChild(0, handle, &parent, &node.header, &node);
}

uint32_t previousNode(TAVHandle* handle, const Sample&, TAVHeaderData& node)
{
  return tavGetPrevNode(0, handle, &node, &node);
}

uint32_t search(TAVHandle* handle, const Sample&, TAVHeaderData& node)
{
  return tavFindElmInt(handle, &node.header, 0, 0, 0, kLast, nullptr, nullptr, &node);
}

uint32_t searchOn(TAVHandle* handle, const Sample& sample, TAVHeaderData& node)
{
  TAVHdrStack stack;
  check(stack.push(&sample.root), "push");
  return tavFindElmInt(handle, &stack.pEntries[0], 0, 0, 0, kLast, &node.header, &stack, &node);
}

uint32_t validation(TAVHandle* handle, const Sample&, TAVHeaderData& node)
{
  return tavValidateHierarchy(0, handle, &node.header);
}

uint32_t print(TAVHandle* handle, const Sample&, TAVHeaderData& node)
{
  char piece[200];
  TAVPrintParam param{0, piece, sizeof piece, nullptr};
  uint64_t printed = 0;
  return tavPrintSubtree(TAV_PRINT_SUBTREE, handle, &node, &param, &printed);
}

constexpr Operation kOperations[] = {{"FirstChild", &Sample::root, firstChild},
                                     {"Sibling", &Sample::firstValue, sibling},
                                     {"SiblingOfALaterNode", &Sample::lastValue, sibling},
                                     {"SiblingOfAnOpenGroup", &Sample::openGroup, sibling},
                                     {"PreviousNode", &Sample::lastValue, previousNode},
                                     {"Search", &Sample::root, search},
                                     {"SearchOn", &Sample::firstValue, searchOn},
                                     {"Validation", &Sample::root, validation},
                                     {"Print", &Sample::root, print}};

struct Case
{
  Operation operation;
  bool swap;
  uint64_t pages;
};

void PrintTo(const Case& row, std::ostream* out)
{
  *out << row.operation.name << (row.swap ? ", swapped" : "") << ", pages: " << row.pages;
}

/// A call that failed at one call of the storage, and the same call again.
struct Attempt
{
  uint32_t failed = TAV_RC_OK;
  bool untouched = false;
  uint32_t again = TAV_RC_OK;
  std::vector<uint64_t> answer;
};

Attempt attempt(const Case& row, const Sample& sample, uint64_t nth, bool traced)
{
  const Form form{.buffered = true, .swap = row.swap, .pageBytes = 64, .ringBytes = 64 * row.pages};
  StreamReader reader(sample.bytes, form, 32);
  TAVHeaderData node{};
  node.header = sample.*row.operation.given;
  const std::vector<uint64_t> before = contentOf(node.header);
  const auto run = [&] { return row.operation.run(reader.handle(), sample, node); };
  reader.vectorStorage().failAt(nth, kRefusal);
  Attempt result;
  if (traced)
  {
    const TraceLog trace;
    result.failed = run();
  }
  else
  {
    result.failed = run();
  }
  reader.vectorStorage().failAt(0, TAV_RC_OK);
  result.untouched = contentOf(node.header) == before;
  result.again = result.failed != TAV_RC_OK ? run() : TAV_RC_OK;
  result.answer = contentOf(node.header);
  return result;
}

class FailedCall : public ::testing::TestWithParam<Case>
{
};

TEST_P(FailedCall, LeavesTheNodeThatItWasGivenAndCanBeTakenAgain)
{
  const Sample sample = sampleOf({.swap = GetParam().swap});
  const Attempt sound = attempt(GetParam(), sample, 0, false);
  ASSERT_EQ(sound.failed, TAV_RC_OK);
  uint64_t failures = 0;
  for (const bool traced : {false, true})
  {
    for (uint64_t nth = 1; nth <= 60; ++nth)
    {
      const Attempt result = attempt(GetParam(), sample, nth, traced);
      ASSERT_EQ(result.again, TAV_RC_OK) << "call " << nth;
      ASSERT_EQ(result.answer, sound.answer) << "call " << nth;
      if (result.failed != TAV_RC_OK)
      {
        ++failures;
        ASSERT_TRUE(result.untouched) << "call " << nth << ": " << korCodeName(result.failed);
      }
    }
  }
  EXPECT_GT(failures, 0U);
}

std::vector<Case> allCases()
{
  std::vector<Case> cases;
  for (const Operation& operation : kOperations)
  {
    for (const bool swap : {false, true})
    {
      for (const uint64_t pages : {1U, 2U}) cases.push_back({operation, swap, pages});
    }
  }
  return cases;
}

INSTANTIATE_TEST_SUITE_P(Operations, FailedCall, ::testing::ValuesIn(allCases()), [](const auto& row) {
  return std::string(row.param.operation.name) + (row.param.swap ? "Swapped" : "Native") +
         std::to_string(row.param.pages);
});

/// The values of the root's children, by a walk that needs one descriptor and takes a step that failed again.
std::vector<uint64_t> walkStubbornly(StreamReader& reader, bool wide, uint64_t& failures)
{
  TAVHeader root = headerAt(reader.handle(), 0, wide);
  std::vector<uint64_t> values;
  TAVHeaderData child{};
  TAVHeader* reference = nullptr;
  for (uint64_t failed = 0;;)
  {
    const uint32_t rc = tavGetNextChild(0, reader.handle(), &root, reference, &child);
    if (rc == TAV_RC_NO_MORE_CHILDREN || failed > 1)
    {
      return values;
    }
    if (rc != TAV_RC_OK)
    {
      ++failed;
      ++failures;
      continue;
    }
    uint64_t value = 0;
    std::memcpy(&value, child.pDataBuf, sizeof value);
    values.push_back(value);
    reference = &child.header;
  }
}

TEST(WalkInOneDescriptor, SkipsNoChildWhenAReadFails)
{
  for (const bool wide : {true, false})
  {
    StreamWriter writer({.root32 = !wide});
    writer.add(wide ? group64(kRoot) : group32(kRoot));
    std::vector<uint64_t> expected;
    for (uint64_t i = 0; i < 20; ++i)
    {
      writer.add(u64(kValue, i, wide));
      expected.push_back(i);
    }
    writer.close();
    uint64_t failures = 0;
    for (uint64_t nth = 1; nth <= 30; ++nth)
    {
      StreamReader reader(writer.bytes(), {.buffered = true, .root32 = !wide, .pageBytes = 64, .ringBytes = 128});
      headerAt(reader.handle(), 0, wide);
      reader.vectorStorage().failAt(nth, kRefusal);
      EXPECT_EQ(walkStubbornly(reader, wide, failures), expected) << "call " << nth;
    }
    EXPECT_GT(failures, 3U);
  }
}

TEST(DamagedSibling, LeavesTheReferenceInItsDescriptor)
{
  for (const bool buffered : {false, true})
  {
    for (const uint64_t length : {45U, 56U, 70U}) // within a header, behind it, within a value
    {
      StreamWriter writer;
      TAVHeader root = writer.add(group64(kRoot));
      const TAVHeader first = writer.add(u64(kValue, 1));
      writer.add(binary(kValue, Bytes(40, 2)));
      Bytes bytes = writer.bytes();
      bytes.resize(length);
      StreamReader reader(bytes, {.buffered = buffered, .pageBytes = 64, .ringBytes = 128});
      TAVHeaderData child{};
      child.header = first;
      EXPECT_NE(tavGetNextChild(0, reader.handle(), &root, &child.header, &child), TAV_RC_OK);
      EXPECT_EQ(contentOf(child.header), contentOf(first)) << length;
    }
  }
}

TEST(PathThatIsNotThere, LeavesTheParentInTheDescriptorOfTheAnswer)
{
  for (const Form& form : {Form{}, Form{.buffered = true, .pageBytes = 64, .ringBytes = 128}})
  {
    const Sample sample = sampleOf(form);
    StreamReader reader(sample.bytes, form, 32);
    const TAVPathEntry path[] = {{0, kGroup}, {0, kGroup}};
    TAVFindLogicalGroupParam param{0, path, 2, nullptr, 0};
    TAVHeaderData node{};
    node.header = sample.root;
    for (int i = 0; i < 2; ++i)
    {
      EXPECT_EQ(tavFindLogicalGroup(0, reader.handle(), &node.header, &param, &node), TAV_RC_NO_MEMORY);
      EXPECT_EQ(contentOf(node.header), contentOf(sample.root));
    }
    param.pathCount = 1;
    EXPECT_EQ(tavFindLogicalGroup(0, reader.handle(), &node.header, &param, &node), TAV_RC_OK);
    EXPECT_EQ(node.header.nodeOffset, sample.openGroup.nodeOffset);
  }
}

} // namespace
