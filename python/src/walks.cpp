// Iterators over nodes: the children of a group, and what a path leads to.
#include <algorithm>
#include <exception>

#include "python/src/reader.h"

namespace tav::python
{

namespace
{

PyTypeObject* childrenType = nullptr;
PyTypeObject* foundType = nullptr;

PyObject* itself(PyObject* self)
{
  return Py_NewRef(self);
}

/// Children by the exact rules of the layer.
struct ChildrenObject
{
  PyObject_HEAD
      NodeObject* parent; ///< null: at the end
  std::shared_ptr<Opened> opened;
  std::optional<ChildRange> range;
  tav::detail::WalkIterator<ChildRange> place;
  PyObject* rest; ///< the walk that goes on where the exact rules do not; null: they do
  uint64_t last;  ///< offset of the child before
  bool begun;
};

ChildrenObject& childrenOf(PyObject* self)
{
  return *reinterpret_cast<ChildrenObject*>(self);
}

/// The next child; false behind the last, and where the exact rules do not lead on.
bool stepOn(ChildrenObject& walk)
{
  if (walk.begun)
  {
    ++walk.place;
  }
  else
  {
    walk.begun = true;
    walk.place = walk.range->begin();
  }
  return walk.place != ChildRange::end();
}

/// The next child by the document's walk, which goes on in a group that was never closed, and says what is damaged.
PyObject* nextRest(ChildrenObject& walk)
{
  if (walk.rest == nullptr)
  {
    walk.rest = walkFound(*walk.parent->reader, walk.parent, "*", walk.parent, nullptr);
  }
  while (true)
  {
    PyObject* const child = PyIter_Next(walk.rest);
    if (child == nullptr || reinterpret_cast<NodeObject*>(child)->offset > walk.last)
    {
      return child;
    }
    Py_DECREF(child);
  }
}

PyObject* nextChild(PyObject* self)
{
  return guarded([&]() -> PyObject* {
    ChildrenObject& walk = childrenOf(self);
    if (walk.parent == nullptr || !walk.range)
    {
      return nullptr;
    }
    ReaderObject& reader = *walk.parent->reader;
    const Opened& opened = use(reader);
    if (walk.rest == nullptr)
    {
      try
      {
        if (!stepOn(walk))
        {
          walk.range.reset();
          return nullptr;
        }
        walk.last = walk.place->offset();
        return reinterpret_cast<PyObject*>(makeNode(reader, opened, *walk.place, walk.parent));
      }
      catch (const std::system_error&)
      {
        walk.place = {};
      }
    }
    return nextRest(walk);
  });
}

void deleteChildren(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  ChildrenObject& walk = childrenOf(self);
  Py_XDECREF(walk.parent);
  Py_XDECREF(walk.rest);
  walk.range.~optional();
  walk.opened.~shared_ptr();
  PyObject_Free(self);
  Py_DECREF(type);
}

/// What a path leads to. Some nodes are looked for at a time, more from time to time, while other threads run.
struct FoundObject
{
  PyObject_HEAD
      ReaderObject* reader;
  NodeObject* parent; ///< of all of them; null: not known
  PyObject* progress; ///< null: nobody is told
  std::shared_ptr<Opened> opened;
  std::optional<inspect::NodeRange> range;
  std::vector<std::pair<tav::Node, inspect::Form>> batch;
  std::exception_ptr failure; ///< behind the batch
  size_t place;
  size_t most; ///< nodes of a batch
  tav::detail::WalkIterator<inspect::NodeRange> walk;
  bool begun;
  bool done;
};

constexpr size_t kMostNodes = 4096;

FoundObject& foundOf(PyObject* self)
{
  return *reinterpret_cast<FoundObject*>(self);
}

void search(FoundObject& found)
{
  while (found.batch.size() < found.most)
  {
    if (std::exchange(found.begun, true))
    {
      ++found.walk;
    }
    else
    {
      found.walk = found.range->begin();
    }
    if (found.walk == inspect::NodeRange::end())
    {
      found.done = true;
      return;
    }
    found.batch.emplace_back(*found.walk, found.opened->document.formOf(*found.walk));
  }
}

void fill(FoundObject& found)
{
  found.batch.clear();
  found.place = 0;
  try
  {
    const Searching searching(*found.reader, found.progress);
    search(found);
  }
  catch (const Raised&)
  {
    found.done = true;
    throw;
  }
  catch (...)
  {
    found.done = true;
    found.failure = std::current_exception();
  }
  found.most = std::min(found.most * 2, kMostNodes);
}

PyObject* nextFound(PyObject* self)
{
  return guarded([&]() -> PyObject* {
    FoundObject& found = foundOf(self);
    const Opened& opened = use(*found.reader);
    if (found.place == found.batch.size() && !found.done)
    {
      useDocument(*found.reader);
      fill(found);
    }
    if (found.place < found.batch.size())
    {
      const auto& [node, form] = found.batch[found.place++];
      return reinterpret_cast<PyObject*>(found.parent != nullptr ? makeNode(*found.reader, opened, node, found.parent)
                                                                 : makeNode(*found.reader, opened, node, form));
    }
    if (found.failure)
    {
      std::rethrow_exception(std::exchange(found.failure, nullptr));
    }
    return nullptr;
  });
}

void deleteFound(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  FoundObject& found = foundOf(self);
  Py_XDECREF(found.parent);
  Py_XDECREF(found.progress);
  std::destroy_at(&found.range);
  std::destroy_at(&found.batch);
  std::destroy_at(&found.failure);
  std::destroy_at(&found.opened);
  Py_DECREF(found.reader);
  PyObject_Free(self);
  Py_DECREF(type);
}

PyType_Slot childrenSlots[] = {{Py_tp_dealloc, asSlot(deleteChildren)},
                               {Py_tp_iter, asSlot(itself)},
                               {Py_tp_iternext, asSlot(nextChild)},
                               {0, nullptr}};
PyType_Slot foundSlots[] = {{Py_tp_dealloc, asSlot(deleteFound)},
                            {Py_tp_iter, asSlot(itself)},
                            {Py_tp_iternext, asSlot(nextFound)},
                            {0, nullptr}};

constexpr unsigned kFlags = Py_TPFLAGS_DEFAULT | Py_TPFLAGS_DISALLOW_INSTANTIATION | Py_TPFLAGS_IMMUTABLETYPE;
PyType_Spec childrenSpec = {"tav._tav.Children", sizeof(ChildrenObject), 0, kFlags, childrenSlots};
PyType_Spec foundSpec = {"tav._tav.Found", sizeof(FoundObject), 0, kFlags, foundSlots};

template<class Object>
Object& allocate(PyTypeObject* type)
{
  auto* const object = PyObject_New(Object, type);
  if (object == nullptr)
  {
    throw Raised{};
  }
  return *object;
}

} // namespace

PyObject* walkChildren(NodeObject& node)
{
  Opened& opened = use(*node.reader);
  // One of size 0 is empty, or was never closed: the document knows.
  const bool isOpen = node.size == 0 || node.size == (node.isWide ? TAV_SIZE_UNKNOWN : layout::kSizeUnknown32);
  if (node.isGroup && (isOpen || opened.onDamage == inspect::OnDamage::skip))
  {
    return walkFound(*node.reader, &node, "*", &node, nullptr);
  }
  ChildRange range = layerNode(opened, node).children();
  ChildrenObject& walk = allocate<ChildrenObject>(childrenType);
  Py_INCREF(&node);
  walk.parent = &node;
  new (&walk.opened) std::shared_ptr<Opened>(node.reader->opened);
  new (&walk.range) std::optional<ChildRange>(std::move(range));
  new (&walk.place) tav::detail::WalkIterator<ChildRange>();
  walk.rest = nullptr;
  walk.last = 0;
  walk.begun = false;
  return reinterpret_cast<PyObject*>(&walk);
}

PyObject* walkFound(ReaderObject& reader, NodeObject* from, std::string path, NodeObject* parent, PyObject* progress)
{
  Opened& opened = useDocument(reader);
  inspect::NodeRange range = from != nullptr
                                 ? opened.document.find(layerNode(opened, *from), path, opened.onDamage)
                                 : opened.document.find(path, opened.onDamage);
  FoundObject& found = allocate<FoundObject>(foundType);
  Py_INCREF(&reader);
  Py_XINCREF(parent);
  Py_XINCREF(progress);
  found.reader = &reader;
  found.parent = parent;
  found.progress = progress;
  new (&found.opened) std::shared_ptr<Opened>(reader.opened);
  new (&found.range) std::optional<inspect::NodeRange>(std::move(range));
  new (&found.batch) std::vector<std::pair<tav::Node, inspect::Form>>();
  new (&found.failure) std::exception_ptr();
  found.place = 0;
  found.most = 1;
  new (&found.walk) tav::detail::WalkIterator<inspect::NodeRange>();
  found.begun = false;
  found.done = false;
  return reinterpret_cast<PyObject*>(&found);
}

PyObject* findFirst(ReaderObject& reader, NodeObject* from, std::string path, PyObject* progress)
{
  const Ref walk(walkFound(reader, from, std::move(path), nullptr, progress));
  PyObject* const first = nextFound(walk.get());
  if (first == nullptr && PyErr_Occurred() != nullptr)
  {
    throw Raised{};
  }
  return first != nullptr ? first : none();
}

void addWalks(PyObject* module)
{
  childrenType = makeType(module, childrenSpec, nullptr);
  foundType = makeType(module, foundSpec, nullptr);
}

} // namespace tav::python
