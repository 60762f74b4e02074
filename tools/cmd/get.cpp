// tav get: values by path.
#include <algorithm>
#include <memory>
#include <optional>

#include <nlohmann/json.hpp>

#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/locate.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"
#include "tools/host/host.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

constexpr uint64_t kMostText = uint64_t{1024} * 1024; ///< longer values are copied piece by piece
constexpr uint64_t kMostSteps = 4000;                 ///< deeper nodes are named by their offset in JSON

/// A path with what was found so far.
struct Wanted
{
  explicit Wanted(const std::string& text)
      : problem{.path = text, .sentence = "no match"}
  {
    PathFault fault;
    const Path path(text, fault);
    switch (fault.kind)
    {
    case PathFault::Kind::none: matcher.emplace(path); break;
    case PathFault::Kind::malformed: throw pathError(text, fault);
    default: // the other paths are followed all the same
      problem.sentence += ": column " + std::to_string(fault.column) + ": " + fault.sentence;
    }
  }

  bool isOpen(bool all) const { return matcher && (all || found == 0); }

  std::optional<PathMatcher> matcher{}; ///< nothing for a name that no element has
  Problem problem;                      ///< when it has led nowhere
  uint64_t found = 0;
};

class Getter
{
public:
  explicit Getter(const Invocation& invocation)
      : stream_(openStream(invocation)), out_("-"), raw_(invocation.has("--raw")), json_(invocation.has("--json")),
        all_(invocation.has("--all")), paths_(invocation.has("--paths")), terminal_(host::isTerminal(stdout))
  {
    if (raw_ && terminal_)
    {
      throw Failure("get: the bytes of --raw are no text for a terminal", "'> FILE' writes them to a file");
    }
    if (raw_ && json_)
    {
      throw Failure("get: --raw and --json exclude each other");
    }
    for (size_t i = 1; i < invocation.arguments().size(); ++i)
    {
      wanted_.push_back(std::make_unique<Wanted>(invocation.arguments()[i]));
    }
  }

  Status run(const Invocation& invocation)
  {
    DamageNotices notices(stream_);
    walk(notices);
    out_.commit();
    tellStatistics(invocation, stream_.bytes());
    Status status = notices.tell();
    for (const auto& wanted : wanted_)
    {
      if (wanted->found == 0)
      {
        status = kFindings;
        wanted->problem.file = stream_.bytes().name();
        report(wanted->problem);
      }
    }
    return status;
  }

private:
  void walk(DamageNotices& notices)
  {
    Walker walker(stream_.bytes(), stream_.form());
    Progress progress("get", stream_.bytes());
    Event event;
    while (!isDone() && walker.next(event))
    {
      progress.at(event.offset);
      notices.see(walker, event);
      if (event.what == What::nodeBegin)
      {
        visit(walker, event);
      }
    }
  }

  bool isDone() const
  {
    return std::none_of(wanted_.begin(), wanted_.end(), [this](const auto& wanted) { return wanted->isOpen(all_); });
  }

  void visit(Walker& walker, const Event& event)
  {
    bool reaches = false;
    for (const auto& wanted : wanted_)
    {
      if (!wanted->isOpen(all_))
      {
        continue;
      }
      if (wanted->matcher->matches(walker, event))
      {
        ++wanted->found;
        put(walker, event);
      }
      reaches = reaches || (wanted->isOpen(all_) && wanted->matcher->reachesBelow());
    }
    if (event.node.isGroup() && !reaches)
    {
      walker.skip();
    }
  }

  void put(const Walker& walker, const Event& event)
  {
    const Node& node = event.node;
    if (raw_)
    {
      copyPayload(node);
      return;
    }
    if (json_)
    {
      putJson(walker, event);
      return;
    }
    if (paths_)
    {
      out_.write(walker.path(event, PathStyle::brief) + "\t");
    }
    if (node.isGroup())
    {
      // A group has no value; its path and size tell that it is there.
      out_.write((paths_ ? "" : walker.path(event, PathStyle::brief) + ": ") + "group of " +
                 counted(node.limit - node.payloadOffset(), "byte"));
    }
    else if (const auto text = plainText(stream_.bytes(), stream_.form(), node, kMostText))
    {
      out_.write(terminal_ ? forTerminal(*text) : *text);
    }
    else
    {
      terminal_ ? showPayload(node) : copyPayload(node);
    }
    out_.write("\n");
  }

