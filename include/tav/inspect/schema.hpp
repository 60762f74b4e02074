/// @file schema.hpp
/// The shape of streams: what paths there are, how often, and what values stand there.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "tav/inspect/api.hpp"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/node.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

struct SchemaOptions
{
  /// Different texts of a path that are counted one by one; their bytes may come to `kBytesOfText` for each of them.
  uint64_t mostTexts = 10'000;
  bool ends = false; ///< count what only ends a group, too
};

inline constexpr uint64_t kBytesOfText = 128;

/// How a stream is added.
struct SchemaWork
{
  DamageWatch::Sink passed{};               ///< is told of damage, by the caller's thread
  std::function<void(uint64_t)> progress{}; ///< is told by offset how far the work is, likewise
  unsigned threads = 1;                     ///< that work on it; the caller's is one of them
  uint64_t partBytes = 0;                   ///< how long the parts are that threads take; 0: by the file's size
};

/// All nodes of one path.
struct SchemaEntry
{
  std::string path{}; ///< steps without numbers
  uint64_t count = 0;
  std::vector<uint16_t> types{}; ///< in ascending order
  /// Of numbers and timestamps, as `plainText` writes them, with their types. Numbers come before timestamps.
  std::optional<std::string> least{};
  std::optional<std::string> greatest{};
  uint16_t leastType = 0;
  uint16_t greatestType = 0;
  std::optional<uint64_t> distinct{}; ///< different texts, or bytes that are no number
  bool more = false;                  ///< there are more than `distinct`, which is where counting ended
};

/// Collects the paths of any number of streams. Memory grows with the number of different paths, the depth, and the
/// texts that are told apart; not with the number of nodes. Used by one thread, which others help where it is asked
/// for.
class Schema
{
public:
  TAV_INSPECT_API explicit Schema(SchemaOptions options = {});
  TAV_INSPECT_API ~Schema();
  Schema(const Schema&) = delete;
  Schema& operator=(const Schema&) = delete;

  /// Walks a whole stream. `seen` is told of every event. Throws Error.
  TAV_INSPECT_API void add(ByteSource& source, const Form& form,
                           const std::function<void(const Walker&, const Event&)>& seen = {});

  /// The same with several threads, with the same outcome; of a file of less than 4 MiB, one does all the work.
  TAV_INSPECT_API void add(ByteSource& source, const Form& form, const SchemaWork& work);

  /// Different paths so far.
  size_t paths() const { return nodes_.size() - 1; }

  /// Hands out all paths: each before those below it, siblings in the order in which they came. `style` brief shortens
  /// those with more than kWholeSteps steps in the middle; whole ones below `mostSteps` levels are "/**/name".
  TAV_INSPECT_API void each(PathStyle style, const std::function<void(const SchemaEntry&)>& told,
                            uint64_t mostSteps = 4000) const;

private:
  class Job;

  /// Orders numbers of all widths and timestamps.
  using Rank = std::array<uint64_t, 4>;
  struct Bound
  {
    Rank rank{};
    std::string text{};
    uint16_t type = 0;
  };
  /// A text of a part of a stream that was new in it, with what it takes to say what the whole stream makes of it.
  struct NewText
  {
    const std::string* text;
    uint64_t size;   ///< of its node
    uint64_t repeat; ///< of the largest node behind it, before the next new text, with a text that was not new
  };
  struct Texts
  {
    std::unordered_set<std::string> seen{};
    std::vector<NewText> inOrder{}; ///< of a part
    uint64_t bytes = 0;
    uint64_t count = 0;
    bool more = false;
  };
  struct PathNode
  {
    uint16_t elm = 0;
    uint32_t firstChild = 0; ///< 0: none; the first of all nodes stands for the file
    uint32_t lastChild = 0;
    uint32_t next = 0;
    uint64_t count = 0;
    std::vector<uint16_t> types{};
    std::unique_ptr<std::array<Bound, 2>> bounds{};
    std::unique_ptr<Texts> texts{};
  };

  void enter(const Walker::State& state);
  void see(ByteSource& source, const Form& form, const Event& event);
  void merge(const Schema& part);
  void mergePath(const PathNode& part, PathNode& path) const;
  void mergeTexts(const Texts& part, Texts& texts) const;
  void endTexts(Texts& texts) const;
  uint64_t roomForTexts() const;
  uint32_t childOf(uint32_t parent, uint16_t elm);
  void addNode(ByteSource& source, const Form& form, const Node& node);
  void addValue(ByteSource& source, const Form& form, const Node& node, PathNode& path) const;
  void addText(ByteSource& source, const Form& form, const Node& node, PathNode& path) const;
  static std::optional<Rank> rankOf(ByteSource& source, const Form& form, const Node& node);
  static SchemaEntry entryOf(const PathNode& path);
  std::string pathText(const std::vector<uint16_t>& steps, PathStyle style, uint64_t mostSteps) const;

  SchemaOptions options_;
  Dictionary dictionary_{}; ///< of all sources; where they say different things, the first is right
  bool isPart_ = false;     ///< of one that is made of parts
  std::vector<PathNode> nodes_{};
  std::unordered_map<uint64_t, uint32_t> children_{}; ///< by parent and element
  std::vector<uint32_t> open_{};                      ///< the nodes on the way to the place, level by level
};

} // namespace tav::inspect
