/// The engine's C interface, and owners for what it hands out.
#pragma once

#include <cstddef>
#include <exception>
#include <string>
#include <string_view>
#include <utility>

#include <duckdb_extension.h>

#include "tav/inspect/problem.hpp"

DUCKDB_EXTENSION_EXTERN

namespace tav::sql
{

/// A value of a query.
class Value
{
public:
  explicit Value(duckdb_value value)
      : value_(value) {}
  Value(const Value&) = delete;
  Value& operator=(const Value&) = delete;
  Value(Value&& other) noexcept
      : value_(std::exchange(other.value_, nullptr)) {}
  Value& operator=(Value&&) = delete;
  ~Value()
  {
    if (value_ != nullptr)
    {
      duckdb_destroy_value(&value_);
    }
  }

  /// Whether it was given, and is not NULL.
  explicit operator bool() const { return value_ != nullptr && !duckdb_is_null_value(value_); }
  duckdb_value get() const { return value_; }
  /// Its type belongs to the value.
  duckdb_logical_type type() const { return duckdb_get_value_type(value_); }
  duckdb_type id() const { return duckdb_get_type_id(type()); }
  /// A text that the engine has made.
  static std::string taken(char* text)
  {
    std::string copy = text != nullptr ? text : "";
    duckdb_free(text);
    return copy;
  }
  std::string text() const { return taken(duckdb_get_varchar(value_)); }

private:
  duckdb_value value_;
};

/// A type of columns and parameters.
class Type
{
public:
  explicit Type(duckdb_type id)
      : type_(duckdb_create_logical_type(id)) {}
  Type(const Type&) = delete;
  Type& operator=(const Type&) = delete;
  ~Type() { duckdb_destroy_logical_type(&type_); }

  duckdb_logical_type get() const { return type_; }

private:
  duckdb_logical_type type_;
};

/// What to do next, as a line of its own.
inline std::string hintOf(const inspect::Error& failure)
{
  const std::string& hint = failure.problem().hint;
  return hint.empty() ? "" : "\n" + hint;
}

/// Does a step and tells the engine by `set` how it failed: nothing that is thrown passes through its frames.
template<class Info, class Step>
void guarded(Info info, void (*set)(Info, const char*), const Step& step)
{
  try
  {
    step();
  }
  catch (const inspect::Error& failure)
  {
    set(info, (inspect::problemLine(failure.problem()) + hintOf(failure)).c_str());
  }
  catch (const std::exception& failure)
  {
    set(info, failure.what());
  }
}

/// Gives an object back that the engine has held.
template<class T>
void destroy(void* object)
{
  delete static_cast<T*>(object);
}

} // namespace tav::sql
