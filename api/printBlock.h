/// Output of a walk on its way to a stream.
#pragma once

#include <array>
#include <cstdint>
#include <cstdio>
#include <string_view>

namespace tav::inside::print
{

inline constexpr int64_t kBlanksPerLevel = 3;

/// Opening, with its indentation, and closing of a data element that is on one line, ready to be copied.
struct ReadyTag
{
  static constexpr size_t kLongestOpening = 96;
  static constexpr size_t kLongestClosing = 64;

  std::string_view opening() const { return {text.data(), openingLength}; }
  std::string_view closing() const { return {text.data() + openingLength, closingLength}; }

  uint32_t key = ~uint32_t{0}; ///< depth and element id
  uint32_t openingLength;
  uint32_t closingLength;
  std::array<char, kLongestOpening + kLongestClosing> text; ///< both, one behind the other
};

/// The tags that a walk has seen last. Siblings have ids close to each other, so the id's low bits choose the place.
using ReadyTags = std::array<ReadyTag, 64>;

/// Makes a tag ready; false when it is too long or too deep to be kept.
bool makeTag(ReadyTag& tag, uint32_t key, uint16_t elm, int64_t depth);

/// The tag of an element; null when it cannot be kept. A depth of 16 bits will do: much less of it makes a tag too
/// long.
[[gnu::always_inline]] inline const ReadyTag* findTag(ReadyTags& tags, uint16_t elm, int64_t depth)
{
  const uint32_t key = static_cast<uint32_t>(depth < 0xFFFE ? depth : 0xFFFE) << 16U | elm;
  ReadyTag& tag = tags[elm % tags.size()];
  return tag.key == key || makeTag(tag, key, elm, depth) ? &tag : nullptr;
}

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

  /// The place for pieces of up to `longest` characters, at most kSize.
  char* reserve(size_t longest)
  {
    if (kSize - used_ < longest) [[unlikely]]
    {
      handOver();
    }
    return text_.data() + used_;
  }

  /// Ends pieces that were written to the reserved place, one behind the other. At most one of three is empty.
  template<size_t count>
  void endPieces(const size_t (&lengths)[count])
  {
    size_t end = used_;
    for (size_t at = 0; at < count; ++at)
    {
      end += lengths[at];
      ends_[endCount_ + at] = static_cast<uint16_t>(end);
    }
    endCount_ += count;
    total_ += end - used_;
    used_ = end;
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

  /// A piece of any length, without a NUL. Returns the characters that count.
  uint64_t add(size_t blanks, std::string_view text);

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

  uint64_t settle(size_t taken);

  FILE* stream_;
  uint64_t& total_;
  size_t used_ = 0;
  size_t nodeStart_ = 0; ///< where the last node begins
  uint64_t taken_ = 0;   ///< what the stream took of the first node before the block was empty
  bool stopped_ = false;
  std::array<char, kSize> text_;
  size_t endCount_ = 0;
  std::array<uint16_t, kSize + kSize / 2> ends_; ///< where each piece ends
};

} // namespace tav::inside::print
