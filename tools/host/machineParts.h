/// @file machineParts.h
/// The parts of a look at the machine.
#pragma once

#include "tools/host/machine.h"

namespace tav::host
{
std::vector<DiskFacts> lookAtDisks();
std::vector<FileSystemFacts> lookAtFileSystems();
std::vector<NetworkFacts> lookAtNetworks();
/// `times` are those of the last look, and of this one when it returns.
std::vector<ProcessFacts> lookAtProcesses(std::map<uint64_t, uint64_t>& times);
} // namespace tav::host
