#include "python/src/results.h"

namespace tav::python
{

PyObject* callPython(const char* module, const char* function, PyObject* argument)
{
  const Ref imported = made(PyImport_ImportModule(module));
  const Ref callable = made(PyObject_GetAttrString(imported.get(), function));
  return made(PyObject_CallOneArg(callable.get(), argument)).release();
}

Ref makeResult(const char* name, Ref fields)
{
  const Ref imported = made(PyImport_ImportModule("tav._results"));
  const Ref type = made(PyObject_GetAttrString(imported.get(), name));
  return made(PyObject_CallObject(type.get(), fields.get()));
}

} // namespace tav::python
