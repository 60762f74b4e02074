// What a source says when its storage fails, ends early or begins behind its end, and an output that cannot be written.
#include <algorithm>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/streams.h"
#include "support/vectorStorage.h"

using namespace tav::inspect;
using test::Bytes;

namespace
{

constexpr uint64_t kPage = ByteSource::kPage;

template<class Work>
Problem refusal(Work&& work)
{
  try
  {
    work();
  }
  catch (const Error& error)
  {
    return error.problem();
  }
  ADD_FAILURE() << "nothing was thrown";
  return {};
}

/// What every reader of a stream gives or refuses, by one word each.
std::string readings(ByteSource& source)
{
  std::string all;
  const auto tried = [&](auto&& work) {
    try
    {
      work();
      all += "done ";
    }
    catch (const Error& error)
    {
      all += error.problem().file + "=" + std::string(korCodeName(error.problem().code)) + " ";
    }
  };
  test::Kept kept;
  tried([&] { toJson(source, {}, kept); });
  tried([&] { toXml(source, {}, kept); });
  tried([&] { check(source, {}, {}); });
  tried([&] { Schema().add(source, {}); });
  tried([&] { recognise(source); });
  return all;
}

} // namespace

TEST(SourceFailures, OfAFileThatBecameShorterAreTold)
{
  auto storage = std::make_unique<test::VectorStorage>(64, Bytes(3 * kPage, 1));
  test::VectorStorage& file = *storage;
  ByteSource source("x.tav", std::move(storage), 2 * kPage);
  EXPECT_EQ(source.view(0).front(), 1U);
  file.bytes.resize(kPage + 10);
  const Problem problem = refusal([&] { source.view(kPage); });
  EXPECT_EQ(problem.file, "x.tav");
  EXPECT_EQ(problem.code, TAV_RC_END_OF_STORAGE);
  EXPECT_EQ(problem.hint, "the file became shorter while it was read");
}

TEST(SourceFailures, OfEveryCallOfTheStorageReachWhoeverReads)
{
  const Bytes bytes = test::namedStream(7);
  auto sound = ByteSource("x", std::make_unique<test::VectorStorage>(64, bytes), 2 * kPage);
  EXPECT_EQ(readings(sound), "done done done done done ");
  for (const uint64_t nth : std::vector<uint64_t>{1, 2})
  {
    auto storage = std::make_unique<test::VectorStorage>(64, bytes);
    test::VectorStorage& file = *storage;
    ByteSource source("x", std::move(storage), 2 * kPage);
    file.failAt(nth, KOR_RC_IO_ERROR);
    EXPECT_EQ(readings(source), "x=KOR_RC_IO_ERROR done done done done ") << "the next one reads it again";
  }
}

TEST(SourceFailures, AreTheStatusAndTheSizeOfItsStorageToo)
{
  class WithoutSize final : public test::VectorStorage
  {
  public:
    uint32_t getTotalSize(uint64_t*) override { return KOR_RC_IO_ERROR; }
  };
  EXPECT_EQ(refusal([] { ByteSource("x", std::make_unique<WithoutSize>()); }).code, KOR_RC_IO_ERROR);
}

TEST(SourceFailures, ThatBeginsBehindTheEndAreTold)
{
  for (const uint64_t from : std::vector<uint64_t>{100, 101, ~uint64_t{0}})
  {
    const Problem problem = refusal([from] {
      ByteSource("x", std::make_unique<test::VectorStorage>(64, Bytes(100)), kDefaultRing, from);
    });
    EXPECT_EQ(problem.sentence, "lies behind the end of the file");
    EXPECT_EQ(problem.offset, from);
    EXPECT_EQ(problem.remedy, Remedy::beginBefore);
  }
}

TEST(SourceFrom, CountsFromItsFirstByteAndSaysSoInItsName)
{
  Bytes bytes(kPage + 100);
  bytes[60] = 7;
  ByteSource source("x", std::make_unique<test::VectorStorage>(64, bytes), kDefaultRing, 50);
  EXPECT_EQ(source.name(), "x from 0x32");
  EXPECT_EQ(source.from(), 50U);
  EXPECT_EQ(source.size(), bytes.size() - 50);
  EXPECT_EQ(source.view(10).front(), 7U);
  // Its storage is that of a handle, and begins there, too.
  uint64_t size = 0;
  EXPECT_EQ(source.storage().getTotalSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, source.size());
  EXPECT_EQ(source.storage().seek(10, 0), TAV_RC_OK);
  uint64_t position = 0;
  EXPECT_EQ(source.storage().getPosition(&position), TAV_RC_OK);
  EXPECT_EQ(position, 10U);
  uint8_t byte = 0;
  void* to = &byte;
  uint64_t done = 0;
  EXPECT_EQ(source.storage().read(1, &to, 1, &done, false, true), TAV_RC_NOT_SUPPORTED) << "backwards";
  EXPECT_EQ(source.storage().read(1, &to, 1, &done, false, false), TAV_RC_OK);
  EXPECT_EQ(byte, 7U);
  EXPECT_EQ(source.storage().write(&byte, 1, &done), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(source.storage().getMemory(&to, &done), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(source.storage().lock(1), TAV_RC_NOT_SUPPORTED) << "as the one below it";
  EXPECT_EQ(source.storage().unlock(), TAV_RC_NOT_SUPPORTED);
}

TEST(SourceFrom, TellsOfPiecesWhileItIsReadStraightOn)
{
  ByteSource source("x", std::make_unique<test::VectorStorage>(64, Bytes(40 * kPage)), 16 * kPage);
  std::vector<uint64_t> told;
  source.tellOfPieces([&](uint64_t offset) { told.push_back(offset); });
  for (uint64_t page = 0; page < 40; ++page)
  {
    source.view(page * kPage);
  }
  ASSERT_FALSE(told.empty());
  EXPECT_TRUE(std::is_sorted(told.begin(), told.end()));
  const size_t before = told.size();
  source.view(5 * kPage);
  source.view(30 * kPage);
  EXPECT_EQ(told.size(), before) << "single looks";
}

TEST(SourceFrom, OfAStorageThatKnowsNoHolesHasNone)
{
  ByteSource source("x", std::make_unique<test::VectorStorage>(64, Bytes(100)));
  EXPECT_EQ(source.zerosUntil(10), 10U);
  EXPECT_EQ(source.zerosUntil(100), 100U);
  EXPECT_EQ(source.zerosBefore(100, 0), 100U);
  EXPECT_EQ(source.zerosBefore(0, 0), 0U);
  EXPECT_EQ(source.pastHole(10, Bytes(5)), 10U);
}

TEST(PatchFileFailures, SayThatTheOutputCannotBeWritten)
{
  const test::TemporaryPath path;
  {
    std::ofstream(path.path) << "abc";
  }
  const std::string text = tav::FilePath(path.path).text();
  KORHFile file;
  KORFileOpenParam open;
  open.pPath = text.c_str();
  open.options = KOR_FILE_READ;
  ASSERT_EQ(file.open(&open), TAV_RC_OK);
  PatchFile out(file);
  out.append(std::string_view("abc"));
  Bytes room(3);
  const Problem problem = refusal([&] { out.read(0, room); });
  EXPECT_THAT(problem.sentence, testing::StartsWith("the output cannot be written: "));
  EXPECT_NE(problem.code, TAV_RC_OK);
  file.close();
}
