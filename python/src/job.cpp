#include "python/src/job.h"

#include "tav/inspect/fileKind.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::python
{

namespace
{

[[noreturn]] void refuse(const inspect::ByteSource& source, const std::optional<inspect::FileKind>& kind)
{
  throw inspect::Error(
      inspect::Problem{.file = source.name(),
                       .sentence = kind                 ? "this is " + std::string(kind->text) + ", no stream"
                                   : source.size() == 0 ? "the file is empty, no stream"
                                                        : "this is no stream, or nothing of it is whole",
                       .code = TAV_RC_NOT_FOUND},
      inspect::Trouble::notFound);
}

inspect::DamageWatch::Sink sinkOf(const Job& job, bool skips)
{
  if (skips)
  {
    return [](const inspect::PassedOver&) {};
  }
  return [&job](const inspect::PassedOver& passed) {
    throw inspect::Error(inspect::Problem{.file = job.input.name,
                                          .offset = passed.offset,
                                          .path = passed.path,
                                          .sentence = passed.reason,
                                          .code = passed.code});
  };
}

} // namespace

Job::Job(PyObject* what, PyObject* form)
    : Job(what, Told(form))
{
}

Job::Job(PyObject* what, const Told& told)
    : input(openInput(what, told.dictionary)), source(input.source())
{
  const inspect::FormChoice& choice = told.choice;
  recognition = inspect::recognise(*source, choice);
  const bool isGiven = choice.swapped || choice.root64 || choice.aligned;
  const auto kind = isGiven ? std::nullopt : inspect::otherKindOf(*source, recognition);
  if (!recognition.isStream || kind)
  {
    refuse(*source, kind);
  }
}

Guard::Guard(Job& job, Pass& pass, bool skips)
    : pass_(pass), watch_(*job.source, job.form(), sinkOf(job, skips))
{
}

void Guard::see(const inspect::Walker& walker, const inspect::Event& event)
{
  pass_.at(event.offset);
  watch_.see(walker, event);
}

Product::Product(PyObject* path)
{
  if (path == Py_None)
  {
    scratch_ = inspect::makeScratch();
    patch_.emplace(scratch_->file());
    return;
  }
  path_ = pathOfFile(path);
  KORFileOpenParam open;
  open.pPath = path_.c_str();
  open.options = KOR_FILE_UPDATE;
  const uint32_t code = own_.open(&open);
  if (code != TAV_RC_OK)
  {
    inspect::failAt(path_, code);
  }
  patch_.emplace(own_);
}

void Product::finish()
{
  patch_->flush();
  const uint32_t code = path_.empty() ? TAV_RC_OK : own_.close();
  if (code != TAV_RC_OK)
  {
    inspect::failAt(path_, code);
  }
}

Ref Product::result()
{
  if (!path_.empty())
  {
    return Ref(none());
  }
  const uint64_t length = patch_->length();
  Ref bytes = made(PyBytes_FromStringAndSize(nullptr, static_cast<Py_ssize_t>(length)));
  auto* const to = reinterpret_cast<uint8_t*>(PyBytes_AS_STRING(bytes.get()));
  if (patch_->read(0, std::span(to, static_cast<size_t>(length))) != length)
  {
    inspect::failAt("a temporary file", TAV_RC_END_OF_STORAGE);
  }
  return bytes;
}

} // namespace tav::python
