/// @file path.hpp
/// Paths: finding nodes by the names on the way. Always ends.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tav/cpp/nearest.hpp"
#include "tav/cpp/ranges.hpp"
#include "tav/cpp/stack.hpp"

namespace tav
{

/// A path, read once and usable for any number of searches: steps between slashes, each a tag, an enum name, a decimal
/// id (also as `#60105`) or `*`, each with `[n]` for the nth of those that the step finds under the same parent, from
/// 1:
/// `*[2]` is the second child. A slash may lead.
class Path
{
public:
  /// TAV_RC_BAD_PARAM for a text that is no path, a name that no element has among them.
  explicit Path(std::string_view text)
      : Path(text, "understanding the path")
  {
  }
  Path(std::string_view text, std::error_code& ec)
  {
    detail::report(parse(text, nullptr), ec);
  }

  /// Calls `visit(node)` for every match below `start`, in stream order, until it returns false.
  template<class Visit>
  void visitBelow(const Node& start, Visit&& visit, std::error_code& ec) const
  {
    visitFrom(0, start, visit, ec);
  }

  /// The first match below `start`, when the first match of every step leads there; else null, which tells nothing.
  /// Over memory the library looks through a level without handing out what it passes.
  [[nodiscard]] std::optional<Node> findStraight(const Node& start) const noexcept
  {
    std::optional<Node> found;
    if (!isStraight_ || start.state_ == nullptr || !start.state_->isFast)
    {
      return found;
    }
    TAVHeaderData nodes[2];
    nodes[0].header = start.data_.header;
    size_t current = 0;
    for (const Step& step : steps_)
    {
      TAVHeaderData& parent = nodes[current];
      current ^= 1U;
      if (!layout::isGroup(parent.header) || tavFindElmInt(start.state_->handle, &parent.header, 0, 0, 0, step.only,
                                                           nullptr, nullptr, &nodes[current]) != TAV_RC_OK)
      {
        return found;
      }
    }
    found = Node(*start.state_, nodes[current]);
    found->parent_ = nodes[current ^ 1U].header;
    return found;
  }

  /// The first match below `start`, whatever leads there.
  void walkToFirst(const Node& start, std::optional<Node>& found, std::error_code& ec) const
  {
    const auto keep = [&found](const Node& node) {
      found = node;
      return false;
    };
    visitBelow(start, keep, ec);
  }

  /// Whether a node is what the path's first step asks for, so that the rest can be searched below it.
  [[nodiscard]] bool beginsWith(const Node& node) const noexcept
  {
    return !steps_.empty() && matches(steps_[0], node.elm()) && steps_[0].nth <= 1;
  }

  /// The path without its first step; empty for a path of one.
  [[nodiscard]] Path rest() const
  {
    Path path;
    path.ids_ = ids_;
    for (size_t i = 1; i < steps_.size(); ++i)
    {
      path.steps_.push(steps_[i]);
    }
    path.isStraight_ = path.areStraight();
    return path;
  }

  /// Whether there is nothing to search: after a failure, or what is left of a path of one step.
  [[nodiscard]] bool empty() const noexcept
  {
    return steps_.empty();
  }

private:
  friend class Reader;

  struct Step
  {
    size_t firstId = 0; ///< in ids_
    size_t idCount = 0; ///< 0: any
    uint64_t nth = 0;   ///< 0: every match
    uint16_t only = 0;  ///< the id, when there is one
  };

  Path() = default;

  [[nodiscard]] bool matches(const Step& step, uint16_t elm) const noexcept
  {
    bool isMatch = step.idCount == 0;
    for (size_t i = 0; i < step.idCount && !isMatch; ++i)
    {
      isMatch = ids_[step.firstId + i] == elm;
    }
    return isMatch;
  }

  /// Whether each step asks for the first child with one id. Elements that end a group are no children of it here.
  [[nodiscard]] bool areStraight() const noexcept
  {
    bool areAll = !steps_.empty();
    for (const Step& step : steps_)
    {
      areAll = areAll && step.idCount == 1 && step.nth <= 1 && !layout::isEndElement(step.only);
    }
    return areAll;
  }