  void putJson(const Walker& walker, const Event& event)
  {
    const Node& node = event.node;
    nlohmann::ordered_json object;
    object["path"] = event.depth <= kMostSteps ? walker.path(event) : offsetPath(node);
    object["offset"] = node.offset();
    object["size"] = node.size();
    object["type"] = typeText(node.type());
    if (!node.isGroup())
    {
      object["value"] = jsonValue(node);
    }
    std::string text = object.dump();
    if (terminal_ && forTerminal(text) != text)
    {
      text = object.dump(-1, ' ', true);
    }
    out_.write(text + "\n");
  }

  nlohmann::ordered_json jsonValue(const Node& node)
  {
    const std::string text = plainText(stream_.bytes(), stream_.form(), node, ~uint64_t{0}).value_or("");
    const uint16_t type = node.type();
    const auto& info = layout::typeInfo(type);
    const bool number = type >= TAV_TYPE_UINT8 && type <= TAV_TYPE_SINT64 && info.valueSize == node.size();
    if (number)
    {
      return nlohmann::ordered_json::parse(text);
    }
    if (!isUtf8(text))
    {
      const std::string escaped = tool::quoted(text);
      return escaped.substr(1, escaped.size() - 2);
    }
    return text;
  }

  void copyPayload(const Node& node)
  {
    const uint64_t end = node.isGroup() ? node.limit : node.payloadOffset() + node.size();
    for (uint64_t at = node.payloadOffset(); at < end;)
    {
      const auto piece = stream_.bytes().view(at);
      if (piece.empty())
      {
        return;
      }
      const auto count = static_cast<size_t>(std::min<uint64_t>(piece.size(), end - at));
      out_.write(piece.first(count));
      at += count;
    }
  }

  void showPayload(const Node& node)
  {
    constexpr size_t most = size_t{64} * 1024;
    const uint64_t end = node.payloadOffset() + node.size();
    std::vector<uint8_t> bytes;
    for (uint64_t at = node.payloadOffset(); at < end;)
    {
      bytes.resize(static_cast<size_t>(std::min<uint64_t>(most + 4, end - at)));
      bytes.resize(stream_.bytes().read(at, bytes));
      const std::string_view text(reinterpret_cast<const char*>(bytes.data()), bytes.size());
      const size_t count = cutAtCharacter(text, most);
      if (count == 0)
      {
        return; // the file became shorter
      }
      out_.write(forTerminal(text.substr(0, count)));
      at += count;
    }
  }

  Stream stream_;
  Output out_;
  bool raw_;
  bool json_;
  bool all_;
  bool paths_;
  bool terminal_; ///< of which nothing that a stream holds may take hold
  std::vector<std::unique_ptr<Wanted>> wanted_{};
};

int run(const Invocation& invocation)
{
  return Getter(invocation).run(invocation);
}

const Registration registration{{
    .place = 50,
    .name = "get",
    .arguments = "FILE PATH...",
    .summary = "values by path",
    .description =
        "Prints the value of the first node that each path leads to, in the order of the stream, one a line:\n"
        "texts as they are, numbers in decimal, bytes in hexadecimal. Paths are those of XPath 1.0 in its\n"
        "abbreviated syntax, on the tree that 'tav xml' prints:\n"
        "  /a/b  //b  ..  .  *                   from the roots; any number of levels; parent; itself; any\n"
        "  a[2]  a[last()-1]  a[position() < 3]  places among what the step finds under the same parent\n"
        "  a[b]  a[b='x' and not(c > 5)]         by what is in it, numbers exactly\n"
        "  a[@type='Uint64']  a[contains(b,'x')] by attributes of the XML; by parts of texts\n"
        "  a | b  **  a[-1]  *_time  #60103  /   either; any levels; the last; pattern; id; the roots\n"
        "Every path that a command prints whole is understood. On a terminal control characters of texts are\n"
        "written as \\x1b, as 'tav tree' does. Exit status 1: a path leads nowhere, also by a name that no\n"
        "element has, or damage was passed over, which is told on standard error; the other values are printed.\n"
        "2: a path is malformed.",
    .options = {{.names = "-a,--all", .help = "every node that a path leads to, not only the first"},
                {.names = "--raw", .help = "the payload's bytes as they stand in the file, without line ends"},
                {.names = "--json", .help = "one JSON object a match: path, offset, size, type, value"},
                {.names = "--paths", .help = "each value behind its path and a tab"}},
    .examples = {{"tav get x.tav /system/host/hostName", "one value"},
                 {"tav get x.tav --all --paths //hostName", "every host name in the file, with its path"},
                 {"tav get x.tav --all '//host[cpu/cpuOnline > 4]/hostName'", "those with many processors"},
                 {"tav get x.tav --raw '/system/host[2]/#60123' > bytes", "the bytes of a value"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
