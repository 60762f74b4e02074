/// What is read: a file by its path, or bytes that Python has.
#pragma once

#include <memory>
#include <span>

#include "python/src/dictionary.h"
#include "python/src/object.h"
#include "tav/inspect/form.hpp"
#include "tav/inspect/source.hpp"

namespace tav::python
{

/// Bytes, and what keeps them where they are. A file is mapped, so that nothing of it is read before it is asked for.
struct Input
{
  Ref memory{};     ///< a memoryview of all bytes, read-only
  std::string name; ///< as messages call it
  inspect::Dictionary dictionary{};

  std::span<const uint8_t> bytes() const;
  std::unique_ptr<inspect::ByteSource> source() const;
};

/// `what` is a path (str or os.PathLike), or an object with a buffer; `dictionary` as of dictionaryOf.
Input openInput(PyObject* what, PyObject* dictionary = nullptr);

/// Whether an argument names a file.
bool isPath(PyObject* what);

/// A path in UTF-8.
std::string pathOfFile(PyObject* path);

/// What byte_order=, root= and align= say; null or None says nothing.
inspect::FormChoice choiceOf(PyObject* byteOrder, PyObject* root, PyObject* align);

/// How functions of the module are told of a stream: a tuple (byte_order, root, align, dictionary). The dictionary is
/// the tuple's.
struct Told
{
  explicit Told(PyObject* tuple);
  inspect::FormChoice choice{};
  PyObject* dictionary = nullptr;
};

/// A form as Python has it: (byte_order, root, align).
Ref formTuple(const inspect::Form& form);

} // namespace tav::python
