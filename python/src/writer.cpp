// tav.Writer and its groups.
#include <memory>
#include <optional>

#include "python/src/input.h"
#include "python/src/names.h"
#include "python/src/pass.h"
#include "python/src/reader.h"
#include "python/src/values.h"
#include "tav/tav.hpp"

namespace tav::python
{

namespace
{

PyTypeObject* groupType = nullptr;

struct WriterObject
{
  PyObject_HEAD
      std::unique_ptr<tav::Writer>
          writer; ///< null: discarded
  inspect::Dictionary dictionary;
  bool isFile;
  bool isFinished;
  bool busy; ///< a thread waits for the system without the interpreter
};

/// An open group. It keeps the groups around it, which would close themselves.
struct GroupObject
{
  PyObject_HEAD
      WriterObject* writer;
  GroupObject* outer; ///< null: the root
  std::optional<tav::Group> group;
};

WriterObject& writerOf(PyObject* self)
{
  return *reinterpret_cast<WriterObject*>(self);
}

GroupObject& groupOf(PyObject* self)
{
  return *reinterpret_cast<GroupObject*>(self);
}

tav::Writer& use(const WriterObject& writer)
{
  if (writer.busy)
  {
    fail(TAV_RC_BAD_PARAM, "the writer is in use by another thread");
  }
  if (writer.writer == nullptr)
  {
    fail(TAV_RC_BAD_PARAM, "the writer was discarded");
  }
  return *writer.writer;
}

tav::Group& use(const GroupObject& group)
{
  use(*group.writer);
  return const_cast<tav::Group&>(*group.group); // a group of Python is a handle of one
}

/// Waits for the system while other threads run.
template<class Work>
void waitFor(WriterObject& object, Work&& work)
{
  tav::Writer& writer = use(object);
  struct Waiting
  {
    explicit Waiting(WriterObject& waits)
        : waiting(waits) { waiting.busy = true; }
    Waiting(const Waiting&) = delete;
    Waiting& operator=(const Waiting&) = delete;
    ~Waiting() { waiting.busy = false; }
    WriterObject& waiting;
  };
  const Waiting waiting(object);
  const Pass pass(nullptr, 0);
  work(writer);
}

StreamOptions streamOptions(const inspect::FormChoice& choice)
{
  StreamOptions options;
  options.byteOrder = choice.swapped.value_or(false) ? ByteOrder::swapped : ByteOrder::native;
  options.root = choice.root64.value_or(true) ? Width::bits64 : Width::bits32;
  options.align8 = choice.aligned.value_or(false);
  return options;
}

OpenRoot openRootOf(PyObject* argument)
{
  const std::string word = argument != nullptr ? bytesOfText(argument) : "close";
  if (word != "close" && word != "refuse")
  {
    raise(PyExc_ValueError, "open_root is 'close' or 'refuse'");
  }
  return word == "refuse" ? OpenRoot::refuse : OpenRoot::close;
}

std::unique_ptr<tav::Writer> openWriter(PyObject* path, const FileOptions& file, const inspect::FormChoice& choice)
{
  const StreamOptions options = streamOptions(choice);
  if (path == nullptr || path == Py_None)
  {
    if (file.append || file.overwrite)
    {
      raise(PyExc_ValueError, "append and overwrite are for files: a path is missing");
    }
    return std::make_unique<tav::Writer>(options);
  }
  const std::string name = pathOfFile(path);
  const bool isGiven = choice.swapped || choice.root64 || choice.aligned;
  const Pass pass(nullptr, 0);
  return file.append && !isGiven ? std::make_unique<tav::Writer>(name, file)
                                 : std::make_unique<tav::Writer>(name, file, options);
}

PyObject* makeWriter(PyTypeObject* type, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    PyObject* path = nullptr;
    PyObject* byteOrder = nullptr;
    PyObject* root = nullptr;
    PyObject* align = nullptr;
    PyObject* openRoot = nullptr;
    PyObject* dictionary = nullptr;
    int append = 0;
    int overwrite = 0;
    static const char* const names[] = {"path", "append", "overwrite", "byte_order", "root",
                                        "align", "open_root", "dictionary", nullptr};
    done(PyArg_ParseTupleAndKeywords(arguments, named, "|O$ppOOOUO:Writer", keywords(names), &path, &append, &overwrite,
                                     &byteOrder, &root, &align, &openRoot, &dictionary) -
         1);
    inspect::Dictionary own = dictionaryOf(dictionary);
    if (append != 0 && overwrite != 0)
    {
      raise(PyExc_ValueError, "a file is either gone on with or overwritten");
    }
    const FileOptions file{
        .overwrite = overwrite != 0, .append = append != 0, .openRoot = openRootOf(openRoot)};
    auto writer = openWriter(path, file, choiceOf(byteOrder, root, align));
    Ref self = made(type->tp_alloc(type, 0));
    WriterObject& object = writerOf(self.get());
    new (&object.writer) std::unique_ptr<tav::Writer>(std::move(writer));
    new (&object.dictionary) inspect::Dictionary(std::move(own));
    object.isFile = path != nullptr && path != Py_None;
    return self.release();
  });
}

