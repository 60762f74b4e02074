// tav.Table: rows of nodes, with columns by paths.
#include <algorithm>
#include <cstdlib>
#include <deque>
#include <memory>
#include <new>

#include "python/src/job.h"
#include "python/src/places.h"
#include "python/src/reader.h"
#include "tav/inspect/arrow.hpp"
#include "tav/inspect/plan.hpp"
#include "tav/inspect/problem.hpp"
#include "tav/inspect/table.hpp"

namespace tav::python
{

namespace
{

using inspect::Cell;
using inspect::CellKind;

PyTypeObject* tableType = nullptr;

struct TableObject
{
  PyObject_HEAD
      std::unique_ptr<inspect::Table>
          table;
  std::deque<std::vector<uint8_t>> parts; ///< buffers that were handed out
};

TableObject& objectOf(PyObject* self)
{
  return *reinterpret_cast<TableObject*>(self);
}

const inspect::Table& tableOf(PyObject* self)
{
  return *objectOf(self).table;
}

inspect::TableQuery queryOf(PyObject* each, PyObject* columns, PyObject* joiner, const inspect::Dictionary& names)
{
  const Ref items = made(PySequence_Fast(columns, "columns are pairs of name and path"));
  std::vector<inspect::TableColumn> wanted;
  for (Py_ssize_t i = 0; i < PySequence_Fast_GET_SIZE(items.get()); ++i)
  {
    PyObject* name = nullptr;
    PyObject* path = nullptr;
    done(PyArg_ParseTuple(PySequence_Fast_GET_ITEM(items.get(), i), "UU", &name, &path) - 1);
    wanted.push_back({bytesOfText(name), bytesOfText(path)});
  }
  std::optional<std::string> between;
  if (joiner != Py_None)
  {
    between = bytesOfText(joiner);
  }
  return {bytesOfText(each), std::move(wanted), std::move(between), names};
}

/// Reads rows until there are so many, or no more, with looks for interrupts in between.
void readRows(inspect::Table& out, inspect::TableReader& rows, uint64_t most, Pass& pass)
{
  while (out.rows() < most && rows.next(out, std::min(most - out.rows(), inspect::TableReader::kBatch)))
  {
    pass.look();
  }
  if (rows.stopped())
  {
    throw inspect::Error(*rows.stopped());
  }
}

inspect::TableOptions optionsOf(Opened& opened)
{
  inspect::TableOptions options{.onDamage = opened.onDamage};
  options.passedOver = [&opened](const inspect::PassedOver& passed) {
    opened.passedOver.emplace(std::pair(passed.offset, passed.rule), passed.length);
  };
  return options;
}

inspect::Part partOfNumbers(PyObject* numbers)
{
  const Ref items = made(PySequence_Fast(numbers, "the numbers of a part are expected"));
  std::vector<uint64_t> words;
  for (Py_ssize_t i = 0; i < PySequence_Fast_GET_SIZE(items.get()); ++i)
  {
    words.push_back(PyLong_AsUnsignedLongLong(PySequence_Fast_GET_ITEM(items.get(), i)));
    done(PyErr_Occurred() != nullptr ? -1 : 0);
  }
  return inspect::partOf(words);
}

Ref numbersOfPart(const inspect::Part& part)
{
  const std::vector<uint64_t> words = inspect::numbersOf(part);
  Ref tuple = made(PyTuple_New(static_cast<Py_ssize_t>(words.size())));
  for (size_t i = 0; i < words.size(); ++i)
  {
    PyTuple_SET_ITEM(tuple.get(), static_cast<Py_ssize_t>(i), numberOf(words[i]).release());
  }
  return tuple;
}

/// What `read_part` has given as a part's end.
inspect::PartEnd endOfNumbers(PyObject* end)
{
  PyObject* behind = nullptr;
  int leans = 0;
  unsigned long long shared = 0;
  done(PyArg_ParseTuple(end, "OpK", &behind, &leans, &shared) - 1);
  return {.behind = partOfNumbers(behind), .leans = leans != 0, .shared = static_cast<size_t>(shared)};
}

PyObject* makeTable(std::unique_ptr<inspect::Table> table)
{
  auto* const object = PyObject_New(TableObject, tableType);
  if (object == nullptr)
  {
    throw Raised{};
  }
  new (&object->table) std::unique_ptr<inspect::Table>(std::move(table));
  new (&object->parts) std::deque<std::vector<uint8_t>>();
  return reinterpret_cast<PyObject*>(object);
}

void deleteTable(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  std::destroy_at(&objectOf(self).table);
  std::destroy_at(&objectOf(self).parts);
  PyObject_Free(self);
  Py_DECREF(type);
}

Py_ssize_t length(PyObject* self)
{
  return static_cast<Py_ssize_t>(tableOf(self).rows());
}

const char* nameOf(CellKind kind)
{
  switch (kind)
  {
  case CellKind::unsigned64:
    return "uint64";
  case CellKind::signed64:
    return "int64";
  case CellKind::unsigned128:
    return "uint128";
  case CellKind::signed128:
    return "int128";
  case CellKind::time:
    return "time";
  case CellKind::bytes:
    return "bytes";
  default:
    return "text";
  }
}

PyObject* getColumns(PyObject* self, void*)
{
  return guarded([&] {
    const inspect::Table& table = tableOf(self);
    Ref dict = made(PyDict_New());
    for (size_t i = 0; i < table.columns().size(); ++i)
    {
      const Ref type = textOf(nameOf(table.type(i)));
      done(PyDict_SetItem(dict.get(), textOf(table.columns()[i].name).get(), type.get()));
    }
    return dict.release();
  });
}

size_t columnOf(const inspect::Table& table, PyObject* number)
{
  const size_t column = PyLong_AsSize_t(number);
  if (PyErr_Occurred() != nullptr || column >= table.columns().size())
  {
    PyErr_Clear();
    raise(PyExc_IndexError, "there is no such column");
  }
  return column;
}

/// A column of numbers or times as buffers: the values, and whether each is there.
PyObject* plainColumn(PyObject* self, PyObject* number)
{
  return guarded([&] {
    const inspect::Table& table = tableOf(self);
    const size_t column = columnOf(table, number);
    const size_t count = table.rows();
    const CellKind kind = table.type(column);
    auto& parts = objectOf(self).parts;
    std::vector<uint8_t>& values = parts.emplace_back(count * sizeof(uint64_t));
    std::vector<uint8_t>& valid = parts.emplace_back(count);
    const uint64_t missing = kind == CellKind::time ? uint64_t{1} << 63U : 0; // NumPy's NaT
    for (size_t row = 0; row < count; ++row)
    {
      const Cell cell = table.cell(column, row);
      const bool isThere = cell.kind != CellKind::missing;
      const uint64_t value = isThere ? cell.number : missing;
      valid[row] = isThere ? 1 : 0;
      std::memcpy(values.data() + row * sizeof value, &value, sizeof value);
    }
    const char* const format = kind == CellKind::unsigned64 ? "Q" : "q";
    const Ref valueBuffer = makeBuffer(self, values.data(), count, sizeof(uint64_t), format);
    const Ref validBuffer = makeBuffer(self, valid.data(), count, 1, "?");
    return made(PyTuple_Pack(2, valueBuffer.get(), validBuffer.get())).release();
  });
}

Ref longOf(const Cell& cell)
{
  const bool isSigned = cell.kind == CellKind::signed64 || cell.kind == CellKind::signed128;
  const bool isWide = cell.kind == CellKind::unsigned128 || cell.kind == CellKind::signed128;
  const uint64_t above = isSigned && (cell.number >> 63U) != 0 ? ~uint64_t{0} : 0;
  const auto words = tav::detail::joinHalves(isWide ? cell.high : above, cell.number);
  return made(_PyLong_FromByteArray(reinterpret_cast<const unsigned char*>(words.data()), sizeof words,
                                    kor::isLittleEndian ? 1 : 0, isSigned ? 1 : 0));
}

/// The kind that a column is to be read as.
CellKind kindOf(PyObject* name)
{
  const std::string wanted = bytesOfText(name);
  for (const CellKind kind : {CellKind::unsigned64, CellKind::signed64, CellKind::unsigned128, CellKind::signed128,
                              CellKind::time, CellKind::bytes})
  {
    if (wanted == nameOf(kind))
    {
      return kind;
    }
  }
  return CellKind::text;
}

/// A cell in a column of objects: of a column of texts each value is its text.
Ref objectAt(const Cell& cell, CellKind kind)
{
  if (cell.kind == CellKind::missing)
  {
    return Ref(none());
  }
  if (kind == CellKind::unsigned128 || kind == CellKind::signed128)
  {
    return longOf(cell);
  }
  if (kind == CellKind::bytes)
  {
    return made(PyBytes_FromStringAndSize(cell.text.data(), static_cast<Py_ssize_t>(cell.text.size())));
  }
  return cell.kind == CellKind::text ? textOf(cell.text) : textOf(inspect::cellText(cell));
}

PyObject* fillColumn(PyObject* self, PyObject* arguments)
{
  return guarded([&] {
    PyObject* number = nullptr;
    PyObject* array = nullptr;
    PyObject* type = nullptr;
    done(PyArg_ParseTuple(arguments, "OOU", &number, &array, &type) - 1);
    const inspect::Table& table = tableOf(self);
    const size_t column = columnOf(table, number);
    const CellKind kind = kindOf(type);
    Places places(array, table.rows());
    for (size_t row = 0; row < table.rows(); ++row)
    {
      places.put(row, objectAt(table.cell(column, row), kind).release());
    }
    return none();
  });
}

/// A structure of the interface in a capsule, which releases it where nobody has taken it over.
template<class Structure>
void releaseCapsule(PyObject* capsule)
{
  auto* const structure = static_cast<Structure*>(PyCapsule_GetPointer(capsule, PyCapsule_GetName(capsule)));
  if (structure->release != nullptr)
  {
    structure->release(structure);
  }
  delete structure;
}

template<class Structure>
Ref makeCapsule(std::unique_ptr<Structure> structure, const char* name)
{
  PyObject* const capsule = PyCapsule_New(structure.get(), name, releaseCapsule<Structure>);
  if (capsule == nullptr)
  {
    if (structure->release != nullptr)
    {
      structure->release(structure.get());
    }
    throw Raised{};
  }
  structure.release(); // the capsule's
  return Ref(capsule);
}

/// Both functions may be asked for a schema, which they need not follow.
void parseSchema(PyObject* arguments, PyObject* named)
{
  PyObject* schema = nullptr;
  static const char* const names[] = {"requested_schema", nullptr};
  done(PyArg_ParseTupleAndKeywords(arguments, named, "|O", keywords(names), &schema) - 1);
}

PyObject* arrowStream(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    parseSchema(arguments, named);
    auto stream = std::make_unique<ArrowArrayStream>();
    inspect::toArrow(tableOf(self), stream.get());
    return makeCapsule(std::move(stream), "arrow_array_stream").release();
  });
}

