/// @file rewriter.h
/// Copies a stream byte for byte, but for nodes that get another value and for what follows from that.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "inspect/edit/places.h"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

/// A changed node while its pieces come.
struct ChangedNode
{
  EditPlace place{};
  std::string payload{};
  bool extra = false;
  std::optional<Event> padding{};
  std::optional<Event> pair{};
};

class Rewriter
{
public:
  using PayloadOf = std::function<std::string(const EditPlace&)>;

  Rewriter(ByteSource& source, const Form& form, EditPlaces& places, PayloadOf payloadOf, PatchFile& out)
      : source_(source), form_(form), places_(places), payloadOf_(std::move(payloadOf)), out_(out) {}

  /// Throws Error, also when the stream is not what it was when the places were found.
  void run(const std::function<void(uint64_t)>& progress);

private:
  struct Group
  {
    Node node{};
    uint64_t header = 0;  ///< in the new stream
    uint64_t payload = 0; ///< likewise
  };
  void add(const Event& event);
  void copy(uint64_t offset, uint64_t length);
  void beginNode(const Event& event);
  void gather(const Event& event);
  void finishChanged(const Event& end);
  void putPair(const Event& pair, uint64_t size);
  void putEnding(const Event& event);
  void endGroup(const Event& event);
  uint64_t growth(const Group& group, uint64_t offset) const;

  ByteSource& source_;
  Form form_;
  EditPlaces& places_;
  PayloadOf payloadOf_;
  PatchFile& out_;
  uint64_t next_ = 0; ///< the place that comes next
  std::optional<EditPlace> place_{};
  std::optional<ChangedNode> changed_{};
  std::vector<Group> groups_{};
};

} // namespace tav::inspect
