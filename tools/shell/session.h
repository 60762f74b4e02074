/// @file session.h
/// What nearly every command begins with: the file named on its command line, opened and recognised.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "tav/inspect.hpp"
#include "tools/shell/names.h"
#include "tools/shell/options.h"
#include "tools/shell/report.h"

namespace tav::tool
{

/// An opened stream and how to read it.
struct Stream
{
  std::unique_ptr<ByteSource> source;
  Recognition recognition;
  std::optional<FileKind> kind{}; ///< what else the file is, when it is no stream

  ByteSource& bytes() { return *source; }
  const Form& form() const { return recognition.form; }
  bool isStream() const { return recognition.isStream && !kind; }
};

/// What to report of a file that is no stream, an empty one included: one wording for all commands.
Problem noStream(const Stream& stream);

/// What the options say of the form: --byte-order, --root, --align, --no-align.
FormChoice formChoice(const Invocation& invocation);

/// The ids of an element that an option names. Throws Failure when no element has the name.
std::vector<uint16_t> requireIds(const std::string& option, const std::string& name,
                                 const Dictionary& dictionary);

/// Bytes of memory for pages: --ring.
uint64_t ringBytes(const Invocation& invocation);

/// Threads that work on one file: --jobs; 0 means as many as there are processors.
unsigned jobsOf(const Invocation& invocation);
OptionSpec jobsOption();

/// Opens a file, from an offset on, and recognises its form; options override. Throws Failure with kTooDamaged when it
/// is no stream. With `lenient`, such a file is handed out all the same, with the most likely form.
Stream openStream(const Invocation& invocation, const std::string& path, uint64_t from, bool lenient = false);

/// The same with another choice of the form than that of the options.
Stream openStream(const Invocation& invocation, const std::string& path, uint64_t from, const FormChoice& choice,
                  bool lenient = false);

/// The one FILE argument of most commands, from --from on.
Stream openStream(const Invocation& invocation, bool lenient = false);

/// Collects what a command passes over, to be told when its result is written: a line each on standard error.
class DamageNotices
{
public:
  explicit DamageNotices(Stream& stream);
  DamageNotices(const DamageNotices&) = delete;
  DamageNotices& operator=(const DamageNotices&) = delete;

  /// To be given every event of the command's own walk,
  void see(const Walker& walker, const Event& event) { watch_.see(walker, event); }
  /// or what a walk of the library has passed over.
  void add(PassedOver passed);

  /// Prints the lines; kFindings when there are some, else kFine.
  Status tell() const;

private:
  static constexpr size_t kMostLines = 1000; ///< the rest is counted

  const Stream& stream_;
  std::vector<PassedOver> passed_{};
  uint64_t places_ = 0;
  DamageWatch watch_;
};

/// Works on one of several files, from --from on. What is no stream, and an Error, is told, and what was passed over
/// until then, and ends nothing else. Returns the highest status.
Status forFile(const Invocation& invocation, const std::string& name,
               const std::function<Status(Stream&, DamageNotices&)>& work);

/// Remembers how much was read for --stats. Called when a source is done with.
void tellStatistics(const Invocation& invocation, const ByteSource& source);

} // namespace tav::tool