void deleteWriter(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  std::destroy_at(&writerOf(self).writer);
  std::destroy_at(&writerOf(self).dictionary);
  type->tp_free(self);
  Py_DECREF(type);
}

struct GroupArguments
{
  GroupArguments(PyObject* arguments, PyObject* named, const inspect::Dictionary& dictionary)
  {
    PyObject* name = nullptr;
    int children = 64;
    int eyeSize = 0;
    unsigned key = 0;
    unsigned info = 0;
    static const char* const names[] = {"name", "children", "eye_size", "key", "info", nullptr};
    done(PyArg_ParseTupleAndKeywords(arguments, named, "O|$ipII:group", keywords(names), &name, &children, &eyeSize,
                                     &key, &info) -
         1);
    if (children != 32 && children != 64)
    {
      raise(PyExc_ValueError, "children is 32 or 64, the bits of their headers");
    }
    elm = idOf(name, dictionary);
    options.children = children == 32 ? Width::bits32 : Width::bits64;
    options.eyeSize = eyeSize != 0;
    options.info = info;
    options.infoKey = static_cast<uint16_t>(std::min(key, 0xFFFFU)); // what does not fit 11 bits is refused
  }
  uint16_t elm = 0;
  GroupOptions options{};
};

PyObject* makeGroup(WriterObject& writer, GroupObject* outer, tav::Group&& group)
{
  auto* const object = PyObject_New(GroupObject, groupType);
  if (object == nullptr)
  {
    throw Raised{};
  }
  Py_INCREF(&writer);
  Py_XINCREF(outer);
  object->writer = &writer;
  object->outer = outer;
  new (&object->group) std::optional<tav::Group>(std::move(group));
  return reinterpret_cast<PyObject*>(object);
}

PyObject* openRootGroup(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    WriterObject& writer = writerOf(self);
    tav::Writer& open = use(writer);
    const GroupArguments given(arguments, named, writer.dictionary);
    return makeGroup(writer, nullptr, open.group(given.elm, given.options));
  });
}

PyObject* flush(PyObject* self, PyObject*)
{
  return guarded([&] {
    waitFor(writerOf(self), [](tav::Writer& writer) { writer.flush(); });
    return none();
  });
}

PyObject* sync(PyObject* self, PyObject*)
{
  return guarded([&] {
    waitFor(writerOf(self), [](tav::Writer& writer) { writer.sync(); });
    return none();
  });
}

PyObject* finish(PyObject* self, PyObject*)
{
  return guarded([&] {
    waitFor(writerOf(self), [](tav::Writer& writer) { writer.finish(); });
    writerOf(self).isFinished = true;
    return none();
  });
}

PyObject* discard(PyObject* self, PyObject*)
{
  return guarded([&] {
    WriterObject& object = writerOf(self);
    if (object.writer != nullptr && !object.isFinished)
    {
      use(object);
      object.writer.reset();
    }
    return none();
  });
}

PyObject* copyBytes(PyObject* self, PyObject*)
{
  return guarded([&] {
    const WriterObject& object = writerOf(self);
    const tav::Writer& writer = use(object);
    if (object.isFile)
    {
      fail(TAV_RC_NOT_SUPPORTED, "the stream is in a file");
    }
    const auto bytes = writer.bytes();
    return made(PyBytes_FromStringAndSize(reinterpret_cast<const char*>(bytes.data()),
                                          static_cast<Py_ssize_t>(bytes.size())))
        .release();
  });
}

PyObject* getSize(PyObject* self, void*)
{
  return guarded([&] { return numberOf(use(writerOf(self)).size()).release(); });
}

PyObject* itself(PyObject* self, PyObject*)
{
  return Py_NewRef(self);
}

