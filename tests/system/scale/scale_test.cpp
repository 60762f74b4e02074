/// Many siblings, deep nesting, large elements, and memory that does not grow with them. TAV_TEST_HUGE=1 makes the
/// streams as large as they are meant to be: ten million siblings, an element of 3 GiB.
#include <cstdlib>
#include <cstring>
#include <gtest/gtest.h>
#include <memory>
#include <vector>

#include "support/platform.h"
#include "support/streams.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr uint64_t kMiB = 0x100000;

bool huge()
{
  return std::getenv("TAV_TEST_HUGE") != nullptr;
}

/// A block of that size, of zeros that take no memory until they are written.
using Block = std::unique_ptr<uint8_t, decltype(&std::free)>;
Block zeros(uint64_t size)
{
  return {static_cast<uint8_t*>(std::calloc(size, 1)), &std::free};
}

class Siblings : public testing::Test
{
protected:
  void write(TAVHandle* handle)
  {
    Element root = group32(TAV_ELM_CMN_SYSTEM);
    TAVHeaderData data = root.data();
    check(tavAddElement(0, handle, &data), "root");
    for (uint32_t i = 0; i < count_; ++i)
    {
      data.header = header32(sizeof i, TAV_TYPE_UINT32, 7);
      data.pDataBuf = reinterpret_cast<uint8_t*>(&i);
      data.dataBufSize = sizeof i;
      if (const uint32_t rc = tavAddElement(0, handle, &data); rc != TAV_RC_OK)
      {
        check(rc, "sibling");
      }
    }
    check(tavCloseHeader(0, handle), "close");
  }

  /// Every sibling is there, in its order.
  void expectAll(TAVHandle* handle)
  {
    TAVHeaderData root{};
    ASSERT_EQ(tavGetNextChild(0, handle, nullptr, nullptr, &root), TAV_RC_OK);
    EXPECT_EQ(root.header.hdr32.size, count_ * 12);
    TAVHeaderData nodes[2]{};
    uint32_t wrong = 0;
    uint32_t rc = tavGetNextChild(0, handle, &root.header, nullptr, &nodes[0]);
    uint32_t seen = 0;
    for (; rc == TAV_RC_OK; ++seen)
    {
      TAVHeaderData& node = nodes[seen % 2];
      wrong += std::memcmp(node.pDataBuf, &seen, sizeof seen) != 0 ? 1 : 0;
      rc = tavGetNextChild(0, handle, &root.header, &node.header, &nodes[(seen + 1) % 2]);
    }
    EXPECT_EQ(rc, TAV_RC_NO_MORE_CHILDREN);
    EXPECT_EQ(seen, count_);
    EXPECT_EQ(wrong, 0U);
    EXPECT_EQ(tavValidateHierarchy(0, handle, &root.header), TAV_RC_OK);
  }

  uint32_t count_ = huge() ? 10'000'000 : 300'000;
};

TEST_F(Siblings, ByTheMillionAreReadBackFromMemory)
{
  const uint64_t size = uint64_t{count_} * 12 + 4096;
  const Block block = zeros(size);
  TAVSSMemory memory(block.get(), size);
  Form form;
  form.root32 = true;
  {
    Handle writer(memory, TAV_OPT_WRITE, form);
    write(writer.get());
  }
  Handle reader(memory, TAV_OPT_READ, form);
  expectAll(reader.get());
}

TEST_F(Siblings, ByTheMillionGoThroughARing)
{
  Form form;
  form.root32 = true;
  form.buffered = true;
  form.pageBytes = 64 * 1024;
  form.ringBytes = 4 * form.pageBytes;
  VectorStorage storage(form.pageBytes);
  {
    Handle writer(storage, TAV_OPT_WRITE, form);
    write(writer.get());
    check(writer->pCircularBuf->reset(), "reset");
  }
  storage.attributes = VectorStorage::kReadOnly;
  Handle reader(storage, TAV_OPT_READ, form);
  expectAll(reader.get());
}

class Deep : public testing::TestWithParam<bool>
{};

TEST_P(Deep, FourThousandLevelsAreWrittenValidatedAndPrintedAndTheNextIsRefused)
{
  Form form;
  form.buffered = GetParam();
  form.pageBytes = 4096;
  form.ringBytes = 4 * form.pageBytes;
  StreamWriter writer(form, 0x40000);
  for (int level = 0; level < 4000; ++level) writer.add(group64(TAV_ELM_CMN_HOST));
  TAVHeaderData next = group64(TAV_ELM_CMN_HOST).data();
  const uint64_t length = writer.length();
  EXPECT_EQ(tavAddElement(0, writer.handle(), &next), TAV_RC_NO_MEMORY);
  writer.handle()->streamBytes = length; // the refused group's header is there, without being counted from here on
  writer.add(u32(TAV_ELM_CMN_CPU_SPEED, 7));
  for (int level = 0; level < 4000; ++level) writer.close();
  EXPECT_EQ(tavCloseHeader(0, writer.handle()), TAV_RC_NOT_FOUND);

  StreamReader reader(writer.bytes(), form);
  TAVHeaderData root{};
  ASSERT_EQ(tavGetNextChild(0, reader.handle(), nullptr, nullptr, &root), TAV_RC_OK);
  EXPECT_EQ(root.header.hdr64.size, 16U * 3999 + 20);
  EXPECT_EQ(tavValidateHierarchy(0, reader.handle(), &root.header), TAV_RC_OK);
  char piece[64];
  TAVPrintParam param{0, piece, sizeof piece, nullptr};
  uint64_t printed = 0;
  EXPECT_EQ(tavPrintSubtree(TAV_PRINT_SUBTREE | TAV_PRINT_DATA, reader.handle(), nullptr, &param, &printed), TAV_RC_OK);
  EXPECT_GT(printed, 4000U);
}

