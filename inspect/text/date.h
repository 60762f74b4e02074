/// @file date.h
#pragma once

#include <optional>
#include <string>

#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"
#include "tav/path/names.hpp"

namespace tav::inspect
{

/// The moment that a data element holds, as far as its bytes are there.
TAVTimeStamp dateOf(ByteSource& source, const Form& form, const Node& node);

/// The same where its text does not tell all of it,
std::optional<TAVTimeStamp> untoldDate(ByteSource& source, const Form& form, const Node& node);
/// and the part of it that an attribute tells.
void appendPartOfDate(std::string& out, const TAVTimeStamp& stamp, detail::paths::Attribute attribute);

} // namespace tav::inspect
