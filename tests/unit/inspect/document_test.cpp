#include <algorithm>
#include <cstddef>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/streams.h"
#include "tav/inspect/document.hpp"

using namespace tav::inspect;
using test::Bytes;
using testing::ElementsAre;
using testing::HasSubstr;

namespace
{

/// How a document gets at its bytes.
enum class Access : uint8_t
{
  memory,
  file
};

class TestDocument : public testing::TestWithParam<Access>
{
protected:
  /// A document over bytes, which the fixture keeps.
  Document open(Bytes bytes, const DocumentOptions& options = {})
  {
    bytes_ = std::move(bytes);
    if (GetParam() == Access::memory)
    {
      return Document(test::spanOf(bytes_), options);
    }
    std::ofstream(file_.path, std::ios::binary)
        .write(reinterpret_cast<const char*>(bytes_.data()), static_cast<std::streamsize>(bytes_.size()));
    return Document(file_.path, options);
  }

  Bytes bytes_;
  const test::TemporaryPath file_;
};

struct Made
{
  bool swap = false;
  bool align = false;
  tav::Width root = tav::Width::bits64;
};

/// A stream with some hosts in it: "ada" and others with a number of processors each.
Bytes hosts(std::initializer_list<std::pair<std::string, uint32_t>> all, const Made& form = {})
{
  tav::Writer writer({.byteOrder = form.swap ? tav::ByteOrder::swapped : tav::ByteOrder::native,
                      .align8 = form.align,
                      .root = form.root});
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM, {.children = form.root});
    for (const auto& [name, processors] : all)
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST, {.children = form.root});
      host.add(TAV_ELM_CMN_HOST_NAME, name);
      host.add(TAV_ELM_CMN_CPU_ONLINE, processors);
    }
  }
  writer.finish();
  return test::bytesOf(writer.bytes());
}

Bytes operator+(Bytes a, const Bytes& b)
{
  a.insert(a.end(), b.begin(), b.end());
  return a;
}

std::vector<std::string> texts(NodeRange range)
{
  std::vector<std::string> all;
  for (const tav::Node& node : range)
  {
    all.push_back(node.as<std::string>());
  }
  return all;
}

/// What an operation that fails says.
template<class Call>
Problem problemOf(Call&& call)
{
  try
  {
    call();
  }
  catch (const Error& error)
  {
    Problem problem = error.problem();
    problem.code = tav::codeOf(error.code());
    return problem;
  }
  ADD_FAILURE() << "it did not fail";
  return {};
}

} // namespace

INSTANTIATE_TEST_SUITE_P(, TestDocument, testing::Values(Access::memory, Access::file), [](const auto& name) {
  return name.param == Access::memory ? "memory" : "file";
});

TEST_P(TestDocument, ANodesPathLeadsBackToItAndItsFormIsThatOfItsStream)
{
  Bytes bytes = hosts({{"ada", 1}, {"grace", 2}});
  const Bytes other = hosts({{"hedy", 3}}, {.swap = true});
  bytes.insert(bytes.end(), other.begin(), other.end());
  const Document document = open(bytes);
  std::vector<std::string> paths;
  std::vector<bool> swapped;
  for (const tav::Node& node : document.find("//hostName"))
  {
    paths.push_back(document.pathOf(node));
    swapped.push_back(document.formOf(node).swapped);
  }
  EXPECT_THAT(paths, ElementsAre("/system/host/hostName", "/system/host[2]/hostName", "/system/host/hostName"));
  EXPECT_THAT(swapped, ElementsAre(false, false, true));
}

TEST_P(TestDocument, ASearchTellsHowFarItIsAndIsCancelledByThrowing)
{
  Bytes bytes;
  for (int i = 0; i < 3000; ++i)
  {
    const Bytes more = hosts({{"ada", 1}});
    bytes.insert(bytes.end(), more.begin(), more.end());
  }
  const Document document = open(bytes);
  std::vector<uint64_t> told;
  document.tellProgress([&](uint64_t offset) {
    told.push_back(offset);
    if (told.size() == 2)
    {
      throw std::runtime_error("enough");
    }
  });
  EXPECT_THROW(texts(document.find("//osName")), std::runtime_error);
  EXPECT_THAT(told, ElementsAre(testing::Gt(0U), testing::Gt(4096U)));
}

