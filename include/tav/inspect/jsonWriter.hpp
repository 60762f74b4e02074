/// @file jsonWriter.hpp
/// Writes a walk as JSON from which the bytes can be made again. Nothing is kept but the groups around the place.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/sink.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

enum class JsonStyle : uint8_t
{
  readable, ///< one node a line, indented
  compact,  ///< no blanks and line breaks
  lines     ///< one object a node, each on its own line, with path, offset and depth
};

class JsonWriter
{
public:
  /// `safe`: whole numbers that a double cannot hold are written as texts.
  TAV_INSPECT_API JsonWriter(ByteSource& source, const Form& form, Sink& out, JsonStyle style, bool safe);

  /// What is before the first node and behind the last one.
  TAV_INSPECT_API void begin();
  TAV_INSPECT_API void end();

  /// The events of a walk, one after the other, from its beginning to its end.
  TAV_INSPECT_API void add(const Walker& walker, const Event& event);

private:
  struct Group
  {
    uint64_t payload;
    uint64_t size;
    bool sizeUnknown;
    bool eyeSize;
    bool wideChildren;
    bool empty; ///< nothing was written into it so far
  };

  struct Bytes
  {
    uint64_t offset = 0;
    uint64_t length = 0;
  };
  /// A data element with its pieces, which come one by one.
  struct DataPieces
  {
    Node node{};
    Bytes extra{};
    Bytes padding{};
    Bytes pair{};
  };

  void take(const Walker& walker, const Event& event);
  void setPath(const Walker& walker, const Event& event);
  void addDamage(const Walker& walker, const Event& event);
  void beginGroup(const Node& node);
  void endGroup(uint64_t end);
  void finishData();
  void putData(const DataPieces& data);
  bool isUsualEnd(const DataPieces& data);

  void startItem();
  void put(std::string_view text);
  void flush();
  void key(std::string_view name);
  void putNumber(std::string_view name, uint64_t value);
  void putString(std::string_view name, std::string_view value);
  void putHex(std::string_view name, std::string_view bytes);
  void putPlace(uint64_t offset, uint64_t depth);
  void putHead(const Node& node);
  void putSize(uint64_t size, bool unknown);
  void putValue(const Node& node);
  void putInteger(const Node& node);
  void putDate(const TAVTimeStamp& stamp);
  void putArray(const Node& node);
  std::string_view textAt(uint64_t from, uint64_t end);
  bool isText(uint64_t from, uint64_t end);
  void putText(uint64_t from, uint64_t end);
  void putBytes(std::string_view name, uint64_t from, uint64_t length);
  void putRemarks(const DataPieces& data);
  std::string bytesAt(uint64_t offset, uint64_t length);
  std::string bytesOf(const Bytes& piece) { return bytesAt(piece.offset, piece.length); }

  ByteSource& source_;
  Form form_;
  Sink& out_;
  JsonStyle style_;
  bool safe_;
  bool firstKey_ = true;
  bool firstRoot_ = true;
  bool hasData_ = false;
  DataPieces data_{};  ///< written when something else begins
  std::string path_{}; ///< in lines: of the node that is written next
  std::string text_{}; ///< what is not handed over yet
  std::vector<Group> groups_{};
  std::vector<uint8_t> piece_{};
};

} // namespace tav::inspect
