#include <array>
#include <filesystem>
#include <fstream>
#include <ostream>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/platform.h"

using namespace tav::inspect;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

namespace
{

constexpr std::string_view kTwo = R"({
  "40001": {"tag": "queueDepth", "kind": "gauge", "unit": "1", "text": "waiting jobs"},
  "40002": {"tag": "jobs_done", "kind": "counter"}
})";

Dictionary read(std::string_view text, const std::string& name = "n.json")
{
  MemoryText source(name, text);
  return Dictionary::read(source);
}

/// What an error says; empty when there is none.
template<class Work>
std::string complaint(Work&& work)
{
  try
  {
    work();
  }
  catch (const Error& error)
  {
    return problemLine(error.problem());
  }
  return {};
}

struct Wrong
{
  const char* name;
  std::string_view text;
  std::string_view says;
};

std::ostream& operator<<(std::ostream& out, const Wrong& row)
{
  return out << row.name;
}

constexpr std::array kWrong = {
    Wrong{"Empty", "", "n.json: line 1, column 1: no JSON: the text ends where a value is expected"},
    Wrong{"NoObject", "[]", "n.json: line 1, column 1: a dictionary is an object: "},
    Wrong{"ANumber", "\n 7", "n.json: line 2, column 2: a dictionary is an object: "},
    Wrong{"Cut", "{\"40001\": {\"tag\": \"a\"", "n.json: line 1, column 22: no JSON: the text ends where "},
    Wrong{"More", "{}\n{}", "n.json: line 2, column 1: there is more behind the dictionary"},
    Wrong{"ElementIsText", "{\"40001\": \"a\"}", "n.json: line 1, column 11: an element is an object: "},
    Wrong{"ElementIsArray", "{\"40001\": [1]}", "n.json: line 1, column 11: an element is an object: "},
    Wrong{"ElementIsNull", "{\"40001\": null}", "n.json: line 1, column 11: an element is an object: "},
    Wrong{"ElementIsTrue", "{\"40001\": true}", "n.json: line 1, column 11: an element is an object: "},
    Wrong{"ElementIsAFraction", "{\"40001\": 1.5}", "n.json: line 1, column 11: an element is an object: "},
    Wrong{"NoId", "{\"x\": {\"tag\": \"a\"}}",
          "n.json: line 1, column 2: \"x\" is no id; they are numbers from 0 to 65535"},
    Wrong{"SignedId", "{\"+40001\": {}}", "n.json: line 1, column 2: \"+40001\" is no id"},
    Wrong{"LongId", "{\"040001\": {}}", "n.json: line 1, column 2: \"040001\" is no id"},
    Wrong{"LargeId", "{\"65536\": {}}", "n.json: line 1, column 2: \"65536\" is no id"},
    Wrong{"BuiltInId", "{\n  \"60103\": {\"tag\": \"a\"}}",
          "n.json: line 2, column 3: the id 60103 is that of \"hostName\" in the built-in dictionary"},
    Wrong{"UnusedIdOfARange", "{\"46000\": {\"tag\": \"a\"}}", "n.json: line 1, column 2: the id 46000 "},
    Wrong{"NoTag", "{\"40001\": {\"kind\": \"gauge\"}}", "n.json: line 1, column 2: the element has no tag"},
    Wrong{"EmptyTag", "{\"40001\": {\"tag\": \"\"}}", "n.json: line 1, column 19: \"\" is no tag; "},
    Wrong{"TagWithABlank", "{\"40001\": {\"tag\": \"a b\"}}", "n.json: line 1, column 19: \"a b\" is no tag; "},
    Wrong{"TagWithADigitFirst", "{\"40001\": {\"tag\": \"1a\"}}", "n.json: line 1, column 19: \"1a\" is no tag; "},
    Wrong{"TagOfXml", "{\"40001\": {\"tag\": \"damaged\"}}",
          "n.json: line 1, column 19: \"damaged\" has another meaning in XML"},
    Wrong{"BuiltInTag", "{\"40001\": {\"tag\": \"hostName\"}}",
          "n.json: line 1, column 19: the tag \"hostName\" is that of 60103 in the built-in dictionary"},
    Wrong{"BuiltInConstant", "{\"40001\": {\"tag\": \"TAV_ELM_CMN_HOST\"}}",
          "n.json: line 1, column 19: the tag \"TAV_ELM_CMN_HOST\" is that of 60102 in the built-in dictionary"},
    Wrong{"TagIsANumber", "{\"40001\": {\"tag\": 7}}", "n.json: line 1, column 19: \"tag\" is a text"},
    Wrong{"TagIsAnObject", "{\"40001\": {\"tag\": {}}}", "n.json: line 1, column 19: \"tag\" is a text"},
    Wrong{"UnknownKey", "{\"40001\": {\"tag\": \"a\", \"units\": \"1\"}}",
          "n.json: line 1, column 24: the key \"units\" is not known; there are tag, kind, unit and text"},
    Wrong{"KeyTwice", "{\"40001\": {\"tag\": \"a\", \"tag\": \"b\"}}",
          "n.json: line 1, column 24: the key \"tag\" is given twice"},
    Wrong{"UnknownKind", "{\"40001\": {\"tag\": \"a\", \"kind\": \"guage\"}}",
          "n.json: line 1, column 32: \"guage\" is no kind; there are gauge, counter and text"},
    Wrong{"IdTwice", "{\"40001\": {\"tag\": \"a\"},\n \"40001\": {\"tag\": \"b\"}}",
          "n.json: line 2, column 2: the id 40001 is given twice, first at n.json: line 1, column 2"},
    Wrong{"TagTwice", "{\"40001\": {\"tag\": \"a\"},\n \"40002\": {\"tag\": \"a\"}}",
          "n.json: line 2, column 19: the tag \"a\" is given twice, first at n.json: line 1, column 2"},
    Wrong{"ColumnsAreCharacters", "{\"40001\": {\"text\": \"\xC3\xA4\xC3\xB6\", \"tag\": 7}}",
          "n.json: line 1, column 33: \"tag\" is a text"},
};

