/// tav.Dictionary: names of own elements, for all that reads and writes.
#pragma once

#include "python/src/object.h"
#include "tav/inspect/dictionary.hpp"

namespace tav::python
{

/// What a `dictionary=` argument says: a Dictionary, or the path of its file; null or None says nothing.
inspect::Dictionary dictionaryOf(PyObject* argument);

/// A Dictionary of Python.
Ref dictionaryObject(inspect::Dictionary dictionary);

/// An element's tag, own ones included; None for an id without one.
Ref tagIn(const inspect::Dictionary& dictionary, uint16_t elm);

/// How an element is called in a path, own ones included.
Ref stepNameIn(const inspect::Dictionary& dictionary, uint16_t elm);

void addDictionary(PyObject* module);

} // namespace tav::python
