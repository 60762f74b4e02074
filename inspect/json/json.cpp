#include "tav/inspect/json.hpp"

#include "inspect/json/encoder.h"
#include "inspect/json/reader.h"
#include "tav/inspect/walker.hpp"

namespace tav::inspect
{

bool toJson(ByteSource& source, const Form& form, Sink& out, const ToJsonOptions& options)
{
  Walker walker(source, form);
  JsonWriter writer(source, form, out, options.style, options.safe);
  writer.begin();
  bool damaged = false;
  Event event;
  while (walker.next(event))
  {
    if (options.progress)
    {
      options.progress(event.offset);
    }
    damaged = damaged || event.what == What::damaged || event.what == What::unread;
    writer.add(walker, event);
  }
  writer.end();
  return damaged;
}

LeftOut fromJson(TextSource& document, PatchFile& out, const Conversion& conversion)
{
  StreamEncoder encoder(out, conversion);
  DocumentReader(document, encoder, conversion.dictionary).read();
  return {encoder.leftOut(), encoder.leftOutBytes()};
}

} // namespace tav::inspect
