#include <cstdint>
#include <optional>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "cpp/layer.h"
#include "tav/path/names.hpp"

using namespace test;

namespace
{

/// system { host { hostName "a" }, host { os { osName "b" }, hostName "c", hostName "d" }, 60105 "e" }
Bytes sample()
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_HOST_NAME, "a");
    }
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      {
        tav::Group os = host.group(TAV_ELM_CMN_OS);
        os.add(TAV_ELM_CMN_OS_NAME, "b");
      }
      host.add(TAV_ELM_CMN_HOST_NAME, "c");
      host.add(TAV_ELM_CMN_HOST_NAME, "d");
    }
    system.add(60105, "e");
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

class LayerPath : public ::testing::Test
{
protected:
  const Bytes stream = sample();
  const tav::Reader reader{spanOf(stream)};

  [[nodiscard]] std::string first(std::string_view path) const
  {
    const auto node = reader.path(path);
    return !node ? "nothing" : node->isGroup() ? "group"
                                               : node->as<std::string>();
  }
  [[nodiscard]] std::string all(std::string_view path) const
  {
    std::string texts;
    for (const tav::Node& node : reader.all(path))
    {
      texts += node.isGroup() ? "group" : node.as<std::string>();
    }
    return texts;
  }

  /// Paths, each with what it leads to.
  using Rows = std::vector<std::pair<const char*, const char*>>;

  void expectFirst(const Rows& rows) const
  {
    for (const auto& [path, text] : rows)
    {
      EXPECT_EQ(first(path), text) << path;
    }
  }
  void expectAll(const Rows& rows) const
  {
    for (const auto& [path, texts] : rows)
    {
      EXPECT_EQ(all(path), texts) << path;
    }
  }
};

} // namespace

TEST_F(LayerPath, TagsEnumNamesConstantsAndIdsAllName)
{
  expectFirst({{"system/host/hostName", "a"},
               {"TAV_ELM_CMN_SYSTEM/TAV_ELM_CMN_HOST/TAV_ELM_CMN_HOST_NAME", "a"},
               {"system/60105", "e"},
               {"system/#60105", "e"}});
}

TEST_F(LayerPath, SlashMayLead)
{
  EXPECT_EQ(first("/system/host/hostName"), "a");
}

TEST_F(LayerPath, RootAloneIsAPath)
{
  EXPECT_EQ(reader.path("/system")->offset(), 0U);
  EXPECT_EQ(first("/host"), "nothing");
}

TEST_F(LayerPath, SearchGoesBackToTheNextMatchOfTheLevelAbove)
{
  EXPECT_EQ(first("system/host/os/osName"), "b");
}

TEST_F(LayerPath, StarIsAnyNode)
{
  EXPECT_EQ(first("system/*/*"), "a");
  EXPECT_EQ(all("system/*/*"), "agroupcd");
  EXPECT_EQ(first("*/60105"), "e");
}

TEST_F(LayerPath, NumberInBracketsCountsTheMatchesAmongSiblings)
{
  expectFirst({{"system/host[2]/hostName", "c"},
               {"system/host[2]/hostName[2]", "d"},
               {"system/*[3]", "e"},
               {"system/host[3]", "nothing"},
               {"system[1]/host", "group"},
               {"system[2]/host", "nothing"}});
}

TEST_F(LayerPath, AllMatchesComeInStreamOrder)
{
  expectAll({{"system/host/hostName", "acd"},
             {"system/host[2]/hostName", "cd"},
             {"system/host/hostName[1]", "ac"},
             {"system/host/cpuOnline", ""}});
}

TEST_F(LayerPath, PathBelowANodeBeginsWithItsChildren)
{
  const tav::Node root = reader.root();
  EXPECT_EQ(root.path("host/hostName")->as<std::string>(), "a");
  EXPECT_FALSE(root.path("system/host"));
  EXPECT_EQ(root.all("host").size(), 2U);
}

TEST_F(LayerPath, PathWithALeadingSlashBeginsAtTheRootFromAnyNode)
{
  const tav::Node host = *reader.path("/system/host[2]");
  EXPECT_EQ(host.path("/system/host/hostName")->as<std::string>(), "a");
  EXPECT_FALSE(host.path("/hostName"));
}

TEST_F(LayerPath, FindsOneAfterTheOther)
{
  std::string names;
  for (const tav::Node& name : reader.find("//hostName"))
  {
    names += name.as<std::string>();
  }
  EXPECT_EQ(names, "acd");
  EXPECT_EQ(givenBy([&](std::error_code& ec) {
              for (const tav::Node& node : reader.root().find("host[", ec))
              {
                ADD_FAILURE() << node.offset();
              }
            }),
            TAV_RC_BAD_PARAM);
}

TEST_F(LayerPath, IsReadOnceAndUsedOften)
{
  const tav::Path path("host/hostName");
  const tav::Node root = reader.root();
  EXPECT_EQ(root.path(path)->as<std::string>(), "a");
  EXPECT_EQ(root.all(path).size(), 3U);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { EXPECT_TRUE(root.path(path, ec)); }), TAV_RC_OK);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { EXPECT_EQ(root.all(path, ec).size(), 3U); }), TAV_RC_OK);
}

