/// @file recover.hpp
/// A sound stream of what is whole in a damaged one.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/scratch.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// Bytes of the file that did not come back.
struct Loss
{
  uint64_t offset = 0;
  uint64_t length = 0;
  std::string reason{};
};

/// A node that came back from beside lost bytes, of which something says that it may be none.
struct Doubt
{
  uint64_t offset = 0;
  uint64_t length = 0; ///< of its header and its payload; of a group: its header
  std::string reason{};
};

/// Where every byte of the file went, and what was done.
struct RecoveryTotals
{
  uint64_t kept = 0; ///< of nodes that came back, their paddings, pairs and end elements, and zeros behind the stream
  uint64_t lost = 0;
  uint64_t unread = 0; ///< behind the place where searching was given up
  uint64_t zeros = 0;  ///< of the kept: behind the stream, and between streams
  uint64_t nodes = 0;  ///< that came back, end elements not counted
  uint64_t ends = 0;   ///< end elements that were written
  uint64_t losses = 0; ///< runs of lost bytes
  uint64_t doubts = 0; ///< nodes that may be none
  uint64_t closed = 0; ///< groups that were open or whose size was wrong
  uint64_t made = 0;   ///< groups made for what has lost its own
  uint64_t pairs = 0;  ///< pairs and end elements that were missing or damaged
};

struct RecoverOptions
{
  uint64_t search = kNoOffset;                 ///< bytes that may be searched for nodes; the rest is unread
  std::function<void(const Loss&)> lost{};     ///< is told of each run of lost bytes, in their order
  std::function<void(const Doubt&)> doubted{}; ///< is told of each node that may be none
  std::function<void(uint64_t)> progress{};    ///< is told by offset how far the work is
  unsigned threads = 1;                        ///< that search a damaged file for eye catchers
};

/// Appends a sound stream of all nodes that are whole: groups are closed, sizes, paddings and pairs made anew. A group
/// whose header is lost comes back by its end element, as `docRoot`; so do nodes that have lost all groups around them.
/// Memory grows with the depth, and with the groups whose headers are lost. Throws Error.
TAV_INSPECT_API RecoveryTotals recover(ByteSource& source, const Form& form, PatchFile& out,
                                       const RecoverOptions& options = {});

/// What came of one way of reading.
struct Account
{
  Form form{};
  RecoveryTotals totals{};
  std::deque<Loss> losses{};  ///< the first of them; the totals count all
  std::deque<Doubt> doubts{}; ///< likewise
  uint64_t bytes = 0;
  uint64_t written = 0;

  bool lostNothing() const { return totals.lost + totals.unread == 0; }
  /// Of ways that differ in the padding alone, the one with more nodes and fewer gaps: with padding, damaged bytes are
  /// taken for some. Of others the one with more nodes and more bytes: the wrong width finds many headers without
  /// payloads, a wrong size many bytes in a few nodes; of equals the one with fewer made groups.
  bool keepsMoreThan(const Account& other) const;
  /// Whether another way found the same.
  bool isLike(const Account& other) const;
};

/// The way that was taken, and the best of the others that were tried where it was in doubt.
struct Outcome
{
  Account taken{};
  std::optional<Account> other{};
  std::vector<Form> alternatives{}; ///< that were about as likely at the first look
};

struct RecoverBestOptions
{
  uint64_t search = kNoOffset;              ///< bytes that may be searched for nodes in each form
  size_t listed = 1000;                     ///< losses that an account keeps, and doubts
  ScratchMaker makeFile = makeScratch;      ///< for what each form that is tried has saved
  std::function<void(uint64_t)> progress{}; ///< is told by offset how far the work is
  unsigned threads = 1;                     ///< that search a damaged file for eye catchers
};

/// As `recover`, in the form that keeps most. Where the start is damaged, nothing but the outcome shows the form: all
/// that are not refuted are tried, and the one that keeps most is taken; of equals the likelier one. Behind a sound
/// start the next likely one is tried where it is not far off. Throws Error.
TAV_INSPECT_API Outcome recoverBest(ByteSource& source, const Recognition& found, PatchFile& out,
                                    const RecoverBestOptions& options = {});

} // namespace tav::inspect
