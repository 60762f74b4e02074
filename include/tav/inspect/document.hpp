/// @file document.hpp
/// Documents: reading files that come from somewhere.
#pragma once

#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <functional>
#include <memory>
#include <ranges>
#include <span>
#include <string>
#include <string_view>
#include <utility>

#include "tav/inspect/api.hpp"
#include "tav/inspect/documentOptions.hpp"
#include "tav/inspect/follow.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/rules.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"
#include "tav/tav.hpp"

namespace tav::inspect
{

/// What a walk does at damage.
enum class OnDamage : uint8_t
{
  stop, ///< throws Error
  skip  ///< goes on behind it; Document::damage() says what was passed over
};

/// Bytes that were passed over.
struct Damage
{
  uint64_t offset = 0;
  uint64_t size = 0; ///< of the bytes that are there; 0: a group begins at `offset` that announces more than there is
  RuleId rule = RuleId::damaged;
};

struct DocumentState;
class Search;

/// Nodes of a document in stream order, as an input range. A single pass; the range holds the place of the walk, so an
/// iterator must not outlive it, and none of them the document.
class NodeRange : public std::ranges::view_base
{
public:
  TAV_INSPECT_API NodeRange(NodeRange&&) noexcept;
  TAV_INSPECT_API NodeRange& operator=(NodeRange&&) noexcept;
  TAV_INSPECT_API ~NodeRange();

  detail::WalkIterator<NodeRange> begin() &
  {
    const bool isThere = std::exchange(begun_, true) ? !done_ : advance();
    return detail::WalkIterator<NodeRange>(isThere ? this : nullptr);
  }
  static std::default_sentinel_t end() noexcept { return std::default_sentinel; }

private:
  friend class Document;
  friend class detail::WalkIterator<NodeRange>;

  explicit NodeRange(std::unique_ptr<Search> search);

  const tav::Node& current() const noexcept { return current_; }
  TAV_INSPECT_API bool advance();

  std::unique_ptr<Search> search_;
  tav::Node current_{};
  bool begun_ = false;
  bool done_ = false;
};

/// A file, or bytes in memory, with one stream or several in it, whose form nobody told and which may be damaged.
/// Move-only; used by one thread at a time.
///
/// Its nodes are those of tav::Reader: what is read by them is read by its exact rules. As with Reader::at, the group
/// around a node that a range hands out is not known to it: siblings() and next() are TAV_RC_NOT_SUPPORTED there,
/// children() and descendants() are not. Nodes must not outlive the document.
class Document
{
public:
  /// Opens a regular file and finds out its form. Throws Error: the system's code where the file cannot be read,
  /// TAV_RC_NOT_FOUND for a file that is no stream, TAV_RC_BAD_PARAM where several forms explain the bytes equally well
  /// and find other nodes; the message names the forms, and an option decides.
  TAV_INSPECT_API explicit Document(const std::filesystem::path& path, const DocumentOptions& options = {});
  /// The same over bytes in memory, which outlive the document.
  TAV_INSPECT_API explicit Document(std::span<const std::byte> bytes, const DocumentOptions& options = {});
  /// The same over any source. `from` is the source's own.
  TAV_INSPECT_API explicit Document(std::unique_ptr<ByteSource> source, const DocumentOptions& options = {});

  TAV_INSPECT_API Document(Document&&) noexcept;
  TAV_INSPECT_API Document& operator=(Document&&) noexcept;
  TAV_INSPECT_API ~Document();

  /// Every stream's root, one after another, each read in its own form. Zeros between streams are passed over.
  /// @throws Error at damage between the streams, or where a root's end is not sure at damage in it, unless skipped
  TAV_INSPECT_API NodeRange roots(OnDamage onDamage = OnDamage::stop) const&;
  NodeRange roots(OnDamage onDamage = OnDamage::stop) const&& = delete;

  /// The nodes that a path from the roots leads to. Groups that the path does not lead into are stepped over.
  /// @throws Error TAV_RC_BAD_PARAM for a text that is no path or has a name that no element has; at damage on the way
  ///         unless it is skipped; TAV_RC_DATA_TOO_LARGE for a data element that is larger than the ring
  TAV_INSPECT_API NodeRange find(std::string_view path, OnDamage onDamage = OnDamage::stop) const&;
  NodeRange find(std::string_view path, OnDamage onDamage = OnDamage::stop) const&& = delete;

  /// The same for a path from a node of this document; one that begins with a slash begins at the roots.
  TAV_INSPECT_API NodeRange find(const tav::Node& from, std::string_view path,
                                 OnDamage onDamage = OnDamage::stop) const&;
  NodeRange find(const tav::Node& from, std::string_view path, OnDamage onDamage = OnDamage::stop) const&& = delete;

  /// Calls `onNode` with each node of the file, and then with each that is written, in stream order: a group when it
  /// was opened, a data element when it is whole. A node is valid during the call. Elements that only end a group are
  /// left out, and damaged places are passed over.
  ///
  /// The path is followed, not the file: when another file takes its place, the rest of the old one comes first, then
  /// all of the new one; a file that is missing is waited for; one that was made shorter than what was told of it, or
  /// emptied and begun with another root, is read from its start again. The file may be cut behind what was told at any
  /// time, also while it is read. What a writer took back may have been told. Looks when the system
  /// says of a change, and ten times a second.
  /// @throws Error TAV_RC_NOT_SUPPORTED for a document that was not opened by a path, or not from its first byte on;
  ///         TAV_RC_DATA_TOO_LARGE for a data element that is larger than the ring; and what `onNode` throws
  TAV_INSPECT_API FollowEnd follow(const std::function<void(const tav::Node&)>& onNode,
                                   const FollowOptions& options = {}) const;

  /// What walks have passed over so far, by offset, each place once: the first 1,048,576 of them. Valid until a range
  /// of the document moves on.
  TAV_INSPECT_API std::span<const Damage> damage() const noexcept;

  /// The form of the stream that a node of this document is in.
  TAV_INSPECT_API Form formOf(const tav::Node& node) const noexcept;
  /// What nothing in a group goes past: of one that says it ends behind the group around it or that was never closed,
  /// and that a range of this document handed out, the end of that group; else the end of the bytes.
  TAV_INSPECT_API uint64_t boundOf(const tav::Node& group) const noexcept;
  /// A path that leads back to a node of this document: a walk from the first byte on that steps over the groups beside
  /// the way. Empty where no node begins there.
  TAV_INSPECT_API std::string pathOf(const tav::Node& node, PathStyle style = PathStyle::whole) const;

  /// Names who is told by offset, every few thousand nodes, how far a search is; nobody when empty. To cancel the
  /// search, throw from it.
  TAV_INSPECT_API void tellProgress(std::function<void(uint64_t)> told) const;

  /// The first stream's form, and why it is that one.
  TAV_INSPECT_API const Form& form() const noexcept;
  TAV_INSPECT_API const Recognition& recognition() const noexcept;
  /// The bytes. Of a file as many as there were when it was opened.
  TAV_INSPECT_API ByteSource& source() const noexcept;

private:
  friend struct DocumentState;
  void open(std::unique_ptr<ByteSource> source, const DocumentOptions& options);

  std::unique_ptr<DocumentState> state_;
};

} // namespace tav::inspect
