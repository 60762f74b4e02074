#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/failingNew.h"
#include "support/nestedGroups.h"
#include "support/reading.h"
#include "support/streams.h"
#include "support/traceLog.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

constexpr uint64_t kContainment = 1;

const auto kForms = testing::Values(Form{}, Form{.swap = true, .align = true}, Form{.buffered = true},
                                    Form{.buffered = true, .swap = true, .align = true});

/// A bare header. Its payload has an address all the same: a writer asks for one.
Element emptyElement(uint16_t elm)
{
  Element element = binary(elm, {});
  element.payload.reserve(1);
  return element;
}

class Validation : public testing::TestWithParam<Form>
{
protected:
  Validation()
      : writer(GetParam()) { root = writer.add(group64(1000)).nodeOffset; }

  void read()
  {
    writer.close();
    reader = std::make_unique<StreamReader>(writer.bytes(), GetParam());
    start = headerAt(reader->handle(), root);
  }

  uint32_t validate() { return tavValidateHierarchy(0, reader->handle(), &start); }
  uint32_t validateContained() { return tavValidateSubtreeInt(kContainment, reader->handle(), &start); }

  StreamWriter writer;
  std::unique_ptr<StreamReader> reader;
  uint64_t root = 0;
  TAVHeader start{};
};
INSTANTIATE_TEST_SUITE_P(Forms, Validation, kForms, kFormName);

TEST_P(Validation, AGroupWithoutChildrenIsSoundAfterOneStep)
{
  read();

  TraceLog trace;
  EXPECT_EQ(validate(), TAV_RC_OK);
  EXPECT_EQ(callsOf(trace, probe::getNextChild), 1U);
  EXPECT_EQ(callsOf(trace, probe::readNode), 0U);
}

TEST_P(Validation, VisitsEveryNodeBelowTheStartOnce)
{
  writer.add(u32(1, 1));
  writer.add(group64(2));
  writer.add(u64(3, 3));
  writer.add(group64(4, TAV_TYPE_HEADER32));
  writer.add(u32(5, 5, false));
  writer.add(group32(6));
  writer.add(u32(7, 7, false));
  writer.close();
  writer.close();
  writer.close();
  writer.add(group64(8));
  writer.close();
  writer.add(ascii(9, "nine", true, TAV_INFO_EYE_SIZE));
  read();

  TraceLog trace;
  EXPECT_EQ(validate(), TAV_RC_OK);
  std::vector<uint16_t> visited;
  for (const Record& record : trace.recordsOf(probe::readNode))
  {
    if (record.kind == KOR_TRACE_VAR && record.point == 100)
    {
      TAVHeaderData node{};
      ASSERT_EQ(record.items.at(0).size(), sizeof node);
      std::memcpy(&node, record.items[0].data(), sizeof node);
      visited.push_back(node.header.hdrType == TAV_HDR_64 ? node.header.hdr64.elm : node.header.hdr32.elm);
    }
  }
  EXPECT_THAT(visited, ElementsAre(1, 2, 3, 4, 5, 6, 7, 8, 9));
}

