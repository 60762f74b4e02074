// Work that goes through a whole file: it hands out what it finds as it goes. To stop it, the page ends the worker.
#include <algorithm>
#include <cctype>
#include <optional>
#include <string>

#include "web/module/host.h"
#include "web/module/pageFile.h"
#include "web/module/session.h"

using namespace tav;
using namespace tav::web;
using inspect::Event;
using inspect::Form;
using inspect::Node;
using inspect::Walker;
using inspect::What;

namespace
{

constexpr uint64_t kMostSearched = uint64_t{1} << 20U; ///< bytes of a value that texts are looked for in

/// Progress is told every so many nodes.
class Pace
{
public:
  void at(uint64_t offset)
  {
    if ((++count_ & 0xFFFU) == 0)
    {
      tellProgress(offset);
    }
  }

private:
  uint64_t count_ = 0;
};

void emitNode(const Walker& walker, const Event& event)
{
  Json json;
  putRow(json, walker, event);
  emit(json);
}

bool equalsFolded(char a, char b)
{
  return std::tolower(static_cast<unsigned char>(a)) == std::tolower(static_cast<unsigned char>(b));
}

bool contains(std::string_view text, std::string_view wanted)
{
  return std::search(text.begin(), text.end(), wanted.begin(), wanted.end(), equalsFolded) != text.end();
}

/// The places of a run of bytes.
uint64_t findBytes(inspect::ByteSource& source, std::string_view wanted, uint64_t most)
{
  std::string text;
  std::vector<uint8_t> piece(size_t{256} * 1024);
  uint64_t found = 0;
  for (uint64_t from = 0; from < source.size() && found < most;)
  {
    const size_t got = source.read(from, piece);
    text.append(reinterpret_cast<const char*>(piece.data()), got);
    const uint64_t base = from + got - text.size();
    for (size_t at = text.find(wanted); at != std::string::npos && found < most; at = text.find(wanted, at + 1))
    {
      Json json;
      json.begin('{').field("kind", "bytes").field("offset", base + at).field("length", wanted.size()).end('}');
      emit(json);
      ++found;
    }
    text.erase(0, text.size() - std::min(text.size(), wanted.size() - 1));
    from += got;
    tellProgress(from);
    if (got == 0)
    {
      break;
    }
  }
  return found;
}

void putTotals(Json& out, const inspect::Account& account)
{
  const inspect::RecoveryTotals& totals = account.totals;
  out.key("form");
  putForm(out, account.form);
  out.field("bytes", account.bytes).field("kept", totals.kept).field("lost", totals.lost);
  out.field("unread", totals.unread).field("zeros", totals.zeros).field("written", account.written);
  out.field("nodes", totals.nodes).field("ends", totals.ends).field("closed", totals.closed);
  out.field("made", totals.made).field("pairs", totals.pairs).field("losses", totals.losses);
  out.field("doubts", totals.doubts);
}

template<class List>
void putPlaces(Json& out, std::string_view name, const List& places)
{
  out.key(name).begin('[');
  for (const auto& place : places)
  {
    out.begin('{').field("offset", place.offset).field("length", place.length).field("reason", place.reason).end('}');
  }
  out.end(']');
}

void putSide(Json& out, std::string_view name, const std::optional<inspect::DiffSide>& side)
{
  if (side)
  {
    out.key(name).begin('{').field("path", side->path).field("offset", side->offset).field("type", side->type);
    if (side->value)
    {
      out.field("value", *side->value);
    }
    out.end('}');
  }
}

void emitDifference(const inspect::Difference& difference)
{
  static constexpr const char* kChanges[] = {"removed", "added", "changed"};
  Json json;
  json.begin('{').field("change", kChanges[static_cast<size_t>(difference.change)]);
  putSide(json, "before", difference.before);
  putSide(json, "after", difference.after);
  json.field("sentence", difference.sentence).end('}');
  emit(json);
}

struct StreamStart
{
  uint64_t offset;
  Form form;
};

/// Checks a file stream by stream, each in its own form.
class CheckOfStreams
{
public:
  CheckOfStreams(inspect::ByteSource& source, bool notes, uint64_t most)
      : source_(source), notes_(notes), most_(most)
  {
  }

