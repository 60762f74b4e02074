#include "layer/elementNames.h"
#include "tav/cpp/chars.hpp"

namespace tav::detail
{

Chars tagOf(uint16_t id) noexcept
{
  const std::string_view tag = elementTag(id);
  return {tag.data(), tag.size()};
}

Chars nameOf(uint16_t id) noexcept
{
  const std::string_view name = elementName(id);
  return {name.data(), name.size()};
}

} // namespace tav::detail