TEST_P(TestDocument, FindsOutTheFormOfAFile)
{
  for (const bool swap : {false, true})
  {
    for (const bool align : {false, true})
    {
      for (const tav::Width root : {tav::Width::bits32, tav::Width::bits64})
      {
        const Document document = open(hosts({{"ada", 8}, {"grace", 16}, {"hedy", 3}}, {swap, align, root}));
        EXPECT_EQ(document.form().swapped, swap);
        EXPECT_EQ(document.form().root64, root == tav::Width::bits64);
        EXPECT_EQ(document.form().aligned, align);
        EXPECT_THAT(texts(document.find("/system/host/hostName")), ElementsAre("ada", "grace", "hedy"));
        std::vector<uint32_t> processors;
        for (const tav::Node& node : document.find("**/cpuOnline"))
        {
          processors.push_back(node.as<uint32_t>());
        }
        EXPECT_THAT(processors, ElementsAre(8, 16, 3));
        EXPECT_TRUE(document.damage().empty());
      }
    }
  }
}

TEST_P(TestDocument, FollowsTheFormThatIsGiven)
{
  const Document document = open(hosts({{"ada", 8}}), {.form = {.swapped = false, .root64 = true, .aligned = false}});
  EXPECT_THAT(texts(document.find("**/hostName")), ElementsAre("ada"));
  const Problem problem = problemOf([&] { static_cast<void>(open(hosts({{"ada", 8}}), {.form = {.swapped = true}})); });
  EXPECT_EQ(problem.code, TAV_RC_NOT_FOUND);
}

TEST_P(TestDocument, SaysWhatAFileIsThatIsNoStream)
{
  Problem problem = problemOf([&] { static_cast<void>(open({})); });
  EXPECT_EQ(problem.code, TAV_RC_NOT_FOUND);
  EXPECT_EQ(problem.sentence, "the file is empty, no stream");
  problem = problemOf([&] { static_cast<void>(open(Bytes(200, 0xAB))); });
  EXPECT_EQ(problem.code, TAV_RC_NOT_FOUND);
  problem = problemOf([&] { static_cast<void>(open(Bytes{'P', 'K', 3, 4, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9, 9})); });
  EXPECT_EQ(problem.code, TAV_RC_NOT_FOUND);
  EXPECT_EQ(problem.sentence, "this is a zip file, no stream");
}

TEST_P(TestDocument, SaysBetweenWhatAFormIsAmbiguous)
{
  Bytes found;
  for (uint64_t seed = 0; found.empty() && seed < 20000; ++seed)
  {
    Bytes tried = test::damaged(test::namedStream(seed), seed);
    ByteSource source("x", std::span<const uint8_t>(tried));
    const Recognition recognition = recognise(source);
    if (recognition.isStream && recognition.ambiguous() && !otherKindOf(source, recognition))
    {
      found = tried;
    }
  }
  ASSERT_FALSE(found.empty());
  const Problem problem = problemOf([&] { static_cast<void>(open(found)); });
  EXPECT_EQ(problem.code, TAV_RC_BAD_PARAM);
  EXPECT_THAT(problem.sentence, HasSubstr("-endian"));
  EXPECT_THAT(problem.sentence, HasSubstr(", or "));
  const Document document = open(found, {.form = {.swapped = false, .root64 = true, .aligned = false}});
  for (const tav::Node& node : document.roots(OnDamage::skip))
  {
    EXPECT_LT(node.offset(), found.size());
  }
}

TEST_P(TestDocument, ReadsEveryStreamInItsOwnForm)
{
  for (const bool swap : {false, true})
  {
    const Bytes first = hosts({{"ada", 8}, {"grace", 16}}, {.swap = swap});
    const Bytes second = hosts({{"hedy", 3}, {"joan", 4}}, {.swap = !swap, .align = true, .root = tav::Width::bits32});
    const Bytes third = hosts({{"mary", 5}}, {.swap = swap});
    const Document document = open(first + Bytes(100, 0) + second + third);
    std::vector<uint64_t> places;
    for (const tav::Node& root : document.roots())
    {
      EXPECT_EQ(root.elm(), TAV_ELM_CMN_SYSTEM);
      places.push_back(root.offset());
    }
    EXPECT_THAT(places, ElementsAre(0, first.size() + 100, first.size() + 100 + second.size()));
    EXPECT_THAT(texts(document.find("/system/host/hostName")), ElementsAre("ada", "grace", "hedy", "joan", "mary"));
    EXPECT_TRUE(document.damage().empty());
  }
}

