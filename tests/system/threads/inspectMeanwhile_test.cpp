/// Several threads look into one file: what they find is what one finds.
#include <algorithm>
#include <cstddef>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <system_error>
#include <vector>

#include <gtest/gtest.h>

#include "tav/inspect.hpp"
#include "tav/tav.hpp"

namespace
{

using namespace tav::inspect;

std::vector<std::byte> stream()
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true});
    for (uint32_t i = 0; i < 3000; ++i)
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST, {.eyeSize = i % 2 == 0});
      host.add(TAV_ELM_CMN_HOST_NAME, std::string(1 + i % 40, 'x'));
      host.add(TAV_ELM_CMN_CPU_ONLINE, i);
    }
  }
  writer.finish();
  std::vector<std::byte> bytes(writer.bytes().begin(), writer.bytes().end());
  std::fill_n(bytes.begin() + 100'000, 300, std::byte{0xEE});
  return bytes;
}

/// A source of which nobody knows that it is memory: all threads read one storage.
std::unique_ptr<ByteSource> sourceOf(std::vector<std::byte>& bytes)
{
  return std::make_unique<ByteSource>("x", std::make_unique<TAVSSMemory>(bytes.data(), bytes.size()), 64 * 1024);
}

/// The types of columns, and how many rows there are.
std::string typesOf(ByteSource& source, unsigned threads)
{
  const TableQuery query("//host", {{"name", "hostName"}, {"cpus", "cpuOnline"}, {"any", "*"}, {"none", "osName"}});
  TableTypes types(query);
  uint64_t rows = 0;
  const auto see = [&](const Table& some) {
    types.see(some);
    rows += some.rows();
  };
  readTable(source, {}, query, {.onDamage = OnDamage::skip, .threads = threads, .partBytes = 5000, .batchRows = 100},
            see);
  std::string text = std::to_string(rows);
  for (size_t i = 0; i < query.columns().size(); ++i)
  {
    text += " " + std::to_string(static_cast<int>(types.type(i)));
  }
  return text;
}

/// What an index has: of all nodes, and of those before the damage.
std::string indexed(const std::vector<std::byte>& bytes, unsigned threads)
{
  const tav::Reader reader(bytes);
  std::error_code ec;
  const tav::Index index = indexOf(reader.root(), {.threads = threads, .partBytes = 5000}, ec);
  const std::optional<tav::Node> last = index.find("host[700]/hostName");
  return std::to_string(index.size()) + " " + std::to_string(last ? last->offset() : 0) + " " + ec.message();
}

std::string found(std::vector<std::byte>& bytes, unsigned threads)
{
  const auto source = sourceOf(bytes);
  std::string text;
  const auto sink = [&](const Finding& finding) { text += finding.path + " " + finding.sentence + "\n"; };
  const CheckTotals totals = check(*source, {}, {.sink = sink, .threads = threads, .partBytes = 5000});
  Schema schema;
  schema.add(*source, {},
             {.passed = [&](const PassedOver& passed) { text += passed.path + passed.sentence; },
              .threads = threads,
              .partBytes = 5000});
  schema.each(PathStyle::whole, [&](const SchemaEntry& entry) {
    text += entry.path + " " + std::to_string(entry.count) + " " + entry.least.value_or("") + "\n";
  });
  const auto scratch = makeScratch();
  PatchFile out(scratch->file());
  text += std::to_string(recover(*source, {}, out, {.threads = threads}).kept);
  return text + " " + typesOf(*source, threads) + " " + std::to_string(totals.nodes) + " " + indexed(bytes, threads);
}

} // namespace

TEST(InspectMeanwhile, FindsWhatOneThreadFinds)
{
  std::vector<std::byte> bytes = stream();
  const std::string one = found(bytes, 1);
  EXPECT_EQ(typesOf(*sourceOf(bytes), 1).substr(0, 2), "29") << "nearly all rows";
  for (const unsigned threads : {2U, 3U, 8U})
  {
    EXPECT_EQ(found(bytes, threads), one);
  }
}
