// Several threads answer as one does: the same findings, paths and counts in the same order.
#include <algorithm>
#include <stdexcept>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

/// A few streams of all kinds in one file, some of them damaged.
Bytes mixture(uint64_t seed)
{
  Bytes bytes = test::namedStream(seed, seed % 2 == 1, seed % 3 == 1);
  for (uint64_t i = 0; i < seed % 3; ++i)
  {
    Bytes more = i % 2 == 0 ? test::bytesOfTree(test::randomTree(seed * 3 + i, {.depth = 6, .width = 9}))
                            : test::namedStream(seed * 5 + i, seed % 4 == 1);
    more.insert(more.begin(), seed % 5 == 0 ? 40 : 0, uint8_t{0});
    bytes.insert(bytes.end(), more.begin(), more.end());
  }
  for (uint64_t i = 0; i < seed / 3 % 4; ++i)
  {
    bytes = test::damaged(bytes, seed + i);
  }
  return bytes;
}

/// One group with many small children, texts that repeat and numbers among them, and a group now and then.
Bytes longGroup(unsigned count, bool pairs)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = pairs});
    for (unsigned i = 0; i < count; ++i)
    {
      root.add(TAV_ELM_CMN_HOST_NAME, std::string(1 + i * 7919U % 211U, 'a'), {.eyeSize = pairs});
      root.add(TAV_ELM_CMN_CPU_ONLINE, i * 2654435761U, {.eyeSize = pairs});
      if (i % 50 == 49)
      {
        tav::Group host = root.group(TAV_ELM_CMN_HOST, {.eyeSize = pairs});
        host.add(TAV_ELM_CMN_HOST_NAME, std::to_string(i / 2));
      }
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  return {first, first + writer.bytes().size()};
}

std::string checked(const Bytes& bytes, const tav::inspect::Form& form, bool notes, unsigned threads, uint64_t part)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  std::string text;
  const auto totals = check(source, form,
                            {.wanted = [&](RuleId rule) { return notes || !ruleOf(rule).note; },
                             .sink =
                                 [&](const Finding& found) {
                                   text += std::to_string(found.offset) + "+" + std::to_string(found.length) + " " +
                                           found.path + ": " + found.sentence + (found.otherStream ? "!" : "") +
                                           " [" + std::string(ruleOf(found.rule).id) + "]\n";
                                 },
                             .threads = threads,
                             .partBytes = part});
  return text + std::to_string(totals.nodes) + " " + std::to_string(totals.endElements);
}

std::string shaped(const Bytes& bytes, const tav::inspect::Form& form, uint64_t mostTexts, bool ends, unsigned threads,
                   uint64_t part)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  Schema schema({.mostTexts = mostTexts, .ends = ends});
  std::string text;
  const SchemaWork work{.passed = [&](const PassedOver& passed) { text += passed.path + " " + passed.sentence + "\n"; },
                        .threads = threads,
                        .partBytes = part};
  schema.add(source, form, work);
  schema.add(source, form, work);
  schema.each(PathStyle::whole, [&](const SchemaEntry& entry) {
    text += entry.path + " " + std::to_string(entry.count) + " " + entry.least.value_or("-") + " " +
            entry.greatest.value_or("-") + " " + std::to_string(entry.leastType) + " " +
            std::to_string(entry.distinct.value_or(0)) + (entry.more ? "+" : "");
    for (const uint16_t type : entry.types)
    {
      text += " " + std::to_string(type);
    }
    text += "\n";
  });
  return text;
}

TableQuery asked(std::string_view each, const std::vector<std::string>& paths, std::optional<std::string> joiner = {})
{
  std::vector<TableColumn> columns;
  for (const std::string& path : paths)
  {
    columns.push_back({path, path});
  }
  return {each, columns, std::move(joiner)};
}

/// Rows of roots, of groups, of data elements, inside of each other; columns of all kinds.
const std::vector<TableQuery>& tables()
{
  static const std::vector<TableQuery> all = {
      asked("//*", {".", "cpuOnline", "*"}),
      asked("//*", {".", "host/*", "*"}, "+"),
      asked("//host", {"hostName", "memTotal", "host/cpuOnline"}),
      asked("/*", {"*", "*/*", "host/host/*"}, ","),
      asked("/*", {"cpuOnline", "hostName", "host/memTotal", "host/hostName"}),
      asked("/*/*", {"cpuOnline", "../memTotal"}),
      asked("//host", {"hostName", ".//cpuOnline", "*[2]"}),
      asked("/*/*", {".//cpuOnline", "*//*"}),
      asked("//host[cpuOnline]", {"memTotal", ".//hostName"}),
      asked("/*[2]", {"cpuOnline"}),
      asked("/system/host", {"hostName"}),
      asked("/system", {"#60101"}),
  };
  return all;
}

