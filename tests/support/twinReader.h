/// Reads the same bytes twice, over direct memory and through a ring, and compares every answer.
#pragma once

#include <cstdio>
#include <cstdlib>

#include "support/platform.h"
#include "support/randomScript.h"
#include "support/traceLog.h"

namespace test
{

class TwinReader
{
public:
  /// Zeros behind the stream: direct memory does not show an eye/size pair that ends at the block's end.
  static constexpr uint64_t kSlack = 32;

  TwinReader(const ScriptCase& one, Random& random, const Bytes& stream, bool root32)
      : random_(random), size_(stream.size() + kSlack), block_(new uint8_t[size_]), memory_(block_.get(), size_),
        vector_(one.pageUnit, withSlack(stream), pickAttributes(random)), ringBytes_(one.ringBytes())
  {
    std::copy(vector_.bytes.begin(), vector_.bytes.end(), block_.get());
    vector_.endCode = random.pick({TAV_RC_END_OF_STORAGE, TAV_RC_END_OF_DATA, TAV_RC_OK});
    if (random.oneIn(4))
    {
      vector_.longestTransfer = 1 + random.below(2 * one.pageBytes());
    }
    Form form = one.form(false);
    form.root32 = root32;
    direct_ = std::make_unique<Handle>(memory_, TAV_OPT_READ, form);
    buffered_ = std::make_unique<Handle>(vector_, TAV_OPT_READ, form);
  }

  void run(const std::vector<WrittenNode>& nodes)
  {
    walk();
    for (uint64_t i = 0; i < 6 && !nodes.empty(); ++i)
    {
      const TAVHeader& header = nodes[random_.below(nodes.size())].header;
      readNode(header.nodeOffset, tav::layout::is64(header));
      stepBack(header);
    }
    for (uint64_t i = 0; i < 4; ++i)
    {
      readNode(random_.below(size_ + 10), random_.oneIn(2));
      scan();
      fromIndex();
      compareChunk(*(*buffered_)->pCircularBuf, vector_.bytes, size_, random_);
    }
    walkBack();
    search();
    searchPath();
    validate();
    print();
    finish();
  }

private:
  /// What one way answered.
  struct Answer
  {
    uint32_t code = 0;
    TAVHeaderData node{};
  };

  static Bytes withSlack(const Bytes& stream)
  {
    Bytes bytes = stream;
    bytes.resize(bytes.size() + kSlack);
    return bytes;
  }

  static uint64_t pickAttributes(Random& random)
  {
    return random.pick({VectorStorage::kReadOnly, VectorStorage::kReadOnly, VectorStorage::kReadWrite,
                        VectorStorage::kReadOnly & ~TAV_ATTR_SEEK});
  }

  template<class Call>
  void ask(Call call, Answer& direct, Answer& buffered)
  {
    direct.code = call(direct_->get(), direct.node);
    buffered.code = call(buffered_->get(), buffered.node);
  }

  /// Whether the buffered call met data that its ring cannot hold, the one thing that direct memory never meets.
  template<class Call>
  bool meetsLargeData(Call call)
  {
    const TraceLog trace;
    TAVHeaderData node{};
    call(buffered_->get(), node);
    const std::vector<Failure> failures = trace.failuresOf(tav::probe::readNode);
    return std::any_of(failures.begin(), failures.end(),
                       [](const Failure& failure) { return failure.code == TAV_RC_DATA_TOO_LARGE; });
  }

  /// The code that a read through the ring gives where direct memory gave `code`.
  [[nodiscard]] uint32_t expectedRead(const TAVHeaderData& node, uint32_t code) const
  {
    const uint64_t payload = node.header.nodeOffset + tav::layout::headerLength(node.header.hdrType);
    const bool data = !tav::layout::isGroup(node.header);
    const bool tooLarge = data && tav::layout::sizeOf(node.header) > ringBytes_;
    switch (code)
    {
    case TAV_RC_OK: return tooLarge ? TAV_RC_DATA_TOO_LARGE : TAV_RC_OK;
    case TAV_RC_DATA_TOO_LARGE: // none of it at all, or a part
      return payload >= size_ ? TAV_RC_END_OF_STORAGE : code;
    case TAV_RC_NO_MEMORY: return TAV_RC_END_OF_STORAGE;
    default: return code;
    }
  }

