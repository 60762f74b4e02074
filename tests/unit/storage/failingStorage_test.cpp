/// Storages that refuse, cut and miss: codes arrive, what had reached the storage stays, nothing leaks.
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>

#include "storage/ringFixture.h"
#include "support/failingNew.h"
#include "support/rows.h"
#include "support/streams.h"

namespace
{

using namespace test;

constexpr uint64_t kCalls = 400; ///< more than the script makes

/// The whole script, so that a call of every kind can fail: appends in page and over pages, elements larger than the
/// ring, groups that close far behind, strings, verbatim nodes, an abandoned group, an update.
class Script
{
public:
  explicit Script(const Form& form)
      : form_(form), storage_(form.pageBytes) {}

  /// Runs until a call fails; the code of that call, or of the last write.
  uint32_t run()
  {
    Handle handle(storage_, TAV_OPT_WRITE, form_);
    handle_ = handle.get();
    uint32_t rc = nodes();
    if (rc == TAV_RC_OK)
    {
      rc = handle->pCircularBuf->reset();
    }
    failedHandleIsUsable(rc);
    length_ = handle->streamBytes;
    return rc;
  }

  RecordingStorage& storage() { return storage_; }
  /// The stream's bytes. What follows them may be left from an attempt that failed.
  [[nodiscard]] std::vector<uint8_t> stream() const
  {
    return {storage_.bytes.begin(),
            storage_.bytes.begin() + static_cast<ptrdiff_t>(std::min<uint64_t>(length_, storage_.bytes.size()))};
  }

private:
  uint32_t add(Element node)
  {
    TAVHeaderData data = node.data();
    const uint64_t before = handle_->streamBytes;
    const uint32_t rc = tavAddElement(0, handle_, &data);
    if (rc != TAV_RC_OK)
    {
      EXPECT_EQ(handle_->streamBytes, before) << "the write offset stays where it was";
    }
    last_ = data;
    return rc;
  }

  uint32_t update()
  {
    std::vector<uint8_t> payload = pattern(9, 40);
    TAVHeaderData data{last_.header, payload.data(), payload.size(), 0};
    return tavUpdateElement(0, handle_, &data);
  }

  uint32_t verbatim()
  {
    std::vector<uint8_t> bytes(16);
    return tavAddStream(0, handle_, TAV_HDR_64, bytes.data(), bytes.size());
  }

  /// No group is opened with an unknown size: it would get its end element even when its size could not be written, and
  /// the element's code would be the answer of the close.
  uint32_t nodes()
  {
    const std::vector<std::function<uint32_t()>> steps{
        [&] { return add(group64(1, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE, 0)); },
        [&] { return add(u32(5, 7, true, TAV_INFO_EYE_SIZE)); },
        [&] { return add(group64(2, TAV_TYPE_HEADER32, TAV_INFO_EYE_SIZE, 0)); },
        [&] { return add(u32(6, 8, false)); },
        [&] { return add(binary(7, pattern(3, 200), false)); },
        [&] { return add(binary(8, pattern(4, 30), false)); },
        [&] { return tavCloseHeader(0, handle_); },
        [&] { return add(binary(9, pattern(5, 40))); },
        [&] { return update(); },
        [&] { return verbatim(); },
        [&] { return add(group64(3, TAV_TYPE_HEADER64, 0, 0)); },
        [&] { return add(binary(10, pattern(6, 300))); },
        [&] { return tavCloseHeader(1, handle_); },
        [&] { return add(binary(11, pattern(7, 20))); },
        [&] { return tavCloseHeader(0, handle_); },
    };
    for (const auto& step : steps)
    {
      if (const uint32_t rc = step(); rc != TAV_RC_OK)
      {
        return rc;
      }
    }
    return TAV_RC_OK;
  }

  /// After one failure the storage works again, and so does the handle.
  void failedHandleIsUsable(uint32_t rc)
  {
    if (rc == TAV_RC_OK)
    {
      return;
    }
    storage_.longestWrite = ~uint64_t{0};
    storage_.seekError = 0;
    EXPECT_EQ(handle_->pCircularBuf->reset(), TAV_RC_OK);
    TAVResetParam param;
    EXPECT_EQ(tavResetHandle(handle_, &param), TAV_RC_OK);
    EXPECT_EQ(nodes(), TAV_RC_OK) << "the script again";
    EXPECT_EQ(handle_->pCircularBuf->reset(), TAV_RC_OK);
  }

