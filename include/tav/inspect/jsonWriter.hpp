/// @file jsonWriter.hpp
/// Writes a walk as JSON from which the bytes can be made again. Nothing is kept but the groups around the place.
#pragma once

#include <optional>
#include <string>
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

/// A data element with its pieces, which come one by one.
struct DataPieces
{
  Node node{};
  std::string path{}; ///< only in lines
  std::optional<Event> extra{};
  std::optional<Event> padding{};
  std::optional<Event> pair{};
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

  std::string pathOf(const Walker& walker, const Event& event) const;
  void addDamage(const Walker& walker, const Event& event);
  void beginGroup(const std::string& path, const Node& node);
  void endGroup(uint64_t end);
  void finishData();
  void putData(const DataPieces& data);
  bool isUsualEnd(const DataPieces& data);

  void startItem();
  void put(std::string_view text) { out_.write(text); }
  void key(std::string_view name);
  void putNumber(std::string_view name, uint64_t value);
  void putString(std::string_view name, std::string_view value);
  void putHex(std::string_view name, std::string_view bytes);
  void putPlace(const std::string& path, uint64_t offset, uint64_t depth);
  void putHead(const std::string& path, const Node& node);
  void putSize(uint64_t size, bool unknown);
  void putValue(const Node& node);
  void putInteger(const Node& node, std::string_view text);
  void putDate(const TAVTimeStamp& stamp);
  void putArray(const Node& node);
  bool isText(uint64_t from, uint64_t end);
  void putText(uint64_t from, uint64_t end);
  void putBytes(std::string_view name, uint64_t from, uint64_t length);
  void putRemarks(const DataPieces& data);
  std::string bytesAt(uint64_t offset, uint64_t length);

  ByteSource& source_;
  Form form_;
  Sink& out_;
  JsonStyle style_;
  bool safe_;
  bool firstKey_ = true;
  bool firstRoot_ = true;
  std::optional<DataPieces> data_{}; ///< written when something else begins
  std::vector<Group> groups_{};
  std::vector<uint8_t> piece_{};
};

} // namespace tav::inspect
