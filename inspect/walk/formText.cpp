// How a form is told.
#include "tav/inspect/form.hpp"

#include "tav/inspect/phrases.hpp"

namespace tav::inspect
{

std::string otherStreamText(const Form& form)
{
  return "a stream in another form seems to begin: " + orderText(form) + ", " + (form.root64 ? "64" : "32") +
         "-bit root header";
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

} // namespace tav::inspect
