/// @file parser.hpp
/// Reads a path. Takes time by its length alone, whatever it is.
#pragma once

#include <array>
#include <charconv>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "tav/cpp/nearest.hpp"
#include "tav/path/compiled.hpp"
#include "tav/path/scanner.hpp"

namespace tav
{

namespace detail::paths
{

inline constexpr size_t kMostNested = 64;      ///< brackets and parentheses inside of each other
inline constexpr size_t kMostSteps = 20'000;   ///< in one path
inline constexpr size_t kMostParents = 500;    ///< `..` behind the first name
inline constexpr size_t kMostMixed = 4;        ///< comparisons of position() with nodes that have conditions
inline constexpr size_t kMostHardParents = 10; ///< `..` that do not follow a name: each may look a level further down

/// Reads by recursive descent, as deep as brackets may be nested.
class Parser : private Scanner
{
public:
  Parser(std::string_view text, Compiled& path, PathFault& fault) noexcept
      : Scanner(text, fault), path_(path)
  {
  }

  /// False when the text is no path; the fault says why.
  bool parse()
  {
    const bool read =
        parseUnion(path_.main, false) && (at_ == text_.size() || failHere()) &&
        (mixed_ <= kMostMixed || fail(0, "too many comparisons of places with what has conditions itself"));
    if (!read || fault_.kind != PathFault::Kind::none)
    {
      path_ = {};
      return false;
    }
    const Route& first = path_.routes[path_.main.front()];
    path_.isStraight = path_.main.size() == 1 && first.ups == 0 && !first.steps.empty() &&
                       std::all_of(first.steps.begin(), first.steps.end(),
                                   [this](const Step& step) { return isFirstOfOne(step); });
    return true;
  }

private:
  using Kind = Expression::Kind;

  // Routes

  bool parseUnion(std::vector<uint32_t>& routes, bool inBrackets)
  {
    do
    {
      Route route;
      if (!parseRoute(route, inBrackets))
      {
        return false;
      }
      finish(route);
      routes.push_back(static_cast<uint32_t>(path_.routes.size()));
      path_.routes.push_back(std::move(route));
    } while (take("|"));
    return true;
  }

  bool parseRoute(Route& route, bool inBrackets)
  {
    passBlanks();
    const size_t start = at_;
    if (take("/"))
    {
      if (inBrackets)
      {
        return fail(start, "a path in brackets begins at the node that they stand behind, not with a slash");
      }
      route.absolute = true;
      if (take("/"))
      {
        addLevels(route);
      }
      else if (passBlanks(); at_ == text_.size() || peek() == '|')
      {
        addStep(route).any = true; // a slash alone: the roots
        return true;
      }
    }
    for (bool stars = false;;)
    {
      if (!parseStep(route, stars, inBrackets))
      {
        return false;
      }
      const bool more = route.attribute == Attribute::none && take("/");
      if (!more)
      {
        stars ? endLevels(route) : void();
        return true;
      }
      if (take("/"))
      {
        addLevels(route);
        stars = false;
      }
    }
  }

  Step& addStep(Route& route)
  {
    ++steps_;
    return route.steps.emplace_back();
  }
  void addLevels(Route& route)
  {
    if (route.steps.empty() || route.steps.back().axis != Axis::descendantOrSelf)
    {
      addStep(route).axis = Axis::descendantOrSelf;
    }
  }
  /// `**` that no name follows: all below.
  void endLevels(Route& route)
  {
    addStep(route).any = true;
  }

  /// `stars`: the step before was `**`; afterwards: this one is.
  bool parseStep(Route& route, bool& stars, bool inBrackets)
  {
    passBlanks();
    if (steps_ >= kMostSteps)
    {
      return fail(at_, "a path has at most " + std::to_string(kMostSteps) + " steps");
    }
    const bool afterStars = std::exchange(stars, false);
    if (peek() == '.')
    {
      afterStars ? endLevels(route) : void();
      return parseDots(route);
    }
    if (inBrackets && peek() == '@')
    {
      return parseAttribute(route);
    }
    if (peek() == '*' && peek(1) == '*' && !isInName(peek(2)) && peek(2) != '*')
    {
      at_ += 2;
      addLevels(route);
      stars = true;
      return (passBlanks(), peek()) != '[' || fail(at_, "** takes no brackets; '**/name[2]' is a second of its name");
    }
    Step& step = addStep(route);
    return parseTest(step) && parsePredicates(route, step);
  }

