#include "python/src/input.h"

#include "tav/byteOrder.h"
#include "tav/inspect/problem.hpp"

namespace tav::python
{

namespace
{

/// Closes a file of Python.
struct OpenFile
{
  explicit OpenFile(Ref file)
      : object(std::move(file)) {}
  OpenFile(const OpenFile&) = delete;
  OpenFile& operator=(const OpenFile&) = delete;
  ~OpenFile()
  {
    Py_XDECREF(PyObject_CallMethod(object.get(), "close", nullptr));
    PyErr_Clear();
  }
  Ref object;
};

Ref openFile(const std::string& name, PyObject* path)
{
  const Ref io = made(PyImport_ImportModule("io"));
  PyObject* const file = PyObject_CallMethod(io.get(), "open", "Os", path, "rb");
  if (file == nullptr && PyErr_ExceptionMatches(PyExc_OSError) != 0)
  {
    PyErr_Clear();
    static_cast<void>(inspect::ByteSource::open(name)); // which throws, with the code that says why
    inspect::failAt(name, KOR_RC_OS_ERROR);
  }
  return made(file);
}

/// The bytes of an open file: a map of it, which an empty one cannot have.
Ref map(PyObject* file)
{
  const Ref module = made(PyImport_ImportModule("mmap"));
  const Ref number = made(PyObject_CallMethod(file, "fileno", nullptr));
  const Ref end = made(PyObject_CallMethod(file, "seek", "ii", 0, 2));
  if (PyObject_Not(end.get()) != 0)
  {
    return made(PyBytes_FromStringAndSize("", 0));
  }
  const Ref access = made(PyObject_GetAttrString(module.get(), "ACCESS_READ"));
  const Ref type = made(PyObject_GetAttrString(module.get(), "mmap"));
  const Ref arguments = made(Py_BuildValue("(Oi)", number.get(), 0));
  const Ref named = made(Py_BuildValue("{s:O}", "access", access.get()));
  return made(PyObject_Call(type.get(), arguments.get(), named.get()));
}

Ref viewOf(PyObject* object)
{
  const Ref view = made(PyMemoryView_FromObject(object));
  const Py_buffer& buffer = *PyMemoryView_GET_BUFFER(view.get());
  if (PyBuffer_IsContiguous(&buffer, 'C') == 0)
  {
    raise(PyExc_BufferError, "the bytes do not lie one behind the other");
  }
  const bool isBytes = buffer.ndim == 1 && buffer.itemsize == 1 && std::string_view(buffer.format) == "B";
  const Ref bytes =
      isBytes ? Ref::borrowed(view.get()) : made(PyObject_CallMethod(view.get(), "cast", "s", "B"));
  return made(PyObject_CallMethod(bytes.get(), "toreadonly", nullptr));
}

} // namespace

std::span<const uint8_t> Input::bytes() const
{
  const Py_buffer& buffer = *PyMemoryView_GET_BUFFER(memory.get());
  return {static_cast<const uint8_t*>(buffer.buf), static_cast<size_t>(buffer.len)};
}

std::unique_ptr<inspect::ByteSource> Input::source() const
{
  auto made = std::make_unique<inspect::ByteSource>(name, bytes());
  made->setDictionary(dictionary);
  return made;
}

bool isPath(PyObject* what)
{
  return PyUnicode_Check(what) != 0 || PyObject_HasAttrString(what, "__fspath__") != 0;
}

std::string pathOfFile(PyObject* path)
{
  PyObject* encoded = nullptr;
  if (PyUnicode_FSConverter(path, &encoded) == 0)
  {
    throw Raised{};
  }
  const Ref bytes(encoded);
  return {PyBytes_AS_STRING(encoded), static_cast<size_t>(PyBytes_GET_SIZE(encoded))};
}

Input openInput(PyObject* what, PyObject* dictionary)
{
  if (!isPath(what))
  {
    return {viewOf(what), "memory", dictionaryOf(dictionary)};
  }
  Input input{{}, pathOfFile(what), dictionaryOf(dictionary)};
  const OpenFile file(openFile(input.name, what));
  input.memory = viewOf(map(file.object.get()).get());
  return input;
}

inspect::FormChoice choiceOf(PyObject* byteOrder, PyObject* root, PyObject* align)
{
  const auto isGiven = [](PyObject* argument) { return argument != nullptr && argument != Py_None; };
  inspect::FormChoice choice;
  if (isGiven(byteOrder))
  {
    const std::string order = bytesOfText(byteOrder);
    if (order != "little" && order != "big")
    {
      raise(PyExc_ValueError, "byte_order is 'little' or 'big'");
    }
    choice.swapped = (order == "little") != kor::isLittleEndian;
  }
  if (isGiven(root))
  {
    const long bits = PyLong_AsLong(root);
    if (bits != 32 && bits != 64)
    {
      if (PyErr_Occurred() != nullptr)
      {
        throw Raised{};
      }
      raise(PyExc_ValueError, "root is 32 or 64, the bits of the first node's header");
    }
    choice.root64 = bits == 64;
  }
  if (isGiven(align))
  {
    choice.aligned = done(PyObject_IsTrue(align)) != 0;
  }
  return choice;
}

Told::Told(PyObject* tuple)
{
  PyObject* byteOrder = nullptr;
  PyObject* root = nullptr;
  PyObject* align = nullptr;
  done(PyArg_ParseTuple(tuple, "OOOO", &byteOrder, &root, &align, &dictionary) - 1);
  choice = choiceOf(byteOrder, root, align);
}

Ref formTuple(const inspect::Form& form)
{
  return made(Py_BuildValue("(siO)", form.swapped != kor::isLittleEndian ? "little" : "big", form.root64 ? 64 : 32,
                            form.aligned ? Py_True : Py_False));
}

} // namespace tav::python
