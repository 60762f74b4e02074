#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <io.h>
#include <process.h>
#include <thread>

#include "kor/host.h"
#include "kor/interruptedFiles.h"
#include "kor/wideText.h"
#include "kor/windows.h"

#include <shellapi.h> // behind the system's main header

namespace tav::kor
{
namespace
{
// What a signal's handler may look at.
InterruptedFiles<wchar_t> filesToRemove;
volatile std::sig_atomic_t held = 0;
volatile std::sig_atomic_t waiting = 0; ///< the number of a signal that came while it was held

extern "C" void endBySignal(int number)
{
  if (held != 0)
  {
    waiting = number;
    return;
  }
  filesToRemove.each([](const wchar_t* path) { DeleteFileW(path); });
  std::signal(number, SIG_DFL);
  std::raise(number);
}

std::string computerName()
{
  DWORD units = 0;
  GetComputerNameExW(ComputerNameDnsHostname, nullptr, &units);
  std::wstring name(units, L'\0');
  if (!GetComputerNameExW(ComputerNameDnsHostname, name.data(), &units)) return {};
  return narrow(name.c_str());
}

/// A value that the system keeps below the key of the first processor, or of the system's version.
std::string registryText(const wchar_t* pKey, const wchar_t* pValue)
{
  wchar_t text[256] = {};
  DWORD bytes = sizeof text - sizeof *text;
  const LSTATUS status =
      RegGetValueW(HKEY_LOCAL_MACHINE, pKey, pValue, RRF_RT_REG_SZ, nullptr, static_cast<void*>(text), &bytes);
  return status == ERROR_SUCCESS ? narrow(text) : std::string();
}

std::optional<uint64_t> registryNumber(const wchar_t* pKey, const wchar_t* pValue)
{
  DWORD number = 0;
  DWORD bytes = sizeof number;
  const LSTATUS status = RegGetValueW(HKEY_LOCAL_MACHINE, pKey, pValue, RRF_RT_REG_DWORD, nullptr, &number, &bytes);
  return status == ERROR_SUCCESS ? std::optional<uint64_t>(number) : std::nullopt;
}

void describeProcessors(CpuFacts& cpu)
{
  constexpr const wchar_t* kKey = L"HARDWARE\\DESCRIPTION\\System\\CentralProcessor\\0";
  cpu.vendor = registryText(kKey, L"VendorIdentifier");
  cpu.model = registryText(kKey, L"ProcessorNameString");
  cpu.megahertz = registryNumber(kKey, L"~MHz");
  SYSTEM_INFO system{};
  GetNativeSystemInfo(&system);
  cpu.configured = system.dwNumberOfProcessors;
  cpu.online = std::thread::hardware_concurrency();
}

void describeMemory(MachineFacts& facts)
{
  MEMORYSTATUSEX status{};
  status.dwLength = sizeof status;
  if (!GlobalMemoryStatusEx(&status)) return;
  facts.memTotal = status.ullTotalPhys;
  facts.memFree = status.ullAvailPhys;
  // The page file's numbers count the memory in.
  facts.swapTotal = status.ullTotalPageFile - std::min(status.ullTotalPageFile, status.ullTotalPhys);
  facts.swapFree = status.ullAvailPageFile - std::min(status.ullAvailPageFile, status.ullAvailPhys);
}
} // namespace

std::vector<std::string> commandLine(int argc, char** argv)
{
  // The words of `main` are in the code page of the machine, which cannot name every file.
  int count = 0;
  LPWSTR* const words = CommandLineToArgvW(GetCommandLineW(), &count);
  if (words == nullptr) return {argv + std::min(argc, 1), argv + argc};
  std::vector<std::string> texts;
  for (int i = 1; i < count; ++i) texts.push_back(narrow(words[i]));
  LocalFree(static_cast<HLOCAL>(words));
  return texts;
}

bool isTerminal(FILE* stream)
{
  return _isatty(_fileno(stream)) != 0;
}

std::optional<unsigned> terminalWidth()
{
  if (!isTerminal(stdout)) return std::nullopt;
  CONSOLE_SCREEN_BUFFER_INFO info{};
  if (GetConsoleScreenBufferInfo(GetStdHandle(STD_OUTPUT_HANDLE), &info) && info.srWindow.Right > info.srWindow.Left)
    return static_cast<unsigned>(info.srWindow.Right - info.srWindow.Left + 1);
  return 80;
}

void prepareStandardStreams()
{
  for (FILE* const stream : {stdin, stdout, stderr}) _setmode(_fileno(stream), _O_BINARY);
  for (const int number : {SIGINT, SIGTERM, SIGBREAK})
  {
    if (std::signal(number, endBySignal) == SIG_IGN) std::signal(number, SIG_IGN);
  }
}

void removeOnInterrupt(const std::string& path)
{
  std::wstring wide;
  if (widen(path.c_str(), wide) == ERROR_SUCCESS) filesToRemove.add(wide);
}

void keepOnInterrupt(const std::string& path)
{
  std::wstring wide;
  if (widen(path.c_str(), wide) == ERROR_SUCCESS) filesToRemove.drop(wide);
}

HeldInterrupts::HeldInterrupts()
{
  held = 1;
}

HeldInterrupts::~HeldInterrupts()
{
  held = 0;
  if (waiting != 0) endBySignal(waiting);
}

uint64_t processId()
{
  return GetCurrentProcessId();
}

MachineFacts describeMachine()
{
  constexpr const wchar_t* kVersion = L"SOFTWARE\\Microsoft\\Windows NT\\CurrentVersion";
  MachineFacts facts;
  facts.hostName = computerName();
  facts.machine = "x86_64";
  facts.osName = "Windows";
  facts.osRelease = registryText(kVersion, L"CurrentVersion");
  facts.osVersion = registryText(kVersion, L"CurrentBuildNumber");
  FILETIME now{};
  GetSystemTimeAsFileTime(&now);
  // In units of 100 ns since 1601.
  const uint64_t units = (uint64_t{now.dwHighDateTime} << 32) | now.dwLowDateTime;
  facts.bootSeconds = units / 10'000'000 - 11'644'473'600 - GetTickCount64() / 1000;
  describeProcessors(facts.cpu);
  describeMemory(facts);
  return facts;
}
} // namespace tav::kor
