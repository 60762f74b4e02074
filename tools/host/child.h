/// @file child.h
/// A program that this one starts, and whose result it reads.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace tav::host
{
/// What a child has to read: its standard input, and the file number 4 where that is not empty. Either is whole before
/// the child begins.
struct ChildTexts
{
  std::string input{};
  std::string side{};
};

/// A running program. What it writes to its file number 3 is read here; its standard output goes nowhere, and its
/// messages go where ours go. No shell is between: each word arrives as it is.
class Child
{
public:
  static constexpr const char* resultName = "/dev/fd/3"; ///< as the child names these files
  static constexpr const char* sideName = "/dev/fd/4";

  /// Whether this system lets a program name its open files so.
  static bool isPossible();

  Child() = default;
  Child(const Child&) = delete;
  Child& operator=(const Child&) = delete;
  /// A child that nobody has waited for is told to end, and does.
  ~Child();

  /// Starts the program at a path, with these words behind its name. Returns a code of codes.h.
  uint32_t start(const std::string& program, const std::vector<std::string>& words, const ChildTexts& texts);

  /// Reads up to so many bytes of the result; `count` is 0 at its end.
  uint32_t read(char* to, size_t most, size_t& count);

  /// Waits for the end: the exit status, 128 and more where a signal ended the child.
  int wait();

private:
  int64_t process_ = -1;
  int from_ = -1; ///< where the result is read
};
} // namespace tav::host
