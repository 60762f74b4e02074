// Rows of nodes as Python sees them: buffers of plain values, and arrays of objects that it has made to be filled.
#include "python/src/names.h"
#include "python/src/places.h"
#include "python/src/rows.h"
#include "python/src/values.h"

namespace tav::python
{

namespace
{

PyTypeObject* rowsType = nullptr;
PyTypeObject* bufferType = nullptr;

struct RowsObject
{
  PyObject_HEAD
      std::unique_ptr<Rows>
          rows;
};

/// A column of plain values, as a buffer.
struct BufferObject
{
  PyObject_HEAD
      PyObject* owner;
  void* items;
  Py_ssize_t count;
  Py_ssize_t itemSize;
  const char* format;
};

Rows& rowsOf(PyObject* self)
{
  return *reinterpret_cast<RowsObject*>(self)->rows;
}

template<class T>
PyObject* bufferOf(PyObject* owner, inspect::NodeColumns::Column<T>& column, const char* format)
{
  return makeBuffer(owner, column.data(), rowsOf(owner).columns.count(), sizeof(T), format).release();
}

int getBuffer(PyObject* self, Py_buffer* view, int flags)
{
  auto& buffer = *reinterpret_cast<BufferObject*>(self);
  static char nothing = 0;
  void* const items = buffer.items != nullptr ? buffer.items : &nothing;
  if (PyBuffer_FillInfo(view, self, items, buffer.count * buffer.itemSize, 0, flags) < 0)
  {
    return -1;
  }
  view->itemsize = buffer.itemSize;
  if ((flags & PyBUF_FORMAT) == PyBUF_FORMAT)
  {
    view->format = const_cast<char*>(buffer.format);
  }
  if ((flags & PyBUF_ND) == PyBUF_ND)
  {
    view->shape = &buffer.count;
  }
  if ((flags & PyBUF_STRIDES) == PyBUF_STRIDES)
  {
    view->strides = &buffer.itemSize;
  }
  return 0;
}

void deleteBuffer(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  Py_DECREF(reinterpret_cast<BufferObject*>(self)->owner);
  PyObject_Free(self);
  Py_DECREF(type);
}

void deleteRows(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  std::destroy_at(&reinterpret_cast<RowsObject*>(self)->rows);
  PyObject_Free(self);
  Py_DECREF(type);
}

PyObject* column(PyObject* self, PyObject* argument)
{
  return guarded([&]() -> PyObject* {
    Rows& rows = rowsOf(self);
    const std::string name = bytesOfText(argument);
    // clang-format off
    if (name == "parent")
    {
      return bufferOf(self, rows.columns.parent, "q");
    }
    if (name == "depth")
    {
      return bufferOf(self, rows.columns.depth, "I");
    }
    if (name == "offset")
    {
      return bufferOf(self, rows.columns.offset, "Q");
    }
    if (name == "size")
    {
      return bufferOf(self, rows.columns.size, "Q");
    }
    if (name == "id")
    {
      return bufferOf(self, rows.columns.id, "H");
    }
    if (name == "key")
    {
      return bufferOf(self, rows.columns.key, "H");
    }
    if (name == "kind")
    {
      return bufferOf(self, rows.columns.kind, "B");
    }
    if (name == "number")
    {
      return bufferOf(self, rows.columns.number, rows.hasUpper ? "Q" : "q");
    }
    if (name == "time")
    {
      return bufferOf(self, rows.columns.time, "q");
    }
    // clang-format on
    raise(PyExc_KeyError, "there is no such column");
  });
}

Ref numberAt(const inspect::NodeColumns& rows, size_t row)
{
  switch (rows.kind[row])
  {
  case inspect::ValueKind::number:
    return isSignedNumber(rows.type[row]) ? made(PyLong_FromLongLong(static_cast<int64_t>(rows.number[row])))
                                          : numberOf(rows.number[row]);
  case inspect::ValueKind::wide:
    return made(valueOf(rows.rest(row)));
  default:
    return Ref(none());
  }
}

/// A value in the column of bytes: words are in this machine's order.
Ref bytesAt(const inspect::NodeColumns& rows, size_t row)
{
  const tav::detail::RawValue raw = rows.rest(row);
  if (raw.type == TAV_TYPE_UINT64_ARRAY)
  {
    return made(PyBytes_FromObject(made(valueOf(raw)).get()));
  }
  return made(PyBytes_FromStringAndSize(reinterpret_cast<const char*>(raw.bytes), static_cast<Py_ssize_t>(raw.size)));
}

void fillTypes(const inspect::NodeColumns& rows, Places& places)
{
  for (size_t row = 0; row < rows.count(); ++row)
  {
    places.put(row, Py_NewRef(typeNameOf(rows.type[row])));
  }
}

void fillTags(const inspect::NodeColumns& rows, Places& places, const inspect::Dictionary& dictionary)
{
  const bool hasOwn = !dictionary.isEmpty();
  for (size_t row = 0; row < rows.count(); ++row)
  {
    places.put(row, hasOwn ? tagIn(dictionary, rows.id[row]).release() : Py_NewRef(tagOf(rows.id[row])));
  }
}

void fillRests(const inspect::NodeColumns& rows, Places& places, inspect::ValueKind kind)
{
  for (size_t row = 0; row < rows.count(); ++row)
  {
    if (rows.kind[row] == kind)
    {
      const bool isText = kind == inspect::ValueKind::text;
      places.put(row, (isText ? made(valueOf(rows.rest(row))) : bytesAt(rows, row)).release());
    }
  }
}

PyObject* fillObjects(PyObject* self, PyObject* arguments)
{
  return guarded([&] {
    PyObject* name = nullptr;
    PyObject* array = nullptr;
    done(PyArg_ParseTuple(arguments, "UO", &name, &array) - 1);
    const inspect::NodeColumns& rows = rowsOf(self).columns;
    const std::string wanted = bytesOfText(name);
    Places places(array, rows.count());
    if (wanted == "tag")
    {
      fillTags(rows, places, rowsOf(self).dictionary());
    }
    else if (wanted == "type")
    {
      fillTypes(rows, places);
    }
    else if (wanted == "text")
    {
      fillRests(rows, places, inspect::ValueKind::text);
    }
    else if (wanted == "bytes")
    {
      fillRests(rows, places, inspect::ValueKind::bytes);
    }
    else
    {
      for (size_t row = 0; row < rows.count(); ++row)
      {
        places.put(row, wanted == "path" ? textOf(rows.paths[row]).release() : numberAt(rows, row).release());
      }
    }
    return none();
  });
}

PyObject* getCount(PyObject* self, void*)
{
  return PyLong_FromSize_t(rowsOf(self).columns.count());
}

/// The type of the numbers' column: of 64 bits where they all fit, else of objects.
PyObject* getNumberType(PyObject* self, void*)
{
  const Rows& rows = rowsOf(self);
  const bool isMixed = rows.hasWide || (rows.hasUpper && rows.hasNegative);
  return PyUnicode_FromString(isMixed ? "object" : rows.hasUpper ? "uint64"
                                                                 : "int64");
}

PyGetSetDef rowsAttributes[] = {{"count", getCount, nullptr, nullptr, nullptr},
                                {"number_type", getNumberType, nullptr, nullptr, nullptr},
                                {}};
PyMethodDef rowsMethods[] = {{"column", column, METH_O, nullptr}, {"fill", fillObjects, METH_VARARGS, nullptr}, {}};
PyType_Slot rowsSlots[] = {{Py_tp_dealloc, asSlot(deleteRows)},
                           {Py_tp_getset, rowsAttributes},
                           {Py_tp_methods, rowsMethods},
                           {0, nullptr}};
PyType_Slot bufferSlots[] = {{Py_tp_dealloc, asSlot(deleteBuffer)},
                             {Py_bf_getbuffer, asSlot(getBuffer)},
                             {0, nullptr}};

constexpr unsigned kFlags = Py_TPFLAGS_DEFAULT | Py_TPFLAGS_DISALLOW_INSTANTIATION | Py_TPFLAGS_IMMUTABLETYPE;
PyType_Spec rowsSpec = {"tav._tav.Rows", sizeof(RowsObject), 0, kFlags, rowsSlots};
PyType_Spec bufferSpec = {"tav._tav.Buffer", sizeof(BufferObject), 0, kFlags, bufferSlots};

} // namespace

Ref makeBuffer(PyObject* owner, void* items, size_t count, size_t itemSize, const char* format)
{
  auto* const buffer = PyObject_New(BufferObject, bufferType);
  if (buffer == nullptr)
  {
    throw Raised{};
  }
  buffer->owner = Py_NewRef(owner);
  buffer->items = items;
  buffer->count = static_cast<Py_ssize_t>(count);
  buffer->itemSize = static_cast<Py_ssize_t>(itemSize);
  buffer->format = format;
  return Ref(reinterpret_cast<PyObject*>(buffer));
}

PyObject* columnsOf(ReaderObject& reader, bool withPaths, PyObject* progress)
{
  Opened& opened = useDocument(reader);
  const std::shared_ptr<Opened> kept = reader.opened;
  auto rows = std::make_unique<Rows>(kept);
  const auto source = opened.input.source();
  {
    Searching searching(reader, progress);
    rows->fill(*source, withPaths, searching.pass());
  }
  auto* const object = PyObject_New(RowsObject, rowsType);
  if (object == nullptr)
  {
    throw Raised{};
  }
  new (&object->rows) std::unique_ptr<Rows>(std::move(rows));
  return reinterpret_cast<PyObject*>(object);
}

void addColumns(PyObject* module)
{
  rowsType = makeType(module, rowsSpec, nullptr);
  bufferType = makeType(module, bufferSpec, nullptr);
}

} // namespace tav::python
