/// Reads a file while it grows.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "inspect/document/followedFile.h"
#include "tav/inspect/document.hpp"
#include "tav/inspect/follow.hpp"

namespace tav::inspect
{

/// Walks a growing file as far as it is written, and goes on from there when it is asked again. In memory are the
/// groups around the place and what is read at a time. The exact reader's steps lead from node to node.
class Follower
{
public:
  using OnNode = std::function<void(const tav::Node&)>;

  Follower(std::string path, const DocumentOptions& options, const OnNode& onNode, StopToken stop)
      : path_(std::move(path)), options_(options), onNode_(onNode), stop_(std::move(stop)) {}
  /// The same for who wants to know more than the nodes.
  Follower(std::string path, const DocumentOptions& options, const FollowTold& told, StopToken stop)
      : path_(std::move(path)), options_(options), told_(told), stop_(std::move(stop)) {}

  /// Reads all that is there now, also of a file that took the place, but no more than `most` nodes. Returns how many
  /// were new. With `quiet` they are passed over. Throws Error, and what the callback throws.
  uint64_t goOn(bool quiet = false, uint64_t most = ~uint64_t{0});

  static uint64_t behindHeader(const TAVHeader& header);

private:
  static constexpr uint64_t kRingBytes = uint64_t{1} << 20U;

  using Counts = std::map<uint16_t, uint64_t>; ///< of siblings, by their ids

  /// A group around the place.
  struct Level
  {
    TAVHeader group{};
    TAVHeader before{}; ///< the child of the group around that is before this one; header type 0: none
    TAVHeader last{};   ///< the child that was read last; header type 0: none
    Counts counts{};    ///< of its children
  };

  /// A root behind the present one.
  struct FoundRoot
  {
    TAVHeader header{};
    Form form{};
    bool isBehindGap = false;         ///< there is something else before it
    std::vector<PassedOver> passed{}; ///< on the way
  };

  bool goesOn() const { return !stop_.stop_requested() && count_ < most_; }
  bool open();
  void beginAnew();
  void readOn();
  void readToEnd();
  void look();
  void reach(uint64_t end);
  bool isCutOff(const std::system_error& error) const;
  bool findForm();
  bool isSame();
  std::optional<FoundRoot> findRoot();
  std::optional<FoundRoot> searchRoot(const Form& form, const WalkStart& start, bool isBehind);
  void readAgain();
  bool isNew(const TAVHeader& header) const;
  bool nextRoot();
  bool nextChild();
  bool takeChild(const TAVHeader& child);
  bool waits(uint32_t rc, bool isLarge);
  void arrive(const TAVHeader& header, const TAVHeader& before);
  void hand(const std::function<void(const Arrival&)>& to, const Node& node, std::span<const Node> above);
  void handRead(const TAVHeader& node);
  Node nodeOf(const TAVHeader& header) const;
  void tellChange(FileChange change);
  void tellCut(const Level& level, uint64_t end, uint32_t rc);
  void tellBetween(const std::vector<PassedOver>& passed);
  void goOver();
  void endOpenRoot();
  bool goBack();
  bool refresh();
  FormChoice choiceNow();
  bool readHeader(const TAVHeader& like, bool swapped, TAVHeader& header);
  void leave();
  tav::Reader& reader();

  std::string path_;
  DocumentOptions options_;
  OnNode onNode_{};
  FollowTold told_{};
  StopToken stop_;
  bool quiet_ = false;
  bool isMissing_ = false;                ///< and that was told
  std::unique_ptr<ByteSource> file_{};    ///< whose storage sees the file as it is at any time
  FollowedFile* followed_ = nullptr;      ///< that storage
  std::unique_ptr<ByteSource> now_{};     ///< the file as it was when reading began this time
  std::unique_ptr<tav::Reader> reader_{}; ///< of this time, too: what it has cached may change
  std::optional<Form> former_{};          ///< the last form that was read
  std::optional<Form> form_{};            ///< of the present stream; nothing before one is recognised
  TAVHeader root_{};                      ///< the present root, or the last one; header type 0: none yet
  TAVHeader rootBefore_{};                ///< the one before it
  std::optional<Form> formBefore_{};      ///< of that one
  Counts roots_{};                        ///< how many there were
  std::vector<Level> levels_{};           ///< from the present root on; empty between roots
  std::vector<Node> above_{};             ///< the groups of the levels
  uint64_t reached_ = 0;                  ///< behind what was told of the last node: its header, or its payload
  bool isReadAgain_ = false;              ///< the place, since nothing was there at first
  uint64_t count_ = 0;
  uint64_t most_ = 0; ///< of them at this look
};

} // namespace tav::inspect
