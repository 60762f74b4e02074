// tav tree: one line a node.
#include <algorithm>
#include <cstdio>
#include <optional>
#include <utility>

#include "tav/inspect/folding.hpp"
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

constexpr uint64_t kMaxIndent = 24; ///< levels; deeper nodes tell their depth, so that a line stays a line
constexpr size_t kWideLine = 1000;  ///< of values where there is no terminal to fit into

struct Colours
{
  const char* offset = "";
  const char* name = "";
  const char* type = "";
  const char* bad = "";
  const char* plain = "";
};

constexpr Colours kOnTerminal{"\033[2m", "\033[1m", "\033[36m", "\033[31m", "\033[0m"};

class TreePrinter
{
public:
  TreePrinter(const Invocation& invocation, Stream& stream)
      : stream_(stream), out_("-"), colours_(wantsColour(invocation) ? kOnTerminal : Colours{}),
        width_(static_cast<size_t>(host::terminalWidth().value_or(0))), paths_(invocation.has("--paths")),
        maxDepth_(invocation.number("--depth").value_or(kNoOffset)), ends_(invocation.has("--ends"))
  {
    if (const auto width = invocation.number("--width"))
    {
      width_ = static_cast<size_t>(std::min<uint64_t>(*width, 100000));
      strict_ = true;
    }
    for (const std::string& name : invocation.all("--only"))
    {
      const std::vector<uint16_t> ids = requireIds("--only", name);
      only_.insert(only_.end(), ids.begin(), ids.end());
    }
    setFolding(invocation);
  }

  /// Prints what `walker` hands out from `event` on; `base` is the depth that is not indented.
  void print(Walker& walker, Event& event, uint64_t base, bool oneNode, DamageNotices& notices)
  {
    Progress progress("tree", stream_.bytes());
    base_ = base;
    named_ = oneNode ? event.offset : kNoOffset;
    bool seen = oneNode; // on the way to it
    do
    {
      progress.at(event.offset);
      if (!std::exchange(seen, false))
      {
        notices.see(walker, event);
      }
      if (!folding_ || folding_->shows(event))
      {
        line(walker, event, base);
      }
      if (event.what == What::nodeBegin && event.node.isGroup() && event.depth - base >= maxDepth_)
      {
        walker.skip();
      }
      if (oneNode && event.what == What::nodeEnd && event.depth <= base)
      {
        break;
      }
    } while (walker.next(event));
    if (folding_)
    {
      folding_->finish();
    }
    out_.commit();
  }

  bool printedNothing() const { return lines_ == 0; }

private:
  void setFolding(const Invocation& invocation);
  bool isLeftOut(const Node& node) const;
  void fold(const Folded& folded);
  static std::string indent(uint64_t level);
  void line(const Walker& walker, const Event& event, uint64_t base);
  std::string label(const Walker& walker, const Event& event, uint64_t level) const;
  std::string remarks(const Node& node) const;
  void put(uint64_t offset, const std::string& size, const std::string& text, const std::string& bad,
           const std::string& type, const std::string& value);

  Stream& stream_;
  Output out_;
  Colours colours_;
  size_t width_;
  bool strict_ = false; ///< also offsets, names and paths are cut, not only values
  bool paths_;
  uint64_t maxDepth_;
  bool ends_;
  std::optional<Folding> folding_{};
  uint64_t base_ = 0;
  uint64_t named_ = kNoOffset; ///< the one node that was asked for
  std::vector<uint16_t> only_{};
  uint64_t lines_ = 0;
};

std::string TreePrinter::indent(uint64_t level)
{
  std::string text(static_cast<size_t>(std::min(level, kMaxIndent)) * 2, ' ');
  return level > kMaxIndent ? text + "(" + std::to_string(level) + ") " : text;
}

/// Repetitions are folded where a person looks, unless something else is asked for.
void TreePrinter::setFolding(const Invocation& invocation)
{
  const bool all = invocation.has("--all");
  if (all && invocation.has("--fold"))
  {
    throw Failure("tree: --all and --fold exclude each other");
  }
  if (!all && only_.empty() && (invocation.has("--fold") || host::isTerminal(stdout)))
  {
    folding_.emplace([this](const Folded& folded) { fold(folded); });
  }
}

/// "… 997 more like this"
void TreePrinter::fold(const Folded& folded)
{
  const uint64_t level = folded.depth - std::min(base_, folded.depth);
  if (level <= maxDepth_)
  {
    const std::string text = "\xE2\x80\xA6 " + std::to_string(folded.count) + " more like this";
    put(folded.offset, "", (paths_ ? "" : indent(level)) + text, "", "", "");
  }
}

/// What only ends a group is shown where it is asked for.
bool TreePrinter::isLeftOut(const Node& node) const
{
  const bool end = layout::isEndElement(node.elm()) && !ends_ && node.offset() != named_;
  const bool named = std::find(only_.begin(), only_.end(), node.elm()) != only_.end();
  return only_.empty() ? end : !named;
}

std::string TreePrinter::label(const Walker& walker, const Event& event, uint64_t level) const
{
  if (paths_ || !only_.empty())
  {
    return walker.path(event, PathStyle::brief);
  }
  std::string text = indent(level);
  if (event.what == What::nodeBegin)
  {
    std::string step;
    appendStep(step, event.node);
    text += step.substr(1);
  }
  return text;
}

