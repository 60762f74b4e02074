/// The byte layout as the library's own code uses it.
#pragma once

#include "tav/layout.hpp"

namespace tav
{
using namespace layout;
} // namespace tav
