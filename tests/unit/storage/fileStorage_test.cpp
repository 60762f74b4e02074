/// The file storage over real files: opening, the cursor, reading.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "storage/fileFixture.h"
#include "support/failingNew.h"
#include "support/rows.h"

namespace
{

using namespace test;
using testing::ElementsAre;
using testing::IsEmpty;

// --- construction ---

struct ModeRow : Row
{
  uint64_t options;
  uint64_t attributes;
};

class FileMode : public FileStorage, public testing::WithParamInterface<ModeRow>
{};

TEST_P(FileMode, GivesTheAttributes)
{
  OpenFile file(fileOf(10), GetParam().options);
  EXPECT_EQ(file.rc, TAV_RC_OK);
  EXPECT_EQ(file->attributes, GetParam().attributes);
  EXPECT_EQ(file->kind, TAV_STORAGE_FILE);
  EXPECT_EQ(file->ioUnit, 0x100000U);
  EXPECT_EQ(file->status, TAV_RC_OK);
  EXPECT_EQ(file->position, 0U);
  EXPECT_EQ(file->needSeek, 0);
  EXPECT_FALSE(file->hasAttributes(TAV_ATTR_DIRECT));
}

INSTANTIATE_TEST_SUITE_P(Rows, FileMode,
                         testing::Values(ModeRow{"Read", 0x1, 0x3E}, ModeRow{"Write", 0x2, 0x39},
                                         ModeRow{"ReadAndWrite", 0x3, 0x3F}, ModeRow{"Update", 0x4, 0x3F},
                                         ModeRow{"UpdateAndCreate", 0x104, 0x3F}),
                         kRowName);

TEST_F(FileStorage, NeedsBothArguments)
{
  TraceLog trace;
  uint32_t rc = 77;
  const TAVSSFile noParam(nullptr, &rc);
  EXPECT_EQ(rc, TAV_RC_BAD_PARAM);
  EXPECT_EQ(noParam.status, TAV_RC_BAD_PARAM);
  EXPECT_EQ(noParam.pFile, nullptr);
  KORFileOpenParam param;
  const TAVSSFile noAnswer(&param, nullptr);
  EXPECT_EQ(noAnswer.status, TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(),
              ElementsAre(at(tav::probe::ssFile, 10, TAV_RC_BAD_PARAM), at(tav::probe::ssFile, 10, TAV_RC_BAD_PARAM)));
}

TEST_F(FileStorage, TellsWhenItsFileObjectCannotBeAllocated)
{
  KORFileOpenParam param;
  uint32_t rc = 77;
  TraceLog trace;
  const allocations::FailNth first(1);
  const TAVSSFile storage(&param, &rc);
  EXPECT_EQ(rc, TAV_RC_NO_MEMORY);
  EXPECT_EQ(storage.status, TAV_RC_NO_MEMORY);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFile, 20, TAV_RC_NO_MEMORY)));
}

struct OpenRow : Row
{
  const char* file;
  uint64_t options;
  uint32_t code;
};

class RefusedFile : public FileStorage, public testing::WithParamInterface<OpenRow>
{};

TEST_P(RefusedFile, KeepsTheCodeInItsStatus)
{
  fileOf(10);
  TraceLog trace;
  OpenFile file(folder_ / GetParam().file, GetParam().options);
  EXPECT_EQ(file.rc, GetParam().code);
  EXPECT_EQ(file->status, GetParam().code);
  EXPECT_EQ(file->pFile, nullptr);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFile, 30, GetParam().code)));
  TAVInitParam param(&*file, TAV_OPT_READ);
  TAVHandle* handle = nullptr;
  EXPECT_EQ(tavInitHandle(&handle, &param), TAV_RC_BAD_PARAM) << "no handle opens over it";
}

INSTANTIATE_TEST_SUITE_P(Rows, RefusedFile,
                         testing::Values(OpenRow{"MissingFile", "nothing", 0x1, KOR_RC_NO_SUCH_FILE},
                                         OpenRow{"MissingFolder", "no/where", kCreate, KOR_RC_NO_SUCH_FILE},
                                         OpenRow{"Folder", ".", 0x1, KOR_RC_IS_FOLDER},
                                         OpenRow{"ExistingFile", "stream.tav", kCreate | KOR_FILE_EXCLUSIVE,
                                                 KOR_RC_FILE_EXISTS},
                                         OpenRow{"NoMode", "stream.tav", 0, TAV_RC_BAD_PARAM}),
                         kRowName);

