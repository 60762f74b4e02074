#include <array>
#include <filesystem>
#include <numeric>
#include <random>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "support/vectorStorage.h"
#include "tav/inspect.hpp"

using namespace tav::inspect;

namespace
{

std::vector<uint8_t> counting(size_t count)
{
  std::vector<uint8_t> bytes(count);
  for (size_t i = 0; i < count; ++i)
  {
    bytes[i] = static_cast<uint8_t>(i * 31 + i / 251);
  }
  return bytes;
}

std::vector<uint8_t> all(PatchFile& file)
{
  std::vector<uint8_t> bytes(static_cast<size_t>(file.length()));
  EXPECT_EQ(file.read(0, bytes), bytes.size());
  return bytes;
}

/// The sources that have the same bytes, over a file's pages and over memory.
std::unique_ptr<ByteSource> sourceOf(bool memory, const std::vector<uint8_t>& bytes, uint64_t ring)
{
  if (memory)
  {
    return std::make_unique<ByteSource>("bytes", std::span<const uint8_t>(bytes));
  }
  return std::make_unique<ByteSource>("bytes", std::make_unique<test::VectorStorage>(64, bytes), ring);
}

} // namespace

class Source : public testing::TestWithParam<bool>
{
};

INSTANTIATE_TEST_SUITE_P(Memory, Source, testing::Bool());

TEST_P(Source, HasTheSameBytesAtAnyOffsetInAnyOrder)
{
  const std::vector<uint8_t> bytes = counting(5 * ByteSource::kPage + 77);
  const auto source = sourceOf(GetParam(), bytes, 2 * ByteSource::kPage);
  ASSERT_EQ(source->size(), bytes.size());
  std::mt19937 random(7);
  std::vector<uint8_t> piece(3 * ByteSource::kPage);
  for (int i = 0; i < 200; ++i)
  {
    const size_t from = random() % (bytes.size() + 10);
    const size_t count = random() % piece.size();
    const size_t got = source->read(from, std::span(piece).first(count));
    ASSERT_EQ(got, from >= bytes.size() ? 0 : std::min(count, bytes.size() - from));
    ASSERT_TRUE(std::equal(piece.begin(), piece.begin() + static_cast<ptrdiff_t>(got),
                           bytes.begin() + static_cast<ptrdiff_t>(std::min(from, bytes.size()))));
  }
}

TEST_P(Source, ShowsNothingAtItsEnd)
{
  const std::vector<uint8_t> bytes = counting(10);
  const auto source = sourceOf(GetParam(), bytes, 0);
  EXPECT_EQ(source->view(9).size(), 1U);
  EXPECT_TRUE(source->view(10).empty());
  EXPECT_TRUE(source->view(~uint64_t{0}).empty());
}

TEST(SourceOverAStorage, KeepsNoMoreThanItsRing)
{
  const std::vector<uint8_t> bytes = counting(20 * ByteSource::kPage);
  const auto source = sourceOf(false, bytes, 2 * ByteSource::kPage);
  for (int round = 0; round < 2; ++round)
  {
    for (uint64_t page = 0; page < 20; page += 5)
    {
      EXPECT_EQ(source->view(page * ByteSource::kPage).front(), bytes[page * ByteSource::kPage]);
    }
  }
  EXPECT_EQ(source->readCalls(), 8U); // four pages far apart do not fit into two: each look reads anew
}

TEST(SourceOverAStorage, TellsTheCodeAndTheNameWhenAReadFails)
{
  auto storage = std::make_unique<test::VectorStorage>(64, counting(100));
  test::VectorStorage& failing = *storage;
  ByteSource source("x.tav", std::move(storage));
  failing.failAt(2, KOR_RC_IO_ERROR);
  std::array<uint8_t, 4> bytes{};
  try
  {
    source.read(0, bytes);
    FAIL() << "nothing was thrown";
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.problem().file, "x.tav");
    EXPECT_EQ(tav::codeOf(error.code()), KOR_RC_IO_ERROR);
    EXPECT_EQ(error.trouble(), Trouble::refused);
  }
}

TEST(SourceOverAFile, RefusesWhatIsMissingOrAFolder)
{
  const auto codeOfOpening = [](const std::string& path) {
    try
    {
      ByteSource::open(path);
    }
    catch (const Error& error)
    {
      return error.problem().code;
    }
    return TAV_RC_OK;
  };
  EXPECT_EQ(codeOfOpening("no such file"), KOR_RC_NO_SUCH_FILE);
  EXPECT_EQ(codeOfOpening("unit"), KOR_RC_IS_FOLDER);
}

