// tav hex: an annotated hex dump, each byte once.
#include <algorithm>
#include <array>
#include <cstdio>
#include <utility>

#include "tav/inspect/locate.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/value.hpp"
#include "tav/inspect/walker.hpp"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/progress.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

constexpr size_t kRow = 16;
constexpr uint64_t kMostOfPiece = 32 * kRow; ///< bytes that are shown where no node begins

class Dumper
{
public:
  Dumper(Stream& stream, DamageNotices& notices)
      : stream_(stream), notices_(notices), out_("-") {}

  /// Dumps from `event` on, one node with all below it or everything.
  void dump(Walker& walker, Event& event, bool oneNode)
  {
    Progress progress("hex", stream_.bytes());
    const uint64_t base = event.depth;
    bool seen = oneNode; // on the way to it
    do
    {
      progress.at(event.offset);
      if (!std::exchange(seen, false))
      {
        notices_.see(walker, event);
      }
      if (event.what == What::nodeEnd)
      {
        if (oneNode && event.depth <= base)
        {
          break;
        }
        continue;
      }
      heading(walker, event);
      rows(event.offset, event.length);
    } while (walker.next(event));
    out_.commit();
  }

  /// Dumps all bytes of what is no stream.
  void dumpAll(const std::string& sentence)
  {
    if (stream_.bytes().size() != 0)
    {
      out_.write("; " + sentence + "\n");
    }
    rows(0, stream_.bytes().size());
    out_.commit();
  }

  /// Dumps from an offset on what is left of the piece that `event` stands for, for it is no node's first byte.
  void dumpWithin(const Walker& walker, const Event& event, uint64_t offset)
  {
    out_.write("; no node begins at " + hexOffset(offset) + ", which lies in " +
               walker.path(event, PathStyle::brief) + "\n");
    heading(walker, event);
    const uint64_t left = event.length - (offset - event.offset);
    rows(offset, std::min(left, kMostOfPiece));
    if (left > kMostOfPiece)
    {
      out_.write("; and " + counted(left - kMostOfPiece, "byte") + " more of it\n");
    }
    out_.commit();
  }

private:
  void heading(const Walker& walker, const Event& event);
  std::string headerText(const Node& node) const;
  std::string pairText(const Node& node, uint64_t offset);
  void rows(uint64_t offset, uint64_t length);

  Stream& stream_;
  DamageNotices& notices_;
  Output out_;
};

std::string Dumper::headerText(const Node& node) const
{
  std::string text = (node.is64() ? "64-bit header: size " : "32-bit header: size ") +
                     (layout::isSizeUnknown(node.header) ? "unknown" : std::to_string(node.size()));
  if (node.is64())
  {
    char info[40];
    std::snprintf(info, sizeof info, ", info 0x%x", static_cast<unsigned>(node.info()));
    text += info;
  }
  text += ", type " + std::to_string(node.type()) + " (" + typeText(node.type());
  text += node.isGroup() ? layout::hasChildren64(node.header) ? ", 64-bit children)" : ", 32-bit children)" : ")";
  return text + ", element " + std::to_string(node.elm());
}

std::string Dumper::pairText(const Node& node, uint64_t offset)
{
  const std::optional<uint64_t> distance = pairDistanceAt(stream_.bytes(), stream_.form(), offset);
  if (!distance)
  {
    return "eye/size pair, the eye catcher is damaged";
  }
  const uint64_t back = offset - node.offset();
  std::string text = "eye/size pair: distance " + std::to_string(*distance);
  return back == *distance ? text : text + ", of " + std::to_string(back) + " back to the node";
}

void Dumper::heading(const Walker& walker, const Event& event)
{
  std::string text;
  switch (event.what)
  {
  case What::nodeBegin: text = walker.path(event, PathStyle::brief) + "\n;   " + headerText(event.node); break;
  case What::payload:
    text = "  " + std::string(event.node.elm() == TAV_ELM_CMN_END_HDR_EYE_SIZE && event.length == layout::kEyeSizeLength
                                  ? "eye/size pair of the group"
                                  : "payload: " + valueText(stream_.bytes(), stream_.form(), event.node, 60));
    break;
  case What::extra: text = "  two uncounted bytes behind a UTF-8 string"; break;
  case What::padding: text = "  padding"; break;
  case What::pair: text = "  " + pairText(event.node, event.offset); break;
  case What::damaged: text = "damaged: " + event.reason; break;
  case What::zeros:
  {
    const bool between = event.offset + event.length < stream_.bytes().size();
    text = std::string("zeros ") + (between ? "between streams, " : "behind the stream, ") +
           counted(event.length, "byte");
    break;
  }
  case What::unread: text = "not looked at"; break;
  default: break;
  }
  out_.write("; " + text + "\n");
}

