/// Handles, storages and rings of their own in several threads, while another switches the trace on and off.
#include <atomic>
#include <gtest/gtest.h>
#include <string>
#include <thread>
#include <vector>

#include "support/streams.h"
#include "tav/tav.h"

namespace
{

using namespace test;

constexpr unsigned kThreads = 8;
constexpr uint64_t kRounds = 40;

Bytes writeOne(const Form& form, uint8_t seed)
{
  StreamWriter writer(form);
  writer.add(group64(TAV_ELM_CMN_SYSTEM));
  for (uint8_t i = 0; i < 12; ++i)
  {
    writer.add(group64(TAV_ELM_CMN_HOST, TAV_TYPE_HEADER64, TAV_INFO_EYE_SIZE));
    writer.add(u32(TAV_ELM_CMN_CPU_SPEED, seed + i, true, TAV_INFO_EYE_SIZE));
    writer.add(binary(TAV_ELM_CMN_MACHINE_ID, Bytes(20U + i, seed), true, TAV_INFO_EYE_SIZE));
    writer.close();
  }
  writer.close();
  return writer.bytes();
}

/// All that a reader does, as one text.
std::string readOne(const Bytes& stream, const Form& form)
{
  StreamReader reader(stream, form, 32);
  TAVHandle* const handle = reader.handle();
  TAVHeaderData root{};
  check(tavGetNextChild(0, handle, nullptr, nullptr, &root), "tavGetNextChild");
  check(tavValidateHierarchy(0, handle, &root.header), "tavValidateHierarchy");
  TAVHeaderData found{};
  // Not found where payloads are padded: no pair counts that.
  const uint32_t rc = tavFindNodeFromIndex(0, handle, 30, 0, &found);
  std::string text = std::to_string(rc) + ' ' + std::to_string(found.header.nodeOffset) + ' ';
  TAVHdrStack stack;
  check(tavFindElmInt(handle, &root.header, 0, 0, 0, TAV_ELM_CMN_HOST, nullptr, &stack, &found), "tavFindElmInt");
  text += std::to_string(found.header.nodeOffset) + ' ';
  char piece[200];
  TAVPrintParam param{0, piece, sizeof piece, nullptr};
  uint64_t printed = 0;
  check(tavPrintSubtree(TAV_PRINT_SUBTREE | TAV_PRINT_DATA, handle, &root, &param, &printed), "tavPrintSubtree");
  return text + std::to_string(printed);
}

/// Switches the trace on and off until it is told to stop. The sink counts.
class TraceSwitch
{
public:
  TraceSwitch()
      : thread_([this] { run(); }) {}
  ~TraceSwitch() { stop(); }
  TraceSwitch(const TraceSwitch&) = delete;
  TraceSwitch& operator=(const TraceSwitch&) = delete;

  void stop()
  {
    ended_ = true;
    if (thread_.joinable())
    {
      thread_.join();
    }
  }

  std::atomic<uint64_t> records{0};
  std::atomic<uint64_t> switches{0};

private:
  static void sink(void* context, const KORTraceRecord* record)
  {
    auto& self = *static_cast<TraceSwitch*>(context);
    self.records += record->probe != 0 ? 1 : 0;
  }
  void run()
  {
    while (!ended_)
    {
      EXPECT_EQ(korTraceStart(&TraceSwitch::sink, this), TAV_RC_OK);
      std::this_thread::yield();
      EXPECT_EQ(korTraceStop(), TAV_RC_OK);
      ++switches;
    }
  }

  std::atomic<bool> ended_{false};
  std::thread thread_;
};

Form formOf(unsigned thread)
{
  Form form;
  form.buffered = thread % 2 == 1;
  form.swap = thread % 4 >= 2;
  form.align = thread >= 4;
  return form;
}

/// What each thread makes, alone.
struct Expected
{
  Bytes stream;
  std::string text;
};

/// Goes on until the trace was on meanwhile: on a busy machine its thread may get a processor late.
void work(unsigned thread, const Expected& expected, const TraceSwitch& trace, std::atomic<uint64_t>& differences)
{
  const Form form = formOf(thread);
  for (uint64_t round = 0; round < kRounds || (trace.records == 0 && round < 1000 * kRounds); ++round)
  {
    const Bytes stream = writeOne(form, static_cast<uint8_t>(thread));
    const bool same = stream == expected.stream && readOne(stream, form) == expected.text;
    differences += same ? 0 : 1;
  }
}

TEST(HandlesOfTheirOwn, InEightThreadsDoNotMeetWhileANinthSwitchesTheTrace)
{
  std::vector<Expected> expected(kThreads);
  for (unsigned i = 0; i < kThreads; ++i)
  {
    expected[i].stream = writeOne(formOf(i), static_cast<uint8_t>(i));
    expected[i].text = readOne(expected[i].stream, formOf(i));
  }
  TraceSwitch trace;
  std::atomic<uint64_t> differences{0};
  std::vector<std::thread> threads;
  for (unsigned i = 0; i < kThreads; ++i)
  {
    threads.emplace_back([i, &expected, &trace, &differences] {
      try
      {
        work(i, expected[i], trace, differences);
      }
      catch (const std::exception& error)
      {
        ADD_FAILURE() << error.what();
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  trace.stop();
  EXPECT_EQ(differences, 0U);
  EXPECT_GT(trace.switches, 0U);
  EXPECT_GT(trace.records, 0U) << "the trace was on while they worked";
}

/// Reserved blocks of all threads are in one registry.
TEST(HandlesOfTheirOwn, NestDeeplyInEightThreads)
{
  std::vector<std::thread> threads;
  std::atomic<uint64_t> deepest{0};
  for (unsigned i = 0; i < kThreads; ++i)
  {
    threads.emplace_back([&deepest] {
      for (int round = 0; round < 5; ++round)
      {
        TAVHdrStack stack;
        const TAVHeader header = header64(0, TAV_TYPE_HEADER64, 1);
        uint64_t count = 0;
        while (stack.push(&header) == TAV_RC_OK) ++count;
        if (count == 4000)
        {
          ++deepest;
        }
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(deepest, 5U * kThreads);
}

} // namespace
