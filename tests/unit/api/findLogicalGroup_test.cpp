#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "support/failingNew.h"
#include "support/hostileFamilies.h"
#include "support/nestedGroups.h"
#include "support/reading.h"
#include "support/streams.h"
#include "support/traceLog.h"

namespace
{

using namespace test;
using namespace tav;
using testing::ElementsAre;
using testing::IsEmpty;

using Path = std::vector<TAVPathEntry>;

const auto kForms = testing::Values(Form{}, Form{.swap = true, .align = true}, Form{.buffered = true},
                                    Form{.buffered = true, .swap = true, .align = true});

/// The record for a path, which has to outlive it.
TAVFindLogicalGroupParam paramOf(const Path& path)
{
  TAVFindLogicalGroupParam param{};
  param.reserved = 0x5A5A5A5A5A5A5A5A; // nobody reads it
  param.pPath = path.data();
  param.pathCount = static_cast<uint32_t>(path.size());
  return param;
}

class FindLogicalGroup : public testing::TestWithParam<Form>
{
protected:
  FindLogicalGroup()
      : writer(GetParam()) { root = writer.add(group64(1000)).nodeOffset; }

  uint64_t open(uint16_t elm, uint32_t info = 0, uint16_t type = TAV_TYPE_HEADER64)
  {
    return writer.add(group64(elm, type, info)).nodeOffset;
  }

  void read()
  {
    writer.close();
    reader = std::make_unique<StreamReader>(writer.bytes(), GetParam());
    parent = headerAt(reader->handle(), root);
  }

  uint32_t find(const Path& path)
  {
    TAVFindLogicalGroupParam param = paramOf(path);
    return tavFindLogicalGroup(0, reader->handle(), &parent, &param, &out.data);
  }

  /// Two branches 10/20, of which only the second holds the 30 that holds a 40; the 30 in between is an element.
  uint64_t addBranches()
  {
    open(10);
    writer.add(u32(20, 1));
    open(30);
    writer.close();
    writer.close();
    open(10);
    open(20);
    writer.add(u32(30, 2));
    writer.close();
    open(20);
    open(30);
    open(41);
    writer.close();
    writer.close();
    open(30);
    const uint64_t found = open(40);
    writer.close();
    writer.close();
    writer.close();
    writer.close();
    open(10);
    open(20);
    open(30);
    open(40); // a match as well, but a later one
    writer.close();
    writer.close();
    writer.close();
    writer.close();
    return found;
  }