  /// Checks from a place on, and returns where a stream in another form begins.
  std::optional<StreamStart> run(const StreamStart& start)
  {
    other_.reset();
    inspect::Checker checker(
        source_, start.form, [this](inspect::RuleId rule) { return notes_ || !ruleOf(rule).note; },
        [&](const inspect::Finding& finding) { take(start, finding); }, inspect::PathStyle::brief,
        Walker(source_, start.form, {.offset = start.offset, .wide = start.form.root64}).state(), false);
    while (!other_ && checker.step())
    {
      pace_.at(checker.position());
    }
    nodes_ += checker.nodes();
    ends_ += checker.endElements();
    return other_;
  }

  void put(Json& out) const
  {
    out.field("nodes", nodes_).field("ends", ends_).field("findings", findings_).field("listed", listed_);
  }

private:
  void take(const StreamStart& start, const inspect::Finding& finding)
  {
    const std::optional<Form> form =
        finding.otherStream && finding.offset > start.offset ? streamFormAt(source_, start.form, finding.offset)
                                                             : std::nullopt;
    if (form)
    {
      other_ = StreamStart{finding.offset, *form};
      return;
    }
    ++findings_;
    if (listed_ == most_)
    {
      return;
    }
    ++listed_;
    const inspect::Rule& rule = ruleOf(finding.rule);
    Json json;
    json.begin('{').field("rule", rule.id).flag("note", rule.note).field("offset", finding.offset);
    json.field("length", finding.length).field("path", finding.path).field("sentence", finding.sentence);
    emit(json.field("why", rule.why).end('}'));
  }

  inspect::ByteSource& source_;
  bool notes_;
  uint64_t most_;
  Pace pace_{};
  std::optional<StreamStart> other_{};
  uint64_t nodes_ = 0;
  uint64_t ends_ = 0;
  uint64_t findings_ = 0;
  uint64_t listed_ = 0;
};

/// "name=path" in lines.
std::vector<inspect::TableColumn> columnsOf(std::string_view text)
{
  std::vector<inspect::TableColumn> columns;
  while (!text.empty())
  {
    const size_t end = std::min(text.find('\n'), text.size());
    const std::string_view line = text.substr(0, end);
    text.remove_prefix(std::min(end + 1, text.size()));
    const size_t equals = line.find('=');
    if (equals != std::string_view::npos)
    {
      columns.push_back({std::string(line.substr(0, equals)), std::string(line.substr(equals + 1))});
    }
  }
  return columns;
}

void emitRows(const inspect::Table& table)
{
  static constexpr const char* kKinds[] = {"", "number", "number", "number", "number", "time", "text", "bytes"};
  Json json;
  json.begin('{').key("kinds").begin('[');
  for (size_t column = 0; column < table.columns().size(); ++column)
  {
    json.string(kKinds[static_cast<size_t>(table.type(column))]);
  }
  json.end(']').key("cells").begin('[');
  for (uint64_t row = 0; row < table.rows(); ++row)
  {
    json.begin('[');
    for (size_t column = 0; column < table.columns().size(); ++column)
    {
      const inspect::Cell cell = table.cell(column, row);
      cell.kind == inspect::CellKind::missing ? json.null() : json.string(cellText(cell));
    }
    json.end(']');
  }
  emit(json.end(']').end('}'));
}

} // namespace

/// Text 0: a path. Emits the nodes that it leads to.
TAV_WEB_EXPORT(tavFindPath)
void tavFindPath(uint32_t most)
{
  answer([&](Session& session, Json& out) {
    const inspect::Path path = inspect::pathOf(session.texts[0], session.dictionary);
    inspect::PathMatcher matcher(path);
    inspect::StreamWalk walk(session.bytes(), session.form());
    Event event;
    Pace pace;
    uint64_t found = 0;
    while (found < most && goToMatch(walk, matcher, event, [&](const Event& seen) { pace.at(seen.offset); }))
    {
      emitNode(walk.walker(), event);
      ++found;
    }
    out.field("found", found).flag("more", found == most);
  });
}

/// Text 0: what names or values have to contain, in any case of ASCII letters.
TAV_WEB_EXPORT(tavFindText)
void tavFindText(uint32_t most)
{
  answer([&](Session& session, Json& out) {
    inspect::ByteSource& source = session.bytes();
    inspect::StreamWalk walk(source, session.form());
    Event event;
    Pace pace;
    uint64_t found = 0;
    std::string text;
    while (found < most && walk.next(event))
    {
      pace.at(event.offset);
      if (event.what != What::nodeBegin || isEndPiece(event))
      {
        continue;
      }
      text.clear();
      inspect::appendElementText(text, event.node.elm(), session.dictionary);
      text += '\n';
      if (!event.node.isGroup())
      {
        static_cast<void>(appendPlainText(text, source, walk.form(), event.node, kMostSearched));
      }
      if (contains(text, session.texts[0]))
      {
        emitNode(walk.walker(), event);
        ++found;
      }
    }
    out.field("found", found).flag("more", found == most);
  });
}

