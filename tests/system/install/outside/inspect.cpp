// A user's program: looks into bytes whose form it does not know, and exits with 0 when every node is found in the XML.
#include <cstdint>
#include <string>

#include <tav/inspect.hpp>
#include <tav/tav.hpp>

namespace
{

class Text final : public tav::inspect::Sink
{
public:
  void write(std::string_view bytes) override { text += bytes; }

  std::string text;
};

} // namespace

int main()
{
  tav::Writer writer;
  {
    tav::Group system = writer.group(TAV_ELM_CMN_SYSTEM);
    system.add(TAV_ELM_CMN_HOST_NAME, "ada");
    system.add(TAV_ELM_CMN_CPU_ONLINE, uint32_t{8});
  }
  writer.finish();
  const auto bytes = writer.bytes();
  tav::inspect::ByteSource source("memory",
                                  std::span(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size()));
  const tav::inspect::Recognition found = tav::inspect::recognise(source);
  Text xml;
  const bool damaged = tav::inspect::toXml(source, found.form, xml);
  return found.isStream && !damaged && xml.text.find(">ada</hostName>") != std::string::npos ? 0 : 1;
}
