/// What the printer produced: streams that catch it, and contexts for its parts.
#pragma once

#include <cstdint>
#include <cstdio>
#include <iomanip>
#include <ostream>
#include <sstream>
#include <string>

#include "api/printer.h"
#include "support/platform.h"
#include "tav/tav.h"

namespace test
{

/// The outcome of one print call.
struct Printed
{
  uint32_t rc;
  uint64_t count; ///< what the call says that it printed
  std::string text;
  bool operator==(const Printed&) const = default;
};

/// A call whose count is the length of its text.
inline Printed printed(uint32_t rc, const std::string& text)
{
  return {rc, text.size(), text};
}

inline std::ostream& operator<<(std::ostream& out, const Printed& call)
{
  return out << korCodeName(call.rc) << ", " << call.count << " characters:\n"
             << call.text;
}

/// What XML begins with.
inline const std::string kProlog = "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n";

/// Lines that begin with `before`, which becomes `now`.
inline std::string moved(const std::string& lines, const std::string& before, const std::string& now)
{
  std::istringstream in(lines);
  std::string all;
  for (std::string line; std::getline(in, line);)
  {
    all += now + line.substr(before.size()) + "\n";
  }
  return all;
}

/// tavPrintSubtree to a stream.
inline Printed printSubtree(uint64_t options, TAVHandle* handle, TAVHeaderData* start = nullptr)
{
  CaughtStream stream;
  TAVPrintParam param{0, nullptr, 0, stream.get()};
  uint64_t count = 0xBAD;
  const uint32_t rc = tavPrintSubtree(options, handle, start, &param, &count);
  return {rc, count, stream.text()};
}

inline TAVPrintCtx printContext(FILE* stream, uint64_t options = 0, bool swap = false)
{
  return {nullptr, 0, stream, 0, 0, swap ? uint8_t{1} : uint8_t{0}, options, 0, 0};
}

/// A pointer as the printer shows it.
inline std::string addressText(const void* pointer)
{
  std::ostringstream out;
  out << std::hex << std::uppercase << std::setw(16) << std::setfill('0') << reinterpret_cast<uintptr_t>(pointer);
  return out.str();
}

} // namespace test
