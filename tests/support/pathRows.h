/// One stream, and what paths lead to in it: the same for the layer and for the inspection library.
#pragma once

#include <cstddef>
#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

#include "tav/tav.hpp"

namespace test
{

/// In stream order, the numbers being those of the nodes:
///
///   0 system { 1 host { 2 hostName "ada", 3 cpu { 4 cpuOnline 8, 5 cpuConfig 12 }, 6 cpu { 7 cpuOnline 2 },
///                       8 memTotal 2^64 + 1 },
///              9 host { 10 hostName "bob", 11 os { 12 osName "Linux", 13 endHdrEyeSize },
///                       14 cpu { 15 cpuOnline -16 } },
///              16 db_conn_time, 17 element 63999 "e", 18 memFree (1 2) }
inline std::vector<std::byte> pathStream(const tav::StreamOptions& options)
{
  tav::Writer writer(options);
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_HOST_NAME, "ada");
      {
        tav::Group cpu = host.group(TAV_ELM_CMN_CPU);
        cpu.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
        cpu.add(TAV_ELM_CMN_CPU_CONFIG, uint64_t{12});
      }
      {
        tav::Group cpu = host.group(TAV_ELM_CMN_CPU);
        cpu.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{2});
      }
      host.add(TAV_ELM_CMN_MEM_TOTAL, tav::Uint128{1, 1});
    }
    {
      tav::Group host = system.group(TAV_ELM_CMN_HOST);
      host.add(TAV_ELM_CMN_HOST_NAME, tav::Utf8{"bob"});
      {
        tav::Group os = host.group(TAV_ELM_CMN_OS, {.eyeSize = true});
        os.add(TAV_ELM_CMN_OS_NAME, "Linux");
      }
      {
        tav::Group cpu = host.group(TAV_ELM_CMN_CPU);
        cpu.add(TAV_ELM_CMN_CPU_ONLINE, int32_t{-16});
      }
    }
    system.add(210, TAVTimeStamp{1714557630, 123, 456, 0, 0});
    system.add(63999, "e");
    system.add(TAV_ELM_CMN_MEM_FREE, std::vector<uint64_t>{1, 2});
  }
  writer.finish();
  const auto bytes = writer.bytes();
  return {bytes.begin(), bytes.end()};
}

struct PathRow
{
  const char* path;
  const char* nodes; ///< their numbers, with blanks between them
};

inline std::ostream& operator<<(std::ostream& out, const PathRow& row)
{
  return out << row.path;
}

