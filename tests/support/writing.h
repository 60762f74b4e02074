/// What tests of the writer share.
#pragma once

#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "support/hex.h"
#include "support/streams.h"

namespace test
{

inline constexpr uint16_t kRoot = 20;                // 0x0014
inline constexpr uint16_t kBlob = 60001;             // 0xEA61
inline constexpr uint32_t kStorageCode = 0x90000777; ///< no code of the library

/// Direct and buffered, both byte orders, packed and aligned.
inline std::vector<Form> allForms()
{
  std::vector<Form> forms;
  for (const bool buffered : {false, true})
  {
    for (const bool swap : {false, true})
    {
      for (const bool align : {false, true})
      {
        forms.push_back({buffered, swap, align});
      }
    }
  }
  return forms;
}

/// Whether a stream of this form holds its numbers with the high byte first.
inline bool isBigEndian(const Form& form)
{
  return form.swap != kBigEndianHost;
}

/// Fills the place where a stream will be written, so that skipped bytes can be told from written ones.
inline void fillStorage(StreamWriter& writer, uint8_t value, size_t count = 1024)
{
  if (writer.form().buffered)
  {
    writer.vectorStorage().bytes.assign(count, value);
  }
  else
  {
    std::memset(writer.handle()->pDirectData, value, std::min<uint64_t>(count, writer.handle()->directDataSize));
  }
}

/// Takes the ring away from a handle for a while.
class WithoutRing
{
public:
  explicit WithoutRing(TAVHandle* handle)
      : handle_(handle), ring_(std::exchange(handle->pCircularBuf, nullptr))
  {
  }
  ~WithoutRing()
  {
    handle_->pCircularBuf = ring_;
  }
  WithoutRing(const WithoutRing&) = delete;
  WithoutRing& operator=(const WithoutRing&) = delete;

private:
  TAVHandle* handle_;
  TAVCircularBuf* ring_;
};

} // namespace test
