/// @file prober.h
/// Whether bytes look like a node: the judgement by which the walker decides where the format leaves a choice, and
/// by which it finds its way again behind damaged bytes.
#pragma once

#include <cstdint>
#include <optional>

#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// How much speaks for a node at an offset, in rising order.
enum class Belief : uint8_t
{
  none,    ///< cannot be a node there
  fits,    ///< the size lies within the bounds
  typed,   ///< a known type with a size that suits it
  named,   ///< and an element of the dictionary
  followed ///< and what comes behind it is a node, too, or the bounds end there
};

/// Where a node can start again behind damaged bytes.
struct Restart
{
  uint64_t offset = 0; ///< the limit when there is no node any more
  bool byPair = false; ///< an eye/size pair leads back to it
  bool gaveUp = false; ///< the budget for looking was used up
};

class Prober
{
public:
  /// `budget`: bytes that may be looked through in search of nodes and of zeros.
  Prober(ByteSource& source, const Form& form, uint64_t budget);

  /// Reads a header; false when it does not lie before `limit`.
  bool header(uint64_t offset, bool wide, uint64_t limit, TAVHeader& out) const;

  /// What speaks for a node at `offset` that ends at `limit` at the latest.
  Belief judge(uint64_t offset, bool wide, uint64_t limit) const;

  /// Whether a header is as a writer makes it: a known type, a size that suits it and lies before `limit`.
  Belief judgeHeader(const TAVHeader& header, uint64_t limit) const;

  /// Whether the bytes of a header have a known type and an element of the dictionary.
  bool isNamedHeader(const uint8_t* bytes, bool wide) const;

  /// The distance of the eye/size pair at `offset`, in the byte order of its eye catcher; nothing when there is none.
  std::optional<uint64_t> pairAt(uint64_t offset, uint64_t limit) const;

  /// Whether the eye/size pair at `offset` ends the group at `group`.
  bool pairEnds(uint64_t offset, uint64_t limit, const TAVHeader& group) const;

  /// Bytes from the end of a data element's header to the place behind its payload and padding.
  uint64_t paddedSize(const TAVHeader& data) const;

  /// The first place behind `from` where a node can start, before `limit`.
  Restart findRestart(uint64_t from, bool wide, bool eitherWidth, uint64_t limit);

  /// Whether all bytes from `offset` to the end of the file are zero. `gaveUp` is set when the budget did not
  /// suffice to tell.
  bool zerosToEnd(uint64_t offset, bool& gaveUp);

  /// Where zeros end that begin behind a root, in the header of another root perhaps, which can begin with zeros
  /// itself. The offset itself where there are fewer than a header has: they can be a part of a damaged one.
  uint64_t behindZeros(uint64_t offset) const;

  /// Whether a root begins at an offset: a group of the dictionary with a header of either width, or a stream of
  /// another form.
  bool rootBegins(uint64_t offset) const;

  /// Where the zeros begin that the file ends in, `from` at the earliest; the file's end when there are fewer than 8.
  uint64_t zerosStart(uint64_t from);

  /// Whether what is behind a node is another node, or the bounds end there.
  bool isFollowed(const TAVHeader& node, uint64_t limit) const;

  /// Whether nodes of any kind follow one another from `offset` on, by their sizes alone, up to the limit, to an open
  /// group that a node follows, or many of them. Says something of nodes with types and elements that nobody knows.
  /// With `toTheEnd`, only up to the limit will do.
  bool isChain(uint64_t offset, bool wide, uint64_t limit, bool toTheEnd = false) const;

  /// Whether any number of nodes of known types follow one another from `offset` exactly up to the limit.
  bool isWholeChain(uint64_t offset, bool wide, uint64_t limit) const;

  /// Whether the dictionary has an element.
  static bool isNamed(uint16_t elm);

  /// Bytes that may be looked through.
  uint64_t budget() const { return budget_; }

  /// Bytes looked through so far.
  uint64_t spent() const { return spent_; }

private:
  /// How far a chain of so many nodes at the most leads, each worth at least so much: to the limit, to an open group or
  /// to where none is.
  struct Chain
  {
    uint64_t end = 0;
    uint64_t nodes = 0;
    bool isBroken = false;
    bool isOpen = false;
  };
  Chain chain(uint64_t offset, bool wide, uint64_t limit, uint64_t most, Belief least) const;
  uint64_t behindLink(const TAVHeader& node, uint64_t limit) const;
  static bool suits(const TAVHeader& header);
  bool isFollowedAt(uint64_t offset, bool wide, uint64_t limit) const;
  bool restartAt(const uint8_t* bytes, uint64_t offset, bool wide, uint64_t limit);
  bool restartByPair(const uint8_t* bytes, uint64_t offset, uint64_t from, uint64_t limit, Restart& restart);
  std::optional<uint64_t> nodeOfPair(uint64_t eye, uint64_t distance, uint64_t from, uint64_t limit) const;

  ByteSource& source_;
  Form form_;
  uint64_t budget_;
  uint64_t spent_ = 0;
  uint64_t nonZeroAt_ = 0; ///< a byte that is not zero is known to be at this offset - 1 or behind it
};

} // namespace tav::inspect