  Form form_;
  RecordingStorage storage_;
  TAVHandle* handle_ = nullptr;
  TAVHeaderData last_{};
  uint64_t length_ = 0;
};

class FailingStorage : public testing::TestWithParam<uint64_t> ///< pages of 64 bytes
{
protected:
  [[nodiscard]] static Form form() { return {.buffered = true, .pageBytes = 64, .ringBytes = 64 * GetParam()}; }
  /// What the script writes when nothing fails.
  static std::vector<uint8_t> expected()
  {
    Script script(form());
    EXPECT_EQ(script.run(), TAV_RC_OK);
    return script.stream();
  }
};

TEST_P(FailingStorage, ReportsEveryFailedCallAndTheHandleGoesOn)
{
  const std::vector<uint8_t> whole = expected();
  uint64_t failures = 0;
  for (uint64_t nth = 1; nth < kCalls; ++nth)
  {
    const int64_t before = allocations::live();
    {
      Script script(form());
      script.storage().failAt(nth, KOR_RC_IO_ERROR);
      const uint32_t rc = script.run();
      failures += rc != TAV_RC_OK ? 1 : 0;
      // A small write whose page could not be read is refused as one outside the cached range.
      EXPECT_TRUE(rc == TAV_RC_OK || rc == KOR_RC_IO_ERROR || rc == TAV_RC_BAD_PARAM) << nth << ": " << korCodeName(rc);
      EXPECT_EQ(script.stream(), whole) << "call " << nth;
    }
    EXPECT_EQ(allocations::live(), before) << "call " << nth;
  }
  EXPECT_GT(failures, 10U);
}

TEST_P(FailingStorage, ThatWritesShortIsOutOfRoom)
{
  for (uint64_t longest = 0; longest < 64; longest += 7)
  {
    Script script(form());
    script.storage().longestWrite = longest;
    EXPECT_EQ(script.run(), TAV_RC_NO_MEMORY) << "pieces of " << longest;
  }
}

TEST_P(FailingStorage, ThatLandsElsewhereIsNotWrittenThere)
{
  Form direct = form();
  RecordingStorage storage(64, pattern(0, 1000));
  Handle handle(storage, TAV_OPT_WRITE, direct);
  Element root = group64(1);
  TAVHeaderData data = root.data();
  ASSERT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_OK);
  ASSERT_EQ(handle->pCircularBuf->reset(), TAV_RC_OK);
  const std::vector<uint8_t> before = storage.bytes;
  storage.position = 500; // so that the ring has to seek
  storage.seekError = 3;
  Element node = binary(2, pattern(50, 700));
  data = node.data();
  const uint32_t rc = tavAddElement(0, handle.get(), &data);
  EXPECT_TRUE(rc == TAV_RC_NO_MEMORY || rc == TAV_RC_BAD_PARAM) << korCodeName(rc);
  EXPECT_EQ(storage.bytes, before);
  storage.seekError = 0;
  EXPECT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_OK) << "the handle is usable";
}

TEST_P(FailingStorage, LeavesIntactWhatHadReachedIt)
{
  for (uint64_t nth = 1; nth < 60; ++nth)
  {
    RecordingStorage storage(64);
    Handle handle(storage, TAV_OPT_WRITE, form());
    Element root = group64(1);
    TAVHeaderData data = root.data();
    ASSERT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_OK);
    Element first = binary(2, pattern(50, 500));
    data = first.data();
    ASSERT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_OK);
    ASSERT_EQ(handle->pCircularBuf->reset(), TAV_RC_OK);
    const std::vector<uint8_t> before(storage.bytes.begin(),
                                      storage.bytes.begin() + static_cast<ptrdiff_t>(handle->streamBytes));
    storage.failAt(nth, KOR_RC_NO_SPACE);
    for (int i = 0; i < 12; ++i)
    {
      Element more = binary(3, pattern(9, 50));
      data = more.data();
      tavAddElement(0, handle.get(), &data);
    }
    handle->pCircularBuf->reset();
    EXPECT_TRUE(std::equal(before.begin(), before.end(), storage.bytes.begin())) << "call " << nth;
  }
}

struct Call : Row
{
  uint32_t (*run)(TAVHandle*, TAVHeaderData&);
};

/// A group of three elements with pairs; the last of them.
TAVHeaderData lastOf(TAVHandle* handle)
{
  TAVHeaderData root{};
  EXPECT_EQ(tavReadNodeInt(0, handle, 0, true, &root), TAV_RC_OK);
  TAVHeaderData nodes[3]{};
  EXPECT_EQ(tavGetNextChild(0, handle, &root.header, nullptr, &nodes[0]), TAV_RC_OK);
  EXPECT_EQ(tavGetNextChild(0, handle, &root.header, &nodes[0].header, &nodes[1]), TAV_RC_OK);
  EXPECT_EQ(tavGetNextChild(0, handle, &root.header, &nodes[1].header, &nodes[2]), TAV_RC_OK);
  return nodes[2];
}