PyObject* arrowArray(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    parseSchema(arguments, named);
    const inspect::Table& table = tableOf(self);
    if (table.rows() == 0)
    {
      fail(TAV_RC_NOT_SUPPORTED, "a table without rows is a stream without arrays");
    }
    ArrowArrayStream stream{};
    inspect::toArrow(table, &stream, {.batchRows = table.rows()});
    const std::unique_ptr<ArrowArrayStream, void (*)(ArrowArrayStream*)> owned(
        &stream, [](ArrowArrayStream* of) { of->release(of); });
    auto schema = std::make_unique<ArrowSchema>();
    auto array = std::make_unique<ArrowArray>();
    if (stream.get_schema(&stream, schema.get()) != 0)
    {
      fail(TAV_RC_NO_MEMORY, stream.get_last_error(&stream));
    }
    const Ref schemaCapsule = makeCapsule(std::move(schema), "arrow_schema");
    if (stream.get_next(&stream, array.get()) != 0)
    {
      fail(TAV_RC_NO_MEMORY, stream.get_last_error(&stream));
    }
    const bool isWhole = static_cast<uint64_t>(array->length) == table.rows();
    const Ref arrayCapsule = makeCapsule(std::move(array), "arrow_array");
    if (!isWhole)
    {
      fail(TAV_RC_DATA_TOO_LARGE, "the table does not fit one array: __arrow_c_stream__ gives several");
    }
    return made(PyTuple_Pack(2, schemaCapsule.get(), arrayCapsule.get())).release();
  });
}

