// tav.Node: a view of a node.
#include "python/src/names.h"
#include "python/src/reader.h"
#include "python/src/results.h"
#include "python/src/values.h"

#include <structmember.h> // which needs the interface before it

namespace tav::python
{

namespace
{

PyTypeObject* nodeType = nullptr;

NodeObject& nodeOf(PyObject* self)
{
  return *reinterpret_cast<NodeObject*>(self);
}

tav::detail::RawValue rawOf(const NodeObject& node)
{
  if (node.payload == nullptr)
  {
    fail(TAV_RC_OUTSIDE_PARENT, "the payload ends behind the end of the bytes");
  }
  return {node.type, node.payload, node.size, node.swapped};
}

NodeObject* makeBare(ReaderObject& reader, const Opened& opened, const tav::Node& node)
{
  auto* const made = PyObject_New(NodeObject, nodeType);
  if (made == nullptr)
  {
    throw Raised{};
  }
  const uint64_t all = opened.bytes.size();
  const uint64_t offset = node.offset();
  const uint64_t size = node.size();
  const bool isWide = layout::is64(node.header());
  const uint64_t from = offset + layout::headerLength(node.header().hdrType); // of a header that was read
  const bool isWhole = from <= all && size <= all - from;
  Py_INCREF(&reader);
  made->reader = &reader;
  made->parent = nullptr;
  made->isGroup = node.isGroup();
  made->payload = isWhole && !made->isGroup ? opened.bytes.data() + from : nullptr;
  made->offset = offset;
  made->size = size;
  made->info = node.info();
  made->type = node.type();
  made->elm = node.elm();
  made->isWide = isWide;
  made->isRoot = false;
  return made;
}

void deleteNode(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  NodeObject& node = nodeOf(self);
  NodeObject* const parent = node.parent;
  Py_DECREF(node.reader);
  PyObject_Free(self);
  Py_DECREF(type);
  releaseChain(parent, &NodeObject::parent);
}

PyObject* getTag(PyObject* self, void*)
{
  return guarded([&] {
    const NodeObject& node = nodeOf(self);
    const Opened* const opened = node.reader->opened.get(); // a closed one has the built-in names
    return opened != nullptr ? tagIn(opened->input.dictionary, node.elm).release() : Py_NewRef(tagOf(node.elm));
  });
}

PyObject* getType(PyObject* self, void*)
{
  return guarded([&] { return Py_NewRef(typeNameOf(nodeOf(self).type)); });
}

PyObject* getValue(PyObject* self, void*)
{
  return guarded([&] { return nodeValue(nodeOf(self)); });
}

/// The stamp of a timestamp; false for another node.
bool stampOfNode(const NodeObject& node, TAVTimeStamp& stamp)
{
  use(*node.reader);
  return node.type == TAV_TYPE_UTC_TIMESTAMP && !node.isGroup && tav::detail::decode(rawOf(node), stamp) == TAV_RC_OK;
}

PyObject* getTime(PyObject* self, void*)
{
  return guarded([&] {
    TAVTimeStamp stamp{};
    return stampOfNode(nodeOf(self), stamp) ? nanosecondsOf(stamp).release() : none();
  });
}

PyObject* getZone(PyObject* self, void*)
{
  return guarded([&] {
    TAVTimeStamp stamp{};
    return stampOfNode(nodeOf(self), stamp) ? PyLong_FromLong(stamp.offsetMinutes) : none();
  });
}

PyObject* getPayload(PyObject* self, void*)
{
  return guarded([&]() -> PyObject* {
    const NodeObject& node = nodeOf(self);
    const Opened& opened = use(*node.reader);
    if (node.isGroup)
    {
      return none();
    }
    const auto from = static_cast<Py_ssize_t>(rawOf(node).bytes - opened.bytes.data());
    return PySequence_GetSlice(opened.input.memory.get(), from, from + static_cast<Py_ssize_t>(node.size));
  });
}

PyObject* getSize(PyObject* self, void*)
{
  return guarded([&] {
    const NodeObject& node = nodeOf(self);
    const bool isOpen = node.isGroup && node.size == (node.isWide ? TAV_SIZE_UNKNOWN : layout::kSizeUnknown32);
    return isOpen ? none() : numberOf(node.size).release();
  });
}

PyObject* getKey(PyObject* self, void*)
{
  return PyLong_FromUnsignedLong(nodeOf(self).info & TAV_INFO_KEY_MASK);
}

PyObject* getPath(PyObject* self, void*)
{
  return guarded([&] {
    NodeObject& node = nodeOf(self);
    Opened& opened = useDocument(*node.reader);
    const tav::Node place = layerNode(opened, node);
    std::string path;
    {
      const Searching searching(*node.reader, nullptr);
      path = opened.document.pathOf(place);
    }
    return textOf(path).release();
  });
}

PyObject* getParent(PyObject* self, void*)
{
  return guarded([&]() -> PyObject* {
    NodeObject& node = nodeOf(self);
    use(*node.reader);
    if (node.parent == nullptr && !node.isRoot)
    {
      const Ref found(findFirst(*node.reader, &node, "..", nullptr));
      node.isRoot = found.get() == Py_None;
      node.parent = node.isRoot ? nullptr : reinterpret_cast<NodeObject*>(Py_NewRef(found.get()));
    }
    return node.parent != nullptr ? Py_NewRef(reinterpret_cast<PyObject*>(node.parent)) : none();
  });
}

PyObject* getReader(PyObject* self, void*)
{
  return Py_NewRef(reinterpret_cast<PyObject*>(nodeOf(self).reader));
}

PyObject* iterate(PyObject* self)
{
  return guarded([&] { return walkChildren(nodeOf(self)); });
}

Py_ssize_t length(PyObject* self)
{
  const Ref walk(iterate(self));
  if (!walk)
  {
    return -1;
  }
  Py_ssize_t count = 0;
  while (true)
  {
    const Ref child(PyIter_Next(walk.get()));
    if (!child)
    {
      return PyErr_Occurred() != nullptr ? -1 : count;
    }
    ++count;
  }
}

int isThere(PyObject*)
{
  return 1; // whatever it holds
}

PyObject* find(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    PyObject* path = nullptr;
    PyObject* progress = nullptr;
    static const char* const names[] = {"path", "progress", nullptr};
    done(PyArg_ParseTupleAndKeywords(arguments, named, "U|$O:find", keywords(names), &path, &progress) - 1);
    NodeObject& node = nodeOf(self);
    return findFirst(*node.reader, &node, bytesOfText(path), progressOf(progress));
  });
}

