/// A table by several threads.
#pragma once

#include <functional>
#include <optional>
#include <vector>

#include "tav/inspect/plan.hpp"
#include "tav/inspect/table.hpp"

namespace tav::inspect
{

/// The parts that several threads read; none where one thread does it as well, or has to.
std::vector<Part> tableParts(ByteSource& source, const Form& form, const TableQuery& query,
                             const TableOptions& options);

/// As readTable.
std::optional<Problem> readTableParts(ByteSource& source, const Form& form, const TableQuery& query,
                                      const TableOptions& options, const std::vector<Part>& parts,
                                      const std::function<void(const Table&)>& rows);

} // namespace tav::inspect
