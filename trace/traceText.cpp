#include <algorithm>
#include <cinttypes>
#include <cstdio>
#include <cstring>
#include <new>
#include <string>

#include "tav/kor.h"

namespace
{
constexpr uint64_t kLongestText = 256; ///< characters of a text that are shown
constexpr uint64_t kLongestHex = 64;   ///< bytes of other data that are shown

const char* wordOf(KORTraceKind kind)
{
  switch (kind)
  {
  case KOR_TRACE_ENTRY:
    return "entry";
  case KOR_TRACE_EXIT:
    return "exit";
  case KOR_TRACE_VAR:
    return "var";
  case KOR_TRACE_ERROR:
    return "error";
  }
  return "?";
}

bool isPrintable(uint8_t byte)
{
  return byte >= 0x20 && byte <= 0x7E;
}

void appendLengthWhenCut(std::string& line, uint64_t length, uint64_t shown)
{
  if (shown < length)
  {
    line += "... (" + std::to_string(length) + " bytes)";
  }
}

void appendText(std::string& line, const uint8_t* bytes, uint64_t length)
{
  const uint64_t shown = std::min(length, kLongestText);
  line += '"';
  for (uint64_t i = 0; i < shown; ++i)
  {
    const char character = static_cast<char>(bytes[i]);
    if (character == '"' || character == '\\')
    {
      line += '\\';
    }
    line += character;
  }
  line += '"';
  appendLengthWhenCut(line, length, shown);
}

template<class Number>
void appendNumber(std::string& line, const uint8_t* bytes)
{
  Number number = 0;
  std::memcpy(&number, bytes, sizeof number);
  line += std::to_string(number);
}

void appendHex(std::string& line, const uint8_t* bytes, uint64_t length)
{
  constexpr char kDigits[] = "0123456789ABCDEF";
  const uint64_t shown = std::min(length, kLongestHex);
  line += "hex ";
  for (uint64_t i = 0; i < shown; ++i)
  {
    line += kDigits[bytes[i] >> 4];
    line += kDigits[bytes[i] & 0xF];
  }
  appendLengthWhenCut(line, length, shown);
}

void appendItem(std::string& line, const KORTraceItem& item)
{
  const auto* const bytes = static_cast<const uint8_t*>(item.pData);
  if (bytes == nullptr)
    line += "null";
  else if (std::all_of(bytes, bytes + item.length, isPrintable))
    appendText(line, bytes, item.length);
  else if (item.length == sizeof(uint8_t))
    appendNumber<uint8_t>(line, bytes);
  else if (item.length == sizeof(uint16_t))
    appendNumber<uint16_t>(line, bytes);
  else if (item.length == sizeof(uint32_t))
    appendNumber<uint32_t>(line, bytes);
  else if (item.length == sizeof(uint64_t))
    appendNumber<uint64_t>(line, bytes);
  else
    appendHex(line, bytes, item.length);
}

std::string lineOf(const KORTraceRecord& record)
{
  char head[128];
  korSnprintf(head, sizeof head, "%-5s thread %" PRIu32 " probe 0x%08" PRIX32 " point %" PRIu32, wordOf(record.kind),
              record.threadId, record.probe, record.point);
  std::string line = head;

  const bool hasCode = record.kind == KOR_TRACE_EXIT || record.kind == KOR_TRACE_ERROR;
  if (hasCode)
  {
    korSnprintf(head, sizeof head, " code 0x%08" PRIX32 " %s", record.code, korCodeName(record.code));
    line += head;
  }
  // The first item of an error is its code, which is there already.
  for (uint32_t i = record.kind == KOR_TRACE_ERROR ? 1 : 0; i < record.itemCount; ++i)
  {
    line += i == 0 || hasCode ? " " : ", ";
    appendItem(line, record.pItems[i]);
  }
  line += '\n';
  return line;
}
} // namespace

void korTraceTextSink(void* context, const KORTraceRecord* record)
{
  if (context == nullptr || record == nullptr)
  {
    return;
  }
  try
  {
    // One fwrite a line: the stream's lock keeps the lines of several threads apart.
    const std::string line = lineOf(*record);
    std::fwrite(line.data(), 1, line.size(), static_cast<std::FILE*>(context));
  }
  catch (const std::bad_alloc&)
  {
    // The record is lost; the traced function must not fail for it.
  }
}