PyObject* findAll(PyObject* self, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    PyObject* path = nullptr;
    PyObject* progress = nullptr;
    static const char* const names[] = {"path", "progress", nullptr};
    done(PyArg_ParseTupleAndKeywords(arguments, named, "U|$O:findall", keywords(names), &path, &progress) - 1);
    NodeObject& node = nodeOf(self);
    return walkFound(*node.reader, &node, bytesOfText(path), nullptr, progressOf(progress));
  });
}

PyObject* load(PyObject* self, PyObject*)
{
  return guarded([&] { return loadNode(nodeOf(self)); });
}

PyObject* represent(PyObject* self)
{
  return guarded([&] { return callPython("tav._html", "node_repr", self); });
}

PyObject* representHtml(PyObject* self, PyObject*)
{
  return guarded([&] { return callPython("tav._html", "node_html", self); });
}

PyObject* compare(PyObject* self, PyObject* other, int how)
{
  if (Py_TYPE(other) != nodeType || (how != Py_EQ && how != Py_NE))
  {
    Py_RETURN_NOTIMPLEMENTED;
  }
  const NodeObject& one = nodeOf(self);
  const NodeObject& two = nodeOf(other);
  const bool isSame = one.reader == two.reader && one.offset == two.offset;
  return PyBool_FromLong((how == Py_EQ) == isSame ? 1 : 0);
}

Py_hash_t hash(PyObject* self)
{
  const NodeObject& node = nodeOf(self);
  const auto mixed = static_cast<Py_hash_t>(reinterpret_cast<uintptr_t>(node.reader) / 16 * 1000003 ^ node.offset);
  return mixed == -1 ? -2 : mixed;
}

