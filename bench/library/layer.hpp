/// The passes of the C++ layer, one each.
#pragma once

#include <span>
#include <vector>

#include "bench/workload.hpp"
#include "tav/tav.hpp"

namespace library
{

size_t encodeLayer(const snapshot::Model& model, std::span<std::byte> block);
uint64_t walkLayerChildren(std::span<const std::byte> stream);
uint64_t walkLayerDescendants(std::span<const std::byte> stream);
/// Path objects for the random paths, below the root.
std::vector<tav::Path> layerPaths();
uint64_t findLayer(const tav::Reader& reader, const tav::Path& path);

} // namespace library
