/// Long accounts in parts, compared with those that are written down in a file.
#pragma once

#include <cstdlib>
#include <fstream>
#include <sstream>
#include <string>

#include <gtest/gtest.h>

namespace test
{

/// Parts begin with an empty line and their name. Writes what was found to the file that an environment variable names.
inline void expectWritten(const std::string& found, const std::string& path, const char* variable)
{
  if (const char* const to = std::getenv(variable))
  {
    std::ofstream(to, std::ios::binary) << found;
  }
  std::ifstream file(path, std::ios::binary);
  ASSERT_TRUE(file) << path << ": run in the tests folder";
  std::istringstream lines(found);
  std::string part;
  std::string before;
  std::string written;
  for (std::string line; std::getline(lines, line); before = line)
  {
    part = before.empty() ? line : part;
    ASSERT_TRUE(std::getline(file, written)) << part << "\n"
                                             << line;
    ASSERT_EQ(line, written) << part;
  }
  EXPECT_FALSE(std::getline(file, written)) << written;
}

} // namespace test
