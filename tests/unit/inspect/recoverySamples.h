/// Small sound streams that have between them what a recovery knows of.
#pragma once

#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "inspect/streams.h"
#include "support/byteRows.h"

namespace test
{

/// A stream, and how it is read.
struct Sample
{
  std::string name;
  Bytes bytes;
  tav::inspect::Form form;
};

/// Lays out a sample, without the library's writer. Little-endian everywhere: what is recovered is written down.
class SampleRows
{
public:
  static constexpr uint32_t kEye = TAV_INFO_EYE_SIZE;
  static constexpr uint32_t kPad = TAV_INFO_ALIGNED8;

  /// Whether the nodes that follow have 64-bit headers.
  explicit SampleRows(bool wide = true)
      : wide_(wide) {}

  SampleRows& open(uint32_t info = 0, bool wideChildren = true, uint16_t elm = TAV_ELM_CMN_HOST)
  {
    groups_.push_back({rows_.at(), info, wide_, wideChildren});
    header(0, info, wideChildren ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32, elm);
    wide_ = wideChildren;
    return *this;
  }
  SampleRows& close()
  {
    const Group group = groups_.back();
    if ((group.info & kEye) != 0)
    {
      header(16, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE);
      rows_.pair(rows_.at() - group.start - (group.wideChildren ? 0 : 8));
    }
    setSize(group, rows_.at() - group.start - (group.wide ? 16 : 8));
    return leave();
  }
  /// The group stays as a writer leaves it that stopped.
  SampleRows& abandon()
  {
    setSize(groups_.back(), TAV_SIZE_UNKNOWN);
    return leave();
  }
  /// The group has a size of 0 and ends by a mark.
  SampleRows& mark()
  {
    header(0, 0, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_MARKER);
    return leave();
  }
  SampleRows& data(uint16_t type, const Bytes& payload, uint32_t info = 0, uint16_t elm = TAV_ELM_CMN_HOST_NAME,
                   uint64_t extra = 0)
  {
    header(payload.size(), info, type, elm);
    rows_.data(payload).fill(extra, 0x11);
    rows_.fill((info & kPad) != 0 ? (8 - payload.size() % 8) % 8 : 0);
    if (wide_ && (info & kEye) != 0)
    {
      rows_.pair(16 + payload.size());
    }
    return *this;
  }
  SampleRows& number(uint32_t info = 0, uint16_t elm = TAV_ELM_CMN_CPU_ONLINE)
  {
    return data(TAV_TYPE_UINT32, {9, 0, 0, 0}, info, elm);
  }
  SampleRows& bytes(uint64_t size, uint32_t info = 0) { return data(TAV_TYPE_BINARY, Bytes(size, 0x77), info); }
  /// Text of a code page, perhaps with the two bytes behind it that it does not count.
  SampleRows& text(uint64_t size, uint32_t info = 0, uint64_t extra = 0)
  {
    Bytes payload(size, 'a');
    payload[0] = 0xE9;
    payload[1] = 0xFD; // 65001
    return data(TAV_TYPE_UTF8_STRING, payload, info, TAV_ELM_CMN_HOST_NAME, extra);
  }
  SampleRows& zeros(uint64_t count)
  {
    rows_.fill(count);
    return *this;
  }

  const Bytes& made() const { return rows_.bytes; }

private:
  struct Group
  {
    uint64_t start = 0;
    uint32_t info = 0;
    bool wide = true;
    bool wideChildren = true;
  };

  void header(uint64_t size, uint32_t info, uint16_t type, uint16_t elm)
  {
    wide_ ? rows_.h64(size, info, type, elm) : rows_.h32(size, type, elm);
  }
  void setSize(const Group& group, uint64_t size)
  {
    const Bytes field = ByteRows(kBigEndianHost).number(size, group.wide ? 8 : 4).bytes;
    std::copy(field.begin(), field.end(), rows_.bytes.begin() + static_cast<ptrdiff_t>(group.start));
  }
  SampleRows& leave()
  {
    wide_ = groups_.back().wide;
    groups_.pop_back();
    return *this;
  }