  void compareNodes(const Answer& direct, const Answer& buffered)
  {
    const TAVHeader& one = direct.node.header;
    same(std::memcmp(&one, &buffered.node.header, sizeof one) == 0, "headers at ", one.nodeOffset, " and ",
         buffered.node.header.nodeOffset);
    if (buffered.code != TAV_RC_OK)
    {
      return;
    }
    if (tav::layout::isGroup(one))
    {
      same(buffered.node.pDataBuf == nullptr && buffered.node.dataBufSize == 0, "a group with data");
      return;
    }
    same(buffered.node.dataBufSize == tav::layout::sizeOf(one) && buffered.node.pDataBuf != nullptr, "data of ",
         buffered.node.dataBufSize, " bytes at ", one.nodeOffset);
    same(std::memcmp(direct.node.pDataBuf, buffered.node.pDataBuf, tav::layout::sizeOf(one)) == 0, "data at ",
         one.nodeOffset);
  }

  Answer readNode(uint64_t offset, bool wide)
  {
    Answer direct;
    Answer buffered;
    ask([&](TAVHandle* handle, TAVHeaderData& node) { return tavReadNodeInt(0, handle, offset, wide, &node); }, direct,
        buffered);
    // Direct memory takes a 32-bit header of type 2 for a data element.
    if (!wide && direct.node.header.hdr32.type == TAV_TYPE_HEADER64)
    {
      return buffered;
    }
    const uint32_t expected = expectedRead(direct.node, direct.code);
    same(buffered.code == expected, "read at ", offset, ": ", nameOf(direct.code), " direct, ", nameOf(buffered.code),
         " buffered");
    if (direct.code == TAV_RC_OK)
    {
      compareNodes(direct, buffered);
    }
    return direct;
  }

  /// Compares calls that read more than one node: the same code and node, or data too large for the ring on the way.
  template<class Call>
  Answer compareCalls(const char* what, Call call)
  {
    Answer direct;
    Answer buffered;
    ask(call, direct, buffered);
    const bool bothOk = direct.code == TAV_RC_OK && buffered.code == TAV_RC_OK;
    const bool sameNode = !bothOk || direct.node.header.nodeOffset == buffered.node.header.nodeOffset;
    const bool oneOk = direct.code == TAV_RC_OK || buffered.code == TAV_RC_OK;
    const auto ranOut = [](uint32_t code) {
      return code == TAV_RC_NO_MEMORY || code == TAV_RC_DATA_TOO_LARGE || code == TAV_RC_NOT_FOUND;
    };
    const bool sameEnd = !oneOk && (direct.code == buffered.code || buffered.code == TAV_RC_END_OF_STORAGE) &&
                         (buffered.code != TAV_RC_END_OF_STORAGE || ranOut(direct.code));
    if ((bothOk && sameNode) || sameEnd)
    {
      if (bothOk && direct.node.header.hdrType != 0)
      {
        compareNodes(direct, buffered);
      }
      return direct;
    }
    same(meetsLargeData(call), what, ": ", nameOf(direct.code), " at ", direct.node.header.nodeOffset, " direct, ",
         nameOf(buffered.code), " at ", buffered.node.header.nodeOffset, " buffered");
    return direct;
  }

