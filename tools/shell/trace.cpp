#include "tools/shell/trace.h"

#include <algorithm>

#include "tav/kor.h"
#include "tav/probes.h"
#include "tools/host/host.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

void filteringSink(void* context, const KORTraceRecord* record)
{
  const auto& filter = *static_cast<const TraceFile::Filter*>(context);
  const auto& probes = filter.probes;
  if (probes.empty() || std::find(probes.begin(), probes.end(), record->probe) != probes.end())
  {
    std::fprintf(filter.file, "%s ", probe::functionName(record->probe));
    korTraceTextSink(filter.file, record);
  }
}

uint32_t probeOf(const std::string& text)
{
  if (const auto id = parseNumber(text))
  {
    // The function's number is enough.
    const auto number = static_cast<uint32_t>(*id);
    return *id < 0x10000 ? probe::kBase + number : number;
  }
  for (uint32_t number = 0; number < 0x100; ++number)
  {
    if (text == probe::functionName(probe::kBase + number))
    {
      return probe::kBase + number;
    }
  }
  throw Failure("--trace-probe: '" + text + "' is no function that traces",
                "examples: tavReadNodeInt, 0x88A0023, 0x23");
}

} // namespace

TraceFile::TraceFile(const Invocation& invocation)
{
  for (const std::string& text : invocation.all("--trace-probe"))
  {
    filter_.probes.push_back(probeOf(text));
  }
  const std::string path = invocation.text("--trace");
  if (path.empty())
  {
    if (!filter_.probes.empty())
    {
      throw Failure("--trace-probe needs --trace FILE");
    }
    return;
  }
  uint32_t code = TAV_RC_OK;
  filter_.file = path == "-" ? stderr : host::openStream(path, "wb", code);
  if (filter_.file == nullptr)
  {
    failAt(path, code);
  }
  korTraceStart(filteringSink, &filter_);
}

TraceFile::~TraceFile()
{
  if (filter_.file == nullptr)
  {
    return;
  }
  korTraceStop();
  const bool failed = std::fflush(filter_.file) != 0 || std::ferror(filter_.file) != 0;
  if (filter_.file != stderr)
  {
    std::fclose(filter_.file);
  }
  if (failed)
  {
    report("the trace could not be written completely");
  }
}

} // namespace tav::tool
