/// @file plainPath.h
/// Paths of plain names and ids, as `host/cpu/#60104`, read without any memory: most that programs write are such.
#pragma once

#include <array>
#include <charconv>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>
#include <system_error>

#include "layer/elementNames.h"
#include "tav/layout.hpp"

namespace tav::detail::paths
{

/// The steps of such a path; none for every other text, which says nothing.
class PlainPath
{
public:
  struct Step
  {
    uint16_t only = 0;
  };

  explicit PlainPath(std::string_view text) noexcept
  {
    bool isPlain = true;
    for (bool isLast = false; isPlain && !isLast;)
    {
      const size_t end = text.find('/');
      isLast = end == std::string_view::npos;
      const std::optional<uint16_t> id = idOf(text.substr(0, end));
      isPlain = id && !layout::isEndElement(*id) && count_ < steps_.size();
      if (isPlain)
      {
        steps_[count_++].only = *id;
        text.remove_prefix(isLast ? text.size() : end + 1);
      }
    }
    count_ = isPlain ? count_ : 0;
  }

  [[nodiscard]] std::span<const Step> steps() const noexcept
  {
    return std::span(steps_).first(count_);
  }

private:
  /// Of a step that is an id or a tag of one element, with nothing around it.
  static std::optional<uint16_t> idOf(std::string_view step) noexcept
  {
    const std::string_view digits = step.substr(step.starts_with('#') ? 1 : 0);
    uint16_t id = 0;
    const auto [end, error] = std::from_chars(digits.data(), digits.data() + digits.size(), id);
    if (error == std::errc() && end == digits.data() + digits.size())
    {
      return id;
    }
    return onlyTagged(step);
  }

  std::array<Step, 16> steps_;
  size_t count_ = 0;
};

} // namespace tav::detail::paths