  /// All nodes, depth first, as far as the stream leads.
  void walk()
  {
    std::vector<TAVHeader> parents;
    TAVHeader previous{};
    bool first = true;
    for (uint64_t left = 200; left != 0; --left)
    {
      TAVHeader* const parent = parents.empty() ? nullptr : &parents.back();
      TAVHeader* const reference = first || parent == nullptr ? nullptr : &previous;
      const Answer answer = compareCalls("tavGetNextChild", [&](TAVHandle* handle, TAVHeaderData& node) {
        return tavGetNextChild(0, handle, parent, reference, &node);
      });
      if (answer.code != TAV_RC_OK)
      {
        if (parents.size() < 2)
        {
          return;
        }
        previous = parents.back();
        parents.pop_back();
        first = false;
        continue;
      }
      const TAVHeader& node = answer.node.header;
      if (!tav::layout::is64(node) && node.hdr32.type == TAV_TYPE_HEADER64)
      {
        return; // a group through the ring alone
      }
      visited_.push_back(node);
      previous = node;
      first = tav::layout::isGroup(node) && parents.size() < 100;
      if (first)
      {
        parents.push_back(node);
      }
      if (parent == nullptr)
      {
        root_ = node;
      }
    }
  }

  void stepBack(const TAVHeader& from)
  {
    TAVHeaderData reference{from, nullptr, 0, 0};
    compareCalls("tavGetPrevNode",
                 [&](TAVHandle* handle, TAVHeaderData& node) { return tavGetPrevNode(0, handle, &reference, &node); });
  }

  /// From the last node visited to the front, as far as pairs lead.
  void walkBack()
  {
    if (visited_.empty())
    {
      return;
    }
    TAVHeaderData at{visited_.back(), nullptr, 0, 0};
    for (uint64_t left = 30; left != 0; --left)
    {
      const Answer answer = compareCalls(
          "a walk back", [&](TAVHandle* handle, TAVHeaderData& node) { return tavGetPrevNode(0, handle, &at, &node); });
      if (answer.code != TAV_RC_OK)
      {
        return;
      }
      at.header = answer.node.header;
    }
  }

  void scan()
  {
    const uint64_t start = random_.below(size_ + 4);
    const uint64_t length = random_.oneIn(2) ? 0 : 1 + random_.below(size_);
    struct Found
    {
      uint64_t offset = 1;
      uint64_t eyeSize = 1;
      bool swapped = true;
      bool operator==(const Found&) const = default;
    };
    Found direct;
    Found buffered;
    const auto run = [&](TAVHandle* handle, Found& found) {
      return tavFindEyeSizeComboInt(handle, start, length, true, &found.offset, &found.eyeSize, &found.swapped);
    };
    const uint32_t rc = run(direct_->get(), direct);
    const uint32_t other = run(buffered_->get(), buffered);
    same(direct == buffered, "a scan from ", start, " found ", direct.offset, " and ", buffered.offset);
    // Over memory the end of the block ends a scan in vain; through a ring it is the end of the storage.
    const bool ranOff = rc != TAV_RC_OK && (start >= size_ || length == 0 || length > size_ - start);
    same(other == (ranOff ? TAV_RC_END_OF_STORAGE : rc), "a scan from ", start, ": ", nameOf(rc), " and ",
         nameOf(other));
  }

  void fromIndex()
  {
    const uint64_t index = random_.below(size_);
    const uint64_t length = random_.oneIn(2) ? 0 : random_.below(size_);
    const uint64_t options = random_.oneIn(3) ? 4 : 0;
    compareCalls("tavFindNodeFromIndex", [&](TAVHandle* handle, TAVHeaderData& node) {
      return tavFindNodeFromIndex(options, handle, index, length, &node);
    });
  }

