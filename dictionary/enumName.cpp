/// @file enumName.cpp
/// Enum names, stored or put together from a tag name.
#include "dictionary/dictionary.h"
#include "dictionary/namingRule.h"

#include <algorithm>

namespace tav::inside
{

EnumName::EnumName(std::string_view text)
    : length_(std::min(text.size(), kRoom - 1))
{
  *std::copy_n(text.data(), length_, text_.data()) = '\0';
}

EnumName EnumName::fromTag(const char* tagName)
{
  const std::string_view tag(tagName);
  EnumName name;
  char* const rest = std::copy(kEnumNamePrefix.begin(), kEnumNamePrefix.end(), name.text_.data());
  const size_t length = std::min(tag.size(), kRoom - 1 - kEnumNamePrefix.size());
  *std::transform(tag.data(), tag.data() + length, rest, capital) = '\0';
  name.length_ = kEnumNamePrefix.size() + length;
  return name;
}

} // namespace tav::inside
