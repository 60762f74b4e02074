#include <array>
#include <optional>
#include <vector>

#include "cpp/layer.h"

using namespace test;

namespace
{

std::string streamOf(const tav::Writer& writer)
{
  return toHex(bytesOf(writer.bytes()));
}

} // namespace

TEST(LayerGroup, ClosesItselfAtTheEndOfItsScope)
{
  tav::Writer writer({.byteOrder = kLowFirst});
  {
    tav::Group root = writer.group(0x0102);
    root.add(0x0304, uint8_t{7});
  }
  EXPECT_EQ(streamOf(writer), rows("11 00 00 00 00 00 00 00 00 00 00 00 02 00 02 01"
                                   "01 00 00 00 00 00 00 00 00 00 00 00 33 00 04 03 07"));
}

TEST(LayerGroup, StandsWithAnUnknownSizeWhileItIsOpen)
{
  tav::Writer writer({.byteOrder = kLowFirst});
  const tav::Group root = writer.group(0x0102);
  EXPECT_EQ(streamOf(writer), rows("FF FF FF FF FF FF FF FF 00 00 00 00 02 00 02 01"));
}

TEST(LayerGroup, EndElementFollowsWhenItIsToBeFoundFromBehind)
{
  tav::Writer writer({.byteOrder = kLowFirst});
  writer.group(0x0102, {.eyeSize = true}).close();
  EXPECT_EQ(streamOf(writer), rows("20 00 00 00 00 00 00 00 00 00 40 00 02 00 02 01"
                                   "10 00 00 00 00 00 00 00 00 00 00 00 65 00 E9 FD"
                                   "ED 0D EC DD EE D5 DE C0 20 00 00 00 00 00 00 00"));
}

TEST(LayerGroup, ChildrenTakeTheHeaderThatTheirGroupAsksFor)
{
  tav::Writer writer({.byteOrder = kLowFirst});
  {
    tav::Group root = writer.group(0x0102, {.children = tav::Width::bits32});
    root.add(0x0304, uint8_t{7});
    tav::Group inner = root.group(0x0506, {.children = tav::Width::bits64, .eyeSize = true, .info = 1});
    inner.add(0x0708, uint8_t{8});
  }
  EXPECT_EQ(streamOf(writer), rows("1A 00 00 00 00 00 00 00 00 00 00 00 01 00 02 01"
                                   "01 00 00 00 33 00 04 03 07"
                                   "09 00 00 00 01 00 06 05"
                                   "01 00 00 00 33 00 08 07 08"));
}

TEST(LayerGroup, OuterGroupGoesOnWithItsOwnWidthAfterAnInnerOne)
{
  tav::Writer writer({.byteOrder = kLowFirst});
  {
    tav::Group root = writer.group(0x0102);
    root.group(0x0506, {.children = tav::Width::bits32}).close();
    root.add(0x0304, uint8_t{7});
  }
  EXPECT_EQ(streamOf(writer), rows("21 00 00 00 00 00 00 00 00 00 00 00 02 00 02 01"
                                   "00 00 00 00 00 00 00 00 00 00 00 00 01 00 06 05"
                                   "01 00 00 00 00 00 00 00 00 00 00 00 33 00 04 03 07"));
}

TEST(LayerGroup, RootHasTheHeaderOfTheStreamsOptions)
{
  tav::Writer writer({.byteOrder = kLowFirst, .root = tav::Width::bits32});
  {
    tav::Group root = writer.group(0x0102);
    root.add(0x0304, uint8_t{7});
  }
  EXPECT_EQ(streamOf(writer), rows("09 00 00 00 01 00 02 01  01 00 00 00 33 00 04 03 07"));
}

TEST(LayerGroup, AbandonedGroupLeavesNothing)
{
  tav::Writer writer({.byteOrder = kLowFirst});
  tav::Group root = writer.group(0x0102);
  {
    tav::Group inner = root.group(0x0506);
    inner.add(0x0304, uint64_t{~uint64_t{0}});
    inner.abandon();
    EXPECT_FALSE(inner.isOpen());
  }
  root.add(0x0708, uint8_t{8});
  root.close();
  EXPECT_EQ(streamOf(writer), rows("11 00 00 00 00 00 00 00 00 00 00 00 02 00 02 01"
                                   "01 00 00 00 00 00 00 00 00 00 00 00 33 00 08 07 08"));
}

