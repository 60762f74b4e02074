/// What a document and its ranges share.
#pragma once

#include <array>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/document.hpp"

namespace tav::inspect
{

/// How the exact reader is told of a form.
StreamOptions streamOptions(const Form& form, uint64_t ringBytes);

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
  bool isEmptyAt(uint64_t offset) const;

  /// The path of the node at an offset: walks up to it. Empty where no node begins there.
  std::string pathAt(uint64_t offset, PathStyle style) const;

  /// Remembers that a stream of this form begins at an offset.
  void learn(uint64_t offset, const Form& form);

  std::unique_ptr<ByteSource> source{};
  Recognition recognition{};
  DocumentOptions options{};
  std::string path{};               ///< of a file that was opened by it, from its first byte on
  std::vector<Damage> damage{};     ///< by offset, each place once
  std::map<uint64_t, Form> forms{}; ///< where streams begin that are in another form than the one before
  std::array<std::unique_ptr<tav::Reader>, 4> readers{};
  std::function<void(uint64_t)> told{}; ///< is told how far a search is
};

} // namespace tav::inspect