class WrongDictionary : public ::testing::TestWithParam<Wrong>
{
};

} // namespace

TEST(Dictionary, GivesWhatTheFileSays)
{
  const Dictionary names = read(kTwo);
  ASSERT_EQ(names.elements().size(), 2U);
  const OwnElement* const depth = names.find(uint16_t{40001});
  ASSERT_NE(depth, nullptr);
  EXPECT_EQ(depth, names.find("queueDepth"));
  EXPECT_EQ(depth->kind, ElementKind::gauge);
  EXPECT_EQ(depth->unit, "1");
  EXPECT_EQ(depth->text, "waiting jobs");
  EXPECT_EQ(depth->place, "n.json: line 2, column 3");
  EXPECT_EQ(names.find("jobs_done")->kind, ElementKind::counter);
  EXPECT_EQ(names.find("jobs_done")->unit, "");
  EXPECT_EQ(names.tagOf(40002), "jobs_done");
  EXPECT_EQ(names.tagOf(60103), "hostName");
  EXPECT_EQ(names.tagOf(40003), "");
  EXPECT_EQ(names.find("jobs"), nullptr);
  EXPECT_EQ(names.find(uint16_t{60103}), nullptr);
}

TEST(Dictionary, OfNothingKnowsTheBuiltInNamesOnly)
{
  for (const Dictionary& none : {Dictionary(), read("{}"), read(" {\r\n\t} ")})
  {
    EXPECT_TRUE(none.isEmpty());
    EXPECT_THAT(none.elements(), IsEmpty());
    EXPECT_THAT(none.names(), IsEmpty());
    EXPECT_EQ(none.tagOf(60103), "hostName");
    EXPECT_EQ(none.find("queueDepth"), nullptr);
  }
}

