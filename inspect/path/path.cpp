#include "tav/inspect/path.hpp"

#include <algorithm>
#include <array>
#include <charconv>
#include <functional>
#include <unordered_map>

#include "inspect/dictionary/builtIn.h"
#include "inspect/path/names.h"
#include "inspect/walk/order.h"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/similar.hpp"
#include "tav/path/names.hpp"

namespace tav::inspect
{

namespace paths = detail::paths;

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

using Names = std::unordered_map<std::string_view, std::vector<uint16_t>>;

/// Every name with the ids that bear it, as they stand and without the blanks around them.
const Names& names()
{
  static const Names table = [] {
    Names made;
    forEachBuiltIn([&made](const BuiltIn& entry) {
      for (const std::string_view name : paths::namesOf(entry.tag, entry.name))
      {
        auto& ids = made[name];
        if (entry.isElement() && std::find(ids.begin(), ids.end(), entry.id) == ids.end())
        {
          ids.push_back(entry.id);
        }
      }
    });
    return made;
  }();
  return table;
}

/// Tags that stand for one id each and can be written in a path. They are asked for at every node.
class ClearTags
{
public:
  ClearTags()
  {
    forEachBuiltIn([this](const BuiltIn& entry) {
      const std::string_view tag = builtInTag(entry.id);
      const auto found = names().find(tag);
      if (isCleanName(tag) && found != names().end() && found->second == std::vector<uint16_t>{entry.id})
      {
        places_[entry.id] = static_cast<uint16_t>(tags_.size());
        tags_.push_back(tag);
      }
    });
  }

  /// Empty where there is none.
  std::string_view tagOf(uint16_t elm) const { return tags_[places_[elm]]; }

private:
  std::vector<std::string_view> tags_{std::string_view()}; ///< the first is that of elements without one
  std::array<uint16_t, 65536> places_{};
};

/// "#12" or "12"
std::optional<uint16_t> idInDigits(std::string_view name)
{
  name.remove_prefix(name.starts_with('#') ? 1 : 0);
  const char* const end = name.data() + name.size();
  uint16_t id = 0;
  const auto result = std::from_chars(name.data(), end, id);
  return result.ec == std::errc() && result.ptr == end ? std::optional(id) : std::nullopt;
}

} // namespace

std::string elementText(uint16_t elm)
{
  return elementText(elm, {});
}

std::string elementText(uint16_t elm, const Dictionary& dictionary)
{
  std::string text;
  appendElementText(text, elm, dictionary);
  return text;
}

std::string_view clearTagOf(uint16_t elm, const Dictionary& dictionary)
{
  static const ClearTags clear;
  const OwnElement* const own = dictionary.find(elm);
  return own != nullptr ? std::string_view(own->tag) : clear.tagOf(elm);
}

void appendElementText(std::string& out, uint16_t elm, const Dictionary& dictionary)
{
  if (const std::string_view tag = clearTagOf(elm, dictionary); !tag.empty())
  {
    out += tag;
    return;
  }
  out += '#';
  appendNumber(out, elm);
}

void appendStep(std::string& path, const Node& node)
{
  appendStep(path, node, {});
}

void appendStep(std::string& path, const Node& node, const Dictionary& dictionary)
{
  path += '/';
  appendElementText(path, node.elm(), dictionary);
  appendPlace(path, node.ordinal, node.offset());
}

void appendPlace(std::string& path, uint64_t ordinal, uint64_t offset)
{
  if (ordinal == 0)
  {
    path += "[@";
    appendHexOffset(path, offset);
    path += ']';
  }
  else if (ordinal > 1)
  {
    path += '[';
    appendNumber(path, ordinal);
    path += ']';
  }
}

std::string offsetPath(const Node& node)
{
  return offsetPath(node, {});
}

std::string offsetPath(const Node& node, const Dictionary& dictionary)
{
  std::string path = "/**";
  if (node.header.hdrType != 0)
  {
    Node unnumbered = node;
    unnumbered.ordinal = 0;
    appendStep(path, unnumbered, dictionary);
  }
  return path;
}

std::optional<uint16_t> soleIdOf(std::string_view name, const Dictionary& dictionary)
{
  if (const std::optional<uint16_t> id = idInDigits(name))
  {
    return id;
  }
  if (const OwnElement* const own = dictionary.find(name))
  {
    return own->id;
  }
  const auto found = names().find(name);
  return found != names().end() && found->second.size() == 1 ? std::optional(found->second.front()) : std::nullopt;
}

std::vector<uint16_t> idsOf(std::string_view name)
{
  return idsOf(name, {});
}

std::vector<uint16_t> idsOf(std::string_view name, const Dictionary& dictionary)
{
  if (const std::optional<uint16_t> id = idInDigits(name))
  {
    return {*id};
  }
  if (const OwnElement* const own = dictionary.find(name))
  {
    return {own->id};
  }
  const auto found = names().find(name);
  return found == names().end() ? std::vector<uint16_t>() : found->second;
}

std::string similarNames(std::string_view name)
{
  return similarNames(name, {});
}

std::string similarNames(std::string_view name, const Dictionary& dictionary)
{
  if (name.size() > 64)
  {
    return {};
  }
  std::vector<std::pair<size_t, std::string_view>> close;
  const auto consider = [&](std::string_view tag) {
    const size_t distance = editDistance(name, tag);
    if (distance <= mostSlips(name))
    {
      close.emplace_back(distance, tag);
    }
  };
  forEachBuiltIn([&](const BuiltIn& entry) { consider(entry.tag); });
  for (const OwnElement& element : dictionary.elements())
  {
    consider(element.tag);
  }
  putInOrder(close, std::less<>());
  close.erase(std::unique(close.begin(), close.end()), close.end());
  std::string text;
  for (size_t i = 0; i < std::min<size_t>(3, close.size()); ++i)
  {
    text += (i == 0 ? "" : ", ") + std::string(close[i].second);
  }
  return text;
}

Path pathOf(std::string_view text)
{
  return pathOf(text, {});
}

Path pathOf(std::string_view text, const Dictionary& dictionary)
{
  PathFault fault;
  Path path(text, dictionary.names(), fault);
  if (fault.kind != PathFault::Kind::none)
  {
    throw pathError(text, fault);
  }
  return path;
}

Error pathError(std::string_view text, const PathFault& fault)
{
  constexpr size_t most = 200;
  const std::string shown = std::string(text.substr(0, most)) + (text.size() > most ? "..." : "");
  const bool unknown = fault.kind == PathFault::Kind::unknownName;
  Problem problem{.sentence = "path '" + shown + "': column " + std::to_string(fault.column) + ": " + fault.sentence};
  problem.hint = unknown && fault.nearest.empty() ? "'tav elements' lists the names; #12345 stands for an id" : "";
  return Error(problem, unknown ? Trouble::notFound : Trouble::refused);
}

} // namespace tav::inspect
