// tav tree: one line a node.
#include <algorithm>
#include <optional>
#include <utility>

#include "tav/inspect/folding.hpp"
#include "tav/inspect/locate.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"
#include "tools/cmd/following.h"
#include "tools/host/host.h"
#include "tools/shell/dictionary.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/pager.h"
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

/// Where the parts of a line begin or end.
struct Parts
{
  size_t name = 0;
  size_t nameEnd = 0;
  size_t type = 0;
  size_t typeEnd = 0;
  bool bad = false; ///< what stands for the name says what is wrong
};

class TreePrinter
{
public:
  explicit TreePrinter(const Invocation& invocation)
      : pagerCommand_(invocation.has("--no-pager") ? "" : pagerCommand()), out_("-"),
        colours_(wantsColour(invocation) ? kOnTerminal : Colours{}),
        width_(static_cast<size_t>(host::terminalWidth().value_or(0))), paths_(invocation.has("--paths")),
        maxDepth_(invocation.number("--depth").value_or(kNoOffset)), ends_(invocation.has("--ends"))
  {
    if (const auto width = invocation.number("--width"))
    {
      width_ = static_cast<size_t>(std::min<uint64_t>(*width, 100000));
      strict_ = true;
    }
    const Dictionary names = dictionaryFor(invocation, invocation.arguments().at(0));
    for (const std::string& name : invocation.all("--only"))
    {
      const std::vector<uint16_t> ids = requireIds("--only", name, names);
      only_.insert(only_.end(), ids.begin(), ids.end());
    }
    setFolding(invocation);
  }

  /// Prints what `walker` hands out from `event` on; `base` is the depth that is not indented.
  void print(Walker& walker, Event& event, uint64_t base, bool oneNode, DamageNotices& notices)
  {
    std::optional<Progress> progress;
    if (pagerCommand_.empty())
    {
      progress.emplace("tree", walker.source());
    }
    else
    {
      pager_.emplace(pagerCommand_);
    }
    base_ = base;
    named_ = oneNode ? event.offset : kNoOffset;
    bool seen = oneNode; // on the way to it
    do
    {
      progress ? progress->at(event.offset) : void();
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
    pager_.reset(); // what is told behind the tree is told behind the pager
  }

  /// Prints each node as it comes.
  Status follow(const Invocation& invocation)
  {
    folding_.reset();
    inspect::FollowTold told;
    told.node = [this](const inspect::Arrival& arrival) {
      nodeLine(foundIn(arrival), arrival.node.depth);
    };
    return followFile(invocation, told, out_);
  }

  bool printedNothing() const { return lines_ == 0; }

private:
  void setFolding(const Invocation& invocation);
  bool isLeftOut(const Node& node) const;
  void fold(const Folded& folded);
  void indent(uint64_t level);
  void line(const Walker& walker, const Event& event, uint64_t base);
  void nodeLine(const FoundNode& found, uint64_t level);
  bool hasPaths() const { return paths_ || !only_.empty(); }
  void remarks(const Node& node);
  void begin(uint64_t offset, std::string_view size);
  void column(size_t begin, size_t width);
  void bad(std::string_view text);
  void type(std::string_view text);
  void value(std::string_view text);
  void put();

  std::string pagerCommand_;           ///< empty: none
  std::optional<host::Pager> pager_{}; ///< ends behind the output
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
  std::string text_{}; ///< of a line while it grows
  Parts parts_{};
};

void TreePrinter::indent(uint64_t level)
{
  text_.append(static_cast<size_t>(std::min(level, kMaxIndent)) * 2, ' ');
  if (level > kMaxIndent)
  {
    text_ += '(';
    appendNumber(text_, level);
    text_ += ") ";
  }
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
    begin(folded.offset, {});
    indent(paths_ ? 0 : level);
    text_ += text;
    put();
  }
}

/// What only ends a group is shown where it is asked for.
bool TreePrinter::isLeftOut(const Node& node) const
{
  const bool end = isEndNode(node) && !ends_ && node.offset() != named_;
  const bool named = std::find(only_.begin(), only_.end(), node.elm()) != only_.end();
  return only_.empty() ? end : !named;
}

void TreePrinter::remarks(const Node& node)
{
  static constexpr std::pair<NodeFlag, std::string_view> all[] = {
      {kOpen, "open"},
      {kOverrun, "cut: claims more than there is"},
      {kNoPair, "no eye/size pair"},
      {kBadPair, "damaged eye/size pair"},
      {kBadGroupType, "64-bit children announced by a 32-bit header"}};
  bool first = true;
  for (const auto& [flag, remark] : all)
  {
    if (node.has(flag))
    {
      text_ += std::exchange(first, false) ? "" : ", ";
      text_ += remark;
    }
  }
}

void TreePrinter::line(const Walker& walker, const Event& event, uint64_t base)
{
  const uint64_t level = event.depth - std::min(base, event.depth);
  if (event.what == What::damaged)
  {
    begin(event.offset, std::to_string(event.length));
    hasPaths() ? walker.appendPath(text_, event, PathStyle::brief) : indent(level);
    bad("damaged");
    value(event.reason);
    put();
    return;
  }
  const bool between = event.offset + event.length < walker.source().size();
  if (event.what == What::unread ||
      (event.what == What::zeros && (between || event.length > uint64_t{2} * 1024 * 1024)))
  {
    begin(event.offset, std::to_string(event.length));
    bad(event.what == What::zeros ? "zeros" : "unread");
    put();
    return;
  }
  if (event.what == What::nodeBegin)
  {
    nodeLine(foundIn(walker, event), level);
  }
}

