/// @file path.hpp
/// Paths: finding nodes by the names on the way. Always ends.
#pragma once

#include <algorithm>
#include <charconv>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tav/cpp/nearest.hpp"
#include "tav/cpp/ranges.hpp"

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
    ec.clear();
    if (!steps_.empty())
    {
      uint64_t farthest = start.offset();
      search(start, 0, visit, farthest, ec);
    }
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
    return !steps_.empty() && steps_.front().matches(node.elm()) && steps_.front().nth <= 1;
  }

  /// The path without its first step; empty for a path of one.
  [[nodiscard]] Path rest() const
  {
    Path path;
    if (!steps_.empty())
    {
      path.steps_.assign(steps_.begin() + 1, steps_.end());
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
    std::vector<uint16_t> ids; ///< empty: any
    uint64_t nth = 0;          ///< 0: every match
    uint16_t only = 0;         ///< the id, when there is one

    [[nodiscard]] bool matches(uint16_t elm) const noexcept
    {
      return ids.empty() || std::find(ids.begin(), ids.end(), elm) != ids.end();
    }
  };

  Path() = default;

  /// Whether each step asks for the first child with one id. Elements that end a group are no children of it here.
  [[nodiscard]] bool areStraight() const noexcept
  {
    return !steps_.empty() && std::all_of(steps_.begin(), steps_.end(), [](const Step& step) {
      return step.ids.size() == 1 && step.nth <= 1 && !layout::isEndElement(step.only);
    });
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
      if (!step.matches(child.elm()) || (step.nth != 0 && ++count != step.nth))
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
        const std::string_view before = path.substr(0, at + behind);
        const auto column = std::count_if(before.begin(), before.end(), [](char c) { return (c & 0xC0) != 0x80; });
        *fault = "column " + std::to_string(column + 1) + ": " + what;
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
      Step step;
      if (!parseStep(path.substr(at, slash - at), Spot{path, at, fault}, step))
      {
        steps_.clear();
        return TAV_RC_BAD_PARAM;
      }
      step.only = step.ids.size() == 1 ? step.ids.front() : uint16_t{0};
      steps_.push_back(std::move(step));
      at = slash + 1;
    }
    isStraight_ = areStraight();
    return TAV_RC_OK;
  }

  template<class Number>
  static bool parseNumber(std::string_view text, Number& number) noexcept
  {
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    return error == std::errc() && end == text.data() + text.size();
  }

  static bool parseStep(std::string_view text, const Spot& spot, Step& step)
  {
    const size_t bracket = text.find('[');
    const std::string_view name = text.substr(0, bracket);
    if (name.empty())
    {
      return spot.fail(0, "a step is empty");
    }
    if (name != "*" && !parseName(name, spot, step.ids))
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
    const bool isPlace = parseNumber(place, step.nth) && step.nth != 0;
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

  static bool parseName(std::string_view text, const Spot& spot, std::vector<uint16_t>& ids)
  {
    uint16_t id = 0;
    if (parseNumber(text.substr(text.front() == '#' ? 1 : 0), id))
    {
      ids.push_back(id);
      return true;
    }
    for (const dictionary::Entry& entry : dictionary::entries()) // several elements can share a tag
    {
      if (isNameOf(entry, text) && entry.constant != "INVALID_ELEMENT")
      {
        ids.push_back(entry.id);
      }
    }
    return !ids.empty() || failName(text, spot);
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

  std::vector<Step> steps_;
  bool isStraight_ = false; ///< findStraight can find it
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
