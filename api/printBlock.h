/// Output of a walk on its way to a stream.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string_view>

namespace tav::inside::print
{

inline constexpr int64_t kBlanksPerLevel = 3;

/// Opening and closing of a data element that stands on one line, ready to be copied.
struct ReadyTag
{
  static constexpr size_t kLongestOpening = 96;
  static constexpr size_t kLongestClosing = 64;

  uint32_t key = ~uint32_t{0}; ///< depth and element id
  uint32_t openingLength;
  uint32_t closingLength;
  std::array<char, kLongestOpening> opening; ///< with its indentation
  std::array<char, kLongestClosing> closing;
};

/// The tags that a walk has seen last. Siblings have ids close to each other, so the id's low bits choose the place.
class ReadyTags
{
public:
  /// Null when the tag is too long or too deep to be kept.
  const ReadyTag* find(uint16_t elm, int64_t depth)
  {
    ReadyTag& tag = tags_[elm % tags_.size()];
    return tag.key == keyOf(elm, depth) || make(tag, elm, depth) ? &tag : nullptr;
  }

private:
  /// A depth of 16 bits will do: much less of it makes a tag too long.
  static uint32_t keyOf(uint16_t elm, int64_t depth)
  {
    return static_cast<uint32_t>(std::min<int64_t>(depth, 0xFFFE)) << 16U | elm;
  }

  static bool make(ReadyTag& tag, uint16_t elm, int64_t depth);

  std::array<ReadyTag, 64> tags_;
};

/// Collects pieces and hands them to the stream together. What a stream then refuses is settled as if every piece had
/// gone to it alone: a refused piece does not count, the next is tried, and a node of which no piece is taken ends the
/// output.
class OutputBlock
{
public:
  /// Less than a stream's own buffer usually has: a stream that copies can refuse at the same byte as if it had been
  /// given the pieces.
  static constexpr size_t kSize = 4000;

  /// @param stream      where the pieces go
  /// @param[in,out] total  characters produced; those that are refused are taken off again
  OutputBlock(FILE* stream, uint64_t& total)
      : stream_(stream), total_(total)
  {
  }
  OutputBlock(const OutputBlock&) = delete;
  OutputBlock& operator=(const OutputBlock&) = delete;

  /// The place for a piece of up to `longest` characters, at most kSize.
  char* reserve(size_t longest)
  {
    if (kSize - used_ < longest) [[unlikely]]
    {
      handOver();
    }
    return text_.data() + used_;
  }

  /// Ends the piece that was written to the reserved place; it is not empty.
  void endPiece(size_t length)
  {
    used_ += length;
    ends_[endCount_++] = static_cast<uint16_t>(used_);
    total_ += length;
  }

  /// A ready piece, copied in a fixed size.
  template<size_t size>
  void addReady(const std::array<char, size>& text, size_t length)
  {
    std::memcpy(reserve(size), text.data(), size);
    endPiece(length);
  }

  /// A piece of any length: blanks, then a text without a NUL among them. Returns the characters that count.
  uint64_t add(size_t blanks, std::string_view text)
  {
    const size_t length = blanks + text.size();
    if (length > kSize) [[unlikely]]
    {
      return addLong(blanks, text);
    }
    if (length != 0)
    {
      char* const place = reserve(length);
      std::memset(place, ' ', blanks);
      std::memcpy(place + blanks, text.data(), text.size());
      endPiece(length);
    }
    return length;
  }

  /// Ends a node that has produced something, so far as is known.
  void endNode()
  {
    if (used_ == 0) // it was handed over, or refused, to its last piece
    {
      stopped_ = stopped_ || taken_ == 0;
      taken_ = 0;
      return;
    }
    ends_[endCount_ - 1] |= kNodeEnd;
    nodeStart_ = used_;
  }

  /// Ends a node of three pieces that were written to the reserved place; the second may be empty.
  void endNodeOfThree(size_t first, size_t second, size_t third)
  {
    const size_t start = used_;
    used_ = start + first + second + third;
    total_ += used_ - start;
    nodeStart_ = used_;
    uint16_t* const ends = ends_.data() + endCount_;
    ends[0] = static_cast<uint16_t>(start + first);
    ends[1] = static_cast<uint16_t>(start + first + second);
    ends[2] = static_cast<uint16_t>(used_ | kNodeEnd);
    endCount_ += 3;
  }

  /// Gives the stream all there is.
  void handOver();

  /// Whether nothing of a node was taken, which ends the output: what comes later is dropped.
  [[nodiscard]] bool stopped() const
  {
    return stopped_;
  }

  ReadyTags tags;

private:
  static constexpr uint16_t kNodeEnd = 0x8000; ///< beside the end of a node's last piece

  uint64_t addLong(size_t blanks, std::string_view text);
  uint64_t settle(size_t taken);

  FILE* stream_;
  uint64_t& total_;
  size_t used_ = 0;
  size_t nodeStart_ = 0; ///< where the last node begins
  uint64_t taken_ = 0;   ///< what the stream took of the first node before the block was empty
  bool stopped_ = false;
  std::array<char, kSize> text_;
  size_t endCount_ = 0;
  std::array<uint16_t, kSize + kSize / 2> ends_; ///< where each piece ends; of three together one may be empty
};

} // namespace tav::inside::print