  bool parseDots(Route& route)
  {
    const size_t start = at_;
    const bool up = take("..");
    take(up ? "" : ".");
    if (up && route.steps.empty() && !route.absolute)
    {
      ++route.ups;
    }
    else if (up)
    {
      if (++parents_ > kMostParents)
      {
        return fail(start, "more than " + std::to_string(kMostParents) + " '..' behind names");
      }
      const Axis before = route.steps.empty() ? Axis::child : route.steps.back().axis;
      route.hasParents = true;
      hardParents_ += before != Axis::child ? 1 : 0;
      if (hardParents_ > kMostHardParents)
      {
        return fail(start, "more than " + std::to_string(kMostHardParents) + " '..' that follow no name");
      }
      addStep(route).axis = Axis::parent;
    }
    passBlanks();
    return peek() != '[' || fail(at_, "brackets stand behind names and *, not behind dots");
  }

  bool parseAttribute(Route& route)
  {
    ++at_;
    const size_t start = at_;
    const std::string_view name = takeName(false);
    route.attribute = attributeNamed(name);
    if (name.empty())
    {
      return failHere();
    }
    return route.attribute != Attribute::none ||
           fail(start, "no attribute is called " + quoted(name) + "; " + attributeList());
  }
  static std::string attributeList()
  {
    std::string list = "there are";
    for (size_t i = 1; i < kAttributeNames.size(); ++i)
    {
      list += (i == 1 ? " " : ", ") + std::string(kAttributeNames[i]);
    }
    return list;
  }

  bool parseTest(Step& step)
  {
    const size_t start = at_;
    if (peek() == '#' || isDigit(peek()))
    {
      return parseId(step);
    }
    const std::string_view name = takeName(true);
    if (name.empty())
    {
      const bool ended = at_ == text_.size() || peek() == '/' || peek() == '[' || peek() == '|';
      return ended ? fail(start, "a step is empty") : failHere();
    }
    if (name == "*")
    {
      step.any = true;
      return true;
    }
    passBlanks();
    if (peek() == '(')
    {
      return fail(start, "no function " + quoted(name) + " leads to nodes");
    }
    if (name.find_first_not_of('*') == std::string_view::npos)
    {
      return fail(start, quoted(name) + " is no pattern; * is any element, ** any number of levels");
    }
    const std::vector<uint16_t> ids = name.find('*') == std::string_view::npos ? idsNamed(name) : idsLike(name);
    if (ids.empty() && fault_.kind == PathFault::Kind::none)
    {
      tellUnknown(start, name);
    }
    setIds(step, ids);
    return true;
  }
  static void setIds(Step& step, const std::vector<uint16_t>& ids)
  {
    step.only = ids.empty() ? uint16_t{0} : ids.front();
    if (ids.size() > 1)
    {
      step.ids = ids;
    }
  }
  [[gnu::noinline, gnu::cold]] void tellUnknown(size_t start, std::string_view name)
  {
    const std::string nearest(nearestTag(name));
    tell(PathFault::Kind::unknownName, start,
         "no element is called " + quoted(name) + (nearest.empty() ? "" : "; did you mean " + nearest + "?"));
    fault_.nearest = nearest;
  }
  bool parseId(Step& step)
  {
    const size_t start = at_;
    at_ += peek() == '#' ? 1 : 0;
    const std::string_view digits = takeDigits();
    if (isInName(peek()))
    {
      takeName(false);
    }
    const std::string_view whole = text_.substr(start, at_ - start);
    const auto [end, error] = std::from_chars(digits.data(), digits.data() + digits.size(), step.only);
    const bool isId = error == std::errc() && end == whole.data() + whole.size();
    return isId || fail(start, quoted(whole) + " is no id; they go from 0 to 65535");
  }

