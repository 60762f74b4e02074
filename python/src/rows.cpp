#include "python/src/rows.h"

#include "tav/inspect/problem.hpp"

namespace tav::python
{

/// Looks through the rows from one on.
void Rows::sort(size_t from)
{
  using inspect::ValueKind;
  for (size_t row = from; row < columns.count(); ++row)
  {
    switch (columns.kind[row])
    {
    case ValueKind::number:
    {
      const bool isUpper = (columns.number[row] >> 63U) != 0;
      const bool isSigned = isUpper && isSignedNumber(columns.type[row]);
      hasNegative |= isSigned;
      hasUpper |= isUpper && !isSigned;
      break;
    }
    case ValueKind::text:
      texts.push_back(row);
      break;
    case ValueKind::bytes:
      bytes.push_back(row);
      break;
    case ValueKind::wide:
      hasWide = true;
      break;
    default:
      break;
    }
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
    sort(from);
    pass.at(columns.offset[columns.count() - 1]);
  }
  if (reader.stopped())
  {
    throw inspect::Error(*reader.stopped());
  }
}

} // namespace tav::python
