#include <gtest/gtest.h>

#include "tools/host/host.h"
#include "tools/host/machine.h"

namespace
{
using namespace tav::host;

TEST(Machine, TellsItsSystemAndItsProcessors)
{
  const MachineFacts facts = describeMachine();
  EXPECT_FALSE(facts.osName.empty());
  EXPECT_FALSE(facts.machine.empty());
  ASSERT_TRUE(facts.cpu.online.has_value());
  EXPECT_GE(*facts.cpu.online, 1U);
}

TEST(Machine, HasNoMoreFreeMemoryThanMemory)
{
  const MachineFacts facts = describeMachine();
  ASSERT_TRUE(facts.memory.total.has_value());
  ASSERT_TRUE(facts.memory.free.has_value());
  EXPECT_GT(*facts.memory.total, 1U << 20U) << "in bytes";
  EXPECT_LE(*facts.memory.free, *facts.memory.total);
}

TEST(PathOfAText, IsThatTextAgain)
{
  const std::string name = "gr\xC3\xBC\xC3\x9F \xE6\x96\x87";
  EXPECT_EQ(textOf(pathOf(name)), name);
}

} // namespace
