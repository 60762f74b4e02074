/// Arrays of objects that Python has made, to be filled.
#pragma once

#include <string_view>

#include "python/src/object.h"

namespace tav::python
{

/// The places of an array of objects, which holds None or nothing at each of them.
class Places
{
public:
  Places(PyObject* array, size_t count)
  {
    done(PyObject_GetBuffer(array, &view_, PyBUF_WRITABLE | PyBUF_FORMAT | PyBUF_C_CONTIGUOUS));
    const bool isRight =
        std::string_view(view_.format) == "O" && static_cast<size_t>(view_.len) == count * sizeof(PyObject*);
    if (!isRight)
    {
      PyBuffer_Release(&view_);
      raise(PyExc_ValueError, "an array of as many objects as rows is expected");
    }
  }
  Places(const Places&) = delete;
  Places& operator=(const Places&) = delete;
  ~Places()
  {
    Py_SET_REFCNT(Py_None, Py_REFCNT(Py_None) - nones_);
    PyBuffer_Release(&view_);
  }

  /// Takes the object over.
  void put(size_t row, PyObject* object)
  {
    auto* const places = static_cast<PyObject**>(view_.buf);
    PyObject* const before = std::exchange(places[row], object);
    if (before == Py_None) [[likely]]
    {
      ++nones_; // given back at once: they are most of the work
    }
    else
    {
      Py_XDECREF(before);
    }
  }

private:
  Py_ssize_t nones_ = 0;
  Py_buffer view_{};
};

/// Plain values of an object of Python, as a buffer that keeps it.
Ref makeBuffer(PyObject* owner, void* items, size_t count, size_t itemSize, const char* format);

} // namespace tav::python
