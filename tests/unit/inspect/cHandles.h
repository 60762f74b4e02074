/// Streams and handles for the tests of the C interface.
#pragma once

#include <fstream>
#include <memory>
#include <string>

#include <gmock/gmock.h>

#include "cpp/layer.h"
#include "inspect/streams.h"
#include "tav/tav_c.h"

namespace test
{

static_assert(sizeof(tav_node) == (sizeof(void*) == 8 ? 80 : 72), "bindings without a compiler count on its layout");

inline constexpr tav_form kNative{kBigEndianHost ? uint8_t{2} : uint8_t{1}, 64, 1};

using CReader = std::unique_ptr<tav_reader, decltype(&tav_close)>;

inline CReader openMemory(const Bytes& bytes, const tav_form* form = &kNative)
{
  tav_reader* reader = nullptr;
  EXPECT_EQ(tav_open_memory(bytes.data(), bytes.size(), form, &reader), TAV_RC_OK);
  return {reader, &tav_close};
}

inline void writeFile(const std::filesystem::path& path, const Bytes& bytes)
{
  std::ofstream(path, std::ios::binary)
      .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}

inline CReader openFile(const std::filesystem::path& path, const tav_form* form = nullptr)
{
  tav_reader* reader = nullptr;
  EXPECT_EQ(tav_open_file(tav::FilePath(path).text().c_str(), form, &reader), TAV_RC_OK);
  return {reader, &tav_close};
}

/// What a writer in memory makes.
class CWriter
{
public:
  explicit CWriter(const tav_form* form = nullptr)
  {
    EXPECT_EQ(tav_create_memory(form, &writer), TAV_RC_OK);
  }
  ~CWriter()
  {
    tav_discard(&writer);
  }
  CWriter(const CWriter&) = delete;
  CWriter& operator=(const CWriter&) = delete;

  Bytes finish()
  {
    const void* bytes = nullptr;
    size_t size = 0;
    EXPECT_EQ(tav_finish(&writer, &bytes, &size), TAV_RC_OK);
    EXPECT_EQ(writer, nullptr);
    const auto* const first = static_cast<const uint8_t*>(bytes);
    Bytes made(first, first + size);
    tav_free(bytes);
    return made;
  }

  tav_writer* writer = nullptr;
};

/// A stream with a value of every kind.
inline Bytes valuesOf(const tav_form* form = &kNative)
{
  CWriter made(form);
  tav_writer* const writer = made.writer;
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_SYSTEM, 0), TAV_RC_OK);
  EXPECT_EQ(tav_add_u32(writer, TAV_ELM_CMN_CPU_ONLINE, 7), TAV_RC_OK);
  EXPECT_EQ(tav_add_u64(writer, 40001, UINT64_MAX), TAV_RC_OK);
  EXPECT_EQ(tav_add_i32(writer, 40002, -7), TAV_RC_OK);
  EXPECT_EQ(tav_add_i64(writer, 40003, INT64_MIN), TAV_RC_OK);
  EXPECT_EQ(tav_add_u128(writer, 40004, 1, 2), TAV_RC_OK);
  EXPECT_EQ(tav_add_text(writer, TAV_ELM_CMN_HOST_NAME, "ada", 3), TAV_RC_OK);
  EXPECT_EQ(tav_add_text(writer, TAV_ELM_CMN_OS_NAME, "gr\xC3\xBC\xC3\x9F", 6), TAV_RC_OK);
  EXPECT_EQ(tav_add_bytes(writer, 40005, "\0\1\2", 3), TAV_RC_OK);
  EXPECT_EQ(tav_add_time(writer, 40006, 1709202600123456789), TAV_RC_OK);
  EXPECT_EQ(tav_begin(writer, TAV_ELM_CMN_HOST, kNative.root_bits == 64 ? TAV_INFO_EYE_SIZE : 0), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  EXPECT_EQ(tav_end(writer), TAV_RC_OK);
  return made.finish();
}

inline tav_node found(const CReader& reader, const char* path)
{
  tav_node node{};
  EXPECT_EQ(tav_find(reader.get(), nullptr, path, &node), TAV_RC_OK) << tav_last_message(reader.get());
  return node;
}

} // namespace test
