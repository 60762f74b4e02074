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
  Event event;
  while (walker.next(event))
  {
    if (options.progress)
    {
      options.progress(event.offset);
    }
    writer.add(walker, event);
  }
  writer.end();
  return writer.foundDamage();
}

LeftOut fromJson(TextSource& document, PatchFile& out, const Conversion& conversion)
{
  StreamEncoder encoder(out, conversion);
  DocumentReader(document, encoder).read();
  return {encoder.leftOut(), encoder.leftOutBytes()};
}

} // namespace tav::inspect
