/// The passes of the C++ layer, one each.
#pragma once

#include <optional>
#include <span>
#include <vector>

#include "bench/workload.hpp"
#include "tav/tav.hpp"

namespace library
{

/// Writes the stream and finishes it.
void writeTree(tav::Writer& writer, const snapshot::Model& model, size_t hosts = 1);
size_t encodeLayer(const snapshot::Model& model, std::span<std::byte> block);
/// By a writer with a buffer of its own, which is made anew.
std::span<const std::byte> encodeLayerGrowing(const snapshot::Model& model, std::optional<tav::Writer>& writer);
uint64_t walkLayerChildren(std::span<const std::byte> stream);
/// By descendants, too.
uint64_t sumLayer(const tav::Reader& reader);
uint64_t walkLayerDescendants(std::span<const std::byte> stream);
/// Path objects for the random paths, below the root.
std::vector<tav::Path> layerPaths();
uint64_t findIndexed(const tav::Index& index, const tav::Path& path);
uint64_t findLayer(const tav::Reader& reader, const tav::Path& path);

} // namespace library
