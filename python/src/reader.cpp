// tav.Reader: a file or bytes in which nodes are looked for.
#include "python/src/reader.h"

#include "python/src/results.h"
#include "tav/inspect/rules.hpp"

namespace tav::python
{

namespace
{

using inspect::OnDamage;

PyTypeObject* readerType = nullptr;

ReaderObject& readerOf(PyObject* self)
{
  return *reinterpret_cast<ReaderObject*>(self);
}

OnDamage onDamageOf(PyObject* argument)
{
  const std::string word = argument != nullptr ? bytesOfText(argument) : "stop";
  if (word != "stop" && word != "skip")
  {
    raise(PyExc_ValueError, "on_damage is 'stop' or 'skip'");
  }
  return word == "skip" ? OnDamage::skip : OnDamage::stop;
}

PyObject* makeReader(PyTypeObject* type, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    PyObject* source = nullptr;
    PyObject* byteOrder = nullptr;
    PyObject* root = nullptr;
    PyObject* align = nullptr;
    PyObject* onDamage = nullptr;
    PyObject* dictionary = nullptr;
    static const char* const names[] = {"source", "byte_order", "root", "align", "on_damage", "dictionary", nullptr};
    done(PyArg_ParseTupleAndKeywords(arguments, named, "O|$OOOUO:Reader", keywords(names), &source, &byteOrder, &root,
                                     &align, &onDamage, &dictionary) -
         1);
    auto opened =
        std::make_shared<Opened>(openInput(source, dictionary), choiceOf(byteOrder, root, align), onDamageOf(onDamage));
    Ref self = made(type->tp_alloc(type, 0));
    new (&readerOf(self.get()).opened) std::shared_ptr<Opened>(std::move(opened));
    return self.release();
  });
}

void deleteReader(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  std::destroy_at(&readerOf(self).opened);
  type->tp_free(self);
  Py_DECREF(type);
}

PyObject* close(PyObject* self, PyObject*)
{
  return guarded([&] {
    ReaderObject& reader = readerOf(self);
    if (reader.opened != nullptr)
    {
      useDocument(reader);
      const std::shared_ptr<Opened> last = std::move(reader.opened); // what goes with it may look at the reader
    }
    return none();
  });
}

PyObject* enter(PyObject* self, PyObject*)
{
  return guarded([&] {
    use(readerOf(self));
    return Py_NewRef(self);
  });
}

PyObject* leave(PyObject* self, PyObject*)
{
  return close(self, nullptr);
}

PyObject* isClosed(PyObject* self, void*)
{
  return PyBool_FromLong(readerOf(self).opened == nullptr ? 1 : 0);
}

PyObject* iterate(PyObject* self)
{
  return guarded([&] { return walkFound(readerOf(self), nullptr, "/", nullptr, nullptr); });
}

Py_ssize_t length(PyObject* self)
{
  const Ref walk(iterate(self));
  Py_ssize_t count = 0;
  while (walk)
  {
    const Ref root(PyIter_Next(walk.get()));
    if (!root)
    {
      return PyErr_Occurred() != nullptr ? -1 : count;
    }
    ++count;
  }
  return -1;
}

int isThere(PyObject*)
{
  return 1;
}

struct PathArguments
{
  PathArguments(PyObject* arguments, PyObject* named, const char* format)
  {
    static const char* const names[] = {"path", "progress", nullptr};
    PyObject* text = nullptr;
    PyObject* callable = nullptr;
    done(PyArg_ParseTupleAndKeywords(arguments, named, format, keywords(names), &text, &callable) - 1);
    path = bytesOfText(text);
    progress = progressOf(callable);
  }
  std::string path{};
  PyObject* progress = nullptr;
};

PyObject* find(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    const PathArguments given(arguments, named, "U|$O:find");
    return findFirst(readerOf(self), nullptr, given.path, given.progress);
  });
}

PyObject* findAll(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    const PathArguments given(arguments, named, "U|$O:findall");
    return walkFound(readerOf(self), nullptr, given.path, nullptr, given.progress);
  });
}

PyObject* load(PyObject* self, PyObject*)
{
  return guarded([&] { return loadRoots(readerOf(self)); });
}

PyObject* rawColumns(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    int withPaths = 0;
    PyObject* progress = nullptr;
    static const char* const names[] = {"path", "progress", nullptr};
    done(PyArg_ParseTupleAndKeywords(arguments, named, "|$pO:_columns", keywords(names), &withPaths, &progress) - 1);
    return columnsOf(readerOf(self), withPaths != 0, progressOf(progress));
  });
}

