/// Commands of the program, run in this process on files that hold the input.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "support/elements.h"

namespace fuzz
{

/// One option of a command line: its long name and its value, if it has one.
struct Option
{
  std::string name;
  std::string value{};
};

/// How the stream is to be read. None unless the highest bit is set: then it is recognised from the bytes.
std::vector<Option> formOptions(uint8_t flags);

std::vector<Option> with(std::vector<Option> options, std::initializer_list<Option> more);

/// A folder of this process, in memory where the system has such a place, with a few files that are used again.
class Folder
{
public:
  Folder();
  ~Folder();
  Folder(const Folder&) = delete;
  Folder& operator=(const Folder&) = delete;

  [[nodiscard]] std::string path(std::string_view name) const;
  /// Writes a file and returns its path.
  [[nodiscard]] std::string put(std::string_view name, std::span<const uint8_t> bytes) const;
  /// The bytes of a file.
  [[nodiscard]] test::Bytes get(std::string_view name) const;
  /// Nothing but these files: whatever else a command left behind ends the program.
  void expectOnly(const std::vector<std::string>& names) const;

private:
  std::string path_;
};

/// Runs a command and returns its exit status. Problems that it reports are statuses, too; every other exception is a
/// finding.
int runCommand(std::string_view name, const std::vector<Option>& options, const std::vector<std::string>& arguments);

} // namespace fuzz
