// What the page asks while it shows a file: the form, rows of the tree, a node.
#include "web/module/host.h"
#include "web/module/session.h"

using namespace tav;
using namespace tav::web;
using inspect::Event;
using inspect::Form;
using inspect::Walker;
using inspect::What;

namespace
{

constexpr uint64_t kMostValue = uint64_t{1} << 20U; ///< bytes of a value that is shown whole
constexpr uint64_t kCounted = 512;                  ///< rows that are counted between looks at what was asked

void putRecognition(Json& out, const inspect::Recognition& found)
{
  out.flag("isStream", found.isStream).flag("damagedStart", found.damagedStart).key("form");
  putForm(out, found.form);
  out.key("because").begin('[');
  for (const inspect::Reason& reason : found.because)
  {
    out.string(reason.sentence);
  }
  out.end(']').key("alternatives").begin('[');
  for (const Form& form : found.alternatives)
  {
    putForm(out, form);
  }
  out.end(']');
}

void putLevel(Json& out, uint32_t number, const Level& level)
{
  out.begin('{')
      .field("level", number)
      .field("rows", level.rows())
      .flag("done", level.isCounted())
      .field("place", level.place())
      .end('}');
}

class Text final : public inspect::Sink
{
public:
  void write(std::string_view bytes) override { text += bytes; }
  std::string text{};
};

/// The JSON form of a node, and of all below it.
std::string jsonOf(inspect::ByteSource& source, inspect::StreamWalk& walk, Event event)
{
  Text out;
  inspect::JsonWriter writer(source, walk.form(), out, inspect::JsonStyle::lines, false);
  writer.begin();
  const uint64_t offset = event.node.offset();
  writer.add(walk.walker(), event);
  while (walk.next(event) && out.text.size() < kMostValue)
  {
    writer.add(walk.walker(), event);
    if (event.what == What::nodeEnd && event.node.offset() == offset)
    {
      break;
    }
  }
  writer.end();
  return std::move(out.text);
}

} // namespace

/// Room for an argument of the next call, to be filled with bytes.
TAV_WEB_EXPORT(tavText)
char* tavText(uint32_t slot, uint32_t size)
{
  std::string& text = Session::here().texts.at(slot);
  text.resize(size);
  return text.data();
}

TAV_WEB_EXPORT(tavAnswer)
const char* tavAnswer()
{
  return Session::here().answer.text().data();
}

TAV_WEB_EXPORT(tavAnswerSize)
uint32_t tavAnswerSize()
{
  return static_cast<uint32_t>(Session::here().answer.text().size());
}

/// Text 0: the file's name; text 1: a dictionary as JSON, or nothing. The choices are those of the page.
TAV_WEB_EXPORT(tavOpen)
void tavOpen(uint32_t order, uint32_t bits, uint32_t padding)
{
  answer([&](Session& session, Json& out) {
    session.levels.clear();
    session.dictionary = {};
    if (!session.texts[1].empty())
    {
      inspect::MemoryText text("own names", session.texts[1]);
      session.dictionary = inspect::Dictionary::read(text);
    }
    session.source = openSource(session.texts[0], session.dictionary);
    session.choice =
        choiceOf(static_cast<Choice>(order), static_cast<Choice>(bits), static_cast<Choice>(padding));
    session.recognition = recognise(*session.source, session.choice);
    const bool isGiven = order + bits + padding > 0;
    const auto kind = isGiven ? std::nullopt : otherKindOf(*session.source, session.recognition);
    out.field("size", session.source->size());
    putRecognition(out, session.recognition);
    if (kind)
    {
      out.field("otherKind", kind->text);
    }
    session.levels.push_back(std::make_unique<Level>(*session.source, session.form()));
  });
}

/// Counts rows of a level on.
TAV_WEB_EXPORT(tavCount)
void tavCount(uint32_t number)
{
  answer([&](Session& session, Json& out) {
    Level& level = session.level(number);
    level.count(kCounted);
    out.key("level");
    putLevel(out, number, level);
  });
}

TAV_WEB_EXPORT(tavRows)
void tavRows(uint32_t number, uint64_t from, uint32_t most)
{
  answer([&](Session& session, Json& out) {
    Level& level = session.level(number);
    out.key("rows").begin('[');
    level.read(from, most, [&](const inspect::StreamWalk& walk, const Event& event) {
      putRow(out, walk.walker(), event);
    });
    out.end(']');
  });
}

/// The level below a row.
TAV_WEB_EXPORT(tavExpand)
void tavExpand(uint32_t number, uint64_t row)
{
  answer([&](Session& session, Json& out) {
    auto below = session.level(number).below(row);
    if (below == nullptr)
    {
      throw inspect::Error("this row has nothing below it");
    }
    below->count(kCounted);
    session.levels.push_back(std::move(below));
    out.key("level");
    putLevel(out, static_cast<uint32_t>(session.levels.size() - 1), *session.levels.back());
  });
}

/// The rows that lead to an offset, from the roots down to the innermost node around it.
TAV_WEB_EXPORT(tavReveal)
void tavReveal(uint64_t offset)
{
  answer([&](Session& session, Json& out) {
    std::unique_ptr<Level> own;
    Level* level = &session.level(0);
    out.key("rows").begin('[');
    while (level != nullptr)
    {
      const auto row = level->rowOf(offset);
      if (!row)
      {
        break;
      }
      out.number(*row);
      bool into = false;
      level->read(*row, 1, [&](const inspect::StreamWalk&, const Event& event) {
        into = event.what == What::nodeBegin && event.node.isGroup() &&
               offset >= event.offset + event.length && offset < event.node.limit;
      });
      auto below = into ? level->below(*row) : nullptr;
      own = std::move(below);
      level = own.get();
    }
    out.end(']');
  });
}

/// All that the page shows of a row: its node's value as far as it is shown, and the whole path.
TAV_WEB_EXPORT(tavNode)
void tavNode(uint32_t number, uint64_t row)
{
  answer([&](Session& session, Json& out) {
    session.level(number).read(row, 1, [&](const inspect::StreamWalk& walk, const Event& event) {
      const Walker& walker = walk.walker();
      const Form& form = walk.form();
      out.key("row");
      putRow(out, walker, event);
      if (event.what != What::nodeBegin)
      {
        return;
      }
      out.field("path", walker.path(event));
      out.field("info", event.node.info()).key("form");
      putForm(out, form);
      if (!event.node.isGroup())
      {
        const auto text = plainText(session.bytes(), form, event.node, kMostValue);
        out.flag("whole", text.has_value());
        out.field("value", text ? std::string_view(*text) : std::string_view());
      }
    });
  });
}

/// The JSON form of a row's node with all below it, a line a node, as far as a megabyte of it.
TAV_WEB_EXPORT(tavJson)
void tavJson(uint32_t number, uint64_t row)
{
  answer([&](Session& session, Json& out) {
    session.level(number).read(row, 1, [&](inspect::StreamWalk& walk, const Event& event) {
      if (event.what == What::nodeBegin)
      {
        out.field("json", jsonOf(session.bytes(), walk, event));
      }
    });
  });
}
