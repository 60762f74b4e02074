#include <algorithm>
#include <thread>

#include "kor/wideText.h"
#include "kor/windows.h"
#include "tools/host/machine.h"

namespace tav::host
{
using kor::narrow;

namespace
{
std::string computerName()
{
  DWORD units = 0;
  GetComputerNameExW(ComputerNameDnsHostname, nullptr, &units);
  std::wstring name(units, L'\0');
  if (!GetComputerNameExW(ComputerNameDnsHostname, name.data(), &units))
  {
    return {};
  }
  return narrow(name.c_str());
}

/// A value that the system keeps below a key.
std::string registryText(const wchar_t* pKey, const wchar_t* pValue)
{
  wchar_t text[256] = {};
  DWORD bytes = sizeof text - sizeof *text;
  const LSTATUS status =
      RegGetValueW(HKEY_LOCAL_MACHINE, pKey, pValue, RRF_RT_REG_SZ, nullptr, static_cast<void*>(text), &bytes);
  return status == ERROR_SUCCESS ? narrow(text) : std::string();
}

void describeProcessors(CpuFacts& cpu)
{
  SYSTEM_INFO system{};
  GetNativeSystemInfo(&system);
  cpu.configured = system.dwNumberOfProcessors;
  cpu.online = std::thread::hardware_concurrency();
}

void describeMemory(MemoryFacts& memory)
{
  MEMORYSTATUSEX status{};
  status.dwLength = sizeof status;
  if (!GlobalMemoryStatusEx(&status))
  {
    return;
  }
  memory.total = status.ullTotalPhys;
  memory.free = memory.available = status.ullAvailPhys;
  // The page file's numbers count the memory in.
  memory.swapTotal = status.ullTotalPageFile - std::min(status.ullTotalPageFile, status.ullTotalPhys);
  memory.swapFree = status.ullAvailPageFile - std::min(status.ullAvailPageFile, status.ullAvailPhys);
}

uint64_t millisecondsOf(const FILETIME& time)
{
  constexpr uint64_t perMillisecond = 10000;
  return ((uint64_t{time.dwHighDateTime} << 32U) | time.dwLowDateTime) / perMillisecond;
}
} // namespace

MachineFacts Machine::look()
{
  constexpr const wchar_t* kVersion = L"SOFTWARE\\Microsoft\\Windows NT\\CurrentVersion";
  MachineFacts facts;
  facts.hostName = computerName();
  facts.machine = "x86_64";
  facts.osName = "Windows";
  facts.osRelease = registryText(kVersion, L"CurrentVersion");
  facts.osVersion = registryText(kVersion, L"CurrentBuildNumber");
  describeProcessors(facts.cpu);
  describeMemory(facts.memory);
  facts.load.uptime = GetTickCount64() / 1000;
  FILETIME idle{};
  FILETIME kernel{}; // with the idle time
  FILETIME user{};
  if (GetSystemTimes(&idle, &kernel, &user))
  {
    facts.cpu.idleTime = millisecondsOf(idle);
    facts.cpu.userTime = millisecondsOf(user);
    facts.cpu.systemTime = millisecondsOf(kernel) - std::min(millisecondsOf(kernel), millisecondsOf(idle));
    const uint64_t busy = *facts.cpu.userTime + *facts.cpu.systemTime;
    const uint64_t whole = busy + *facts.cpu.idleTime;
    if (busy >= busy_ && whole > whole_) facts.cpu.usage = (busy - busy_) * 100 / (whole - whole_);
    busy_ = busy;
    whole_ = whole;
  }
  return facts;
}
} // namespace tav::host
