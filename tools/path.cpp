#include "tools/path.h"

#include <algorithm>
#include <charconv>
#include <limits>
#include <unordered_map>

#include "tav/dictionary.hpp"
#include "tools/similar.h"

namespace tav::tool
{

namespace
{

bool isCleanName(std::string_view text)
{
  const auto clean = [](char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' || c == '-' ||
           c == '.';
  };
  const bool digitFirst = !text.empty() && text.front() >= '0' && text.front() <= '9';
  return !text.empty() && !digitFirst && std::all_of(text.begin(), text.end(), clean);
}

std::string_view trimmed(std::string_view text)
{
  while (!text.empty() && text.front() == ' ')
  {
    text.remove_prefix(1);
  }
  while (!text.empty() && text.back() == ' ')
  {
    text.remove_suffix(1);
  }
  return text;
}

using Names = std::unordered_map<std::string_view, std::vector<uint16_t>>;

/// Every name with the ids that bear it, as they stand and without the blanks around them.
const Names& names()
{
  static const Names table = [] {
    Names made;
    for (const dictionary::Entry& entry : dictionary::entries())
    {
      for (const std::string_view name : {entry.tag, entry.name, entry.constant})
      {
        for (const std::string_view form : {name, trimmed(name)})
        {
          auto& ids = made[form];
          if (entry.constant != "INVALID_ELEMENT" && std::find(ids.begin(), ids.end(), entry.id) == ids.end())
          {
            ids.push_back(entry.id);
          }
        }
      }
    }
    return made;
  }();
  return table;
}

template<class Number>
bool parseNumber(std::string_view text, Number& value, int base)
{
  const char* const end = text.data() + text.size();
  const auto result = std::from_chars(text.data(), end, value, base);
  return result.ec == std::errc() && result.ptr == end;
}

} // namespace

std::string elementText(uint16_t elm)
{
  const std::string_view tag = dictionary::tagOf(elm);
  if (isCleanName(tag))
  {
    const auto found = names().find(tag);
    if (found != names().end() && found->second.size() == 1 && found->second.front() == elm)
    {
      return std::string(tag);
    }
  }
  std::string id = std::to_string(elm);
  id.insert(id.begin(), '#');
  return id;
}

void appendStep(std::string& path, const Node& node)
{
  path += '/';
  path += elementText(node.elm());
  if (node.ordinal == 0)
  {
    path += "[@";
    path += hexOffset(node.offset());
    path += ']';
  }
  else if (node.ordinal > 1)
  {
    path += '[';
    path += std::to_string(node.ordinal);
    path += ']';
  }
}

std::string offsetPath(const Node& node)
{
  std::string path = "/**";
  if (node.header.hdrType != 0)
  {
    Node unnumbered = node;
    unnumbered.ordinal = 0;
    appendStep(path, unnumbered);
  }
  return path;
}

std::vector<uint16_t> idsOf(std::string_view name)
{
  const std::string_view digits = name.starts_with('#') ? name.substr(1) : name;
  uint16_t id = 0;
  if (parseNumber(digits, id, 10))
  {
    return {id};
  }
  const auto found = names().find(name);
  return found == names().end() ? std::vector<uint16_t>() : found->second;
}

std::string similarNames(std::string_view name)
{
  if (name.size() > 64)
  {
    return {};
  }
  std::vector<std::pair<size_t, std::string_view>> close;
  for (const dictionary::Entry& entry : dictionary::entries())
  {
    const size_t distance = editDistance(name, entry.tag);
    if (distance <= mostSlips(name))
    {
      close.emplace_back(distance, entry.tag);
    }
  }
  std::sort(close.begin(), close.end());
  close.erase(std::unique(close.begin(), close.end()), close.end());
  std::string text;
  for (size_t i = 0; i < std::min<size_t>(3, close.size()); ++i)
  {
    text += (i == 0 ? "" : ", ") + std::string(close[i].second);
  }
  return text;
}

void Path::fail(const std::string& sentence, std::string hint) const
{
  throw Failure("path '" + text_ + "': " + sentence, std::move(hint));
}

Path::Path(std::string_view text)
    : text_(text)
{
  if (text == "/")
  {
    steps_.push_back({.kind = Step::Kind::any});
    return;
  }
  if (text.starts_with('/'))
  {
    text.remove_prefix(1);
  }
  if (text.empty())
  {
    fail("names no node", "a path looks like /system/host[2]/hostName");
  }
  while (true)
  {
    const size_t slash = text.find('/');
    addStep(text.substr(0, slash));
    if (slash == std::string_view::npos)
    {
      return;
    }
    text.remove_prefix(slash + 1);
  }
}

void Path::requireNames() const
{
  if (!unknown_.empty())
  {
    fail(unknown_, hint_);
  }
}

Problem Path::noMatch(const std::string& file) const
{
  return {.file = file,
          .path = text_,
          .sentence = unknown_.empty() ? "no match" : "no match: " + unknown_,
          .hint = hint_};
}

void Path::addStep(std::string_view text)
{
  const std::string number = "step " + std::to_string(steps_.size() + 1);
  const size_t bracket = text.find('[');
  const std::string_view name = text.substr(0, bracket);
  Step step;
  if (name.empty())
  {
    fail(number + " is empty", "write one slash between two steps and none at the end");
  }
  if (name == "*" || name == "**")
  {
    step.kind = name == "*" ? Step::Kind::any : Step::Kind::anyLevels;
  }
  else
  {
    step.ids = idsOf(name);
    if (step.ids.empty() && (name.front() == '#' || (name.front() >= '0' && name.front() <= '9')))
    {
      fail(number + ": '" + std::string(name) + "' is no id", "ids go from 0 to 65535");
    }
    if (step.ids.empty() && name.find(']') != std::string_view::npos)
    {
      fail(number + " has a ] without a [");
    }
    if (step.ids.empty() && unknown_.empty())
    {
      const std::string similar = similarNames(name);
      unknown_ = "no element has the name '" + std::string(name) + "'";
      hint_ =
          similar.empty() ? "'tav elements' lists the names; #12345 stands for an id" : "did you mean " + similar + "?";
    }
  }
  if (bracket != std::string_view::npos)
  {
    if (text.back() != ']')
    {
      fail(number + " has a [ without a ] at its end");
    }
    if (step.kind == Step::Kind::anyLevels)
    {
      fail(number + ": ** takes no index", "'**/name[2]' is the second of its name in each group");
    }
    addIndex(text.substr(bracket + 1, text.size() - bracket - 2), step);
  }
  steps_.push_back(std::move(step));
}

void Path::addIndex(std::string_view index, Step& step) const
{
  if (index.starts_with('@'))
  {
    const bool hexadecimal = index.starts_with("@0x") || index.starts_with("@0X");
    if (!parseNumber(index.substr(hexadecimal ? 3 : 1), step.offset, hexadecimal ? 16 : 10))
    {
      fail("'" + std::string(index) + "' is no offset", "an offset looks like [@0x1a40]");
    }
    return;
  }
  if (!parseNumber(index, step.ordinal, 10) || step.ordinal == 0)
  {
    fail("'" + std::string(index) + "' is no index", "the first of its name is [1]");
  }
}

PathMatcher::PathMatcher(const Path& path)
    : steps_(path.steps())
{
  starts_.push_back(0);
  bool match = false;
  enter(0, match);
}

/// Adds a position to the level that is being made, and those that `**` reaches from it without a level of its own.
void PathMatcher::enter(size_t state, bool& match)
{
  for (;; ++state)
  {
    if (state == steps_.size())
    {
      match = true;
      return;
    }
    if (std::find(states_.begin() + static_cast<ptrdiff_t>(starts_.back()), states_.end(), state) != states_.end())
    {
      return;
    }
    states_.push_back(state);
    counts_.push_back(0);
    if (steps_[state].kind != Path::Step::Kind::anyLevels)
    {
      return;
    }
  }
}

bool PathMatcher::matches(const Node& node)
{
  // The positions of level d are those that the children at depth d are tried against.
  const auto level = static_cast<size_t>(node.depth);
  if (level + 1 < starts_.size())
  {
    states_.resize(starts_[level + 1]);
    counts_.resize(states_.size());
    starts_.resize(level + 1);
  }
  const size_t first = starts_.back();
  const size_t last = states_.size();
  starts_.push_back(last);
  bool match = false;
  for (size_t i = first; i < last; ++i)
  {
    const size_t state = states_[i];
    const Path::Step& step = steps_[state];
    const bool isNode = !layout::isEndElement(node.elm()); // what only ends a group counts where it is named
    if (step.kind == Path::Step::Kind::anyLevels)
    {
      isNode ? enter(state, match) : void();
      continue;
    }
    const bool named = (step.kind == Path::Step::Kind::any && isNode) ||
                       std::find(step.ids.begin(), step.ids.end(), node.elm()) != step.ids.end();
    counts_[i] += named ? 1 : 0;
    if (named && (step.ordinal == 0 || step.ordinal == counts_[i]) &&
        (step.offset == kNoOffset || step.offset == node.offset()))
    {
      enter(state + 1, match);
    }
  }
  return match;
}

} // namespace tav::tool
