/// The trace frame of a function: entry, dumps, errors and exit in one scope object.
#pragma once

#include <cstdint>
#include <cstring>
#include <tuple>

#include "kor/shared.h"
#include "tav/kor.h"

namespace tav::inside
{

/// Whether a record would go anywhere. Asked before every record: tracing may be switched in mid-call.
inline bool tracing()
{
  const KORTraceCB* const block = kor::loadAcquire(g_pWTCB);
  if (block == nullptr) [[likely]]
  {
    return false;
  }
  return kor::loadRelaxed(block->enable) != 0;
}

/// What a dump shows of its arguments.
namespace trace
{

/// The bytes of a value: numbers, and pointers as such.
template<class Value>
KORTraceItem item(const Value& value)
{
  return {&value, sizeof value}; // NOLINT(bugprone-sizeof-expression): of a pointer, its own bytes are meant
}

inline KORTraceItem item(const KORTraceItem& ready)
{
  return ready;
}

/// The characters of a label. An address in the first page cannot be a text.
inline KORTraceItem label(const char* text)
{
  constexpr uintptr_t firstPage = 4096;
  return {text, reinterpret_cast<uintptr_t>(text) < firstPage ? 0 : std::strlen(text)};
}

template<size_t Size>
KORTraceItem item(const char (&text)[Size])
{
  return label(text);
}

/// The whole record behind a pointer, nothing for null.
template<class Record>
KORTraceItem record(const Record* pRecord)
{
  return {pRecord, pRecord != nullptr ? sizeof(Record) : 0};
}

/// What a dump keeps of its argument until the record is written: a text stays where it is, anything else is copied.
template<class Value>
Value kept(const Value& value)
{
  return value;
}

template<size_t Size>
KORTraceItem kept(const char (&text)[Size])
{
  return item(text);
}

inline constexpr uint32_t kEntryLevel = 1000000;

inline uint32_t threadId()
{
  return static_cast<uint32_t>(korThreadID());
}

[[gnu::cold, gnu::noinline]] inline void entry(uint32_t probe)
{
  _wtraceEntry(threadId(), probe, 0, kEntryLevel);
}

[[gnu::cold, gnu::noinline]] inline void exit(uint32_t probe, uint32_t code)
{
  _wtraceExit(threadId(), probe, &code, 0);
}

[[gnu::cold, gnu::noinline]] inline void error(uint32_t probe, uint32_t point, uint32_t code)
{
  _wtraceErrorVar(threadId(), probe, point, KOR_TRACE_ERROR, 0, 1, uint32_t{0}, uint64_t{sizeof code},
                  static_cast<const void*>(&code));
}

/// Takes its values as copies: a variable whose address went to a record would have to live in memory in every call.
template<class... Values>
[[gnu::cold, gnu::noinline]] void variables(uint32_t probe, uint32_t point, Values... values)
{
  const auto triple = [](const KORTraceItem& one) { return std::make_tuple(uint32_t{0}, one.length, one.pData); };
  const auto emit = [&](auto... flat) {
    _wtraceVar(threadId(), probe, point, KOR_TRACE_VAR, static_cast<uint32_t>(sizeof...(Values)), flat...);
  };
  std::apply(emit, std::tuple_cat(triple(item(values))...));
}

/// Dumps items under a probe, for the one record that carries another probe than its function.
template<class... Values>
void dump(uint32_t probe, uint32_t point, const Values&... values)
{
  if (tracing()) [[unlikely]]
  {
    variables(probe, point, kept(values)...);
  }
}

} // namespace trace

/// Traces one call of a function: the entry record now, the exit record with the code at the end of the scope.
/// While tracing is off every record costs a load and a branch.
class TraceFrame
{
public:
  explicit TraceFrame(uint32_t probe)
      : probe_(probe)
  {
    if (tracing()) [[unlikely]]
    {
      trace::entry(probe_);
    }
  }

  ~TraceFrame()
  {
    if (tracing()) [[unlikely]]
    {
      trace::exit(probe_, code_);
    }
  }

  TraceFrame(const TraceFrame&) = delete;
  TraceFrame& operator=(const TraceFrame&) = delete;

  /// Dumps arguments or results.
  template<class... Values>
  void dump(uint32_t point, const Values&... values) const
  {
    trace::dump(probe_, point, values...);
  }

  /// A check of this function: fails with `code`, reported at `point`.
  [[nodiscard]] bool require(uint32_t point, bool holds, uint32_t code)
  {
    return holds || fail(point, code);
  }

  /// A code from below, passed on unchanged and reported at `point` when it is a failure.
  [[nodiscard]] bool step(uint32_t point, uint32_t code)
  {
    return code == TAV_RC_OK || fail(point, code);
  }

  /// Sets the code without a record.
  bool keep(uint32_t code)
  {
    code_ = code;
    return code == TAV_RC_OK;
  }

  /// Reports a failure and keeps its code. Always false, so that it can end a chain of checks.
  bool fail(uint32_t point, uint32_t code)
  {
    code_ = code;
    report(point, code);
    return false;
  }

  /// Reports a code that does not become the result.
  void report(uint32_t point, uint32_t code) const
  {
    if (tracing()) [[unlikely]]
    {
      trace::error(probe_, point, code);
    }
  }

  [[nodiscard]] uint32_t code() const
  {
    return code_;
  }

private:
  uint32_t probe_;
  uint32_t code_ = TAV_RC_OK;
};

/// A frame without records, for a step of a call that leaves none and calls nothing outside the library.
class UntracedFrame
{
public:
  explicit UntracedFrame(uint32_t /*probe*/) {}

  template<class... Values>
  void dump(uint32_t /*point*/, const Values&... /*values*/) const
  {
  }

  [[nodiscard]] bool require(uint32_t point, bool holds, uint32_t code)
  {
    return holds || fail(point, code);
  }

  bool fail(uint32_t /*point*/, uint32_t code)
  {
    code_ = code;
    return false;
  }

  [[nodiscard]] uint32_t code() const
  {
    return code_;
  }

private:
  uint32_t code_ = TAV_RC_OK;
};

} // namespace tav::inside