void TreePrinter::nodeLine(const FoundNode& found, uint64_t level)
{
  const Node& node = found.node;
  if (level > maxDepth_ || isLeftOut(node))
  {
    return;
  }
  begin(node.offset(), node.has(kOpen) && node.size() != 0 ? "?" : std::to_string(node.size()));
  if (hasPaths())
  {
    text_ += found.path(PathStyle::brief);
  }
  else
  {
    indent(level);
    const size_t slash = text_.size();
    appendStep(text_, node, found.source.dictionary());
    text_.erase(slash, 1);
  }
  type(typeText(node.type()));
  value({});
  const size_t before = text_.size();
  if (!node.isGroup())
  {
    appendValueText(text_, found.source, found.form, node, width_ != 0 ? width_ : kWideLine);
  }
  const size_t behind = text_.size();
  if (node.flags != 0)
  {
    text_ += node.isGroup() ? "" : "  (";
    const size_t remarked = text_.size();
    remarks(node);
    text_.size() == remarked ? text_.resize(behind) : void(text_ += node.isGroup() ? "" : ")");
  }
  if (text_.size() == before)
  {
    text_.resize(parts_.typeEnd);
  }
  put();
}

/// Sets what was written from `begin` on to the right of a column.
void TreePrinter::column(size_t begin, size_t width)
{
  const size_t length = text_.size() - begin;
  text_.insert(begin, width - std::min(length, width), ' ');
}

void TreePrinter::begin(uint64_t offset, std::string_view size)
{
  text_.clear();
  appendHexOffset(text_, offset);
  column(0, 10);
  text_ += ' ';
  const size_t sizeBegin = text_.size();
  text_ += size;
  column(sizeBegin, 8);
  text_ += "  ";
  parts_ = {.name = text_.size()};
}

/// What stands for the name, or behind it, and is wrong.
void TreePrinter::bad(std::string_view text)
{
  const bool gap = text_.size() != parts_.name && text_.back() != ' ';
  text_ += gap ? " " : "";
  text_ += text;
  parts_.bad = true;
}

void TreePrinter::type(std::string_view text)
{
  parts_.nameEnd = text_.size();
  text_ += "  ";
  parts_.type = text_.size();
  text_ += text;
  parts_.typeEnd = text_.size();
}

void TreePrinter::value(std::string_view text)
{
  if (parts_.typeEnd == 0)
  {
    parts_.nameEnd = text_.size();
    parts_.type = parts_.typeEnd = text_.size() + 2;
  }
  text_ += "  ";
  text_ += text;
}

void TreePrinter::put()
{
  if (parts_.typeEnd == 0) // a name alone
  {
    parts_.nameEnd = parts_.type = parts_.typeEnd = text_.size();
  }
  if (width_ != 0)
  {
    const bool fits = strict_ || width_ >= parts_.type + 3;
    text_ = fits ? cutToWidth(text_, width_) : text_.substr(0, parts_.nameEnd);
  }
  text_ += '\n';
  ++lines_;
  if (*colours_.plain == '\0')
  {
    out_.write(text_);
    return;
  }
  const std::string_view line = std::string_view(text_).substr(0, text_.size() - 1);
  const auto part = [&](size_t begin, size_t end) {
    return std::string(line.substr(std::min(begin, line.size()), end - std::min(begin, end)));
  };
  out_.write(colours_.offset + part(0, parts_.name) + colours_.plain + (parts_.bad ? colours_.bad : colours_.name) +
             part(parts_.name, parts_.nameEnd) + colours_.plain + part(parts_.nameEnd, parts_.type) + colours_.type +
             part(parts_.type, parts_.typeEnd) + colours_.plain + part(parts_.typeEnd, line.size()) + "\n");
}

int run(const Invocation& invocation)
{
  TreePrinter printer(invocation);
  if (invocation.has("--follow"))
  {
    for (const char* const option : {"--at", "--fold"})
    {
      if (invocation.has(option))
      {
        throw Failure("tree: --follow and " + std::string(option) + " exclude each other");
      }
    }
    return printer.follow(invocation);
  }
  Stream stream = openStream(invocation);
  Walker walker(stream.bytes(), stream.form());
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
        "counts the others; damage among them is always shown. What is longer than the terminal goes through\n"
        "PAGER, less unless it is set; empty or cat: through none. Where the output is no terminal, and with\n"
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
         {.names = "--no-pager", .help = "no pager on a terminal"},
         {.names = "--width", .kind = ValueKind::number, .value = "N", .help = "cut lines to N columns; 0: never"},
         {.names = "--color",
          .kind = ValueKind::choice,
          .value = "WHEN",
          .help = "colour the output",
          .choices = {"auto", "always", "never"}},
         followOption()},
    .examples = {{"tav tree x.tav --depth 2", "the outline of a stream"},
                 {"tav tree x.tav --only hostName", "every host name with its path"},
                 {"tav tree day.tav --follow", "what is recorded, as it is"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
