#include "web/module/pageFile.h"

#include <memory>

namespace tav::web
{

PageFile::PageFile(const std::string& name)
{
  KORFileOpenParam param;
  param.pPath = name.c_str();
  param.options = KOR_FILE_UPDATE | KOR_FILE_CREATE;
  const uint32_t code = file_.open(&param);
  if (code != TAV_RC_OK)
  {
    inspect::failAt(name, code);
  }
}

} // namespace tav::web

namespace tav::inspect
{

/// In place of the library's, which asks for a folder for temporary files: there is none here.
std::unique_ptr<Scratch> makeScratch()
{
  return std::make_unique<web::PageFile>("");
}

} // namespace tav::inspect
