/// @file names.h
/// The program is a shell around the inspection library and uses its names as its own.
#pragma once

namespace tav::inspect
{
}

namespace tav::tool
{
using namespace inspect;
}