INSTANTIATE_TEST_SUITE_P(Access, Deep, testing::Bool(),
                         [](const auto& access) { return access.param ? "Buffered" : "Direct"; });

TEST(LargeElement, IsWrittenReadUpdatedAndSteppedOverInMemory)
{
  const uint64_t size = (huge() ? 3072 : 24) * kMiB;
  const Block payload = zeros(size);
  ASSERT_NE(payload, nullptr);
  payload.get()[size - 1] = 0x5A;
  const uint64_t blockSize = size + 4096;
  const Block block = zeros(blockSize);
  ASSERT_NE(block, nullptr);
  TAVSSMemory memory(block.get(), blockSize);
  {
    Handle writer(memory, TAV_OPT_WRITE, {});
    TAVHeaderData data = group64(TAV_ELM_CMN_SYSTEM).data();
    check(tavAddElement(0, writer.get(), &data), "root");
    data = {header64(size, TAV_TYPE_BINARY, 7, TAV_INFO_EYE_SIZE), payload.get(), size, 0};
    check(tavAddElement(0, writer.get(), &data), "element");
    Element last = u32(8, 9, true, TAV_INFO_EYE_SIZE);
    data = last.data();
    check(tavAddElement(0, writer.get(), &data), "last");
    check(tavCloseHeader(0, writer.get()), "close");
    EXPECT_EQ(writer->streamBytes, 16 + 16 + size + 16 + 16 + 4 + 16);
  }
  Handle reader(memory, TAV_OPT_READ, {});
  TAVHeaderData root{};
  TAVHeaderData large{};
  TAVHeaderData last{};
  ASSERT_EQ(tavGetNextChild(0, reader.get(), nullptr, nullptr, &root), TAV_RC_OK);
  ASSERT_EQ(tavGetNextChild(0, reader.get(), &root.header, nullptr, &large), TAV_RC_OK);
  EXPECT_EQ(large.header.hdr64.size, size);
  EXPECT_EQ(large.pDataBuf[size - 1], 0x5A);
  ASSERT_EQ(tavGetNextChild(0, reader.get(), &root.header, &large.header, &last), TAV_RC_OK);
  TAVHeaderData before{};
  ASSERT_EQ(tavGetPrevNode(0, reader.get(), &last, &before), TAV_RC_OK);
  EXPECT_EQ(before.header.nodeOffset, large.header.nodeOffset);
  EXPECT_EQ(tavFindNodeFromIndex(0, reader.get(), 100, 0, &before), TAV_RC_OK);
  EXPECT_EQ(before.header.nodeOffset, large.header.nodeOffset);
}

/// Keeps nothing: what a stream that is larger than memory needs is seen without the stream.
class Nowhere : public TAVSideStorage
{
public:
  Nowhere()
      : TAVSideStorage(0, VectorStorage::kReadWrite)
  {
    ioUnit = 64 * 1024;
  }
  uint32_t seek(uint64_t offset, uint64_t) override { return position_ = offset, TAV_RC_OK; }
  uint32_t getPosition(uint64_t* pPosition) override { return *pPosition = position_, TAV_RC_OK; }
  uint32_t getTotalSize(uint64_t* pSize) override { return *pSize = size_, TAV_RC_OK; }
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool, bool) override
  {
    *pRead = std::min({wanted, bufSize, position_ < size_ ? size_ - position_ : 0});
    std::memset(*ppData, 0, *pRead);
    position_ += *pRead;
    return *pRead < wanted ? TAV_RC_END_OF_STORAGE : TAV_RC_OK;
  }
  uint32_t write(const void*, uint64_t size, uint64_t* pWritten) override
  {
    position_ += * pWritten = size;
    size_ = std::max(size_, position_);
    return TAV_RC_OK;
  }
  uint32_t getMemory(void**, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t lock(uint32_t) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t unlock() override { return TAV_RC_NOT_SUPPORTED; }

private:
  uint64_t position_ = 0;
  uint64_t size_ = 0;
};

TEST(Memory, OfAWriterIsItsRingAndAConstantHoweverLongTheStream)
{
  Nowhere storage;
  Form form;
  form.ringBytes = kMiB;
  const uint64_t before = peakKibibytes();
  Handle writer(storage, TAV_OPT_WRITE, form);
  Bytes payload(1000, 7);
  TAVHeaderData data = group64(TAV_ELM_CMN_SYSTEM).data();
  check(tavAddElement(0, writer.get(), &data), "root");
  const uint64_t length = (huge() ? 8192 : 192) * kMiB;
  while (writer->streamBytes < length)
  {
    data = {header64(payload.size(), TAV_TYPE_BINARY, 7, TAV_INFO_EYE_SIZE), payload.data(), payload.size(), 0};
    check(tavAddElement(0, writer.get(), &data), "element");
  }
  check(tavCloseHeader(0, writer.get()), "close");
  EXPECT_LT(peakKibibytes() - before, 1024U + 4096U) << "a ring of 1 MiB, a header stack, and what is around them";
}

} // namespace
