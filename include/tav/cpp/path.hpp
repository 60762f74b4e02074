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
/// id (also as `#60105`) or `*`, each with `[n]` for the nth match among its siblings, from 1. A slash may lead.
class Path
{
public:
  /// TAV_RC_BAD_PARAM for a text that is no path, a name that no element has among them.
  explicit Path(std::string_view text)
  {
    detail::demand(parse(text), "reading a path");
  }
  Path(std::string_view text, std::error_code& ec)
  {
    detail::report(parse(text), ec);
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
  [[nodiscard]] bool beginsWith(const Node& node) const noexcept
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

  /// Whether there is nothing to search: after a failure, or what is left of a path of one step.
  [[nodiscard]] bool empty() const noexcept
  {
    return steps_.empty();
  }

private:
  struct Step
  {
    std::vector<uint16_t> ids; ///< empty: any
    uint64_t nth = 0;          ///< 0: every match

    [[nodiscard]] bool matches(uint16_t elm) const noexcept
    {
      return ids.empty() || std::find(ids.begin(), ids.end(), elm) != ids.end();
    }
  };

  Path() = default;

  /// One recursion a step: the path is the caller's, the stream's depth does not matter. False: enough.
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
      if (!(last ? visit(child) : search(child, level + 1, visit, ec)))
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

  uint32_t parse(std::string_view text)
  {
    text.remove_prefix(text.starts_with('/') ? 1 : 0);
    for (bool more = true; more;)
    {
      const size_t slash = text.find('/');
      more = slash != std::string_view::npos;
      Step step;
      if (!parseStep(text.substr(0, slash), step))
      {
        steps_.clear();
        return TAV_RC_BAD_PARAM;
      }
      steps_.push_back(std::move(step));
      text.remove_prefix(more ? slash + 1 : text.size());
    }
    return TAV_RC_OK;
  }

  template<class Number>
  static bool parseNumber(std::string_view text, Number& number) noexcept
  {
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    return error == std::errc() && end == text.data() + text.size();
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
    return text == "*" || (!text.empty() && parseName(text, step.ids));
  }

  static std::string_view trimmed(std::string_view name) noexcept
  {
    const size_t first = name.find_first_not_of(' ');
    const size_t end = name.find_last_not_of(' ') + 1;
    return first == std::string_view::npos ? std::string_view() : name.substr(first, end - first);
  }

  static bool parseName(std::string_view text, std::vector<uint16_t>& ids)
  {
    uint16_t id = 0;
    if (parseNumber(text.substr(text.front() == '#' ? 1 : 0), id))
    {
      ids.push_back(id);
      return true;
    }
    for (const dictionary::Entry& entry : dictionary::entries()) // several elements can share a tag
    {
      const bool named = entry.tag == text || entry.constant == text || trimmed(entry.name) == text;
      if (named && entry.constant != "INVALID_ELEMENT")
      {
        ids.push_back(entry.id);
      }
    }
    return !ids.empty();
  }

  std::vector<Step> steps_;
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
  std::optional<Node> found;
  const auto keep = [&found](const Node& node) {
    found = node;
    return false;
  };
  path.visitBelow(*this, keep, ec);
  return found;
}

inline std::optional<Node> Node::path(const Path& path) const
{
  std::error_code ec;
  std::optional<Node> found = this->path(path, ec);
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