TEST_P(Validation, GroupsThatEndWithTheirPairAreSound)
{
  writer.add(group64(2, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
  writer.add(u32(3, 1, true, TAV_INFO_EYE_SIZE));
  writer.close();
  writer.add(group64(4, TAV_TYPE_HEADER32, TAV_INFO_EYE_SIZE));
  writer.add(u32(5, 1, false));
  writer.close();
  writer.add(u32(6, 1));
  read();

  EXPECT_EQ(validate(), TAV_RC_OK);
}

TEST_P(Validation, TracesTheWalkOverItsStack)
{
  writer.add(group64(2));
  writer.close();
  read();

  TraceLog trace;
  ASSERT_EQ(tavValidateSubtreeInt(kContainment - 1, reader->handle(), &start), TAV_RC_OK);
  std::vector<uint32_t> entered;
  for (const Step& step : trace.steps())
  {
    const bool low = step.probe >= probe::kBase + 0x19 && step.probe <= probe::hdrStackTop;
    if (step.kind == KOR_TRACE_ENTRY && (low || step.probe == probe::getNextChild))
    {
      entered.push_back(step.probe);
    }
  }
  EXPECT_THAT(entered, ElementsAre(0x88A0019, 0x88A001A, 0x88A001D, // the walk, its stack, the start pushed
                                   0x88A0020, 0x88A000F, 0x88A001D, // the root's first child, pushed
                                   0x88A0020, 0x88A000F, 0x88A001E, // it has no child: popped
                                   0x88A0020, 0x88A000F,            // it has no sibling either
                                   0x88A001B));
}

TEST_P(Validation, FreesItsStackBeforeItTracesTheResult)
{
  writer.add(group64(2));
  writer.close();
  read();
  const TraceLog trace;
  ASSERT_EQ(tavValidateSubtreeInt(kContainment - 1, reader->handle(), &start), TAV_RC_OK);
  const std::vector<Step> steps = trace.steps();
  ASSERT_GE(steps.size(), 3U);
  EXPECT_THAT(std::vector<Step>(steps.end() - 3, steps.end()),
              ElementsAre(Step{KOR_TRACE_EXIT, probe::hdrStackEnd, 0},
                          Step{KOR_TRACE_VAR, probe::validateSubtree, 100},
                          Step{KOR_TRACE_EXIT, probe::validateSubtree, 0}));
}

TEST_P(Validation, TracesArgumentsAndResult)
{
  read();

  TraceLog trace;
  ASSERT_EQ(validate(), TAV_RC_OK);
  TAVHandle* const handle = reader->handle();
  EXPECT_THAT(trace.stepsOf(probe::validateHierarchy),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::validateHierarchy, 0},
                          Step{KOR_TRACE_VAR, probe::validateHierarchy, 0},
                          Step{KOR_TRACE_EXIT, probe::validateHierarchy, 0}));
  EXPECT_THAT(trace.dump(probe::validateHierarchy, 0).items, ElementsAre(bytesOf(handle)));
  EXPECT_THAT(trace.stepsOf(probe::validateSubtree),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::validateSubtree, 0},
                          Step{KOR_TRACE_VAR, probe::validateSubtree, 0},
                          Step{KOR_TRACE_VAR, probe::validateSubtree, 100},
                          Step{KOR_TRACE_EXIT, probe::validateSubtree, 0}));
  EXPECT_THAT(trace.dump(probe::validateSubtree, 0).items,
              ElementsAre(bytesOf(uint64_t{0}), bytesOf(handle), bytesOf(start)));
  EXPECT_THAT(trace.dump(probe::validateSubtree, 100).items, ElementsAre(bytesOf(uint32_t{0})));
}

TEST_P(Validation, StartsAtAnyGroup)
{
  const uint64_t group = writer.add(group64(2, TAV_TYPE_HEADER32)).nodeOffset;
  writer.add(u32(3, 1, false));
  writer.close();
  writer.add(u32(4, 1));
  read();
  start = headerAt(reader->handle(), group);

  TraceLog trace;
  EXPECT_EQ(validate(), TAV_RC_OK);
  EXPECT_EQ(callsOf(trace, probe::readNode), 1U);
}

TEST_P(Validation, AnEmptyDataElementAsStartIsSound)
{
  const uint64_t element = writer.add(emptyElement(2)).nodeOffset;
  read();
  start = headerAt(reader->handle(), element);

  EXPECT_EQ(validate(), TAV_RC_OK);
}

