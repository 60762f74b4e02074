/// @file pageFile.h
/// Files that the module makes.
#pragma once

#include <string>

#include "tav/inspect.hpp"

namespace tav::web
{

/// A file in the worker's memory, which keeps it for the page under its name; without one it is gone with the object.
class PageFile final : public inspect::Scratch
{
public:
  explicit PageFile(const std::string& name);

  KORHFile& file() override { return file_; }

private:
  KORHFile file_{};
};

} // namespace tav::web
