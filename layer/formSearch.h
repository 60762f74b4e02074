/// @file formSearch.h
/// In which form a file's first stream is written.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "layer/fileBytes.h"
#include "layer/rootSearch.h"

namespace tav::detail
{

/// Finds out in which form a file is written: by its first root, and for a root that has no flags by the nodes behind.
class FormSearch
{
public:
  explicit FormSearch(FileBytes& bytes) noexcept
      : bytes_(bytes)
  {
  }

  /// `given`: what the caller says that it is, or null.
  uint32_t run(const StreamForm* given, StreamForm& form, std::string& sentence);

private:
  uint32_t tryForm(StreamForm form, std::vector<StreamForm>& possible);
  void keep(const StreamForm& form, const TAVHeader& root, std::vector<StreamForm>& possible);
  uint32_t follow(const StreamForm& form, const TAVHeader& root, bool& fits);
  static uint32_t compare(const StreamForm& given, const std::vector<StreamForm>& possible, StreamForm& form,
                          std::string& sentence);
  static uint32_t choose(const std::vector<StreamForm>& possible, StreamForm& form, std::string& sentence);

  FileBytes& bytes_;
  std::vector<StreamForm> overrunning_;
};

} // namespace tav::detail
