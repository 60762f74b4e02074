/// @file namingRule.h
/// How the enum name of most elements follows from the tag name: a prefix and the tag in capital letters.
#pragma once

#include <cstddef>
#include <string_view>

namespace tav::inside
{

inline constexpr std::string_view kEnumNamePrefix = "SQLM_ELM_";

constexpr char capital(char letter)
{
  return letter >= 'a' && letter <= 'z' ? static_cast<char>(letter - 'a' + 'A') : letter;
}

constexpr bool followsFromTag(std::string_view enumName, std::string_view tagName)
{
  if (enumName.size() != kEnumNamePrefix.size() + tagName.size() || !enumName.starts_with(kEnumNamePrefix))
  {
    return false;
  }
  for (size_t i = 0; i < tagName.size(); ++i)
  {
    if (enumName[kEnumNamePrefix.size() + i] != capital(tagName[i]))
    {
      return false;
    }
  }
  return true;
}

} // namespace tav::inside