  ByteRows rows_{kBigEndianHost};
  bool wide_;
  std::vector<Group> groups_{};
};

inline std::vector<Sample> recoverySamples()
{
  constexpr uint32_t kEye = SampleRows::kEye;
  constexpr uint32_t kPad = SampleRows::kPad;
  constexpr uint16_t kUnknownElement = 12345;
  constexpr uint16_t kUnknownType = 77;
  const tav::inspect::Form wide{.swapped = kBigEndianHost};
  const tav::inspect::Form narrow{.swapped = kBigEndianHost, .root64 = false};
  const tav::inspect::Form padded{.swapped = kBigEndianHost, .aligned = true};
  const Bytes inner = SampleRows().open().number().number().close().made();
  return {
      {"groups without pairs",
       SampleRows()
           .open()
           .number()
           .open()
           .number()
           .bytes(5)
           .close()
           .number()
           .open()
           .open()
           .number()
           .close()
           .close()
           .close()
           .made(),
       wide},
      {"groups with pairs",
       SampleRows()
           .open(kEye)
           .open(kEye)
           .close()
           .number(kEye)
           .open(kEye)
           .bytes(6, kEye)
           .open(kEye)
           .number(kEye)
           .close()
           .close()
           .number(kEye)
           .close()
           .made(),
       wide},
      {"texts",
       SampleRows()
           .open()
           .text(6)
           .text(5, 0, 2)
           .number()
           .text(5, kEye)
           .text(6, kEye, 2)
           .text(7, kPad)
           .text(7, kPad, 2)
           .close()
           .made(),
       wide},
      {"groups of 32-bit headers in one of 64-bit ones",
       SampleRows()
           .open(kEye)
           .number()
           .open(kEye, false)
           .number()
           .open(0, false)
           .number()
           .close()
           .number()
           .close()
           .number()
           .open(0, false)
           .number()
           .number()
           .number()
           .close()
           .close()
           .made(),
       wide},
      {"32-bit headers",
       SampleRows(false)
           .open(0, false)
           .number()
           .open(0, false)
           .number()
           .bytes(3)
           .close()
           .text(6)
           .open(0, false)
           .number()
           .close()
           .close()
           .made(),
       narrow},
      {"padded",
       SampleRows()
           .open(kPad | kEye)
           .number(kPad | kEye)
           .bytes(5, kPad)
           .open(kPad)
           .text(6, kPad)
           .number(kPad)
           .close()
           .bytes(8, kPad)
           .close()
           .made(),
       padded},
      {"abandoned",
       SampleRows().open().number().open(kEye).number(kEye).open().number().abandon().abandon().abandon().made(), wide},
      {"ended by marks, and zeros behind it",
       SampleRows()
           .open(kEye)
           .number()
           .open()
           .number()
           .open(0, false)
           .number()
           .mark()
           .mark()
           .number()
           .close()
           .zeros(21)
           .made(),
       wide},
      {"two roots, of which the first is empty",
       SampleRows().open().close().number().open().number().number().close().open(kEye).number().close().made(), wide},
      {"nodes that no reader knows",
       SampleRows()
           .open()
           .number()
           .data(kUnknownType, Bytes(6, 0x77))
           .number(0, kUnknownElement)
           .data(kUnknownType, Bytes(6, 0x77), kEye)
           .data(TAV_TYPE_UINT32, Bytes(5, 1))
           .number(kEye, kUnknownElement)
           .number()
           .close()
           .made(),
       wide},
      {"a stream as a payload",
       SampleRows()
           .open(kEye)
           .number()
           .data(TAV_TYPE_BINARY, inner, kEye)
           .data(TAV_TYPE_ASCII_STRING, inner)
           .number()
           .close()
           .made(),
       wide},
  };
}

} // namespace test