std::string tabled(const Bytes& bytes, const tav::inspect::Form& form, const TableQuery& query, OnDamage onDamage,
                   unsigned threads, uint64_t part)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  std::string text;
  std::string told;
  TableTypes types(query);
  const auto stopped = readTable(source, form, query,
                                 {.onDamage = onDamage,
                                  .passedOver =
                                      [&](const PassedOver& passed) {
                                        told += passed.path + " " + passed.sentence + "\n";
                                      },
                                  .threads = threads,
                                  .partBytes = part,
                                  .batchRows = 7},
                                 [&](const Table& rows) {
                                   types.see(rows);
                                   for (uint64_t row = 0; row < rows.rows(); ++row)
                                   {
                                     for (size_t column = 0; column < rows.columns().size(); ++column)
                                     {
                                       const Cell cell = rows.cell(column, row);
                                       text += std::to_string(static_cast<int>(cell.kind)) + cellText(cell) + "|";
                                     }
                                     text += "\n";
                                   }
                                 });
  for (size_t column = 0; column < query.columns().size(); ++column)
  {
    text += std::to_string(static_cast<int>(types.type(column))) + (types.exceedsSigned(column) ? "+" : "") + " ";
  }
  return text + told + (stopped ? problemLine(*stopped) : "");
}

/// All that paths lead to, with path and value, and what was passed over.
std::string found(const Bytes& bytes, const tav::inspect::Form& form, const std::vector<std::string>& texts, bool all,
                  unsigned threads, uint64_t part)
{
  ByteSource source("x", std::span<const uint8_t>(bytes));
  std::vector<tav::Path> paths;
  for (const std::string& text : texts)
  {
    paths.push_back(pathOf(text));
  }
  std::string text;
  const std::vector<uint64_t> counts = findPaths(
      source, form, paths,
      {.found =
           [&](const PathMatch& match) {
             text += std::to_string(match.path) + " " + match.text(PathStyle::whole) + " " +
                     std::to_string(match.node.offset()) + "+" + std::to_string(match.node.limit) + " " +
                     std::to_string(match.node.depth) + " " + std::to_string(match.node.ordinal) + " " +
                     plainText(match.source, match.form, match.node, 40).value_or("-") + "\n";
           },
       .passed = [&](const PassedOver& passed) { text += passed.path + " " + passed.sentence + "\n"; },
       .all = all,
       .threads = threads,
       .partBytes = part});
  for (const uint64_t count : counts)
  {
    text += std::to_string(count) + " ";
  }
  return text;
}

/// Names and levels alone, conditions, places of all kinds, parents; one and several.
const std::vector<std::vector<std::string>>& sought()
{
  static const std::vector<std::vector<std::string>> all = {
      {"//*"},
      {"/"},
      {"//hostName"},
      {"/system/host"},
      {"/system/host/host/cpuOnline", "//memTotal"},
      {"//host[cpuOnline]/hostName"},
      {"/system/host[hostName='a' or memTotal > 5]"},
      {"/*/*[last()]", "/*/host"},
      {"/system[2]//*", "//host[2]"},
      {"//cpuOnline/..", "//memTotal[../hostName]"},
      {"/*[@size > 100]", "/system/#60101"},
      {"/hostName/* | //*//cpuOnline[1]", "//host/*"},
  };
  return all;
}

void expectSameFound(const Bytes& bytes, const tav::inspect::Form& form, const std::vector<uint64_t>& parts)
{
  for (size_t i = 0; i < sought().size(); ++i)
  {
    for (const bool all : {true, false})
    {
      SCOPED_TRACE("paths " + std::to_string(i) + (all ? " all" : " first"));
      const std::string one = found(bytes, form, sought()[i], all, 1, 0);
      for (size_t at = 0; at < parts.size(); ++at)
      {
        const auto threads = static_cast<unsigned>(2 + (i + at) % 7); // over all paths and parts, each number of them
        ASSERT_EQ(found(bytes, form, sought()[i], all, threads, parts[at]), one) << parts[at];
      }
    }
  }
}

