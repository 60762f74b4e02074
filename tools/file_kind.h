/// @file file_kind.h
/// Recognises by their first bytes files that are no streams but something that many programs know.
#pragma once

#include <optional>
#include <string_view>

#include "tools/source.h"

namespace tav::tool
{

struct FileKind
{
  std::string_view name; ///< "gzip", as scripts read it
  std::string_view text; ///< "a gzip file", as people do
  std::string_view hint; ///< what leads to a stream from there; empty: nothing does
};

/// What the first bytes say that a file is; nothing when they say nothing. They alone do not rule out a stream: the
/// size of its root can be any bytes.
std::optional<FileKind> fileKindOf(ByteSource& source);

} // namespace tav::tool