void Dumper::rows(uint64_t offset, uint64_t length)
{
  std::array<uint8_t, kRow> bytes{};
  bool zeroBefore = false;
  bool starred = false;
  for (uint64_t done = 0; done < length; done += kRow)
  {
    const auto count = static_cast<size_t>(std::min<uint64_t>(kRow, length - done));
    stream_.bytes().read(offset + done, std::span(bytes).first(count));
    const bool zero = std::all_of(bytes.begin(), bytes.end(), [](uint8_t byte) { return byte == 0; });
    if (zero && zeroBefore && done + kRow < length)
    {
      // Rows of zeros are told once: where addresses jump, xxd -r fills with zeros. The last row shows where they end.
      out_.write(std::exchange(starred, true) ? "" : "*\n");
      continue;
    }
    zeroBefore = zero;
    starred = false;
    char row[128];
    const unsigned long long place = offset + done;
    int at = std::snprintf(row, sizeof row, "%08llx: ", place);
    for (size_t i = 0; i < kRow; ++i)
    {
      at += i < count ? std::snprintf(row + at, sizeof row - static_cast<size_t>(at), i % 2 == 1 ? "%02x " : "%02x",
                                      static_cast<unsigned>(bytes[i]))
                      : std::snprintf(row + at, sizeof row - static_cast<size_t>(at), i % 2 == 1 ? "   " : "  ");
    }
    std::string line(row, static_cast<size_t>(at));
    line += ' ';
    for (size_t i = 0; i < count; ++i)
    {
      line += bytes[i] >= 0x20 && bytes[i] < 0x7F ? static_cast<char>(bytes[i]) : '.';
    }
    out_.write(line + "\n");
  }
}

int run(const Invocation& invocation)
{
  Stream stream = openStream(invocation, true);
  Walker walker(stream.bytes(), stream.form());
  Event event;
  DamageNotices notices(stream);
  Dumper dumper(stream, notices);
  const Seen seen = [&](const Event& passed) { notices.see(walker, passed); };
  bool oneNode = true;
  if (invocation.has("--at") && invocation.has("--path"))
  {
    throw Failure("hex: --at and --path exclude each other");
  }
  if (!stream.isStream() && (!invocation.has("--at") || stream.bytes().size() == 0))
  {
    if (!invocation.has("--path"))
    {
      dumper.dumpAll(noStream(stream).sentence);
    }
    throw Failure(kTooDamaged, noStream(stream));
  }
  if (const auto at = invocation.number("--at"))
  {
    if (findOffset(stream.bytes(), walker, event, *at, seen))
    {
      event.reason = stream.isStream() ? event.reason : noStream(stream).sentence;
      dumper.dumpWithin(walker, event, *at);
      tellStatistics(invocation, stream.bytes());
      if (!stream.isStream())
      {
        throw Failure(kTooDamaged, noStream(stream));
      }
      notices.tell();
      return kFindings;
    }
  }
  else if (invocation.has("--path"))
  {
    const Path path = pathOf(invocation.text("--path"));
    PathMatcher matcher(path);
    if (!goToMatch(walker, matcher, event, seen))
    {
      notices.tell();
      throw Failure(kFindings, Problem{.file = stream.bytes().name(), .path = path.text(), .sentence = "no match"});
    }
  }
  else
  {
    oneNode = false;
    if (!walker.next(event))
    {
      return kFine;
    }
  }
  dumper.dump(walker, event, oneNode);
  tellStatistics(invocation, stream.bytes());
  return notices.tell();
}

const Registration registration{{
    .place = 110,
    .name = "hex",
    .arguments = "FILE",
    .summary = "annotated hex dump: each byte once, with what it is",
    .description =
        "Rows are as those of xxd, so that 'xxd -r' makes the bytes again; lines that begin with ; tell what\n"
        "the rows below them are. Rows of zeros are told once, with a * below them. Bytes that\n"
        "are no part of a node are dumped as damaged, and the exit status is then 1. It is also 1 when no node\n"
        "begins at the OFFSET of --at: then the bytes from there on are dumped, up to the next piece, at most 512.",
    .options =
        {{.names = "--at", .kind = ValueKind::number, .value = "OFFSET", .help = "the node at OFFSET and all below it"},
         {.names = "--path", .kind = ValueKind::text, .value = "PATH", .help = "the first node that PATH leads to"}},
    .examples = {{"tav hex x.tav --path /system/host", "the bytes of a group"},
                 {"tav hex x.tav | grep -v '^;' | xxd -r > same", "back to bytes"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
