/// @file dictionary.h
/// What own elements are called: by --dictionary, by TAV_DICTIONARY, and by what lies beside a file.
#pragma once

#include <string>

#include "tav/inspect/dictionary.hpp"
#include "tools/shell/names.h"
#include "tools/shell/options.h"

namespace tav::tool
{

/// Of the options, and below them of the environment. Throws Failure and Error.
Dictionary givenDictionary(const Invocation& invocation);

/// The same, and below it of what lies beside a file; "-" has nothing beside it.
Dictionary dictionaryFor(const Invocation& invocation, const std::string& file);

} // namespace tav::tool