/// From the roots.
inline constexpr PathRow kPathRows[] = {
    // Steps
    {"/system", "0"},
    {"system/host", "1 9"},
    {"/system/host/cpu/cpuOnline", "4 7 15"},
    {"/host", ""},
    {"//host", "1 9"},
    {"//system", "0"},
    {"/system//cpuOnline", "4 7 15"},
    {"//host//cpuOnline", "4 7 15"},
    {"//cpu/cpuConfig", "5"},
    {"/", "0"},
    {" / system / host ", "1 9"},
    // Names
    {"/TAV_ELM_CMN_SYSTEM/TAV_ELM_CMN_HOST", "1 9"},
    {"/#60100/60102", "1 9"},
    {"//#63999", "17"},
    {"//#63998", ""},
    {"/system/*", "1 9 16 17 18"},
    {"//*", "0 1 2 3 4 5 6 7 8 9 10 11 12 14 15 16 17 18"},
    {"//*Name", "2 10 12"},
    {"//cpu*", "3 4 5 6 7 14 15"},
    {"//*_conn_*", "16"},
    {"//mem*al", "8"},
    {"//endHdrEyeSize", "13"},
    {"//os/*", "12"},
    {"//os/*[2]", ""},
    {"//os/endHdrEyeSize[1]", "13"},
    {"//os/*[last()]", "12"},
    {"//endHdr*", "13"},
    {"//*ize*", ""},
    // Up, and the node itself
    {"//cpuOnline/..", "3 6 14"},
    {"//cpuOnline/../..", "1 9"},
    {"//cpuConfig/../../hostName", "2"},
    {"//osName/../../../host[1]", "1"},
    {"/system/..", ""},
    {"/system/../system", ""},
    {"/..", ""},
    {"..", ""},
    {"../system", ""},
    {".", ""},
    {"./system", "0"},
    {"/./system/./host/.", "1 9"},
    {"//.", "0 1 2 3 4 5 6 7 8 9 10 11 12 14 15 16 17 18"},
    {"//..", "0 1 2 3 4 5 6 7 8 9 10 11 12 14 15 16 17 18"},
    {"//cpu/.//..", "1 3 4 5 6 7 9 14 15"},
    {"//host//../cpuOnline", "4 7 15"},
    {"//..//..", "0 1 2 3 4 5 6 7 8 9 10 11 12 14 15 16 17 18"},
    {"//endHdrEyeSize/..", "11"},
    {"//host/cpu[2]/../memTotal", "8"},
    {"/system/host[2]/../*[last()]", "18"},
    // Places
    {"/system/host[1]", "1"},
    {"/system/host[2]/hostName", "10"},
    {"/system/host[3]", ""},
    {"/system/*[3]", "16"},
    {"//cpu[1]", "3 14"},
    {"//cpu[2]", "6"},
    {"//cpu[1]/*[1]", "4 15"},
    {"/system/*[last()]", "18"},
    {"/system/*[last()-1]", "17"},
    {"/system/*[last() - 1]", "17"},
    {"/system/*[-1]", "18"},
    {"/system/*[-2]", "17"},
    {"/system/*[-9]", ""},
    {"//cpu[last()]", "6 14"},
    {"//cpu[-1]", "6 14"},
    {"/system/*[position() <= 2]", "1 9"},
    {"/system/*[position() != 2]", "1 16 17 18"},
    {"/system/*[position() = last()]", "18"},
    {"/system/*[position() > 1 and position() < last()]", "9 16 17"},
    {"/system/*[position()+1 = 3]", "9"},
    {"/system/*[2 = position()]", "9"},
    {"/system[last()]", "0"},
    {"/system/host[os][1]", "9"},
    {"/system/*[*][2]", "9"},
    {"/system/*[hostName][last()]", "9"},
    {"/system/*[2][last()]", "9"},
    {"/system/*[position() > 1][2]", "16"},
    {"/system/*[position() > 1][-1]", "18"},
    {"//host/*[last()]/*[last()]", "15"},
    // Conditions
    {"//host[os]", "9"},
    {"//host[not(os)]", "1"},
    {"//host[os/osName]", "9"},
    {"//host[cpu/cpuConfig]/hostName", "2"},
    {"//host[.//cpuConfig]", "1"},
    {"//*[not(*)]", "2 4 5 7 8 10 12 15 16 17 18"},
    {"//*[endHdrEyeSize]", "11"},
    {"//host[hostName='ada']", "1"},
    {"//host[hostName=\"bob\"]/cpu/cpuOnline", "15"},
    {"//host['ada' = hostName]", "1"},
    {"//host[hostName!='ada']", "9"},
    {"//cpu[cpuOnline = 8]", "3"},
    {"//cpu[cpuOnline = '8']", "3"},
    {"//cpu[cpuOnline = 8.0]", "3"},
    {"//cpu[cpuOnline = ' 8 ']", ""},
    {"//cpu[cpuOnline > 2]", "3"},
    {"//cpu[cpuOnline >= 2]", "3 6"},
    {"//cpu[cpuOnline < 8]", "6 14"},
    {"//cpu[cpuOnline < -15.5]", "14"},
    {"//cpu[5 < cpuOnline]", "3"},
    {"//cpu['5' < cpuOnline]", "3"},
    {"//cpu[cpuOnline < cpuConfig]", "3"},
    {"//cpu[cpuOnline = cpuConfig]", ""},
    {"//host[cpu/cpuOnline = cpu/cpuOnline]", "1 9"},
    {"//host[cpu/cpuOnline != cpu/cpuOnline]", "1"},
    {"//host[cpu/cpuOnline > 7 and memTotal]", "1"},
    {"//host[os or memTotal]", "1 9"},
    {"//host[os and memTotal]", ""},
    {"//host[os or memTotal and hostName='x']", "9"},
    {"//host[(os or memTotal) and hostName='ada']", "1"},
    {"//host[not(os and memTotal)]", "1 9"},
    {"//host[cpu[2]]", "1"},
    {"//host[cpu[cpuOnline=2]]", "1"},
    {"//host[cpu[last()][cpuOnline=2]]", "1"},
    {"//cpu[../os]", "14"},
    {"//cpu[../hostName='ada']", "3 6"},
    {"//cpuOnline[../../hostName='ada']", "4 7"},
    {"//cpuOnline[../../../..]", ""},
    {"/system[..]", ""},
    {"//hostName[../cpu/cpuConfig]", "2"},
    {"//cpu[../cpu[2]]", "3 6"},
    {"//*[./cpuConfig]", "3"},
    {"//host[os | memTotal]", "1 9"},
    {"//cpu[cpuConfig | ../os]", "3 14"},
    {"//host[cpu/..]", "1 9"},
    {"//host[cpu/../os]", "9"},
    {"//host[cpu[../os]]", "9"},
    {"//host[.//..]", "1 9"},
    {"//*/..", "0 1 3 6 9 11 14"},
    {"//*[//host]", nullptr}, // no path
    // Numbers of any length
    {"//*[. = 18446744073709551617]", "8"},
    {"//*[. > 18446744073709551616]", "8"},
    {"//*[. >= 18446744073709551618]", ""},
    {"//*[. < 340282366920938463463374607431768211456]", "4 5 7 8 15"},
    {"//*[. > 18446744073709551616.5]", "8"},
    {"//*[. < 18446744073709551617]", "4 5 7 15"},
    // Values, attributes, parts of texts
    {"//*[.='Linux']", "12"},
    {"//*[. = 'bob']", "10"},
    {"//host[.='ada']", ""},
    {"//*[@type='Uint32']", "4 7"},
    {"//*[@type='group64']", "0 1 3 6 9 11 14"},
    {"//host[cpu/cpuOnline/@type='Sint32']", "9"},
    {"//*[@id]", "17"},
    {"//*[@id=63999]", "17"},
    {"//*[@header='64']", "0"},
    {"//*[@eyeSize]", "11"},
    {"//*[@eyeSize='true']/osName", "12"},
    {"//*[@encoding]", ""},
    {"//host[contains(hostName,'d')]", "1"},
    {"//*[contains(.,'inu')]", "12"},
    {"//*[starts-with(.,'b')]", "10"},
    {"//host[starts-with(hostName,'a') or contains(os/osName,'ux')]", "1 9"},
    {"//host[contains(hostName,'')]", "1 9"},
    {"//host[contains(os/osName,'')]", "1 9"},
    {"//host[contains('adams',hostName)]", "1"},
    {"//*[contains(@type,'int32')]", "4 7 15"},
    // Moments and arrays compare as texts
    {"//*[. = '2024-05-01T10:00:30.123456+00:00']", "16"},
    {"//db_conn_time[. > '2024-05-01T10:00']", "16"},
    {"//db_conn_time[. > '2024-05-01T11']", ""},
    {"//db_conn_time[. > 5]", ""},
    {"//memFree[. = '[1 2]']", "18"},
    {"//memFree[. = 1]", ""},
    // Both, and what XPath does not have
    {"//os | //hostName", "2 10 11"},
    {"//hostName | //os | //hostName", "2 10 11"},
    {"/system | //cpu[2]/cpuOnline | /system/host[1]", "0 1 7"},
    {"**", "0 1 2 3 4 5 6 7 8 9 10 11 12 14 15 16 17 18"},
    {"**/cpuOnline", "4 7 15"},
    {"/**/cpu[2]", "6"},
    {"/system/host/**", "2 3 4 5 6 7 8 10 11 12 14 15"},
    {"/system/**/cpuOnline", "4 7 15"},
    {"/system/**/**", "1 2 3 4 5 6 7 8 9 10 11 12 14 15 16 17 18"},
    {"/system[@0]", "0"},
    {"//*[@0x0]/host[1]", "1"},
    {"//host[@1]", ""},
};

/// From the second host.
inline constexpr PathRow kPathRowsFromNode[] = {
    {"hostName", "10"},
    {"*", "10 11 14"},
    {".", "9"},
    {".//cpuOnline", "15"},
    {"..", "0"},
    {"../..", ""},
    {"../host", "1 9"},
    {"../host[1]/cpu[2]", "6"},
    {"cpu/..", "9"},
    {"os/../../host", "1 9"},
    {"/system/host[1]", "1"},
    {"//cpuConfig", "5"},
    {"/", "0"},
    {"cpu[../../host/memTotal]", "14"},
    {"*[last()]", "14"},
    {"hostName | ../host[1] | /system", "0 1 10"},
    {"**", "10 11 12 14 15"},
    {"endHdrEyeSize", ""},
    {"os/endHdrEyeSize", "13"},
    {"system", ""},
};

} // namespace test
