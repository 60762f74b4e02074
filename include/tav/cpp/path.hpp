/// @file path.hpp
/// Paths: finding nodes by the names on the way. Always ends.
#pragma once

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <optional>
#include <string_view>
#include <utility>
#include <vector>

#include "tav/cpp/ranges.hpp"

namespace tav
{

/// A path, read once and usable for any number of searches: steps between slashes, each a tag, an enum name, a decimal
/// id or `*`, each with `[n]` for the nth match among its siblings, from 1. A leading slash is allowed.
class Path
{
public:
  explicit Path(std::string_view text)
  {
    detail::demand(parse(text), "reading a path");
  }
  Path(std::string_view text, std::error_code& ec)
  {
    ec = makeError(parse(text));
  }

  /// Calls `visit(node)` for every match below `start`, in stream order, until it returns false.
  template<class Visit>
  void visitBelow(const Node& start, Visit&& visit, std::error_code& ec) const
  {
    ec.clear();
    if (!steps_.empty())
    {
      search(start, 0, visit, ec);
    }
  }

  /// Whether a node is what the path's first step asks for, so that the rest can be searched below it.
  [[nodiscard]] bool beginsWith(const Node& node) const
  {
    return !steps_.empty() && steps_.front().matches(node.elm()) && steps_.front().nth <= 1;
  }

  /// The path without its first step; empty for a path of one.
  [[nodiscard]] Path rest() const
  {
    Path path;
    path.steps_.assign(steps_.begin() + (steps_.empty() ? 0 : 1), steps_.end());
    return path;
  }

  [[nodiscard]] bool empty() const
  {
    return steps_.empty();
  }

private:
  struct Step
  {
    std::vector<uint16_t> ids; ///< empty: any
    uint64_t nth = 0;          ///< 0: every match

    [[nodiscard]] bool matches(uint16_t elm) const
    {
      return ids.empty() || std::find(ids.begin(), ids.end(), elm) != ids.end();
    }
  };

  Path() = default;

  /// One recursion a step: the path is the caller's, the stream's depth does not matter.
  template<class Visit>
  bool search(const Node& parent, size_t level, Visit& visit, std::error_code& ec) const
  {
    const Step& step = steps_[level];
    uint64_t count = 0;
    for (const Node& child : parent.children(ec))
    {
      if (!step.matches(child.elm()) || (step.nth != 0 && ++count != step.nth))
      {
        continue;
      }
      const bool last = level + 1 == steps_.size();
      if (!(last ? visit(child) : search(Node(child), level + 1, visit, ec)))
      {
        return false;
      }
      if (ec || (step.nth != 0 && count == step.nth))
      {
        break;
      }
    }
    return !ec;
  }

  uint32_t parse(std::string_view text)
  {
    if (text.starts_with('/'))
    {
      text.remove_prefix(1);
    }
    while (!text.empty())
    {
      const size_t slash = text.find('/');
      Step step;
      if (!parseStep(text.substr(0, slash), step))
      {
        steps_.clear();
        return TAV_RC_BAD_PARAM;
      }
      steps_.push_back(std::move(step));
      text.remove_prefix(slash == std::string_view::npos ? text.size() : slash + 1);
    }
    return steps_.empty() ? TAV_RC_BAD_PARAM : TAV_RC_OK;
  }

  template<class Number>
  static bool parseNumber(std::string_view text, Number& number)
  {
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    return error == std::errc() && end == text.data() + text.size() && !text.empty();
  }

  static bool parseStep(std::string_view text, Step& step)
  {
    if (text.ends_with(']'))
    {
      const size_t bracket = text.rfind('[');
      if (bracket == std::string_view::npos ||
          !parseNumber(text.substr(bracket + 1, text.size() - bracket - 2), step.nth) || step.nth == 0)
      {
        return false;
      }
      text = text.substr(0, bracket);
    }
    return text == "*" || parseName(text, step.ids);
  }

  static bool parseName(std::string_view text, std::vector<uint16_t>& ids)
  {
    uint16_t id = 0;
    if (parseNumber(text, id))
    {
      ids.push_back(id);
      return true;
    }
    for (const dictionary::Entry& entry : dictionary::entries()) // several elements can share a tag
    {
      if (entry.tag == text || entry.name == text || entry.constant == text)
      {
        ids.push_back(entry.id);
      }
    }
    return !ids.empty();
  }

  std::vector<Step> steps_;
};

inline std::vector<Node> Node::all(std::string_view path, std::error_code& ec) const
{
  std::vector<Node> found;
  const Path parsed(path, ec);
  if (!ec)
  {
    parsed.visitBelow(
        *this,
        [&found](const Node& node) {
          found.push_back(node);
          return true;
        },
        ec);
  }
  return found;
}

inline std::vector<Node> Node::all(std::string_view path) const
{
  std::error_code ec;
  std::vector<Node> found = all(path, ec);
  detail::demand(codeOf(ec), "searching a path");
  return found;
}

inline std::optional<Node> Node::path(std::string_view path, std::error_code& ec) const
{
  std::optional<Node> found;
  const Path parsed(path, ec);
  if (!ec)
  {
    parsed.visitBelow(
        *this,
        [&found](const Node& node) {
          found = node;
          return false;
        },
        ec);
  }
  return found;
}

inline std::optional<Node> Node::path(std::string_view path) const
{
  std::error_code ec;
  std::optional<Node> found = this->path(path, ec);
  detail::demand(codeOf(ec), "searching a path");
  return found;
}

} // namespace tav
