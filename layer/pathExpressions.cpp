// What the brackets of a path ask.
#include <algorithm>
#include <array>
#include <charconv>
#include <system_error>
#include <utility>

#include "layer/pathParser.h"
#include "tav/path/decimal.hpp"

namespace tav::detail::paths
{

namespace
{

constexpr size_t kMostNested = 64; // brackets and parentheses inside of each other

} // namespace

bool Parser::parsePredicates(Route& route, Step& step)
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

bool Parser::checkPlace(Expression& number, size_t start)
{
  if (number.kind != Kind::number || number.text.empty())
  {
    return true;
  }
  if (number.constant == 0 || number.constant == kNoConstant)
  {
    return fail(start, {quoted(number.text), " is no place; the first is [1]"});
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

bool Parser::enter(size_t start)
{
  if (++nested_ > kMostNested)
  {
    return fail(start, {"more than ", std::to_string(kMostNested), " brackets inside of each other"});
  }
  return true;
}

bool Parser::leave(size_t start, std::string_view end)
{
  --nested_;
  if (take(end))
  {
    return true;
  }
  passBlanks();
  return at_ < text_.size() ? failHere() : fail(start, {"a ", text_.substr(start, 1), " without a ", end});
}

uint32_t Parser::add(Expression expression)
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

bool Parser::parseEither(uint32_t& out)
{
  return parseParts(out, Kind::either, "or", &Parser::parseBoth);
}

bool Parser::parseBoth(uint32_t& out)
{
  return parseParts(out, Kind::both, "and", &Parser::parseComparison);
}

bool Parser::parseParts(uint32_t& out, Kind kind, std::string_view word, bool (Parser::*parsePart)(uint32_t&))
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

bool Parser::parseComparison(uint32_t& out)
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

bool Parser::takeOperator(Operator& out) noexcept
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

bool Parser::isValue(uint32_t expression) const noexcept
{
  const Kind kind = path_.expressions[expression].kind;
  return kind == Kind::nodes || kind == Kind::text || kind == Kind::number;
}

bool Parser::parseSum(uint32_t& out)
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

bool Parser::addTerm(Expression& sum, const Expression& term, int64_t sign) noexcept
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

bool Parser::parseOperand(uint32_t& out)
{
  passBlanks();
  const size_t start = at_;
  const char c = peek();
  if (path_.expressions.size() >= kMostSteps)
  {
    return fail(at_, {"a path has at most ", std::to_string(kMostSteps), " conditions"});
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

bool Parser::parseText(uint32_t& out)
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

bool Parser::parseNumber(uint32_t& out)
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
    return fail(start, {quoted(number.text), " is no number"});
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

bool Parser::parseOffset(uint32_t& out)
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

bool Parser::parseFunction(size_t start, std::string_view name, uint32_t& out)
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
    return fail(start, {"no function is called ", quoted(name),
                        "; there are position, last, not, contains and starts-with"});
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

bool Parser::parseArgument(uint32_t& out)
{
  passBlanks();
  const size_t start = at_;
  return parseSum(out) && (isValue(out) || fail(start, "only values have a text"));
}

} // namespace tav::detail::paths
