/// Passes over bytes, during which other threads of Python run.
#pragma once

#include <cstdint>

#include "python/src/object.h"

namespace tav::python
{

/// Lets go of the interpreter while it lives. `at` looks in between for an interrupt, and tells who wants to know how
/// far the pass is: the callable `progress(done, total)`, both in bytes; null or None: nobody.
class Pass
{
public:
  Pass(PyObject* progress, uint64_t total) noexcept
      : progress_(progress == Py_None ? nullptr : progress), total_(total), thread_(PyEval_SaveThread()) {}
  Pass(const Pass&) = delete;
  Pass& operator=(const Pass&) = delete;
  ~Pass() { hold(); }

  /// Called with the place of the pass, as often as it likes. Throws Raised to end it.
  void at(uint64_t offset)
  {
    ++calls_;
    if (calls_ == kCalls || offset - told_ >= kBytes) // also where a further round begins before the last place
    {
      look(offset);
    }
  }

  /// Looks now.
  void look() { look(told_); }

  /// Takes the interpreter again, for good.
  void hold() noexcept
  {
    if (thread_ != nullptr)
    {
      PyEval_RestoreThread(std::exchange(thread_, nullptr));
    }
  }

private:
  static constexpr uint64_t kBytes = uint64_t{1} << 20U;
  static constexpr uint32_t kCalls = 1U << 15U;

  void look(uint64_t offset);

  PyObject* progress_;
  uint64_t total_;
  uint64_t told_ = 0;
  uint32_t calls_ = 0;
  PyThreadState* thread_;
};

/// The callable that a `progress=` argument is; anything else but None is refused.
PyObject* progressOf(PyObject* argument);

} // namespace tav::python
