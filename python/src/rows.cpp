#include "python/src/rows.h"

#include "tav/inspect/problem.hpp"

namespace tav::python
{

/// Looks through the numbers from one on. Most columns have none whose first bit is set, which is seen without looking
/// at their kinds and types.
void Rows::seeNumbers(size_t from)
{
  using inspect::ValueKind;
  const uint64_t* const numbers = columns.number.data();
  const ValueKind* const kinds = columns.kind.data();
  const size_t count = columns.count();
  uint64_t all = 0;
  bool wide = false;
  for (size_t row = from; row < count; ++row)
  {
    all |= numbers[row];
    wide |= kinds[row] == ValueKind::wide;
  }
  hasWide |= wide;
  for (size_t row = from; row < count && (all >> 63U) != 0; ++row)
  {
    const bool isUpper = kinds[row] == ValueKind::number && (numbers[row] >> 63U) != 0;
    const bool isSigned = isUpper && isSignedNumber(columns.type[row]);
    hasNegative |= isSigned;
    hasUpper |= isUpper && !isSigned;
  }
}

void Rows::fill(inspect::ByteSource& source, bool withPaths, Pass& pass)
{
  inspect::NodeReaderOptions options;
  options.onDamage = opened_->onDamage;
  options.paths = withPaths;
  options.passedOver = [this](const inspect::PassedOver& passed) {
    opened_->passedOver.emplace(std::pair(passed.offset, passed.rule), passed.length);
  };
  inspect::NodeReader reader(source, opened_->document.form(), options);
  reader.tellProgress([&pass](uint64_t offset) { pass.at(offset); });
  for (size_t from = 0; reader.next(columns); from = columns.count())
  {
    seeNumbers(from);
    pass.at(columns.offset[columns.count() - 1]);
  }
  if (reader.stopped())
  {
    throw inspect::Error(*reader.stopped());
  }
}

} // namespace tav::python
