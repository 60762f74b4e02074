#include "support/traceLog.h"

#include <ostream>
#include <stdexcept>
#include <utility>

namespace test
{

std::ostream& operator<<(std::ostream& out, const Failure& failure)
{
  return out << tav::probe::functionName(failure.probe) << " point " << failure.point << " "
             << korCodeName(failure.code);
}

std::ostream& operator<<(std::ostream& out, const Step& step)
{
  static const char* const names[] = {"?", "entry", "exit", "dump", "error"};
  const uint32_t kind = step.kind;
  return out << names[kind <= KOR_TRACE_ERROR ? kind : 0] << " " << tav::probe::functionName(step.probe) << " "
             << step.point;
}

std::ostream& operator<<(std::ostream& out, const Record& record)
{
  return out << Step{record.kind, record.probe, record.point} << " " << korCodeName(record.code) << ", "
             << record.items.size() << " items";
}

namespace
{
KORTraceSink witness = nullptr;
}

void traceAllTo(KORTraceSink sink)
{
  if (witness != nullptr)
  {
    korTraceStop();
  }
  witness = sink;
  if (witness != nullptr)
  {
    korTraceStart(witness, nullptr);
  }
}

TraceTap::TraceTap(std::function<void(const KORTraceRecord&)> told)
    : told_(std::move(told))
{
  if (witness != nullptr)
  {
    korTraceStop();
  }
  if (korTraceStart(&TraceTap::sink, this) != TAV_RC_OK)
  {
    throw std::logic_error("a trace is running already");
  }
}

TraceTap::~TraceTap()
{
  korTraceStop();
  if (witness != nullptr)
  {
    korTraceStart(witness, nullptr);
  }
}

void TraceTap::sink(void* context, const KORTraceRecord* record)
{
  if (witness != nullptr)
  {
    witness(nullptr, record);
  }
  static_cast<TraceTap*>(context)->told_(*record);
}

void TraceLog::take(const KORTraceRecord& record)
{
  Record copy{record.kind, record.threadId, record.probe, record.point, record.code, {}};
  for (uint32_t i = 0; i < record.itemCount; ++i)
  {
    const KORTraceItem& item = record.pItems[i];
    copy.items.emplace_back(item.length != 0 ? static_cast<const char*>(item.pData) : "", item.length);
  }
  const std::lock_guard lock(mutex_);
  records_.push_back(std::move(copy));
}

std::vector<Record> TraceLog::records() const
{
  const std::lock_guard lock(mutex_);
  return records_;
}

std::vector<Record> TraceLog::recordsOf(uint32_t probe) const
{
  std::vector<Record> result;
  for (const Record& record : records())
  {
    if (record.probe == probe)
    {
      result.push_back(record);
    }
  }
  return result;
}

std::vector<Failure> TraceLog::failures() const
{
  std::vector<Failure> result;
  for (const Record& record : records())
  {
    if (record.kind == KOR_TRACE_ERROR)
    {
      result.push_back({record.probe, record.point, record.code});
    }
  }
  return result;
}

std::vector<Failure> TraceLog::failuresOf(uint32_t probe) const
{
  std::vector<Failure> result;
  for (const Failure& failure : failures())
  {
    if (failure.probe == probe)
    {
      result.push_back(failure);
    }
  }
  return result;
}

std::vector<Step> TraceLog::steps() const
{
  std::vector<Step> result;
  for (const Record& record : records())
  {
    result.push_back({record.kind, record.probe, record.point});
  }
  return result;
}

std::vector<Step> TraceLog::stepsOf(uint32_t probe) const
{
  std::vector<Step> result;
  for (const Record& record : recordsOf(probe))
  {
    result.push_back({record.kind, record.probe, record.point});
  }
  return result;
}

Record TraceLog::dump(uint32_t probe, uint32_t point) const
{
  for (const Record& record : recordsOf(probe))
  {
    if (record.kind == KOR_TRACE_VAR && record.point == point)
    {
      return record;
    }
  }
  return {};
}

void TraceLog::clear()
{
  const std::lock_guard lock(mutex_);
  records_.clear();
}

} // namespace test