TEST(Dictionary, TheLongestFreeStretchIsFree)
{
  std::string text;
  for (unsigned id = 1054; id < 45000; ++id)
  {
    text += (text.empty() ? "{\"" : ",\"") + std::to_string(id) + "\":{\"tag\":\"own" + std::to_string(id) + "\"}";
  }
  const Dictionary names = read(text + "}");
  EXPECT_EQ(names.elements().size(), 45000U - 1054U);
  EXPECT_EQ(names.tagOf(44999), "own44999");
  EXPECT_EQ(names.find("own1054")->id, 1054);
  EXPECT_NE(complaint([] { read(R"({"1053": {"tag": "a"}})"); }), "");
  EXPECT_NE(complaint([] { read(R"({"45000": {"tag": "a"}})"); }), "");
}

TEST(Dictionary, CutAnywhereIsAnErrorWithAPlace)
{
  for (size_t size = 0; size < kTwo.size(); ++size)
  {
    EXPECT_THAT(complaint([&] { read(kTwo.substr(0, size)); }), ::testing::StartsWith("n.json: line ")) << size;
  }
}

TEST_P(WrongDictionary, IsToldWithItsPlace)
{
  EXPECT_THAT(complaint([] { read(GetParam().text); }), ::testing::StartsWith(GetParam().says));
}
INSTANTIATE_TEST_SUITE_P(All, WrongDictionary, ::testing::ValuesIn(kWrong),
                         [](const auto& row) { return std::string(row.param.name); });

TEST(Dictionary, IsEqualWithTheSameElementsWhereverTheyAreGiven)
{
  EXPECT_EQ(Dictionary(), Dictionary());
  EXPECT_EQ(read(kTwo), read(kTwo, "other.json"));
  EXPECT_NE(read(kTwo), Dictionary());
  EXPECT_NE(read(kTwo), read(R"({"40001": {"tag": "queueDepth"}, "40002": {"tag": "jobs_done", "kind": "counter"}})"));
  EXPECT_NE(read(R"({"40001": {"tag": "queueDepth"}})"), read(R"({"40002": {"tag": "queueDepth"}})"));
}

TEST(Dictionary, TwoOfOneRankMustAgree)
{
  const Dictionary one = read(kTwo, "a.json");
  EXPECT_EQ(one.with(read(kTwo, "b.json")).elements().size(), 2U);
  EXPECT_EQ(one.with(read(R"({"40003": {"tag": "other"}})", "b.json")).elements().size(), 3U);
  EXPECT_EQ(complaint([&] { one.with(read("{\n\"40001\": {\"tag\": \"other\"}}", "b.json")); }),
            "b.json: line 2, column 1: the id 40001 is given otherwise at a.json: line 2, column 3");
  EXPECT_EQ(complaint([&] { one.with(read(R"({"40003": {"tag": "queueDepth"}})", "b.json")); }),
            "b.json: line 1, column 2: the tag \"queueDepth\" is given otherwise at a.json: line 2, column 3");
}

TEST(Dictionary, AHigherOneIsRight)
{
  const Dictionary high = read(R"({"40001": {"tag": "depth"}, "40005": {"tag": "jobs_done"}})");
  const Dictionary both = high.over(read(kTwo)).over(read(R"({"40009": {"tag": "low"}})"));
  std::vector<std::string> tags;
  for (const OwnElement& element : both.elements())
  {
    tags.push_back(std::to_string(element.id) + " " + element.tag);
  }
  EXPECT_THAT(tags, ElementsAre("40001 depth", "40005 jobs_done", "40009 low"));
  EXPECT_EQ(Dictionary().over(high).elements().data(), high.elements().data());
}