TEST_P(TestDocument, LeavesOutWhatStandsBefore)
{
  const Document document = open(Bytes(100, 0xAB) + hosts({{"ada", 8}, {"grace", 16}}), {.from = 100});
  std::vector<uint64_t> places;
  for (const tav::Node& root : document.roots())
  {
    places.push_back(root.offset());
  }
  EXPECT_THAT(places, ElementsAre(0));
  EXPECT_THAT(texts(document.find("/system/host/hostName")), ElementsAre("ada", "grace"));
  EXPECT_EQ(problemOf([&] { static_cast<void>(open(Bytes(10), {.from = 11})); }).code, TAV_RC_BAD_PARAM);
}

TEST_P(TestDocument, FindsFromANodeInItsStreamsForm)
{
  const Bytes first = hosts({{"ada", 8}});
  const Document document = open(first + hosts({{"hedy", 3}, {"joan", 4}}, {.swap = true}));
  std::vector<std::string> names;
  for (const tav::Node& root : document.roots())
  {
    for (const tav::Node& host : document.find(root, "host[2]"))
    {
      EXPECT_EQ(test::countOf(document.find(host, "*")), 2U);
      EXPECT_THAT(texts(document.find(host, "/system/host[1]/hostName")), ElementsAre("ada", "hedy"));
      names.push_back(texts(document.find(host, "hostName")).at(0));
    }
  }
  EXPECT_THAT(names, ElementsAre("joan"));
}

TEST_P(TestDocument, FindsFromANodeWhatTheReaderFinds)
{
  const Document document = open(hosts({{"ada", 4}, {"eve", 8}, {"bob", 16}}));
  const tav::Reader reader(test::spanOf(bytes_));
  const auto offsetsOf = [](auto&& range) {
    std::vector<uint64_t> offsets;
    for (const tav::Node& node : range)
    {
      offsets.push_back(node.offset());
    }
    return offsets;
  };
  size_t found = 0;
  for (const tav::Node& from : reader.find("/ | //*"))
  {
    for (const char* const path : {".", "*", ".//*", "hostName", "..", "../*", "../*[1]", "../../*", "..//cpuOnline",
                                   "//host[cpuOnline > 4]", "/system/host[last()]", "../host[hostName='eve'] | ."})
    {
      SCOPED_TRACE(std::to_string(from.offset()) + " " + path);
      const std::vector<uint64_t> expected = offsetsOf(from.find(path));
      EXPECT_EQ(offsetsOf(document.find(from, path)), expected);
      found += expected.size();
    }
  }
  EXPECT_GT(found, 100U);
}

TEST_P(TestDocument, FindsNothingBelowAnEmptyGroupAndWhatIsBelowOneThatWasNeverClosed)
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    {
      const tav::Group host = system.group(TAV_ELM_CMN_HOST);
    }
    system.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{1});
    system.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{2});
  }
  writer.finish();
  const Bytes closed = test::bytesOf(writer.bytes());
  Bytes leftOpen = hosts({{"ada", 8}}); // as a program left it that was killed
  std::fill_n(leftOpen.begin(), sizeof(uint64_t), uint8_t{0});
  for (const OnDamage onDamage : {OnDamage::stop, OnDamage::skip})
  {
    const Document document = open(closed + closed);
    for (const tav::Node& host : document.find("/system/host"))
    {
      EXPECT_TRUE(test::countOf(document.find(host, "*", onDamage)) == 0);
      EXPECT_TRUE(test::countOf(document.find(host, ".//*", onDamage)) == 0);
      EXPECT_EQ(test::countOf(document.find(host, ".", onDamage)), 1U);
    }
  }
  const Document left = open(leftOpen);
  for (const tav::Node& root : left.roots())
  {
    EXPECT_EQ(test::countOf(left.find(root, ".//*", OnDamage::skip)), 3U);
  }
}

/// Where nodes begin, by asking each for what is in it.
void offsetsBelow(const Document& document, const tav::Node& node, std::vector<uint64_t>& offsets)
{
  offsets.push_back(node.offset());
  for (const tav::Node& child : document.find(node, "*", OnDamage::skip))
  {
    offsetsBelow(document, child, offsets);
  }
}

tav::Node lastHost(const Document& document)
{
  NodeRange hosts = document.find("/system/host[2]", OnDamage::skip);
  return *hosts.begin();
}

