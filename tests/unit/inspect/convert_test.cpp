#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

std::string jsonOf(const Bytes& bytes, const tav::inspect::Form& form, JsonStyle style = JsonStyle::readable)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  test::Kept kept;
  toJson(source, form, kept, {.style = style});
  return kept.text;
}

Bytes bytesOfJson(const std::string& text, const Conversion& conversion = {})
{
  MemoryText document("document", text);
  test::Made made;
  fromJson(document, made.file(), conversion);
  return made.bytes();
}

Problem refusal(const std::string& text)
{
  try
  {
    bytesOfJson(text);
  }
  catch (const Error& error)
  {
    return error.problem();
  }
  return {};
}

struct Told
{
  std::vector<Difference> list;
  bool different = false;
};

Told differences(const Bytes& a, const tav::inspect::Form& formA, const Bytes& b, const tav::inspect::Form& formB,
                 const DiffOptions& options = {})
{
  ByteSource first("a", std::span<const uint8_t>(a));
  ByteSource second("b", std::span<const uint8_t>(b));
  Told told;
  told.different = diff({first, formA}, {second, formB}, options,
                        [&](const Difference& difference) { told.list.push_back(difference); });
  return told;
}

/// {"system": {"host": {"hostName": ..., "cpuOnline": ...}}} as a stream of this machine.
Bytes hostStream(const std::string& name, unsigned processors)
{
  return bytesOfJson("{\"system\": {\"host\": {\"hostName\": \"" + name + "\", \"cpuOnline\": " +
                     std::to_string(processors) + "}}}");
}

} // namespace

TEST(Json, GivesTheSameBytesAgain)
{
  for (uint64_t seed = 0; seed < 300; ++seed)
  {
    SCOPED_TRACE(seed);
    const test::Tree tree = test::randomTree(seed);
    const Bytes sound = test::bytesOfTree(tree);
    for (const Bytes& bytes : {sound, test::damaged(sound, seed)})
    {
      for (const JsonStyle style : {JsonStyle::readable, JsonStyle::compact, JsonStyle::lines})
      {
        ASSERT_TRUE(bytesOfJson(jsonOf(bytes, test::readForm(tree.form), style)) == bytes);
      }
    }
  }
}

TEST(Json, TellsWhetherSomeBytesAreNoNode)
{
  const Bytes sound = hostStream("ada", 8);
  Bytes damaged = sound;
  damaged.resize(damaged.size() - 3);
  for (const auto& [bytes, expected] : {std::pair(sound, false), {damaged, true}})
  {
    ByteSource source("x", std::span<const uint8_t>(bytes));
    test::Kept kept;
    EXPECT_EQ(toJson(source, {}, kept), expected);
  }
}

TEST(Json, ConvertsToAnotherForm)
{
  const Bytes little = hostStream("ada", 8);
  const Bytes other = bytesOfJson(jsonOf(little, {}), {.swapped = true, .aligned = true});
  EXPECT_NE(other, little);
  EXPECT_FALSE(differences(little, {}, other, {.swapped = true, .aligned = true}).different);
}

TEST(Json, SaysThatPairsTakeWideHeaders)
{
  try
  {
    bytesOfJson("{\"system\": {}}", {.root64 = false, .eyeSize = true});
    FAIL() << "no 32-bit header announces a pair";
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.problem().remedy, Remedy::makeWide);
    EXPECT_EQ(error.problem().sentence, "eye/size pairs need 64-bit headers");
  }
}

TEST(Json, SaysWhereADocumentIsWrong)
{
  const Problem problem = refusal("{\"system\":\n {\"hostNam\": 1}}");
  EXPECT_EQ(problem.file, "document: line 2, byte 22");
  EXPECT_EQ(problem.path, "/system/hostNam");
  EXPECT_THAT(problem.sentence, testing::HasSubstr("did you mean hostName?"));
  EXPECT_THAT(refusal("{\"system\": [").sentence, testing::StartsWith("no JSON: "));
  EXPECT_EQ(refusal("").sentence, "the document is empty");
}

