// tav get: values by path.
#include <algorithm>
#include <memory>
#include <optional>

#include <nlohmann/json.hpp>

#include "tav/inspect/find.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/locate.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"
#include "tools/cmd/following.h"
#include "tools/host/host.h"
#include "tools/shell/dictionary.h"
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
  Wanted(const std::string& text, const Dictionary& dictionary)
      : problem{.path = text, .sentence = "no match"}
  {
    PathFault fault;
    Path read(text, dictionary.names(), fault);
    switch (fault.kind)
    {
    case PathFault::Kind::none:
      matcher.emplace(read);
      looksAhead = PathMatcher::looksAhead(read);
      path.emplace(std::move(read));
      break;
    case PathFault::Kind::malformed: throw pathError(text, fault);
    default: // the other paths are followed all the same
      problem.sentence += ": column " + std::to_string(fault.column) + ": " + fault.sentence;
    }
  }

  /// What is followed begins again.
  void beginAnew()
  {
    if (matcher)
    {
      matcher.emplace(*path);
    }
  }

  std::optional<Path> path{}; ///< nothing for a name that no element has
  std::optional<PathMatcher> matcher{};
  Problem problem; ///< when it has led nowhere
  uint64_t found = 0;
  bool looksAhead = false;
};

class Getter
{
public:
  explicit Getter(const Invocation& invocation)
      : out_("-"), raw_(invocation.has("--raw")), json_(invocation.has("--json")),
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
    const Dictionary names = dictionaryFor(invocation, invocation.arguments().at(0));
    for (size_t i = 1; i < invocation.arguments().size(); ++i)
    {
      wanted_.push_back(std::make_unique<Wanted>(invocation.arguments()[i], names));
    }
  }

  Status run(const Invocation& invocation)
  {
    Stream stream = openStream(invocation);
    DamageNotices notices(stream);
    search(invocation, stream, notices);
    out_.commit();
    tellStatistics(invocation, stream.bytes());
    const Status status = notices.tell();
    return tellMissing(stream.bytes().name()) ? kFindings : status;
  }

  /// Prints what comes: each node at once, or, where a path looks ahead, those of a root when it has ended.
  Status follow(const Invocation& invocation)
  {
    if (invocation.has("--jobs"))
    {
      throw Failure("get: --follow and --jobs exclude each other");
    }
    inspect::FollowTold told;
    const bool hasUnknown = tellUnknown(invocation);
    if (std::none_of(wanted_.begin(), wanted_.end(), [](const auto& wanted) { return wanted->path.has_value(); }))
    {
      return kFindings;
    }
    if (std::any_of(wanted_.begin(), wanted_.end(), [](const auto& wanted) { return wanted->looksAhead; }))
    {
      told.rootEnd = [this](const inspect::Arrival& root) { walkRoot(root); };
    }
    else
    {
      told.node = [this](const inspect::Arrival& node) { take(node); };
    }
    told.change = [this](inspect::FileChange change) {
      if (change != inspect::FileChange::missing)
      {
        std::for_each(wanted_.begin(), wanted_.end(), [](const auto& wanted) { wanted->beginAnew(); });
      }
    };
    const Status status = followFile(invocation, told, out_);
    return hasUnknown ? kFindings : status;
  }

