/// @file form.hpp
/// Recognises how a stream is to be read. Nothing in a stream says so; the ways are tried and compared.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"

namespace tav::inspect
{

/// What is given instead of being recognised.
struct FormChoice
{
  std::optional<bool> swapped{};
  std::optional<bool> root64{};
  std::optional<bool> aligned{};
};

/// Why a file is read as it is.
struct Reason
{
  std::string sentence{};          ///< starts with a lower-case letter, no full stop
  std::optional<uint64_t> other{}; ///< where a stream in another form seems to begin, of which it says
};

struct Recognition
{
  Form form{};
  bool isStream = false;            ///< at least one way finds a node
  bool damagedStart = false;        ///< the first node is not where it should be
  std::vector<Form> alternatives{}; ///< other ways that explain the bytes as well, and differ in what they find
  /// Ways to try where bytes are lost, likelier ones first: all that nothing refutes where the start is damaged, else
  /// the next best one where the best leaves a doubt and it is not far off.
  std::vector<Form> possible{};
  std::vector<Reason> because{}; ///< why
  uint64_t looked = 0;           ///< bytes that the judgement rests on

  bool ambiguous() const { return !alternatives.empty(); }
};

/// Tries all ways that `choice` leaves open on the beginning of the file. Reads a bounded part of it.
TAV_INSPECT_API Recognition recognise(ByteSource& source, const FormChoice& choice = {});

/// The form of a stream that seems to begin at an offset inside of another one, where it is not that one's. Padding
/// cannot be told.
TAV_INSPECT_API std::optional<Form> otherStreamAt(ByteSource& source, const Form& form, uint64_t offset);

/// The same, but its own bytes tell about the padding: for who goes on there. Reads up to 1 MiB of it.
TAV_INSPECT_API std::optional<Form> streamFormAt(ByteSource& source, const Form& form, uint64_t offset);

/// What to say of it.
TAV_INSPECT_API std::string otherStreamText(const Form& form);

/// "little-endian", "big-endian"
TAV_INSPECT_API std::string orderText(const Form& form);

/// One line: "little-endian, 64-bit root header, padded to 8"
TAV_INSPECT_API std::string formText(const Form& form);

} // namespace tav::inspect
