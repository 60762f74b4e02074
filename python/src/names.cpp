#include "python/src/names.h"

#include <optional>
#include <vector>

#include "tav/dictionary.hpp"
#include "tav/inspect/jsonText.hpp"
#include "tav/inspect/path.hpp"

namespace tav::python
{

namespace
{

PyObject* idsByName = nullptr;

Ref makeTag(uint16_t elm)
{
  const std::string_view tag = dictionary::tagOf(elm);
  return tag.empty() ? Ref(none()) : textOf(tag);
}

Ref makeStep(uint16_t elm)
{
  return textOf(inspect::elementText(elm));
}

Ref makeType(uint16_t type)
{
  const auto name = inspect::jsonTypeName(type);
  return name ? textOf(*name) : numberOf(type);
}

/// A whole number from 0 to 65,535.
std::optional<uint16_t> shortOf(PyObject* number)
{
  const Ref index = made(PyNumber_Index(number));
  int overflow = 0;
  const long long value = PyLong_AsLongLongAndOverflow(index.get(), &overflow);
  const bool fits = overflow == 0 && value >= 0 && value <= UINT16_MAX;
  return fits ? std::optional(static_cast<uint16_t>(value)) : std::nullopt;
}

uint16_t lookUpName(const std::string& text, const inspect::Dictionary& dictionary)
{
  const std::vector<uint16_t> ids = inspect::idsOf(text);
  if (!ids.empty())
  {
    return ids.front();
  }
  const std::string similar = inspect::similarNames(text, dictionary);
  const std::string hint = similar.empty() ? "" : "; did you mean " + similar + "?";
  fail(TAV_RC_BAD_PARAM, "no element is called '" + text + "'" + hint);
}

} // namespace

Names elementTags(makeTag);
Names elementSteps(makeStep);
Names typeNames(makeType);

PyObject* Names::add(uint16_t number)
{
  PyObject* object = make_(number).release();
  if (PyUnicode_CheckExact(object))
  {
    PyUnicode_InternInPlace(&object); // keys of dicts compare by their place then
  }
  names_[number] = object;
  return object;
}

uint16_t idOf(PyObject* name, const inspect::Dictionary& dictionary)
{
  if (!PyUnicode_Check(name))
  {
    const auto id = shortOf(name);
    if (!id)
    {
      fail(TAV_RC_BAD_PARAM, "ids of elements go from 0 to 65535");
    }
    return *id;
  }
  if (idsByName == nullptr)
  {
    idsByName = made(PyDict_New()).release();
  }
  PyObject* const known = PyDict_GetItemWithError(idsByName, name);
  if (known != nullptr)
  {
    return static_cast<uint16_t>(PyLong_AsUnsignedLong(known));
  }
  if (PyErr_Occurred() != nullptr)
  {
    throw Raised{};
  }
  const std::string text = bytesOfText(name);
  if (const inspect::OwnElement* const own = dictionary.isEmpty() ? nullptr : dictionary.find(text))
  {
    return own->id;
  }
  const uint16_t id = lookUpName(text, dictionary);
  constexpr Py_ssize_t mostNames = 20'000; // spellings of names that are remembered
  if (PyDict_Size(idsByName) < mostNames)
  {
    done(PyDict_SetItem(idsByName, name, numberOf(id).get()));
  }
  return id;
}

uint16_t typeOf(PyObject* name)
{
  std::optional<uint16_t> type;
  if (PyUnicode_Check(name))
  {
    type = inspect::jsonTypeOf(bytesOfText(name));
  }
  else
  {
    type = shortOf(name);
  }
  if (!type)
  {
    fail(TAV_RC_BAD_PARAM, "this is no type: 'Uint32' is one, and 'UTF8 String'");
  }
  return *type;
}

} // namespace tav::python