  StreamWriter writer;
  std::unique_ptr<StreamReader> reader;
  uint64_t root = 0;
  TAVHeader parent{};
  Untouched out;
};
INSTANTIATE_TEST_SUITE_P(Forms, FindLogicalGroup, kForms, kFormName);

TEST_P(FindLogicalGroup, APathOfOneEntryGivesTheFirstGroupWithTheId)
{
  open(9);
  writer.close();
  const uint64_t expected = open(10);
  writer.close();
  open(10);
  writer.close();
  read();

  ASSERT_EQ(find({{0, 10}}), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  EXPECT_EQ(out.data.header.hdr64.elm, 10U);
  EXPECT_EQ(out.data.header.hdr64.type, TAV_TYPE_HEADER64);
}

TEST_P(FindLogicalGroup, APathLeadsThroughItsLevels)
{
  writer.add(u32(5, 1));
  open(10);
  writer.add(u32(5, 2));
  open(20);
  const uint64_t expected = open(30);
  writer.close();
  writer.close();
  writer.close();
  read();

  ASSERT_EQ(find({{0, 10}, {0, 20}, {0, 30}}), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
}

TEST_P(FindLogicalGroup, EachLevelIsSoughtAmongDirectChildrenOnly)
{
  open(10);
  open(15);
  open(20);
  writer.close();
  writer.close();
  writer.close();
  read();

  EXPECT_EQ(find({{0, 10}, {0, 20}}), TAV_RC_NO_MEMORY);
  EXPECT_TRUE(out.isUntouched());
}

TEST_P(FindLogicalGroup, DataElementsWithTheIdArePassedOver)
{
  writer.add(u32(10, 1));
  writer.add(u32(10, 2));
  open(10);
  writer.add(u32(20, 3));
  const uint64_t expected = open(20);
  writer.close();
  writer.add(u32(20, 4));
  writer.close();
  read();

  ASSERT_EQ(find({{0, 10}, {0, 20}}), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
}

TEST_P(FindLogicalGroup, ALevelWithDataElementsOnlyFails)
{
  open(10);
  writer.add(u32(20, 1));
  writer.add(u32(20, 2));
  writer.close();
  read();

  TraceLog trace;
  EXPECT_EQ(find({{0, 10}, {0, 20}}), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failuresOf(probe::findLogicalGroup),
              ElementsAre(Failure{probe::findLogicalGroup, 80, TAV_RC_NO_MEMORY}));
  EXPECT_TRUE(out.isUntouched());
}

TEST_P(FindLogicalGroup, GoesBackOverSeveralLevelsToTheFirstWholeMatch)
{
  const uint64_t expected = addBranches();
  read();

  ASSERT_EQ(find({{0, 10}, {0, 20}, {0, 30}, {0, 40}}), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
}

TEST_P(FindLogicalGroup, TracesEachLevelThatItSearches)
{
  addBranches();
  read();

  TraceLog trace;
  ASSERT_EQ(find({{0, 10}, {0, 20}, {0, 30}, {0, 40}}), TAV_RC_OK);
  std::string levels;
  for (const Record& record : trace.recordsOf(probe::findLogicalGroup))
  {
    if (record.kind == KOR_TRACE_VAR && record.point == 100)
    {
      ASSERT_EQ(record.items.size(), 3U);
      const auto level = static_cast<uint32_t>(record.items[0][kBigEndianHost ? 3 : 0]);
      EXPECT_THAT(record.items, ElementsAre(bytesOf(level), bytesOf(uint16_t{0}), bytesOf(uint32_t{10 * (level + 1)})));
      levels += static_cast<char>('0' + level);
    }
  }
  // 10; its 20 is an element; no other 20. Next 10, 20; its 30 is an element; none besides. Next 20, 30, no 40.
  // Next 30, its 40.
  EXPECT_EQ(levels, "0"
                    "11"
                    "0"
                    "1"
                    "22"
                    "1"
                    "2"
                    "3"
                    "2"
                    "3");
  EXPECT_THAT(trace.dump(probe::findLogicalGroup, 200).items, ElementsAre(bytesOf(out.data)));
}

TEST_P(FindLogicalGroup, AnExhaustedTreeAnswers)
{
  addBranches();
  read();

  TraceLog trace;
  EXPECT_EQ(find({{0, 10}, {0, 20}, {0, 30}, {0, 50}}), TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failuresOf(probe::findLogicalGroup),
              ElementsAre(Failure{probe::findLogicalGroup, 80, TAV_RC_NO_MEMORY}));
  EXPECT_EQ(trace.recordsOf(probe::hdrStackPopCopy).back().code, TAV_RC_NO_MEMORY);
  EXPECT_TRUE(out.isUntouched());
}

TEST_P(FindLogicalGroup, KeysChooseAmongGroupsWithTheId)
{
  open(10, 0x801); // key 1
  writer.close();
  open(10, 0x002);
  open(20, 0x003);
  writer.close();
  const uint64_t expected = open(20, 0x80000004);
  writer.close();
  writer.close();
  read();

  ASSERT_EQ(find({{2, 10}, {4, 20}}), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  ASSERT_EQ(find({{2, 10}, {0, 20}}), TAV_RC_OK);
  EXPECT_LT(out.data.header.nodeOffset, expected);
}

TEST_P(FindLogicalGroup, GroupsWith32BitHeadersHaveNoKey)
{
  open(10, 5, TAV_TYPE_HEADER32);
  const uint64_t expected = writer.add(group32(20)).nodeOffset;
  writer.close();
  writer.close();
  read();

  EXPECT_EQ(find({{5, 10}, {5, 20}}), TAV_RC_NO_MEMORY);
  ASSERT_EQ(find({{5, 10}, {0, 20}}), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
  EXPECT_EQ(out.data.header.hdrType, TAV_HDR_32);
}

TEST_P(FindLogicalGroup, FindsTheLastOfALongList)
{
  uint64_t last = 0;
  for (uint32_t i = 0; i < 300; ++i)
  {
    last = open(10);
    writer.add(u32(20, i));
    if (i == 299)
    {
      last = open(20);
      writer.close();
    }
    writer.close();
  }
  read();

  ASSERT_EQ(find({{0, 10}, {0, 20}}), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, last);
}

TEST_P(FindLogicalGroup, AnEmptyPathFindsNothing)
{
  open(10);
  writer.close();
  read();

  TraceLog trace;
  EXPECT_EQ(find({}), TAV_RC_NOT_FOUND);
  const Path path{{0, 10}};
  TAVFindLogicalGroupParam none = paramOf(path);
  none.pathCount = 0;
  EXPECT_EQ(tavFindLogicalGroup(0, reader->handle(), &parent, &none, &out.data), TAV_RC_NOT_FOUND);
  const Failure expected{probe::findLogicalGroup, 80, TAV_RC_NOT_FOUND};
  EXPECT_THAT(trace.failures(), ElementsAre(expected, expected));
  EXPECT_TRUE(out.isUntouched());
  EXPECT_THAT(trace.recordsOf(probe::findElement), IsEmpty());
}

TEST_P(FindLogicalGroup, ASecondListIsRefusedAfterTheSearch)
{
  open(10);
  writer.close();
  read();
  const Path found{{0, 10}};
  const Path missed{{0, 10}, {0, 20}};
  const Path empty;

  for (const Path* path : {&found, &missed, &empty})
  {
    TAVFindLogicalGroupParam param = paramOf(*path);
    param.pSecond = found.data();
    param.secondCount = 1;
    TraceLog trace;
    EXPECT_EQ(tavFindLogicalGroup(0, reader->handle(), &parent, &param, &out.data), TAV_RC_NOT_SUPPORTED);
    EXPECT_THAT(trace.failuresOf(probe::findLogicalGroup),
                ElementsAre(Failure{probe::findLogicalGroup, 80, TAV_RC_NOT_SUPPORTED}));
    EXPECT_EQ(callsOf(trace, probe::findElement) != 0, !path->empty());
  }
  EXPECT_TRUE(out.isUntouched());
}

TEST_P(FindLogicalGroup, HalfASecondListIsNone)
{
  const uint64_t expected = open(10);
  writer.close();
  read();
  const Path path{{0, 10}};

  TAVFindLogicalGroupParam param = paramOf(path);
  param.pSecond = path.data();
  EXPECT_EQ(tavFindLogicalGroup(0, reader->handle(), &parent, &param, &out.data), TAV_RC_OK);
  param.pSecond = nullptr;
  param.secondCount = 1;
  EXPECT_EQ(tavFindLogicalGroup(0, reader->handle(), &parent, &param, &out.data), TAV_RC_OK);
  EXPECT_EQ(out.data.header.nodeOffset, expected);
}

TEST_P(FindLogicalGroup, TracesArgumentsUnderTheirLabel)
{
  open(10, 3);
  writer.close();
  read();
  const Path path{{3, 10}};
  TAVFindLogicalGroupParam param = paramOf(path);

  TraceLog trace;
  ASSERT_EQ(tavFindLogicalGroup(0, reader->handle(), &parent, &param, &out.data), TAV_RC_OK);
  EXPECT_THAT(trace.stepsOf(probe::findLogicalGroup),
              ElementsAre(Step{KOR_TRACE_ENTRY, probe::findLogicalGroup, 0},
                          Step{KOR_TRACE_VAR, probe::findLogicalGroup, 0},
                          Step{KOR_TRACE_VAR, probe::findLogicalGroup, 100},
                          Step{KOR_TRACE_VAR, probe::findLogicalGroup, 200},
                          Step{KOR_TRACE_EXIT, probe::findLogicalGroup, 0}));
  TAVHandle* const handle = reader->handle();
  TAVHeaderData* const pOut = &out.data;
  EXPECT_THAT(trace.dump(probe::findLogicalGroup, 0).items,
              ElementsAre(bytesOf(uint64_t{0}), bytesOf(handle), "Parent header and logical group search information",
                          bytesOf(parent), bytesOf(param), bytesOf(pOut)));
  EXPECT_THAT(trace.dump(probe::findLogicalGroup, 100).items,
              ElementsAre(bytesOf(uint32_t{0}), bytesOf(uint16_t{3}), bytesOf(uint32_t{10})));
}

TEST_P(FindLogicalGroup, EndsWithoutAnyMemory)
{
  addBranches();
  read();
  const Path path{{0, 10}, {0, 20}};
  TAVFindLogicalGroupParam param = paramOf(path);
  uint32_t rc = TAV_RC_OK;
  {
    const allocations::AllFail fail;
    rc = tavFindLogicalGroup(0, reader->handle(), &parent, &param, &out.data);
  }
  EXPECT_EQ(rc, TAV_RC_NO_MEMORY);
  EXPECT_TRUE(out.isUntouched());
}

TEST_P(FindLogicalGroup, NeedsNoBlockToBeginWithAndLosesNone)
{
  const uint64_t expected = addBranches();
  read();
  const int64_t before = allocations::live();
  for (uint64_t nth = 1; nth <= 2; ++nth)
  {
    const allocations::FailNth fail(nth);
    EXPECT_EQ(find({{0, 10}, {0, 20}, {0, 30}, {0, 40}}), TAV_RC_OK);
    EXPECT_TRUE(fail.happened());
    EXPECT_EQ(out.data.header.nodeOffset, expected);
  }
  EXPECT_EQ(allocations::live(), before);
}

TEST(FindLogicalGroupArguments, AreCheckedInTheirOrder)
{
  StreamReader reader(Bytes(16, 0));
  StreamWriter writer;
  TAVHeader parent = header64(0, TAV_TYPE_HEADER64, 1000);
  const Path path{{0, 10}};
  TAVFindLogicalGroupParam param = paramOf(path);
  TAVFindLogicalGroupParam noPath = param;
  noPath.pPath = nullptr;
  Untouched out;
  TraceLog trace;
  const auto find = [&](uint64_t options, TAVHandle* handle, TAVHeader* from, TAVFindLogicalGroupParam* what,
                        TAVHeaderData* to) { return tavFindLogicalGroup(options, handle, from, what, to); };
  EXPECT_EQ(find(1, nullptr, nullptr, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(find(1, writer.handle(), nullptr, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(find(1, writer.handle(), &parent, nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(find(1, writer.handle(), &parent, &param, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(find(1, writer.handle(), &parent, &noPath, &out.data), TAV_RC_BAD_OPTIONS);
  EXPECT_EQ(find(0, writer.handle(), &parent, &noPath, &out.data), TAV_RC_WRONG_MODE);
  EXPECT_EQ(find(0, reader.handle(), &parent, &noPath, &out.data), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(Failure{probe::findLogicalGroup, 10, TAV_RC_BAD_PARAM},
                                            Failure{probe::findLogicalGroup, 20, TAV_RC_BAD_PARAM},
                                            Failure{probe::findLogicalGroup, 30, TAV_RC_BAD_PARAM},
                                            Failure{probe::findLogicalGroup, 40, TAV_RC_BAD_PARAM},
                                            Failure{probe::findLogicalGroup, 50, TAV_RC_BAD_OPTIONS},
                                            Failure{probe::findLogicalGroup, 60, TAV_RC_WRONG_MODE},
                                            Failure{probe::findLogicalGroup, 70, TAV_RC_BAD_PARAM}));
  EXPECT_TRUE(out.isUntouched());
  EXPECT_THAT(trace.recordsOf(probe::findElement), IsEmpty());
}

/// Groups each of whose levels is all that follows: the first child of each is the pair that leads to its sibling.
class OverlappingLevels : public testing::TestWithParam<Form>
{
};
INSTANTIATE_TEST_SUITE_P(Forms, OverlappingLevels, kForms, kFormName);

TEST_P(OverlappingLevels, AreNotSearchedWithoutBound)
{
  HostileRows rows(0x40000, GetParam().swap);
  rows.open(1000);
  for (int i = 0; i < 100; ++i)
  {
    const uint64_t group = rows.open(10);
    rows.payloadPair(group);
  }
  rows.repeatUpTo(rows.length(), 32, [&rows] { rows.h64(16, 0, TAV_TYPE_BINARY, 7).fill(16, 0x11); });
  rows.marker();
  StreamReader reader(rows.bytes, GetParam());
  TAVHeader parent = headerAt(reader.handle(), 0);
  const Path path{{0, 10}, {0, 20}};
  TAVFindLogicalGroupParam param = paramOf(path);
  Untouched out;
  EXPECT_EQ(tavFindLogicalGroup(0, reader.handle(), &parent, &param, &out.data), TAV_RC_OUTSIDE_PARENT);
  EXPECT_TRUE(out.isUntouched());
}

TEST(FindLogicalGroupDepth, APathOf4000EntriesIsFollowedAndALongerOneRefused)
{
  const Bytes bytes = nestedGroups(4002);
  StreamReader reader(bytes);
  TAVHeader parent = headerAt(reader.handle(), 0);
  const Path path(4001, TAVPathEntry{0, kNestedElm});
  TAVFindLogicalGroupParam param = paramOf(path);
  param.pathCount = 4000;
  TAVHeaderData out{};
  Untouched untouched;
  const int64_t before = allocations::live();
  EXPECT_EQ(tavFindLogicalGroup(0, reader.handle(), &parent, &param, &out), TAV_RC_OK);
  EXPECT_EQ(out.header.nodeOffset, 4000U * 16);
  param.pathCount = 4001;
  EXPECT_EQ(tavFindLogicalGroup(0, reader.handle(), &parent, &param, &untouched.data), TAV_RC_NO_MEMORY);
  EXPECT_TRUE(untouched.isUntouched());
  EXPECT_EQ(allocations::live(), before);
}

} // namespace
