/// @file fileWatch.h
/// Waiting for a file to change. Compiled into the library that asks for it: no library exports it.
#pragma once

#include <cstdint>
#include <string>

namespace tav::kor
{

/// Watches a path: the file there, another one that takes its place, and one that comes where none is. Where the system
/// cannot tell of changes, and for those that it does not tell of, a wait ends after a while.
class FileWatch
{
public:
  /// `path` is UTF-8. Never fails: at worst every wait takes its time.
  explicit FileWatch(const std::string& path);
  ~FileWatch();
  FileWatch(const FileWatch&) = delete;
  FileWatch& operator=(const FileWatch&) = delete;

  /// Returns when the file may have changed, at the latest after so many milliseconds.
  void wait(uint32_t milliseconds);

private:
  void watchFile();

  std::string path_;
  std::string name_{};                        ///< the last part of the path
  [[maybe_unused]] intptr_t descriptor_ = -1; ///< of the system's watch; -1: there is none
  [[maybe_unused]] int32_t folder_ = -1;      ///< the watch on the folder
};

} // namespace tav::kor
