// tav schema: the shape of streams, a line a path.
#include <algorithm>

#include "tav/inspect.hpp"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

constexpr size_t kWidestPath = 60; ///< longer ones push the rest of their line to the right

Status addFile(const Invocation& invocation, const std::string& name, Schema& schema)
{
  return forFile(invocation, name, [&](Stream& stream, DamageNotices& notices) {
    const unsigned jobs = jobsOf(invocation);
    Progress progress("schema " + stream.source->name(), stream.bytes());
    schema.add(stream.bytes(), stream.form(),
               {.passed = [&](PassedOver passed) { notices.add(std::move(passed)); },
                .progress = [&](uint64_t offset) { jobs > 1 ? progress.reach(offset) : progress.at(offset); },
                .threads = jobs});
    return kFine;
  });
}

std::string typesText(const SchemaEntry& entry)
{
  std::string text;
  std::string last;
  for (const uint16_t type : entry.types)
  {
    const std::string name = typeText(type);
    text += name == last ? "" : (text.empty() ? "" : ", ") + name;
    last = name;
  }
  return text;
}

std::string valuesText(const SchemaEntry& entry)
{
  std::string text;
  if (entry.least)
  {
    text = *entry.least + (*entry.least == *entry.greatest ? "" : " .. " + *entry.greatest);
  }
  if (entry.distinct)
  {
    text += text.empty() ? "" : ", ";
    text += (entry.more ? "more than " : "") + std::to_string(*entry.distinct) + " distinct";
  }
  return text;
}

void putText(const Schema& schema, Output& out)
{
  size_t width = 0;
  schema.each(PathStyle::brief, [&](const SchemaEntry& entry) { width = std::max(width, entry.path.size()); });
  width = std::min(width, kWidestPath);
  schema.each(PathStyle::brief, [&](const SchemaEntry& entry) {
    std::string count = std::to_string(entry.count);
    count.insert(0, count.size() < 10 ? 10 - count.size() : 0, ' ');
    std::string path = entry.path;
    path.resize(std::max(width, path.size()), ' ');
    const std::string values = valuesText(entry);
    out.write(count + "  " + path + "  " + typesText(entry) + (values.empty() ? "" : "  " + values) + "\n");
  });
}

/// A number as JSON has it where it is one of 64 bits at the most, else a text.
std::string jsonBound(const std::string& text, uint16_t type)
{
  if (type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64)
  {
    return text;
  }
  std::string quotedText;
  appendJsonString(quotedText, text);
  return quotedText;
}

void putJson(const Schema& schema, Output& out)
{
  schema.each(PathStyle::whole, [&](const SchemaEntry& entry) {
    std::string line = "{\"path\": ";
    appendJsonString(line, entry.path);
    line += ", \"count\": " + std::to_string(entry.count) + ", \"types\": [";
    bool first = true;
    for (const uint16_t type : entry.types)
    {
      line += first ? "" : ", ";
      first = false;
      const auto name = jsonTypeName(type);
      name ? appendJsonString(line, *name) : void(line += std::to_string(type));
    }
    line += "]";
    if (entry.least)
    {
      line += ", \"min\": " + jsonBound(*entry.least, entry.leastType) +
              ", \"max\": " + jsonBound(*entry.greatest, entry.greatestType);
    }
    if (entry.distinct)
    {
      line += ", \"distinct\": " + std::to_string(*entry.distinct) + (entry.more ? ", \"more\": true" : "");
    }
    out.write(line + "}\n");
  });
}

int run(const Invocation& invocation)
{
  const std::vector<std::string>& names = invocation.arguments();
  if (std::count(names.begin(), names.end(), "-") > 1)
  {
    throw Failure("schema: only one of the files can be standard input");
  }
  SchemaOptions options;
  options.mostTexts = invocation.number("--distinct").value_or(options.mostTexts);
  options.ends = invocation.has("--ends");
  Schema schema(options);
  Status status = kFine;
  for (const std::string& name : names)
  {
    status = std::max(status, addFile(invocation, name, schema));
  }
  Output out("-");
  invocation.has("--json") ? putJson(schema, out) : putText(schema, out);
  out.commit();
  return status;
}

const Registration registration{{
    .place = 52,
    .name = "schema",
    .arguments = "FILE...",
    .inputs = ~size_t{0},
    .summary = "the shape of streams: a line for each path",
    .description =
        "Lists every path that there is, without numbers, with how often it was found in all the files together,\n"
        "the types there, the least and the greatest of numbers and times, and how many different texts there\n"
        "are. Texts of a path are counted one by one up to 10,000 of 128 bytes on average (--distinct); where\n"
        "there are more, the line says 'more than'. Memory grows with the number of paths, not of nodes.\n\n"
        "A file that cannot be read, or is no stream, is told on standard error, and the next one is read; the\n"
        "exit status is the highest that one of the files gives.",
    .options = {{.names = "--json",
                 .help = "one JSON object a path: path, count, types, min, max, distinct; more: there are more than "
                         "distinct"},
                {.names = "--distinct",
                 .kind = ValueKind::number,
                 .value = "N",
                 .help = "count up to N different texts of a path, 10000 unless given"},
                {.names = "--ends", .help = "count what only ends a group, too"},
                jobsOption()},
    .examples = {{"tav schema x.tav", "what is in a file"},
                 {"tav schema *.tav --json | jq -r 'select(.distinct == 1) | .path'", "texts that never change"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