  void search()
  {
    if (visited_.empty())
    {
      return;
    }
    TAVHeader parent = visited_[random_.below(visited_.size())];
    const uint32_t elm = tav::layout::elmOf(visited_[random_.below(visited_.size())]);
    const auto deepest = static_cast<uint32_t>(random_.below(3));
    const auto key = static_cast<uint16_t>(random_.oneIn(2) ? random_.below(4) : 0);
    compareCalls("tavFindElmInt", [&](TAVHandle* handle, TAVHeaderData& found) {
      TAVHdrStack stack;
      TAVHeaderData last{};
      uint32_t rc = TAV_RC_OK;
      for (uint64_t left = 6; rc == TAV_RC_OK && left != 0; --left)
      {
        found = {};
        rc = tavFindElmInt(handle, &parent, 0, deepest, key, elm, left == 6 ? nullptr : &last.header, &stack, &found);
        if (rc == TAV_RC_OK && found.header.hdrType == 0)
        {
          break; // entered a group
        }
        last = found;
      }
      return rc;
    });
  }

  /// A path whose first entry is known to match: one that misses there does not come back.
  void searchPath()
  {
    if (root_.hdrType == 0 || !tav::layout::isGroup(root_))
    {
      return;
    }
    Answer answer;
    const uint32_t rc = tavGetNextChild(0, buffered_->get(), &root_, nullptr, &answer.node);
    if (rc != TAV_RC_OK || !tav::layout::isGroup(answer.node.header))
    {
      return;
    }
    const TAVPathEntry path[] = {{0, tav::layout::elmOf(answer.node.header)},
                                 {0, random_.pick<uint32_t>({SQLM_ELM_NODE, SQLM_ELM_DBASE})}};
    TAVFindLogicalGroupParam param{0, path, random_.oneIn(2) ? 1U : 2U, nullptr, 0};
    compareCalls("tavFindLogicalGroup", [&](TAVHandle* handle, TAVHeaderData& node) {
      return tavFindLogicalGroup(0, handle, &root_, &param, &node);
    });
  }

  void validate()
  {
    if (root_.hdrType == 0)
    {
      return;
    }
    const uint64_t options = random_.below(2);
    compareCalls("tavValidateSubtreeInt",
                 [&](TAVHandle* handle, TAVHeaderData&) { return tavValidateSubtreeInt(options, handle, &root_); });
    compareCalls("tavValidateHierarchy",
                 [&](TAVHandle* handle, TAVHeaderData&) { return tavValidateHierarchy(0, handle, &root_); });
  }

  void print()
  {
    // Without the descriptors: they show addresses.
    const uint64_t options =
        TAV_PRINT_SUBTREE |
        random_.pick<uint64_t>({TAV_PRINT_HEADERS | TAV_PRINT_DATA, TAV_PRINT_DATA, TAV_PRINT_DATA | TAV_PRINT_XML,
                                TAV_PRINT_DATA | TAV_PRINT_XML | TAV_PRINT_ATTRIBUTES});
    std::string text[2];
    const auto run = [&](TAVHandle* handle, TAVHeaderData&) {
      CaughtStream stream;
      TAVPrintParam param{0, nullptr, 0, stream.get()};
      uint64_t printed = 0;
      const uint32_t rc = tavPrintSubtree(options, handle, nullptr, &param, &printed);
      std::string& shown = text[handle == direct_->get() ? 0 : 1];
      shown = stream.text();
      same(printed == shown.size(), "printed ", printed, " of ", shown.size());
      return rc;
    };
    const Answer direct = compareCalls("tavPrintSubtree", run);
    const bool cut = text[0] != text[1] && text[0].starts_with(text[1]);
    same(text[0] == text[1] || (cut && meetsLargeData(run)), "printed texts differ: ", nameOf(direct.code));
  }

  /// A reader leaves the storage as it found it.
  void finish()
  {
    buffered_->close();
    same(vector_.bytes.size() == size_ && std::memcmp(vector_.bytes.data(), block_.get(), size_) == 0,
         "reading changed the storage");
  }

  Random& random_;
  uint64_t size_;
  std::unique_ptr<uint8_t[]> block_;
  TAVSSMemory memory_;
  VectorStorage vector_;
  uint64_t ringBytes_;
  std::unique_ptr<Handle> direct_;
  std::unique_ptr<Handle> buffered_;
  std::vector<TAVHeader> visited_;
  TAVHeader root_{};
};

} // namespace test