class FailingReads : public testing::TestWithParam<Call>
{};

TEST_P(FailingReads, GiveTheStoragesCodeAndThenTheAnswer)
{
  const Form form{.buffered = true, .pageBytes = 64, .ringBytes = 128};
  StreamWriter writer(form);
  writer.add(group64(1));
  for (int i = 0; i < 3; ++i)
  {
    writer.add(binary(2, pattern(0, 100), true, TAV_INFO_EYE_SIZE));
  }
  writer.close();
  const Bytes bytes = writer.bytes();
  uint64_t failures = 0;
  for (uint64_t nth = 1; nth < 30; ++nth)
  {
    const int64_t before = allocations::live();
    {
      StreamReader reader(bytes, form, 32);
      TAVHeaderData node = lastOf(reader.handle());
      reader.vectorStorage().failAt(nth, KOR_RC_IO_ERROR);
      const uint32_t rc = GetParam().run(reader.handle(), node);
      reader.vectorStorage().failAt(0, TAV_RC_OK);
      failures += rc != TAV_RC_OK ? 1 : 0;
      // A search for a node shows that it found none; its own record has the code.
      EXPECT_TRUE(rc == TAV_RC_OK || rc == KOR_RC_IO_ERROR || rc == TAV_RC_NOT_FOUND) << nth << ": " << korCodeName(rc);
      node = lastOf(reader.handle());
      EXPECT_EQ(GetParam().run(reader.handle(), node), TAV_RC_OK) << "the handle is usable after call " << nth;
      EXPECT_EQ(reader.vectorStorage().writes, 0U);
    }
    EXPECT_EQ(allocations::live(), before);
  }
  EXPECT_GT(failures, 0U);
}

uint32_t readAgain(TAVHandle* handle, TAVHeaderData& node)
{
  return tavReadNodeInt(0, handle, 16, true, &node);
}
uint32_t stepBack(TAVHandle* handle, TAVHeaderData& node)
{
  TAVHeaderData reference = node;
  return tavGetPrevNode(0, handle, &reference, &node);
}
uint32_t scanOn(TAVHandle* handle, TAVHeaderData&)
{
  uint64_t offset = 0;
  uint64_t eyeSize = 0;
  bool swapped = false;
  return tavFindEyeSizeComboInt(handle, 0, 0, true, &offset, &eyeSize, &swapped);
}
uint32_t fromIndex(TAVHandle* handle, TAVHeaderData& node)
{
  return tavFindNodeFromIndex(0, handle, 20, 0, &node);
}
uint32_t validate(TAVHandle* handle, TAVHeaderData&)
{
  TAVHeaderData root{};
  const uint32_t rc = tavReadNodeInt(0, handle, 0, true, &root);
  return rc == TAV_RC_OK ? tavValidateHierarchy(0, handle, &root.header) : rc;
}
uint32_t print(TAVHandle* handle, TAVHeaderData&)
{
  TAVHeaderData root{};
  const uint32_t rc = tavReadNodeInt(0, handle, 0, true, &root);
  char piece[200];
  TAVPrintParam param{0, piece, sizeof piece, nullptr};
  uint64_t printed = 0;
  return rc == TAV_RC_OK ? tavPrintSubtree(TAV_PRINT_SUBTREE, handle, &root, &param, &printed) : rc;
}

INSTANTIATE_TEST_SUITE_P(Calls, FailingReads,
                         testing::Values(Call{"ReadNode", readAgain}, Call{"PreviousNode", stepBack},
                                         Call{"Scan", scanOn}, Call{"FromIndex", fromIndex}, Call{"Validate", validate},
                                         Call{"Print", print}),
                         kRowName);

INSTANTIATE_TEST_SUITE_P(RingPages, FailingStorage, testing::Values(1U, 2U, 3U));

TEST(FailingStorageAtTheEnd, IsReportedByTheLastResetOnly)
{
  VectorStorage storage(64);
  Handle handle(storage, TAV_OPT_WRITE, {.buffered = true, .pageBytes = 64, .ringBytes = 192});
  Element root = group64(1);
  TAVHeaderData data = root.data();
  ASSERT_EQ(tavAddElement(0, handle.get(), &data), TAV_RC_OK);
  storage.failAt(1, KOR_RC_NO_SPACE);
  EXPECT_EQ(handle->pCircularBuf->reset(), KOR_RC_NO_SPACE);
  EXPECT_EQ(handle->pCircularBuf->reset(), TAV_RC_OK) << "the page was kept";
  EXPECT_GE(storage.bytes.size(), 16U);
}

} // namespace
