/// @file names.h
/// The program is a shell around the inspection library and uses its names as its own.
#pragma once

namespace tav::inspect
{
struct Node;
class Path;
} // namespace tav::inspect

namespace tav::tool
{
using namespace inspect;
using inspect::Node; // and not the C++ layer's
using inspect::Path;
} // namespace tav::tool
