/// @file places.h
/// The nodes that are to be changed, in stream order, in a file of their own.
#pragma once

#include <array>
#include <cstdint>
#include <optional>

#include "tav/inspect/node.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/scratch.hpp"

namespace tav::inspect
{

/// One node and what becomes of it.
struct EditPlace
{
  uint64_t offset = 0;
  std::array<uint8_t, layout::kHeaderSize64> header{}; ///< as stored in the stream
  uint32_t headerLength = 0;
  uint32_t assignment = 0;
  uint16_t type = 0;     ///< that it gets
  uint16_t codePage = 0; ///< of a UTF-8 string
  uint32_t padding = 0;  ///< so that no byte of a place is left to chance

  uint64_t payload() const { return offset + headerLength; }
};

class EditPlaces
{
public:
  explicit EditPlaces(const ScratchMaker& makeFile)
      : scratch_(makeFile()), file_(scratch_->file()) {}

  void add(const EditPlace& place)
  {
    file_.append(std::span(reinterpret_cast<const uint8_t*>(&place), sizeof place));
    ++count_;
  }

  uint64_t count() const { return count_; }

  EditPlace at(uint64_t number)
  {
    EditPlace place;
    file_.read(number * sizeof place, std::span(reinterpret_cast<uint8_t*>(&place), sizeof place));
    return place;
  }

private:
  std::unique_ptr<Scratch> scratch_;
  PatchFile file_;
  uint64_t count_ = 0;
};

} // namespace tav::inspect