/// Damaged in none, one or more places, by a seed.
Bytes damagedOften(Bytes bytes, uint64_t seed)
{
  for (uint64_t i = 0; i < seed / 2; ++i)
  {
    bytes = test::damaged(bytes, seed * 7 + i);
  }
  return bytes;
}

void expectSameTables(const Bytes& bytes, const tav::inspect::Form& form, const std::vector<uint64_t>& parts)
{
  for (size_t i = 0; i < tables().size(); ++i)
  {
    for (const OnDamage onDamage : {OnDamage::stop, OnDamage::skip})
    {
      SCOPED_TRACE("table " + std::to_string(i) + (onDamage == OnDamage::skip ? " skip" : " stop"));
      const std::string one = tabled(bytes, form, tables()[i], onDamage, 1, 0);
      for (const uint64_t part : parts)
      {
        ASSERT_EQ(tabled(bytes, form, tables()[i], onDamage, static_cast<unsigned>(2 + part % 7), part), one) << part;
      }
    }
  }
}

} // namespace

TEST(Parallel, MakesTablesOfRandomTreesAsOneThreadDoes)
{
  for (uint64_t seed = 0; seed < test::casesOf(40).count; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = mixture(seed);
    const tav::inspect::Form form{.swapped = seed % 2 == 1, .aligned = seed % 3 == 1};
    expectSameTables(bytes, form, {30, 300, bytes.size() / 64 + 1, bytes.size() / 2 + 1});
  }
}

TEST(Parallel, MakesTablesOfRootsAsOneThreadDoes)
{
  for (uint64_t seed = 0; seed < test::casesOf(6).count; ++seed)
  {
    SCOPED_TRACE(seed);
    Bytes bytes;
    for (uint64_t i = 0; i < 30; ++i)
    {
      const Bytes more = test::namedStream(seed * 31 + i);
      bytes.insert(bytes.end(), more.begin(), more.end());
    }
    bytes = damagedOften(bytes, seed);
    expectSameTables(bytes, {}, {100, 1000, bytes.size() / 3});
  }
}

TEST(Parallel, MakesTablesOfLongGroupsAsOneThreadDoes)
{
  for (uint64_t seed = 0; seed < test::casesOf(8).count; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = damagedOften(longGroup(300, seed % 2 == 1), seed);
    expectSameTables(bytes, {}, {500, 9000});
  }
}

TEST(Parallel, FindsInRandomTreesWhatOneThreadFinds)
{
  for (uint64_t seed = 0; seed < test::casesOf(40).count; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = mixture(seed);
    const tav::inspect::Form form{.swapped = seed % 2 == 1, .aligned = seed % 3 == 1};
    expectSameFound(bytes, form, {31, 300, 1 + seed % 200, bytes.size() / 64 + 1, bytes.size() / 2 + 1});
  }
}

TEST(Parallel, FindsInRootsAndLongGroupsWhatOneThreadFinds)
{
  for (uint64_t seed = 0; seed < test::casesOf(8).count; ++seed)
  {
    SCOPED_TRACE(seed);
    Bytes bytes;
    for (uint64_t i = 0; i < 30; ++i)
    {
      const Bytes more = test::namedStream(seed * 31 + i);
      bytes.insert(bytes.end(), more.begin(), more.end());
    }
    expectSameFound(damagedOften(bytes, seed), {}, {100, 1001, bytes.size() / 3});
    expectSameFound(damagedOften(longGroup(300, seed % 2 == 1), seed), {}, {500, 9001, 9002});
  }
}

