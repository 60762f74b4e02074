/// @file ending.cpp
/// How the module ends when it cannot go on: the worker sees a trap. The C++ library would make a text first, which
/// nobody sees, and printing takes a fortieth of the module.
#include <cstddef>

extern "C" [[noreturn]] void abort_message(const char* /*format*/, ...)
{
  __builtin_trap();
}

/// The C++ library asks for the text of an error without a name; the C library has one for each.
extern "C" int snprintf(char* /*to*/, size_t /*size*/, const char* /*format*/, ...)
{
  __builtin_trap();
}
