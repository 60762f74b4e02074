/// @file session.h
/// What nearly every command begins with: the file named on its command line, opened and recognised.
#pragma once

#include <memory>
#include <string>

#include "tav/inspect/form.hpp"
#include "tav/inspect/source.hpp"
#include "tools/shell/names.h"
#include "tools/shell/options.h"

namespace tav::tool
{

/// An opened stream and how to read it.
struct Stream
{
  std::unique_ptr<ByteSource> source;
  Recognition recognition;

  ByteSource& bytes() { return *source; }
  const Form& form() const { return recognition.form; }
};

/// What the options say of the form: --byte-order, --root, --align, --no-align.
FormChoice formChoice(const Invocation& invocation);

/// Bytes of memory for pages: --ring.
uint64_t ringBytes(const Invocation& invocation);

/// Opens a file and recognises its form; options override. Throws Failure with kTooDamaged when nothing in it looks
/// like a stream. With `lenient`, such a file is handed out all the same, with the most likely form.
Stream openStream(const Invocation& invocation, const std::string& path, bool lenient = false);

/// The one FILE argument of most commands.
Stream openStream(const Invocation& invocation);

/// Remembers how much was read for --stats. Called when a source is done with.
void tellStatistics(const Invocation& invocation, const ByteSource& source);

} // namespace tav::tool
