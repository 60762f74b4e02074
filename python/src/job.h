/// What the functions of the module have in common: a stream of a file or of bytes, in a form that is given or found.
#pragma once

#include <memory>
#include <optional>

#include "python/src/input.h"
#include "python/src/pass.h"
#include "tav/inspect/damageWatch.hpp"
#include "tav/inspect/patchFile.hpp"
#include "tav/inspect/scratch.hpp"

namespace tav::python
{

/// A stream that is worked on.
struct Job
{
  /// `form` as of Told. What is no stream raises TavError.
  Job(PyObject* what, PyObject* form);

  Input input;
  std::unique_ptr<inspect::ByteSource> source;
  inspect::Recognition recognition;

  const inspect::Form& form() const { return recognition.form; }
  const inspect::Dictionary& dictionary() const { return input.dictionary; }

private:
  Job(PyObject* what, const Told& told);
};

/// Follows a walk: tells how far it is, and ends it at damage unless that is skipped.
class Guard
{
public:
  Guard(Job& job, Pass& pass, bool skips);
  void see(const inspect::Walker& walker, const inspect::Event& event);

private:
  Pass& pass_;
  inspect::DamageWatch watch_;
};

/// Where a new stream goes: an empty file that is there, or, without a path, bytes.
class Product
{
public:
  explicit Product(PyObject* path);
  inspect::PatchFile& file() { return *patch_; }
  /// Called without the interpreter: all is in the file.
  void finish();
  /// The bytes; None for a file.
  Ref result();

private:
  std::string path_{}; ///< empty: bytes
  std::unique_ptr<inspect::Scratch> scratch_{};
  KORHFile own_{};
  std::optional<inspect::PatchFile> patch_{};
};

/// A number for Py_BuildValue.
inline unsigned long long wide(uint64_t number)
{
  return number;
}

PyObject* recognise(PyObject* module, PyObject* arguments);
PyObject* check(PyObject* module, PyObject* arguments);
PyObject* diff(PyObject* module, PyObject* arguments);
PyObject* schema(PyObject* module, PyObject* arguments);
PyObject* toJson(PyObject* module, PyObject* arguments);
PyObject* fromJson(PyObject* module, PyObject* arguments);
PyObject* recover(PyObject* module, PyObject* arguments);
PyObject* setValues(PyObject* module, PyObject* arguments);
PyObject* extract(PyObject* module, PyObject* arguments);

} // namespace tav::python