/// `function(self)` in tav._table.
template<int Which>
PyObject* convert(PyObject* self, PyObject*)
{
  static constexpr const char* functions[] = {"to_numpy", "to_pandas"};
  return guarded([&] {
    const Ref module = made(PyImport_ImportModule("tav._table"));
    const Ref function = made(PyObject_GetAttrString(module.get(), functions[Which]));
    return made(PyObject_CallOneArg(function.get(), self)).release();
  });
}

PyObject* represent(PyObject* self)
{
  const inspect::Table& table = tableOf(self);
  return PyUnicode_FromFormat("<tav.Table of %llu rows, %zu columns>", static_cast<unsigned long long>(table.rows()),
                              table.columns().size());
}

PyGetSetDef attributes[] = {
    {"columns", getColumns, nullptr,
     "The columns' types by their names: 'uint64', 'int64', 'uint128', 'int128', 'time', 'text', 'bytes'", nullptr},
    {}};

PyMethodDef methods[] = {
    {"to_numpy", convert<0>, METH_NOARGS,
     "to_numpy($self, /)\n--\n\n"
     "A dict of arrays. Whole numbers are uint64 or int64, masked arrays where a value is missing, and int objects\n"
     "beyond 64 bits; times are datetime64[ns] with NaT; texts and bytes are objects, None where they are missing."},
    {"to_pandas", convert<1>, METH_NOARGS,
     "to_pandas($self, /)\n--\n\n"
     "A pandas.DataFrame. Whole numbers are UInt64 or Int64, which can be missing, never floats; beyond 64 bits\n"
     "objects; times are datetime64[ns, UTC]."},
    {"__arrow_c_stream__", asFunction(arrowStream), METH_VARARGS | METH_KEYWORDS,
     "__arrow_c_stream__($self, /, requested_schema=None)\n--\n\nThe table by the Arrow C stream interface."},
    {"__arrow_c_array__", asFunction(arrowArray), METH_VARARGS | METH_KEYWORDS,
     "__arrow_c_array__($self, /, requested_schema=None)\n--\n\nThe table as one array, with its schema."},
    {"_plain", plainColumn, METH_O, nullptr},
    {"_fill", fillColumn, METH_VARARGS, nullptr},
    {}};