PyGetSetDef attributes[] = {
    {"tag", getTag, nullptr, "The element's name, or None for an id without one: str | None", nullptr},
    {"type", getType, nullptr, "The type's name as `tav json` has it, 'Uint32'; the number of another: str | int",
     nullptr},
    {"value", getValue, nullptr,
     "The value: int, str, bytes, datetime in UTC, or array.array('Q'); None for a group.\n\n"
     "A payload whose size does not suit its type, and one of an unknown type, is bytes. A moment beyond the year\n"
     "9999 is time_ns. Bytes of a text that are no UTF-8 are lone surrogates, as in names of files.",
     nullptr},
    {"time_ns", getTime, nullptr,
     "Nanoseconds since 1970 of a timestamp, of whatever year; None for other nodes: int | None", nullptr},
    {"zone", getZone, nullptr, "Minutes east of Greenwich that a timestamp is to be shown with: int | None", nullptr},
    {"payload", getPayload, nullptr,
     "The payload as it stands in the stream, without a copy; None for a group: memoryview | None\n\n"
     "It keeps the bytes alive, also when the reader is closed.",
     nullptr},
    {"size", getSize, nullptr, "Bytes of the payload; None for a group that was never closed: int | None", nullptr},
    {"key", getKey, nullptr, "The search key of 11 bits in `info`: int", nullptr},
    {"path", getPath, nullptr, "A path that leads back to this node. Costs a walk to it: str", nullptr},
    {"parent", getParent, nullptr,
     "The group around it; None for a root: Node | None. Costs a search for a node that a path led to.", nullptr},
    {"reader", getReader, nullptr, "The reader that it is of: Reader", nullptr},
    {}};

PyMemberDef members[] = {
    {"id", T_USHORT, offsetof(NodeObject, elm), READONLY, "The element's id: int"},
    {"offset", T_ULONGLONG, offsetof(NodeObject, offset), READONLY,
     "Offset of the header in bytes, from the first byte on: int"},
    {"info", T_UINT, offsetof(NodeObject, info), READONLY, "The flag bits of a 64-bit header, else 0: int"},
    {"is_group", T_BOOL, offsetof(NodeObject, isGroup), READONLY, "Whether it holds other nodes: bool"},
    {}};

PyMethodDef methods[] = {
    {"find", asFunction(find), METH_VARARGS | METH_KEYWORDS,
     "find($self, /, path, *, progress=None)\n--\n\n"
     "The first node that a path leads to from here, or None. TavError for a text that is no path."},
    {"findall", asFunction(findAll), METH_VARARGS | METH_KEYWORDS,
     "findall($self, /, path, *, progress=None)\n--\n\n"
     "An iterator over all nodes that a path leads to from here, in stream order."},
    {"load", load, METH_NOARGS,
     "load($self, /)\n--\n\nThe value; of a group a dict by tags, with lists where a tag repeats."},
    {"_repr_html_", representHtml, METH_NOARGS, "_repr_html_($self, /)\n--\n\nA tree that unfolds, for notebooks."},
    {}};

PyType_Slot slots[] = {
    {Py_tp_dealloc, asSlot(deleteNode)},
    {Py_tp_getset, attributes},
    {Py_tp_members, members},
    {Py_tp_methods, methods},
    {Py_tp_iter, asSlot(iterate)},
    {Py_tp_repr, asSlot(represent)},
    {Py_tp_richcompare, asSlot(compare)},
    {Py_tp_hash, asSlot(hash)},
    {Py_sq_length, asSlot(length)},
    {Py_nb_bool, asSlot(isThere)},
    {Py_tp_doc, const_cast<char*>("A node of a stream: a view, which keeps its reader alive. Iterating gives a group's "
                                  "children; a data element has none. Nodes are equal when they are the same place.")},
    {0, nullptr}};

PyType_Spec spec = {"tav.Node", sizeof(NodeObject), 0,
                    Py_TPFLAGS_DEFAULT | Py_TPFLAGS_DISALLOW_INSTANTIATION | Py_TPFLAGS_IMMUTABLETYPE, slots};

} // namespace

NodeObject* makeNode(ReaderObject& reader, const Opened& opened, const tav::Node& node, NodeObject* parent)
{
  NodeObject* const made = makeBare(reader, opened, node);
  Py_INCREF(parent);
  made->parent = parent;
  made->swapped = parent->swapped;
  made->aligned = parent->aligned;
  return made;
}

NodeObject* makeNode(ReaderObject& reader, const Opened& opened, const tav::Node& node, const inspect::Form& form)
{
  NodeObject* const made = makeBare(reader, opened, node);
  made->swapped = form.swapped;
  made->aligned = form.aligned;
  return made;
}

tav::Node layerNode(Opened& opened, const NodeObject& node)
{
  return opened.readerOf(node.swapped, node.aligned).at(node.offset, node.isWide ? Width::bits64 : Width::bits32);
}

PyObject* nodeValue(const NodeObject& node)
{
  use(*node.reader);
  return node.isGroup ? none() : valueOf(rawOf(node));
}

void addNode(PyObject* module)
{
  nodeType = makeType(module, spec, "Node");
}

} // namespace tav::python