std::string TreePrinter::remarks(const Node& node) const
{
  std::string text;
  const auto add = [&](NodeFlag flag, const char* remark) {
    text += node.has(flag) ? (text.empty() ? "" : ", ") + std::string(remark) : "";
  };
  add(kOpen, "open");
  add(kOverrun, "cut: claims more than there is");
  add(kNoPair, "no eye/size pair");
  add(kBadPair, "damaged eye/size pair");
  add(kBadGroupType, "64-bit children announced by a 32-bit header");
  return text;
}

void TreePrinter::line(const Walker& walker, const Event& event, uint64_t base)
{
  const uint64_t level = event.depth - std::min(base, event.depth);
  if (event.what == What::damaged)
  {
    put(event.offset, std::to_string(event.length), label(walker, event, level), "damaged", "", event.reason);
    return;
  }
  const bool between = event.offset + event.length < stream_.bytes().size();
  if (event.what == What::unread ||
      (event.what == What::zeros && (between || event.length > uint64_t{2} * 1024 * 1024)))
  {
    put(event.offset, std::to_string(event.length), "", event.what == What::zeros ? "zeros" : "unread", "", "");
    return;
  }
  if (event.what != What::nodeBegin || level > maxDepth_)
  {
    return;
  }
  const Node& node = event.node;
  if (isLeftOut(node))
  {
    return;
  }
  std::string value = remarks(node);
  if (!node.isGroup())
  {
    const size_t room = width_ != 0 ? width_ : kWideLine;
    const std::string shown = valueText(stream_.bytes(), stream_.form(), node, room);
    value = shown + (value.empty() ? "" : "  (" + value + ")");
  }
  const std::string size = node.has(kOpen) && node.size() != 0 ? "?" : std::to_string(node.size());
  put(node.offset(), size, label(walker, event, level), "", typeText(node.type()), value);
}

void TreePrinter::put(uint64_t offset, const std::string& size, const std::string& text, const std::string& bad,
                      const std::string& type, const std::string& value)
{
  char columns[64];
  std::snprintf(columns, sizeof columns, "%10s %8s  ", hexOffset(offset).c_str(), size.c_str());
  const bool gap = !bad.empty() && !text.empty() && text.back() != ' ';
  std::string line = columns;
  const size_t nameBegin = line.size();
  line += text + (gap ? " " : "") + bad;
  const size_t nameEnd = line.size();
  line += type.empty() && value.empty() ? "" : "  ";
  const size_t typeBegin = line.size();
  line += type;
  const size_t typeEnd = line.size();
  line += (type.empty() || value.empty() ? "" : "  ") + value;
  if (width_ != 0)
  {
    line = strict_ || width_ >= typeBegin + 3 ? cutToWidth(line, width_) : line.substr(0, nameEnd);
  }
  const auto part = [&](size_t begin, size_t end) {
    return line.substr(std::min(begin, line.size()), std::min(end, line.size()) - std::min(begin, line.size()));
  };
  out_.write(colours_.offset + part(0, nameBegin) + colours_.plain + (bad.empty() ? colours_.name : colours_.bad) +
             part(nameBegin, nameEnd) + colours_.plain + part(nameEnd, typeBegin) + colours_.type +
             part(typeBegin, typeEnd) + colours_.plain + part(typeEnd, line.size()) + "\n");
  ++lines_;
}

int run(const Invocation& invocation)
{
  Stream stream = openStream(invocation);
  Walker walker(stream.bytes(), stream.form());
  TreePrinter printer(invocation, stream);
  DamageNotices notices(stream);
  Event event;
  const auto at = invocation.number("--at");
  if (at)
  {
    goToOffset(stream.bytes(), walker, event, *at, [&](const Event& seen) { notices.see(walker, seen); });
    printer.print(walker, event, event.depth, true, notices);
  }
  else if (walker.next(event))
  {
    printer.print(walker, event, 0, false, notices);
  }
  tellStatistics(invocation, stream.bytes());
  return notices.tell() != kFine || (invocation.has("--only") && printer.printedNothing()) ? kFindings : kFine;
}

const Registration registration{{
    .place = 30,
    .name = "tree",
    .arguments = "FILE",
    .summary = "one line a node: offset, size, name, type, value",
    .description =
        "Lists every node in the order of the stream, indented by its level. Bytes that are no node are\n"
        "listed as damaged, with the reason; then the exit status is 1. Elements that only end a group are\n"
        "left out. On a terminal values are cut to its width, lines are coloured unless NO_COLOR is set or\n"
        "TERM is dumb, and of siblings of one name that follow one another three are shown, with a line that\n"
        "counts the others; damage among them is always shown. Where the output is no terminal, and with\n"
        "--only, every node has its line, unless --fold asks for the short form.",
    .options =
        {{.names = "--depth", .kind = ValueKind::number, .value = "N", .help = "no node deeper than N levels"},
         {.names = "--at", .kind = ValueKind::number, .value = "OFFSET", .help = "the node at OFFSET and all below it"},
         {.names = "--only",
          .kind = ValueKind::text,
          .value = "NAME",
          .help = "only these elements, by name or id, with their paths",
          .many = true},
         {.names = "--all", .help = "every node has its line, on a terminal, too"},
         {.names = "--fold", .help = "fold repetitions also where the output is no terminal"},
         {.names = "--ends", .help = "also elements that only end a group"},
         {.names = "--paths", .help = "paths instead of indented names"},
         {.names = "--width", .kind = ValueKind::number, .value = "N", .help = "cut lines to N columns; 0: never"},
         {.names = "--color",
          .kind = ValueKind::choice,
          .value = "WHEN",
          .help = "colour the output",
          .choices = {"auto", "always", "never"}}},
    .examples = {{"tav tree x.tav --depth 2", "the outline of a stream"},
                 {"tav tree x.tav --only hostName", "every host name with its path"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