/// An exception leaves a file that is overwritten as it is, and any other one with what was written.
PyObject* leaveWriter(PyObject* self, PyObject* arguments)
{
  const bool isSound = PyTuple_GET_SIZE(arguments) == 0 || PyTuple_GET_ITEM(arguments, 0) == Py_None;
  return isSound ? finish(self, nullptr) : discard(self, nullptr);
}

void deleteGroup(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  GroupObject& group = groupOf(self);
  std::destroy_at(&group.group);
  GroupObject* const outer = group.outer;
  Py_DECREF(group.writer);
  PyObject_Free(self);
  Py_DECREF(type);
  releaseChain(outer, &GroupObject::outer);
}

PyObject* openGroup(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    GroupObject& outer = groupOf(self);
    tav::Group& group = use(outer);
    const GroupArguments given(arguments, named, outer.writer->dictionary);
    return makeGroup(*outer.writer, &outer, group.group(given.elm, given.options));
  });
}

struct AddArguments
{
  PyObject* type = nullptr;
  NodeOptions options{};
};

AddArguments addArguments(PyObject* const* values, PyObject* names)
{
  AddArguments given;
  for (Py_ssize_t i = 0; names != nullptr && i < PyTuple_GET_SIZE(names); ++i)
  {
    PyObject* const name = PyTuple_GET_ITEM(names, i);
    PyObject* const value = values[i];
    const auto isCalled = [name](const char* text) { return PyUnicode_CompareWithASCIIString(name, text) == 0; };
    const auto number = [value] {
      const unsigned long result = PyLong_AsUnsignedLong(value);
      if (PyErr_Occurred() != nullptr)
      {
        throw Raised{};
      }
      return result;
    };
    if (isCalled("type"))
    {
      given.type = value;
    }
    else if (isCalled("eye_size"))
    {
      given.options.eyeSize = done(PyObject_IsTrue(value)) != 0;
    }
    else if (isCalled("key"))
    {
      given.options.infoKey = static_cast<uint16_t>(std::min(number(), 0xFFFFUL));
    }
    else if (isCalled("info"))
    {
      given.options.info = static_cast<uint32_t>(number());
    }
    else
    {
      PyErr_Format(PyExc_TypeError, "add() got an unexpected keyword argument '%U'", name);
      throw Raised{};
    }
  }
  return given;
}

PyObject* add(PyObject* self, PyObject* const* values, Py_ssize_t count, PyObject* names)
{
  return guarded([&] {
    tav::Group& group = use(groupOf(self));
    if (count != 2)
    {
      raise(PyExc_TypeError, "add() takes a name and a value");
    }
    const AddArguments given = addArguments(values + count, names);
    const uint16_t elm = idOf(values[0], groupOf(self).writer->dictionary);
    const Encoded encoded = encode(values[1], given.type);
    group.addRaw(encoded.type, elm, std::as_bytes(std::span(encoded.bytes)), given.options);
    return none();
  });
}

PyObject* closeGroup(PyObject* self, PyObject*)
{
  return guarded([&] {
    use(groupOf(self)).close();
    return none();
  });
}

PyObject* abandonGroup(PyObject* self, PyObject*)
{
  return guarded([&] {
    use(groupOf(self)).abandon();
    return none();
  });
}

/// One that was closed or abandoned inside is left as it is.
PyObject* leaveGroup(PyObject* self, PyObject*)
{
  return guarded([&] {
    const GroupObject& object = groupOf(self);
    if (object.writer->writer != nullptr && object.group->isOpen())
    {
      use(object).close();
    }
    return none();
  });
}

PyObject* isOpen(PyObject* self, void*)
{
  const GroupObject& object = groupOf(self);
  return PyBool_FromLong(object.writer->writer != nullptr && object.group->isOpen() ? 1 : 0);
}

constexpr const char* kGroupDoc =
    "group($self, /, name, *, children=64, eye_size=False, key=0, info=0)\n--\n\n"
    "Opens a group: `with w.group('system') as g:` closes it at the end, whatever happens in it.\n\n"
    "name: a tag, a constant, '#60103' or an id; children: bits of their headers, 32 or 64\n"
    "eye_size: it ends with an element by which it is found from behind; key: 11 bits to search by";

PyGetSetDef writerAttributes[] = {{"size", getSize, nullptr, "Bytes of the stream so far: int", nullptr}, {}};

