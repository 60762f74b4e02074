#include "tools/http/request.h"

#include <algorithm>
#include <array>
#include <charconv>

namespace tav::tool
{

namespace
{

constexpr int kBadRequest = 400;
constexpr int kMethodNotAllowed = 405;
constexpr int kRangeNotSatisfiable = 416;
constexpr int kVersionNotSupported = 505;

constexpr std::string_view kLineEnd = "\r\n";

bool isTokenCharacter(char c)
{
  constexpr std::string_view marks = "!#$%&'*+-.^_`|~";
  return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') ||
         marks.find(c) != std::string_view::npos;
}

bool isToken(std::string_view text)
{
  return !text.empty() && std::all_of(text.begin(), text.end(), isTokenCharacter);
}

bool isPlain(char c)
{
  return c > ' ' && c < '\x7F';
}

/// What a field's value may have: bytes above ASCII, too, but nothing that steers.
bool isOfValue(char c)
{
  return c == '\t' || (static_cast<unsigned char>(c) >= ' ' && c != '\x7F');
}

bool isSame(std::string_view name, std::string_view lower)
{
  return std::equal(name.begin(), name.end(), lower.begin(), lower.end(),
                    [](char a, char b) { return (a >= 'A' && a <= 'Z' ? static_cast<char>(a - 'A' + 'a') : a) == b; });
}

std::string_view trimmed(std::string_view text)
{
  constexpr std::string_view blanks = " \t";
  const size_t first = std::min(text.find_first_not_of(blanks), text.size());
  text.remove_prefix(first);
  return text.substr(0, text.find_last_not_of(blanks) + 1);
}

/// Takes the next line away; false when there is none.
bool takeLine(std::string_view& rest, std::string_view& line)
{
  const size_t end = rest.find(kLineEnd);
  if (end == std::string_view::npos)
  {
    return false;
  }
  line = rest.substr(0, end);
  rest.remove_prefix(end + kLineEnd.size());
  return true;
}

int readRequestLine(std::string_view line, HttpRequest& request)
{
  const size_t first = line.find(' ');
  const size_t second = first == std::string_view::npos ? first : line.find(' ', first + 1);
  if (second == std::string_view::npos)
  {
    return kBadRequest;
  }
  const std::string_view method = line.substr(0, first);
  const std::string_view target = line.substr(first + 1, second - first - 1);
  const std::string_view version = line.substr(second + 1);
  const bool isVersion = version.size() == 8 && version.starts_with("HTTP/");
  if (!isToken(method) || !target.starts_with('/') || !std::all_of(target.begin(), target.end(), isPlain) || !isVersion)
  {
    return kBadRequest;
  }
  if (version != "HTTP/1.1")
  {
    return kVersionNotSupported;
  }
  request.isHead = method == "HEAD";
  request.target = target;
  return method == "GET" || request.isHead ? 0 : kMethodNotAllowed;
}

/// The field that a name stands for, when it is one that matters.
std::string* fieldOf(HttpRequest& request, std::string_view name)
{
  struct Field
  {
    std::string_view name;
    std::string HttpRequest::*value;
  };
  constexpr std::array<Field, 5> fields = {{{"host", &HttpRequest::host},
                                            {"origin", &HttpRequest::origin},
                                            {"sec-fetch-site", &HttpRequest::site},
                                            {"range", &HttpRequest::range},
                                            {"if-match", &HttpRequest::match}}};
  const auto* const found =
      std::find_if(fields.begin(), fields.end(), [&](const Field& field) { return isSame(name, field.name); });
  return found == fields.end() ? nullptr : &(request.*found->value);
}

int readField(std::string_view line, HttpRequest& request)
{
  const size_t colon = std::min(line.find(':'), line.size());
  const std::string_view name = line.substr(0, colon);
  if (colon == line.size() || !isToken(name) || !std::all_of(line.begin(), line.end(), isOfValue))
  {
    return kBadRequest;
  }
  const std::string_view value = trimmed(line.substr(colon + 1));
  // What has a body is no request for a page; where such a body ended would be another question.
  if (isSame(name, "transfer-encoding") || (isSame(name, "content-length") && value != "0"))
  {
    return kBadRequest;
  }
  if (isSame(name, "connection"))
  {
    request.isLast = request.isLast || isSame(value, "close");
  }
  if (std::string* const field = fieldOf(request, name); field != nullptr)
  {
    if (!field->empty() || value.empty())
    {
      return kBadRequest; // twice, or without a word
    }
    *field = value;
  }
  return 0;
}

bool readNumber(std::string_view text, uint64_t& number)
{
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  return !text.empty() && error == std::errc() && end == text.data() + text.size();
}

} // namespace

int readRequest(std::string_view head, HttpRequest& request)
{
  std::string_view line;
  if (!takeLine(head, line))
  {
    return kBadRequest;
  }
  int status = readRequestLine(line, request);
  bool ended = false;
  while (status == 0 && !ended)
  {
    if (!takeLine(head, line))
    {
      return kBadRequest;
    }
    ended = line.empty();
    status = ended ? 0 : readField(line, request);
  }
  const bool isWhole = head.empty() && !request.host.empty();
  return status == 0 && !isWhole ? kBadRequest : status;
}

int readRange(std::string_view text, uint64_t size, HttpRange& range)
{
  constexpr std::string_view unit = "bytes=";
  if (!text.starts_with(unit))
  {
    return kBadRequest;
  }
  text.remove_prefix(unit.size());
  const size_t dash = text.find('-');
  if (dash == std::string_view::npos)
  {
    return kBadRequest;
  }
  const std::string_view from = text.substr(0, dash);
  const std::string_view to = text.substr(dash + 1);
  uint64_t last = 0;
  if (from.empty())
  {
    uint64_t count = 0;
    if (!readNumber(to, count))
    {
      return kBadRequest;
    }
    range = {size - std::min(count, size), size - 1};
    return count == 0 || size == 0 ? kRangeNotSatisfiable : 0;
  }
  if (!readNumber(from, range.first) || (!to.empty() && (!readNumber(to, last) || last < range.first)))
  {
    return kBadRequest;
  }
  range.last = to.empty() ? size - 1 : std::min(last, size - 1);
  return range.first < size ? 0 : kRangeNotSatisfiable;
}

} // namespace tav::tool
