// How a form is told.
#include "tools/form.h"

#include "tools/report.h"

namespace tav::tool
{

std::string otherStreamText(const Form& form)
{
  return "a stream in another form seems to begin: " + orderText(form) + ", " + (form.root64 ? "64" : "32") +
         "-bit root header";
}

std::string fromText(const ByteSource& source, uint64_t offset)
{
  return "--from " + hexOffset(source.from() + offset);
}

std::string orderText(const Form& form)
{
  return form.swapped != kor::isLittleEndian ? "little-endian" : "big-endian";
}

std::string formText(const Form& form)
{
  return orderText(form) + ", " + (form.root64 ? "64" : "32") + "-bit root header, " +
         (form.aligned ? "padded to 8" : "not padded");
}

} // namespace tav::tool
