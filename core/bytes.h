/// The bytes that the library's own steps go over.
#pragma once

#include "core/word.h"
#include "tav/core/bytes.hpp"

namespace tav::core
{

template<class Form>
using BlockBytes = BlockOf<Form, LibraryWay>;

template<class Form>
using RingBytes = RingOf<Form, LibraryWay>;

} // namespace tav::core
