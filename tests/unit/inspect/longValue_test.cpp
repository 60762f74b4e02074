/// Payloads that memory cannot have, as there are where addresses have 32 bits and files of more than 4 GB.
#include <algorithm>
#include <cstring>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"
#include "support/vectorStorage.h"
#include "tav/inspect/table.hpp"

using namespace tav::inspect;
using testing::Each;
using testing::HasSubstr;
using testing::SizeIs;

namespace
{

/// Where a cast to the size of memory would leave 6 bytes of it, or more than any buffer can have.
constexpr uint64_t kTooLong = sizeof(size_t) == 4 ? (uint64_t{1} << 32U) + 6 : (uint64_t{1} << 63U) + 6;
constexpr uint64_t kHeader = 16;

/// Bytes, with zeros behind them up to a size that nothing could have.
class LongStorage : public test::VectorStorage
{
public:
  LongStorage(std::vector<uint8_t> content, uint64_t size)
      : VectorStorage(0x1000, std::move(content), kReadOnly), size_(size) {}

  uint32_t getTotalSize(uint64_t* pSize) override
  {
    *pSize = size_;
    return TAV_RC_OK;
  }

  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool, bool) override
  {
    const uint64_t count = std::min({wanted, bufSize, size_ - std::min(size_, position)});
    auto* const out = static_cast<uint8_t*>(*ppData);
    for (uint64_t i = 0; i < count; ++i)
    {
      out[i] = position + i < bytes.size() ? bytes[static_cast<size_t>(position + i)] : 0;
    }
    position += count;
    *pRead = count;
    return count < wanted ? TAV_RC_END_OF_STORAGE : TAV_RC_OK;
  }

private:
  uint64_t size_;
};

/// A root with one element of `kTooLong` bytes.
class LongValue : public testing::TestWithParam<uint16_t>
{
protected:
  LongValue()
  {
    tav::Writer writer;
    {
      auto root = writer.group(TAV_ELM_CMN_SYSTEM);
      root.add(TAV_ELM_CMN_HOST_NAME, "abcdefghijklmnopqrstuvwx");
    }
    writer.finish();
    const std::span<const std::byte> made = writer.bytes();
    std::vector<uint8_t> content(made.size());
    std::memcpy(content.data(), made.data(), made.size());
    const uint64_t around = kTooLong + kHeader;
    const uint16_t type = GetParam();
    std::memcpy(content.data(), &around, sizeof around);
    std::memcpy(content.data() + kHeader, &kTooLong, sizeof kTooLong);
    std::memcpy(content.data() + kHeader + 12, &type, sizeof type);
    source = std::make_unique<ByteSource>("long", std::make_unique<LongStorage>(content, around + kHeader));
  }

  Node element()
  {
    Walker walker(*source, form);
    for (Event event; walker.next(event);)
    {
      if (event.what == What::nodeBegin && !event.node.isGroup())
      {
        return event.node;
      }
    }
    ADD_FAILURE() << "there is no element";
    return {};
  }

  /// What a piece of work throws.
  template<class Work>
  static std::optional<Problem> problemOf(const Work& work)
  {
    try
    {
      work();
    }
    catch (const Error& error)
    {
      return error.problem();
    }
    return std::nullopt;
  }

  Form form{.swapped = false, .root64 = true, .aligned = false};
  std::unique_ptr<ByteSource> source;
};

} // namespace

TEST_P(LongValue, IsShownByItsFirstBytes)
{
  const Node node = element();
  ASSERT_EQ(node.size(), kTooLong);
  EXPECT_THAT(payloadBytes(*source, form, node, 7), SizeIs(7));
  std::string text;
  appendValueText(text, *source, form, node, 20);
  EXPECT_THAT(text, HasSubstr(" ..."));
}

TEST_P(LongValue, IsRefusedAsAWholeAndNotCutWithoutAWord)
{
  const Node node = element();
  const auto whole = ~uint64_t{0};
  const std::vector<std::optional<Problem>> problems = {
      problemOf([&] { static_cast<void>(payloadBytes(*source, form, node, whole)); }),
      problemOf([&] { static_cast<void>(plainText(*source, form, node, whole)); }),
      problemOf([&] {
        const auto stopped = readTable(*source, form, {"/system", {{"name", "*"}}});
        static_cast<void>(stopped);
      })};
  for (const std::optional<Problem>& problem : problems)
  {
    ASSERT_TRUE(problem.has_value());
    EXPECT_EQ(problem->code, TAV_RC_NO_MEMORY);
    EXPECT_EQ(problem->offset, 2 * kHeader);
    EXPECT_THAT(problem->sentence, HasSubstr(std::to_string(kTooLong)));
  }
}

INSTANTIATE_TEST_SUITE_P(Types, LongValue,
                         testing::Values(TAV_TYPE_BINARY, TAV_TYPE_ASCII_STRING, TAV_TYPE_UTF8_STRING));
