/// Whole lives of streams, over a file through a ring and over memory.
#pragma once

#include <functional>
#include <string>

#include "steps.h"

namespace faults
{

/// A scenario gets the path of a file of its own. What it gives is compared with what it gives when nothing fails.
struct Scenario
{
  const char* name;
  std::function<std::string(Steps&, const std::string& path)> run;
};

std::ostream& operator<<(std::ostream& out, const Scenario& scenario);

/// Writes to a file: groups, elements in a page, over pages and larger than the ring, an abandoned group, updates.
std::string writeFile(Steps& steps, const std::string& path);
/// The same in memory of the library's own.
std::string writeMemory(Steps& steps, const std::string& path);
/// Groups nested so deeply that the header stack grows, and their validation.
std::string nestDeeply(Steps& steps, const std::string& path);
/// Writes a file, uses the handle once more from the start, as a reader of the file finds it.
std::string resetHandle(Steps& steps, const std::string& path);
/// Everything that reads, on a file that is there.
std::string readFile(Steps& steps, const std::string& path);
/// The same on memory.
std::string readMemory(Steps& steps, const std::string& path);

/// What is done with files by their paths: links are followed, a folder is listed and made durable, a file removed.
std::string followPaths(Steps& steps, const std::string& path);

/// The size of a device, which only its end tells.
std::string askDevice(Steps& steps, const std::string& path);

/// The bytes of a file.
std::string contentOf(const std::string& path);

} // namespace faults
