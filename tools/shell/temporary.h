/// @file temporary.h
/// Temporary files of the program: gone at its end, and when it is interrupted.
#pragma once

#include <memory>
#include <string>

#include "tav/inspect/scratch.hpp"

namespace tav::tool
{

/// A file in the folder for temporary files. Where an open file can be removed it has no name from the beginning, else
/// it is removed with the object or by an interrupt.
class Temporary final : public inspect::Scratch
{
public:
  Temporary();
  ~Temporary() override;
  Temporary(const Temporary&) = delete;
  Temporary& operator=(const Temporary&) = delete;

  KORHFile& file() override { return file_; }

  static std::unique_ptr<inspect::Scratch> make() { return std::make_unique<Temporary>(); }

private:
  KORHFile file_{};
  std::string path_{}; ///< to be removed
};

} // namespace tav::tool
