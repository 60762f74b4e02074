/// Runs every reading operation over a stream, however damaged, and checks that it ends in a code and stays inside.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <random>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "api/uncalledOperations.h"
#include "support/byteRows.h"
#include "support/streams.h"
#include "tav/tav.h"

namespace test
{

/// No walk may take more steps than this. A stream of n bytes has room for n / 8 headers; the factor is for groups of
/// unknown size, whose sibling may stand in what was walked before.
inline uint64_t mostSteps(uint64_t bytes)
{
  return 8 * (bytes / 8 + 2);
}

class Prober
{
public:
  Prober(const Bytes& bytes, const Form& form, uint64_t seed)
      : size_(bytes.size()), reader_(bytes, form), random_(seed), form_(form)
  {
    for (const uint64_t near : {uint64_t{0}, uint64_t{8}, uint64_t{16}, size_ - 16, size_ - 8, size_ - 1, size_,
                                size_ + 1,
                                uint64_t{1} << 32, ~uint64_t{0} - 16, ~uint64_t{0} - 8, ~uint64_t{0}})
    {
      offsets_.push_back(near);
    }
    for (int i = 0; i < 12; ++i)
    {
      offsets_.push_back(below(size_ + 1));
    }
  }

  void readEverywhere()
  {
    for (const uint64_t offset : offsets_)
    {
      for (const bool wide : {true, false})
      {
        TAVHeaderData out{};
        accept(tavReadNodeInt(0, handle(), offset, wide, &out), out);
        moreData(out);
      }
    }
  }

  void scanEverywhere()
  {
    for (const uint64_t offset : offsets_)
    {
      uint64_t found = 0;
      uint64_t distance = 0;
      bool swapped = false;
      for (const uint64_t length : {uint64_t{0}, uint64_t{8}, below(size_ + 9), ~uint64_t{0}})
      {
        const uint32_t rc = tavFindEyeSizeComboInt(handle(), offset, length, true, &found, &distance, &swapped);
        acceptCode(rc);
        if (rc == TAV_RC_OK)
        {
          EXPECT_GE(found, offset);
          EXPECT_LE(found + 16, size_);
        }
      }
    }
  }

  void indexEverywhere()
  {
    for (const uint64_t offset : offsets_)
    {
      for (uint64_t options = 0; options <= 8; ++options)
      {
        TAVHeaderData out{};
        const uint64_t length = options % 2 == 0 ? 0 : below(size_ + 2);
        accept(tavFindNodeFromIndex(options, handle(), offset, length, &out), out);
      }
    }
  }

  /// Single steps from headers that no walk gives, and to both sides of any offset.
  void stepEverywhere()
  {
    for (const uint64_t offset : offsets_)
    {
      TAVHeader parent = anyHeader(offset);
      TAVHeader reference = anyHeader(below(2) == 0 ? offset : below(size_ + 20));
      TAVHeaderData out{};
      accept(tavGetNextChild(0, handle(), &parent, nullptr, &out), out);
      accept(tavGetNextChild(0, handle(), &parent, &reference, &out), out);
      TAVHeaderData back{};
      back.header = reference;
      walkBack(back);
    }
  }

  /// Visits all nodes, depth first, as validation and printing do. False when that took too many steps.
  bool walk()
  {
    std::vector<TAVHeader> parents;
    TAVHeaderData node{};
    uint64_t steps = 0;
    uint32_t rc = tavGetNextChild(0, handle(), nullptr, nullptr, &node);
    accept(rc, node);
    root_ = node.header;
    if (rc != TAV_RC_OK)
    {
      return true;
    }
    hasRoot_ = true;
    parents.push_back(node.header);
    TAVHeader previous{};
    bool first = true;
    while (!parents.empty() && parents.size() < 4000)
    {
      if (++steps > mostSteps(size_))
      {
        ADD_FAILURE() << "a walk of " << size_ << " bytes took more than " << mostSteps(size_) << " steps";
        return false;
      }
      TAVHeader parent = parents.back();
      rc = tavGetNextChild(0, handle(), &parent, first ? nullptr : &previous, &node);
      accept(rc, node);
      first = false;
      if (rc == TAV_RC_NO_MORE_CHILDREN)
      {
        previous = parents.back();
        parents.pop_back();
        continue;
      }
      if (rc != TAV_RC_OK)
      {
        return true;
      }
      previous = node.header;
      const uint16_t type = node.header.hdrType == TAV_HDR_64 ? node.header.hdr64.type : node.header.hdr32.type;
      if (type == TAV_TYPE_HEADER32 || type == TAV_TYPE_HEADER64)
      {
        parents.push_back(node.header);
        first = true;
      }
      moreData(node);
      walkBack(node);
    }
    return true;
  }

  void search()
  {
    if (!hasRoot_)
    {
      return;
    }
    const std::array<std::pair<uint32_t, uint32_t>, 4> depths{{{0, 0}, {0, 6}, {1, 3}, {~0U, ~0U}}};
    for (const auto& [minDepth, maxDepth] : depths)
    {
      TAVHdrStack stack;
      TAVHeader parent = root_;
      TAVHeaderData found{};
      uint64_t steps = 0;
      uint32_t rc = tavFindElmInt(handle(), &parent, minDepth, maxDepth, 0, static_cast<uint32_t>(below(400)), nullptr,
                                  &stack, &found);
      while (rc == TAV_RC_OK && ++steps <= mostSteps(size_))
      {
        // Going on after a match, or into the group that was entered.
        TAVHeaderData next{};
        const bool matched = found.header.hdrType != 0;
        rc = matched ? tavFindElmInt(handle(), &parent, minDepth, maxDepth, 0, elmOfNode(found), &found.header, &stack,
                                     &next)
                     : tavFindElmInt(handle(), stack.top(), minDepth, maxDepth, 0, 5, nullptr, &stack, &next);
        found = next;
      }
      acceptCode(rc);
      EXPECT_LE(steps, mostSteps(size_));
    }
  }

