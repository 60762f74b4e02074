#include "tav/kor.h"

#include "support/failingNew.h"
#include "support/traceLog.h"
#include "trace/traceFrame.h"

#include <array>
#include <atomic>
#include <chrono>
#include <future>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <memory>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace
{
using test::Record;
using test::TraceLog;
using testing::ElementsAre;
using testing::SizeIs;

constexpr uint32_t kThread = 77;
constexpr uint32_t kProbe = 0x088A0007;

MATCHER_P(RecordIs, expected, "")
{
  return arg.kind == expected.kind && arg.threadId == expected.threadId && arg.probe == expected.probe &&
         arg.point == expected.point && arg.code == expected.code && arg.items == expected.items;
}

/// A triple of the hooks with variables.
#define ITEM(pointer, length) uint32_t{0}, static_cast<uint64_t>(length), static_cast<const void*>(pointer)

void count(void* context, const KORTraceRecord*)
{
  static_cast<std::atomic<int>*>(context)->fetch_add(1);
}

TEST(TraceStart, SwitchesTheControlBlockOn)
{
  std::atomic<int> records{0};
  ASSERT_EQ(korTraceStart(count, &records), TAV_RC_OK);
  ASSERT_NE(g_pWTCB, nullptr);
  EXPECT_NE(g_pWTCB->enable, 0u);
  EXPECT_TRUE(tav::inside::tracing());
  korTraceStop();
}

TEST(TraceStart, NeedsASink)
{
  EXPECT_EQ(korTraceStart(nullptr, nullptr), TAV_RC_BAD_PARAM);
  EXPECT_EQ(korTraceStop(), KOR_RC_TRACE_INACTIVE);
}

TEST(TraceStart, IsRefusedWhileATraceRuns)
{
  TraceLog recorder;
  std::atomic<int> others{0};
  EXPECT_EQ(korTraceStart(count, &others), KOR_RC_TRACE_ACTIVE);
  _wtraceEntry(kThread, kProbe, 0, 0);
  EXPECT_THAT(recorder.records(), SizeIs(1));
  EXPECT_EQ(others.load(), 0);
}

TEST(TraceStart, WorksAgainAfterAStop)
{
  std::atomic<int> first{0};
  ASSERT_EQ(korTraceStart(count, &first), TAV_RC_OK);
  ASSERT_EQ(korTraceStop(), TAV_RC_OK);
  TraceLog second;
  _wtraceEntry(kThread, kProbe, 0, 0);
  EXPECT_THAT(second.records(), SizeIs(1));
}

TEST(TraceStop, SwitchesTheControlBlockOff)
{
  std::atomic<int> records{0};
  ASSERT_EQ(korTraceStart(count, &records), TAV_RC_OK);
  EXPECT_EQ(korTraceStop(), TAV_RC_OK);
  ASSERT_NE(g_pWTCB, nullptr);
  EXPECT_EQ(g_pWTCB->enable, 0u);
  EXPECT_FALSE(tav::inside::tracing());
}

TEST(TraceStop, IsRefusedWhenNoTraceRuns)
{
  EXPECT_EQ(korTraceStop(), KOR_RC_TRACE_INACTIVE);
}

TEST(TraceStop, IsRefusedTheSecondTime)
{
  std::atomic<int> records{0};
  ASSERT_EQ(korTraceStart(count, &records), TAV_RC_OK);
  EXPECT_EQ(korTraceStop(), TAV_RC_OK);
  EXPECT_EQ(korTraceStop(), KOR_RC_TRACE_INACTIVE);
}

TEST(TraceHooks, DropRecordsWhenNoTraceRuns)
{
  std::atomic<int> records{0};
  ASSERT_EQ(korTraceStart(count, &records), TAV_RC_OK);
  ASSERT_EQ(korTraceStop(), TAV_RC_OK);
  const uint32_t code = TAV_RC_NOT_FOUND;
  _wtraceEntry(kThread, kProbe, 0, 1000000);
  _wtraceVar(kThread, kProbe, 0, 3, 1, ITEM("x", 1));
  _wtraceErrorVar(kThread, kProbe, 10, 4, 0, 1, ITEM(&code, 4));
  _wtraceExit(kThread, kProbe, &code, 0);
  EXPECT_EQ(records.load(), 0);
}

TEST(TraceHooks, AnEntryTellsThreadAndProbe)
{
  TraceLog recorder;
  _wtraceEntry(kThread, kProbe, 0, 1000000);
  EXPECT_THAT(recorder.records(), ElementsAre(RecordIs(Record{KOR_TRACE_ENTRY, kThread, kProbe, 0, 0, {}})));
}

TEST(TraceHooks, AnExitTellsTheCode)
{
  TraceLog recorder;
  const uint32_t code = TAV_RC_WRONG_MODE;
  _wtraceExit(kThread, kProbe, &code, 0);
  EXPECT_THAT(recorder.records(),
              ElementsAre(RecordIs(Record{KOR_TRACE_EXIT, kThread, kProbe, 0, TAV_RC_WRONG_MODE, {}})));
}

TEST(TraceHooks, AnExitWithoutAResultIsASuccess)
{
  TraceLog recorder;
  _wtraceExit(kThread, kProbe, nullptr, 0);
  EXPECT_THAT(recorder.records(), ElementsAre(RecordIs(Record{KOR_TRACE_EXIT, kThread, kProbe, 0, TAV_RC_OK, {}})));
}

TEST(TraceHooks, AnErrorTellsPointAndCode)
{
  TraceLog recorder;
  const uint32_t code = TAV_RC_BAD_PARAM;
  _wtraceErrorVar(kThread, kProbe, 20, 4, 0, 1, ITEM(&code, sizeof code));
  const std::string bytes(reinterpret_cast<const char*>(&code), sizeof code);
  EXPECT_THAT(recorder.records(),
              ElementsAre(RecordIs(Record{KOR_TRACE_ERROR, kThread, kProbe, 20, TAV_RC_BAD_PARAM, {bytes}})));
}

TEST(TraceHooks, AnErrorWhoseItemIsNoCodeTellsNone)
{
  TraceLog recorder;
  _wtraceErrorVar(kThread, kProbe, 20, 4, 0, 1, ITEM("ab", 2));
  EXPECT_THAT(recorder.records(), ElementsAre(RecordIs(Record{KOR_TRACE_ERROR, kThread, kProbe, 20, 0, {"ab"}})));
}

TEST(TraceHooks, VariablesComeInTheirOrder)
{
  TraceLog recorder;
  _wtraceVar(kThread, kProbe, 100, 3, 3, ITEM("first", 5), ITEM("", 0), ITEM("third", 5));
  EXPECT_THAT(recorder.records(),
              ElementsAre(RecordIs(Record{KOR_TRACE_VAR, kThread, kProbe, 100, 0, {"first", "", "third"}})));
}

TEST(TraceHooks, ARecordMayHaveNoVariables)
{
  TraceLog recorder;
  _wtraceVar(kThread, kProbe, 1, 3, 0);
  EXPECT_THAT(recorder.records(), ElementsAre(RecordIs(Record{KOR_TRACE_VAR, kThread, kProbe, 1, 0, {}})));
}

const char* const kDigits = "0123456789abcdefg";

void traceSeventeenItems()
{
  const char* const d = kDigits;
  _wtraceVar(kThread, kProbe, 0, 3, 17, ITEM(d, 1), ITEM(d + 1, 1), ITEM(d + 2, 1), ITEM(d + 3, 1), ITEM(d + 4, 1),
             ITEM(d + 5, 1), ITEM(d + 6, 1), ITEM(d + 7, 1), ITEM(d + 8, 1), ITEM(d + 9, 1), ITEM(d + 10, 1),
             ITEM(d + 11, 1), ITEM(d + 12, 1), ITEM(d + 13, 1), ITEM(d + 14, 1), ITEM(d + 15, 1), ITEM(d + 16, 1));
}

TEST(TraceHooks, MoreThanSixteenVariablesAllArrive)
{
  TraceLog recorder;
  traceSeventeenItems();
  const std::vector<Record> records = recorder.records();
  ASSERT_THAT(records, SizeIs(1));
  std::string joined;
  for (const std::string& item : records[0].items) joined += item;
  EXPECT_EQ(joined, kDigits);
}

TEST(TraceHooks, WithoutMemoryTheFirstSixteenVariablesArrive)
{
  uint32_t items = 0;
  const auto sink = [](void* context, const KORTraceRecord* record) {
    *static_cast<uint32_t*>(context) = record->itemCount;
  };
  ASSERT_EQ(korTraceStart(sink, &items), TAV_RC_OK);
  {
    const allocations::AllFail fail;
    traceSeventeenItems();
  }
  korTraceStop();
  EXPECT_EQ(items, 16u);
}

TEST(TraceFrame, TellsItsCallFromEntryToExit)
{
  TraceLog recorder;
  {
    tav::inside::TraceFrame frame(kProbe);
    EXPECT_FALSE(frame.require(10, false, TAV_RC_BAD_PARAM));
  }
  std::vector<KORTraceKind> kinds;
  for (const Record& record : recorder.records())
  {
    kinds.push_back(record.kind);
    EXPECT_EQ(record.threadId, static_cast<uint32_t>(korThreadID()));
  }
  EXPECT_THAT(kinds, ElementsAre(KOR_TRACE_ENTRY, KOR_TRACE_ERROR, KOR_TRACE_EXIT));
}

/// What a sink does with the trace that it serves, and what came of it.
struct Meddler
{
  int calls = 0;
  uint32_t stopCode = TAV_RC_OK;
  uint32_t startCode = TAV_RC_OK;
};

void stopInside(void* context, const KORTraceRecord*)
{
  auto* const meddler = static_cast<Meddler*>(context);
  ++meddler->calls;
  meddler->stopCode = korTraceStop();
}

void restartInside(void* context, const KORTraceRecord*)
{
  auto* const meddler = static_cast<Meddler*>(context);
  ++meddler->calls;
  meddler->stopCode = korTraceStop();
  meddler->startCode = korTraceStart(restartInside, context);
}

void traceInside(void* context, const KORTraceRecord*)
{
  ++static_cast<Meddler*>(context)->calls;
  _wtraceEntry(kThread, kProbe + 1, 0, 0);
}

TEST(TraceSink, MayStopTheTraceAndStartAnother)
{
  struct Row
  {
    KORTraceSink sink;
    int calls;
    uint32_t atTheEnd; ///< what stopping gives
  };
  for (const Row& row : {Row{stopInside, 1, KOR_RC_TRACE_INACTIVE}, Row{restartInside, 2, TAV_RC_OK}})
  {
    Meddler meddler;
    ASSERT_EQ(korTraceStart(row.sink, &meddler), TAV_RC_OK);
    _wtraceEntry(kThread, kProbe, 0, 0);
    _wtraceEntry(kThread, kProbe, 0, 0);
    EXPECT_EQ(meddler.calls, row.calls);
    EXPECT_EQ(meddler.stopCode, TAV_RC_OK);
    EXPECT_EQ(meddler.startCode, TAV_RC_OK);
    EXPECT_EQ(korTraceStop(), row.atTheEnd);
  }
}

TEST(TraceSink, IsNotToldOfItsOwnCalls)
{
  Meddler meddler;
  ASSERT_EQ(korTraceStart(traceInside, &meddler), TAV_RC_OK);
  _wtraceEntry(kThread, kProbe, 0, 0);
  korTraceStop();
  EXPECT_EQ(meddler.calls, 1);
}

/// A sink that stays inside until it is told to leave.
struct Gate
{
  std::promise<void> entered;
  std::promise<void> leave;
  std::atomic<bool> left{false};
};

void waitAtGate(void* context, const KORTraceRecord*)
{
  auto* const gate = static_cast<Gate*>(context);
  gate->entered.set_value();
  gate->leave.get_future().wait();
  gate->left = true;
}

TEST(TraceStop, WaitsForACallOfTheSinkInAnotherThread)
{
  Gate gate;
  ASSERT_EQ(korTraceStart(waitAtGate, &gate), TAV_RC_OK);
  std::thread traced([] { _wtraceEntry(kThread, kProbe, 0, 0); });
  gate.entered.get_future().wait();

  std::future<bool> stopped = std::async(std::launch::async, [&gate] {
    korTraceStop();
    return gate.left.load();
  });
  EXPECT_EQ(stopped.wait_for(std::chrono::milliseconds(50)), std::future_status::timeout);
  gate.leave.set_value();
  EXPECT_TRUE(stopped.get());
  traced.join();
}

TEST(TraceStop, DoesNotWaitForCallsOfALaterTrace)
{
  Gate first;
  Gate second;
  ASSERT_EQ(korTraceStart(waitAtGate, &first), TAV_RC_OK);
  std::thread tracedFirst([] { _wtraceEntry(kThread, kProbe, 0, 0); });
  first.entered.get_future().wait();
  std::future<uint32_t> stopped = std::async(std::launch::async, korTraceStop);
  while (tav::inside::tracing()) std::this_thread::yield();

  ASSERT_EQ(korTraceStart(waitAtGate, &second), TAV_RC_OK);
  std::thread tracedSecond([] { _wtraceEntry(kThread, kProbe, 0, 0); });
  second.entered.get_future().wait();
  first.leave.set_value();
  EXPECT_EQ(stopped.get(), TAV_RC_OK);
  EXPECT_FALSE(second.left.load());

  second.leave.set_value();
  EXPECT_EQ(korTraceStop(), TAV_RC_OK);
  EXPECT_TRUE(second.left.load());
  tracedFirst.join();
  tracedSecond.join();
}

/// A sink that holds the first caller back and stops the trace in the second.
struct TwoCallers
{
  std::atomic<int> callers{0};
  std::promise<void> firstIn;
  std::promise<void> firstLeaves;
  uint32_t stopCode = UINT32_MAX;
};

void stopAsSecondCaller(void* context, const KORTraceRecord*)
{
  auto* const callers = static_cast<TwoCallers*>(context);
  if (callers->callers.fetch_add(1) == 0)
  {
    callers->firstIn.set_value();
    callers->firstLeaves.get_future().wait();
  }
  else
  {
    callers->stopCode = korTraceStop();
  }
}

TEST(TraceStop, FromInsideASinkDoesNotWaitForOtherThreads)
{
  TwoCallers callers;
  ASSERT_EQ(korTraceStart(stopAsSecondCaller, &callers), TAV_RC_OK);
  std::thread first([] { _wtraceEntry(kThread, kProbe, 0, 0); });
  callers.firstIn.get_future().wait();
  _wtraceEntry(kThread, kProbe, 0, 0); // would not come back if it waited
  EXPECT_EQ(callers.stopCode, TAV_RC_OK);
  callers.firstLeaves.set_value();
  first.join();
}

/// A context that is gone as soon as its trace was stopped. `records` is plain on purpose: each thread counts
/// under the mutex, and the reader after the stop needs none.
struct ShortLived
{
  std::mutex mutex;
  int records = 0;
};

void countShortLived(void* context, const KORTraceRecord*)
{
  auto* const shortLived = static_cast<ShortLived*>(context);
  const std::lock_guard<std::mutex> guard(shortLived->mutex);
  ++shortLived->records;
}

TEST(Trace, StartsAndStopsWhileOtherThreadsTrace)
{
  std::atomic<bool> done{false};
  std::atomic<int> calls{0};
  std::vector<std::thread> threads;
  threads.reserve(8);
  for (int t = 0; t < 3; ++t)
  {
    threads.emplace_back([&done, &calls] {
      while (!done.load())
      {
        tav::inside::TraceFrame frame(kProbe);
        frame.dump(0, uint64_t{7});
        frame.report(10, TAV_RC_NOT_FOUND);
        calls.fetch_add(1);
      }
    });
  }

  int failures = 0;
  int64_t records = 0;
  for (int round = 0; round < 200; ++round)
  {
    auto context = std::make_unique<ShortLived>();
    failures += korTraceStart(countShortLived, context.get()) != TAV_RC_OK;
    const int before = calls.load();
    while (calls.load() < before + 4) std::this_thread::yield();
    failures += korTraceStop() != TAV_RC_OK;
    records += context->records;
  }
  done = true;
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(failures, 0);
  EXPECT_GT(records, 0);
}

TEST(Trace, TwoThreadsThatStartAtATimeGetOneTrace)
{
  for (int round = 0; round < 100; ++round)
  {
    std::atomic<int> records{0};
    std::atomic<int> started{0};
    const auto start = [&] { started += korTraceStart(count, &records) == TAV_RC_OK; };
    std::thread one(start);
    std::thread two(start);
    one.join();
    two.join();
    EXPECT_EQ(started.load(), 1);
    EXPECT_EQ(korTraceStop(), TAV_RC_OK);
  }
}
} // namespace
