// Streams as dicts and lists.
#include "python/src/names.h"
#include "python/src/values.h"
#include "python/src/walkBelow.h"

namespace tav::python
{

void passOver(Opened& opened, const WalkRoot& root, const inspect::PassedOver& passed)
{
  if (opened.onDamage == inspect::OnDamage::skip)
  {
    opened.passedOver.emplace(std::pair(passed.offset, passed.rule), passed.length);
    return;
  }
  const size_t below = passed.path.find('/', 1); // the walk knows no more than what is below its root
  throw inspect::Error(inspect::Problem{.file = opened.input.name,
                                        .offset = passed.offset,
                                        .path = opened.document.pathOf(root.node, inspect::PathStyle::brief) +
                                                (below == std::string::npos ? "" : passed.path.substr(below)),
                                        .sentence = passed.reason,
                                        .code = passed.code});
}

std::vector<WalkRoot> rootsOf(Opened& opened)
{
  std::vector<WalkRoot> roots;
  for (const tav::Node& root : opened.document.roots(opened.onDamage))
  {
    roots.push_back({root, opened.document.formOf(root)});
  }
  return roots;
}

namespace
{

/// Puts a value under a key; the second one of a key makes a list of both. Takes the value over.
void put(PyObject* dict, PyObject* key, Ref value)
{
  const Py_ssize_t before = PyDict_GET_SIZE(dict);
  PyObject* const there = PyDict_SetDefault(dict, key, value.get());
  if (there == nullptr)
  {
    throw Raised{};
  }
  if (PyDict_GET_SIZE(dict) != before)
  {
    return;
  }
  if (PyList_CheckExact(there)) // a value is none
  {
    done(PyList_Append(there, value.get()));
    return;
  }
  const Ref list = made(PyList_New(2));
  PyList_SET_ITEM(list.get(), 0, Py_NewRef(there));
  PyList_SET_ITEM(list.get(), 1, value.release());
  done(PyDict_SetItem(dict, key, list.get()));
}

/// Whether a group of size 0 is empty, and was not one that was never closed.
bool isEmpty(Opened& opened, const tav::Node& group)
{
  inspect::NodeRange children = opened.document.find(group, "*", inspect::OnDamage::skip);
  return children.begin() == inspect::NodeRange::end();
}

Ref loadBelow(Opened& opened, const WalkRoot& root)
{
  constexpr uint32_t kLooks = 1U << 16U; // nodes between two looks for an interrupt
  const auto source = opened.input.source();
  Ref result = made(PyDict_New());
  if (root.node.size() == 0 && isEmpty(opened, root.node))
  {
    return result;
  }
  std::vector<PyObject*> open{result.get()}; // each in the one before it, by depth
  uint32_t count = 0;
  walkBelow(opened, *source, opened.readerOf(root.form.swapped, root.form.aligned), root, false, [&](const Step& step) {
    open.resize(static_cast<size_t>(step.depth));
    if (++count % kLooks == 0)
    {
      done(PyErr_CheckSignals());
    }
    Ref value;
    if (step.isGroup)
    {
      value = made(PyDict_New());
      open.push_back(value.get());
    }
    else
    {
      value = step.payload != nullptr ? made(valueOf(step.raw(root.form.swapped))) : Ref(none());
    }
    put(open[static_cast<size_t>(step.depth) - 1], stepNameIn(opened.input.dictionary, step.elm()).get(),
        std::move(value));
  });
  return result;
}

Ref loadOne(Opened& opened, const WalkRoot& root)
{
  if (root.node.isGroup())
  {
    return loadBelow(opened, root);
  }
  const uint8_t* const payload = payloadIn(opened.bytes, root.node.header());
  return payload == nullptr
             ? Ref(none())
             : made(valueOf({root.node.type(), payload, root.node.size(), root.form.swapped}));
}

} // namespace

PyObject* loadNode(NodeObject& node)
{
  Opened& opened = node.isGroup && node.size == 0 ? useDocument(*node.reader) : use(*node.reader);
  const inspect::Form form{.swapped = node.swapped, .root64 = node.isWide, .aligned = node.aligned};
  return loadOne(opened, {layerNode(opened, node), form}).release();
}

PyObject* loadRoots(ReaderObject& reader)
{
  Opened& opened = useDocument(reader);
  const std::vector<WalkRoot> roots = rootsOf(opened);
  Ref list = made(PyList_New(0));
  for (const WalkRoot& root : roots)
  {
    const Ref dict = made(PyDict_New());
    done(PyDict_SetItem(dict.get(), stepNameIn(opened.input.dictionary, root.node.elm()).get(),
                        loadOne(opened, root).get()));
    done(PyList_Append(list.get(), dict.get()));
  }
  return roots.size() == 1 ? Py_NewRef(PyList_GET_ITEM(list.get(), 0)) : list.release();
}

} // namespace tav::python