TEST_F(FileStorage, TracesConstructionAndEnd)
{
  const std::string path = fileOf(10);
  KORFileOpenParam param;
  param.pPath = path.c_str();
  param.options = KOR_FILE_READ;
  uint32_t rc = 77;
  uint32_t* const pRc = &rc;
  TraceLog trace;
  {
    const TAVSSFile storage(&param, &rc);
  }
  EXPECT_THAT(trace.dump(tav::probe::ssFile, 0).items, ElementsAre(bytesOf(param), bytesOf(pRc)));
  EXPECT_EQ(trace.stepsOf(tav::probe::ssFile).back(), (Step{KOR_TRACE_EXIT, tav::probe::ssFile, 0}));
  EXPECT_THAT(trace.stepsOf(tav::probe::ssFileEnd), ElementsAre(Step{KOR_TRACE_ENTRY, tav::probe::ssFileEnd, 0},
                                                                Step{KOR_TRACE_EXIT, tav::probe::ssFileEnd, 0}));
  EXPECT_THAT(trace.failures(), IsEmpty());
}

TEST_F(FileStorage, LeavesNothingBehind)
{
  const std::string path = fileOf(10);
  const int64_t before = allocations::live();
  {
    const OpenFile good(path, KOR_FILE_READ);
    const OpenFile bad(path, 0);
  }
  EXPECT_EQ(allocations::live(), before);
}

// --- cursor and size ---

TEST_F(FileStorage, SeeksAnywhereAlsoBehindTheEnd)
{
  OpenFile file(fileOf(10), KOR_FILE_READ);
  TraceLog trace;
  EXPECT_EQ(file->seek(1000, 5), TAV_RC_OK);
  EXPECT_EQ(file->position, 1000U);
  EXPECT_THAT(trace.dump(tav::probe::ssFileSeek, 0).items, ElementsAre(bytesOf(uint64_t{1000}), bytesOf(uint64_t{5})));
  uint64_t position = 0;
  EXPECT_EQ(file->getPosition(&position), TAV_RC_OK);
  EXPECT_EQ(position, 1000U);
  EXPECT_THAT(trace.dump(tav::probe::ssFileGetPosition, 100).items, ElementsAre(bytesOf(uint64_t{1000})));
}

TEST_F(FileStorage, TracesWhatItOpenedAndWhereASeekLanded)
{
  const std::string path = fileOf(10);
  TraceLog trace;
  OpenFile file(path, KOR_FILE_READ);
  ASSERT_EQ(file->seek(4, 1), TAV_RC_OK);
  EXPECT_THAT(trace.dump(tav::probe::ssFile, 100).items,
              ElementsAre(bytesOf(file->pFile), bytesOf(file->attributes), bytesOf(file->ioUnit)));
  EXPECT_THAT(trace.dump(tav::probe::ssFileSeek, 100).items, ElementsAre(bytesOf(uint64_t{4})));
}

TEST_F(FileStorage, TracesNoResultOfAnOpeningThatFailed)
{
  TraceLog trace;
  OpenFile file(folder_ / "missing", KOR_FILE_READ);
  EXPECT_NE(file.rc, TAV_RC_OK);
  EXPECT_THAT(trace.dump(tav::probe::ssFile, 100).items, IsEmpty());
}

TEST_F(FileStorage, PassesOnWhyThereIsNoSize)
{
  OpenFile file(fileOf(10), KOR_FILE_READ);
  ASSERT_EQ(file->pFile->close(), TAV_RC_OK);
  uint64_t size = 5;
  TraceLog trace;
  EXPECT_EQ(file->getTotalSize(&size), KOR_RC_NOT_OPEN);
  EXPECT_EQ(size, 5U);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileGetTotalSize, 30, KOR_RC_NOT_OPEN)));
}

TEST_F(FileStorage, PassesOnWhyNothingCanBeReadBackward)
{
  OpenFile file(fileOf(10), KOR_FILE_WRITE);
  file->attributes |= TAV_ATTR_READ_BACKWARD; // which the file was not opened for
  ASSERT_EQ(file->seek(10, 1), TAV_RC_OK);
  TraceLog trace;
  const Got got = read(file, 4, 64, true);
  EXPECT_NE(got.code, TAV_RC_OK);
  EXPECT_THAT(got.bytes, IsEmpty());
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileRead, 50, got.code)));
}