TEST(PatchFile, HasWhatWasAppendedWithWhatReplacedIt)
{
  const auto scratch = makeScratch();
  PatchFile file(scratch->file());
  std::vector<uint8_t> expected;
  std::mt19937 random(3);
  for (int i = 0; i < 300; ++i)
  {
    // Some pieces are larger than what is kept in memory.
    const std::vector<uint8_t> piece = counting(random() % (i % 50 == 0 ? 600'000 : 9'000));
    file.append(std::span<const uint8_t>(piece));
    expected.insert(expected.end(), piece.begin(), piece.end());
    const size_t zeros = random() % 3 == 0 ? random() % 100'000 : 0;
    file.appendZeros(zeros);
    expected.insert(expected.end(), zeros, 0);
    const std::array<uint8_t, 16> patch{9, 8, 7, 6, 5, 4, 3, 2, 1};
    if (expected.size() > patch.size())
    {
      const size_t at = random() % (expected.size() - patch.size());
      file.patch(at, patch);
      std::copy(patch.begin(), patch.end(), expected.begin() + static_cast<ptrdiff_t>(at));
    }
  }
  EXPECT_EQ(file.length(), expected.size());
  EXPECT_TRUE(all(file) == expected);
}

TEST(PatchFile, CanBeReadInBetween)
{
  const auto scratch = makeScratch();
  PatchFile file(scratch->file());
  file.append(std::string_view("abc"));
  std::array<uint8_t, 8> bytes{};
  EXPECT_EQ(file.read(1, bytes), 2U);
  EXPECT_EQ(bytes[0], 'b');
  file.append(std::string_view("def"));
  EXPECT_EQ(file.read(0, bytes), 6U);
  EXPECT_EQ(bytes[5], 'f');
  EXPECT_EQ(file.read(6, bytes), 0U);
}

TEST(Scratch, IsANewFileEachTime)
{
  const auto first = makeScratch();
  const auto second = makeScratch();
  PatchFile one(first->file());
  one.append(std::string_view("first"));
  one.flush();
  PatchFile two(second->file());
  EXPECT_EQ(two.length(), 0U);
  two.append(std::string_view("second"));
  EXPECT_EQ(all(one), std::vector<uint8_t>({'f', 'i', 'r', 's', 't'}));
  EXPECT_EQ(all(two).size(), 6U);
}

TEST(Scratch, TakesTheNextNameWhenOneIsTaken)
{
  KORHFile first;
  KORHFile second;
  const std::string one = openTemporary(first, 20261122);
  const std::string two = openTemporary(second, 20261122);
  EXPECT_NE(one, two);
  first.close();
  second.close();
  EXPECT_TRUE(std::filesystem::remove(one));
  EXPECT_TRUE(std::filesystem::remove(two));
}

TEST(SourceOfAFile, HasToBeginInsideOfIt)
{
  const std::vector<uint8_t> bytes = counting(100);
  try
  {
    ByteSource("bytes", std::make_unique<test::VectorStorage>(64, bytes), kDefaultRing, 100);
    FAIL() << "there is nothing from there on";
  }
  catch (const Error& error)
  {
    EXPECT_EQ(error.problem().remedy, Remedy::beginBefore);
    EXPECT_EQ(error.problem().offset, 100U);
    EXPECT_EQ(error.problem().sentence, "lies behind the end of the file");
  }
}

TEST(FileKinds, AreToldByTheirFirstBytes)
{
  using namespace std::string_view_literals;
  struct Row
  {
    std::string_view bytes;
    std::string_view name;
    bool isEmpty;
  };
  for (const Row& row : {Row{"\x1F\x8B\x08rest"sv, "gzip", false}, Row{"PK\x03\x04rest"sv, "zip", false},
                         Row{"PK\x05\x06rest"sv, "zip", true}, Row{"\x28\xB5\x2F\xFDrest"sv, "zstd", false},
                         Row{"{\"system\": {}}"sv, "json", false}, Row{"[1]"sv, "json", false},
                         Row{"<tav/>"sv, "xml", false}, Row{"hello"sv, "text", false}, Row{"\x7F"
                                                                                           "ELF"sv,
                                                                                           "elf", false}})
  {
    SCOPED_TRACE(row.bytes);
    ByteSource source("x", std::span(reinterpret_cast<const uint8_t*>(row.bytes.data()), row.bytes.size()));
    const auto kind = fileKindOf(source);
    ASSERT_TRUE(kind);
    EXPECT_EQ(kind->name, row.name);
    EXPECT_EQ(kind->isEmpty, row.isEmpty);
    EXPECT_FALSE(kind->text.empty());
  }
  const std::vector<uint8_t> bytes = counting(100);
  ByteSource source("x", std::span<const uint8_t>(bytes));
  EXPECT_FALSE(fileKindOf(source));
}
