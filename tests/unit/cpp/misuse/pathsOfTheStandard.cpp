// EXPECT: filesystem
// The layer's header does not bring <filesystem>: who does not use it shall not pay for it.
#include "tav/tav.hpp"

bool isThere(const tav::FilePath& path)
{
  return std::filesystem::exists(path.text());
}