PyType_Slot slots[] = {
    {Py_tp_dealloc, asSlot(deleteTable)},
    {Py_tp_getset, attributes},
    {Py_tp_methods, methods},
    {Py_tp_repr, asSlot(represent)},
    {Py_sq_length, asSlot(length)},
    {Py_tp_doc, const_cast<char*>("Rows for nodes that a path leads to, with columns by paths from there.")},
    {0, nullptr}};

PyType_Spec spec = {"tav.Table", sizeof(TableObject), 0,
                    Py_TPFLAGS_DEFAULT | Py_TPFLAGS_DISALLOW_INSTANTIATION | Py_TPFLAGS_IMMUTABLETYPE, slots};

} // namespace

PyObject* readTable(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* readers = nullptr;
    PyObject* each = nullptr;
    PyObject* columns = nullptr;
    PyObject* joiner = nullptr;
    PyObject* progress = nullptr;
    unsigned long long most = 0;
    PyObject* dictionary = nullptr;
    done(PyArg_ParseTuple(arguments, "OUOOOKO", &readers, &each, &columns, &joiner, &progress, &most, &dictionary) - 1);
    PyObject* const told = progressOf(progress);
    const inspect::TableQuery query = queryOf(each, columns, joiner, dictionaryOf(dictionary));
    auto table = std::make_unique<inspect::Table>(query);
    const Ref walk = made(PyObject_GetIter(readers));
    while (table->rows() < most)
    {
      const Ref item(PyIter_Next(walk.get()));
      if (!item)
      {
        break;
      }
      ReaderObject& reader = readerObjectOf(item.get());
      Opened& opened = useDocument(reader);
      Searching searching(reader, told);
      const auto source = opened.input.source();
      inspect::TableReader rows(*source, opened.document.form(), query, optionsOf(opened));
      readRows(*table, rows, most, searching.pass());
    }
    done(PyErr_Occurred() != nullptr ? -1 : 0);
    return makeTable(std::move(table));
  });
}

