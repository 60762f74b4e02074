#include "inspect/document/followedFile.h"

#include <algorithm>
#include <cstddef>

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

/// Reads a place again when the write that was under way there has ended.
uint32_t FollowedFile::readAgain(uint64_t from, uint64_t length, uint64_t& done)
{
  uint64_t unused = 0;
  static_cast<void>(pFile->findData(from, &unused)); // Linux has it wait for whoever writes to the file
  again_.resize(static_cast<size_t>(length));
  KORFileSeekParam place;
  place.offset = from;
  KORFileReadParam param;
  param.length = length;
  const uint32_t code = pFile->seek(&place, nullptr);
  return code == TAV_RC_OK ? pFile->read(&param, again_.data(), &done) : code;
}

/// What was read before and after the end of a write is no part of one. A writer that does not let go of a place is
/// given a few chances: what it changes there counts as not written yet, unless it has to be there.
uint32_t FollowedFile::readSettled(uint64_t wanted, void** data, uint64_t room, uint64_t* done)
{
  constexpr int chances = 8;
  constexpr int chancesOfNeeded = 1000;
  const uint64_t from = position;
  auto* const bytes = static_cast<uint8_t*>(*data);
  uint32_t code = TAVSSFile::read(wanted, data, room, done, false, false);
  for (int i = 0; i < chancesOfNeeded && (code == TAV_RC_OK || code == TAV_RC_END_OF_STORAGE) && *done != 0; ++i)
  {
    uint64_t got = 0;
    const uint32_t again = readAgain(from, *done, got);
    if (again != TAV_RC_OK && again != TAV_RC_END_OF_STORAGE)
    {
      *done = 0;
      return again;
    }
    const auto end = again_.begin() + static_cast<ptrdiff_t>(got);
    const auto same = static_cast<uint64_t>(std::mismatch(again_.begin(), end, bytes).first - again_.begin());
    if (same == *done)
    {
      break;
    }
    const bool isLet = i >= chances && from + same >= needed_;
    const uint64_t left = isLet ? same : got;
    std::copy(again_.begin(), end, bytes);
    code = left < *done ? TAV_RC_END_OF_STORAGE : code;
    *done = left;
    position = from + left;
    needSeek = 1;
    if (isLet)
    {
      break;
    }
  }
  return code;
}

uint32_t FollowedFile::read(uint64_t wanted, void** data, uint64_t room, uint64_t* done, bool zeroCopy, bool backward)
{
  const uint64_t from = position;
  const uint32_t code = backward || zeroCopy ? TAVSSFile::read(wanted, data, room, done, zeroCopy, backward)
                                             : readSettled(wanted, data, room, done);
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