TEST_F(LayerPath, WhatIsNoPathIsRefused)
{
  for (const char* const text :
       {"", "//", "///host", "host///hostName", "host/", "noSuchElement", "host[0]", "host[", "host[x]", "host]", "[1]",
        "host[1x]", "65536", "#", "host[99999999999999999999]", "invalid_element"})
  {
    EXPECT_EQ(thrownBy([&] { const tav::Path path(text); }), TAV_RC_BAD_PARAM) << text;
    EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.path(text)); }), TAV_RC_BAD_PARAM) << text;
    EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.all(text)); }), TAV_RC_BAD_PARAM) << text;
    EXPECT_EQ(thrownBy([&] { static_cast<void>(reader.root().path(text)); }), TAV_RC_BAD_PARAM) << text;
    EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(reader.root().all(text, ec)); }), TAV_RC_BAD_PARAM)
        << text;
  }
}

TEST_F(LayerPath, DamageOnTheWayIsReportedButNotWhatLiesBehindTheMatch)
{
  Bytes damaged = stream;
  const uint64_t second = reader.path("system/host[2]")->offset();
  damaged[second + 7] = 0x7F; // its size leads far past the stream
  const tav::Reader other(spanOf(damaged));
  EXPECT_EQ(other.path("system/host/hostName")->as<std::string>(), "a");
  EXPECT_EQ(thrownBy([&] { static_cast<void>(other.path("system/60105")); }), TAV_RC_OUTSIDE_PARENT);
  EXPECT_EQ(givenBy([&](std::error_code& ec) { static_cast<void>(other.all("system/60105", ec)); }),
            TAV_RC_OUTSIDE_PARENT);
}

TEST_F(LayerPath, MatchKnowsItsGroup)
{
  const auto os = reader.root().path("host[2]/os");
  ASSERT_TRUE(os);
  EXPECT_EQ(os->next()->as<std::string>(), "c");
  const auto name = reader.root().path("host/hostName");
  ASSERT_TRUE(name);
  EXPECT_FALSE(name->next()) << "the last of its group";
}

TEST_F(LayerPath, ElementThatEndsAGroupIsFoundByItsNameAlone)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    root.add(TAV_ELM_CMN_HOST_NAME, "a");
  }
  writer.finish();
  const tav::Reader other(writer.bytes());
  EXPECT_TRUE(other.root().path("hostName"));
  EXPECT_EQ(other.root().path("65001")->elm(), 65001);
  EXPECT_TRUE(other.root().path("endHdrEyeSize[1]"));
  EXPECT_FALSE(other.root().path("65000"));
  EXPECT_EQ(other.all("//*").size(), 2U);
}

TEST_F(LayerPath, MatchIsTheSameAfterTheHandleWasGivenAway)
{
  const uint64_t before = reader.root().path("host/os/osName")->offset();
  ASSERT_NE(reader.handle(), nullptr);
  EXPECT_EQ(reader.root().path("host/os/osName")->offset(), before);
  EXPECT_EQ(first("system/host/hostName"), "a");
}

namespace
{

/// What a text leads to when it is compiled first, as a code or an offset.
template<class From, class Path>
std::pair<uint32_t, uint64_t> reached(const From& from, const Path& path)
{
  std::error_code ec = std::make_error_code(std::errc::interrupted);
  const std::optional<tav::Node> node = from.path(path, ec);
  return {tav::codeOf(ec), node ? node->offset() : ~uint64_t{0}};
}

template<class From>
std::pair<uint32_t, uint64_t> reachedCompiled(const From& from, const std::string& text)
{
  std::error_code ec;
  const tav::Path path(text, ec);
  return ec ? std::pair(tav::codeOf(ec), ~uint64_t{0}) : reached(from, path);
}

/// Texts that are read without being compiled, and such that look like them.
std::vector<std::string> plainTexts()
{
  const std::string seven = "60101/60102/60103/60104/60105/60106/60107/";
  return {"host", "host/hostName", "#60102/#60103", "60102/60103", "host/60103", "host/os/osName", "60105",
          "060102", "host/hostName[1]", " host/hostName", "host/ hostName", "host//hostName", "/host", "host/",
          "", "/", "#", "#host", "60102x", "65536", "99999999",
          "65000", "65001", "endHdrEyeSize", "*", "**/hostName", "host/.", "host/..",
          "hst", "host-name", "TAV_ELM_CMN_HOST/hostName", "TAV_ELM_CMN_HOST ", "invalid_element", "INVALID_ELEMENT",
          "db_conn_time", "host|system", "system/host", "/system/host/hostName", "system", "system/60105", "//system",
          seven + seven + "1", seven + seven + "1/2", seven + seven + "1/2/3"};
}

} // namespace

