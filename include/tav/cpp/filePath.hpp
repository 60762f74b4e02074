/// @file filePath.hpp
/// Names of files, without the header that knows what can be done with them.
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <type_traits>

#include "tav/codes.h"
#include "tav/cpp/error.hpp"

namespace tav
{

namespace detail
{

/// Characters that stand for UTF-16 or UTF-32, whichever their size is.
template<class T>
concept WideCharacter = std::same_as<T, wchar_t> || std::same_as<T, char16_t> || std::same_as<T, char32_t>;

template<class T>
concept NarrowName = std::convertible_to<const T&, std::string_view> && !std::same_as<T, std::nullptr_t>;
template<class T>
concept Utf8Name = std::convertible_to<const T&, std::u8string_view> && !std::same_as<T, std::nullptr_t>;
template<class T>
concept WideName = !std::same_as<T, std::nullptr_t> && (std::convertible_to<const T&, std::wstring_view> ||
                                                        std::convertible_to<const T&, std::u16string_view> ||
                                                        std::convertible_to<const T&, std::u32string_view>);

/// std::filesystem::path, known by what it can do.
template<class T>
concept PathName = requires(const T& path)
{
  {
    path.u8string()
    } -> std::convertible_to<std::u8string_view>;
};
/// std::filesystem::directory_entry, likewise.
template<class T>
concept EntryName = requires(const T& entry)
{
  {
    entry.path()
    } -> PathName;
};

inline void appendUtf8(std::string& to, uint32_t letter)
{
  const auto put = [&to](uint32_t byte) { to += static_cast<char>(byte); };
  if (letter < 0x80)
  {
    put(letter);
    return;
  }
  if (letter < 0x800)
  {
    put(0xC0 | letter >> 6U);
  }
  else if (letter < 0x10000)
  {
    put(0xE0 | letter >> 12U);
    put(0x80 | (letter >> 6U & 0x3FU));
  }
  else
  {
    put(0xF0 | letter >> 18U);
    put(0x80 | (letter >> 12U & 0x3FU));
    put(0x80 | (letter >> 6U & 0x3FU));
  }
  put(0x80 | (letter & 0x3FU));
}

/// UTF-16 or UTF-32 as UTF-8. What is neither is no name.
template<WideCharacter Character>
std::string narrowed(std::basic_string_view<Character> wide)
{
  std::string text;
  for (size_t at = 0; at < wide.size(); ++at)
  {
    auto letter = static_cast<uint32_t>(wide[at]);
    const bool leads = letter >= 0xD800 && letter < 0xDC00 && sizeof(Character) == 2;
    const uint32_t next = leads && at + 1 < wide.size() ? static_cast<uint32_t>(wide[at + 1]) : 0;
    if (next >= 0xDC00 && next < 0xE000)
    {
      letter = 0x10000 + ((letter - 0xD800) << 10U) + (next - 0xDC00);
      ++at;
    }
    demand(letter > 0x10FFFF || (letter >= 0xD800 && letter < 0xE000) ? KOR_RC_BAD_NAME : TAV_RC_OK,
           "understanding a file's name");
    appendUtf8(text, letter);
  }
  return text;
}

} // namespace detail

/// The name of a file. Whatever makes a std::filesystem::path makes one, such a path among them; a program that has no
/// other use for `<filesystem>` does not have to compile it. Names in `char` are UTF-8 everywhere; wide ones that are
/// no text throw KOR_RC_BAD_NAME.
class FilePath
{
public:
  template<class Name>
  requires(detail::NarrowName<Name> || detail::Utf8Name<Name> || detail::WideName<Name> || detail::PathName<Name> ||
           detail::EntryName<Name>)
      // NOLINTNEXTLINE(google-explicit-constructor): names are given as they are at hand
      FilePath(const Name& name)
  {
    if constexpr (detail::PathName<Name>)
    {
      assign(name.u8string()); // string() throws where a locale lacks a letter
    }
    else if constexpr (detail::EntryName<Name>)
    {
      assign(name.path().u8string());
    }
    else if constexpr (detail::NarrowName<Name>)
    {
      text_ = std::string_view(name);
    }
    else if constexpr (detail::Utf8Name<Name>)
    {
      assign(name);
    }
    else
    {
      widen(name);
    }
  }

  /// In UTF-8, as a file is opened and as messages show it.
  [[nodiscard]] const std::string& text() const noexcept
  {
    return text_;
  }
  [[nodiscard]] const char* c_str() const noexcept
  {
    return text_.c_str();
  }

private:
  void assign(std::u8string_view name)
  {
    text_.assign(reinterpret_cast<const char*>(name.data()), name.size());
  }

  template<class Name>
  void widen(const Name& name)
  {
    if constexpr (std::convertible_to<const Name&, std::wstring_view>)
    {
      text_ = detail::narrowed(std::wstring_view(name));
    }
    else if constexpr (std::convertible_to<const Name&, std::u16string_view>)
    {
      text_ = detail::narrowed(std::u16string_view(name));
    }
    else
    {
      text_ = detail::narrowed(std::u32string_view(name));
    }
  }

  std::string text_;
};

} // namespace tav
