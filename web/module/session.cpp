#include "web/module/session.h"

#include <stdexcept>

#include "web/module/host.h"

namespace tav::web
{

using inspect::Event;
using inspect::Node;
using inspect::Walker;
using inspect::What;

namespace
{

constexpr uint64_t kShownValue = 160; ///< bytes of a payload that a row shows

const char* kindOf(const Event& event)
{
  switch (event.what)
  {
  case What::damaged:
    return "damaged";
  case What::zeros:
    return "zeros";
  case What::unread:
    return "unread";
  default:
    return event.node.isGroup() ? "group" : "data";
  }
}

void putRemarks(Json& out, const Node& node)
{
  static constexpr struct
  {
    inspect::NodeFlag flag;
    const char* text;
  } kRemarks[] = {{inspect::kOpen, "size unknown"},
                  {inspect::kOverrun, "claims more than there is"},
                  {inspect::kNoPair, "its pair is missing"},
                  {inspect::kBadPair, "its pair is damaged"},
                  {inspect::kBadGroupType, "a 32-bit header that announces 64-bit children"},
                  {inspect::kWrongSize, "its size is wrong"},
                  {inspect::kAfterDamage, "nodes may be missing before it"}};
  out.key("remarks").begin('[');
  for (const auto& remark : kRemarks)
  {
    if (node.has(remark.flag))
    {
      out.string(remark.text);
    }
  }
  out.end(']');
}

void putOwnElement(Json& out, const inspect::ByteSource& source, uint16_t elm)
{
  const inspect::OwnElement* const own = source.dictionary().find(elm);
  if (own != nullptr)
  {
    out.field("unit", own->unit).field("meaning", own->text).field("kindOfValue", kindText(own->kind));
  }
}

} // namespace

Session& Session::here()
{
  static Session session;
  return session;
}

inspect::ByteSource& Session::bytes() const
{
  if (source == nullptr)
  {
    throw inspect::Error("no file is open");
  }
  return *source;
}

Level& Session::level(uint32_t number) const
{
  if (number >= levels.size() || levels[number] == nullptr)
  {
    throw inspect::Error("there is no such level");
  }
  return *levels[number];
}

std::unique_ptr<inspect::ByteSource> openSource(const std::string& name, const inspect::Dictionary& dictionary)
{
  KORFileOpenParam param;
  param.pPath = name.c_str();
  param.options = KOR_FILE_READ;
  uint32_t code = TAV_RC_OK;
  auto file = std::make_unique<TAVSSFile>(&param, &code);
  file->ioUnit = 4 * inspect::ByteSource::kPage;
  if (code != TAV_RC_OK)
  {
    inspect::failAt(name, code);
  }
  auto source = std::make_unique<inspect::ByteSource>(name, std::move(file), Session::kRing);
  source->setDictionary(dictionary);
  return source;
}

inspect::FormChoice choiceOf(Choice order, Choice bits, Choice padding)
{
  inspect::FormChoice choice;
  if (order != Choice::findOut)
  {
    choice.swapped = order == Choice::second; // the module's own order is little-endian
  }
  if (bits != Choice::findOut)
  {
    choice.root64 = bits == Choice::second;
  }
  if (padding != Choice::findOut)
  {
    choice.aligned = padding == Choice::second;
  }
  return choice;
}

void putForm(Json& out, const inspect::Form& form)
{
  out.begin('{')
      .field("order", orderText(form))
      .field("bits", form.root64 ? 64U : 32U)
      .flag("padded", form.aligned)
      .field("text", formText(form))
      .end('}');
}

void putRow(Json& out, const Walker& walker, const Event& event)
{
  out.begin('{').field("kind", kindOf(event)).field("offset", event.offset);
  if (event.what != What::nodeBegin)
  {
    out.field("length", event.length).field("reason", event.reason).end('}');
    return;
  }
  const Node& node = event.node;
  inspect::ByteSource& source = walker.source();
  std::string step;
  appendStep(step, node, source.dictionary());
  out.field("step", step.substr(1))
      .field("path", walker.path(event, inspect::PathStyle::brief))
      .field("type", inspect::typeText(node.type()))
      .field("elm", node.elm())
      .field("header", node.headerLength());
  const bool open = node.has(inspect::kOpen);
  const uint64_t end = node.isGroup() ? node.limit : node.payloadOffset() + node.size();
  out.field("end", end).flag("open", open).field("info", node.info());
  if (!node.isGroup())
  {
    out.field("value", valueText(source, walker.form(), node, kShownValue));
  }
  if (node.flags != 0)
  {
    putRemarks(out, node);
  }
  putOwnElement(out, source, node.elm());
  out.end('}');
}

void emit(const Json& json)
{
  hostEmit(json.text().data(), static_cast<uint32_t>(json.text().size()));
}

void tellProgress(uint64_t offset)
{
  hostProgress(offset);
}

} // namespace tav::web
