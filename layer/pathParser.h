/// @file pathParser.h
/// Reads a path. Takes time by its length alone, whatever it is.
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <vector>

#include "layer/pathScanner.h"
#include "tav/dictionary.hpp"
#include "tav/path/compiled.hpp"

namespace tav::detail::paths
{

inline constexpr size_t kMostSteps = 20'000; ///< in one path, and expressions in its brackets
inline constexpr size_t kMostMixed = 4;      ///< comparisons of position() with nodes that have conditions

/// Reads by recursive descent, as deep as brackets may be nested. Routes and their steps are in pathParser.cpp, what is
/// in brackets in pathExpressions.cpp.
class Parser : private Scanner
{
public:
  Parser(std::string_view text, dictionary::OwnNames own, Compiled& path, PathFault& fault) noexcept
      : Scanner(text, fault), path_(path), own_(own)
  {
  }

  /// False when the text is no path; the fault says why.
  bool parse();

private:
  using Kind = Expression::Kind;

  /// The XML form shows the id and the name of elements that it cannot call by their tags.
  void keepOwnTags();

  // Routes

  bool parseUnion(std::vector<uint32_t>& routes, bool inBrackets);

  bool parseRoute(Route& route, bool inBrackets);

  Step& addStep(Route& route);
  void addLevels(Route& route);
  /// `**` that no name follows: all below.
  void endLevels(Route& route);

  /// `stars`: the step before was `**`; afterwards: this one is.
  bool parseStep(Route& route, bool& stars, bool inBrackets);

  bool parseDots(Route& route);

  bool parseAttribute(Route& route);
  static std::string attributeList();

  bool parseTest(Step& step);
  static void setIds(Step& step, const std::vector<uint16_t>& ids);
  [[gnu::noinline, gnu::cold]] void tellUnknown(size_t start, std::string_view name);
  bool parseId(Step& step);

  bool parsePredicates(Route& route, Step& step);
  /// A number alone is a place among the matches: from 1, or from the last one, which is -1.
  bool checkPlace(Expression& number, size_t start);

  bool enter(size_t start);
  bool leave(size_t start, std::string_view end);

  /// What ends a group is no child here.
  [[nodiscard]] bool isFirstOfOne(const Step& step) const noexcept;

  // Expressions

  uint32_t add(Expression expression);

  bool parseEither(uint32_t& out);
  bool parseBoth(uint32_t& out);
  /// Operands with a word between them: a list, not a chain, so that long ones need no depth.
  bool parseParts(uint32_t& out, Kind kind, std::string_view word, bool (Parser::*parsePart)(uint32_t&));

  bool parseComparison(uint32_t& out);
  bool takeOperator(Operator& out) noexcept;
  [[nodiscard]] bool isValue(uint32_t expression) const noexcept;

  /// An operand, or whole numbers, position() and last() with + and - between them.
  bool parseSum(uint32_t& out);
  static bool addTerm(Expression& sum, const Expression& term, int64_t sign) noexcept;

  bool parseOperand(uint32_t& out);

  bool parseText(uint32_t& out);

  /// A number is with its digits, however many; with its value, too, where that is whole and can be counted with.
  bool parseNumber(uint32_t& out);

  bool parseOffset(uint32_t& out);

  bool parseFunction(size_t start, std::string_view name, uint32_t& out);
  bool parseArgument(uint32_t& out);

  /// What the matcher wants to know of a route.
  void finish(Route& route);

  static constexpr int64_t kNoConstant = std::numeric_limits<int64_t>::max();

  Compiled& path_;
  dictionary::OwnNames own_;
  size_t nested_ = 0;
  size_t steps_ = 0;
  size_t parents_ = 0;
  size_t mixed_ = 0;
  size_t hardParents_ = 0;
};

} // namespace tav::detail::paths