PyObject* readPart(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* object = nullptr;
    PyObject* numbers = nullptr;
    PyObject* each = nullptr;
    PyObject* columns = nullptr;
    PyObject* joiner = nullptr;
    PyObject* progress = nullptr;
    done(PyArg_ParseTuple(arguments, "OOUOOO", &object, &numbers, &each, &columns, &joiner, &progress) - 1);
    PyObject* const told = progressOf(progress);
    const inspect::TableQuery query =
        queryOf(each, columns, joiner, use(readerObjectOf(object)).input.dictionary);
    const inspect::Part part = partOfNumbers(numbers);
    auto table = std::make_unique<inspect::Table>(query);
    inspect::PartEnd end;
    {
      ReaderObject& reader = readerObjectOf(object);
      Opened& opened = useDocument(reader);
      Searching searching(reader, told);
      const auto source = opened.input.source();
      inspect::TableReader rows(*source, query, part, optionsOf(opened));
      readRows(*table, rows, ~uint64_t{0}, searching.pass());
      end = rows.end();
    }
    const Ref made = Ref(makeTable(std::move(table)));
    return tav::python::made(Py_BuildValue("(O(NOK))", made.get(), numbersOfPart(end.behind).release(),
                                           end.leans ? Py_True : Py_False,
                                           static_cast<unsigned long long>(end.shared)))
        .release();
  });
}

PyObject* plan(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* what = nullptr;
    PyObject* form = nullptr;
    unsigned long long size = 0;
    PyObject* each = nullptr;
    PyObject* columns = nullptr;
    PyObject* joiner = nullptr;
    done(PyArg_ParseTuple(arguments, "OOKOOO", &what, &form, &size, &each, &columns, &joiner) - 1);
    const Job job(what, form);
    const inspect::Form& found = job.form();
    const inspect::PlanOptions options{
        .targetBytes = size,
        .form = {.swapped = found.swapped, .root64 = found.root64, .aligned = found.aligned}};
    const auto query = each == Py_None ? std::nullopt : std::optional(queryOf(each, columns, joiner, job.dictionary()));
    std::vector<inspect::Part> parts;
    {
      const Pass pass(nullptr, 0);
      parts = query ? inspect::planTable(*job.source, *query, options) : inspect::plan(*job.source, options);
    }
    Ref list = made(PyList_New(0));
    for (const inspect::Part& part : parts)
    {
      done(PyList_Append(list.get(), numbersOfPart(part).get()));
    }
    return list.release();
  });
}

PyObject* behindOf(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* part = nullptr;
    PyObject* end = nullptr;
    done(PyArg_ParseTuple(arguments, "OO", &part, &end) - 1);
    return numbersOfPart(inspect::behindOf(partOfNumbers(part), endOfNumbers(end))).release();
  });
}

PyObject* holdsBehind(PyObject*, PyObject* arguments)
{
  return guarded([&] {
    PyObject* behind = nullptr;
    PyObject* part = nullptr;
    PyObject* end = nullptr; // None: it was not reached
    done(PyArg_ParseTuple(arguments, "OOO", &behind, &part, &end) - 1);
    const inspect::PartEnd reached = end == Py_None ? inspect::PartEnd{} : endOfNumbers(end);
    return PyBool_FromLong(inspect::holdsBehind(partOfNumbers(behind), partOfNumbers(part), reached) ? 1 : 0);
  });
}

void addTable(PyObject* module)
{
  tableType = makeType(module, spec, "Table");
}

} // namespace tav::python
