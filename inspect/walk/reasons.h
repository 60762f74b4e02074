/// @file reasons.h
#pragma once

#include <vector>

#include "inspect/walk/trial.h"
#include "tav/inspect/form.hpp"

namespace tav::inspect
{

/// Why the first of the trials, which are sorted, is taken for the form of a file.
std::vector<Reason> explainForm(const std::vector<Trial>& trials, const Recognition& result,
                                const Dictionary& dictionary);

} // namespace tav::inspect
