/// What is written in Python: classes of results, and what is shown of nodes.
#pragma once

#include "python/src/object.h"

namespace tav::python
{

/// Calls a function of a module with one argument.
PyObject* callPython(const char* module, const char* function, PyObject* argument);

/// A result of a class in tav._results, whose fields are those of the tuple.
Ref makeResult(const char* name, Ref fields);

} // namespace tav::python
