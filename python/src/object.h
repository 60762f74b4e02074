/// Python objects from C++: owned references, failures, and what is asked of every function of the module.
#pragma once

#define PY_SSIZE_T_CLEAN
#include <Python.h>

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

namespace tav::python
{

/// Thrown where Python has an exception set already.
struct Raised
{
};

/// An owned reference.
class Ref
{
public:
  Ref() = default;
  explicit Ref(PyObject* owned) noexcept
      : object_(owned) {}
  Ref(Ref&& other) noexcept
      : object_(std::exchange(other.object_, nullptr)) {}
  Ref& operator=(Ref&& other) noexcept
  {
    std::swap(object_, other.object_);
    return *this;
  }
  ~Ref() { Py_XDECREF(object_); }

  static Ref borrowed(PyObject* object) noexcept
  {
    Py_XINCREF(object);
    return Ref(object);
  }
  PyObject* get() const noexcept { return object_; }
  PyObject* release() noexcept { return std::exchange(object_, nullptr); }
  explicit operator bool() const noexcept { return object_ != nullptr; }

private:
  PyObject* object_ = nullptr;
};

/// What a call of the interface has made; null throws Raised.
inline Ref made(PyObject* object)
{
  if (object == nullptr)
  {
    throw Raised{};
  }
  return Ref(object);
}

/// The result of a call of the interface that answers less than 0 after a failure.
inline int done(int result)
{
  if (result < 0)
  {
    throw Raised{};
  }
  return result;
}

/// Text as str; what is no UTF-8 becomes lone surrogates, as Python does it with names of files.
inline Ref textOf(std::string_view text)
{
  return made(PyUnicode_DecodeUTF8(text.data(), static_cast<Py_ssize_t>(text.size()), "surrogateescape"));
}

inline Ref numberOf(uint64_t number)
{
  return made(PyLong_FromUnsignedLongLong(number));
}

inline PyObject* none()
{
  return Py_NewRef(Py_None);
}

/// The UTF-8 of a str; lone surrogates go back to the bytes that they stand for.
std::string bytesOfText(PyObject* text);

/// Raises a Python exception of a type with a sentence.
[[noreturn]] void raise(PyObject* type, const char* sentence);

/// Raises TavError.
[[noreturn]] void fail(uint32_t code, const std::string& sentence);

/// Makes a Python exception of the C++ exception that is being handled.
void tellPython() noexcept;

/// Makes the class TavError and adds it to the module.
void addErrors(PyObject* module);

/// Calls `work`, which gives a new reference; what it throws becomes a Python exception. Every function that Python
/// calls goes through here.
template<class Work>
PyObject* guarded(Work&& work) noexcept
{
  try
  {
    return work();
  }
  catch (const Raised&)
  {
    return nullptr;
  }
  catch (...)
  {
    tellPython();
    return nullptr;
  }
}

/// The same for what answers 0, or -1 after a failure.
template<class Work>
int guardedStatus(Work&& work) noexcept
{
  try
  {
    return work();
  }
  catch (const Raised&)
  {
    return -1;
  }
  catch (...)
  {
    tellPython();
    return -1;
  }
}

/// The functions of a type or a module as its table takes them.
template<class Function>
PyCFunction asFunction(Function* function) noexcept
{
  return reinterpret_cast<PyCFunction>(reinterpret_cast<void (*)()>(function));
}

template<class Function>
void* asSlot(Function* function) noexcept
{
  return reinterpret_cast<void*>(function);
}

/// A type from its slots, added to the module where it has a name there.
PyTypeObject* makeType(PyObject* module, PyType_Spec& spec, const char* name);

/// Lets go of an object that keeps the one around it, and so on: one after the other, as they can be nested deeply.
template<class Object>
void releaseChain(Object* object, Object* Object::*outer) noexcept
{
  while (object != nullptr && Py_REFCNT(object) == 1)
  {
    Object* const next = std::exchange(object->*outer, nullptr);
    Py_DECREF(object);
    object = next;
  }
  Py_XDECREF(object);
}

/// The name in a table of keywords, which older headers want as plain pointers.
char** keywords(const char* const* names) noexcept;

} // namespace tav::python