TEST_F(FileStorage, KeepsItsCursorWhenASeekFails)
{
  OpenFile file(fileOf(10), KOR_FILE_READ);
  ASSERT_EQ(file->seek(4, 1), TAV_RC_OK);
  TraceLog trace;
  EXPECT_EQ(file->seek(~uint64_t{0}, 1), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.dump(tav::probe::ssFileSeek, 100).items, IsEmpty());
  EXPECT_EQ(file->position, 4U);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileSeek, 20, TAV_RC_BAD_PARAM)));
  EXPECT_EQ(read(file, 2), (Got{TAV_RC_OK, pattern(4, 2)}));
}

TEST_F(FileStorage, NeedsAPlaceForThePosition)
{
  OpenFile file(fileOf(10), KOR_FILE_READ);
  TraceLog trace;
  EXPECT_EQ(file->getPosition(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileGetPosition, 110, TAV_RC_BAD_PARAM)));
}

TEST_F(FileStorage, TellsTheFilesSize)
{
  OpenFile file(fileOf(123), KOR_FILE_READ);
  uint64_t size = 0;
  EXPECT_EQ(file->getTotalSize(&size), TAV_RC_OK);
  EXPECT_EQ(size, 123U);
  TraceLog trace;
  EXPECT_EQ(file->getTotalSize(nullptr), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileGetTotalSize, 10, TAV_RC_BAD_PARAM)));
}

// --- reading ---

TEST_F(FileStorage, ReadsForwardFromItsCursor)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  TraceLog trace;
  EXPECT_EQ(read(file, 5), (Got{TAV_RC_OK, pattern(0, 5)}));
  EXPECT_EQ(read(file, 5), (Got{TAV_RC_OK, pattern(5, 5)}));
  EXPECT_EQ(file->position, 10U);
  EXPECT_THAT(trace.dump(tav::probe::ssFileRead, 100).items, ElementsAre(bytesOf(uint64_t{5}), bytesOf(uint64_t{5})));
}

TEST_F(FileStorage, ReadsNoMoreThanTheBufferHolds)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  EXPECT_EQ(read(file, 15, 3), (Got{TAV_RC_OK, pattern(0, 3)}));
}

TEST_F(FileStorage, GivesTheEndTogetherWithTheLastBytes)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  ASSERT_EQ(file->seek(15, 1), TAV_RC_OK);
  EXPECT_EQ(read(file, 10), (Got{TAV_RC_END_OF_STORAGE, pattern(15, 5)}));
  EXPECT_EQ(file->position, 20U);
  TraceLog trace;
  EXPECT_EQ(read(file, 10), (Got{TAV_RC_END_OF_STORAGE, {}}));
  EXPECT_EQ(file->position, 20U);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileRead, 30, TAV_RC_END_OF_STORAGE)));
}

TEST_F(FileStorage, NeedsPlacesForBytesAndCount)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  uint64_t got = 99;
  void* pData = nullptr;
  TraceLog trace;
  EXPECT_EQ(file->read(5, nullptr, 5, &got, false, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(file->read(5, &pData, 5, nullptr, false, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(got, 99U);
  EXPECT_EQ(file->read(5, &pData, 5, &got, false, false), TAV_RC_BAD_PARAM);
  EXPECT_EQ(got, 0U);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileRead, 240, TAV_RC_BAD_PARAM),
                                            at(tav::probe::ssFileRead, 240, TAV_RC_BAD_PARAM),
                                            at(tav::probe::ssFileRead, 20, TAV_RC_BAD_PARAM)));
}

TEST_F(FileStorage, NeedsNoBufferForNoBytes)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  uint64_t got = 99;
  void* pData = nullptr;
  EXPECT_EQ(file->read(0, &pData, 5, &got, false, false), TAV_RC_OK);
  EXPECT_EQ(file->read(5, &pData, 0, &got, false, false), TAV_RC_OK);
  EXPECT_EQ(file->read(5, &pData, 5, &got, false, true), TAV_RC_END_OF_STORAGE) << "nothing stands before";
  ASSERT_EQ(file->seek(4, 1), TAV_RC_OK);
  EXPECT_EQ(file->read(0, &pData, 5, &got, false, true), TAV_RC_OK);
  EXPECT_EQ(got, 0U);
  EXPECT_EQ(file->read(5, &pData, 5, &got, false, true), TAV_RC_BAD_PARAM);
  EXPECT_EQ(file->position, 4U);
}

