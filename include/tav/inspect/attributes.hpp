/// @file attributes.hpp
/// What the XML form shows of a node as attributes, which paths compare, too.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tav/inspect/api.hpp"
#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"
#include "tav/path/names.hpp"

namespace tav::inspect
{

/// The name of a node's element in XML; "element" where the tag is not unique or no name in XML.
TAV_INSPECT_API std::string xmlNameOf(uint16_t elm);
TAV_INSPECT_API std::string xmlNameOf(uint16_t elm, const Dictionary& dictionary);

/// Appends it.
TAV_INSPECT_API void appendXmlName(std::string& out, uint16_t elm, const Dictionary& dictionary);

/// Whether XML can hold the text of a part of the file: no control characters but tab and line ends, no U+FFFE and
/// U+FFFF.
TAV_INSPECT_API bool isXmlText(ByteSource& source, uint64_t from, uint64_t end);

/// How a value is in XML.
enum class XmlValue : uint8_t
{
  number,
  date,
  text,
  array,
  hex ///< what is none of these, or a text that XML cannot hold
};

/// Of a data element.
TAV_INSPECT_API XmlValue xmlValueOf(ByteSource& source, const Node& node);

/// An attribute of a node; nothing where it has none of this name.
TAV_INSPECT_API std::optional<std::string> attributeText(ByteSource& source, const Form& form, const Node& node,
                                                         detail::paths::Attribute attribute);

/// Appends it; false, and nothing, where there is none.
TAV_INSPECT_API bool appendAttributeText(std::string& out, ByteSource& source, const Form& form, const Node& node,
                                         detail::paths::Attribute attribute);

} // namespace tav::inspect
