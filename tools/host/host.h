/// @file host.h
/// What the program asks of the operating system beside libkor: the terminal, standard streams, signals, and names of
/// files. Texts and paths are UTF-8.
#pragma once

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

namespace tav::host
{
/// The words behind the program's name, in UTF-8.
std::vector<std::string> commandLine(int argc, char** argv);

/// The path that a UTF-8 text names; from a plain text the standard library makes one by the machine's code page.
inline std::filesystem::path pathOf(const std::string& utf8)
{
  return {std::u8string(utf8.begin(), utf8.end())};
}

/// A path's UTF-8 text.
inline std::string textOf(const std::filesystem::path& path)
{
  const std::u8string utf8 = path.u8string();
  return {utf8.begin(), utf8.end()};
}

/// The path of the program itself; empty where the system does not tell it.
std::filesystem::path programPath();

/// The paths that a variable of the environment lists, as PATH does; none when it is not set.
std::vector<std::string> pathList(const char* variable);

/// Where the folders that PATH lists have a program of this name; empty when none has.
std::string findProgram(const std::string& name);

/// The parts of a text between separators, without empty ones.
inline std::vector<std::string> separated(const std::string& text, char separator)
{
  std::vector<std::string> parts;
  for (size_t at = 0; at < text.size();)
  {
    const size_t end = std::min(text.find(separator, at), text.size());
    if (end != at)
    {
      parts.push_back(text.substr(at, end - at));
    }
    at = end + 1;
  }
  return parts;
}

/// Whether a standard stream is a terminal.
bool isTerminal(FILE* stream);

/// Columns of the terminal on standard output; nothing when there is none.
std::optional<unsigned> terminalWidth();

/// While one lives, what goes to standard output goes through a command of the shell, and an interrupt is the
/// command's. At its end it waits for the command. Where the command cannot be started, or the system has none, nothing
/// changes.
class Pager
{
public:
  explicit Pager(const std::string& command);
  ~Pager();
  Pager(const Pager&) = delete;
  Pager& operator=(const Pager&) = delete;

private:
  int64_t process_ = -1;
  int before_ = -1; ///< standard output as it was
  void (*interrupt_)(int) = nullptr;
};

/// Makes all standard streams streams of bytes, where a line ends as it was written, and a closed pipe or a file that
/// must not grow further an error of the write. A program that is interrupted or told to end removes the files of
/// `removeOnInterrupt` first.
void prepareStandardStreams();

/// Removes a file when the program is interrupted or told to end; it then ends as by the signal itself. Some eight
/// files at a time.
void removeOnInterrupt(const std::string& path);

/// The file is gone or has come to stay.
void keepOnInterrupt(const std::string& path);

/// While one lives an interrupt waits, so that no file is made and not yet known to `removeOnInterrupt`. One at a time.
class HeldInterrupts
{
public:
  HeldInterrupts();
  ~HeldInterrupts();
  HeldInterrupts(const HeldInterrupts&) = delete;
  HeldInterrupts& operator=(const HeldInterrupts&) = delete;
};

/// While one lives an interrupt (SIGINT, Ctrl-C) is remembered and does not end the program. One at a time.
class CaughtInterrupt
{
public:
  CaughtInterrupt();
  ~CaughtInterrupt();
  CaughtInterrupt(const CaughtInterrupt&) = delete;
  CaughtInterrupt& operator=(const CaughtInterrupt&) = delete;

  static bool hasCome();
};

/// The number of this process, for names of temporary files.
uint64_t processId();

/// Removes a file; false when that does not work, also because it is open where that is in the way.
bool removeFile(const std::string& path);

/// `std::fopen` for any path; `mode` is one of "rb", "wb". What is written to a path that `ownFile` knows goes to that
/// very open file, from its position. When that does not work the result is null, and `code` says why.
FILE* openStream(const std::string& path, const char* mode, uint32_t& code);

/// The number of the open file of this process that a path stands for, itself or by links: /dev/stdout, /dev/fd/3,
/// /proc/self/fd/3. To open such a path again would begin at the start of the file, or make another one in its place.
std::optional<int> ownFile(const std::string& path);

/// The file that a path leads to: symbolic links are followed, also those to a file that is not there yet. Links of the
/// system to open files of other processes are not; the result is then such a link.
std::filesystem::path targetOf(const std::string& path);

/// Puts a complete file in its place, which lasts when the machine stops at any moment: its bytes are on the disk
/// before it has the name, and the name is when this returns. Without `replace` it never takes the place of another
/// file, not even of one that appeared just now. With it, the file gets mode and owner of the one whose place it takes,
/// as far as the system lets; what it cannot have of the owner's group, that group may not do with it either. A new
/// file gets the mode of new files. Returns a code of codes.h.
uint32_t moveIntoPlace(const std::string& from, const std::string& to, bool replace);
} // namespace tav::host
