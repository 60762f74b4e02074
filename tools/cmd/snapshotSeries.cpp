#include "tools/cmd/snapshotSeries.h"

#include <algorithm>
#include <charconv>
#include <chrono>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <thread>

#include "tools/host/host.h"
#include "tools/shell/output.h"
#include "tools/shell/report.h"

namespace tav::tool
{

namespace
{

using std::chrono::milliseconds;

/// "500ms", "5s", "1m", "2h"
std::optional<milliseconds> parseDuration(std::string_view text)
{
  struct Unit
  {
    std::string_view name;
    milliseconds length;
  };
  constexpr Unit units[] = {{"ms", milliseconds(1)},
                            {"s", std::chrono::seconds(1)},
                            {"m", std::chrono::minutes(1)},
                            {"h", std::chrono::hours(1)}};
  constexpr uint64_t longest = 1'000'000'000;
  uint64_t number = 0;
  const auto [end, failure] = std::from_chars(text.data(), text.data() + text.size(), number);
  const std::string_view name(end, static_cast<size_t>(text.data() + text.size() - end));
  const auto* const unit =
      std::find_if(std::begin(units), std::end(units), [name](const Unit& one) { return one.name == name; });
  if (failure != std::errc() || unit == std::end(units) || number == 0 || number > longest)
  {
    return std::nullopt;
  }
  return unit->length * static_cast<milliseconds::rep>(number);
}

struct Series
{
  std::string path{};
  std::optional<milliseconds> every{};
  uint64_t count = 1; ///< 0: until the program is ended
  uint64_t rotate = 0;
  uint64_t keep = 0;
};

Series seriesOf(const Invocation& invocation)
{
  Series series;
  series.path = invocation.text("--output", "-");
  if (isStandardOutput(series.path))
  {
    throw Failure("snapshot: --append needs -o FILE", "only a file has an end to go on behind");
  }
  if (invocation.has("--every"))
  {
    series.every = parseDuration(invocation.text("--every"));
    if (!series.every)
    {
      throw Failure("snapshot: '" + invocation.text("--every") + "' is no time; 500ms, 5s, 1m and 2h are");
    }
    series.count = 0;
  }
  series.count = invocation.number("--count").value_or(series.count);
  if (invocation.has("--count") && (!series.every || series.count == 0))
  {
    throw Failure("snapshot: --count needs " + std::string(series.every ? "a number above 0" : "--every"));
  }
  series.rotate = invocation.number("--rotate").value_or(0);
  if (series.rotate != 0 && host::pathOf(series.path).filename().string().find("%n") == std::string::npos)
  {
    throw Failure("snapshot: --rotate needs a FILE with %n in its name",
                  "day-%n.tav stands for day-1.tav, day-2.tav, …");
  }
  series.keep = invocation.number("--keep").value_or(0);
  if (invocation.has("--keep") && (series.rotate == 0 || series.keep == 0))
  {
    throw Failure("snapshot: --keep needs " + std::string(series.rotate == 0 ? "--rotate" : "a number above 0"));
  }
  return series;
}

void appendOne(Recorder& recorder, bool pairs, const SnapshotMaker& make, Width children)
{
  const auto now = std::chrono::system_clock::now();
  make([&](std::span<const std::byte> nodes) {
    Group root = recorder.group(TAV_ELM_CMN_SYSTEM, {.children = children, .eyeSize = pairs});
    try
    {
      root.add(SQLM_ELM_ATTR_TIMESTAMP, now, {.eyeSize = pairs});
      root.addStream(children, nodes);
      root.close();
    }
    catch (const std::system_error& error)
    {
      throw Failure(kTrouble, Problem{.file = recorder.path().text(), .sentence = error.what()});
    }
  });
}

} // namespace

void refuseSeries(const Invocation& invocation)
{
  for (const char* const option : {"--every", "--count", "--rotate", "--keep"})
  {
    if (invocation.has(option))
    {
      throw Failure("snapshot: " + std::string(option) + " needs --append");
    }
  }
}

int appendSnapshots(const Invocation& invocation, const SnapshotForm& form, const SnapshotMaker& make)
{
  const Series series = seriesOf(invocation);
  try
  {
    Recorder recorder(host::pathOf(series.path),
                      {.maxBytes = series.rotate, .keep = series.keep, .syncEvery = std::chrono::nanoseconds(0)},
                      form.stream);
    auto next = std::chrono::steady_clock::now();
    for (uint64_t made = 0; series.count == 0 || made < series.count; ++made)
    {
      if (made != 0)
      {
        next = std::max(next + *series.every, std::chrono::steady_clock::now()); // none is made up for
        std::this_thread::sleep_until(next);
      }
      appendOne(recorder, form.pairs, make, form.stream.root);
    }
    recorder.finish();
    return kFine;
  }
  catch (const std::system_error& error)
  {
    throw Failure(kTrouble, Problem{.file = {}, .sentence = error.what()});
  }
}

} // namespace tav::tool