  /// visitBelow with the steps from one on; nothing when there are none.
  template<class Visit>
  void visitFrom(size_t level, const Node& start, Visit&& visit, std::error_code& ec) const
  {
    ec.clear();
    if (level < steps_.size())
    {
      uint64_t farthest = start.offset();
      search(start, level, visit, farthest, ec);
    }
  }

  /// One recursion a step: the path is the caller's, the stream's depth does not matter. False: enough. Only damage
  /// leads to a node that does not stand behind the `last` one, and from there over the same nodes again.
  template<class Visit>
  bool search(const Node& parent, size_t level, Visit& visit, uint64_t& farthest, std::error_code& ec) const
  {
    const Step& step = steps_[level];
    uint64_t count = 0;
    for (const Node& child : parent.children(ec))
    {
      if (child.offset() <= farthest)
      {
        detail::report(TAV_RC_OUTSIDE_PARENT, ec);
        return false;
      }
      farthest = child.offset();
      if (!matches(step, child.elm()) || (step.nth != 0 && ++count != step.nth))
      {
        continue;
      }
      const bool last = level + 1 == steps_.size();
      if (!(last ? visit(child) : search(child, level + 1, visit, farthest, ec)))
      {
        return false;
      }
      if (step.nth != 0)
      {
        break;
      }
    }
    return !ec;
  }

  Path(std::string_view text, const char* doing)
  {
    std::string fault;
    const uint32_t rc = parse(text, &fault);
    detail::demand(rc, doing, [&] { return detail::Told{std::string(text), fault}; });
  }

  /// A place in a path, and where to tell what is wrong there.
  struct Spot
  {
    std::string_view path;
    size_t at;          ///< of the text's first byte
    std::string* fault; ///< null: nobody asks

    /// Tells that something is wrong at a place behind this one; always false.
    bool fail(size_t behind, const std::string& what) const
    {
      if (fault != nullptr)
      {
        size_t column = 1;
        for (const char c : path.substr(0, at + behind))
        {
          column += (c & 0xC0) != 0x80 ? 1 : 0;
        }
        *fault = "column " + std::to_string(column) + ": " + what;
      }
      return false;
    }
  };

  uint32_t parse(std::string_view path, std::string* fault)
  {
    size_t at = path.starts_with('/') ? 1 : 0;
    for (bool more = true; more;)
    {
      const size_t slash = path.find('/', at);
      more = slash != std::string_view::npos;
      Step step{.firstId = ids_.size()};
      if (!parseStep(path.substr(at, slash - at), Spot{path, at, fault}, step))
      {
        steps_.clear();
        return TAV_RC_BAD_PARAM;
      }
      steps_.push(step);
      at = slash + 1;
    }
    isStraight_ = areStraight();
    return TAV_RC_OK;
  }

  /// Decimal digits and nothing else.
  static bool parseNumber(std::string_view text, uint64_t most, uint64_t& number) noexcept
  {
    uint64_t sum = 0;
    for (const char c : text)
    {
      const auto digit = static_cast<uint64_t>(c - '0');
      if (c < '0' || c > '9' || sum > (most - digit) / 10)
      {
        return false;
      }
      sum = sum * 10 + digit;
    }
    number = sum;
    return !text.empty();
  }

  bool parseStep(std::string_view text, const Spot& spot, Step& step)
  {
    const size_t bracket = text.find('[');
    const std::string_view name = text.substr(0, bracket);
    if (name.empty())
    {
      return spot.fail(0, "a step is empty");
    }
    if (name != "*" && !parseName(name, spot, step))
    {
      return false;
    }
    if (bracket == std::string_view::npos)
    {
      return true;
    }
    if (!text.ends_with(']'))
    {
      return spot.fail(bracket, "a [ without a ] at the end of its step");
    }
    const std::string_view place = text.substr(bracket + 1, text.size() - bracket - 2);
    const bool isPlace = parseNumber(place, UINT64_MAX, step.nth) && step.nth != 0;
    return isPlace || spot.fail(bracket + 1, "'" + std::string(place) + "' is no place; the first is [1]");
  }

