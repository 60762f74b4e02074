// The module tav._tav: types and functions under the package's own names.
#include "python/src/job.h"
#include "python/src/reader.h"
#include "python/src/values.h"

namespace tav::python
{

namespace
{

// What Python hands to its users is in tav/__init__.py, with names for the arguments.
PyMethodDef functions[] = {{"recognise", recognise, METH_VARARGS, nullptr},
                           {"check", check, METH_VARARGS, nullptr},
                           {"diff", diff, METH_VARARGS, nullptr},
                           {"schema", schema, METH_VARARGS, nullptr},
                           {"to_json", toJson, METH_VARARGS, nullptr},
                           {"from_json", fromJson, METH_VARARGS, nullptr},
                           {"recover", recover, METH_VARARGS, nullptr},
                           {"set", setValues, METH_VARARGS, nullptr},
                           {"read_table", readTable, METH_VARARGS, nullptr},
                           {"read_part", readPart, METH_VARARGS, nullptr},
                           {"plan", plan, METH_VARARGS, nullptr},
                           {"behind_of", behindOf, METH_VARARGS, nullptr},
                           {"holds_behind", holdsBehind, METH_VARARGS, nullptr},
                           {"extract", extract, METH_VARARGS, nullptr},
                           {}};

PyModuleDef definition = {PyModuleDef_HEAD_INIT, "tav._tav", "The compiled part of the package tav.", -1, functions,
                          nullptr, nullptr, nullptr, nullptr};

PyObject* makeModule()
{
  Ref module = made(PyModule_Create(&definition));
  prepareValues();
  addErrors(module.get());
  addDictionary(module.get());
  addReader(module.get());
  addNode(module.get());
  addWalks(module.get());
  addColumns(module.get());
  addTable(module.get());
  addWriter(module.get());
  addFollowing(module.get());
  done(PyModule_AddStringConstant(module.get(), "__version__", TAV_VERSION));
  return module.release();
}

} // namespace

} // namespace tav::python

PyMODINIT_FUNC PyInit__tav()
{
  return tav::python::guarded([] { return tav::python::makeModule(); });
}