TEST_P(TestDocument, FindsInAGroupThatSaysItEndsPastTheOneAroundItWhatAWalkFinds)
{
  const Bytes before = hosts({{"ada", 8}, {"grace", 4}});
  const Bytes sound = before + hosts({{"hedy", 2}});
  const Document whole = open(sound);
  const auto last = static_cast<ptrdiff_t>(lastHost(whole).offset());
  uint64_t size = 0;
  std::memcpy(&size, sound.data() + last, sizeof size);
  for (uint64_t more = 1; more < 120; ++more)
  {
    Bytes bytes = sound;
    const uint64_t claimed = size + more;
    std::memcpy(bytes.data() + last, &claimed, sizeof claimed);
    const Document document = open(bytes);
    std::vector<uint64_t> expected;
    for (const tav::Node& node : document.find("//*", OnDamage::skip))
    {
      expected.push_back(node.offset());
    }
    std::vector<uint64_t> found;
    for (const tav::Node& root : document.roots(OnDamage::skip))
    {
      offsetsBelow(document, root, found);
    }
    ASSERT_EQ(found, expected) << more << " bytes more";
    ASSERT_EQ(found.size(), 11U) << more << " bytes more";
    EXPECT_EQ(document.boundOf(lastHost(document)), before.size());
  }
}

TEST_P(TestDocument, StopsAtDamageAndSaysWhere)
{
  Bytes bytes = hosts({{"ada", 8}, {"grace", 16}, {"hedy", 3}});
  const Document sound = open(bytes);
  uint64_t place = 0;
  for (const tav::Node& node : sound.find("/system/host[2]/hostName"))
  {
    place = node.offset();
  }
  bytes[static_cast<size_t>(place)] = 0xFF; // its size, larger than its group
  bytes[static_cast<size_t>(place) + 1] = 0xFF;
  const Document document = open(bytes);
  std::vector<std::string> names;
  const Problem problem = problemOf([&] {
    for (const tav::Node& node : document.find("**/hostName"))
    {
      names.push_back(node.as<std::string>());
    }
  });
  EXPECT_THAT(names, ElementsAre("ada"));
  EXPECT_EQ(problem.offset, place);
  EXPECT_EQ(problem.path, "/system/host[2]");
  EXPECT_EQ(problem.code, TAV_RC_OUTSIDE_PARENT);
  EXPECT_TRUE(document.damage().empty());
  NodeRange groups = document.find("/system/host[2]");
  const tav::Node group = *groups.begin();
  EXPECT_EQ(problemOf([&] { texts(document.find(group, "*")); }).path, "/system/host[2]"); // from a node, too

  EXPECT_THAT(texts(document.find("**/hostName", OnDamage::skip)), ElementsAre("ada", "hedy"));
  ASSERT_EQ(document.damage().size(), 1U);
  EXPECT_EQ(document.damage()[0].offset, place);
  EXPECT_GE(document.damage()[0].size, 16U);
  EXPECT_EQ(document.damage()[0].rule, RuleId::damaged);
  EXPECT_THAT(texts(document.find("**/hostName", OnDamage::skip)), ElementsAre("ada", "hedy"));
  EXPECT_EQ(document.damage().size(), 1U) << "a place is told once";
}

TEST_P(TestDocument, TellsOfAFileThatIsCut)
{
  Bytes bytes = hosts({{"ada", 8}, {"grace", 16}});
  bytes.resize(bytes.size() - 3);
  const Document document = open(bytes);
  EXPECT_THAT(texts(document.find("**/hostName", OnDamage::skip)), ElementsAre("ada", "grace"));
  std::vector<RuleId> rules;
  for (const Damage& damage : document.damage())
  {
    rules.push_back(damage.rule);
  }
  EXPECT_THAT(rules, testing::Contains(RuleId::pastFile));
  EXPECT_EQ(document.damage()[0].offset, 0U);
  EXPECT_EQ(document.damage()[0].size, 0U);
}

TEST_P(TestDocument, RefusesPathsThatAreNone)
{
  const Document document = open(hosts({{"ada", 8}}));
  EXPECT_EQ(problemOf([&] { static_cast<void>(document.find("")); }).code, TAV_RC_BAD_PARAM);
  EXPECT_EQ(problemOf([&] { static_cast<void>(document.find("a[")); }).code, TAV_RC_BAD_PARAM);
  const Problem problem = problemOf([&] { static_cast<void>(document.find("/system/hosst")); });
  EXPECT_EQ(problem.code, TAV_RC_BAD_PARAM);
  EXPECT_THAT(problem.sentence + problem.hint, HasSubstr("hosst"));
}

