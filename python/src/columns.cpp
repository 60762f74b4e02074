// Rows of nodes as Python sees them: buffers of plain values, and arrays of objects that it has made to be filled.
#include "python/src/names.h"
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
PyObject* makeBuffer(PyObject* owner, Column<T>& column, const char* format)
{
  auto* const buffer = PyObject_New(BufferObject, bufferType);
  if (buffer == nullptr)
  {
    throw Raised{};
  }
  buffer->owner = Py_NewRef(owner);
  buffer->items = column.data();
  buffer->count = static_cast<Py_ssize_t>(rowsOf(owner).count());
  buffer->itemSize = sizeof(T);
  buffer->format = format;
  return reinterpret_cast<PyObject*>(buffer);
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
    if (name == "parent") return makeBuffer(self, rows.parent, "q");
    if (name == "depth") return makeBuffer(self, rows.depth, "I");
    if (name == "offset") return makeBuffer(self, rows.offset, "Q");
    if (name == "size") return makeBuffer(self, rows.size, "Q");
    if (name == "id") return makeBuffer(self, rows.id, "H");
    if (name == "key") return makeBuffer(self, rows.key, "H");
    if (name == "kind") return makeBuffer(self, rows.kind, "B");
    if (name == "number") return makeBuffer(self, rows.number, rows.hasUpper ? "Q" : "q");
    if (name == "time") return makeBuffer(self, rows.time, "q");
    // clang-format on
    raise(PyExc_KeyError, "there is no such column");
  });
}

/// The places of an array of objects, which holds None or nothing at each of them.
class Places
{
public:
  Places(PyObject* array, size_t count)
  {
    done(PyObject_GetBuffer(array, &view_, PyBUF_WRITABLE | PyBUF_FORMAT | PyBUF_C_CONTIGUOUS));
    const bool isRight = std::string_view(view_.format) == "O" &&
                         static_cast<size_t>(view_.len) == count * sizeof(PyObject*);
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

Ref numberAt(const Rows& rows, size_t row)
{
  switch (rows.kind[row])
  {
  case Kind::number:
  {
    const bool isSigned = tav::detail::isIntegerType(rows.type[row]) && (rows.type[row] - TAV_TYPE_UINT8) % 2 != 0;
    return isSigned ? made(PyLong_FromLongLong(static_cast<int64_t>(rows.number[row]))) : numberOf(rows.number[row]);
  }
  case Kind::wide:
    return made(valueOf(rows.rest(row)));
  default:
    return Ref(none());
  }
}

/// A value in the column of bytes: words are in this machine's order.
Ref bytesAt(const Rows& rows, size_t row)
{
  const tav::detail::RawValue raw = rows.rest(row);
  if (raw.type == TAV_TYPE_UINT64_ARRAY)
  {
    return made(PyBytes_FromObject(made(valueOf(raw)).get()));
  }
  return made(PyBytes_FromStringAndSize(reinterpret_cast<const char*>(raw.bytes), static_cast<Py_ssize_t>(raw.size)));
}

void fillNames(const Rows& rows, Places& places, bool types)
{
  for (size_t row = 0; row < rows.count(); ++row)
  {
    places.put(row, Py_NewRef(types ? typeNameOf(rows.type[row]) : tagOf(rows.id[row])));
  }
}

PyObject* fillObjects(PyObject* self, PyObject* arguments)
{
  return guarded([&] {
    PyObject* name = nullptr;
    PyObject* array = nullptr;
    done(PyArg_ParseTuple(arguments, "UO", &name, &array) - 1);
    const Rows& rows = rowsOf(self);
    const std::string wanted = bytesOfText(name);
    Places places(array, rows.count());
    if (wanted == "tag" || wanted == "type")
    {
      fillNames(rows, places, wanted == "type");
    }
    else if (wanted == "text")
    {
      for (const size_t row : rows.texts)
      {
        places.put(row, made(valueOf(rows.rest(row))).release());
      }
    }
    else if (wanted == "bytes")
    {
      for (const size_t row : rows.bytes)
      {
        places.put(row, bytesAt(rows, row).release());
      }
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
  return PyLong_FromSize_t(rowsOf(self).count());
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
