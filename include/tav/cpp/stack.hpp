/// @file stack.hpp
/// Plain values one behind the other.
#pragma once

#include <cstddef>
#include <cstring>
#include <new>
#include <type_traits>
#include <utility>

namespace tav::detail
{

/// What std::vector is to values that are copied as bytes. It compiles in a tenth of the time.
template<class T>
class Stack
{
  static_assert(std::is_trivially_copyable_v<T>);

public:
  Stack() = default;
  Stack(const Stack& other)
  {
    if (other.size_ != 0)
    {
      grow(other.size_);
      std::memcpy(static_cast<void*>(items_), other.items_, other.size_ * sizeof(T));
      size_ = other.size_;
    }
  }
  Stack(Stack&& other) noexcept
      : items_(std::exchange(other.items_, nullptr)), size_(std::exchange(other.size_, 0)),
        room_(std::exchange(other.room_, 0))
  {
  }
  Stack& operator=(Stack other) noexcept
  {
    std::swap(items_, other.items_);
    std::swap(size_, other.size_);
    std::swap(room_, other.room_);
    return *this;
  }
  ~Stack()
  {
    ::operator delete(items_);
  }

  void push(const T& item)
  {
    const T kept = item; // which may be one of these
    if (size_ == room_)
    {
      grow(size_ < 8 ? 8 : 2 * size_);
    }
    new (items_ + size_) T(kept);
    ++size_;
  }
  void pop() noexcept
  {
    --size_;
  }
  void clear() noexcept
  {
    size_ = 0;
  }
  [[nodiscard]] const T& back() const noexcept
  {
    return items_[size_ - 1];
  }
  [[nodiscard]] const T& operator[](size_t at) const noexcept
  {
    return items_[at];
  }
  [[nodiscard]] const T* begin() const noexcept
  {
    return items_;
  }
  [[nodiscard]] const T* end() const noexcept
  {
    return items_ + size_;
  }
  [[nodiscard]] size_t size() const noexcept
  {
    return size_;
  }
  [[nodiscard]] bool empty() const noexcept
  {
    return size_ == 0;
  }

private:
  void grow(size_t room)
  {
    auto* const larger = static_cast<T*>(::operator new(room * sizeof(T)));
    if (size_ != 0)
    {
      std::memcpy(static_cast<void*>(larger), items_, size_ * sizeof(T));
    }
    ::operator delete(items_);
    items_ = larger;
    room_ = room;
  }

  T* items_ = nullptr;
  size_t size_ = 0;
  size_t room_ = 0;
};

} // namespace tav::detail