struct UnservedRow : Row
{
  uint64_t options;
  uint64_t wanted;
  bool zeroCopy;
  bool backward;
  uint32_t point;
  uint32_t code;
};

class UnservedRead : public FileStorage, public testing::WithParamInterface<UnservedRow>
{};

TEST_P(UnservedRead, IsRefused)
{
  const UnservedRow& row = GetParam();
  OpenFile file(fileOf(20), row.options);
  ASSERT_EQ(file->seek(9, 1), TAV_RC_OK);
  uint8_t buffer[8];
  void* pData = buffer;
  uint64_t got = 99;
  TraceLog trace;
  EXPECT_EQ(file->read(row.wanted, &pData, sizeof buffer, &got, row.zeroCopy, row.backward), row.code);
  EXPECT_EQ(got, 0U);
  EXPECT_EQ(file->position, 9U);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileRead, row.point, row.code)));
}

INSTANTIATE_TEST_SUITE_P(
    Rows, UnservedRead,
    testing::Values(UnservedRow{"ForwardOfAWriteOnlyFile", 0x2, 5, false, false, 230, TAV_RC_NOT_SUPPORTED},
                    UnservedRow{"NothingOfAWriteOnlyFile", 0x2, 0, false, false, 220, TAV_RC_BAD_PARAM},
                    UnservedRow{"BackwardOfAWriteOnlyFile", 0x2, 5, false, true, 230, TAV_RC_NOT_SUPPORTED},
                    UnservedRow{"ZeroCopy", 0x1, 5, true, false, 230, TAV_RC_NOT_SUPPORTED},
                    UnservedRow{"ZeroCopyOfNothing", 0x1, 0, true, false, 220, TAV_RC_BAD_PARAM},
                    UnservedRow{"ZeroCopyBackward", 0x1, 5, true, true, 230, TAV_RC_NOT_SUPPORTED}),
    kRowName);

TEST_F(FileStorage, ReadsBackwardIntoTheEndOfTheBuffer)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  ASSERT_EQ(file->seek(12, 1), TAV_RC_OK);
  EXPECT_EQ(read(file, 5, 8, true), (Got{TAV_RC_OK, pattern(7, 5)}));
  EXPECT_EQ(file->position, 7U);
  EXPECT_EQ(file->needSeek, 1);
}

TEST_F(FileStorage, ReadsBackwardNoMoreThanTheBufferHolds)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  ASSERT_EQ(file->seek(12, 1), TAV_RC_OK);
  EXPECT_EQ(read(file, 9, 3, true), (Got{TAV_RC_OK, pattern(9, 3)}));
}

TEST_F(FileStorage, ReadsBackwardOnlyWhatStandsBeforeTheCursor)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  ASSERT_EQ(file->seek(4, 1), TAV_RC_OK);
  EXPECT_EQ(read(file, 10, 16, true), (Got{TAV_RC_OK, pattern(0, 4)}));
  EXPECT_EQ(file->position, 0U);
  TraceLog trace;
  EXPECT_EQ(read(file, 10, 16, true), (Got{TAV_RC_END_OF_STORAGE, {}}));
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileRead, 210, TAV_RC_END_OF_STORAGE)));
}

TEST_F(FileStorage, ReadsForwardAgainFromWhereABackwardReadWent)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  ASSERT_EQ(file->seek(12, 1), TAV_RC_OK);
  ASSERT_EQ(read(file, 5, 8, true).code, TAV_RC_OK);
  EXPECT_EQ(read(file, 3), (Got{TAV_RC_OK, pattern(7, 3)}));
  EXPECT_EQ(read(file, 3), (Got{TAV_RC_OK, pattern(10, 3)}));
  EXPECT_EQ(file->needSeek, 1) << "set for good";
}

TEST_F(FileStorage, WritesWhereABackwardReadWent)
{
  const std::string path = fileOf(20);
  OpenFile file(path, KOR_FILE_UPDATE);
  ASSERT_EQ(file->seek(12, 1), TAV_RC_OK);
  ASSERT_EQ(read(file, 5, 8, true).code, TAV_RC_OK);
  uint64_t written = 0;
  EXPECT_EQ(file->write("xy", 2, &written), TAV_RC_OK);
  EXPECT_EQ(file->position, 9U);
  std::vector<uint8_t> expected = pattern(0, 20);
  expected[7] = 'x';
  expected[8] = 'y';
  EXPECT_EQ(contentOf(path), expected);
}

