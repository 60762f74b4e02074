/// Records a trace for as long as the object lives.
#pragma once

#include <cstdint>
#include <functional>
#include <iosfwd>
#include <mutex>
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "tav/kor.h"
#include "tav/probes.h"

namespace test
{

// What is expected of a trace's failures, steps and dumps.
using ::testing::ElementsAre;
using ::testing::IsEmpty;

/// A failure that a function reported: where, and with which code.
struct Failure
{
  uint32_t probe;
  uint32_t point;
  uint32_t code;
  bool operator==(const Failure&) const = default;
};
std::ostream& operator<<(std::ostream& out, const Failure& failure);

/// One record, with copies of the items' bytes.
struct Record
{
  KORTraceKind kind;
  uint32_t threadId;
  uint32_t probe;
  uint32_t point;
  uint32_t code;
  std::vector<std::string> items;
};
std::ostream& operator<<(std::ostream& out, const Record& record);

/// A record's kind, probe and point: enough to compare sequences.
struct Step
{
  KORTraceKind kind;
  uint32_t probe;
  uint32_t point;
  bool operator==(const Step&) const = default;
};
std::ostream& operator<<(std::ostream& out, const Step& step);

/// Sends every record of the program to `sink` as well, those between the logs and those that a log takes, until it is
/// called with null. A test that starts a trace by itself has to stop this one before.
void traceAllTo(KORTraceSink sink);

/// Calls a function with every record of the program, when it is left, for as long as the object lives.
class TraceTap
{
public:
  explicit TraceTap(std::function<void(const KORTraceRecord&)> told);
  ~TraceTap();
  TraceTap(const TraceTap&) = delete;
  TraceTap& operator=(const TraceTap&) = delete;

private:
  static void sink(void* context, const KORTraceRecord* record);

  std::function<void(const KORTraceRecord&)> told_;
};

class TraceLog
{
public:
  [[nodiscard]] std::vector<Record> records() const;
  /// All failures, in order.
  [[nodiscard]] std::vector<Failure> failures() const;
  /// The failures of one probe.
  [[nodiscard]] std::vector<Failure> failuresOf(uint32_t probe) const;
  /// The records of one probe, in order.
  [[nodiscard]] std::vector<Record> recordsOf(uint32_t probe) const;
  /// Kind, probe and point of all records, or of one probe's.
  [[nodiscard]] std::vector<Step> steps() const;
  [[nodiscard]] std::vector<Step> stepsOf(uint32_t probe) const;
  /// The first dump of a probe at a point; an empty record when there is none.
  [[nodiscard]] Record dump(uint32_t probe, uint32_t point) const;
  void clear();

private:
  void take(const KORTraceRecord& record);

  mutable std::mutex mutex_{};
  std::vector<Record> records_{};
  TraceTap tap_{[this](const KORTraceRecord& record) { take(record); }};
};

/// The bytes of a value as an item shows them.
template<class Value>
std::string bytesOf(const Value& value)
{
  return {reinterpret_cast<const char*>(&value), sizeof value};
}

} // namespace test
