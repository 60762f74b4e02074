/// What a document and its ranges share.
#pragma once

#include <array>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/document.hpp"
#include "tav/inspect/streamWalk.hpp"

namespace tav::inspect
{

/// How the exact reader is told of a form.
StreamOptions streamOptions(const Form& form, uint64_t ringBytes);

/// A walk that has come to a place.
struct PlaceWalk
{
  PlaceWalk(ByteSource& source, const Form& form);

  /// Goes on to the node at an offset, past the groups that end before it; false where no node begins there, or before
  /// the place that it has come to.
  bool goTo(uint64_t offset);

  StreamWalk walk;
  Event event{};
  bool hasEvent = false;
};

struct DocumentState
{
  static constexpr size_t kMostDamages = size_t{1} << 20U;

  /// The state inside a document, for those who stand on one.
  static DocumentState& of(const Document& document) { return *document.state_; }

  /// The reader for streams of a form. Which header the first node has is told with each node.
  tav::Reader& readerOf(const Form& form);

  /// Enters what was passed over into the account.
  void add(const PassedOver& passed);

  /// The form of the stream that a node is in which a walk has handed out.
  Form formAt(uint64_t offset) const;

  /// Whether the group at an offset, which says that it is empty, is a closed one: what is behind it is not in it then.
  /// Who asks of one group after another in their order goes through the file once.
  bool isEmptyAt(uint64_t offset);

  /// Remembers where a group ends that ends past the one around it or was never closed, which it does not tell itself.
  void learnEnd(const Node& group);

  /// Where such a group ends; kNoOffset for any other.
  uint64_t endAt(uint64_t offset) const;

  /// The path of the node at an offset: walks up to it. Empty where no node begins there.
  std::string pathAt(uint64_t offset, PathStyle style) const;

  /// Remembers that a stream of this form begins at an offset.
  void learn(uint64_t offset, const Form& form);

  std::unique_ptr<ByteSource> source{};
  Recognition recognition{};
  DocumentOptions options{};
  std::string path{};                  ///< of a file that was opened by it, from its first byte on
  std::vector<Damage> damage{};        ///< by offset, each place once
  std::map<uint64_t, Form> forms{};    ///< where streams begin that are in another form than the one before
  std::map<uint64_t, uint64_t> ends{}; ///< of groups that end where the one around them does, by their offsets
  std::array<std::unique_ptr<tav::Reader>, 4> readers{};
  std::optional<PlaceWalk> places{};    ///< where isEmptyAt looked last
  std::function<void(uint64_t)> told{}; ///< is told how far a search is
};

} // namespace tav::inspect
