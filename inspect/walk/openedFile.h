/// @file openedFile.h
/// Opening a file for a source of bytes.
#pragma once

#include <memory>
#include <string>

#include "tav/inspect/problem.hpp"
#include "tav/inspect/source.hpp"
#include "tav/tav.h"

namespace tav::inspect
{

/// Opens a regular file by its path, UTF-8, as a TAVSSFile or a class of it. Throws Error when that does not work.
template<class File = TAVSSFile>
std::unique_ptr<File> openedFile(const std::string& path)
{
  KORFileOpenParam param;
  param.pPath = path.c_str();
  param.options = KOR_FILE_READ;
  uint32_t code = TAV_RC_OK;
  auto file = std::make_unique<File>(&param, &code);
  file->ioUnit = 4 * ByteSource::kPage; // of a ring over it: a node somewhere in a large file is read by one page
  if (code != TAV_RC_OK)
  {
    failAt(path, code);
  }
  return file;
}

} // namespace tav::inspect