TEST_P(TestDocument, AgreesWithTheReaderOverRandomTrees)
{
  for (uint64_t seed = 0; seed < 150; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed, {.forget = false});
    const Form form = test::readForm(tree.form);
    const Document document = open(test::bytesOfTree(tree), {.form = {form.swapped, form.root64, form.aligned}});
    const tav::Reader reader(test::spanOf(bytes_), {.byteOrder = form.swapped ? tav::ByteOrder::swapped
                                                                              : tav::ByteOrder::native,
                                                    .align8 = form.aligned,
                                                    .root = form.root64 ? tav::Width::bits64 : tav::Width::bits32});
    std::vector<const test::TreeNode*> nodes;
    test::listNodes(tree.root, nodes);
    std::vector<uint64_t> expected;
    for (const test::TreeNode* const node : nodes)
    {
      if (!tav::layout::isEndElement(node->elm))
      {
        expected.push_back(node->offset);
      }
    }
    std::vector<uint64_t> found;
    for (const tav::Node& node : document.find("/**/*"))
    {
      const tav::Node other =
          reader.at(node.offset(), node.width());
      EXPECT_EQ(test::bytesOf(node.payload()), test::bytesOf(other.payload()));
      found.push_back(node.offset());
    }
    EXPECT_EQ(found, expected);
  }
}

TEST_P(TestDocument, EndsOverDamagedStreams)
{
  size_t opened = 0;
  for (uint64_t seed = 0; seed < 300; ++seed)
  {
    SCOPED_TRACE(seed);
    const bool swap = seed % 2 == 0;
    const Bytes bytes = test::damaged(test::namedStream(seed, swap), seed);
    const DocumentOptions known{.form = {.swapped = swap, .root64 = true, .aligned = false}};
    ByteSource source("x", std::span<const uint8_t>(bytes));
    if (!recognise(source, known.form).isStream)
    {
      continue; // nothing of a small one was left
    }
    ++opened;
    const Document document = open(bytes, known);
    uint64_t last = 0;
    for (const tav::Node& node : document.find("/**/*", OnDamage::skip))
    {
      EXPECT_TRUE(last == 0 || node.offset() > last);
      last = node.offset();
    }
    uint64_t end = 0;
    for (const Damage& damage : document.damage())
    {
      EXPECT_LE(end, damage.offset + damage.size);
      EXPECT_LE(damage.offset + damage.size, bytes.size());
      end = damage.offset;
    }
  }
  EXPECT_GT(opened, 250U);
}

TEST_P(TestDocument, StandsAtItsEndAfterAnError)
{
  Bytes bytes = hosts({{"ada", 8}});
  bytes.resize(bytes.size() - 3);
  const Document document = open(bytes, {.form = {.aligned = false}});
  NodeRange range = document.find("**/cpuOnline");
  EXPECT_THROW(static_cast<void>(range.begin()), Error);
  EXPECT_TRUE(range.begin() == NodeRange::end());
}

TEST(DocumentFile, SaysWhyItCannotBeOpened)
{
  const test::TemporaryPath file;
  EXPECT_EQ(problemOf([&] { static_cast<void>(Document(file.path)); }).code, KOR_RC_NO_SUCH_FILE);
  EXPECT_EQ(problemOf([&] { static_cast<void>(Document(std::filesystem::temp_directory_path())); }).code,
            KOR_RC_IS_FOLDER);
}

TEST(DocumentFile, LooksBelowEmptyGroupsInOneGoThroughTheFile)
{
  constexpr size_t groups = 4000;
  const test::TemporaryPath file;
  {
    tav::Writer writer(file.path);
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    for (size_t i = 0; i < groups; ++i)
    {
      const tav::Group host = system.group(TAV_ELM_CMN_HOST);
    }
  }
  const Document document(file.path, {.ringBytes = 16384});
  size_t found = 0;
  for (const tav::Node& host : document.find("/system/host"))
  {
    ++found;
    EXPECT_EQ(test::countOf(document.find(host, "*")), 0U);
  }
  EXPECT_EQ(found, groups);
  // From the start to each group it would be two thousand times the file.
  EXPECT_LT(document.source().bytesRead(), 20 * document.source().size());
}

TEST(DocumentFile, TellsOfAnElementThatIsLargerThanTheRing)
{
  const test::TemporaryPath file;
  {
    tav::Writer writer(file.path);
    {
      tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
      system.add(TAV_ELM_CMN_HOST_NAME, std::string(size_t{9} << 20U, 'a'));
      system.add(TAV_ELM_CMN_OS_NAME, "small");
    }
    writer.finish();
  }
  const Document document(file.path, {.ringBytes = 65536});
  NodeRange range = document.find("/system/hostName");
  const Problem problem = problemOf([&] { static_cast<void>(range.begin()); });
  EXPECT_EQ(problem.code, TAV_RC_DATA_TOO_LARGE);
  EXPECT_EQ(problem.path, "/system/hostName");
  EXPECT_THAT(texts(document.find("/system/osName")), ElementsAre("small"));
}