TEST_F(FileStorage, SeeksLazilyOnlyAfterABackwardRead)
{
  OpenFile file(fileOf(20), KOR_FILE_READ);
  file->position = 9; // the file itself is at 0
  EXPECT_EQ(read(file, 2), (Got{TAV_RC_OK, pattern(0, 2)}));
  file->position = 9;
  file->needSeek = 1;
  EXPECT_EQ(read(file, 2), (Got{TAV_RC_OK, pattern(9, 2)}));
}

TEST_F(FileStorage, GivesTheCodeOfALazySeek)
{
  OpenFile file(fileOf(20), KOR_FILE_UPDATE);
  file->needSeek = 1;
  file->position = ~uint64_t{0};
  TraceLog trace;
  EXPECT_EQ(read(file, 2), (Got{TAV_RC_BAD_PARAM, {}}));
  uint64_t written = 0;
  EXPECT_EQ(file->write("xy", 2, &written), TAV_RC_BAD_PARAM);
  EXPECT_THAT(trace.failures(), ElementsAre(at(tav::probe::ssFileRead, 100, TAV_RC_BAD_PARAM),
                                            at(tav::probe::ssFileWrite, 30, TAV_RC_BAD_PARAM)));
}

TEST_F(FileStorage, OffersNoMemory)
{
  OpenFile file(fileOf(10), KOR_FILE_READ);
  void* pData = nullptr;
  uint64_t size = 0;
  TraceLog trace;
  EXPECT_EQ(file->getMemory(&pData, &size), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(file->getMemory(nullptr, nullptr), TAV_RC_NOT_SUPPORTED);
  EXPECT_EQ(trace.failures().front(), at(tav::probe::ssFileGetMemory, 10, TAV_RC_NOT_SUPPORTED));
}

struct ClosedRow : Row
{
  uint32_t probe;
  uint32_t point;
  uint32_t (*call)(TAVSSFile&);
};

class UnopenedFile : public FileStorage, public testing::WithParamInterface<ClosedRow>
{};

TEST_P(UnopenedFile, IsNotReached)
{
  OpenFile file(folder_ / "nothing", KOR_FILE_UPDATE);
  ASSERT_EQ(file->pFile, nullptr);
  TraceLog trace;
  EXPECT_EQ(GetParam().call(*file), KOR_RC_NOT_OPEN);
  EXPECT_THAT(trace.failures(), ElementsAre(at(GetParam().probe, GetParam().point, KOR_RC_NOT_OPEN)));
}

uint8_t spare[8];
uint64_t count = 0;
INSTANTIATE_TEST_SUITE_P(
    Rows, UnopenedFile,
    testing::Values(ClosedRow{"Seek", tav::probe::ssFileSeek, 10, [](TAVSSFile& file) { return file.seek(0, 1); }},
                    ClosedRow{"Size", tav::probe::ssFileGetTotalSize, 20,
                              [](TAVSSFile& file) { return file.getTotalSize(&count); }},
                    ClosedRow{"Read", tav::probe::ssFileRead, 10,
                              [](TAVSSFile& file) {
                                void* pData = spare;
                                return file.read(1, &pData, 8, &count, false, false);
                              }},
                    ClosedRow{"Write", tav::probe::ssFileWrite, 20,
                              [](TAVSSFile& file) { return file.write(spare, 1, &count); }},
                    ClosedRow{"Lock", tav::probe::ssFileLock, 10, [](TAVSSFile& file) { return file.lock(0); }},
                    ClosedRow{"Unlock", tav::probe::ssFileUnlock, 10, [](TAVSSFile& file) { return file.unlock(); }}),
    kRowName);

TEST_F(FileStorage, LeavesItsCursorWhereItWasWhenALookBackCannotSeek)
{
  OpenFile storage(fileOf(20), KOR_FILE_READ);
  ASSERT_EQ(storage->seek(10, 0), TAV_RC_OK);
  ASSERT_EQ(storage->pFile->close(), TAV_RC_OK);
  std::vector<uint8_t> bytes(4);
  void* buffer = bytes.data();
  uint64_t got = 77;
  EXPECT_EQ(storage->read(4, &buffer, 4, &got, false, true), KOR_RC_NOT_OPEN);
  EXPECT_EQ(got, 0U);
  EXPECT_EQ(storage->position, 10U);
}

} // namespace
