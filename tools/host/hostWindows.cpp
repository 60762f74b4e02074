#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <io.h>
#include <process.h>

#include "kor/wideText.h"
#include "kor/windows.h"
#include "tools/host/host.h"
#include "tools/host/interruptedFiles.h"
#include "tools/host/interrupts.h"

#include <shellapi.h> // behind the system's main header

namespace tav::host
{
using kor::narrow;
using kor::widen;

namespace
{
InterruptedFiles<wchar_t> filesToRemove; // which the handler of a signal may look at
} // namespace

extern "C" void endBySignal(int number)
{
  if (!endsNow(number))
  {
    std::signal(number, endBySignal); // which each signal resets
    return;
  }
  filesToRemove.each([](const wchar_t* path) { DeleteFileW(path); });
  std::signal(number, SIG_DFL);
  std::raise(number);
}

std::vector<std::string> commandLine(int argc, char** argv)
{
  // The words of `main` are in the code page of the machine, which cannot name every file.
  int count = 0;
  LPWSTR* const words = CommandLineToArgvW(GetCommandLineW(), &count);
  if (words == nullptr)
  {
    return {argv + std::min(argc, 1), argv + argc};
  }
  std::vector<std::string> texts;
  for (int i = 1; i < count; ++i) texts.push_back(narrow(words[i]));
  LocalFree(static_cast<HLOCAL>(words));
  return texts;
}

std::filesystem::path programPath()
{
  constexpr size_t kLongest = 32768; // of a path, with its end
  std::wstring path(kLongest, L'\0');
  path.resize(GetModuleFileNameW(nullptr, path.data(), static_cast<DWORD>(path.size())));
  return {path};
}

std::vector<std::string> pathList(const char* variable)
{
  std::wstring name;
  const wchar_t* const value = widen(variable, name) == ERROR_SUCCESS ? _wgetenv(name.c_str()) : nullptr;
  return separated(value == nullptr ? std::string() : narrow(value), ';');
}

bool isTerminal(FILE* stream)
{
  return _isatty(_fileno(stream)) != 0;
}

std::optional<unsigned> terminalWidth()
{
  if (!isTerminal(stdout))
  {
    return std::nullopt;
  }
  CONSOLE_SCREEN_BUFFER_INFO info{};
  if (GetConsoleScreenBufferInfo(GetStdHandle(STD_OUTPUT_HANDLE), &info) && info.srWindow.Right > info.srWindow.Left)
    return static_cast<unsigned>(info.srWindow.Right - info.srWindow.Left + 1);
  return 80;
}

/// The console scrolls by itself.
Pager::Pager(const std::string&) {}

Pager::~Pager() = default;

void prepareStandardStreams()
{
  for (FILE* const stream : {stdin, stdout, stderr}) _setmode(_fileno(stream), _O_BINARY);
  for (const int number : {SIGINT, SIGTERM, SIGBREAK})
  {
    if (std::signal(number, endBySignal) == SIG_IGN)
    {
      std::signal(number, SIG_IGN);
    }
  }
}

void removeOnInterrupt(const std::string& path)
{
  std::wstring wide;
  if (widen(path.c_str(), wide) == ERROR_SUCCESS)
  {
    filesToRemove.add(wide);
  }
}

void keepOnInterrupt(const std::string& path)
{
  std::wstring wide;
  if (widen(path.c_str(), wide) == ERROR_SUCCESS)
  {
    filesToRemove.drop(wide);
  }
}

uint64_t processId()
{
  return GetCurrentProcessId();
}
} // namespace tav::host
