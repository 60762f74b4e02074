/// @file sink.hpp
/// Where results go.
#pragma once

#include <string_view>

#include "tav/inspect/api.hpp"

namespace tav::inspect
{

/// Takes a result piece after piece. What goes wrong it throws; the work then ends with that.
class TAV_INSPECT_API Sink
{
public:
  virtual ~Sink() = default;
  virtual void write(std::string_view bytes) = 0;
};

} // namespace tav::inspect
