// tav snapshot: describes this machine as a stream.
#include <algorithm>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "tav/byteOrder.h"
#include "tav/tav.hpp"
#include "tools/cmd/snapshotNames.h"
#include "tools/cmd/snapshotSeries.h"
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

  /// Names that have other characters than those of ASCII have a question mark for each byte of them.
  void add(uint16_t elm, std::string text)
  {
    if (!text.empty())
    {
      std::replace_if(
          text.begin(), text.end(), [](char letter) { return (letter & 0x80) != 0; }, '?');
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

void describeProcessors(SnapshotWriter& writer, const host::CpuFacts& cpu)
{
  writer.open(TAV_ELM_CMN_CPU);
  writer.add(TAV_ELM_CMN_CPU_CONFIG, cpu.configured);
  writer.add(TAV_ELM_CMN_CPU_ONLINE, cpu.online);
  writer.add(TAV_ELM_CMN_CPU_SPEED, cpu.speed);
  writer.add(TAV_ELM_CMN_CPU_HMT, cpu.threadsPerCore);
  writer.add(TAV_ELM_CMN_CPU_CORES_PER_SOCKET, cpu.coresPerSocket);
  writer.add(TAV_ELM_CMN_CPU_TOTAL_USAGE, cpu.usage);
  writer.add(own::cpuUser, cpu.userTime);
  writer.add(own::cpuNice, cpu.niceTime);
  writer.add(own::cpuSystem, cpu.systemTime);
  writer.add(own::cpuIdle, cpu.idleTime);
  writer.add(own::cpuWait, cpu.waitTime);
  writer.add(own::cpuInterrupt, cpu.interruptTime);
  writer.add(own::cpuStolen, cpu.stolenTime);
  writer.close();
}

host::Fact sum(const host::Fact& a, const host::Fact& b)
{
  return a && b ? host::Fact(*a + *b) : std::nullopt;
}

void describeMemory(SnapshotWriter& writer, const host::MemoryFacts& memory)
{
  writer.open(TAV_ELM_CMN_MEMORY); // all in bytes
  writer.add(TAV_ELM_CMN_MEM_TOTAL, memory.total);
  writer.add(TAV_ELM_CMN_MEM_FREE, memory.free);
  writer.add(TAV_ELM_CMN_MEM_AVAIL, memory.available);
  writer.add(TAV_ELM_CMN_SWAP_MEM_TOTAL, memory.swapTotal);
  writer.add(TAV_ELM_CMN_SWAP_MEM_FREE, memory.swapFree);
  writer.add(TAV_ELM_CMN_VIRT_MEM_TOTAL, sum(memory.total, memory.swapTotal));
  writer.add(TAV_ELM_CMN_VIRT_MEM_RESERVED, memory.reserved);
  writer.add(TAV_ELM_CMN_VIRT_MEM_AVAIL, sum(memory.available, memory.swapFree));
  writer.add(TAV_ELM_CMN_VIRT_MEM_FREE, sum(memory.free, memory.swapFree));
  writer.add(own::buffers, memory.buffers);
  writer.add(own::cached, memory.cached);
  writer.add(own::dirty, memory.dirty);
  writer.close();
}

void describeLoad(SnapshotWriter& writer, const host::LoadFacts& load)
{
  writer.open(own::systemLoad);
  writer.add(own::uptime, load.uptime);
  writer.add(own::load1, load.last1);
  writer.add(own::load5, load.last5);
  writer.add(own::load15, load.last15);
  writer.add(own::running, load.running);
  writer.add(own::threads, load.processes);
  writer.add(own::switches, load.switches);
  writer.add(own::interrupts, load.interrupts);
  writer.add(own::started, load.started);
  writer.close();
}

void describe(SnapshotWriter& writer, const host::DiskFacts& disk)
{
  writer.open(own::disk);
  writer.add(own::diskName, disk.name);
  writer.add(own::diskReads, disk.reads);
  writer.add(own::diskReadBytes, disk.readBytes);
  writer.add(own::diskWrites, disk.writes);
  writer.add(own::diskWrittenBytes, disk.writtenBytes);
  writer.add(own::diskBusy, disk.busyTime);
  writer.close();
}

void describe(SnapshotWriter& writer, const host::FileSystemFacts& fileSystem)
{
  writer.open(own::fileSystem);
  writer.add(own::fsFolder, fileSystem.folder);
  writer.add(own::fsDevice, fileSystem.device);
  writer.add(own::fsKind, fileSystem.kind);
  writer.add(SQLM_ELM_FS_ID, fileSystem.id);
  writer.add(SQLM_ELM_FS_TOTAL_SZ, fileSystem.total);
  writer.add(SQLM_ELM_FS_USED_SZ, fileSystem.used);
  writer.add(own::fsAvailable, fileSystem.available);
  writer.close();
}

void describe(SnapshotWriter& writer, const host::NetworkFacts& network)
{
  writer.open(own::network);
  writer.add(own::netName, network.name);
  writer.add(own::netReceivedBytes, network.received.bytes);
  writer.add(own::netReceivedPackets, network.received.packets);
  writer.add(own::netReceiveErrors, network.received.errors);
  writer.add(own::netReceiveDrops, network.received.drops);
  writer.add(own::netSentBytes, network.sent.bytes);
  writer.add(own::netSentPackets, network.sent.packets);
  writer.add(own::netSendErrors, network.sent.errors);
  writer.add(own::netSendDrops, network.sent.drops);
  writer.close();
}

void describe(SnapshotWriter& writer, const host::ProcessFacts& process)
{
  writer.open(own::process);
  writer.add(own::processId, host::Fact(process.id));
  writer.add(own::processName, process.name);
  writer.add(own::processTime, host::Fact(process.time));
  writer.add(own::processRecent, host::Fact(process.recent));
  writer.add(own::processMemory, host::Fact(process.memory));
  writer.add(own::processThreads, host::Fact(process.threads));
  writer.close();
}

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

  describeProcessors(writer, facts.cpu);
  describeMemory(writer, facts.memory);
  describeLoad(writer, facts.load);
  const auto each = [&writer](const auto& all) {
    for (const auto& one : all)
    {
      describe(writer, one);
    }
  };
  each(facts.disks);
  each(facts.fileSystems);
  each(facts.networks);
  each(facts.processes);

  writer.close(); // host
  writer.close(); // system
}

bool isSwapped(const Invocation& invocation)
{
  const std::string order = invocation.text("--byte-order", "native");
  return order == "swapped" || order == (kor::isLittleEndian ? "big" : "little");
}

/// The stream of this machine as it is now.
std::vector<uint8_t> makeSnapshot(host::Machine& machine, const SnapshotForm& form)
{
  constexpr size_t room = size_t{1024} * 1024;
  std::vector<uint8_t> block(room); // zeroed: padding is skipped and not written, and shows what was there
  TAVSSMemory memory(block.data(), room);
  const bool narrow = form.stream.root == Width::bits32;
  const uint64_t options = TAV_OPT_WRITE | (narrow ? TAV_OPT_ROOT32 : 0);
  TAVInitParam param(&memory, options, kDefaultRing, 0,
                     form.stream.byteOrder == ByteOrder::swapped ? TAV_BYTE_ORDER_SWAPPED : uint8_t{0},
                     form.stream.align8 ? uint8_t{1} : uint8_t{0});
  TAVHandle* handle = nullptr;
  check(tavInitHandle(&handle, &param), "tavInitHandle");
  const auto closing = [](TAVHandle* open) { tavTermHandle(&open); };
  const std::unique_ptr<TAVHandle, decltype(closing)> closer(handle, closing);
  SnapshotWriter writer(handle, narrow, form.pairs);
  describe(writer, machine.look());
  block.resize(static_cast<size_t>(handle->streamBytes));
  return block;
}

/// What is below the root, without what ends it.
std::span<const std::byte> nodesOf(const std::vector<uint8_t>& snapshot, const SnapshotForm& form)
{
  const bool wide = form.stream.root == Width::bits64;
  const uint64_t header = layout::headerLength(wide ? TAV_HDR_64 : TAV_HDR_32);
  const uint64_t end = form.pairs ? layout::endElementLength(wide) : 0;
  return std::as_bytes(std::span(snapshot)).subspan(header, snapshot.size() - header - end);
}

int run(const Invocation& invocation)
{
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
  const SnapshotForm form{{.byteOrder = isSwapped(invocation) ? ByteOrder::swapped : ByteOrder::native,
                           .align8 = invocation.has("--align"),
                           .root = narrow ? Width::bits32 : Width::bits64},
                          invocation.has("--eye-size")};
  host::Machine machine;
  if (invocation.has("--append"))
  {
    return appendSnapshots(invocation, form,
                           [&](const auto& take) { take(nodesOf(makeSnapshot(machine, form), form)); });
  }
  refuseSeries(invocation);
  Output out(invocation.text("--output", "-"), invocation.has("--force"));
  if (isStandardOutput(invocation.text("--output", "-")) && host::isTerminal(stdout))
  {
    throw Failure("snapshot: a stream is no text for a terminal", "-o FILE writes it to a file");
  }
  const std::vector<uint8_t> bytes = makeSnapshot(machine, form);
  out.write(std::span<const uint8_t>(bytes));
  out.commit();
  return kFine;
}

const Registration registration{{
    .place = 10,
    .name = "snapshot",
    .arguments = "",
    .summary = "describes this machine as a stream",
    .description =
        "Writes a stream with the host's name, operating system, processors, memory (in bytes) and load, its disks,\n"
        "file systems and networks, and the ten busiest processes. Elements that the dictionary has no name for are\n"
        "named in snapshot-names.json, which the package brings.\n\n"
        "With --append the snapshot goes behind the last stream of a file, which must have the form that the "
        "options say; a root that a killed program left open is closed first. A file that another program "
        "records into is refused.",
    .options =
        {{.names = "-o,--output",
          .kind = ValueKind::file,
          .value = "FILE",
          .help = "where to; standard output unless given"},
         {.names = "--append",
          .help = "go on at the end of FILE, with the time of the snapshot; it is on the device when the "
                  "command ends"},
         {.names = "--every",
          .kind = ValueKind::text,
          .value = "TIME",
          .help = "with --append: a snapshot every 500ms, 5s, 1m, 2h, until interrupted"},
         {.names = "--count", .kind = ValueKind::number, .value = "N", .help = "with --every: end after so many"},
         {.names = "--rotate",
          .kind = ValueKind::number,
          .value = "SIZE",
          .help = "with --append: change the file when it has SIZE bytes; %n in FILE is its number"},
         {.names = "--keep",
          .kind = ValueKind::number,
          .value = "N",
          .help = "with --rotate: remove all but the last N files"},
         {.names = "--eye-size", .help = "end every node with an eye/size pair"},
         {.names = "--hdr32", .help = "32-bit headers, as with --root 32"}},
    .concerns = kForm | kCalls,
    .examples = {{"tav snapshot -o x.tav", "write one"},
                 {"tav snapshot --byte-order big --align -o y.tav", "in another form"},
                 {"tav snapshot --append --every 5s --rotate 64M --keep 7 -o day-%n.tav", "record this machine"},
                 {"tav snapshot | tav tree -", "look at this machine"}},
    .run = run,
}};

} // namespace

} // namespace tav::tool
