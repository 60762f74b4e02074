/// @file names.h
/// The program is a shell around the inspection library and uses its names as its own.
#pragma once

#include "tav/inspect/node.hpp"
#include "tav/inspect/path.hpp"

namespace tav::tool
{
using namespace inspect;
using inspect::Node; // and not the C++ layer's
using inspect::Path;
} // namespace tav::tool
