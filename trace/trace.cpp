#include <array>
#include <atomic>
#include <cstdarg>
#include <cstring>
#include <memory>
#include <mutex>
#include <new>

#include "kor/lock.h"
#include "kor/shared.h"
#include "tav/kor.h"

extern "C" {
KORTraceCB* g_pWTCB = nullptr;
}

namespace
{
using tav::kor::Lock;
using tav::kor::store;

class ActiveCall;

/// Constant-initialised and never torn down: threads may trace before and after all static objects live.
struct Tracer
{
  Lock lock; ///< guards all but `finished`; never held while a sink runs
  KORTraceSink sink = nullptr;
  void* context = nullptr;
  uint64_t session = 0;              ///< counts the starts
  ActiveCall* firstActive = nullptr; ///< the calls of sinks that are under way
  std::atomic<uint32_t> finished{0}; ///< changes whenever such a call ends
};

constinit Tracer tracer;
constinit KORTraceCB controlBlock{};
constinit thread_local bool insideSink = false;

/// One call of the sink, known to `korTraceStop` for as long as it lives. Records made by a sink itself find no
/// sink: delivering them would never end.
class ActiveCall
{
public:
  ActiveCall()
  {
    if (insideSink)
    {
      return;
    }
    const std::lock_guard<Lock> guard(tracer.lock);
    sink_ = tracer.sink;
    if (sink_ == nullptr)
    {
      return;
    }
    context_ = tracer.context;
    session_ = tracer.session;
    next_ = tracer.firstActive;
    if (next_ != nullptr)
    {
      next_->previous_ = this;
    }
    tracer.firstActive = this;
  }

  ~ActiveCall()
  {
    if (sink_ == nullptr)
    {
      return;
    }
    insideSink = false;
    {
      const std::lock_guard<Lock> guard(tracer.lock);
      if (previous_ != nullptr)
        previous_->next_ = next_;
      else
        tracer.firstActive = next_;
      if (next_ != nullptr)
      {
        next_->previous_ = previous_;
      }
      tracer.finished.fetch_add(1);
    }
    tracer.finished.notify_all();
  }

  ActiveCall(const ActiveCall&) = delete;
  ActiveCall& operator=(const ActiveCall&) = delete;

  explicit operator bool() const { return sink_ != nullptr; }

  void deliver(const KORTraceRecord& record)
  {
    insideSink = true;
    sink_(context_, &record);
  }

  /// Whether a call of `session` or of an earlier one is under way; the caller holds the lock.
  static bool anyUpTo(uint64_t session)
  {
    const ActiveCall* call = tracer.firstActive;
    while (call != nullptr && call->session_ > session) call = call->next_;
    return call != nullptr;
  }

private:
  KORTraceSink sink_ = nullptr;
  void* context_ = nullptr;
  uint64_t session_ = 0;
  ActiveCall* previous_ = nullptr;
  ActiveCall* next_ = nullptr;
};

/// Waits until no call of `session` or of an earlier one is under way. Later sessions do not prolong it.
void waitForCalls(uint64_t session)
{
  for (;;)
  {
    uint32_t seen = 0;
    {
      const std::lock_guard<Lock> guard(tracer.lock);
      if (!ActiveCall::anyUpTo(session))
      {
        return;
      }
      seen = tracer.finished.load();
    }
    tracer.finished.wait(seen);
  }
}

/// The items of a record, taken from the triples of a hook's argument list.
class Items
{
public:
  Items(uint32_t count, va_list triples)
  {
    items_ = local_.data();
    count_ = count;
    if (count > local_.size())
    {
      more_.reset(new (std::nothrow) KORTraceItem[count]);
      if (more_ != nullptr)
        items_ = more_.get();
      else
        count_ = static_cast<uint32_t>(local_.size()); // a trace with a cut record beats none
    }
    for (uint32_t i = 0; i < count_; ++i)
    {
      static_cast<void>(va_arg(triples, uint32_t));
      items_[i].length = va_arg(triples, uint64_t);
      items_[i].pData = va_arg(triples, const void*);
    }
  }