  bool parsePredicates(Route& route, Step& step)
  {
    // Into a list of its own: expressions add routes to the path's, not to this one.
    while (take("["))
    {
      uint32_t expression = 0;
      const size_t start = at_ - 1;
      if (!enter(start) || !parseEither(expression) || !leave(start, "]"))
      {
        return false;
      }
      if (!checkPlace(path_.expressions[expression], start + 1))
      {
        return false;
      }
      step.predicates.push_back(expression);
    }
    step.counters = route.counters;
    route.counters += 2 * step.predicates.size();
    return true;
  }
  /// A number alone is a place among the matches: from 1, or from the last one, which is -1.
  bool checkPlace(Expression& number, size_t start)
  {
    if (number.kind != Kind::number || number.text.empty())
    {
      return true;
    }
    if (number.constant == 0 || number.constant == kNoConstant)
    {
      return fail(start, quoted(number.text) + " is no place; the first is [1]");
    }
    if (number.constant < 0)
    {
      number.constant += 1;
      number.lasts = 1;
      number.usesPlace = true;
      path_.keepsPlaces = true;
    }
    number.text.clear();
    return true;
  }

  bool enter(size_t start)
  {
    return ++nested_ <= kMostNested ||
           fail(start, "more than " + std::to_string(kMostNested) + " brackets inside of each other");
  }
  bool leave(size_t start, std::string_view end)
  {
    --nested_;
    if (take(end))
    {
      return true;
    }
    passBlanks();
    return at_ < text_.size() ? failHere()
                              : fail(start, "a " + std::string(1, text_[start]) + " without a " + std::string(end));
  }

  /// What ends a group is no child here.
  [[nodiscard]] bool isFirstOfOne(const Step& step) const noexcept
  {
    const auto isFirst = [this](uint32_t index) {
      const Expression& place = path_.expressions[index];
      return place.kind == Kind::number && place.constant == 1 && !place.usesPlace;
    };
    return step.axis == Axis::child && !step.any && step.ids.empty() && !layout::isEndElement(step.only) &&
           (step.predicates.empty() || (step.predicates.size() == 1 && isFirst(step.predicates.front())));
  }

  // Expressions

  uint32_t add(Expression expression)
  {
    const auto asks = [this](uint32_t index) {
      const std::vector<Step>& steps = path_.routes[index].steps;
      return std::any_of(steps.begin(), steps.end(), [](const Step& step) { return !step.predicates.empty(); });
    };
    bool nests = std::any_of(expression.routes.begin(), expression.routes.end(), asks);
    expression.usesPlace = expression.positions != 0 || expression.lasts != 0;
    for (const uint32_t part : expression.parts)
    {
      expression.usesPlace = expression.usesPlace || path_.expressions[part].usesPlace;
      nests = nests || path_.expressions[part].nests;
    }
    expression.nests = nests && !expression.usesPlace;
    // What a comparison finds out cannot be kept where it depends on the place.
    const bool joins =
        expression.kind != Kind::either && expression.kind != Kind::both && expression.kind != Kind::negation;
    mixed_ += nests && expression.usesPlace && joins ? 1 : 0;
    path_.expressions.push_back(std::move(expression));
    return static_cast<uint32_t>(path_.expressions.size() - 1);
  }

  bool parseEither(uint32_t& out)
  {
    return parseParts(out, Kind::either, "or", &Parser::parseBoth);
  }
  bool parseBoth(uint32_t& out)
  {
    return parseParts(out, Kind::both, "and", &Parser::parseComparison);
  }
  /// Operands with a word between them: a list, not a chain, so that long ones need no depth.
  bool parseParts(uint32_t& out, Kind kind, std::string_view word, bool (Parser::*parsePart)(uint32_t&))
  {
    if (!(this->*parsePart)(out))
    {
      return false;
    }
    Expression list{.kind = kind, .parts = {out}};
    while (takeWord(word))
    {
      uint32_t part = 0;
      if (!(this->*parsePart)(part))
      {
        return false;
      }
      list.parts.push_back(part);
    }
    if (list.parts.size() > 1)
    {
      out = add(std::move(list));
    }
    return true;
  }