TEST_P(Validation, ADataElementAsStartIsDecidedByItsFirstStep)
{
  // As a node, the payload would be a data element of 0xFFFF bytes, in whichever byte order.
  const Bytes node{0xFF, 0xFF, 0, 0, 0, 0, 0xFF, 0xFF, 0, 0, 0, 0, 0, 55, 0, 0};
  const uint64_t element = writer.add(binary(2, node)).nodeOffset;
  read();
  start = headerAt(reader->handle(), element);

  TraceLog trace;
  EXPECT_EQ(validate(), GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(callsOf(trace, probe::getNextChild), 1U);
}

TEST_P(Validation, TheCodeOfABrokenStepComesUp)
{
  writer.add(u32(1, 1));
  writer.add(group64(2));
  const uint64_t group = writer.add(group64(3)).nodeOffset;
  writer.add(u32(4, 1));
  writer.close();
  writer.close();
  writer.add(u32(5, 1));
  writer.close();
  Bytes bytes = writer.bytes();
  // the group 3 claims one byte more than its parent has
  bytes[group + (GetParam().swap != kBigEndianHost ? 7 : 0)] += 1;
  reader = std::make_unique<StreamReader>(bytes, GetParam());
  start = headerAt(reader->handle(), root);

  TraceLog trace;
  EXPECT_EQ(validate(), TAV_RC_OUTSIDE_PARENT);
  const uint32_t rc = TAV_RC_OUTSIDE_PARENT;
  EXPECT_THAT(trace.failures(), testing::Contains(Failure{probe::getNextChild, 110, rc}));
  EXPECT_THAT(trace.failuresOf(probe::validateSubtree), ElementsAre(Failure{probe::validateSubtree, 50, rc}));
  EXPECT_THAT(trace.failuresOf(probe::validateHierarchy), ElementsAre(Failure{probe::validateHierarchy, 40, rc}));
  EXPECT_THAT(trace.dump(probe::validateSubtree, 100).items, ElementsAre(bytesOf(rc)));
}

TEST_P(Validation, AStreamThatEndsInAHeaderOrInDataIsBroken)
{
  const uint64_t last = writer.add(ascii(1, "0123456789")).nodeOffset;
  read();
  const Bytes whole = writer.bytes();

  StreamReader inHeader(Bytes(whole.begin(), whole.begin() + static_cast<ptrdiff_t>(last + 15)), GetParam());
  EXPECT_EQ(tavValidateHierarchy(0, inHeader.handle(), &start),
            GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY);
  StreamReader inData(Bytes(whole.begin(), whole.begin() + static_cast<ptrdiff_t>(last + 25)), GetParam());
  EXPECT_EQ(tavValidateHierarchy(0, inData.handle(), &start), TAV_RC_DATA_TOO_LARGE);
}

TEST_P(Validation, AnElementOfUnknownSizeCannotBeRead)
{
  const uint64_t group = writer.add(group64(2, TAV_TYPE_HEADER32)).nodeOffset;
  const uint64_t element = writer.add(u32(3, 1, false)).nodeOffset;
  writer.close();
  writer.close();
  Bytes bytes = writer.bytes();
  std::fill_n(bytes.begin() + static_cast<ptrdiff_t>(element), 4, uint8_t{0xFF});
  reader = std::make_unique<StreamReader>(bytes, GetParam());
  start = headerAt(reader->handle(), group);

  EXPECT_EQ(validate(), TAV_RC_DATA_TOO_LARGE);
}

TEST_P(Validation, LeavesTheHeaderAsItIs)
{
  writer.add(group64(2));
  writer.close();
  read();
  const std::string before = bytesOf(start);

  EXPECT_EQ(validate(), TAV_RC_OK);
  EXPECT_EQ(bytesOf(start), before);
}

TEST_P(Validation, WithoutAStackThereIsNoWalk)
{
  read();

  TraceLog trace;
  const allocations::FailNth fail(1);
  EXPECT_EQ(validate(), TAV_RC_NO_HDR_STACK);
  EXPECT_THAT(trace.failuresOf(probe::validateSubtree),
              ElementsAre(Failure{probe::validateSubtree, 30, TAV_RC_NO_HDR_STACK}));
  EXPECT_EQ(callsOf(trace, probe::getNextChild), 0U);
}

TEST_P(Validation, AStackThatBeganWithoutABlockGrows)
{
  writer.add(u32(1, 1));
  read();

  const int64_t before = allocations::live();
  const allocations::FailNth fail(2);
  EXPECT_EQ(validate(), TAV_RC_OK);
  EXPECT_TRUE(fail.happened());
  EXPECT_EQ(allocations::live(), before);
}

TEST_P(Validation, AStackWithoutABlockThatCannotGrowEndsTheWalk)
{
  read();

  TraceLog trace;
  const allocations::OnlySizes small(0, sizeof(TAVHdrStack));
  EXPECT_EQ(validate(), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failuresOf(probe::validateSubtree),
              ElementsAre(Failure{probe::validateSubtree, 40, TAV_RC_NO_MEMORY}));
  EXPECT_EQ(callsOf(trace, probe::getNextChild), 0U);
}

TEST_P(Validation, RefusesTheContainmentBitWithoutReading)
{
  writer.add(u32(1, 1));
  read();

  TraceLog trace;
  EXPECT_EQ(tavValidateHierarchy(1, reader->handle(), &start), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavValidateHierarchy(~uint64_t{0}, reader->handle(), &start), TAV_RC_BAD_PARAM);
  const Failure expected{probe::validateHierarchy, 30, TAV_RC_BAD_PARAM};
  EXPECT_THAT(trace.failures(), ElementsAre(expected, expected));
  EXPECT_THAT(trace.recordsOf(probe::validateSubtree), IsEmpty());
  EXPECT_THAT(trace.recordsOf(probe::getNextChild), IsEmpty());
}

TEST_P(Validation, OtherOptionBitsChangeNothing)
{
  writer.add(emptyElement(1)); // what containment would refuse
  read();

  TraceLog trace;
  EXPECT_EQ(tavValidateHierarchy(0xFFFFFFFFFFFFFFFE, reader->handle(), &start), TAV_RC_OK);
  EXPECT_THAT(trace.dump(probe::validateSubtree, 0).items.at(0), bytesOf(uint64_t{0xFFFFFFFFFFFFFFFE}));
}

TEST(ValidationArguments, AreCheckedInTheirOrder)
{
  StreamReader reader(Bytes(16, 0));
  TAVHeader start = header64(0, TAV_TYPE_HEADER64, 1000);
  TraceLog trace;
  EXPECT_EQ(tavValidateHierarchy(1, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavValidateHierarchy(1, reader.handle(), nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavValidateHierarchy(1, reader.handle(), &start), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavValidateSubtreeInt(1, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(tavValidateSubtreeInt(1, reader.handle(), nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::validateHierarchy, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::validateHierarchy, 20, TAV_RC_BAD_PARAM},
                                            Failure{probe::validateHierarchy, 30, TAV_RC_BAD_PARAM},
                                            Failure{probe::validateSubtree, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::validateSubtree, 20, TAV_RC_BAD_PARAM}));
}

TEST(ValidationMode, AHandleForWritingCannotWalk)
{
  StreamWriter writer;
  TAVHeader start = writer.add(group64(1000));
  EXPECT_EQ(tavValidateHierarchy(0, writer.handle(), &start), TAV_RC_WRONG_MODE);
}

TEST_P(Validation, AContainedLastChildEndsWhereItsParentDoesWithoutItsHeader)
{
  writer.add(u32(1, 1));
  writer.add(u32(2, 2));
  read();

  EXPECT_EQ(validateContained(), TAV_RC_OK);
}

TEST_P(Validation, AChildThatEndsOneByteLaterIsOutside)
{
  const uint64_t group = writer.add(group64(2)).nodeOffset;
  writer.add(ascii(3, "12345678"));
  writer.close();
  writer.add(u64(4, 1)); // so that the bytes behind the group are there
  writer.close();
  Bytes bytes = writer.bytes();
  const size_t low = GetParam().swap != kBigEndianHost ? 7 : 0;
  bytes[group + low] -= 1; // the group claims 23 of the 24 bytes that its child takes
  reader = std::make_unique<StreamReader>(bytes, GetParam());
  start = headerAt(reader->handle(), group);

  TraceLog trace;
  EXPECT_EQ(validateContained(), TAV_RC_OUTSIDE_PARENT);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::validateSubtree, 50, TAV_RC_OUTSIDE_PARENT}));
}

TEST_P(Validation, ContainmentLooksAtNestedGroupsToo)
{
  writer.add(group64(2));
  const uint64_t inner = writer.add(group64(3)).nodeOffset;
  const uint64_t element = writer.add(ascii(4, "12345678")).nodeOffset;
  writer.close();
  writer.close();
  writer.add(u64(5, 1));
  writer.close();
  Bytes bytes = writer.bytes();
  bytes[element + (GetParam().swap != kBigEndianHost ? 7 : 0)] += 1;
  ASSERT_GT(element, inner);
  reader = std::make_unique<StreamReader>(bytes, GetParam());
  start = headerAt(reader->handle(), root);

  TraceLog trace;
  EXPECT_EQ(validateContained(), TAV_RC_OUTSIDE_PARENT);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::validateSubtree, 50, TAV_RC_OUTSIDE_PARENT}));
}