/// A method that is written in Python: `function(self, *arguments, **named)`.
PyObject* callHelper(const char* module, const char* function, PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    const Ref imported = made(PyImport_ImportModule(module));
    const Ref callable = made(PyObject_GetAttrString(imported.get(), function));
    const Ref first = made(PyTuple_Pack(1, self));
    const Ref all = made(PySequence_Concat(first.get(), arguments));
    return made(PyObject_Call(callable.get(), all.get(), named)).release();
  });
}

PyObject* columns(PyObject* self, PyObject* arguments, PyObject* named)
{
  return callHelper("tav._columns", "columns", self, arguments, named);
}

PyObject* table(PyObject* self, PyObject* arguments, PyObject* named)
{
  return callHelper("tav._table", "table", self, arguments, named);
}

PyObject* getDamage(PyObject* self, void*)
{
  return guarded([&] {
    const Opened& opened = useDocument(readerOf(self));
    auto all = opened.passedOver;
    for (const inspect::Damage& damage : opened.document.damage())
    {
      all.emplace(std::pair(damage.offset, damage.rule), damage.size);
    }
    Ref list = made(PyList_New(0));
    for (const auto& [place, size] : all)
    {
      const std::string rule(inspect::ruleOf(place.second).id);
      const Ref item = makeResult("Damage", made(Py_BuildValue("(KKs)", static_cast<unsigned long long>(place.first),
                                                               static_cast<unsigned long long>(size), rule.c_str())));
      done(PyList_Append(list.get(), item.get()));
    }
    return list.release();
  });
}

PyObject* getForm(PyObject* self, void*)
{
  return guarded([&] { return makeResult("Form", formTuple(use(readerOf(self)).document.form())).release(); });
}

PyObject* getName(PyObject* self, void*)
{
  return guarded([&] { return textOf(use(readerOf(self)).input.name).release(); });
}

PyObject* getBytes(PyObject* self, void*)
{
  return guarded([&] { return Py_NewRef(use(readerOf(self)).input.memory.get()); });
}

PyObject* represent(PyObject* self)
{
  return guarded([&] { return callPython("tav._html", "reader_repr", self); });
}

PyObject* representHtml(PyObject* self, PyObject*)
{
  return guarded([&] { return callPython("tav._html", "reader_html", self); });
}

PyObject* getDictionary(PyObject* self, void*)
{
  return guarded([&] {
    const inspect::Dictionary& dictionary = use(readerOf(self)).input.dictionary;
    return dictionary.isEmpty() ? none() : dictionaryObject(dictionary).release();
  });
}

PyGetSetDef attributes[] = {
    {"dictionary", getDictionary, nullptr, "Names of own elements: Dictionary, or None", nullptr},
    {"closed", isClosed, nullptr, "Whether it is closed: bool", nullptr},
    {"damage", getDamage, nullptr,
     "What walks have passed over so far: list of Damage(offset, size, rule), each place once, by offset", nullptr},
    {"form", getForm, nullptr, "How the first stream is read: Form(byte_order, root, align)", nullptr},
    {"name", getName, nullptr, "The path that it was opened by, or 'memory': str", nullptr},
    {"memory", getBytes, nullptr, "All bytes, without a copy: memoryview", nullptr},
    {}};

PyMethodDef methods[] = {
    {"find", asFunction(find), METH_VARARGS | METH_KEYWORDS,
     "find($self, /, path, *, progress=None)\n--\n\n"
     "The first node that a path leads to, or None. TavError for a text that is no path, and at damage on the way\n"
     "unless on_damage='skip'. Other threads run meanwhile. progress(done, total) is called with bytes."},
    {"findall", asFunction(findAll), METH_VARARGS | METH_KEYWORDS,
     "findall($self, /, path, *, progress=None)\n--\n\n"
     "An iterator over all nodes that a path leads to, in stream order. It looks for some of them ahead."},
    {"load", load, METH_NOARGS,
     "load($self, /)\n--\n\n"
     "The whole stream as {root's tag: {...}}: a dict for a group, a list where a tag repeats, '#60103' for an id\n"
     "without a tag. Several roots: a list of these."},
    {"columns", asFunction(columns), METH_VARARGS | METH_KEYWORDS,
     "columns($self, /, *, path=False, progress=None)\n--\n\n"
     "A row for each node, in one pass: a dict of NumPy arrays of one length, named and ordered as in SQL.\n\n"
     "ord, parent (the parent's ord, -1 for a root), depth, offset, size, id, tag, type, key, number, text, time\n"
     "(datetime64[ns]), bytes; with path=True path, which costs more than all the others. Behind each of parent,\n"
     "number, text, time and bytes is a bool array 'parent_valid', 'number_valid' and so on: where it is False\n"
     "the row has no such value. number is int64, or uint64 or object (int) where a value needs it; never a float."},
    {"table", asFunction(table), METH_VARARGS | METH_KEYWORDS,
     "table($self, /, each, columns, *, join=None, part=None, progress=None)\n--\n\n"
     "A row for each node that the path `each` leads to, in one pass: Table. columns: {name: path from there}; the\n"
     "first value where a path leads to several, or all of them with the text `join` between them. part: of tav.plan;\n"
     "only the rows that begin in it."},
    {"_columns", asFunction(rawColumns), METH_VARARGS | METH_KEYWORDS, nullptr},
    {"close", close, METH_NOARGS,
     "close($self, /)\n--\n\nLets go of the file. Nodes and walks raise TavError from now on; payloads live on."},
    {"__enter__", enter, METH_NOARGS, nullptr},
    {"__exit__", leave, METH_VARARGS, nullptr},
    {"_repr_html_", representHtml, METH_NOARGS, "_repr_html_($self, /)\n--\n\nA tree that unfolds, for notebooks."},
    {}};

