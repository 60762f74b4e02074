// tav snapshot: describes this machine as a stream.
#include <filesystem>
#include <memory>

#include "tav/byteOrder.h"
#include "tools/host/host.h"
#include "tools/host/machine.h"
#include "tools/shell/options.h"
#include "tools/shell/output.h"
#include "tools/shell/report.h"
#include "tools/shell/session.h"

namespace tav::tool
{

namespace
{

void check(uint32_t code, const char* doing)
{
  if (code != TAV_RC_OK)
  {
    throw Failure(kTrouble, Problem{.file = {},
                                    .sentence = std::string(doing) + ": " + std::string(codeSentence(code)),
                                    .code = code});
  }
}

/// Writes nodes in one of the forms; groups are closed by `close`.
class SnapshotWriter
{
public:
  SnapshotWriter(TAVHandle* handle, bool narrow, bool pairs)
      : handle_(handle), narrow_(narrow), pairs_(pairs && !narrow) {}

  void open(uint16_t elm)
  {
    TAVHeaderData group = node(elm, narrow_ ? TAV_TYPE_HEADER32 : TAV_TYPE_HEADER64, 0);
    if (!narrow_)
    {
      group.header.hdr64.size = TAV_SIZE_UNKNOWN;
    }
    check(tavAddElement(0, handle_, &group), "tavAddElement");
  }
  void close() { check(tavCloseHeader(0, handle_), "tavCloseHeader"); }

  void add(uint16_t elm, const std::string& text)
  {
    if (!text.empty())
    {
      add(elm, TAV_TYPE_ASCII_STRING, text.data(), text.size());
    }
  }
  void add(uint16_t elm, const std::optional<uint64_t>& number)
  {
    if (number)
    {
      add(elm, TAV_TYPE_UINT64, &*number, sizeof *number);
    }
  }

private:
  TAVHeaderData node(uint16_t elm, uint16_t type, uint64_t size) const
  {
    TAVHeaderData data{};
    data.header.hdrType = narrow_ ? TAV_HDR_32 : TAV_HDR_64;
    if (narrow_)
    {
      data.header.hdr32 = {static_cast<uint32_t>(size), type, elm};
    }
    else
    {
      data.header.hdr64 = {size, pairs_ ? TAV_INFO_EYE_SIZE : 0, type, elm};
    }
    return data;
  }
  void add(uint16_t elm, uint16_t type, const void* bytes, uint64_t size)
  {
    TAVHeaderData data = node(elm, type, size);
    data.pDataBuf = static_cast<uint8_t*>(const_cast<void*>(bytes)); // only read
    check(tavAddElement(0, handle_, &data), "tavAddElement");
  }

  TAVHandle* handle_;
  bool narrow_;
  bool pairs_;
};

void describe(SnapshotWriter& writer, const host::MachineFacts& facts)
{
  writer.open(TAV_ELM_CMN_SYSTEM);
  writer.open(TAV_ELM_CMN_HOST);
  writer.add(TAV_ELM_CMN_HOST_NAME, facts.hostName);
  writer.add(TAV_ELM_CMN_MACHINE_ID, facts.machine);

  writer.open(TAV_ELM_CMN_OS);
  writer.add(TAV_ELM_CMN_OS_NAME, facts.osName);
  writer.add(TAV_ELM_CMN_OS_RELEASE, facts.osRelease);
  writer.add(TAV_ELM_CMN_OS_VERSION, facts.osVersion);
  writer.close();

  writer.open(TAV_ELM_CMN_CPU);
  writer.add(TAV_ELM_CMN_CPU_CONFIG, facts.cpu.configured);
  writer.add(TAV_ELM_CMN_CPU_ONLINE, facts.cpu.online);
  writer.close();

  writer.open(TAV_ELM_CMN_MEMORY); // all in bytes
  writer.add(TAV_ELM_CMN_MEM_TOTAL, facts.memTotal);
  writer.add(TAV_ELM_CMN_MEM_FREE, facts.memFree);
  writer.add(TAV_ELM_CMN_SWAP_MEM_TOTAL, facts.swapTotal);
  writer.add(TAV_ELM_CMN_SWAP_MEM_FREE, facts.swapFree);
  writer.close();

  writer.close(); // host
  writer.close(); // system
}

bool isSwapped(const Invocation& invocation)
{
  const std::string order = invocation.text("--byte-order", "native");
  return order == "swapped" || order == (kor::isLittleEndian ? "big" : "little");
}

int run(const Invocation& invocation)
{
  constexpr uint64_t room = uint64_t{256} * 1024;
  const std::string root = invocation.text("--root");
  if (root == "64" && invocation.has("--hdr32"))
  {
    throw Failure("snapshot: --hdr32 and --root 64 exclude each other");
  }
  const bool narrow = invocation.has("--hdr32") || root == "32";
  if (narrow && invocation.has("--eye-size"))
  {
    throw Failure("snapshot: " + std::string(root == "32" ? "--root 32" : "--hdr32") +
                      " and --eye-size exclude each other",
                  "only 64-bit headers can announce an eye/size pair");
  }
  Output out(invocation.text("--output", "-"), invocation.has("--force"));
  if (isStandardOutput(invocation.text("--output", "-")) && host::isTerminal(stdout))
  {
    throw Failure("snapshot: a stream is no text for a terminal", "-o FILE writes it to a file");
  }
  // Zeroed: padding is skipped and not written, and shows what was there.
  const auto block = std::make_unique<uint8_t[]>(room);
  TAVSSMemory memory(block.get(), room);
  const uint64_t options = TAV_OPT_WRITE | (narrow ? TAV_OPT_ROOT32 : 0);
  TAVInitParam param(&memory, options, kDefaultRing, 0, isSwapped(invocation) ? TAV_BYTE_ORDER_SWAPPED : uint8_t{0},
                     invocation.has("--align") ? uint8_t{1} : uint8_t{0});
  TAVHandle* handle = nullptr;
  check(tavInitHandle(&handle, &param), "tavInitHandle");
  const auto closing = [](TAVHandle* open) { tavTermHandle(&open); };
  const std::unique_ptr<TAVHandle, decltype(closing)> closer(handle, closing);
  SnapshotWriter writer(handle, narrow, invocation.has("--eye-size"));
  describe(writer, host::describeMachine());
  out.write(std::span<const uint8_t>(block.get(), static_cast<size_t>(handle->streamBytes)));
  out.commit();
  return kFine;
}

const Registration registration{{
    .place = 10,
    .name = "snapshot",
    .arguments = "",
    .summary = "describes this machine as a stream",
    .description = "Writes a stream with the host's name, operating system, processors and memory (in bytes).",
    .options = {{.names = "-o,--output",
                 .kind = ValueKind::file,
                 .value = "FILE",
                 .help = "where to; standard output unless given"},
                {.names = "--eye-size", .help = "end every node with an eye/size pair"},
                {.names = "--hdr32", .help = "32-bit headers, as with --root 32"}},
    .concerns = kForm | kCalls,
    .examples = {{"tav snapshot -o x.tav", "write one"},
                 {"tav snapshot --byte-order big --align -o y.tav", "in another form"},
                 {"tav snapshot | tav tree -", "look at this machine"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