TEST_P(Validation, ContainmentRefusesAnEmptyLastChild)
{
  writer.add(u32(1, 1));
  writer.add(emptyElement(2));
  read();

  EXPECT_EQ(validate(), TAV_RC_OK);
  EXPECT_EQ(validateContained(), TAV_RC_OUTSIDE_PARENT);
}

TEST_P(Validation, ContainmentRefusesTheLastChildOfA64BitGroupOfNarrowChildren)
{
  const uint64_t group = writer.add(group64(2, TAV_TYPE_HEADER32)).nodeOffset;
  writer.add(u64(3, 1, false));
  writer.close();
  writer.add(u64(4, 1));
  read();
  start = headerAt(reader->handle(), group);

  EXPECT_EQ(validate(), TAV_RC_OK);
  EXPECT_EQ(validateContained(), TAV_RC_OUTSIDE_PARENT);
}

TEST_P(Validation, ContainmentAcceptsTheLastChildOfA32BitGroup)
{
  writer.add(group64(2, TAV_TYPE_HEADER32));
  const uint64_t group = writer.add(group32(3)).nodeOffset;
  writer.add(u64(4, 1, false));
  writer.close();
  writer.close();
  read();
  start = headerAt(reader->handle(), group, false);

  EXPECT_EQ(validateContained(), TAV_RC_OK);
}

