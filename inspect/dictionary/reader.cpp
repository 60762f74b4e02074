#include "inspect/dictionary/reader.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <utility>

#include "inspect/dictionary/builtIn.h"
#include "tav/inspect/path.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/value.hpp"
#include "tav/path/names.hpp"

namespace tav::inspect
{

namespace
{

constexpr size_t kLongestTag = 128;

/// What the XML form calls things that are no nodes.
constexpr std::array<std::string_view, 5> kTaken = {"tav", "element", "damaged", "zeros", "unread"};

/// Whether a tag can stand in paths and be a name in XML.
bool isTag(std::string_view text)
{
  const auto isLetter = [](char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_'; };
  return !text.empty() && text.size() <= kLongestTag && isLetter(text.front()) &&
         std::all_of(text.begin(), text.end(), [&](char c) {
           return isLetter(c) || (c >= '0' && c <= '9') || c == '-' || c == '.';
         });
}

} // namespace

std::vector<OwnElement> DictionaryReader::read()
{
  try
  {
    JsonParser(source_, *this).parseValue();
    behind_ = static_cast<size_t>(source_.position());
    if (source_.skipBlanks())
    {
      fail(tokenStart(), "there is more behind the dictionary");
    }
  }
  catch (const JsonSyntaxError& error)
  {
    fail(static_cast<size_t>(source_.position()), "no JSON: " + std::string(error.what()));
  }
  return std::move(elements_);
}

/// Where the piece of JSON begins that was read last.
size_t DictionaryReader::tokenStart() const
{
  return std::min(text_.find_first_not_of(" \t\r\n,:", behind_), text_.size());
}

void DictionaryReader::goTo(size_t at, Place& place) const
{
  for (; place.at < at; ++place.at)
  {
    const char c = text_[place.at];
    const bool isContinuation = (static_cast<uint8_t>(c) & 0xC0U) == 0x80U;
    place.line += c == '\n' ? 1 : 0;
    place.column = c == '\n' ? 1 : place.column + (isContinuation ? 0 : 1);
  }
}

std::string DictionaryReader::textOf(const Place& place) const
{
  return name_ + ": line " + std::to_string(place.line) + ", column " + std::to_string(place.column);
}

std::string DictionaryReader::placeOf(size_t at) const
{
  Place place;
  goTo(at, place);
  return textOf(place);
}

/// The same for a place behind all that this was asked for before.
std::string DictionaryReader::nextPlace(size_t at)
{
  goTo(at, reached_);
  return textOf(reached_);
}

void DictionaryReader::fail(size_t at, const std::string& sentence) const
{
  throw Error(Problem{.file = placeOf(at), .sentence = sentence});
}

void DictionaryReader::refuse() const
{
  fail(tokenStart(), depth_ == 0   ? "a dictionary is an object: {\"40001\": {\"tag\": \"queueDepth\"}}"
                     : depth_ == 1 ? "an element is an object: {\"tag\": \"queueDepth\"}"
                                   : inspect::quoted(key_) + " is a text");
}

void DictionaryReader::startObject()
{
  if (depth_ >= 2)
  {
    refuse();
  }
  ++depth_;
  behind_ = static_cast<size_t>(source_.position());
}

void DictionaryReader::key(std::string_view name)
{
  const size_t at = tokenStart();
  if (depth_ == 1)
  {
    elementAt_ = at;
    startElement(name);
  }
  else
  {
    static constexpr std::array<std::string_view, 4> known = {"tag", "kind", "unit", "text"};
    if (std::find(known.begin(), known.end(), name) == known.end())
    {
      fail(at, "the key " + inspect::quoted(name) + " is not known; there are tag, kind, unit and text");
    }
    if (std::find(seen_.begin(), seen_.end(), name) != seen_.end())
    {
      fail(at, "the key " + inspect::quoted(name) + " is given twice");
    }
    seen_.emplace_back(name);
    key_ = name;
  }
  behind_ = static_cast<size_t>(source_.position());
}

void DictionaryReader::startElement(std::string_view id)
{
  element_ = {};
  seen_.clear();
  const char* const end = id.data() + id.size();
  const auto [stop, error] = std::from_chars(id.data(), end, element_.id);
  if (error != std::errc() || stop != end || std::to_string(element_.id) != id)
  {
    fail(elementAt_, inspect::quoted(id) + " is no id; they are numbers from 0 to 65535");
  }
  element_.place = nextPlace(elementAt_);
  if (const std::string_view tag = builtInTag(element_.id); !tag.empty())
  {
    fail(elementAt_, "the id " + std::string(id) +
                         (isBuiltIn(element_.id)
                              ? " is that of " + inspect::quoted(detail::paths::withoutBlanks(tag)) + " in"
                              : " lies among those of") +
                         " the built-in dictionary");
  }
  if (const auto [before, isNew] = ids_.emplace(element_.id, element_.place); !isNew)
  {
    fail(elementAt_, "the id " + std::string(id) + " is given twice, first at " + before->second);
  }
}

void DictionaryReader::string(std::string_view text)
{
  if (depth_ < 2)
  {
    refuse();
  }
  if (key_ == "tag")
  {
    tagAt_ = tokenStart();
    element_.tag = text;
  }
  else if (key_ == "kind")
  {
    setKind(text);
  }
  else
  {
    (key_ == "unit" ? element_.unit : element_.text) = text;
  }
  behind_ = static_cast<size_t>(source_.position());
}

void DictionaryReader::setKind(std::string_view name)
{
  for (const ElementKind kind : {ElementKind::gauge, ElementKind::counter, ElementKind::text})
  {
    if (kindText(kind) == name)
    {
      element_.kind = kind;
      return;
    }
  }
  fail(tokenStart(), inspect::quoted(name) + " is no kind; there are gauge, counter and text");
}

void DictionaryReader::endObject()
{
  if (depth_ == 2)
  {
    endElement();
  }
  --depth_;
  behind_ = static_cast<size_t>(source_.position());
}

void DictionaryReader::endElement()
{
  const std::string& tag = element_.tag;
  if (std::find(seen_.begin(), seen_.end(), "tag") == seen_.end())
  {
    fail(elementAt_, "the element has no tag");
  }
  if (!isTag(tag))
  {
    fail(tagAt_, inspect::quoted(tag) + " is no tag; a letter or _ and then letters, digits, _, - and . are, at most " +
                     std::to_string(kLongestTag));
  }
  if (std::find(kTaken.begin(), kTaken.end(), tag) != kTaken.end())
  {
    fail(tagAt_, inspect::quoted(tag) + " has another meaning in XML");
  }
  if (const std::vector<uint16_t> ids = idsOf(tag); !ids.empty())
  {
    fail(tagAt_,
         "the tag " + inspect::quoted(tag) + " is that of " + std::to_string(ids.front()) +
             " in the built-in dictionary");
  }
  if (const auto [before, isNew] = tags_.emplace(tag, element_.place); !isNew)
  {
    fail(tagAt_, "the tag " + inspect::quoted(tag) + " is given twice, first at " + before->second);
  }
  elements_.push_back(std::move(element_));
}

} // namespace tav::inspect