PyMethodDef writerMethods[] = {
    {"group", asFunction(openRootGroup), METH_VARARGS | METH_KEYWORDS, kGroupDoc},
    {"flush", flush, METH_NOARGS,
     "flush($self, /)\n--\n\nReturns when the system has all that was added: it outlives this process."},
    {"sync", sync, METH_NOARGS, "sync($self, /)\n--\n\nReturns when the device has all that was added."},
    {"finish", finish, METH_NOARGS,
     "finish($self, /)\n--\n\nEnds the stream, and closes the file; one that is overwritten takes its place now."},
    {"discard", discard, METH_NOARGS,
     "discard($self, /)\n--\n\nDrops the writer unfinished. What is in a file stays; one that was to be\n"
     "overwritten is as it was."},
    {"bytes", copyBytes, METH_NOARGS, "bytes($self, /)\n--\n\nThe stream so far, of one in memory."},
    {"__enter__", itself, METH_NOARGS, nullptr},
    {"__exit__", leaveWriter, METH_VARARGS, nullptr},
    {}};

PyType_Slot writerSlots[] = {
    {Py_tp_new, asSlot(makeWriter)},
    {Py_tp_dealloc, asSlot(deleteWriter)},
    {Py_tp_getset, writerAttributes},
    {Py_tp_methods, writerMethods},
    {Py_tp_doc,
     const_cast<char*>(
         "Writer(path=None, *, append=False, overwrite=False, byte_order=None, root=None, align=None,\n"
         "       open_root='close', dictionary=None)\n--\n\n"
         "Writes a stream into a file, or into memory where there is no path: see bytes().\n\n"
         "append: goes on behind the last stream of a file, in its form; overwrite: replaces a file, which stays\n"
         "as it is until finish(). Else a file that is there is refused.\n"
         "byte_order: 'little' or 'big', this machine's by default; root: 32 or 64; align: pad payloads to 8 bytes\n"
         "open_root: with append, a root that was never closed is closed, or refused\n"
         "dictionary: names of own elements: a Dictionary, or the path of its file\n\n"
         "As a context manager it finishes at the end, and is discarded where an exception comes through.")},
    {0, nullptr}};

PyGetSetDef groupAttributes[] = {
    {"is_open", isOpen, nullptr, "Whether nodes can still be added: bool", nullptr}, {}};

PyMethodDef groupMethods[] = {
    {"add", asFunction(add), METH_FASTCALL | METH_KEYWORDS,
     "add($self, name, value, /, *, type=None, eye_size=False, key=0, info=0)\n--\n\n"
     "Appends a value.\n\n"
     "A str is an ASCII String where it is ASCII, else a UTF8 String; an int the first of Uint32, Uint64 and Uint128\n"
     "(Sint32, Sint64, Sint128) that holds it; a bool is a Uint8; a datetime with a zone a UTC Timestamp; bytes are\n"
     "Binary; a list of ints, and an array of unsigned 64-bit numbers, is a Uint64 array. `type` says another: a name\n"
     "as `tav json` has it, or a number; then bytes are the payload as it is, in this machine's order, and an int is\n"
     "a timestamp's nanoseconds since 1970."},
    {"group", asFunction(openGroup), METH_VARARGS | METH_KEYWORDS, kGroupDoc},
    {"close", closeGroup, METH_NOARGS, "close($self, /)\n--\n\nCloses the group, which takes nothing more."},
    {"abandon", abandonGroup, METH_NOARGS,
     "abandon($self, /)\n--\n\nTakes back the group and all in it: the next node is written in its place."},
    {"__enter__", itself, METH_NOARGS, nullptr},
    {"__exit__", leaveGroup, METH_VARARGS, nullptr},
    {}};

PyType_Slot groupSlots[] = {
    {Py_tp_dealloc, asSlot(deleteGroup)},
    {Py_tp_getset, groupAttributes},
    {Py_tp_methods, groupMethods},
    {Py_tp_doc,
     const_cast<char*>("An open group of a stream that is written. Only the innermost open one takes nodes.")},
    {0, nullptr}};

PyType_Spec writerSpec = {"tav.Writer", sizeof(WriterObject), 0, Py_TPFLAGS_DEFAULT | Py_TPFLAGS_IMMUTABLETYPE,
                          writerSlots};
PyType_Spec groupSpec = {"tav.Group", sizeof(GroupObject), 0,
                         Py_TPFLAGS_DEFAULT | Py_TPFLAGS_DISALLOW_INSTANTIATION | Py_TPFLAGS_IMMUTABLETYPE, groupSlots};

} // namespace

void addWriter(PyObject* module)
{
  makeType(module, writerSpec, "Writer");
  groupType = makeType(module, groupSpec, "Group");
}

} // namespace tav::python
