/// Names of elements and types as Python has them: each made once.
#pragma once

#include <cstdint>

#include "python/src/object.h"

namespace tav::python
{

/// An element's tag; None for an id without one. Borrowed, lives for ever; null after a failure.
PyObject* tagOf(uint16_t elm);

/// How an element is called in a path, which stands for it alone: its tag, else "#60103". As tagOf.
PyObject* stepNameOf(uint16_t elm);

/// A type's name as `tav json` has it; the number of a type without one. As tagOf.
PyObject* typeNameOf(uint16_t type);

/// The id that a tag, a constant, "#60103" or a number means.
uint16_t idOf(PyObject* name);

/// The type that a name or a number means.
uint16_t typeOf(PyObject* name);

} // namespace tav::python
