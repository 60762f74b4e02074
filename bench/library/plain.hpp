/// What the entries of the plain operations share.
#pragma once

#include <cstdio>
#include <functional>

#include "bench/floor.hpp"
#include "bench/harness.hpp"
#include "tav/tav.h"

namespace library
{

/// A handle over a block of memory, opened and closed as a user does it.
class MemoryHandle
{
public:
  MemoryHandle(void* block, uint64_t size, uint64_t options)
      : storage_(block, size)
  {
    TAVInitParam param(&storage_, options);
    tavInitHandle(&handle_, &param);
  }
  ~MemoryHandle()
  {
    if (handle_ != nullptr)
    {
      tavTermHandle(&handle_);
    }
  }
  MemoryHandle(const MemoryHandle&) = delete;
  MemoryHandle& operator=(const MemoryHandle&) = delete;

  [[nodiscard]] TAVHandle* get() const { return handle_; }

private:
  TAVSSMemory storage_;
  TAVHandle* handle_ = nullptr;
};

/// The encoded workload as the library takes it; reading writes nothing.
inline char* encoded()
{
  return const_cast<char*>(floor0::stream().data());
}

inline uint64_t encodedSize()
{
  return floor0::stream().size();
}

/// @name The passes: one each. A size or a sum of 0 is a failure.
/// @{
/// How callers fill their descriptors. Only the first gives a payload's size in `dataBufSize`: the others leave it to
/// the header's.
enum class Filling : uint8_t
{
  sized,       ///< one descriptor, kept and changed
  kept,        ///< likewise
  zeroed,      ///< one for each leaf, zeroed and assigned to
  initialized, ///< one for each leaf, all members at once
};
size_t encodePlain(const snapshot::Model& model, void* block, uint64_t size, Filling filling = Filling::sized,
                   size_t hosts = 1);
uint64_t walkPlain(void* block, uint64_t size);
/// `stack`: null, or an empty one that serves all searches.
uint64_t findPlain(TAVHandle* handle, const snapshot::Path& path, TAVHdrStack* stack);
bool validatePlain(void* block, uint64_t size);
/// Prints to `param`; returns the characters.
size_t printPlain(void* block, uint64_t size, TAVPrintParam param, uint64_t options);
/// The characters of the workload's XML, which `printed` writes once into a stream in memory: 0 unless every leaf and
/// group is there with its value.
size_t checkedXmlBytes(const std::function<size_t(std::FILE*)>& printed);
inline constexpr uint64_t kXml = TAV_PRINT_SUBTREE | TAV_PRINT_DATA | TAV_PRINT_XML;
/// @}

} // namespace library
