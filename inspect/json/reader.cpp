#include "inspect/json/reader.h"

#include <algorithm>
#include <utility>

#include "inspect/path/names.h"
#include "tav/inspect/path.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

std::optional<uint16_t> elementNamed(std::string_view name, const Dictionary& dictionary)
{
  if (const std::optional<uint16_t> id = soleIdOf(name, dictionary))
  {
    return id;
  }
  const std::vector<uint16_t> ids = idsOf(name, dictionary);
  if (!ids.empty())
  {
    std::string list;
    for (const uint16_t id : ids)
    {
      list += (list.empty() ? "#" : ", #") + std::to_string(id);
    }
    throw BuildError("several elements have the name " + inspect::quoted(name) + ": " + list);
  }
  return std::nullopt;
}

BuildError unknownElement(std::string_view name, const Dictionary& dictionary)
{
  const std::string similar = similarNames(name, dictionary);
  return BuildError("no element has the name " + inspect::quoted(name) +
                    (similar.empty() ? "" : "; did you mean " + similar + "?"));
}

void DocumentReader::fail(const std::string& sentence) const
{
  Problem problem;
  problem.file = source_.name() + ": line " + std::to_string(source_.line()) + ", byte " +
                 std::to_string(source_.position());
  problem.path = pointer();
  problem.sentence = sentence;
  throw Error(problem);
}

std::string DocumentReader::pointer() const
{
  std::string text;
  for (const Level& level : levels_)
  {
    const bool array = level.where == Where::nodes || level.where == Where::repeated || level.where == Where::pieces ||
                       level.where == Where::bytes;
    if (!array && level.key.empty())
    {
      continue;
    }
    text += '/';
    for (const char c : array ? std::to_string(level.index) : level.key)
    {
      text += c == '~' ? "~0" : c == '/' ? "~1"
                                         : std::string(1, c);
    }
  }
  // A key is any text; what steers terminals is written as escapes.
  const std::string safe = inspect::quoted(text);
  return safe.substr(1, safe.size() - 2);
}

void DocumentReader::read()
{
  JsonParser parser(source_, *this);
  try
  {
    while (source_.skipBlanks())
    {
      if (started_ && !lines_)
      {
        fail("there is more behind the document");
      }
      started_ = true;
      parser.parseValue();
    }
    if (!started_)
    {
      fail("the document is empty");
    }
    beginNodes();
    closeTo(0);
  }
  catch (const JsonSyntaxError& error)
  {
    fail("no JSON: " + std::string(error.what()));
  }
  catch (const BuildError& error)
  {
    fail(error.what());
  }
}

void DocumentReader::push(Where where)
{
  Level level;
  level.where = where;
  levels_.push_back(std::move(level));
}

void DocumentReader::beginNodes()
{
  if (!std::exchange(formSet_, true))
  {
    encoder_.setForm(form_);
  }
}

void DocumentReader::startObject()
{
  if (levels_.empty())
  {
    push(lines_ ? Where::node : Where::document);
    draft_ = Draft();
    return;
  }
  Level& level = top();
  switch (level.where)
  {
  case Where::document: startForm(); break;
  case Where::nodes:
    draft_ = Draft();
    push(Where::node);
    break;
  case Where::node: startObjectProperty(level.key); break;
  case Where::shortNode:
    level.key.starts_with('$') ? startObjectProperty(level.key.substr(1)) : push(Where::shortNode);
    break;
  case Where::shortList: push(Where::shortNode); break;
  case Where::repeated:
    startChild(level.elm);
    push(Where::shortNode);
    break;
  default: fail("an object cannot stand here");
  }
}

void DocumentReader::startForm()
{
  const std::string name = top().key;
  if (name == "nodes")
  {
    if (top().given)
    {
      fail("the nodes are given twice");
    }
    beginNodes();
    top().given = true;
    push(Where::shortList);
    return;
  }
  if (name != "form")
  {
    fail("an object cannot stand here");
  }
  if (formSet_)
  {
    fail("the form must stand before the nodes");
  }
  if (std::exchange(formGiven_, true))
  {
    fail("the form is given twice");
  }
  push(Where::form);
}

void DocumentReader::key(std::string_view name)
{
  top().key = name;
  switch (top().where)
  {
  case Where::document: documentKey(name); break;
  case Where::shortNode:
    if (!name.starts_with('$'))
    {
      if (!top().begun)
      {
        beginGroup(top());
      }
      startChild(name);
    }
    break;
  case Where::shortList: startChild(name); break;
  default: break;
  }
}

void DocumentReader::documentKey(std::string_view name)
{
  static constexpr std::string_view known[] = {"tav", "form", "lines", "nodes"};
  if (std::find(std::begin(known), std::end(known), name) == std::end(known))
  {
    if (formSet_ || lines_ || top().given)
    {
      fail("the key " + inspect::quoted(name) + " is not known here");
    }
    // Without an envelope, every key is an element.
    beginNodes();
    top().where = Where::shortList;
    startChild(name);
  }
}

