/// Names of elements and types as Python has them: each made once.
#pragma once

#include <array>
#include <cstdint>

#include "python/src/object.h"
#include "tav/inspect/dictionary.hpp"

namespace tav::python
{

/// The names of all ids, each made when it is asked for first. What they give is borrowed, and lives for ever.
class Names
{
public:
  using Maker = Ref (*)(uint16_t);
  explicit Names(Maker make) noexcept
      : make_(make) {}

  PyObject* of(uint16_t number)
  {
    PyObject* const name = names_[number];
    return name != nullptr ? name : add(number);
  }

private:
  PyObject* add(uint16_t number);

  Maker make_;
  std::array<PyObject*, 65536> names_{};
};

/// An element's tag; None for an id without one.
inline PyObject* tagOf(uint16_t elm)
{
  extern Names elementTags;
  return elementTags.of(elm);
}

/// How an element is called in a path, which stands for it alone: its tag, else "#60103".
inline PyObject* stepNameOf(uint16_t elm)
{
  extern Names elementSteps;
  return elementSteps.of(elm);
}

/// A type's name as `tav json` has it; the number of a type without one.
inline PyObject* typeNameOf(uint16_t type)
{
  extern Names typeNames;
  return typeNames.of(type);
}

/// The id that a tag, a constant, "#60103" or a number means.
uint16_t idOf(PyObject* name, const inspect::Dictionary& dictionary);

/// The type that a name or a number means.
uint16_t typeOf(PyObject* name);

} // namespace tav::python
