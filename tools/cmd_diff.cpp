// tav diff: what two streams have not in common.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "tools/diff_align.h"
#include "tools/diff_index.h"
#include "tools/json_text.h"
#include "tools/options.h"
#include "tools/output.h"
#include "tools/report.h"
#include "tools/value.h"

namespace tav::tool
{

namespace
{

constexpr size_t kMaxChildren = 200'000; ///< of one group that are compared at once
constexpr uint64_t kPiece = uint64_t{64} * 1024;
constexpr uint64_t kMaxJsonValue = uint64_t{64} * 1024;

/// How far apart two numbers may be: "10", "0.5%".
struct Tolerance
{
  double amount = 0;
  bool percent = false;

  static Tolerance parse(std::string text)
  {
    Tolerance tolerance;
    tolerance.percent = text.ends_with('%');
    text.resize(text.size() - (tolerance.percent ? 1 : 0));
    // Not every standard library has from_chars for this type; strtod takes blanks, hexadecimal digits and words too.
    const bool plain = !text.empty() && text.find_first_not_of("0123456789.e-") == std::string::npos;
    char* end = nullptr;
    tolerance.amount = std::strtod(text.c_str(), &end);
    if (!plain || end != text.c_str() + text.size() || !(tolerance.amount >= 0))
    {
      throw Failure("diff: --tolerance: '" + text + "' is no number", "10 is, and 0.5%");
    }
    return tolerance;
  }

  bool holds(uint64_t difference, uint64_t larger) const
  {
    const double limit = percent ? static_cast<double>(larger) * amount / 100 : amount;
    return static_cast<double>(difference) <= limit;
  }
};

class Comparer
{
public:
  Comparer(const Invocation& invocation, DiffIndex& a, DiffIndex& b)
      : a_(a), b_(b), out_("-"), tolerance_(Tolerance::parse(invocation.text("--tolerance", "0"))),
        json_(invocation.has("--json")), colour_(!json_ && wantsColour(invocation))
  {
  }

  /// Compares everything; true when there is a difference.
  bool run()
  {
    levels_.push_back({0, a_.rows(), 0, b_.rows()});
    while (!levels_.empty())
    {
      Level& level = levels_.back();
      if (level.at < level.pairs.size())
      {
        const auto [first, second] = level.pairs[level.at++];
        compare(first, second);
      }
      else if (level.fromA < level.endA || level.fromB < level.endB)
      {
        fill(level);
      }
      else
      {
        levels_.pop_back();
      }
    }
    out_.commit();
    return found_;
  }

private:
  struct Level
  {
    uint64_t fromA; ///< children that were not aligned so far
    uint64_t endA;
    uint64_t fromB;
    uint64_t endB;
    Pairs pairs{};
    size_t at = 0;
  };

  static std::vector<Child> children(DiffIndex& index, uint64_t& from, uint64_t end)
  {
    std::vector<Child> list;
    while (from < end && list.size() < kMaxChildren)
    {
      const Row row = index.row(from);
      const uint32_t kind = row.elm | (row.isGroup() ? 0x10000u : row.isDamaged() ? 0x20000u
                                                                                  : 0u);
      list.push_back({from, row.hash, row.key, kind});
      from = row.next;
    }
    return list;
  }

  void fill(Level& level)
  {
    level.at = 0;
    const std::vector<Child> first = children(a_, level.fromA, level.endA);
    const std::vector<Child> second = children(b_, level.fromB, level.endB);
    level.pairs = align(first, second);
  }

  void compare(uint64_t first, uint64_t second);
  bool samePayload(const Row& a, const Row& b);
  bool near(const Row& a, const Row& b);
  void tell(char sign, uint64_t first, uint64_t second, const std::string& what);
  void tellText(char sign, uint64_t first, uint64_t second, const std::string& what);
  void tellJson(char sign, uint64_t first, uint64_t second);
  void putSide(std::string& text, DiffIndex& index, uint64_t number, const std::string& suffix);