void DocumentReader::startChild(uint16_t elm)
{
  draft_ = Draft();
  draft_.properties.elm = elm;
}

void DocumentReader::startChild(std::string_view name)
{
  const auto elm = elementNamed(name, dictionary_);
  if (!elm)
  {
    throw unknownElement(name, dictionary_);
  }
  startChild(*elm);
}

void DocumentReader::endObject()
{
  switch (top().where)
  {
  case Where::node:
  case Where::shortNode:
    top().key.clear();
    endNode(top());
    break;
  case Where::date:
    draft_.value.assign(reinterpret_cast<const char*>(&date_), sizeof date_);
    break;
  default: break;
  }
  close();
}

/// Leaves a level; what comes next in the one around it is its next item.
void DocumentReader::close()
{
  levels_.pop_back();
  if (!levels_.empty())
  {
    ++top().index;
  }
}

void DocumentReader::beginGroup(Level& level)
{
  if (draft_.given != Given::nothing)
  {
    throw BuildError("a node has either a value or children");
  }
  if (draft_.properties.type && !layout::isGroupType(*draft_.properties.type))
  {
    throw BuildError(typeText(*draft_.properties.type) + " has no children");
  }
  encoder_.beginGroup(draft_.properties);
  level.begun = true;
}

void DocumentReader::endNode(Level& level)
{
  if (level.begun)
  {
    encoder_.endGroup();
    return;
  }
  if (lines_ && levels_.size() == 1)
  {
    endLine();
    return;
  }
  const bool group =
      draft_.properties.type ? layout::isGroupType(*draft_.properties.type) : level.where == Where::shortNode;
  if (group && draft_.given == Given::nothing)
  {
    beginGroup(level);
    encoder_.endGroup();
    return;
  }
  encoder_.finish(draft_);
}

void DocumentReader::endLine()
{
  if (!draft_.begun)
  {
    closeTo(draft_.depth.value_or(0));
  }
  if (draft_.properties.type && layout::isGroupType(*draft_.properties.type) && draft_.given == Given::nothing)
  {
    draft_.properties.endElement = false; // every node has a line of its own
    encoder_.beginGroup(draft_.properties);
    return;
  }
  encoder_.finish(draft_);
}

void DocumentReader::closeTo(uint64_t depth)
{
  if (depth > encoder_.depth())
  {
    throw BuildError("depth " + std::to_string(depth) + " is more than one below the line before");
  }
  while (encoder_.depth() > depth)
  {
    encoder_.endGroup();
  }
}

void DocumentReader::startArray()
{
  if (levels_.empty() && !lines_)
  {
    beginNodes();
    push(Where::nodes);
    return;
  }
  if (levels_.empty())
  {
    fail("an array cannot stand here");
  }
  Level& level = top();
  switch (level.where)
  {
  case Where::document:
    if (level.key != "nodes" || level.given)
    {
      fail(level.key == "nodes" ? "the nodes are given twice" : "an array cannot stand here");
    }
    beginNodes();
    level.given = true;
    push(Where::nodes);
    break;
  case Where::node: startArrayProperty(level.key); break;
  case Where::shortNode:
  case Where::shortList:
    if (level.key.starts_with('$'))
    {
      startArrayProperty(level.key.substr(1));
      break;
    }
    push(Where::repeated);
    top().elm = *draft_.properties.elm;
    break;
  default: fail("an array cannot stand here");
  }
}

void DocumentReader::endArray()
{
  close();
}

void DocumentReader::startObjectProperty(std::string_view name)
{
  if (name == "children" && !top().begun)
  {
    beginGroup(top());
    push(Where::shortList);
    return;
  }
  if (name != "value")
  {
    fail("an object cannot stand here");
  }
  setGiven(Given::date);
  date_ = {};
  push(Where::date);
}

void DocumentReader::startArrayProperty(std::string_view name)
{
  if (name == "children" && !top().begun)
  {
    beginGroup(top());
    push(Where::nodes);
    return;
  }
  const bool bytes = name == "bytes" || name == "damaged" || name == "unread";
  if (name != "value" && !bytes)
  {
    fail("an array cannot stand here");
  }
  if (name == "value")
  {
    const bool numbers = draft_.properties.type == TAV_TYPE_UINT64_ARRAY;
    setGiven(numbers ? Given::array : Given::nothing);
  }
  else
  {
    setGiven(name == "bytes" ? Given::bytes : name == "damaged" ? Given::damaged
                                                                : Given::unread);
  }
  push(bytes ? Where::bytes : Where::pieces);
}

} // namespace tav::inspect