/// Text 0: bytes in hexadecimal.
TAV_WEB_EXPORT(tavFindBytes)
void tavFindBytes(uint32_t most)
{
  answer([&](Session& session, Json& out) {
    std::string digits = session.texts[0];
    std::erase(digits, ' ');
    std::string wanted;
    if (!inspect::appendHexBytes(wanted, digits) || wanted.empty())
    {
      throw inspect::Error("these are no bytes in hexadecimal", "two digits a byte, as in 0a ff");
    }
    const uint64_t found = findBytes(session.bytes(), wanted, most);
    out.field("found", found).flag("more", found == most);
  });
}

/// Emits what is wrong, up to a number of findings; `notes`: what is remarkable but no defect, too. Each stream is
/// checked in its own form.
TAV_WEB_EXPORT(tavCheck)
void tavCheck(uint32_t notes, uint32_t most)
{
  answer([&](Session& session, Json& out) {
    CheckOfStreams check(session.bytes(), notes != 0, most);
    for (std::optional<StreamStart> next = StreamStart{0, session.form()}; next;)
    {
      next = check.run(*next);
    }
    check.put(out);
  });
}

/// Text 0: the name under which the worker keeps the sound stream.
TAV_WEB_EXPORT(tavRecover)
void tavRecover()
{
  answer([&](Session& session, Json& out) {
    PageFile file(session.texts[0]);
    inspect::PatchFile patches(file.file());
    inspect::RecoverBestOptions options;
    options.progress = tellProgress;
    const inspect::Outcome outcome = recoverBest(session.bytes(), session.recognition, patches, options);
    patches.flush();
    putTotals(out, outcome.taken);
    putPlaces(out, "lostPlaces", outcome.taken.losses);
    putPlaces(out, "doubtfulNodes", outcome.taken.doubts);
    if (outcome.other)
    {
      out.key("other").begin('{');
      putTotals(out, *outcome.other);
      out.end('}');
    }
  });
}

/// Text 0: the other file's name. Emits each difference.
TAV_WEB_EXPORT(tavDiff)
void tavDiff(uint32_t most)
{
  answer([&](Session& session, Json& out) {
    const auto other = openSource(session.texts[0], session.dictionary);
    const inspect::Recognition form = recognise(*other);
    if (!form.isStream)
    {
      throw inspect::Error(inspect::Problem{.file = session.texts[0], .sentence = "this is no stream"});
    }
    inspect::DiffOptions options;
    options.mostValue = 1024;
    Pace pace;
    options.seen = [&](inspect::ByteSource&, const Walker&, const Event& event) {
      pace.at(event.offset);
    };
    uint64_t found = 0;
    diff({.source = session.bytes(), .form = session.form()}, {.source = *other, .form = form.form}, options,
         [&](const inspect::Difference& difference) {
           if (found++ < most)
           {
             emitDifference(difference);
           }
         });
    out.field("found", found).flag("more", found > most);
  });
}

/// Text 0: the rows' path; text 1: the columns, "name=path" in lines. Emits rows as texts.
TAV_WEB_EXPORT(tavTable)
void tavTable(uint32_t most)
{
  answer([&](Session& session, Json& out) {
    const inspect::TableQuery query(session.texts[0], columnsOf(session.texts[1]), {}, session.dictionary);
    inspect::TableOptions options;
    options.onDamage = inspect::OnDamage::skip;
    uint64_t passedOver = 0;
    options.passedOver = [&](const inspect::PassedOver&) {
      ++passedOver;
    };
    inspect::TableReader reader(session.bytes(), session.form(), query, options);
    session.bytes().tellOfPieces(tellProgress);
    uint64_t rows = 0;
    for (bool more = true; more && rows < most;)
    {
      inspect::Table table(query);
      more = reader.next(table, 1000);
      rows += table.rows();
      emitRows(table);
    }
    session.bytes().tellOfPieces({});
    out.field("rows", rows).field("passedOver", passedOver).flag("more", rows >= most);
  });
}