TEST(Diff, FindsNothingBetweenAStreamAndItself)
{
  for (uint64_t seed = 0; seed < 100; ++seed)
  {
    const test::Tree tree = test::randomTree(seed);
    const Bytes bytes = test::bytesOfTree(tree);
    EXPECT_FALSE(differences(bytes, test::readForm(tree.form), bytes, test::readForm(tree.form)).different) << seed;
  }
}

TEST(Diff, TellsAChangedValueWithBothSides)
{
  const Told told = differences(hostStream("ada", 8), {}, hostStream("ada", 9), {});
  ASSERT_EQ(told.list.size(), 1U);
  EXPECT_TRUE(told.different);
  const Difference& difference = told.list.front();
  EXPECT_EQ(difference.change, Change::changed);
  EXPECT_EQ(difference.before->path, "/system/host/cpuOnline");
  EXPECT_EQ(difference.before->value, "8");
  EXPECT_EQ(difference.after->value, "9");
  EXPECT_THAT(difference.sentence, testing::HasSubstr("8 -> 9"));
}

TEST(Diff, TellsWhatOnlyOneStreamHas)
{
  const Bytes one = bytesOfJson("{\"system\": {\"hostName\": \"ada\"}}");
  const Bytes two = bytesOfJson("{\"system\": {\"hostName\": \"ada\", \"cpuOnline\": 1}}");
  const Told added = differences(one, {}, two, {});
  ASSERT_EQ(added.list.size(), 1U);
  EXPECT_EQ(added.list.front().change, Change::added);
  EXPECT_FALSE(added.list.front().before);
  const Told removed = differences(two, {}, one, {});
  ASSERT_EQ(removed.list.size(), 1U);
  EXPECT_EQ(removed.list.front().change, Change::removed);
}

TEST(Diff, LeavesOutWhatIsIgnoredAndWhatIsNear)
{
  const Bytes a = hostStream("ada", 100);
  const Bytes b = hostStream("bob", 101);
  EXPECT_EQ(differences(a, {}, b, {}).list.size(), 2U);
  DiffOptions options;
  options.ignored.emplace_back("**/hostName");
  EXPECT_EQ(differences(a, {}, b, {}, options).list.size(), 1U);
  options.tolerance = {.amount = 1, .percent = true};
  EXPECT_FALSE(differences(a, {}, b, {}, options).different);
}

TEST(Path, LeadsToTheNodesThatItNames)
{
  const Bytes bytes = bytesOfJson("{\"system\": {\"host\": [{\"hostName\": \"ada\"}, {\"hostName\": \"bob\"}]}}");
  const auto offsets = [&](const std::string& text) {
    ByteSource source("x", std::span<const uint8_t>(bytes));
    PathSearch search(source, {}, pathOf(text));
    Event event;
    std::vector<std::string> found;
    while (search.next(event))
    {
      found.push_back(search.walker().path(event));
    }
    return found;
  };
  using testing::ElementsAre;
  EXPECT_THAT(offsets("/system/host"), ElementsAre("/system/host", "/system/host[2]"));
  EXPECT_THAT(offsets("/system/host[2]/hostName"), ElementsAre("/system/host[2]/hostName"));
  EXPECT_THAT(offsets("**/hostName"), ElementsAre("/system/host/hostName", "/system/host[2]/hostName"));
  EXPECT_THAT(offsets("/"), ElementsAre("/system"));
  EXPECT_THAT(offsets("/system/cpu"), ElementsAre());
}

TEST(Path, IsRefusedWithItsText)
{
  for (const char* text : {"", "//", "/system[", "/system[x=]", "/sys tem["})
  {
    try
    {
      pathOf(text);
      ADD_FAILURE() << text;
    }
    catch (const Error& error)
    {
      EXPECT_EQ(error.trouble(), Trouble::refused) << text;
      EXPECT_THAT(error.problem().sentence, testing::StartsWith("path '" + std::string(text) + "': column "));
    }
  }
}

TEST(Path, NameThatNoElementHasIsNotFound)
{
  try
  {
    pathOf("/system/hostNam");
    ADD_FAILURE();
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.trouble(), Trouble::notFound);
    EXPECT_THAT(error.problem().sentence,
                testing::HasSubstr("column 9: no element is called 'hostNam'; did you mean hostName?"));
  }
}
