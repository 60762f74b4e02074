/// @file owner.hpp
/// Objects with one owner.
#pragma once

#include <cstddef>
#include <utility>

namespace tav::detail
{

/// What std::unique_ptr is, as far as the layer needs it: `<memory>` and what its templates become are a tenth of the
/// time that a small program takes to compile.
template<class T>
class Owner
{
public:
  Owner() = default;
  explicit Owner(T* object) noexcept
      : object_(object)
  {
  }
  Owner(Owner&& other) noexcept
      : object_(other.release())
  {
  }
  /// Of an object of a class below `T`, whose destructor is virtual.
  template<class Other>
  Owner(Owner<Other>&& other) noexcept // NOLINT(google-explicit-constructor): as a pointer converts
      : object_(other.release())
  {
  }
  Owner& operator=(Owner other) noexcept
  {
    reset(other.release());
    return *this;
  }
  ~Owner()
  {
    delete object_;
  }

  void reset(T* object = nullptr) noexcept
  {
    delete std::exchange(object_, object);
  }
  T* release() noexcept
  {
    return std::exchange(object_, nullptr);
  }
  [[nodiscard]] T* get() const noexcept
  {
    return object_;
  }
  T& operator*() const noexcept
  {
    return *object_;
  }
  T* operator->() const noexcept
  {
    return object_;
  }
  explicit operator bool() const noexcept
  {
    return object_ != nullptr;
  }
  friend bool operator==(const Owner& owner, std::nullptr_t) noexcept
  {
    return owner.object_ == nullptr;
  }

private:
  T* object_ = nullptr;
};

} // namespace tav::detail