  static std::string_view trimmed(std::string_view name) noexcept
  {
    const size_t first = name.find_first_not_of(' ');
    const size_t end = name.find_last_not_of(' ') + 1;
    return first == std::string_view::npos ? std::string_view() : name.substr(first, end - first);
  }

  static bool isNameOf(const dictionary::Entry& entry, std::string_view text) noexcept
  {
    return entry.constant == text || entry.tag == text || trimmed(entry.tag) == text || entry.name == text ||
           trimmed(entry.name) == text;
  }

  bool parseName(std::string_view text, const Spot& spot, Step& step)
  {
    uint64_t id = 0;
    if (parseNumber(text.substr(text.front() == '#' ? 1 : 0), UINT16_MAX, id))
    {
      addId(static_cast<uint16_t>(id), step);
      return true;
    }
    for (const dictionary::Entry& entry : dictionary::entries()) // several elements can share a tag
    {
      if (isNameOf(entry, text) && entry.constant != "INVALID_ELEMENT")
      {
        addId(entry.id, step);
      }
    }
    return step.idCount != 0 || failName(text, spot);
  }

  void addId(uint16_t id, Step& step)
  {
    ids_.push(id);
    ++step.idCount;
    step.only = step.idCount == 1 ? id : uint16_t{0};
  }

  [[gnu::noinline, gnu::cold]] static bool failName(std::string_view text, const Spot& spot)
  {
    if (spot.fault == nullptr)
    {
      return false;
    }
    const std::string quoted = "'" + std::string(text) + "'";
    if (text.front() == '#' || (text.front() >= '0' && text.front() <= '9'))
    {
      return spot.fail(0, quoted + " is no id; they go from 0 to 65535");
    }
    const std::string_view nearest = detail::nearestTag(text);
    return spot.fail(0, "no element is called " + quoted +
                            (nearest.empty() ? "" : "; did you mean " + std::string(nearest) + "?"));
  }

  detail::Stack<Step> steps_;
  detail::Stack<uint16_t> ids_; ///< of all steps
  bool isStraight_ = false;     ///< findStraight can find it
};

inline std::vector<Node> Node::all(const Path& path, std::error_code& ec) const
{
  std::vector<Node> found;
  const auto keep = [&found](const Node& node) {
    found.push_back(node);
    return true;
  };
  path.visitBelow(*this, keep, ec);
  return found;
}

inline std::vector<Node> Node::all(const Path& path) const
{
  std::error_code ec;
  std::vector<Node> found = all(path, ec);
  detail::demand(codeOf(ec), "searching a path");
  return found;
}

inline std::vector<Node> Node::all(std::string_view path, std::error_code& ec) const
{
  const Path parsed(path, ec);
  return ec ? std::vector<Node>() : all(parsed, ec);
}

inline std::vector<Node> Node::all(std::string_view path) const
{
  return all(Path(path));
}

inline std::optional<Node> Node::path(const Path& path, std::error_code& ec) const
{
  std::optional<Node> found = path.findStraight(*this);
  if (found)
  {
    ec.clear();
    return found;
  }
  path.walkToFirst(*this, found, ec);
  return found;
}

inline std::optional<Node> Node::path(const Path& path) const
{
  std::optional<Node> found = path.findStraight(*this);
  if (found)
  {
    return found;
  }
  std::error_code ec;
  path.walkToFirst(*this, found, ec);
  detail::demand(codeOf(ec), "searching a path");
  return found;
}

inline std::optional<Node> Node::path(std::string_view path, std::error_code& ec) const
{
  const Path parsed(path, ec);
  return ec ? std::nullopt : this->path(parsed, ec);
}

inline std::optional<Node> Node::path(std::string_view path) const
{
  return this->path(Path(path));
}

} // namespace tav
