/// What the tests of judging, searching and recovering have in common.
#pragma once

#include <cstdint>
#include <span>
#include <utility>

#include <gtest/gtest.h>

#include "inspect/recover/judge.h"
#include "inspect/streams.h"
#include "support/byteRows.h"

namespace test
{

/// Bytes, the place that they are judged from, and the judge.
class Judged
{
public:
  Judged(Bytes all, const tav::inspect::Form& form)
      : bytes(std::move(all)), source("x", std::span<const uint8_t>(bytes)), place(form, bytes.size()),
        judge(source, form, place) {}

  Bytes bytes;
  tav::inspect::ByteSource source;
  tav::inspect::Place place;
  tav::inspect::Judge judge;
};

/// Rows of bytes in this machine's byte order and in the other one.
class BothOrders : public testing::TestWithParam<bool>
{
protected:
  /// A value of four bytes, without a pair.
  void number(uint16_t elm = TAV_ELM_CMN_CPU_ONLINE, uint32_t info = 0)
  {
    rows.h64(4, info, TAV_TYPE_UINT32, elm).number(9, 4);
  }

  ByteRows rows{GetParam()};
  tav::inspect::Form form{.swapped = GetParam()};
};

} // namespace test