TEST(Dictionary, ElementsAreNamedByIt)
{
  const Dictionary names = read(kTwo);
  EXPECT_EQ(elementText(40001, names), "queueDepth");
  EXPECT_EQ(elementText(40001), "#40001");
  EXPECT_EQ(elementText(60103, names), "hostName");
  EXPECT_EQ(xmlNameOf(40001, names), "queueDepth");
  EXPECT_THAT(idsOf("queueDepth", names), ElementsAre(40001));
  EXPECT_THAT(idsOf("#40001", names), ElementsAre(40001));
  EXPECT_THAT(idsOf("queueDepth"), IsEmpty());
  EXPECT_EQ(similarNames("queueDept", names), "queueDepth");
  EXPECT_EQ(complaint([&] { pathOf("/system/queueDept", names); }),
            "path '/system/queueDept': column 9: no element is called 'queueDept'; did you mean queueDepth?");
  EXPECT_EQ(complaint([&] { pathOf("/system/*Depth[queueDepth > 3]", names); }), "");
}

namespace
{

/// A system with one own element.
std::vector<std::byte> ownStream()
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    system.add(40001, uint32_t{7});
  }
  writer.finish();
  return {writer.bytes().begin(), writer.bytes().end()};
}

} // namespace

TEST(Dictionary, DocumentsFindByIt)
{
  const std::vector<std::byte> bytes = ownStream();
  const Document document(std::span<const std::byte>(bytes), {.dictionary = read(kTwo)});
  unsigned found = 0;
  for (const tav::Node& node : document.find("/system/queueDepth[. > 6 and not(@id)]"))
  {
    found += node.elm() == 40001 ? 1 : 0;
  }
  EXPECT_EQ(found, 1U);
  EXPECT_EQ(document.source().dictionary().tagOf(40001), "queueDepth");
  const Document without{std::span<const std::byte>(bytes)};
  EXPECT_THROW(without.find("/system/queueDepth"), Error);
}

TEST(Dictionary, PathsOfTheLayerTakeNames)
{
  const std::vector<std::byte> bytes = ownStream();
  const tav::Reader reader(std::span<const std::byte>(bytes), tav::StreamOptions{});
  const std::array own = {tav::dictionary::OwnName{40001, "queueDepth"}};
  EXPECT_EQ(reader.path(tav::Path("/system/queueDepth", own))->as<uint32_t>(), 7U);
  EXPECT_EQ(reader.path(tav::Path("/system/queue*[not(@id)]", own))->as<uint32_t>(), 7U);
  EXPECT_EQ(reader.path(tav::Path("/system/#40001[@id = 40001]"))->as<uint32_t>(), 7U);
  EXPECT_FALSE(reader.path(tav::Path("/system/#40001[@id = 40001]", own)).has_value());
  EXPECT_THROW(tav::Path("/system/queueDepth"), std::system_error);
  std::error_code ec;
  EXPECT_TRUE(tav::Path("/system/queueDept", own, ec).empty());
  EXPECT_TRUE(ec);
  tav::PathFault fault;
  EXPECT_TRUE(tav::Path("/system/queueDept", own, fault).empty());
  EXPECT_EQ(fault.nearest, "queueDepth");
}

TEST(Dictionary, WhatLiesBesideAFileIsFound)
{
  const std::filesystem::path folder = test::makeFolder("dictionary");
  const auto put = [&](const char* name, std::string_view text) {
    std::ofstream(folder / name, std::ios::binary) << text;
  };
  const std::string file = (folder / "day.tav").string();
  EXPECT_TRUE(Dictionary::beside(file).isEmpty());
  put("tav-names.json", R"({"40001": {"tag": "ofTheFolder"}})");
  EXPECT_EQ(Dictionary::beside(file).tagOf(40001), "ofTheFolder");
  put("day.tav.names.json", R"({"40001": {"tag": "ofTheFile"}})");
  EXPECT_EQ(Dictionary::beside(file).tagOf(40001), "ofTheFile");
  std::filesystem::create_directory(folder / "night.tav.names.json");
  EXPECT_EQ(Dictionary::beside((folder / "night.tav").string()).tagOf(40001), "ofTheFolder");
  EXPECT_THROW(Dictionary::open((folder / "none.json").string()), Error);
  std::filesystem::remove_all(folder);
}
