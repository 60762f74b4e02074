#include "kor/wideText.h"

#include <new>

#include "kor/windows.h"

namespace tav::kor
{
unsigned long widen(const char* pText, std::wstring& wide)
{
  const int units = MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, pText, -1, nullptr, 0);
  if (units <= 0)
  {
    return GetLastError();
  }
  try
  {
    wide.resize(static_cast<std::size_t>(units));
  }
  catch (const std::bad_alloc&)
  {
    return ERROR_NOT_ENOUGH_MEMORY;
  }
  if (MultiByteToWideChar(CP_UTF8, MB_ERR_INVALID_CHARS, pText, -1, wide.data(), units) <= 0)
  {
    return GetLastError();
  }
  wide.pop_back(); // the NUL, which the text has behind its end anyway
  return ERROR_SUCCESS;
}

std::string narrow(const wchar_t* pText)
{
  const int bytes = WideCharToMultiByte(CP_UTF8, 0, pText, -1, nullptr, 0, nullptr, nullptr);
  if (bytes <= 0)
  {
    return {};
  }
  std::string text(static_cast<std::size_t>(bytes), '\0');
  WideCharToMultiByte(CP_UTF8, 0, pText, -1, text.data(), bytes, nullptr, nullptr);
  text.pop_back();
  return text;
}
} // namespace tav::kor
