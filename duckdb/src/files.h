/// The files that a query names.
#pragma once

#include <string>
#include <vector>

namespace tav::sql
{

/// The files that a name means: itself where there is such a file, else those that it matches as a pattern, in the
/// order of their names. `*` and `?` stand for characters of one name, `[a-c]` and `[!a-c]` for one of some, `**` for
/// any number of folders. What begins with a point is matched by a pattern that does. Throws Error where there is none.
std::vector<std::string> filesOf(const std::string& name);

/// Whether a name ends as those of streams do.
bool isStreamName(const std::string& name);

} // namespace tav::sql
