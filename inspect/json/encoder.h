/// @file build_encoder.h
/// Makes a stream of what a JSON document describes, node by node; sizes are set right when a group ends.
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "tav/inspect/json.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/patchFile.hpp"

namespace tav::inspect
{

/// Something that no stream can be made of; the place in the document is added by its reader.
struct BuildError : std::runtime_error
{
  using std::runtime_error::runtime_error;
};

/// What is given of a node's header. What is not given is as a writer makes it.
struct Properties
{
  std::optional<uint16_t> elm{};
  std::string unknown{}; ///< what to say of its name, when no element has that and no id is given
  std::optional<uint16_t> type{};
  std::optional<bool> wide{};
  std::optional<uint32_t> info{};
  std::optional<uint64_t> size{}; ///< all ones: unknown
  bool eyeSize = false;
  bool endElement = true; ///< of a group with eyeSize
};

/// What a value is made of.
enum class Given : uint8_t
{
  nothing,
  text,
  integer, ///< in decimal
  array,   ///< of 64-bit numbers, in host order
  date,    ///< a TAVTimeStamp, in host order
  bytes,   ///< as they stand in the stream
  damaged, ///< bytes that are no node
  unread,
  zeros ///< behind the stream; `count` of them
};

/// One item of a document while it is read.
struct Draft
{
  Properties properties{};
  Given given = Given::nothing;
  std::string value{};
  uint64_t count = 0;
  bool isTruth = false; ///< an integer that was true or false
  std::optional<uint16_t> codePage{};
  std::optional<std::string> extra{};
  std::optional<std::string> padding{};
  std::optional<std::string> pair{};
  std::optional<uint64_t> depth{};
  bool begun = false; ///< the header is written, and the value as far as it was read

  bool isRaw() const { return given == Given::damaged || given == Given::unread || given == Given::zeros; }
};

class StreamEncoder
{
public:
  StreamEncoder(PatchFile& file, const Conversion& conversion)
      : file_(file), conversion_(conversion), remake_(conversion.isAsked())
  {
  }

  /// How the document says that it is to be read; before the first node.
  void setForm(const Form& form);

  void beginGroup(const Properties& properties);
  /// Of the innermost group; what is changed here counts when the group ends.
  Properties& group() { return groups_.back().properties; }
  void endGroup();
  size_t depth() const { return groups_.size(); }

  /// Writes what the draft has of its value so far, and takes it out of the draft; for values that are long.
  void addValue(Draft& draft);
  /// Writes the rest of a data element or of a damaged part.
  void finish(Draft& draft);

  uint64_t leftOut() const { return leftOut_; }
  uint64_t leftOutBytes() const { return leftOutBytes_; }

private:
  struct Group
  {
    Properties properties{};
    TAVHeader header{};
    uint64_t payload = 0;
  };

  bool isWide(const Properties& properties) const;
  uint16_t groupType(const Properties& properties, bool wide) const;
  TAVHeader header(const Properties& properties, bool wide, uint16_t type, uint64_t size) const;
  void putHeader(const TAVHeader& header);
  void putEndElement(const Group& group);
  void addRaw(Draft& draft);
  void begin(Draft& draft);
  void putBehind(Draft& draft, uint64_t size);
  bool isLeftOut(const Draft& draft);

  PatchFile& file_;
  Conversion conversion_;
  bool remake_;
  Form form_{};          ///< of the stream that is made
  bool reorder_ = false; ///< the document's bytes are in the other order
  std::vector<Group> groups_{};
  TAVHeader header_{}; ///< of the data element that is being written
  uint64_t headerAt_ = 0;
  uint64_t leftOut_ = 0;
  uint64_t leftOutBytes_ = 0;
};

/// The type that a value has when none is given.
uint16_t typeFor(const Draft& draft);

/// The payload, in stream order, of a value that is complete. Throws BuildError when it is none of the type.
std::string payloadFor(const Draft& draft, uint16_t type, bool swapped, bool reorder);

} // namespace tav::inspect