  bool parseComparison(uint32_t& out)
  {
    passBlanks();
    const size_t start = at_;
    if (!parseSum(out))
    {
      return false;
    }
    Operator comparison{};
    if (!takeOperator(comparison))
    {
      return true;
    }
    uint32_t right = 0;
    const size_t behind = at_;
    if (!isValue(out))
    {
      return fail(start, "only values can be compared");
    }
    if (!parseSum(right))
    {
      return false;
    }
    if (!isValue(right))
    {
      return fail(behind, "only values can be compared");
    }
    out = add({.kind = Kind::comparison, .comparison = comparison, .parts = {out, right}});
    passBlanks();
    const size_t next = at_;
    return !takeOperator(comparison) || fail(next, "a comparison of a comparison");
  }
  bool takeOperator(Operator& out) noexcept
  {
    static constexpr std::array<std::pair<std::string_view, Operator>, 6> operators = {
        {{"=", Operator::equal},
         {"!=", Operator::unequal},
         {"<=", Operator::lessOrEqual},
         {">=", Operator::greaterOrEqual},
         {"<", Operator::less},
         {">", Operator::greater}}};
    for (const auto& [token, meaning] : operators)
    {
      if (take(token))
      {
        out = meaning;
        return true;
      }
    }
    return false;
  }
  [[nodiscard]] bool isValue(uint32_t expression) const noexcept
  {
    const Kind kind = path_.expressions[expression].kind;
    return kind == Kind::nodes || kind == Kind::text || kind == Kind::number;
  }

  /// An operand, or whole numbers, position() and last() with + and - between them.
  bool parseSum(uint32_t& out)
  {
    passBlanks();
    const size_t start = at_;
    if (!parseOperand(out))
    {
      return false;
    }
    for (passBlanks(); peek() == '+' || peek() == '-'; passBlanks())
    {
      const int64_t sign = text_[at_++] == '-' ? -1 : 1;
      uint32_t term = 0;
      if (!parseOperand(term) || !addTerm(path_.expressions[out], path_.expressions[term], sign))
      {
        return fault_.kind != PathFault::Kind::malformed
                   ? fail(start, "only whole numbers, position() and last() are added and subtracted")
                   : false;
      }
    }
    return true;
  }
  static bool addTerm(Expression& sum, const Expression& term, int64_t sign) noexcept
  {
    const auto isSum = [](const Expression& part) {
      return part.kind == Kind::number && part.constant != kNoConstant;
    };
    if (!isSum(sum) || !isSum(term))
    {
      return false;
    }
    constexpr int64_t most = int64_t{1} << 62U;
    sum.positions += sign * term.positions;
    sum.lasts += sign * term.lasts;
    sum.constant += sign * term.constant;
    sum.text.clear();
    sum.usesPlace = sum.usesPlace || term.usesPlace;
    return sum.constant < most && sum.constant > -most;
  }

  bool parseOperand(uint32_t& out)
  {
    passBlanks();
    const size_t start = at_;
    const char c = peek();
    if (path_.expressions.size() >= kMostSteps)
    {
      return fail(at_, "a path has at most " + std::to_string(kMostSteps) + " conditions");
    }
    if (c == '\'' || c == '"')
    {
      return parseText(out);
    }
    if (c == '(')
    {
      ++at_;
      return enter(start) && parseEither(out) && leave(start, ")");
    }
    if (isDigit(c) || c == '-' || (c == '.' && isDigit(peek(1))))
    {
      return parseNumber(out);
    }
    if (c == '@' && isDigit(peek(1)))
    {
      return parseOffset(out);
    }
    if (beginsName(c))
    {
      const std::string_view name = takeName(false);
      passBlanks();
      if (peek() == '(')
      {
        return parseFunction(start, name, out);
      }
      at_ = start;
    }
    Expression nodes{.kind = Kind::nodes};
    if (c == '\0' || c == ']')
    {
      return fail(at_, "a value or a condition is missing");
    }
    return parseUnion(nodes.routes, true) && (out = add(std::move(nodes)), true);
  }

  bool parseText(uint32_t& out)
  {
    const size_t start = at_;
    const size_t end = text_.find(text_[start], start + 1);
    if (end == std::string_view::npos)
    {
      return fail(start, "a text without a quotation mark at its end");
    }
    at_ = end + 1;
    out = add({.kind = Kind::text, .text = std::string(text_.substr(start + 1, end - start - 1))});
    return true;
  }

