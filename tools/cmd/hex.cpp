// tav hex: an annotated hex dump, each byte once.
#include <algorithm>
#include <array>
#include <utility>

#include "tav/inspect/locate.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
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
constexpr uint64_t kLong = uint64_t{64} * 1024; ///< of zeros it is asked again how many follow
constexpr uint64_t kMostOfPiece = 32 * kRow;    ///< bytes that are shown where no node begins

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
  void headerText(const Node& node);
  void pairText(const Node& node, uint64_t offset);
  void rows(uint64_t offset, uint64_t length);
  void row(uint64_t offset, std::span<const uint8_t> bytes);
  uint64_t pastHole(uint64_t offset, uint64_t done, uint64_t length);

  Stream& stream_;
  DamageNotices& notices_;
  Output out_;
  std::string text_{}; ///< of a line while it grows
};

void Dumper::headerText(const Node& node)
{
  text_ += node.is64() ? "64-bit header: size " : "32-bit header: size ";
  layout::isSizeUnknown(node.header) ? void(text_ += "unknown") : appendNumber(text_, node.size());
  if (node.is64())
  {
    text_ += ", info ";
    appendHexOffset(text_, node.info());
  }
  text_ += ", type ";
  appendNumber(text_, node.type());
  text_ += " (";
  text_ += typeText(node.type());
  text_ += node.isGroup() ? layout::hasChildren64(node.header) ? ", 64-bit children)" : ", 32-bit children)" : ")";
  text_ += ", element ";
  appendNumber(text_, node.elm());
}

void Dumper::pairText(const Node& node, uint64_t offset)
{
  const std::optional<uint64_t> distance = pairDistanceAt(stream_.bytes(), stream_.form(), offset);
  if (!distance)
  {
    text_ += "eye/size pair, the eye catcher is damaged";
    return;
  }
  const uint64_t back = offset - node.offset();
  text_ += "eye/size pair: distance ";
  appendNumber(text_, *distance);
  text_ += back == *distance ? "" : ", of " + std::to_string(back) + " back to the node";
}

void Dumper::heading(const Walker& walker, const Event& event)
{
  text_ = "; ";
  switch (event.what)
  {
  case What::nodeBegin:
    walker.appendPath(text_, event, PathStyle::brief);
    text_ += "\n;   ";
    headerText(event.node);
    break;
  case What::payload:
    if (event.node.elm() == TAV_ELM_CMN_END_HDR_EYE_SIZE && event.length == layout::kEyeSizeLength)
    {
      text_ += "  eye/size pair of the group";
      break;
    }
    text_ += "  payload: ";
    appendValueText(text_, stream_.bytes(), stream_.form(), event.node, 60);
    break;
  case What::extra: text_ += "  two uncounted bytes behind a UTF-8 string"; break;
  case What::padding: text_ += "  padding"; break;
  case What::pair:
    text_ += "  ";
    pairText(event.node, event.offset);
    break;
  case What::damaged: text_ += "damaged: " + event.reason; break;
  case What::zeros:
  {
    const bool between = event.offset + event.length < stream_.bytes().size();
    text_ += between ? "zeros between streams, " : "zeros behind the stream, ";
    text_ += counted(event.length, "byte");
    break;
  }
  case What::unread: text_ += "not looked at"; break;
  default: break;
  }
  text_ += '\n';
  out_.write(text_);
}

/// The row of zeros behind which one comes that has to be looked at, from the one at `done` on.
uint64_t Dumper::pastHole(uint64_t offset, uint64_t done, uint64_t length)
{
  const uint64_t next = std::min(length, stream_.bytes().zerosUntil(offset + done + kRow) - offset);
  const uint64_t last = (length - 1) / kRow;
  return std::max(done, std::min(next / kRow, last) * kRow - kRow);
}

void Dumper::rows(uint64_t offset, uint64_t length)
{
  std::array<uint8_t, kRow> room{};
  bool zeroBefore = false;
  bool starred = false;
  for (uint64_t done = 0; done < length; done += kRow)
  {
    const auto bytes = std::span(room).first(static_cast<size_t>(std::min<uint64_t>(kRow, length - done)));
    stream_.bytes().read(offset + done, bytes);
    const bool zero = std::all_of(bytes.begin(), bytes.end(), [](uint8_t byte) { return byte == 0; });
    if (zero && zeroBefore && done + kRow < length)
    {
      // Rows of zeros are told once: where addresses jump, xxd -r fills with zeros. The last row shows where they end.
      const bool asks = !starred || (offset + done) % kLong < kRow;
      out_.write(std::exchange(starred, true) ? "" : "*\n");
      done = asks ? pastHole(offset, done, length) : done;
      continue;
    }
    zeroBefore = zero;
    starred = false;
    row(offset + done, bytes);
  }
}

/// "00000010: 6162 0a                                  ab."
void Dumper::row(uint64_t offset, std::span<const uint8_t> bytes)
{
  constexpr std::string_view digits = "0123456789abcdef";
  constexpr size_t columns = kRow / 2 * 5;
  constexpr size_t addressWidth = 8;
  text_.clear();
  appendNumber(text_, offset, 16);
  text_.insert(0, addressWidth - std::min(addressWidth, text_.size()), '0');
  text_ += ": ";
  const size_t begin = text_.size();
  text_.resize(begin + columns + 1 + bytes.size() + 1, ' ');
  char* number = text_.data() + begin;
  char* letter = number + columns + 1;
  for (size_t i = 0; i < bytes.size(); ++i)
  {
    const uint8_t byte = bytes[i];
    number[0] = digits[byte >> 4U];
    number[1] = digits[byte & 0xFU];
    number += i % 2 == 1 ? 3 : 2;
    *letter++ = byte >= 0x20 && byte < 0x7F ? static_cast<char>(byte) : '.';
  }
  *letter = '\n';
  out_.write(text_);
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
    const Path path = pathOf(invocation.text("--path"), stream.bytes().dictionary());
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