private:
  /// Tells of the paths that have led nowhere.
  bool tellMissing(const std::string& file)
  {
    bool isAny = false;
    for (const auto& wanted : wanted_)
    {
      if (wanted->found == 0)
      {
        isAny = true;
        wanted->problem.file = file;
        report(wanted->problem);
      }
    }
    return isAny;
  }

  /// Tells of the paths that can lead nowhere, before what the others lead to is waited for.
  bool tellUnknown(const Invocation& invocation)
  {
    bool isAny = false;
    for (const auto& wanted : wanted_)
    {
      if (!wanted->matcher)
      {
        isAny = true;
        wanted->problem.file = invocation.arguments().at(0);
        report(wanted->problem);
      }
    }
    return isAny;
  }

  void take(const inspect::Arrival& arrival)
  {
    for (const auto& wanted : wanted_)
    {
      if (wanted->matcher && wanted->matcher->matches(arrival.node))
      {
        put(foundIn(arrival));
      }
    }
  }

  void walkRoot(const inspect::Arrival& root)
  {
    Walker walker(root.source, root.form, {.offset = root.node.offset(), .wide = root.node.is64()});
    std::string first;
    for (Event event; walker.next(event) && (event.what != What::nodeEnd || event.depth != 0);)
    {
      if (event.what != What::nodeBegin)
      {
        continue;
      }
      if (first.empty())
      {
        appendStep(first, event.node, walker.source().dictionary());
      }
      FoundNode found = foundIn(walker, event);
      // The walk begins with this root, which is not the first of its name.
      found.path = [&](PathStyle style) {
        return inspect::pathText(root) + walker.path(event, style).substr(first.size());
      };
      visit(walker, event, found);
    }
  }

  void search(const Invocation& invocation, Stream& stream, DamageNotices& notices)
  {
    std::vector<Path> paths;
    std::vector<Wanted*> sought;
    for (const auto& wanted : wanted_)
    {
      if (wanted->path)
      {
        paths.push_back(*wanted->path);
        sought.push_back(wanted.get());
      }
    }
    const unsigned jobs = jobsOf(invocation);
    Progress progress("get", stream.bytes());
    inspect::PathWork work;
    work.found = [&](const inspect::PathMatch& match) {
      ++sought[match.path]->found;
      put({match.source, match.form, match.node, match.text});
    };
    work.passed = [&](inspect::PassedOver passed) { notices.add(std::move(passed)); };
    work.progress = [&](uint64_t offset) { jobs > 1 ? progress.reach(offset) : progress.at(offset); };
    work.all = all_;
    work.threads = jobs;
    if (!paths.empty())
    {
      inspect::findPaths(stream.bytes(), stream.form(), paths, work);
    }
  }

  void visit(Walker& walker, const Event& event, const FoundNode& found)
  {
    bool reaches = false;
    for (const auto& wanted : wanted_)
    {
      if (!wanted->matcher)
      {
        continue;
      }
      if (wanted->matcher->matches(walker, event))
      {
        put(found);
      }
      reaches = reaches || wanted->matcher->reachesBelow();
    }
    if (event.node.isGroup() && !reaches)
    {
      walker.skip();
    }
  }

  void put(const FoundNode& found)
  {
    const Node& node = found.node;
    if (raw_)
    {
      copyPayload(found);
      return;
    }
    if (json_)
    {
      putJson(found);
      return;
    }
    if (paths_)
    {
      out_.write(found.path(PathStyle::brief) + "\t");
    }
    if (node.isGroup())
    {
      // A group has no value; its path and size tell that it is there.
      out_.write((paths_ ? "" : found.path(PathStyle::brief) + ": ") + "group of " +
                 counted(node.limit - node.payloadOffset(), "byte"));
    }
    else if (const auto text = plainText(found.source, found.form, node, kMostText))
    {
      out_.write(terminal_ ? forTerminal(*text) : *text);
    }
    else
    {
      terminal_ ? showPayload(found) : copyPayload(found);
    }
    out_.write("\n");
  }

  void putJson(const FoundNode& found)
  {
    const Node& node = found.node;
    nlohmann::ordered_json object;
    object["path"] =
        node.depth <= kMostSteps ? found.path(PathStyle::whole) : offsetPath(node, found.source.dictionary());
    object["offset"] = node.offset();
    object["size"] = node.size();
    object["type"] = typeText(node.type());
    if (!node.isGroup())
    {
      object["value"] = jsonValue(found);
    }
    std::string text = object.dump();
    if (terminal_ && forTerminal(text) != text)
    {
      text = object.dump(-1, ' ', true);
    }
    out_.write(text + "\n");
  }

  static nlohmann::ordered_json jsonValue(const FoundNode& found)
  {
    const Node& node = found.node;
    const std::string text = plainText(found.source, found.form, node, ~uint64_t{0}).value_or("");
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

  void copyPayload(const FoundNode& found)
  {
    const Node& node = found.node;
    const uint64_t end = node.isGroup() ? node.limit : node.payloadOffset() + node.size();
    for (uint64_t at = node.payloadOffset(); at < end;)
    {
      const auto piece = found.source.view(at);
      if (piece.empty())
      {
        return;
      }
      const auto count = static_cast<size_t>(std::min<uint64_t>(piece.size(), end - at));
      out_.write(piece.first(count));
      at += count;
    }
  }

  void showPayload(const FoundNode& found)
  {
    const Node& node = found.node;
    constexpr size_t most = size_t{64} * 1024;
    const uint64_t end = node.payloadOffset() + node.size();
    std::vector<uint8_t> bytes;
    for (uint64_t at = node.payloadOffset(); at < end;)
    {
      bytes.resize(static_cast<size_t>(std::min<uint64_t>(most + 4, end - at)));
      bytes.resize(found.source.read(at, bytes));
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
  Getter getter(invocation);
  return invocation.has("--follow") ? getter.follow(invocation) : getter.run(invocation);
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
        "element has, or damage was passed over, which is told on standard error. 2: a path is malformed.",
    .options = {{.names = "-a,--all", .help = "every node that a path leads to, not only the first"},
                {.names = "--raw", .help = "the payload's bytes as they stand in the file, without line ends"},
                {.names = "--json", .help = "one JSON object a match: path, offset, size, type, value"},
                {.names = "--paths", .help = "each value behind its path and a tab"},
                jobsOption(),
                followOption()},
    .examples = {{"tav get x.tav --all --paths //hostName", "every host name in the file, with its path"},
                 {"tav get x.tav --all '//host[cpu/cpuOnline > 4]/hostName'", "those with many processors"},
                 {"tav get x.tav --raw '/system/host[2]/#60123' > bytes", "the bytes of a value"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
