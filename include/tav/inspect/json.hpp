/// @file json.hpp
/// Streams as JSON that loses nothing, and back. docs/json.md describes the form.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>

#include "tav/inspect/api.hpp"
#include "tav/inspect/dictionary.hpp"
#include "tav/inspect/jsonWriter.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/textSource.hpp"

namespace tav::inspect
{

struct ToJsonOptions
{
  JsonStyle style = JsonStyle::readable;
  bool safe = false;                        ///< whole numbers that a double cannot hold are written as texts
  std::function<void(uint64_t)> progress{}; ///< is told by offset how far the work is
};

/// Writes a whole stream; true when some bytes of it are no node. Throws Error, and what the sink throws.
TAV_INSPECT_API bool toJson(ByteSource& source, const Form& form, Sink& out, const ToJsonOptions& options = {});

/// What is asked for instead of what the document says. Any of it makes sizes, pairs and paddings anew.
struct Conversion
{
  std::optional<bool> swapped{};
  std::optional<bool> root64{};
  std::optional<bool> aligned{};
  bool eyeSize = false;
  Dictionary dictionary{}; ///< what the document may call own elements; their ids are understood without it

  bool isAsked() const { return swapped || root64 || aligned || eyeSize; }
};

/// What a conversion has left out: damaged places, which cannot be converted.
struct LeftOut
{
  uint64_t places = 0;
  uint64_t bytes = 0;
};

/// Makes the stream that a document describes. Throws Error, with line and byte of the document, when it is no JSON or
/// describes no stream; what was appended until then stays.
TAV_INSPECT_API LeftOut fromJson(TextSource& document, PatchFile& out, const Conversion& conversion = {});

} // namespace tav::inspect
