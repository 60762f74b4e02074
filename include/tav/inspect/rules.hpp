/// @file rules.hpp
/// What a check looks for: the one table of rules.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "tav/codes.h"
#include "tav/inspect/api.hpp"
#include "tav/inspect/node.hpp"

namespace tav::inspect
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
  Form form;             ///< of the example, which is little-endian
  std::string_view
      bytes;       ///< the smallest file that breaks it: hexadecimal; "00*9" is nine zeros, "(...)*9" a run nine times
  uint64_t offset; ///< where the finding in it is
};

/// In the order of RuleId.
TAV_INSPECT_API std::span<const Rule> rules();

TAV_INSPECT_API const Rule& ruleOf(RuleId rule);

/// Null when no rule has this id.
TAV_INSPECT_API const Rule* findRule(std::string_view id);

} // namespace tav::inspect
