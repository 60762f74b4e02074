/// Files that grow, for the tests of following.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <initializer_list>

#include "cpp/layer.h"
#include "support/byteRows.h"
#include "tav/inspect/follow.hpp"
#include "tav/tav.hpp"

namespace test
{

inline void append(const std::filesystem::path& path, const Bytes& bytes)
{
  std::ofstream(path, std::ios::binary | std::ios::app)
      .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

/// Writes over bytes that are there.
inline void patch(const std::filesystem::path& path, uint64_t offset, const Bytes& bytes)
{
  std::fstream file(path, std::ios::binary | std::ios::in | std::ios::out);
  file.seekp(static_cast<std::streamoff>(offset));
  file.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

inline Bytes part(const Bytes& bytes, size_t from, size_t to)
{
  return {bytes.begin() + static_cast<ptrdiff_t>(from), bytes.begin() + static_cast<ptrdiff_t>(to)};
}

inline Bytes numbers(std::initializer_list<uint32_t> all, bool swap = false, uint16_t root = TAV_ELM_CMN_SYSTEM)
{
  tav::Writer writer({.byteOrder = swap ? tav::ByteOrder::swapped : tav::ByteOrder::native});
  {
    tav::Group system = writer.group(root);
    for (const uint32_t number : all)
    {
      system.add(TAV_ELM_CMN_CPU_ONLINE, number);
    }
  }
  writer.finish();
  return bytesOf(writer.bytes());
}

/// The header of a group as a writer leaves it while the group is open.
inline Bytes openHeader(uint16_t elm)
{
  ByteRows rows;
  rows.h64(TAV_SIZE_UNKNOWN, 0, TAV_TYPE_HEADER64, elm);
  return rows.bytes;
}

inline Bytes number(uint32_t value)
{
  ByteRows rows;
  rows.h64(4, 0, TAV_TYPE_UINT32, TAV_ELM_CMN_CPU_ONLINE);
  rows.number(value, 4);
  return rows.bytes;
}

inline Bytes sizeBytes(uint64_t size)
{
  ByteRows rows;
  rows.number(size, 8);
  return rows.bytes;
}

} // namespace test