  const KORTraceItem* data() const { return items_; }
  uint32_t count() const { return count_; }

private:
  std::array<KORTraceItem, 16> local_; // filled up to count_, left as it is behind it
  std::unique_ptr<KORTraceItem[]> more_;
  KORTraceItem* items_ = nullptr;
  uint32_t count_ = 0;
};

KORTraceRecord recordOf(KORTraceKind kind, uint32_t threadId, uint32_t probe, uint32_t point)
{
  KORTraceRecord record{};
  record.kind = kind;
  record.threadId = threadId;
  record.probe = probe;
  record.point = point;
  return record;
}

uint32_t codeAt(const void* pCode)
{
  uint32_t code = 0;
  if (pCode != nullptr)
  {
    std::memcpy(&code, pCode, sizeof code);
  }
  return code;
}
} // namespace

uint32_t korTraceStart(KORTraceSink sink, void* context)
{
  if (sink == nullptr)
  {
    return TAV_RC_BAD_PARAM;
  }
  const std::lock_guard<Lock> guard(tracer.lock);
  if (tracer.sink != nullptr)
  {
    return KOR_RC_TRACE_ACTIVE;
  }
  tracer.sink = sink;
  tracer.context = context;
  ++tracer.session;
  store(controlBlock.enable, uint32_t{1});
  store(g_pWTCB, &controlBlock);
  return TAV_RC_OK;
}

uint32_t korTraceStop(void)
{
  uint64_t session = 0;
  {
    const std::lock_guard<Lock> guard(tracer.lock);
    if (tracer.sink == nullptr)
    {
      return KOR_RC_TRACE_INACTIVE;
    }
    store(controlBlock.enable, uint32_t{0});
    tracer.sink = nullptr;
    tracer.context = nullptr;
    session = tracer.session;
  }
  // From inside a sink the wait would be for itself, or for a sink that stops the trace as well.
  if (!insideSink)
  {
    waitForCalls(session);
  }
  return TAV_RC_OK;
}

void _wtraceEntry(uint32_t threadId, uint32_t probe, uint32_t /*reserved*/, uint32_t /*level*/)
{
  ActiveCall call;
  if (call)
  {
    call.deliver(recordOf(KOR_TRACE_ENTRY, threadId, probe, 0));
  }
}

void _wtraceExit(uint32_t threadId, uint32_t probe, const void* pResult, uint32_t /*reserved*/)
{
  ActiveCall call;
  if (!call)
  {
    return;
  }
  KORTraceRecord record = recordOf(KOR_TRACE_EXIT, threadId, probe, 0);
  record.code = codeAt(pResult);
  call.deliver(record);
}

void _wtraceVar(uint32_t threadId, uint32_t probe, uint32_t point, uint32_t /*kind*/, uint32_t count, ...)
{
  ActiveCall call;
  if (!call)
  {
    return;
  }
  va_list triples;
  va_start(triples, count);
  const Items items(count, triples);
  va_end(triples);

  KORTraceRecord record = recordOf(KOR_TRACE_VAR, threadId, probe, point);
  record.pItems = items.data();
  record.itemCount = items.count();
  call.deliver(record);
}

void _wtraceErrorVar(uint32_t threadId, uint32_t probe, uint32_t point, uint32_t /*kind*/, uint32_t /*reserved*/,
                     uint32_t count, ...)
{
  ActiveCall call;
  if (!call)
  {
    return;
  }
  va_list triples;
  va_start(triples, count);
  const Items items(count, triples);
  va_end(triples);

  KORTraceRecord record = recordOf(KOR_TRACE_ERROR, threadId, probe, point);
  record.pItems = items.data();
  record.itemCount = items.count();
  if (items.count() > 0 && items.data()[0].length == sizeof record.code)
  {
    record.code = codeAt(items.data()[0].pData);
  }
  call.deliver(record);
}
