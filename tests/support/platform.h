/// What tests ask of the operating system: a file a platform, and no test asks by itself.
#pragma once

#include <cstdint>
#include <cstdio>
#include <string>

namespace test
{

/// A new folder with a name of its own, below the folder for temporary files.
std::string makeFolder(const std::string& prefix);

/// The path of the device that keeps nothing.
const char* nullDevice();

/// A new stream of bytes for writing and reading, in a file that goes with it.
FILE* temporaryStream();

/// Removes all that was written to such a stream; false when that does not work.
bool emptyStream(FILE* stream);

/// Sends standard output to `stream`; returns what `restoreOutput` takes.
int redirectOutput(FILE* stream);
void restoreOutput(int before);

/// Whether files are mapped.
bool mapsFiles();

/// The most memory that this process has had.
uint64_t peakKibibytes();

/// A stream that keeps what is printed to it.
class CaughtStream
{
public:
  CaughtStream();
  ~CaughtStream();
  CaughtStream(const CaughtStream&) = delete;
  CaughtStream& operator=(const CaughtStream&) = delete;

  FILE* get() { return stream_; }
  /// All that was printed so far. More can be printed behind it.
  std::string text();

private:
  FILE* stream_;
};

/// Sends standard output into a stream of its own for as long as it lives, or until its text is asked for.
class CaughtStdout
{
public:
  CaughtStdout();
  ~CaughtStdout();
  CaughtStdout(const CaughtStdout&) = delete;
  CaughtStdout& operator=(const CaughtStdout&) = delete;

  std::string text();

private:
  void giveBack();

  CaughtStream stream_;
  int before_;
};

} // namespace test