TEST_P(Validation, ContainmentDoesNotWrapAroundTheEndOfTheNumbers)
{
  writer.add(u32(1, 1));
  read();
  start.hdr64.size = TAV_SIZE_UNKNOWN - 16; // ends at the last number, and its end without the header before that
  Untouched first;
  ASSERT_EQ(tavGetNextChild(0, reader->handle(), &start, nullptr, &first.data), TAV_RC_OK);
  const Bytes bytes = writer.bytes();

  // The same group further on: its end passes the last number, so it contains nothing.
  Bytes moved(16, 0);
  moved.insert(moved.end(), bytes.begin(), bytes.end());
  StreamReader later(moved, GetParam());
  TAVHeader open = start;
  open.hdr64.size = TAV_SIZE_UNKNOWN;
  open.nodeOffset = 16;
  EXPECT_EQ(tavValidateSubtreeInt(kContainment, later.handle(), &open), TAV_RC_OUTSIDE_PARENT);
}

class DeepValidation : public testing::TestWithParam<Form>
{
};
INSTANTIATE_TEST_SUITE_P(Forms, DeepValidation, testing::Values(Form{}, Form{.buffered = true}), kFormName);

TEST_P(DeepValidation, TakesUpTo4000NestedGroups)
{
  StreamReader reader(nestedGroups(4000), GetParam());
  TAVHeader start = headerAt(reader.handle(), 0);
  const int64_t before = allocations::live();
  EXPECT_EQ(tavValidateHierarchy(0, reader.handle(), &start), TAV_RC_OK);
  EXPECT_EQ(allocations::live(), before);
}

TEST_P(DeepValidation, EndsAtTheNextInTheStacksCode)
{
  StreamReader reader(nestedGroups(4001), GetParam());
  TAVHeader start = headerAt(reader.handle(), 0);
  const int64_t before = allocations::live();
  EXPECT_EQ(tavValidateHierarchy(0, reader.handle(), &start), TAV_RC_NO_MEMORY);
  EXPECT_EQ(allocations::live(), before);

  TraceLog trace;
  EXPECT_EQ(tavValidateHierarchy(0, reader.handle(), &start), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::hdrStackGrow, 10, TAV_RC_NO_MEMORY},
                                            Failure{probe::hdrStackPush, 20, TAV_RC_NO_MEMORY},
                                            Failure{probe::validateSubtree, 50, TAV_RC_NO_MEMORY},
                                            Failure{probe::validateHierarchy, 40, TAV_RC_NO_MEMORY}));
}

TEST_P(DeepValidation, AGrowthThatFailsEndsTheWalk)
{
  StreamReader reader(nestedGroups(1001), GetParam());
  TAVHeader start = headerAt(reader.handle(), 0);
  const int64_t before = allocations::live();
  const allocations::FailNth fail(3); // the stack, its block, then the growth
  EXPECT_EQ(tavValidateHierarchy(0, reader.handle(), &start), TAV_RC_NO_MEMORY);
  EXPECT_TRUE(fail.happened());
  EXPECT_EQ(allocations::live(), before);
}

} // namespace
