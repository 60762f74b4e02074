/// @file followedFile.h
/// A file while it is followed.
#pragma once

#include <cstdint>
#include <vector>

#include "tav/tav.h"

namespace tav::inspect
{

/// A file as it was at the last look, though its writer goes on: as long as it was then. Bytes that were cut off since
/// read as zeros, which is what a writer that appends cuts off; those that have to be there come short. So a look does
/// not depend on when the file is cut while it lasts.
///
/// Nor does it on a write that is under way: many systems let a reader see a part of one, with zeros for the rest, and
/// a ring writes into pages that are there. What is read is therefore read again behind the end of the write, and
/// counts as far as both agree.
class FollowedFile final : public TAVSSFile
{
public:
  using TAVSSFile::TAVSSFile;

  /// Takes the size that the file has now. Nothing has to be there until `need` says so.
  uint32_t look();

  /// Bytes before `end` have to be there.
  void need(uint64_t end) { needed_ = end; }
  uint64_t needed() const { return needed_; }

  /// Up to where the file was there at this look, as far as was seen.
  uint64_t end() const { return end_; }
  /// Whether bytes were asked for at this look that had to be there and were not.
  bool isShort() const { return isShort_; }

  uint32_t getTotalSize(uint64_t* size) override;
  uint32_t read(uint64_t wanted, void** data, uint64_t room, uint64_t* done, bool zeroCopy, bool backward) override;

private:
  uint32_t readSettled(uint64_t wanted, void** data, uint64_t room, uint64_t* done);
  uint32_t readAgain(uint64_t from, uint64_t length, uint64_t& done);

  std::vector<uint8_t> again_; ///< what a place holds a moment later
  uint64_t size_ = 0;          ///< at the last look
  uint64_t end_ = 0;
  uint64_t needed_ = 0;
  bool isShort_ = false;
};

} // namespace tav::inspect