PyType_Slot slots[] = {
    {Py_tp_new, asSlot(makeReader)},
    {Py_tp_dealloc, asSlot(deleteReader)},
    {Py_tp_getset, attributes},
    {Py_tp_methods, methods},
    {Py_tp_iter, asSlot(iterate)},
    {Py_tp_repr, asSlot(represent)},
    {Py_sq_length, asSlot(length)},
    {Py_nb_bool, asSlot(isThere)},
    {Py_tp_doc,
     const_cast<char*>(
         "Reader(source, *, byte_order=None, root=None, align=None, on_damage='stop',\n"
         "       dictionary=None)\n--\n\n"
         "A file or bytes with one stream or several, whose form nobody has to tell. Iterating gives the roots.\n\n"
         "source: a path (str, os.PathLike), or an object with a buffer, which stays as it is while the reader is\n"
         "open\n"
         "byte_order: 'little' or 'big'; root: 32 or 64, bits of the first header; align: whether payloads are padded\n"
         "to 8 bytes: what is given is not found out\n"
         "on_damage: 'stop' raises TavError at damage; 'skip' goes on behind it, and `damage` tells what was passed\n"
         "over\n"
         "dictionary: names of own elements: a Dictionary, or the path of its file\n\n"
         "A file is mapped: opening costs nothing by its size, and it must not become shorter meanwhile.\n"
         "A reader belongs to one thread at a time: a search while another one runs raises TavError. Different\n"
         "readers of one file are independent.")},
    {0, nullptr}};

PyType_Spec spec = {"tav.Reader", sizeof(ReaderObject), 0, Py_TPFLAGS_DEFAULT | Py_TPFLAGS_IMMUTABLETYPE, slots};

} // namespace

inspect::DocumentOptions documentOptions(const inspect::FormChoice& form, const inspect::Dictionary& dictionary)
{
  inspect::DocumentOptions options;
  options.form = form;
  options.dictionary = dictionary;
  return options;
}

Opened::Opened(Input given, const inspect::FormChoice& choice, OnDamage atDamage)
    : input(std::move(given)), bytes(input.bytes()), onDamage(atDamage),
      document(input.source(), documentOptions(choice, input.dictionary))
{
  document.tellProgress([this](uint64_t offset) {
    if (pass != nullptr)
    {
      pass->at(offset);
    }
  });
}

StreamOptions layerOptions(bool swapped, bool aligned)
{
  StreamOptions options;
  options.byteOrder = swapped ? ByteOrder::swapped : ByteOrder::native;
  options.align8 = aligned;
  return options;
}

const tav::Reader& Opened::readerOf(bool swapped, bool aligned)
{
  auto& reader = readers_[(swapped ? 1U : 0U) + (aligned ? 2U : 0U)];
  if (reader == nullptr)
  {
    reader = std::make_unique<tav::Reader>(std::as_bytes(bytes), layerOptions(swapped, aligned));
  }
  return *reader;
}

Opened& use(const ReaderObject& reader)
{
  if (reader.opened == nullptr)
  {
    fail(TAV_RC_BAD_PARAM, "the reader is closed");
  }
  return *reader.opened;
}

Opened& useDocument(const ReaderObject& reader)
{
  Opened& opened = use(reader);
  if (reader.busy)
  {
    fail(TAV_RC_BAD_PARAM, "the reader is searching: each thread needs a reader of its own");
  }
  return opened;
}

ReaderObject& readerObjectOf(PyObject* object)
{
  if (Py_TYPE(object) != readerType)
  {
    raise(PyExc_TypeError, "a reader is expected");
  }
  return readerOf(object);
}

void addReader(PyObject* module)
{
  readerType = makeType(module, spec, "Reader");
}

} // namespace tav::python