  void validate()
  {
    if (hasRoot_)
    {
      for (const uint64_t options : {0U, 1U})
      {
        acceptCode(tavValidateSubtreeInt(options, handle(), &root_));
      }
      acceptCode(tavValidateHierarchy(0, handle(), &root_));
    }
  }

  void print()
  {
    std::array<char, 80> piece{};
    for (const uint64_t options : {0x1U, 0x7U, 0xFU, 0x45U, 0x4FU, 0xC7U, 0x15U})
    {
      TAVPrintParam param{0, piece.data(), piece.size(), nullptr};
      uint64_t printed = 0;
      acceptCode(tavPrintSubtree(options, handle(), nullptr, &param, &printed));
    }
  }

  void everything()
  {
    readEverywhere();
    scanEverywhere();
    indexEverywhere();
    stepEverywhere();
    if (walk())
    {
      search();
      validate();
      print();
    }
  }

private:
  TAVHandle* handle() { return reader_.handle(); }
  uint64_t below(uint64_t bound) { return random_() % bound; }

  TAVHeader anyHeader(uint64_t offset)
  {
    static constexpr std::array<uint64_t, 8> sizes{0, 1, 16, 0xFFFFFFFF, TAV_SIZE_UNKNOWN,
                                                   ~uint64_t{0} - 16, ~uint64_t{0} - 1, uint64_t{1} << 63};
    const uint64_t size = below(3) == 0 ? below(size_ + 40) : sizes[below(sizes.size())];
    const std::array<uint16_t, 3> types{TAV_TYPE_HEADER32, TAV_TYPE_HEADER64, TAV_TYPE_BINARY};
    const uint16_t type = types[below(3)];
    const uint32_t info = static_cast<uint32_t>(random_());
    return below(2) == 0 ? header64(size, type, 7, info, offset)
                         : header32(static_cast<uint32_t>(size), type, 7, offset);
  }

  void acceptCode(uint32_t rc)
  {
    EXPECT_TRUE(rc == TAV_RC_OK || rc >> 28 == 9) << std::hex << rc;
    EXPECT_STRNE(korCodeName(rc), korCodeName(0x12345678)) << "a code without a name: " << std::hex << rc;
  }

  /// A success leads to bytes that are there: all of them are read.
  void accept(uint32_t rc, const TAVHeaderData& node)
  {
    acceptCode(rc);
    if (rc != TAV_RC_OK || node.pDataBuf == nullptr)
    {
      return;
    }
    const uint64_t size = node.header.hdrType == TAV_HDR_64 ? node.header.hdr64.size : node.header.hdr32.size;
    touch(node.pDataBuf, std::min(size, node.dataBufSize));
    expectInside(node);
  }

  void expectInside(const TAVHeaderData& node)
  {
    const uint8_t* const from = form_.buffered ? handle()->pCircularBuf->pRing : handle()->pDirectData;
    const uint64_t length = form_.buffered ? handle()->pCircularBuf->ringSize : handle()->directDataSize;
    ASSERT_GE(node.pDataBuf, from);
    ASSERT_LE(node.pDataBuf, from + length);
    ASSERT_LE(node.dataBufSize, static_cast<uint64_t>(from + length - node.pDataBuf));
  }

  void touch(const uint8_t* bytes, uint64_t count)
  {
    for (uint64_t i = 0; i < count; ++i)
    {
      sum_ = sum_ + bytes[i];
    }
  }

  /// Asks for further data of a node for as long as that leads on.
  void moreData(TAVHeaderData node)
  {
    for (int i = 0; i < 4; ++i)
    {
      const uint32_t rc = tavGetNextDataBuffer(0, handle(), &node);
      acceptCode(rc);
      if (rc != TAV_RC_OK)
      {
        return;
      }
      touch(node.pDataBuf, node.dataBufSize);
      expectInside(node);
    }
  }

  /// Every step back is one of 16 bytes at the least.
  void walkBack(TAVHeaderData node)
  {
    uint64_t steps = 0;
    uint32_t rc = TAV_RC_OK;
    while (rc == TAV_RC_OK)
    {
      ASSERT_LE(++steps, size_ / 16 + 2) << "a walk back does not end";
      const uint64_t from = node.header.nodeOffset;
      rc = tavGetPrevNode(0, handle(), &node, &node);
      accept(rc, node);
      if (rc == TAV_RC_OK)
      {
        ASSERT_LE(node.header.nodeOffset + 16, from);
      }
    }
  }

  uint64_t size_;
  StreamReader reader_;
  std::mt19937_64 random_;
  Form form_;
  std::vector<uint64_t> offsets_;
  TAVHeader root_{};
  bool hasRoot_ = false;
  volatile uint8_t sum_ = 0;
};

} // namespace test