TEST(Parallel, FindsPlacesAmongMoreSiblingsThanAreCounted)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (unsigned i = 0; i < 4000; ++i)
    {
      root.add(static_cast<uint16_t>(100 + (i < 1000 ? i % 100 : i * 7 % 300)), uint32_t{i});
      root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{i});
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  const Bytes bytes(first, first + writer.bytes().size());
  const std::string one = found(bytes, {}, {"//*"}, true, 1, 0);
  EXPECT_EQ(found(bytes, {}, {"//*"}, true, 3, 1000), one);
  EXPECT_EQ(found(bytes, {}, {"//*"}, true, 3, 30'000), one);
}

TEST(Parallel, NamesOwnElementsByTheSourcesDictionary)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (uint32_t i = 0; i < 300; ++i)
    {
      root.group(40001).add(40002, i);
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  ByteSource source("x", std::span<const uint8_t>(first, writer.bytes().size()));
  MemoryText names("n.json", R"({"40001": {"tag": "queue"}, "40002": {"tag": "queueDepth"}})");
  source.setDictionary(Dictionary::read(names));
  const std::vector<tav::Path> paths{pathOf("//queueDepth", source.dictionary())};
  std::vector<std::string> last;
  for (const unsigned threads : {1U, 3U})
  {
    const PathWork work{.found = [&](const PathMatch& match) { last.push_back(match.text(PathStyle::whole)); },
                        .threads = threads,
                        .partBytes = 1000};
    last.clear();
    EXPECT_THAT(findPaths(source, {}, paths, work), testing::ElementsAre(300U));
    EXPECT_EQ(last.front(), "/system/queue/queueDepth");
    EXPECT_EQ(last.back(), "/system/queue[300]/queueDepth");
  }
  // Once more by the file's own walk: what goes on behind a place that is forged names elements, too.
  std::vector<std::string> told;
  Bytes bytes(first, first + writer.bytes().size());
  std::fill_n(bytes.begin() + 5000, 20, uint8_t{0xEE});
  for (const unsigned threads : {1U, 3U})
  {
    ByteSource broken("x", std::span<const uint8_t>(bytes));
    broken.setDictionary(source.dictionary());
    std::string text;
    check(
        broken, {},
        {.sink = [&](const Finding& finding) { text += finding.path + "\n"; }, .threads = threads, .partBytes = 1000});
    told.push_back(text);
  }
  EXPECT_THAT(told.front(), testing::HasSubstr("queue"));
  EXPECT_EQ(told.back(), told.front());
}

TEST(Parallel, MakesNoRowsOfWhatIsForgedInAPayload)
{
  // A payload, longer than several parts, that holds what its siblings look like, eye catchers and rows included.
  const Bytes inner = longGroup(300, true);
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    for (unsigned i = 0; i < 400; ++i)
    {
      if (i == 200)
      {
        root.add(TAV_ELM_CMN_HOST_NAME, std::as_bytes(std::span(inner).subspan(16)));
      }
      tav::Group host = root.group(TAV_ELM_CMN_HOST, {.eyeSize = true});
      host.add(TAV_ELM_CMN_HOST_NAME, "ada", {.eyeSize = true});
      host.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{i}, {.eyeSize = true});
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  const Bytes bytes(first, first + writer.bytes().size());
  expectSameTables(bytes, {}, {2000, 9000});
  expectSameFound(bytes, {}, {2000, 9001});
  const std::string hosts = tabled(bytes, {}, asked("//host", {"cpuOnline"}), OnDamage::stop, 3, 2000);
  EXPECT_EQ(std::count(hosts.begin(), hosts.end(), '\n'), 400);
}

TEST(Parallel, ChecksAsOneThreadDoes)
{
  for (uint64_t seed = 0; seed < test::casesOf(60).count; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = mixture(seed);
    const tav::inspect::Form form{.swapped = seed % 2 == 1, .aligned = seed % 3 == 1};
    for (const bool notes : {false, true})
    {
      const std::string one = checked(bytes, form, notes, 1, 0);
      for (const uint64_t part : {30U, 300U})
      {
        EXPECT_EQ(checked(bytes, form, notes, 2, part), one);
        EXPECT_EQ(checked(bytes, form, notes, 5, part), one);
      }
    }
  }
}

TEST(Parallel, ChecksLongGroupsAsOneThreadDoes)
{
  for (uint64_t seed = 0; seed < test::casesOf(12).count; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = damagedOften(longGroup(700, seed % 2 == 1), seed);
    const std::string one = checked(bytes, {}, seed % 3 == 0, 1, 0);
    for (const uint64_t part : {500U, 9000U})
    {
      EXPECT_EQ(checked(bytes, {}, seed % 3 == 0, 2, part), one);
      EXPECT_EQ(checked(bytes, {}, seed % 3 == 0, 3, part), one);
    }
  }
}

TEST(Parallel, FindsTheSamePlacesAmongMoreSiblingsThanAreCounted)
{
  tav::Writer writer;
  {
    tav::Group root = writer.group(TAV_ELM_CMN_SYSTEM);
    for (unsigned i = 0; i < 4000; ++i)
    {
      root.add(static_cast<uint16_t>(100 + i * 7 % 300), uint32_t{i}); // ids that nobody knows: a finding each
      root.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{i});
    }
  }
  writer.finish();
  const auto* const first = reinterpret_cast<const uint8_t*>(writer.bytes().data());
  const Bytes bytes(first, first + writer.bytes().size());
  const std::string one = checked(bytes, {}, true, 1, 0);
  EXPECT_EQ(checked(bytes, {}, true, 3, 1000), one);
  EXPECT_EQ(checked(bytes, {}, true, 3, 30'000), one);
}

TEST(Parallel, CollectsTheShapeAsOneThreadDoes)
{
  for (uint64_t seed = 0; seed < test::casesOf(60).count; ++seed)
  {
    SCOPED_TRACE(seed);
    const Bytes bytes = mixture(seed);
    const tav::inspect::Form form{.swapped = seed % 2 == 1, .aligned = seed % 3 == 1};
    const uint64_t texts = seed % 4 == 0 ? 10'000 : seed % 4;
    const std::string one = shaped(bytes, form, texts, seed % 5 == 0, 1, 0);
    for (const uint64_t part : {30U, 300U})
    {
      EXPECT_EQ(shaped(bytes, form, texts, seed % 5 == 0, 3, part), one);
    }
  }
}

TEST(Parallel, CountsTextsAsOneThreadDoes)
{
  const Bytes bytes = longGroup(900, false);
  for (const uint64_t texts : {0U, 1U, 2U, 10U, 50U, 150U, 180U, 200U, 210U, 211U, 212U, 1000U})
  {
    SCOPED_TRACE(texts);
    const std::string one = shaped(bytes, {}, texts, false, 1, 0);
    for (const uint64_t part : {1000U, 20'000U})
    {
      EXPECT_EQ(shaped(bytes, {}, texts, false, 2, part), one);
    }
  }
}

TEST(Parallel, TakesAsMuchOfAFileAsOneThreadDoesAndCountsIt)
{
  const Bytes bytes = longGroup(20'000, true);
  auto storage = std::make_unique<TAVSSMemory>(const_cast<uint8_t*>(bytes.data()), bytes.size());
  ByteSource source("x", std::move(storage));
  const auto totals = check(source, {}, {.threads = 2, .partBytes = 100'000});
  EXPECT_EQ(totals.nodes, 1U + 40'000 + 2 * 400);
  EXPECT_GE(source.bytesRead(), bytes.size());
  EXPECT_LT(source.bytesRead(), bytes.size() * 3);
}

TEST(Parallel, EndsWithWhatTheCallbackThrows)
{
  Bytes bytes = longGroup(3000, false);
  std::fill_n(bytes.begin() + static_cast<ptrdiff_t>(bytes.size() / 2), 600, uint8_t{0xEE});
  ByteSource source("x", std::span<const uint8_t>(bytes));
  const auto sink = [](const Finding&) { throw std::runtime_error("enough"); };
  EXPECT_THROW(check(source, {}, {.sink = sink, .threads = 3, .partBytes = 2000}), std::runtime_error);
  const auto progress = [](uint64_t) { throw std::runtime_error("enough"); };
  EXPECT_THROW(check(source, {}, {.progress = progress, .threads = 3, .partBytes = 2000}), std::runtime_error);
}

TEST(Parallel, RecoversAsOneThreadDoes)
{
  for (uint64_t seed = 0; seed < 4; ++seed)
  {
    Bytes bytes;
    for (unsigned i = 0; i < 4; ++i)
    {
      const Bytes more = longGroup(5000, seed % 2 == 0);
      bytes.insert(bytes.end(), more.begin(), more.end());
      std::fill_n(bytes.end() - 300'000, 20 * seed, uint8_t{0xEE});
    }
    ASSERT_GT(bytes.size(), size_t{2} << 20U);
    std::vector<Bytes> made;
    std::vector<uint64_t> lost;
    for (const unsigned threads : {1U, 3U})
    {
      ByteSource source("x", std::span<const uint8_t>(bytes));
      test::Made out;
      lost.push_back(recover(source, {}, out.file(), {.threads = threads}).lost);
      made.push_back(out.bytes());
    }
    EXPECT_EQ(made[0], made[1]);
    EXPECT_EQ(lost[0], lost[1]);
  }
}
