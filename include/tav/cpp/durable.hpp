/// @file durable.hpp
/// When what was written is on the device.
#pragma once

#include <cstdint>
#include <string>

#include "tav/cpp/file.hpp"

namespace tav::detail
{

/// What a writer keeps for sync().
class Durable
{
public:
  /// The path of a file whose name may not be on the device yet.
  void name(const FilePath& path)
  {
    path_ = path.text();
  }

  /// Waits until a storage's bytes are on the device, and the name of its file. A failure stays: the system may have
  /// dropped what it could not write, and would tell the next one that all is well.
  uint32_t sync(TAVSideStorage& storage) noexcept
  {
    if (failed_ != TAV_RC_OK)
    {
      return failed_;
    }
    if (storage.kind != TAV_STORAGE_FILE)
    {
      return TAV_RC_NOT_SUPPORTED;
    }
    failed_ = static_cast<TAVSSFile&>(storage).pFile->syncData();
    if (failed_ == TAV_RC_OK && !path_.empty())
    {
      failed_ = korSyncFolderOf(path_.c_str());
      path_.clear();
    }
    return failed_;
  }

  [[nodiscard]] bool hasFailed() const noexcept
  {
    return failed_ != TAV_RC_OK;
  }

  /// What there is to say of a code that sync() gave; empty when it says all.
  [[nodiscard]] const char* refusal(uint32_t code) const noexcept
  {
    if (failed_ != TAV_RC_OK)
    {
      return "what was written since the last successful sync may be lost";
    }
    return code == TAV_RC_NOT_SUPPORTED ? "only files have a device to wait for" : "";
  }

private:
  std::string path_; ///< empty: the name is there, or there is none
  uint32_t failed_ = TAV_RC_OK;
};

} // namespace tav::detail
