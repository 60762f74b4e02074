// The single values of a JSON document: properties, values, and the pieces of long ones.
#include <algorithm>
#include <charconv>
#include <cstring>
#include <utility>

#include "inspect/dictionary/builtIn.h"
#include "inspect/json/reader.h"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/value.hpp"

namespace tav::inspect
{

namespace
{

constexpr size_t kLong = size_t{1024} * 1024; ///< bytes of a value that are kept before they are written

template<class Number>
Number wholeNumber(std::string_view name, const Scalar& value)
{
  Number number{};
  const char* const end = value.text.data() + value.text.size();
  const bool given = value.kind == Scalar::Kind::integer || value.kind == Scalar::Kind::text;
  const bool hex = value.text.starts_with("0x");
  const auto result = std::from_chars(value.text.data() + (hex ? 2 : 0), end, number, hex ? 16 : 10);
  if (!given || result.ec != std::errc() || result.ptr != end)
  {
    throw BuildError(std::string(name) + ": " +
                     (value.kind == Scalar::Kind::null ? std::string("null") : inspect::quoted(value.text)) +
                     " is no number that fits");
  }
  return number;
}

bool truth(std::string_view name, const Scalar& value)
{
  if (value.kind != Scalar::Kind::truth)
  {
    throw BuildError(std::string(name) + " is true or false");
  }
  return value.text == "1";
}

std::string hexBytes(std::string_view name, const Scalar& value)
{
  std::string bytes;
  if (value.kind != Scalar::Kind::text || !appendHexBytes(bytes, value.text))
  {
    throw BuildError(std::string(name) + ": bytes are given in hexadecimal, as \"00ff\"");
  }
  return bytes;
}

std::string_view textOf(std::string_view name, const Scalar& value)
{
  if (value.kind != Scalar::Kind::text)
  {
    throw BuildError(std::string(name) + " is a text");
  }
  return value.text;
}

bool widthOf(std::string_view name, const Scalar& value)
{
  if (value.kind != Scalar::Kind::integer || (value.text != "32" && value.text != "64"))
  {
    throw BuildError(std::string(name) + " is 32 or 64");
  }
  return value.text == "64";
}

} // namespace

void DocumentReader::null()
{
  scalar({});
}

void DocumentReader::boolean(bool value)
{
  scalar({Scalar::Kind::truth, value ? "1" : "0"});
}

void DocumentReader::integer(std::string_view digits)
{
  scalar({Scalar::Kind::integer, digits});
}

void DocumentReader::fraction(std::string_view text)
{
  scalar({Scalar::Kind::fraction, text});
}

void DocumentReader::string(std::string_view text)
{
  scalar({Scalar::Kind::text, text});
}

void DocumentReader::scalar(const Scalar& value)
{
  if (levels_.empty())
  {
    fail("the document is an object or an array");
  }
  scalarIn(top(), value);
  ++top().index;
}

void DocumentReader::scalarIn(Level& level, const Scalar& value)
{
  switch (level.where)
  {
  case Where::document: documentValue(level.key, value); return;
  case Where::form: formValue(level.key, value); return;
  case Where::node: property(level.key, value); return;
  case Where::shortNode:
    level.key.starts_with('$') ? property(std::string_view(level.key).substr(1), value) : shortValue(value);
    return;
  case Where::shortList: shortValue(value); return;
  case Where::repeated:
    startChild(level.elm);
    shortValue(value);
    return;
  case Where::pieces: givePiece(value); return;
  case Where::bytes: giveBytes(value); return;
  case Where::date: dateField(level.key, value); return;
  case Where::nodes: fail("a node is an object");
  }
}

void DocumentReader::shortValue(const Scalar& value)
{
  giveValue(value);
  encoder_.finish(draft_);
}

void DocumentReader::documentValue(std::string_view name, const Scalar& value)
{
  if (name == "tav" && (value.kind != Scalar::Kind::integer || value.text != std::to_string(kJsonVersion)))
  {
    fail("this document is of another version: tav is " + inspect::quoted(value.text) + ", not 1");
  }
  if (name == "lines")
  {
    lines_ = truth(name, value);
    beginNodes();
  }
  else if (name != "tav")
  {
    fail(std::string(name) + " is " + (name == "form" ? "an object" : "an array of nodes"));
  }
}

void DocumentReader::formValue(std::string_view name, const Scalar& value)
{
  if (name == "byteOrder")
  {
    const std::string_view order = textOf(name, value);
    if (order != "little" && order != "big")
    {
      throw BuildError("byteOrder is little or big");
    }
    form_.swapped = (order == "little") != kor::isLittleEndian;
  }
  else if (name == "root")
  {
    form_.root64 = widthOf(name, value);
  }
  else if (name == "aligned")
  {
    form_.aligned = truth(name, value);
  }
  else
  {
    fail("the key " + inspect::quoted(name) + " is not known here");
  }
}

void DocumentReader::property(std::string_view name, const Scalar& value)
{
  const bool begun = top().begun;
  Properties& properties = begun ? encoder_.group() : draft_.properties;
  if (headerProperty(properties, name, value) || name == "path" || name == "offset" || name == "reason")
  {
    return;
  }
  if (name == "depth")
  {
    draft_.depth = wholeNumber<uint64_t>(name, value);
    return;
  }
  if (begun)
  {
    throw BuildError("the key " + inspect::quoted(name) + " has no place in a node with children");
  }
  valueProperty(name, value);
}

/// A name that no dictionary has is taken for that of an own element: its id says which.
void DocumentReader::elementProperty(Properties& properties, std::string_view name, const Scalar& value)
{
  const bool isName = name == "element";
  const auto elm = isName ? elementNamed(textOf(name, value), dictionary_) : wholeNumber<uint16_t>(name, value);
  if (!elm)
  {
    properties.unknown = unknownElement(value.text, dictionary_).what();
  }
  else if (properties.elm.value_or(*elm) != *elm)
  {
    throw BuildError("element and id do not agree: #" + std::to_string(*properties.elm) + " and #" +
                     std::to_string(*elm));
  }
  properties.elm = elm ? elm : properties.elm;
  if (!properties.unknown.empty() && properties.elm && !builtInTag(*properties.elm).empty())
  {
    throw BuildError(properties.unknown);
  }
}

bool DocumentReader::headerProperty(Properties& properties, std::string_view name, const Scalar& value)
{
  if (name == "element" || name == "id")
  {
    elementProperty(properties, name, value);
  }
  else if (name == "header")
  {
    const bool wide = widthOf(name, value);
    if (top().begun && properties.wide != wide)
    {
      throw BuildError("the header of a group must stand before its children");
    }
    properties.wide = wide;
  }
  else if (name == "type")
  {
    const auto type = value.kind == Scalar::Kind::text ? jsonTypeOf(value.text) : wholeNumber<uint16_t>(name, value);
    if (!type)
    {
      throw BuildError("there is no type " + inspect::quoted(value.text));
    }
    properties.type = type;
  }
  else if (name == "info")
  {
    properties.info = wholeNumber<uint32_t>(name, value);
  }
  else if (name == "size")
  {
    const bool unknown = value.kind == Scalar::Kind::text && value.text == "unknown";
    properties.size = unknown ? TAV_SIZE_UNKNOWN : wholeNumber<uint64_t>(name, value);
  }
  else if (name == "eyeSize")
  {
    properties.eyeSize = truth(name, value);
  }
  else if (name == "endElement")
  {
    properties.endElement = truth(name, value);
  }
  else
  {
    return false;
  }
  return true;
}

void DocumentReader::valueProperty(std::string_view name, const Scalar& value)
{
  if (name == "value")
  {
    giveValue(value);
  }
  else if (name == "codePage")
  {
    draft_.codePage = wholeNumber<uint16_t>(name, value);
  }
  else if (name == "extra" || name == "padding" || name == "pair")
  {
    (name == "extra" ? draft_.extra : name == "padding" ? draft_.padding
                                                        : draft_.pair) = hexBytes(name, value);
  }
  else if (name == "zeros")
  {
    setGiven(Given::zeros);
    draft_.count = wholeNumber<uint64_t>(name, value);
  }
  else if (name == "bytes" || name == "damaged" || name == "unread")
  {
    setGiven(name == "bytes" ? Given::bytes : name == "damaged" ? Given::damaged
                                                                : Given::unread);
    draft_.value = hexBytes(name, value);
  }
  else
  {
    throw BuildError("the key " + inspect::quoted(name) + " is not known here");
  }
}

void DocumentReader::setGiven(Given given)
{
  if (draft_.given != Given::nothing || top().begun)
  {
    throw BuildError("the node has a value already");
  }
  draft_.given = given;
}

void DocumentReader::giveValue(const Scalar& value)
{
  if (value.kind == Scalar::Kind::null || value.kind == Scalar::Kind::fraction)
  {
    throw BuildError(value.kind == Scalar::Kind::null
                         ? "no type holds null"
                         : "no type holds " + std::string(value.text) + ", only whole numbers");
  }
  if (draft_.given != Given::nothing)
  {
    throw BuildError("the node has a value already");
  }
  draft_.given = value.kind == Scalar::Kind::text ? Given::text : Given::integer;
  draft_.isTruth = value.kind == Scalar::Kind::truth;
  draft_.value = value.text;
}

void DocumentReader::givePiece(const Scalar& value)
{
  const bool text = value.kind == Scalar::Kind::text && draft_.given != Given::array;
  if (draft_.given == Given::nothing)
  {
    draft_.given = text ? Given::text : Given::array;
  }
  if (draft_.given == Given::text && text)
  {
    draft_.value += value.text;
  }
  else if (draft_.given == Given::array)
  {
    const auto number = wholeNumber<uint64_t>("value", value);
    draft_.value.append(reinterpret_cast<const char*>(&number), sizeof number);
  }
  else
  {
    throw BuildError("texts and numbers do not go together in one value");
  }
  spill();
}

void DocumentReader::giveBytes(const Scalar& value)
{
  if (value.kind == Scalar::Kind::text)
  {
    if (!appendHexBytes(draft_.value, value.text))
    {
      throw BuildError("bytes are given in hexadecimal, as \"00ff\"");
    }
    spill();
    return;
  }
  for (auto zeros = wholeNumber<uint64_t>("zeros", value); zeros != 0;)
  {
    const uint64_t now = std::min<uint64_t>(zeros, kLong);
    draft_.value.append(static_cast<size_t>(now), '\0');
    zeros -= now;
    spill();
  }
}

/// Hands over what there is of a long value.
void DocumentReader::spill()
{
  if (draft_.value.size() < kLong)
  {
    return;
  }
  if (lines_ && !draft_.begun)
  {
    closeTo(draft_.depth.value_or(0));
  }
  encoder_.addValue(draft_);
}

void DocumentReader::dateField(std::string_view name, const Scalar& value)
{
  if (name == "seconds")
  {
    date_.seconds = wholeNumber<uint64_t>(name, value);
  }
  else if (name == "fractionA" || name == "fractionB" || name == "further")
  {
    (name == "fractionA" ? date_.fractionA : name == "fractionB" ? date_.fractionB
                                                                 : date_.further) =
        wholeNumber<uint16_t>(name, value);
  }
  else if (name == "offsetMinutes")
  {
    date_.offsetMinutes = wholeNumber<int16_t>(name, value);
  }
  else
  {
    throw BuildError("the key " + inspect::quoted(name) + " is not known in a date");
  }
}

} // namespace tav::inspect
