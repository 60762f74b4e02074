// The routes of a path and their steps.
#include "layer/pathParser.h"

#include <algorithm>
#include <charconv>
#include <system_error>
#include <utility>

#include "layer/elementNames.h"
#include "tav/layout.hpp"
#include "tav/path/names.hpp"

namespace tav::detail::paths
{

namespace
{

constexpr size_t kMostParents = 500;    // `..` behind the first name
constexpr size_t kMostHardParents = 10; // `..` that do not follow a name: each may look a level further down

} // namespace

bool Parser::parse()
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
  keepOwnTags();
  return true;
}

void Parser::keepOwnTags()
{
  const auto asks = [](const Route& route) {
    return route.attribute == Attribute::id || route.attribute == Attribute::name;
  };
  if (!own_.empty() && std::any_of(path_.routes.begin(), path_.routes.end(), asks))
  {
    for (const dictionary::OwnName& name : own_)
    {
      path_.ownTags.push_back(name.id);
    }
    putInOrder(path_.ownTags);
  }
}

bool Parser::parseUnion(std::vector<uint32_t>& routes, bool inBrackets)
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

bool Parser::parseRoute(Route& route, bool inBrackets)
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

Step& Parser::addStep(Route& route)
{
  ++steps_;
  return route.steps.emplace_back();
}

void Parser::addLevels(Route& route)
{
  if (route.steps.empty() || route.steps.back().axis != Axis::descendantOrSelf)
  {
    addStep(route).axis = Axis::descendantOrSelf;
  }
}

void Parser::endLevels(Route& route)
{
  addStep(route).any = true;
}

bool Parser::parseStep(Route& route, bool& stars, bool inBrackets)
{
  passBlanks();
  if (steps_ >= kMostSteps)
  {
    return fail(at_, {"a path has at most ", std::to_string(kMostSteps), " steps"});
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

bool Parser::parseDots(Route& route)
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
      return fail(start, {"more than ", std::to_string(kMostParents), " '..' behind names"});
    }
    const Axis before = route.steps.empty() ? Axis::child : route.steps.back().axis;
    route.hasParents = true;
    hardParents_ += before != Axis::child ? 1 : 0;
    if (hardParents_ > kMostHardParents)
    {
      return fail(start, {"more than ", std::to_string(kMostHardParents), " '..' that follow no name"});
    }
    addStep(route).axis = Axis::parent;
  }
  passBlanks();
  return peek() != '[' || fail(at_, "brackets stand behind names and *, not behind dots");
}

std::string Parser::attributeList()
{
  std::string list = "there are";
  for (size_t i = 1; i < kAttributeNames.size(); ++i)
  {
    list += (i == 1 ? " " : ", ") + std::string(kAttributeNames[i]);
  }
  return list;
}

bool Parser::parseAttribute(Route& route)
{
  ++at_;
  const size_t start = at_;
  const std::string_view name = takeName(false);
  route.attribute = attributeNamed(name);
  if (name.empty())
  {
    return failHere();
  }
  if (route.attribute == Attribute::none)
  {
    return fail(start, {"no attribute is called ", quoted(name), "; ", attributeList()});
  }
  return true;
}

void Parser::setIds(Step& step, const std::vector<uint16_t>& ids)
{
  step.only = ids.empty() ? uint16_t{0} : ids.front();
  if (ids.size() > 1)
  {
    step.ids = ids;
  }
}

void Parser::tellUnknown(size_t start, std::string_view name)
{
  const std::string nearest(nearestTag(name, own_));
  std::string sentence = "no element is called " + quoted(name);
  if (!nearest.empty())
  {
    sentence.append("; did you mean ").append(nearest).append("?");
  }
  tell(PathFault::Kind::unknownName, start, std::move(sentence));
  fault_.nearest = nearest;
}

bool Parser::parseId(Step& step)
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
  if (!isId)
  {
    return fail(start, {quoted(whole), " is no id; they go from 0 to 65535"});
  }
  return true;
}

bool Parser::parseTest(Step& step)
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
    return fail(start, {"no function ", quoted(name), " leads to nodes"});
  }
  if (name.find_first_not_of('*') == std::string_view::npos)
  {
    return fail(start, {quoted(name), " is no pattern; * is any element, ** any number of levels"});
  }
  const std::vector<uint16_t> ids =
      name.find('*') == std::string_view::npos ? idsNamed(name, own_) : idsLike(name, own_);
  if (ids.empty() && fault_.kind == PathFault::Kind::none)
  {
    tellUnknown(start, name);
  }
  setIds(step, ids);
  return true;
}

bool Parser::isFirstOfOne(const Step& step) const noexcept
{
  const auto isFirst = [this](uint32_t index) {
    const Expression& place = path_.expressions[index];
    return place.kind == Kind::number && place.constant == 1 && !place.usesPlace;
  };
  return step.axis == Axis::child && !step.any && step.ids.empty() && !layout::isEndElement(step.only) &&
         (step.predicates.empty() || (step.predicates.size() == 1 && isFirst(step.predicates.front())));
}

void Parser::finish(Route& route)
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

} // namespace tav::detail::paths
