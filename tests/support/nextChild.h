/// The fixture of tests that step to first children and siblings.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include <gtest/gtest.h>

#include "support/byteRows.h"
#include "support/streams.h"
#include "support/traceLog.h"
#include "tav/probes.h"
#include "tav/tav.h"

namespace test
{

class NextChildTest : public ::testing::TestWithParam<Form>
{
protected:
  /// Opens what `rows` holds; `form` may differ from the parameter.
  void open(const Form& form) { reader = std::make_unique<StreamReader>(rows.bytes, form); }
  uint32_t next(TAVHeader* parent, TAVHeader* reference)
  {
    if (reader == nullptr)
    {
      open(GetParam());
    }
    out = untouched();
    trace.clear();
    return tavGetNextChild(0, reader->handle(), parent, reference, &out);
  }
  [[nodiscard]] uint64_t offset() const { return out.header.nodeOffset; }
  [[nodiscard]] std::vector<Failure> failures() const { return trace.failuresOf(tav::probe::getNextChild); }
  static std::vector<Failure> one(uint32_t point, uint32_t code) { return {{tav::probe::getNextChild, point, code}}; }
  /// What reading a header at the end of the stream gives.
  [[nodiscard]] uint32_t endCode() const { return GetParam().buffered ? TAV_RC_END_OF_STORAGE : TAV_RC_NO_MEMORY; }

  ByteRows rows{GetParam().swap};
  std::unique_ptr<StreamReader> reader;
  TAVHeaderData out = untouched();
  TraceLog trace;
};

} // namespace test
