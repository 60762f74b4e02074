// Collecting what is long, and what the form that is asked for has no room for.
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

std::string rootWith(const std::string& children, const std::string& before = {})
{
  return R"([{"element": "system", )" + before + R"("children": [)" + children + "]}]";
}

/// The stream that is collected of a document, or the sentence with which that is refused.
struct Collected
{
  Bytes bytes{};
  std::string refused{};
  uint64_t events = 0;
};

Collected collected(const Bytes& bytes, const FormChoice& form, const char* path = nullptr, bool ownWidths = false)
{
  Collected result;
  ByteSource source("x", std::span<const uint8_t>(bytes));
  test::Made made;
  Collector collector(made.file(), {.form = form, .ownWidths = ownWidths});
  const auto seen = [&](const Walker&, const Event&) { ++result.events; };
  try
  {
    path != nullptr ? collector.addFound(source, {}, Path(path), seen) : collector.add(source, {}, seen);
    collector.finish();
    result.bytes = made.bytes();
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.problem().file, "x");
    result.refused = error.problem().sentence;
  }
  return result;
}

bool differ(const Bytes& a, const Bytes& b, const Form& formB)
{
  ByteSource first("a", std::span<const uint8_t>(a));
  ByteSource second("b", std::span<const uint8_t>(b));
  return diff({first, {}}, {second, formB}, {}, [](const Difference&) {});
}

} // namespace

TEST(CollectLong, ValuesOfSeveralPiecesAreTheSameInEveryForm)
{
  // More than the 64 KiB that are copied at a time, and no multiple of it.
  std::string numbers;
  for (uint64_t i = 0; i < 20'001; ++i)
  {
    numbers += (i == 0 ? "" : ",") + std::to_string(i * 1'000'003);
  }
  const Bytes bytes = test::bytesOfJson(
      rootWith(R"({"id": 1, "type": "Uint64 array", "value": [)" + numbers + R"(]}, {"id": 2, "value": ")" +
               std::string(150'001, 'a') + "\"}"));
  for (const bool swapped : {false, true})
  {
    for (const bool root64 : {false, true})
    {
      const Form form{.swapped = swapped, .root64 = root64, .aligned = !root64};
      for (const char* const path : std::vector<const char*>{nullptr, "/system"})
      {
        const Collected made =
            collected(bytes, {.swapped = swapped, .root64 = root64, .aligned = !root64}, path);
        EXPECT_EQ(made.refused, "");
        EXPECT_GT(made.events, 4U);
        EXPECT_FALSE(differ(bytes, made.bytes, form)) << swapped << root64;
        EXPECT_EQ(test::defects(made.bytes, form), 0U);
      }
    }
  }
}

TEST(CollectLong, InfoBitsHaveNoRoomInNarrowHeaders)
{
  const Bytes ofData = test::bytesOfJson(rootWith(R"({"id": 1, "info": 4660, "value": 7})"));
  const Bytes ofGroup = test::bytesOfJson(rootWith(R"({"id": 1, "value": 7})", R"("info": 4660, )"));
  for (const Bytes& bytes : {ofData, ofGroup})
  {
    EXPECT_EQ(collected(bytes, {.root64 = false}).refused,
              "a 32-bit header has no room for the info bits 0x1234");
    const Collected wide = collected(bytes, {.swapped = true});
    EXPECT_EQ(wide.refused, "");
    EXPECT_FALSE(differ(bytes, wide.bytes, {.swapped = true}));
    EXPECT_EQ(collected(bytes, {.root64 = false}, nullptr, true).refused, "") << "each keeps its own width";
  }
}

TEST(CollectLong, OwnWidthsAreKeptOfEachRoot)
{
  const Bytes wide = test::bytesOfJson(rootWith(R"({"id": 1, "value": 7})"));
  const Bytes narrow =
      test::bytesOfJson(R"({"form": {"root": 32}, "nodes": )" + rootWith(R"({"id": 1, "value": 7})") + "}");
  Bytes both = wide;
  both.insert(both.end(), narrow.begin(), narrow.end());
  EXPECT_EQ(collected(both, {}, nullptr, true).bytes, both);
  const Collected all = collected(both, {.root64 = true});
  EXPECT_EQ(all.bytes.size(), 2 * wide.size());
}
