/// @file rules.h
/// What `tav check` looks for: the one table of rules, from which docs/check-rules.md is made as well.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "tav/codes.h"

namespace tav::tool
{

enum class RuleId : uint8_t
{
  headerCut,
  typeUnknown,
  elementUnknown,
  sizeType,
  pastParent,
  pastFile,
  groupType,
  rootNoGroup,
  groupOpen,
  sizeUnknown,
  groupSize,
  endMissing,
  endForm,
  afterEnd,
  pairMissing,
  eyeDamaged,
  pairDistance,
  pairOrder,
  alignFlag,
  paddingMissing,
  paddingDirty,
  stringExtra,
  utf8Invalid,
  stringNul,
  stringHigh,
  damaged,
  behindStream,
  zerosBetween,
  zerosLong,
  tooDeep,
  count
};

struct Rule
{
  RuleId rule;
  std::string_view id;
  bool note;             ///< remarkable, but no defect: told when it is asked for
  uint32_t code;         ///< what the library answers, or would say of it
  std::string_view what; ///< one sentence
  std::string_view why;  ///< what it does to a reader
  std::string_view form; ///< options to read the example with
  std::string_view
      bytes;       ///< the smallest file that breaks it: hexadecimal; "00*9" is nine zeros, "(...)*9" a run nine times
  uint64_t offset; ///< where the finding in it is
};

/// In the order of RuleId.
std::span<const Rule> rules();

const Rule& ruleOf(RuleId rule);

/// Null when no rule has this id.
const Rule* findRule(std::string_view id);

/// The document: every rule with its example, in Markdown.
std::string rulesMarkdown();

/// The table as JSON, for scripts.
std::string rulesJson();

} // namespace tav::tool
