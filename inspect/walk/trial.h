/// @file trial.h
/// What one way of reading finds in the first bytes of a file, and what speaks against it.
#pragma once

#include <cstdint>
#include <optional>

#include "inspect/walk/prober.h"
#include "tav/inspect/form.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// What speaks against a way of reading is counted in about the bits that chance needs to make it: for a place that is
/// no node, or a header that no writer makes, that is this.
inline constexpr uint64_t kDamage = 50;

enum class RootBelief : uint8_t
{
  none,
  fits,  ///< the file's first bytes can be a root's header
  usual, ///< and are as writers make it
  exact  ///< and say about how long the file is, which chance hardly does
};

/// What the root alone says of a way.
constexpr RootBelief surenessOf(RootBelief root)
{
  return root >= RootBelief::usual ? root : RootBelief::none;
}

/// What one way of reading the bytes finds in them.
struct Trial
{
  Form form{};
  RootBelief root = RootBelief::none;
  uint64_t nodes = 0;
  uint64_t named = 0; ///< nodes whose element is in the dictionary and whose size suits the type
  uint64_t groups = 0;
  uint64_t wide = 0;      ///< nodes with 64-bit headers
  uint64_t alignBits = 0; ///< of them, those that announce padding
  uint64_t paddings = 0;
  uint64_t eyes = 0;      ///< eye catchers in this byte order
  uint64_t otherEyes = 0; ///< and in the other one
  uint64_t extras = 0;
  uint64_t plainStrings = 0;
  uint64_t damages = 0;
  uint64_t extent = 1; ///< where the trial stopped
  uint64_t cost = 0;   ///< how much speaks against it
  uint64_t signature = 14695981039346656037u;
  uint64_t dataRoots = 0;    ///< nodes outside of all groups that were counted: data,
  uint64_t otherRoots = 0;   ///< and such with other headers than a root should have
  uint64_t overrunEnd = 0;   ///< where the last group that claimed too much said that it ends
  uint64_t overrunLimit = 0; ///< and where it had to end
  uint64_t otherAt = 0;      ///< where a stream in another form seems to begin; 0: nowhere
  Form otherForm{};
  Node first{};
  std::optional<Form> givenUpFor{}; ///< the way that is better by far, for which this one was not tried to its end

  double rate() const { return static_cast<double>(cost) / static_cast<double>(extent); }
  bool isExact() const { return root == RootBelief::exact; }
  /// What the root alone says of the way: a header is hardly usual by chance, and damage far behind says nothing of it.
  RootBelief sureness() const { return surenessOf(root); }
};

/// How far a way is tried.
struct TrialLimits
{
  uint64_t search = 0;           ///< bytes that may be looked through for nodes
  const Trial* better = nullptr; ///< a way without damage for which this one is given up, as soon as it is certain
  double far = 0;                ///< that it is worse by more than this, over the bytes that both have looked at
};

/// Reads the beginning in a form.
Trial tryForm(ByteSource& source, const Form& form, const TrialLimits& limits);

/// As recognise(), with all ways tried to their ends, which it leaves out where that changes nothing.
Recognition recogniseByAll(ByteSource& source, const FormChoice& choice);

/// What the first bytes say of a form.
RootBelief judgeRoot(ByteSource& source, const Form& form);

/// Whether a root's header is as writers make it.
bool isUsualRoot(const TAVHeader& root);

/// Reads the header of a root; false when what is there can be none.
bool readRoot(const Prober& prober, uint64_t offset, bool wide, uint64_t limit, TAVHeader& root);

} // namespace tav::inspect
