/// @file hints.h
/// What helps, in the words of this program: the library names neither options nor commands.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tav/inspect.hpp"
#include "tools/shell/names.h"

namespace tav::tool
{

/// A problem of the library, with the options and commands that help.
Problem withHint(Problem problem);

/// What leads to a stream from a file of this kind; empty: nothing does.
std::string_view hintOf(const FileKind& kind);

/// What is said behind a sentence that says of a stream in another form at an offset of a source: the option that
/// reads it.
std::string readsFrom(const ByteSource& source, uint64_t offset);

/// The reasons for a form as they are printed.
std::vector<std::string> reasonTexts(const ByteSource& source, const Recognition& found);

/// The options that read a file in a form.
std::string formOptions(const Form& form);

} // namespace tav::tool
