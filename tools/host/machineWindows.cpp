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
  if (!GetComputerNameExW(ComputerNameDnsHostname, name.data(), &units)) return {};
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

MachineFacts describeMachine()
{
  constexpr const wchar_t* kVersion = L"SOFTWARE\\Microsoft\\Windows NT\\CurrentVersion";
  MachineFacts facts;
  facts.hostName = computerName();
  facts.machine = "x86_64";
  facts.osName = "Windows";
  facts.osRelease = registryText(kVersion, L"CurrentVersion");
  facts.osVersion = registryText(kVersion, L"CurrentBuildNumber");
  describeProcessors(facts.cpu);
  describeMemory(facts);
  return facts;
}
} // namespace tav::host
