/// The C++ layer over a storage of the user's own, each call of which fails once, in turn.
#include <memory>
#include <string>
#include <system_error>
#include <vector>

#include <gtest/gtest.h>

#include "support/failingNew.h"
#include "support/vectorStorage.h"
#include "tav/tav.hpp"

namespace
{

using namespace test;

constexpr uint64_t kPage = 64;
constexpr uint32_t kHosts = 12;

tav::StreamOptions options()
{
  return {.ringBytes = 3 * kPage};
}

/// Runs an operation; when it fails, checks the error and runs it again on the healthy storage.
template<class Operation>
void twice(uint64_t& failures, Operation&& operation)
{
  std::error_code ec;
  operation(ec);
  if (!ec)
  {
    return;
  }
  ++failures;
  EXPECT_EQ(ec.category(), tav::category());
  operation(ec);
  EXPECT_FALSE(ec) << "the second attempt: " << ec.message();
}

uint64_t write(VectorStorage& storage)
{
  uint64_t failures = 0;
  tav::Writer writer(storage, options());
  std::unique_ptr<tav::Group> root;
  twice(failures, [&](std::error_code& ec) {
    root = std::make_unique<tav::Group>(writer.group(TAV_ELM_CMN_SYSTEM, {.eyeSize = true}, ec));
  });
  for (uint32_t i = 0; i < kHosts; ++i)
  {
    std::unique_ptr<tav::Group> host;
    twice(failures, [&](std::error_code& ec) {
      host = std::make_unique<tav::Group>(root->group(TAV_ELM_CMN_HOST, {.eyeSize = true}, ec));
    });
    twice(failures, [&](std::error_code& ec) { host->add(TAV_ELM_CMN_CPU_SPEED, i, {.eyeSize = true}, ec); });
    twice(failures, [&](std::error_code& ec) { host->add(TAV_ELM_CMN_HOST_NAME, std::string(20 + i, 'a'), ec); });
    twice(failures, [&](std::error_code& ec) { host->close(ec); });
  }
  twice(failures, [&](std::error_code& ec) { root->close(ec); });
  twice(failures, [&](std::error_code& ec) { writer.finish(ec); });
  return failures;
}

/// The numbers in the stream, in their order.
std::vector<uint32_t> numbers(VectorStorage& storage, std::error_code& ec)
{
  std::vector<uint32_t> found;
  const tav::Reader reader(storage, options(), ec);
  if (ec)
  {
    return found;
  }
  const tav::Node root = reader.root(ec);
  if (ec)
  {
    return found;
  }
  for (const tav::Node& node : root.descendants(ec))
  {
    if (node.elm() != TAV_ELM_CMN_CPU_SPEED)
    {
      continue;
    }
    std::error_code valueError;
    found.push_back(node.as<uint32_t>(valueError));
    if (valueError)
    {
      ec = valueError;
      return found;
    }
  }
  return found;
}

std::vector<uint32_t> expectedNumbers()
{
  std::vector<uint32_t> all(kHosts);
  for (uint32_t i = 0; i < kHosts; ++i) all[i] = i;
  return all;
}

TEST(LayerOverAFailingStorage, WritesEverythingAtTheSecondAttempt)
{
  VectorStorage healthy(kPage);
  ASSERT_EQ(write(healthy), 0U);
  const uint64_t calls = healthy.calls();
  uint64_t failures = 0;
  for (uint64_t nth = 1; nth <= calls && !HasFailure(); ++nth)
  {
    SCOPED_TRACE("call " + std::to_string(nth) + " of " + std::to_string(calls));
    VectorStorage storage(kPage);
    storage.failAt(nth, KOR_RC_IO_ERROR);
    failures += write(storage);
    std::error_code ec;
    EXPECT_EQ(numbers(storage, ec), expectedNumbers());
    EXPECT_FALSE(ec) << ec.message();
  }
  EXPECT_GT(failures, calls / 2) << "most failures were told";
}

TEST(LayerOverAFailingStorage, ReadsEverythingAtTheSecondAttempt)
{
  VectorStorage storage(kPage);
  write(storage);
  storage.attributes = VectorStorage::kReadOnly;
  std::error_code ec;
  const uint64_t before = storage.calls();
  ASSERT_EQ(numbers(storage, ec), expectedNumbers());
  const uint64_t calls = storage.calls() - before;
  int64_t blocks = 0;
  for (uint64_t nth = 1; nth <= calls && !HasFailure(); ++nth)
  {
    SCOPED_TRACE("call " + std::to_string(nth) + " of " + std::to_string(calls));
    storage.failAt(nth, KOR_RC_IO_ERROR);
    const std::vector<uint32_t> found = numbers(storage, ec);
    EXPECT_TRUE(ec) << "a walk that did not see all of it ends with an error";
    EXPECT_LT(found.size(), kHosts + 1U);
    EXPECT_EQ(numbers(storage, ec), expectedNumbers());
    EXPECT_FALSE(ec) << ec.message();
    if (nth == 1)
    {
      blocks = allocations::live(); // what the test's own first time takes is taken
    }
  }
  EXPECT_EQ(allocations::live(), blocks) << "nothing leaks";
}

} // namespace
