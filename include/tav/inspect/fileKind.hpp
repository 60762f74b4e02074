/// @file fileKind.hpp
/// Recognises by their first bytes files that are no streams but something that many programs know.
#pragma once

#include <optional>
#include <string_view>

#include "tav/inspect/api.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

struct FileKind
{
  std::string_view name; ///< "gzip", as scripts read it
  std::string_view text; ///< "a gzip file", as people do
  bool isEmpty = false;  ///< an archive that holds nothing
};

struct Recognition;

/// What the first bytes say that a file is; nothing when they say nothing. They alone do not rule out a stream: the
/// size of its root can be any bytes.
TAV_INSPECT_API std::optional<FileKind> fileKindOf(ByteSource& source);

/// The same for a file whose form was found out and not given. Nothing when the first bytes are the header of a group
/// that the dictionary knows and the file has room for: then they are nothing else, whatever they look like.
TAV_INSPECT_API std::optional<FileKind> otherKindOf(ByteSource& source, const Recognition& found);

} // namespace tav::inspect
