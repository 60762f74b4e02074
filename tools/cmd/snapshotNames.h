/// @file snapshotNames.h
/// Elements of snapshots that the dictionary has no name for. packaging/snapshot-names.json names them, with kinds,
/// units and texts; ids stay what they are, since streams have them.
#pragma once

#include <cstdint>

namespace tav::tool::own
{

enum : uint16_t
{
  systemLoad = 44000,
  uptime = 44001,
  load1 = 44002,
  load5 = 44003,
  load15 = 44004,
  running = 44005,
  threads = 44006,
  switches = 44007,
  interrupts = 44008,
  started = 44009,
  cpuUser = 44010,
  cpuNice = 44011,
  cpuSystem = 44012,
  cpuIdle = 44013,
  cpuWait = 44014,
  cpuInterrupt = 44015,
  cpuStolen = 44016,
  buffers = 44017,
  cached = 44018,
  dirty = 44019,
  disk = 44020,
  diskName = 44021,
  diskReads = 44022,
  diskReadBytes = 44023,
  diskWrites = 44024,
  diskWrittenBytes = 44025,
  diskBusy = 44026,
  fileSystem = 44027,
  fsFolder = 44028,
  fsDevice = 44029,
  fsKind = 44030,
  fsAvailable = 44031,
  network = 44032,
  netName = 44033,
  netReceivedBytes = 44034,
  netReceivedPackets = 44035,
  netReceiveErrors = 44036,
  netReceiveDrops = 44037,
  netSentBytes = 44038,
  netSentPackets = 44039,
  netSendErrors = 44040,
  netSendDrops = 44041,
  process = 44042,
  processId = 44043,
  processName = 44044,
  processTime = 44045,
  processRecent = 44046,
  processMemory = 44047,
  processThreads = 44048
};

} // namespace tav::tool::own
