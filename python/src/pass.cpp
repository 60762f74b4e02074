#include "python/src/pass.h"

namespace tav::python
{

void Pass::look(uint64_t offset)
{
  told_ = offset;
  calls_ = 0;
  hold();
  done(PyErr_CheckSignals());
  if (progress_ != nullptr)
  {
    made(PyObject_CallFunctionObjArgs(progress_, numberOf(offset).get(), numberOf(total_).get(), nullptr));
  }
  thread_ = PyEval_SaveThread();
}

PyObject* progressOf(PyObject* argument)
{
  if (argument == nullptr || argument == Py_None)
  {
    return nullptr;
  }
  if (PyCallable_Check(argument) == 0)
  {
    raise(PyExc_TypeError, "progress is called with the bytes that are done and all bytes: a callable is expected");
  }
  return argument;
}

} // namespace tav::python