TEST_F(LayerPath, TextLeadsWhereThePathThatIsMadeOfItLeads)
{
  const tav::Node root = reader.root();
  for (const std::string& text : plainTexts())
  {
    EXPECT_EQ(reached(root, text), reachedCompiled(root, text)) << text;
    EXPECT_EQ(reached(reader, text), reachedCompiled(reader, text)) << text;
  }
}

TEST_F(LayerPath, EveryTagIsFoundByItsText)
{
  for (const tav::dictionary::Entry& entry : tav::dictionary::entries())
  {
    if (!tav::detail::paths::isElementName(entry.name) || tav::layout::isEndElement(entry.id))
    {
      continue;
    }
    tav::Writer writer;
    {
      tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
      system.add(60105, "e");
      system.add(static_cast<uint16_t>(entry.id), uint32_t{1});
    }
    writer.finish();
    const tav::Reader one(writer.bytes());
    const tav::Node root = one.root();
    EXPECT_EQ(reached(root, entry.tag), reachedCompiled(root, std::string(entry.tag))) << entry.tag;
  }
}

TEST(LayerPathOf, ANodeThatNoWalkComesToBeginsAtIt)
{
  // A group with a name and a number, written within the bytes of an element.
  tav::Writer inner;
  {
    tav::Group host = inner.group(TAV_ELM_CMN_HOST);
    host.add(TAV_ELM_CMN_HOST_NAME, "a");
    host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{7});
  }
  inner.finish();
  tav::Writer writer;
  uint64_t place = 0;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    system.add(TAV_ELM_CMN_OS_NAME, "b");
    place = system.addRaw(TAV_TYPE_BINARY, TAV_ELM_CMN_HOST_NAME, inner.bytes()).offset() + 16;
  }
  writer.finish();
  const tav::Reader reader(writer.bytes());
  const tav::Node host = reader.at(place);
  const auto text = [&](const char* path) {
    const auto found = host.path(path);
    return !found                             ? "nothing"
           : found->isGroup()                 ? std::to_string(found->elm())
           : found->type() == TAV_TYPE_UINT32 ? std::to_string(found->as<uint32_t>())
                                              : found->as<std::string>();
  };
  EXPECT_EQ(host.elm(), TAV_ELM_CMN_HOST);
  EXPECT_EQ(text("hostName"), "a");
  EXPECT_EQ(text("cpuOnline[../hostName='a']"), "7");
  EXPECT_EQ(text(".."), "nothing");
  EXPECT_EQ(text("../osName"), "nothing");
  EXPECT_EQ(text("/system"), std::to_string(TAV_ELM_CMN_SYSTEM));
  EXPECT_EQ(text("/system/osName"), "b");
}

namespace
{

/// Paths with a condition for the third of three hosts, over a file of which a ring holds a page.
class LayerPathOverFailing : public testing::TestWithParam<const char*>
{
protected:
  LayerPathOverFailing()
  {
    tav::Writer writer;
    {
      tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
      for (const char* const name : {"b", "c", "d"})
      {
        tav::Group host = system.group(TAV_ELM_CMN_HOST);
        host.add(TAV_ELM_CMN_HOST_NAME, "a");
        host.add(60105, std::string(3000, 'x')); // on pages of its own
        host.add(TAV_ELM_CMN_HOST_NAME, name);
        tav::Group os = host.group(TAV_ELM_CMN_OS);
        os.add(60105, std::string(3000, 'x'));
        os.add(TAV_ELM_CMN_OS_NAME, name);
      }
    }
    writer.finish();
    storage_.bytes = bytesOf(writer.bytes());
    const tav::Reader reader(writer.bytes());
    third_ = reader.path("system/host[3]")->offset();
  }

  VectorStorage storage_{0x1000};
  uint64_t third_ = 0;
};

INSTANTIATE_TEST_SUITE_P(Conditions, LayerPathOverFailing,
                         testing::Values("hostName[last()] = 'd' or os/osName = 'e'",
                                         "(hostName | os/osName) = 'd'",
                                         "os/@id or hostName[3] or os/osName = 'd'"),
                         [](const auto& one) { return std::to_string(one.index); });

} // namespace

TEST_P(LayerPathOverFailing, GiveTheCodeOfTheCallThatFails)
{
  const std::string path = std::string("system/host[") + GetParam() + "]";
  constexpr std::pair<uint32_t, uint64_t> failure{KOR_RC_IO_ERROR, ~uint64_t{0}};
  uint64_t made = 1;
  uint64_t nth = 0;
  for (; nth <= made && !HasFailure(); ++nth)
  {
    const tav::Reader reader(storage_, {.ringBytes = 0x1000});
    const uint64_t before = storage_.calls();
    storage_.failAt(nth, KOR_RC_IO_ERROR); // 0: none fails
    const auto answer = reached(reader, path);
    made = nth == 0 ? storage_.calls() - before : made;
    EXPECT_EQ(answer, nth == 0 ? std::pair(uint32_t{TAV_RC_OK}, third_) : failure) << nth << " of " << made;
  }
  EXPECT_GT(nth, 10U);
}