  DiffIndex& a_;
  DiffIndex& b_;
  Output out_;
  Tolerance tolerance_;
  bool json_;
  bool colour_;
  bool found_ = false;
  std::vector<Level> levels_{};
};

void Comparer::compare(uint64_t first, uint64_t second)
{
  if (first == kNoRow || second == kNoRow)
  {
    const bool removed = second == kNoRow;
    tell(removed ? '-' : '+', first, second, removed ? a_.text(first) : b_.text(second));
    return;
  }
  const Row a = a_.row(first);
  const Row b = b_.row(second);
  if (a.info != b.info)
  {
    tell('~', first, second, "info  " + hexOffset(a.info) + " -> " + hexOffset(b.info));
  }
  if (a.isGroup())
  {
    levels_.push_back({first + 1, a.next, second + 1, b.next});
    return;
  }
  if (a.type != b.type)
  {
    tell('~', first, second, a_.text(first) + " -> " + b_.text(second));
  }
  else if (!samePayload(a, b) && !near(a, b))
  {
    constexpr uint64_t most = 200;
    tell('~', first, second, DiffIndex::kindText(a) + "  " + a_.value(a, most) + " -> " + b_.value(b, most));
  }
}

bool Comparer::samePayload(const Row& a, const Row& b)
{
  if (a.size != b.size)
  {
    return false;
  }
  for (uint64_t at = 0; at < a.size; at += kPiece)
  {
    if (a_.piece(a, at, kPiece) != b_.piece(b, at, kPiece))
    {
      return false;
    }
  }
  return true;
}

bool Comparer::near(const Row& a, const Row& b)
{
  const bool number = a.type >= TAV_TYPE_UINT8 && a.type <= TAV_TYPE_SINT64 && a.size == b.size &&
                      a.size == layout::typeInfo(a.type).valueSize;
  if (!number || tolerance_.amount == 0)
  {
    return false;
  }
  const std::string textA = a_.value(a, kPiece);
  const std::string textB = b_.value(b, kPiece);
  const auto magnitude = [](const std::string& text) {
    return std::strtoull(text.c_str() + (text.starts_with('-') ? 1 : 0), nullptr, 10);
  };
  const uint64_t sizeA = magnitude(textA);
  const uint64_t sizeB = magnitude(textB);
  const uint64_t larger = std::max(sizeA, sizeB);
  const bool sameSign = textA.starts_with('-') == textB.starts_with('-');
  // Of numbers with different signs the sum is at most 2^63 + 2^63 - 1.
  return tolerance_.holds(sameSign ? larger - std::min(sizeA, sizeB) : sizeA + sizeB, larger);
}

void Comparer::tell(char sign, uint64_t first, uint64_t second, const std::string& what)
{
  found_ = true;
  json_ ? tellJson(sign, first, second) : tellText(sign, first, second, what);
}

void Comparer::tellText(char sign, uint64_t first, uint64_t second, const std::string& what)
{
  const std::string path = first != kNoRow ? a_.path(first) : b_.path(second);
  const std::string other = first != kNoRow && second != kNoRow ? b_.path(second) : path;
  const char* const start = !colour_ ? "" : sign == '-' ? "\033[31m"
                                        : sign == '+'   ? "\033[32m"
                                                        : "\033[33m";
  out_.write(std::string(start) + sign + " " + path + (other != path ? " (" + other + ")" : "") +
             (colour_ ? "\033[0m" : "") + "  " + what + "\n");
}

void Comparer::putSide(std::string& text, DiffIndex& index, uint64_t number, const std::string& suffix)
{
  const Row row = index.row(number);
  const auto put = [&](const std::string& name, const std::string& value) {
    text += ", \"" + name + suffix + "\": ";
    appendJsonString(text, value);
  };
  put("path", index.path(number));
  text += ", \"offset" + suffix + "\": " + std::to_string(row.offset);
  put("type", row.isDamaged() ? "damaged" : typeText(row.type));
  if (!row.isGroup())
  {
    put("value", index.value(row, kMaxJsonValue));
  }
  if (row.info != 0)
  {
    text += ", \"info" + suffix + "\": " + std::to_string(row.info);
  }
}

void Comparer::tellJson(char sign, uint64_t first, uint64_t second)
{
  std::string text = std::string("{\"change\": \"") + (sign == '-' ? "removed" : sign == '+' ? "added"
                                                                                             : "changed") +
                     "\"";
  if (first != kNoRow)
  {
    putSide(text, a_, first, "");
  }
  if (second != kNoRow)
  {
    putSide(text, b_, second, first != kNoRow ? "Now" : "");
  }
  out_.write(text + "}\n");
}

int run(const Invocation& invocation)
{
  const std::string& nameA = invocation.arguments().at(0);
  const std::string& nameB = invocation.arguments().at(1);
  if (nameA == "-" && nameB == "-")
  {
    throw Failure("diff: only one of the two can be standard input");
  }
  std::vector<Path> ignored;
  for (const std::string& path : invocation.all("--ignore"))
  {
    if (path == "/")
    {
      throw Failure("diff: --ignore / leaves nothing to compare");
    }
    ignored.emplace_back(path).requireNames();
  }
  Tolerance::parse(invocation.text("--tolerance", "0")); // told before the work begins
  const auto from = [&](const char* own) {
    return invocation.has(own) ? invocation.number(own) : invocation.number("--from");
  };
  Stream a = openStream(invocation, nameA, from("--from-a").value_or(0));
  Stream b = openStream(invocation, nameB, from("--from-b").value_or(0));
  DamageNotices noticesA(a);
  DamageNotices noticesB(b);
  DiffIndex indexA(a, ignored, noticesA);
  DiffIndex indexB(b, ignored, noticesB);
  const bool different = Comparer(invocation, indexA, indexB).run();
  tellStatistics(invocation, a.bytes());
  tellStatistics(invocation, b.bytes());
  const bool damagedA = noticesA.tell() != kFine;
  const bool damagedB = noticesB.tell() != kFine;
  return different || damagedA || damagedB ? kFindings : kFine;
}

const Registration registration{{
    .place = 120,
    .name = "diff",
    .arguments = "A B",
    .inputs = 2,
    .summary = "what two streams do not have in common, by path",
    .description =
        "Lists what B lacks (-), has in addition (+) or has with another value (~). Byte order, header widths,\n"
        "padding, pairs and end elements are no difference; types, values, info bits and damaged bytes are.\n"
        "Groups of one name are matched by their keys (node_number, db_name, hostName) where they have\n"
        "some; other elements of one name by what is equal in their order, and else one after the other.\n"
        "The order of elements with different names is no difference. Exit status 1: there are some,\n"
        "or damage was passed over, which is told on standard error.\n\n"
        "Nodes are listed in a temporary file; in memory are only the children of the groups on the way\n"
        "to the place that is compared. Of a group with more than 200,000 children, 200,000 at a time\n"
        "are compared, so that what moved farther is told as removed and added.",
    .options = {{.names = "--ignore",
                 .kind = ValueKind::text,
                 .value = "PATH",
                 .help = "leave out the nodes that PATH leads to and all below them",
                 .many = true},
                {.names = "--tolerance",
                 .kind = ValueKind::text,
                 .value = "N",
                 .help = "numbers may differ by N, or by N% of the larger one"},
                {.names = "--from-a",
                 .kind = ValueKind::number,
                 .value = "OFFSET",
                 .help = "read A as if it began at OFFSET; --from is for both"},
                {.names = "--from-b", .kind = ValueKind::number, .value = "OFFSET", .help = "the same for B"},
                {.names = "--json", .help = "one JSON object a difference"},
                {.names = "--color",
                 .kind = ValueKind::choice,
                 .value = "WHEN",
                 .help = "colour the output",
                 .choices = {"auto", "always", "never"}}},
    .examples = {{"tav diff yesterday.tav today.tav", "what changed"},
                 {"tav diff a.tav b.tav --ignore '**/memory' --tolerance 1%", "without what always changes"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
