/// @file collect.hpp
/// Subtrees and whole streams as one new stream.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "tav/inspect/api.hpp"
#include "tav/inspect/form.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/path.hpp"
#include "tav/inspect/source.hpp"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

struct CollectOptions
{
  FormChoice form{};      ///< of the new stream; what is not given is the first source's
  bool ownWidths = false; ///< a root has the header that its group had, instead of the form's
};

/// Appends nodes of any streams, one root behind the other. Values stay, in the byte order of the new stream; sizes,
/// paddings, pairs and end elements are made anew. Zeros and damaged bytes are left out. Memory grows with the depth.
/// Used by one thread.
class Collector
{
public:
  using Seen = std::function<void(const Walker&, const Event&)>;

  /// `out` outlives this object.
  TAV_INSPECT_API explicit Collector(PatchFile& out, const CollectOptions& options = {});
  TAV_INSPECT_API ~Collector();
  Collector(const Collector&) = delete;
  Collector& operator=(const Collector&) = delete;

  /// Appends all roots of a source. `seen` is told of every event. Throws Error, for what 32-bit headers cannot hold,
  /// too; what was appended until then stays.
  TAV_INSPECT_API void add(ByteSource& source, const Form& form, const Seen& seen = {});

  /// Appends the groups that a path leads to, of nested ones the outermost. Throws Error also where it leads to a node
  /// that is no group, or to none.
  TAV_INSPECT_API void addFound(ByteSource& source, const Form& form, const Path& path, const Seen& seen = {});

  /// Ends the stream; called once, after everything else.
  TAV_INSPECT_API void finish();

  /// Appended so far; end elements are not counted.
  TAV_INSPECT_API uint64_t roots() const;
  TAV_INSPECT_API uint64_t nodes() const;

private:
  class Work;
  std::unique_ptr<Work> work_;
};

} // namespace tav::inspect
