// Failures of the library as Python exceptions, and small services of the interface.
#include "python/src/object.h"

#include <new>
#include <stdexcept>

#include "tav/inspect/problem.hpp"

namespace tav::python
{

namespace
{

PyObject* tavError = nullptr;

constexpr const char* kErrorDoc =
    "A failure of the library.\n\n"
    "code: the library's code, an int; name: its name, as 'TAV_RC_NOT_FOUND'\n"
    "offset: in bytes from the stream's first one, or None; path: of the node, or None\n"
    "file: as it was given, or None; hint: what to do next, or None";

void attach(PyObject* error, const char* name, Ref value)
{
  done(PyObject_SetAttrString(error, name, value.get()));
}

Ref textOrNone(std::string_view text)
{
  return text.empty() ? Ref(none()) : textOf(text);
}

void raiseProblem(const inspect::Problem& problem, uint32_t code)
{
  const std::string line = inspect::problemLine(problem);
  const Ref error = made(PyObject_CallFunctionObjArgs(tavError, textOf(line).get(), nullptr));
  const auto* const known = tav::detail::codeTextOf(code);
  attach(error.get(), "code", numberOf(code));
  attach(error.get(), "name", textOf(known != nullptr ? known->name : ""));
  attach(error.get(), "offset", problem.offset ? numberOf(*problem.offset) : Ref(none()));
  attach(error.get(), "path", textOrNone(problem.path));
  attach(error.get(), "file", textOrNone(problem.file));
  attach(error.get(), "hint", textOrNone(problem.hint));
  PyErr_SetObject(tavError, error.get());
}

/// The code of an error of the layer, whichever library has thrown it: each has a category of its own.
uint32_t codeIn(const std::error_code& error)
{
  const bool isOurs = std::string_view(error.category().name()) == category().name();
  return isOurs ? static_cast<uint32_t>(error.value()) : uint32_t{TAV_RC_OK};
}

/// The exception at hand, by its type.
void translate()
{
  try
  {
    throw;
  }
  catch (const inspect::Error& error)
  {
    const uint32_t code = codeIn(error.code());
    raiseProblem(error.problem(), code != TAV_RC_OK ? code : TAV_RC_BAD_PARAM);
  }
  catch (const std::system_error& error)
  {
    const uint32_t code = codeIn(error.code());
    raiseProblem(inspect::Problem{.sentence = error.what()}, code != TAV_RC_OK ? code : KOR_RC_OS_ERROR);
  }
  catch (const std::bad_alloc&)
  {
    PyErr_NoMemory();
  }
  catch (const std::exception& error)
  {
    PyErr_SetString(PyExc_RuntimeError, error.what());
  }
}

} // namespace

void tellPython() noexcept
{
  try
  {
    translate();
  }
  catch (const Raised&)
  {
    return; // of making the exception
  }
  catch (...)
  {
    PyErr_NoMemory();
  }
}

std::string bytesOfText(PyObject* text)
{
  if (!PyUnicode_Check(text))
  {
    raise(PyExc_TypeError, "a str is expected");
  }
  const Ref bytes = made(PyUnicode_AsEncodedString(text, "utf-8", "surrogateescape"));
  return {PyBytes_AS_STRING(bytes.get()), static_cast<size_t>(PyBytes_GET_SIZE(bytes.get()))};
}

void raise(PyObject* type, const char* sentence)
{
  PyErr_SetString(type, sentence);
  throw Raised{};
}

void fail(uint32_t code, const std::string& sentence)
{
  raiseProblem(inspect::Problem{.sentence = sentence, .code = code}, code);
  throw Raised{};
}

void addErrors(PyObject* module)
{
  const Ref defaults = made(Py_BuildValue("{s:i,s:s,s:O,s:O,s:O,s:O}", "code", 0, "name", "", "offset", Py_None, "path",
                                          Py_None, "file", Py_None, "hint", Py_None));
  tavError = made(PyErr_NewExceptionWithDoc("tav.TavError", kErrorDoc, nullptr, defaults.get())).release();
  done(PyModule_AddObjectRef(module, "TavError", tavError));
}

PyTypeObject* makeType(PyObject* module, PyType_Spec& spec, const char* name)
{
  Ref type = made(PyType_FromSpec(&spec));
  if (name != nullptr)
  {
    done(PyModule_AddObjectRef(module, name, type.get()));
  }
  return reinterpret_cast<PyTypeObject*>(type.release());
}

char** keywords(const char* const* names) noexcept
{
  return const_cast<char**>(names);
}

} // namespace tav::python
