#include "python/src/dictionary.h"

#include <memory>

#include "python/src/input.h"
#include "python/src/names.h"
#include "python/src/results.h"

namespace tav::python
{

namespace
{

PyTypeObject* dictionaryType = nullptr;

struct DictionaryObject
{
  PyObject_HEAD
      inspect::Dictionary value;
  PyObject* paths; ///< what it was read from: a tuple
};

DictionaryObject& objectOf(PyObject* self)
{
  return *reinterpret_cast<DictionaryObject*>(self);
}

Ref allocate(PyTypeObject* type, inspect::Dictionary value, Ref paths)
{
  Ref self = made(type->tp_alloc(type, 0));
  new (&objectOf(self.get()).value) inspect::Dictionary(std::move(value));
  objectOf(self.get()).paths = paths.release();
  return self;
}

PyObject* makeDictionary(PyTypeObject* type, PyObject* arguments, PyObject* named)
{
  return guarded([&] {
    static const char* const none[] = {nullptr};
    const Ref nothing = made(PyTuple_New(0));
    done(PyArg_ParseTupleAndKeywords(nothing.get(), named, ":Dictionary", keywords(none)) - 1);
    inspect::Dictionary all;
    for (Py_ssize_t i = 0; i < PyTuple_GET_SIZE(arguments); ++i)
    {
      all = all.with(inspect::Dictionary::open(pathOfFile(PyTuple_GET_ITEM(arguments, i))));
    }
    return allocate(type, std::move(all), Ref::borrowed(arguments)).release();
  });
}

void deleteDictionary(PyObject* self)
{
  PyTypeObject* const type = Py_TYPE(self);
  std::destroy_at(&objectOf(self).value);
  Py_XDECREF(objectOf(self).paths);
  type->tp_free(self);
  Py_DECREF(type);
}

PyObject* getElements(PyObject* self, void*)
{
  return guarded([&] {
    Ref list = made(PyList_New(0));
    for (const inspect::OwnElement& element : objectOf(self).value.elements())
    {
      const auto optional = [](std::string_view text) { return text.empty() ? Ref(none()) : textOf(text); };
      Ref fields = made(Py_BuildValue("(HOOOO)", element.id, textOf(element.tag).get(),
                                      optional(inspect::kindText(element.kind)).get(), optional(element.unit).get(),
                                      optional(element.text).get()));
      done(PyList_Append(list.get(), makeResult("OwnElement", std::move(fields)).get()));
    }
    return list.release();
  });
}

PyObject* reduce(PyObject* self, PyObject*)
{
  return guarded([&]() -> PyObject* {
    if (objectOf(self).paths == nullptr)
    {
      raise(PyExc_TypeError, "a dictionary that a reader has given cannot be pickled");
    }
    return Py_BuildValue("(OO)", reinterpret_cast<PyObject*>(Py_TYPE(self)), objectOf(self).paths);
  });
}

Py_ssize_t length(PyObject* self)
{
  return static_cast<Py_ssize_t>(objectOf(self).value.elements().size());
}

PyObject* compare(PyObject* self, PyObject* other, int how)
{
  if (Py_TYPE(other) != dictionaryType || (how != Py_EQ && how != Py_NE))
  {
    Py_RETURN_NOTIMPLEMENTED;
  }
  const bool isSame = objectOf(self).value == objectOf(other).value;
  return PyBool_FromLong((how == Py_EQ) == isSame ? 1 : 0);
}

PyGetSetDef attributes[] = {{"elements", getElements, nullptr,
                             "All own elements, by id: list of OwnElement(id, tag, kind, unit, text)", nullptr},
                            {}};
PyMethodDef methods[] = {{"__reduce__", reduce, METH_NOARGS, nullptr}, {}};

PyType_Slot slots[] = {
    {Py_tp_new, asSlot(makeDictionary)},
    {Py_tp_dealloc, asSlot(deleteDictionary)},
    {Py_tp_getset, attributes},
    {Py_tp_methods, methods},
    {Py_tp_richcompare, asSlot(compare)},
    {Py_tp_hash, asSlot(PyObject_HashNotImplemented)},
    {Py_sq_length, asSlot(length)},
    {Py_tp_doc,
     const_cast<char*>(
         "Dictionary(*paths)\n--\n\n"
         "What own elements are called, of the files that docs/tav.md describes. `dictionary=` takes one, or a\n"
         "path. TavError, with line and column, for a file that is none, and with both places where an id or a\n"
         "tag is given twice, or is that of a built-in element.")},
    {0, nullptr}};
PyType_Spec spec = {"tav.Dictionary", sizeof(DictionaryObject), 0, Py_TPFLAGS_DEFAULT | Py_TPFLAGS_IMMUTABLETYPE,
                    slots};

} // namespace

inspect::Dictionary dictionaryOf(PyObject* argument)
{
  if (argument == nullptr || argument == Py_None)
  {
    return {};
  }
  return Py_TYPE(argument) == dictionaryType ? objectOf(argument).value
                                             : inspect::Dictionary::open(pathOfFile(argument));
}

Ref dictionaryObject(inspect::Dictionary dictionary)
{
  return allocate(dictionaryType, std::move(dictionary), Ref());
}

Ref tagIn(const inspect::Dictionary& dictionary, uint16_t elm)
{
  const inspect::OwnElement* const own = dictionary.isEmpty() ? nullptr : dictionary.find(elm);
  return own != nullptr ? textOf(own->tag) : Ref::borrowed(tagOf(elm));
}

Ref stepNameIn(const inspect::Dictionary& dictionary, uint16_t elm)
{
  const inspect::OwnElement* const own = dictionary.isEmpty() ? nullptr : dictionary.find(elm);
  return own != nullptr ? textOf(own->tag) : Ref::borrowed(stepNameOf(elm));
}

void addDictionary(PyObject* module)
{
  dictionaryType = makeType(module, spec, "Dictionary");
}

} // namespace tav::python