TEST(LayerGroup, PaddingDoesNotShowWhatWasAbandoned)
{
  tav::Writer writer({.align8 = true});
  tav::Group root = writer.group(0x0102);
  tav::Group inner = root.group(0x0506);
  inner.add(0x0304, std::string(64, 'x'));
  inner.abandon();
  root.add(0x0708, uint8_t{8});
  const Bytes all = bytesOf(writer.bytes());
  EXPECT_EQ(toHex(Bytes(all.end() - 8, all.end())), rows("08 00 00 00 00 00 00 00"));
}

TEST(LayerGroup, OnlyTheInnermostOneTakesNodes)
{
  tav::Writer writer;
  tav::Group root = writer.group(0x0102);
  tav::Group inner = root.group(0x0506);
  const uint64_t before = writer.size();
  const Bytes node(8);
  EXPECT_EQ(thrownBy([&] { root.add(1, uint8_t{1}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { root.add<TAV_TYPE_UINT8>(1, 1); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { root.addRaw(TAV_TYPE_BINARY, 1, {}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { root.addStream(tav::Width::bits64, spanOf(node)); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { tav::Group second = root.group(1); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { root.close(); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { root.abandon(); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { tav::Group second = writer.group(1); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(writer.size(), before);
  EXPECT_EQ(thrownBy([&] { inner.add(1, uint8_t{1}); }), TAV_RC_OK);
}

TEST(LayerGroup, FormsWithAnErrorCodeGiveTheSameCodes)
{
  tav::Writer writer;
  tav::Group root = writer.group(0x0102);
  tav::Group inner = root.group(0x0506);
  const Bytes node(8);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { root.add(1, uint8_t{1}, ec); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { root.add(1, uint8_t{1}, {.eyeSize = true}, ec); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { root.addRaw(101, 1, {}, {}, ec); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { root.addStream(tav::Width::bits64, spanOf(node), ec); }),
            TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { tav::Group second = root.group(1, ec); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { tav::Group second = root.group(1, {}, ec); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { root.close(ec); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { root.abandon(ec); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { inner.add(1, uint8_t{1}, ec); }), TAV_RC_OK);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { inner.close(ec); }), TAV_RC_OK);
}

TEST(LayerGroup, ClosedGroupAnswersErrors)
{
  tav::Writer writer;
  tav::Group root = writer.group(0x0102);
  root.close();
  EXPECT_EQ(thrownBy([&] { root.add(1, uint8_t{1}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { root.close(); }), TAV_RC_BAD_PARAM);
}

TEST(LayerGroup, GroupThatCouldNotBeOpenedAnswersErrors)
{
  std::error_code ec;
  tav::Writer writer;
  tav::Group root = writer.group(0x0102);
  tav::Group failed = writer.group(0x0102, ec);
  EXPECT_EQ(tav::codeOf(ec), TAV_RC_BAD_PARAM);
  EXPECT_FALSE(failed.isOpen());
  EXPECT_EQ(thrownBy([&] { failed.add(1, uint8_t{1}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { tav::Group inner = failed.group(1); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { failed.close(); }), TAV_RC_BAD_PARAM);
}

TEST(LayerGroup, MovedGroupIsTheSameGroup)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(0x0102);
    tav::Group moved = std::move(root);
    moved.add(0x0304, uint8_t{7});
    EXPECT_FALSE(root.isOpen()); // NOLINT(bugprone-use-after-move): that is the test
    EXPECT_EQ(thrownBy([&] { root.add(1, uint8_t{1}); }), TAV_RC_BAD_PARAM);
  }
  EXPECT_EQ(writer.size(), 33U);
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), TAV_RC_OK);
}

TEST(LayerGroup, KeptPastItsWriterAnswersErrorsAndHurtsNothing)
{
  std::optional<tav::Group> kept;
  {
    tav::Writer writer;
    kept.emplace(writer.group(0x0102));
  }
  EXPECT_FALSE(kept->isOpen());
  EXPECT_EQ(thrownBy([&] { kept->add(1, uint8_t{1}); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { tav::Group inner = kept->group(1); }), TAV_RC_BAD_PARAM);
  EXPECT_EQ(thrownBy([&] { kept->close(); }), TAV_RC_BAD_PARAM);
}

TEST(LayerGroup, LivesOnWhenItsWriterIsMoved)
{
  tav::Writer writer;
  tav::Group root = writer.group(0x0102);
  tav::Writer moved = std::move(writer);
  root.add(0x0304, uint8_t{7});
  root.close();
  EXPECT_EQ(moved.size(), 33U);
  EXPECT_EQ(thrownBy([&] { tav::Group second = writer.group(1); }), TAV_RC_BAD_PARAM); // NOLINT
  EXPECT_EQ(writer.size(), 0U);
  EXPECT_EQ(writer.handle(), nullptr);
}

TEST(LayerGroup, ExceptionClosesWhatIsOpen)
{
  tav::Writer writer({.byteOrder = kLowFirst});
  EXPECT_THROW(
      {
        tav::Group root = writer.group(0x0102);
        tav::Group inner = root.group(0x0506);
        throw std::runtime_error("something else failed");
      },
      std::runtime_error);
  EXPECT_EQ(streamOf(writer), rows("10 00 00 00 00 00 00 00 00 00 00 00 02 00 02 01"
                                   "00 00 00 00 00 00 00 00 00 00 00 00 02 00 06 05"));
}

TEST(LayerGroup, DestroyedBeforeItsInnerGroupIsReportedByFinish)
{
  tav::Writer writer;
  {
    std::optional<tav::Group> root(writer.group(0x0102));
    tav::Group inner = root->group(0x0506);
    root.reset();
    EXPECT_EQ(thrownBy([&] { inner.add(1, uint8_t{1}); }), TAV_RC_BAD_PARAM) << "what the destructor could not say";
    EXPECT_EQ(thrownBy([&] { inner.add(1, uint8_t{1}); }), TAV_RC_OK);
  }
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), TAV_RC_BAD_PARAM);
}

// A block with room for the root, one element and nothing more: the end element of a group does not fit.
class LayerGroupThatCannotEnd : public ::testing::Test
{
protected:
  static constexpr uint64_t kRoom = 16 + 16 + 17 + 1; // root, inner group, element; the last byte is not used
  std::vector<std::byte> block = std::vector<std::byte>(kRoom);
  tav::Writer writer{std::span(block)};
};

TEST_F(LayerGroupThatCannotEnd, CloseSaysSoAndLeavesItOpen)
{
  tav::Group root = writer.group(0x0102);
  tav::Group inner = root.group(0x0506, {.eyeSize = true});
  inner.add(1, uint8_t{1});
  EXPECT_EQ(thrownBy([&] { inner.close(); }), TAV_RC_END_OF_STORAGE);
  EXPECT_TRUE(inner.isOpen());
  inner.abandon();
  root.add(1, uint8_t{1});
  root.close();
  writer.finish();
  EXPECT_EQ(writer.size(), 33U);
}

TEST_F(LayerGroupThatCannotEnd, FailureOfADestructorComesUpAtTheNextOperation)
{
  tav::Group root = writer.group(0x0102);
  {
    tav::Group inner = root.group(0x0506, {.eyeSize = true});
    inner.add(1, uint8_t{1});
  }
  EXPECT_EQ(thrownBy([&] { root.add(1, uint8_t{1}); }), TAV_RC_END_OF_STORAGE);
}

TEST_F(LayerGroupThatCannotEnd, TheOuterGroupCanTakeItBack)
{
  {
    tav::Group root = writer.group(0x0102);
    {
      tav::Group inner = root.group(0x0506, {.eyeSize = true});
      inner.add(1, uint8_t{1});
    }
    EXPECT_EQ(thrownBy([&] { root.abandon(); }), TAV_RC_END_OF_STORAGE) << "what the destructor could not say";
    EXPECT_EQ(thrownBy([&] { root.close(); }), TAV_RC_END_OF_STORAGE) << "the inner group is tried again";
    root.abandon();
  }
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), TAV_RC_OK);
  EXPECT_EQ(writer.size(), 0U);
}

TEST_F(LayerGroupThatCannotEnd, FinishReportsTheFirstFailureAndThenThatGroupsAreOpen)
{
  {
    tav::Group root = writer.group(0x0102, {.eyeSize = true});
    tav::Group inner = root.group(0x0506, {.eyeSize = true});
    inner.add(1, uint8_t{1});
  }
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(thrownBy([&] { writer.finish(); }), TAV_RC_END_OF_STORAGE) << "the groups are tried again";
  EXPECT_NE(writer.handle(), nullptr);
}

TEST(LayerGroup, FourThousandCanBeOpenAndTheNextOneLeavesNothing)
{
  tav::Writer writer;
  std::vector<tav::Group> open;
  open.push_back(writer.group(0x0102));
  while (open.size() < 4000)
  {
    open.push_back(open.back().group(0x0506));
  }
  const uint64_t before = writer.size();
  EXPECT_EQ(thrownBy([&] { tav::Group tooDeep = open.back().group(0x0506); }), TAV_RC_NO_MEMORY);
  EXPECT_EQ(writer.size(), before);
  open.back().add(1, uint8_t{1});
  while (!open.empty())
  {
    open.pop_back();
  }
  writer.finish();
  tav::Reader reader(writer.bytes());
  reader.validate();
}

TEST(LayerGroup, TakesTheFormOfAGroupThatAPlainOperationPutInItsPlace)
{
  tav::Writer writer;
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  tav::Group host = root.group(TAV_ELM_CMN_HOST);
  EXPECT_EQ(host.add(TAV_ELM_CMN_HOST_NAME, "a").width(), tav::Width::bits64);
  TAVHandle* const handle = writer.handle();
  ASSERT_EQ(tavCloseHeader(0, handle), TAV_RC_OK);
  TAVHeaderData other{};
  other.header.hdr64 = {TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER32, TAV_ELM_CMN_HOST};
  other.header.hdrType = TAV_HDR_64;
  ASSERT_EQ(tavAddElement(0, handle, &other), TAV_RC_OK);
  EXPECT_EQ(host.add(TAV_ELM_CMN_HOST_NAME, "b").width(), tav::Width::bits32);
}

TEST(LayerGroup, RefusesNodesAfterAPlainOperationHasClosedIt)
{
  std::array<std::byte, 256> block{};
  tav::Writer writer(block);
  tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
  tav::Group host = root.group(TAV_ELM_CMN_HOST);
  ASSERT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_OK);
  EXPECT_EQ(thrownBy([&] { host.add(TAV_ELM_CMN_HOST_NAME, "a"); }), TAV_RC_BAD_PARAM);
}

TEST(LayerGroup, GoesOnAfterAGroupInsideOfEitherForm)
{
  std::array<std::byte, 512> block{};
  tav::Writer writer(block);
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (const tav::Width children : {tav::Width::bits32, tav::Width::bits64})
    {
      tav::Group host = root.group(TAV_ELM_CMN_HOST, {.children = children});
      EXPECT_EQ(host.add(TAV_ELM_CMN_HOST_NAME, "a").width(), children);
      EXPECT_EQ(thrownBy([&] { root.add(TAV_ELM_CMN_HOST_NAME, "b"); }), TAV_RC_BAD_PARAM);
      host.close();
      EXPECT_EQ(root.add(TAV_ELM_CMN_HOST_NAME, "b").width(), tav::Width::bits64);
      EXPECT_EQ(thrownBy([&] { host.add(TAV_ELM_CMN_HOST_NAME, "c"); }), TAV_RC_BAD_PARAM);
    }
  }
  writer.finish();
  const tav::Reader reader(writer.bytes());
  EXPECT_EQ(reader.root().all("hostName").size(), 2U);
  EXPECT_EQ(reader.root().all("host/hostName").size(), 2U);
}
