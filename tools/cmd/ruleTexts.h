/// @file ruleTexts.h
/// The table of what `tav check` looks for, as texts.
#pragma once

#include <string>

namespace tav::tool
{

/// The document: every rule with its example, in Markdown.
std::string rulesMarkdown();

/// The table as JSON, for scripts.
std::string rulesJson();

} // namespace tav::tool
