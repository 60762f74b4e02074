#include "inspect/document/followedFile.h"

#include <algorithm>

namespace tav::inspect
{

uint32_t FollowedFile::look()
{
  needed_ = 0;
  isShort_ = false;
  const uint32_t code = TAVSSFile::getTotalSize(&size_);
  end_ = size_;
  return code;
}

uint32_t FollowedFile::getTotalSize(uint64_t* size)
{
  *size = size_;
  return TAV_RC_OK;
}

uint32_t FollowedFile::read(uint64_t wanted, void** data, uint64_t room, uint64_t* done, bool zeroCopy, bool backward)
{
  const uint64_t from = position;
  const uint32_t code = TAVSSFile::read(wanted, data, room, done, zeroCopy, backward);
  const uint64_t asked = std::min(wanted, room);
  const uint64_t due = from < size_ ? std::min(asked, size_ - from) : 0;
  if (backward || (code != TAV_RC_OK && code != TAV_RC_END_OF_STORAGE) || *done >= due)
  {
    return code;
  }
  end_ = std::min(end_, from + *done);
  if (from + *done < needed_)
  {
    isShort_ = true;
    return code;
  }
  std::fill_n(static_cast<uint8_t*>(*data) + *done, due - *done, uint8_t{0});
  *done = due;
  position = from + due;
  needSeek = 1; // the file itself is where its bytes ended
  return due == asked ? TAV_RC_OK : TAV_RC_END_OF_STORAGE;
}

} // namespace tav::inspect