  /// A number is with its digits, however many; with its value, too, where that is whole and can be counted with.
  bool parseNumber(uint32_t& out)
  {
    const size_t start = at_;
    at_ += peek() == '-' ? 1 : 0;
    takeDigits();
    if (peek() == '.')
    {
      ++at_;
      takeDigits();
    }
    if (isInName(peek()))
    {
      takeName(false);
    }
    Expression number{.kind = Kind::number, .text = std::string(text_.substr(start, at_ - start))};
    if (!decimalOf(number.text))
    {
      return fail(start, quoted(number.text) + " is no number");
    }
    const char* const end = number.text.data() + number.text.size();
    const auto [stop, error] = std::from_chars(number.text.data(), end, number.constant);
    constexpr int64_t most = int64_t{1} << 53U;
    if (error != std::errc() || stop != end || number.constant > most || number.constant < -most)
    {
      number.constant = kNoConstant;
    }
    out = add(std::move(number));
    return true;
  }

  bool parseOffset(uint32_t& out)
  {
    const size_t start = at_++;
    const bool hexadecimal = peek() == '0' && (peek(1) == 'x' || peek(1) == 'X');
    at_ += hexadecimal ? 2 : 0;
    Expression expression{.kind = Kind::offset};
    const char* const first = text_.data() + at_;
    const auto [end, error] =
        std::from_chars(first, text_.data() + text_.size(), expression.offset, hexadecimal ? 16 : 10);
    at_ += static_cast<size_t>(end - first);
    if (error != std::errc() || isInName(peek()))
    {
      return fail(start, "an offset looks like [@0x1a40]");
    }
    out = add(std::move(expression));
    return true;
  }

  bool parseFunction(size_t start, std::string_view name, uint32_t& out)
  {
    const size_t open = at_++;
    if (name == "position" || name == "last")
    {
      Expression number{.kind = Kind::number};
      (name == "last" ? number.lasts : number.positions) = 1;
      path_.keepsPlaces = path_.keepsPlaces || name == "last";
      out = add(std::move(number));
      return take(")") || failHere();
    }
    if (name == "not")
    {
      uint32_t part = 0;
      if (!enter(open) || !parseEither(part) || !leave(open, ")"))
      {
        return false;
      }
      out = add({.kind = Kind::negation, .parts = {part}});
      return true;
    }
    if (name != "contains" && name != "starts-with")
    {
      return fail(start, "no function is called " + quoted(name) +
                             "; there are position, last, not, contains and starts-with");
    }
    Expression call{.kind = name == "contains" ? Kind::contains : Kind::startsWith, .parts = {0, 0}};
    if (!enter(open) || !parseArgument(call.parts[0]) || !(take(",") || failHere()) || !parseArgument(call.parts[1]) ||
        !leave(open, ")"))
    {
      return false;
    }
    out = add(std::move(call));
    return true;
  }
  bool parseArgument(uint32_t& out)
  {
    passBlanks();
    const size_t start = at_;
    return parseSum(out) && (isValue(out) || fail(start, "only values have a text"));
  }

  /// What the matcher wants to know of a route.
  void finish(Route& route)
  {
    int64_t level = 0;
    int64_t least = 0;
    for (const Step& step : route.steps)
    {
      level += step.axis == Axis::child ? 1 : step.axis == Axis::parent ? -1
                                                                        : 0;
      least = std::min(least, level);
    }
    route.climb = static_cast<size_t>(-least);
    path_.leavesStart = path_.leavesStart || route.absolute || route.ups != 0 || route.climb != 0;
    path_.keepsPlaces = path_.keepsPlaces || route.ups != 0 || route.hasParents;
  }

  static constexpr int64_t kNoConstant = std::numeric_limits<int64_t>::max();

  Compiled& path_;
  size_t nested_ = 0;
  size_t steps_ = 0;
  size_t parents_ = 0;
  size_t mixed_ = 0;
  size_t hardParents_ = 0;
};

} // namespace detail::paths

} // namespace tav
