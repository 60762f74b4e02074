#include "tav/cpp/chars.hpp"
#include "tav/dictionary.hpp"

namespace tav::detail
{

Chars tagOf(uint16_t id) noexcept
{
  const std::string_view tag = dictionary::tagOf(id);
  return {tag.data(), tag.size()};
}

Chars nameOf(uint16_t id) noexcept
{
  const std::string_view name = dictionary::nameOf(id);
  return {name.data(), name.size()};
}

} // namespace tav::detail
