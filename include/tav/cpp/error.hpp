/// @file error.hpp
/// Return codes as std::error_code.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>
#include <system_error>
#include <type_traits>

#include "tav/codes.h"

namespace tav
{

namespace detail
{

struct CodeText
{
  uint32_t code;
  const char* name;
  const char* sentence;
};

inline constexpr CodeText kCodeTexts[] = {
#define TAV_CODE_TEXT(name, value, sentence) {value, #name, sentence},
    TAV_CODE_LIST(TAV_CODE_TEXT)
#undef TAV_CODE_TEXT
};

/// The name and the sentence of a code.
inline const CodeText* codeTextOf(uint32_t code) noexcept
{
  for (const CodeText& text : kCodeTexts)
  {
    if (text.code == code)
    {
      return &text;
    }
  }
  return nullptr;
}

class Category : public std::error_category
{
public:
  [[nodiscard]] const char* name() const noexcept override
  {
    return "tav";
  }

  /// "TAV_RC_NOT_FOUND: nothing was found, or no group is open"
  [[nodiscard]] std::string message(int value) const override
  {
    const CodeText* const text = codeTextOf(static_cast<uint32_t>(value));
    return text != nullptr ? std::string(text->name) + ": " + text->sentence : "unknown code";
  }

  [[nodiscard]] std::error_condition default_error_condition(int value) const noexcept override
  {
    switch (static_cast<uint32_t>(value))
    {
    case TAV_RC_NO_MEMORY:
      return std::errc::not_enough_memory;
    case TAV_RC_NOT_SUPPORTED:
      return std::errc::not_supported;
    case TAV_RC_BAD_PARAM:
      return std::errc::invalid_argument;
    case KOR_RC_NO_SUCH_FILE:
      return std::errc::no_such_file_or_directory;
    case KOR_RC_NO_PERMISSION:
      return std::errc::permission_denied;
    case KOR_RC_NO_SPACE:
      return std::errc::no_space_on_device;
    case KOR_RC_IS_FOLDER:
      return std::errc::is_a_directory;
    case KOR_RC_IO_ERROR:
      return std::errc::io_error;
    case KOR_RC_FILE_EXISTS:
      return std::errc::file_exists;
    default:
      return {value, *this};
    }
  }
};

} // namespace detail

/// The category "tav". A code's value is the return code.
inline const std::error_category& category() noexcept
{
  static const detail::Category instance;
  return instance;
}

/// A return code as std::error_code; 0 is no error.
inline std::error_code makeError(uint32_t code) noexcept
{
  return code == TAV_RC_OK ? std::error_code() : std::error_code(static_cast<int>(code), category());
}

/// The return code in an error of this category; TAV_RC_OK for no error and for errors of others.
inline uint32_t codeOf(const std::error_code& error) noexcept
{
  return error && error.category() == category() ? static_cast<uint32_t>(error.value()) : TAV_RC_OK;
}

namespace detail
{

/// Out of line: what a program rarely does costs the places where it does it no room.
[[noreturn, gnu::noinline, gnu::cold]] inline void raise(uint32_t code, const char* what)
{
  throw std::system_error(makeError(code), what);
}

/// The form with an error code of an operation.
inline void report(uint32_t code, std::error_code& ec) noexcept
{
  ec = makeError(code);
}

/// What is known of a failure beside its code: what it was done with, and a sentence that says more than the code's.
struct Told
{
  std::string about;
  std::string sentence;
};

/// A failure of which more is known than its code says: "adding cpu (60004): TAV_RC_BAD_PARAM: the group is closed".
class ToldError : public std::system_error
{
public:
  ToldError(uint32_t code, const std::string& text)
      : std::system_error(makeError(code)), text_(text)
  {
  }
  [[nodiscard]] const char* what() const noexcept override
  {
    return text_.what();
  }

private:
  std::runtime_error text_; ///< whose copies cannot fail
};

/// As raise, for a failure of which there may be more to say.
[[noreturn, gnu::noinline, gnu::cold]] inline void raiseTold(uint32_t code, const char* what, const Told& told)
{
  const std::string text = told.about.empty() ? std::string(what) : std::string(what) + ' ' + told.about;
  const CodeText* const known = codeTextOf(code);
  if (told.sentence.empty() || known == nullptr)
  {
    throw std::system_error(makeError(code), text);
  }
  throw ToldError(code, text + ": " + known->name + ": " + told.sentence);
}

/// The same where more can be said: `about` says what it was done with.
template<class About>
[[noreturn, gnu::noinline, gnu::cold]] void raiseAbout(uint32_t code, const char* what, const About& about)
{
  if constexpr (std::is_same_v<decltype(about()), Told>)
  {
    raiseTold(code, what, about());
  }
  else
  {
    throw std::system_error(makeError(code), std::string(what) + ' ' + about());
  }
}

/// The throwing form of an operation: nothing for success.
inline void demand(uint32_t code, const char* what)
{
  if (code != TAV_RC_OK) [[unlikely]]
  {
    raise(code, what);
  }
}

/// The same, where `about()` makes a text of what it was done with, or a Told; it is called after a failure alone.
template<class About>
void demand(uint32_t code, const char* what, const About& about)
{
  if (code != TAV_RC_OK) [[unlikely]]
  {
    raiseAbout(code, what, about);
  }
}

} // namespace detail

} // namespace tav
