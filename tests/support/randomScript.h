/// Seeded random scripts that write the same stream twice: over direct memory and through a ring. Every step compares
/// what the two calls answered.
#pragma once

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <initializer_list>
#include <span>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include "format/layout.h"
#include "support/streams.h"

namespace test
{

/// The same numbers for a seed on every platform.
class Random
{
public:
  explicit Random(uint64_t seed)
      : state_(seed) {}
  /// Numbers that somebody else chose, as long as there are any: the bytes must outlive the object.
  Random(std::span<const uint8_t> choices, uint64_t seed)
      : state_(seed), choices_(choices) {}

  uint64_t next()
  {
    uint64_t word = state_ += 0x9E3779B97F4A7C15;
    word = (word ^ (word >> 30)) * 0xBF58476D1CE4E5B9;
    word = (word ^ (word >> 27)) * 0x94D049BB133111EB;
    return word ^ (word >> 31);
  }
  /// 0 to `limit` - 1.
  uint64_t below(uint64_t limit)
  {
    if (limit == 0)
    {
      return 0;
    }
    return (choices_.empty() ? next() : choose(limit)) % limit;
  }
  bool oneIn(uint64_t chance) { return below(chance) == 0; }
  template<class Value>
  Value pick(std::initializer_list<Value> values)
  {
    return values.begin()[below(values.size())];
  }

private:
  /// As many bytes as the limit needs, so that a changed byte changes one choice.
  uint64_t choose(uint64_t limit)
  {
    uint64_t number = 0;
    for (uint64_t reach = 1; reach < limit && !choices_.empty() && reach < uint64_t{1} << 56; reach <<= 8)
    {
      number = number << 8 | choices_.front();
      choices_ = choices_.subspan(1);
    }
    return number;
  }

  uint64_t state_;
  std::span<const uint8_t> choices_{};
};

/// A difference between the two ways, which no rule allows.
class Difference : public std::runtime_error
{
public:
  using std::runtime_error::runtime_error;
};

template<class... Parts>
void same(bool holds, const Parts&... parts)
{
  if (!holds) [[unlikely]]
  {
    std::ostringstream text;
    (text << ... << parts);
    throw Difference(text.str());
  }
}

/// One case: a script, and the ring that its buffered half goes through.
struct ScriptCase
{
  uint64_t seed = 0;
  uint64_t pageUnit = 64;
  uint64_t ringPages = 10; ///< 0: the default ring
  bool swap = false;
  bool align = false;

  [[nodiscard]] uint64_t pageBytes() const { return (pageUnit + 7) / 8 * 8; }
  [[nodiscard]] uint64_t ringBytes() const { return ringPages != 0 ? ringPages * pageBytes() : 0xA00000; }
  [[nodiscard]] Form form(bool buffered) const { return {buffered, swap, align, false, pageUnit, ringBytes()}; }
};

inline std::ostream& operator<<(std::ostream& out, const ScriptCase& one)
{
  return out << "seed " << one.seed << ", page unit " << one.pageUnit << ", ring pages " << one.ringPages
             << (one.swap ? ", swapped" : "") << (one.align ? ", aligned" : "");
}

inline std::string nameOf(uint32_t code)
{
  return korCodeName(code);
}

/// The offsets where chunks of a ring must agree with the direct block.
inline void compareChunk(TAVCircularBuf& ring, const Bytes& block, uint64_t limit, Random& random)
{
  const uint64_t offset = random.below(limit);
  const bool backward = random.oneIn(2);
  const uint64_t length = 1 + random.below(random.oneIn(2) ? 32 : 3 * ring.pageSize);
  TAVCBUserArea area{};
  const uint32_t rc = ring.getChunk(offset, length, &area, backward, false);
  // A backward chunk may have a start that cannot be named; its bytes stand all the same.
  const bool delivered = rc == TAV_RC_OK || (backward && rc == TAV_RC_CB_STATE);
  same(delivered, "chunk at ", offset, ": ", nameOf(rc));
  same(area.chunkLength != 0 && area.chunkLength <= length, "chunk length ", area.chunkLength);
  same(!backward || area.chunkLength <= offset + 1, "a chunk that begins before the stream");
  const uint64_t first = backward ? offset + 1 - area.chunkLength : offset;
  const uint64_t shown = std::min<uint64_t>(area.chunkLength, block.size() - first);
  same(std::memcmp(area.pChunk, block.data() + first, shown) == 0, "chunk bytes at ", first);
}

/// A written node, as the writer knew it.
struct WrittenNode
{
  TAVHeader header;
  bool updatable;
};

/// Writes one random script over both ways.
class TwinWriter
{
public:
  TwinWriter(const ScriptCase& one, Random& random)
      : case_(one), random_(random), budget_(pickBudget()), block_(3 * budget_ + 0x8000),
        memory_(block_.data(), block_.size()), vector_(one.pageUnit, {}, pickAttributes())
  {
    root32_ = random.oneIn(6);
    utf8_ = random.oneIn(6);
    vector_.endCode = random.pick({TAV_RC_END_OF_STORAGE, TAV_RC_END_OF_STORAGE, TAV_RC_END_OF_DATA, TAV_RC_OK});
    if (random.oneIn(4))
    {
      vector_.longestTransfer = 1 + random.below(2 * one.pageBytes());
    }
  }

  void run()
  {
    Handle direct(memory_, TAV_OPT_WRITE, case_.form(false));
    Handle buffered(vector_, TAV_OPT_WRITE, case_.form(true));
    direct_ = direct.get();
    buffered_ = buffered.get();
    const uint64_t steps = 2 + random_.below(random_.oneIn(8) ? 90 : 25);
    for (uint64_t i = 0; i < steps; ++i)
    {
      step();
    }
    const bool closing = !random_.oneIn(6);
    while (closing && direct_->pHdrStack->count != 0)
    {
      close(0);
    }
    length_ = direct_->streamBytes;
    if (random_.oneIn(2))
    {
      same(buffered_->pCircularBuf->reset() == TAV_RC_OK, "reset at the end");
    }
    buffered.close();
    direct.close();
    compareStorage();
  }

  /// The stream's bytes, as the direct block holds them.
  [[nodiscard]] Bytes stream() const { return {block_.begin(), block_.begin() + static_cast<ptrdiff_t>(length_)}; }
  [[nodiscard]] bool root32() const { return root32_; }
  [[nodiscard]] const std::vector<WrittenNode>& nodes() const { return nodes_; }

private:
  uint64_t pickBudget()
  {
    // Elements larger than a ring of large pages are rare: they cost more than a hundred small cases.
    const uint64_t ring = case_.ringBytes();
    if (ring <= 0x4000)
    {
      return 0x4000;
    }
    return ring <= 0x400000 && random_.oneIn(ring <= 0x40000 ? 12 : 150) ? 2 * ring : 0x4000;
  }

  uint64_t pickAttributes()
  {
    return random_.oneIn(6) ? VectorStorage::kReadWrite & ~TAV_ATTR_SEEK : VectorStorage::kReadWrite;
  }

  uint64_t pickSize()
  {
    const uint64_t page = case_.pageBytes();
    const uint64_t ring = case_.ringBytes();
    uint64_t size = random_.below(40);
    switch (random_.below(10))
    {
    case 0: size = page - 1 + random_.below(3); break;
    case 1: size = ring - 24 + random_.below(48); break;
    case 2: size = random_.below(3 * ring); break;
    case 3: size = ring - page - 1 + random_.below(3); break;
    default: break;
    }
    return size <= budget_ ? size : random_.below(200);
  }

  void step()
  {
    if (direct_->pHdrStack->count == 0)
    {
      open();
      return;
    }
    if (direct_->streamBytes + budget_ + 0x1000 > block_.size())
    {
      close(random_.oneIn(2) ? 1 : 0);
      return;
    }
    switch (random_.below(20))
    {
    case 0:
    case 1: open(); break;
    case 2:
    case 3: close(0); break;
    case 4: close(random_.oneIn(2) ? 1 : 0); break;
    case 5: verbatim(); break;
    case 6: string(); break;
    case 7:
    case 8: update(); break;
    case 9:
    case 10: readBack(); break;
    case 11: pokeRing(); break;
    case 12: resetHandle(); break;
    default: element(); break;
    }
  }

  [[nodiscard]] bool wide() const
  {
    const TAVHeader* const group = direct_->pHdrStack->top();
    return group == nullptr ? !root32_ : tav::layout::typeOf(*group) != TAV_TYPE_HEADER32;
  }

  void written(uint32_t direct, uint32_t buffered, const char* what)
  {
    same(direct == buffered, what, ": ", nameOf(direct), " direct, ", nameOf(buffered), " buffered");
    same(direct_->streamBytes == buffered_->streamBytes, what, ": write offsets ", direct_->streamBytes, " and ",
         buffered_->streamBytes);
    highest_ = std::max(highest_, direct_->streamBytes);
  }

  uint32_t add(Element node, bool updatable)
  {
    TAVHeaderData one = node.data();
    TAVHeaderData other = node.data();
    const uint32_t direct = tavAddElement(0, direct_, &one);
    written(direct, tavAddElement(0, buffered_, &other), "tavAddElement");
    same(std::memcmp(&one.header, &other.header, sizeof one.header) == 0, "headers after tavAddElement");
    if (direct == TAV_RC_OK)
    {
      nodes_.push_back({one.header, updatable});
    }
    return direct;
  }

  Bytes randomBytes(uint64_t count)
  {
    Bytes bytes(count);
    const uint64_t kind = random_.below(4);
    for (uint8_t& byte : bytes)
    {
      byte = static_cast<uint8_t>(kind == 0 ? random_.next() : 'a' + random_.below(26));
    }
    return bytes;
  }

  uint32_t pickInfo() { return (random_.oneIn(2) ? TAV_INFO_EYE_SIZE : 0) | static_cast<uint32_t>(random_.below(4)); }

  void open()
  {
    const uint16_t elm = random_.pick({TAV_ELM_CMN_HOST, SQLM_ELM_DBASE, SQLM_ELM_NODE});
    if (!wide())
    {
      add(group32(elm, static_cast<uint32_t>(random_.pick<uint64_t>({0, 0, 77}))), false);
      return;
    }
    const uint16_t type = random_.oneIn(3) ? TAV_TYPE_HEADER32 : TAV_TYPE_HEADER64;
    add(group64(elm, type, pickInfo(), random_.pick<uint64_t>({TAV_SIZE_UNKNOWN, TAV_SIZE_UNKNOWN, 0, 5})), false);
  }

  void element()
  {
    struct Kind
    {
      uint16_t type;
      uint64_t size; ///< 0: any
    };
    Kind kind = random_.pick<Kind>({{TAV_TYPE_ASCII_STRING, 0},
                                    {TAV_TYPE_UINT8, 1},
                                    {TAV_TYPE_SINT16, 2},
                                    {TAV_TYPE_UINT32, 4},
                                    {TAV_TYPE_SINT64, 8},
                                    {TAV_TYPE_UTC_TIMESTAMP, 16},
                                    {TAV_TYPE_BINARY, 0},
                                    {TAV_TYPE_UINT128, 16},
                                    {TAV_TYPE_UINT64_ARRAY, 0}});
    if (kind.size == 0 || random_.oneIn(10))
    {
      kind.size = pickSize();
    }
    const uint16_t elm = random_.pick<uint16_t>({SQLM_ELM_NODE_NUMBER, SQLM_ELM_DB_NAME, TAV_ELM_CMN_HOST_NAME, 5, 6});
    Bytes payload = randomBytes(kind.size);
    if (kind.size == 0)
    {
      payload.reserve(1); // an empty payload still needs an address
    }
    add(test::element(wide(), kind.type, elm, std::move(payload), pickInfo()), true);
  }

  void string()
  {
    const bool utf8 = utf8_ && random_.oneIn(2);
    Element node = test::element(wide(), utf8 ? TAV_TYPE_UTF8_STRING : TAV_TYPE_ASCII_STRING, SQLM_ELM_DB_NAME,
                                 randomBytes(pickSize()), pickInfo());
    node.payload.resize(node.payload.size() + 2, 'z');
    TAVHeaderData one = node.data();
    TAVHeaderData other = node.data();
    const uint16_t codePage = utf8 ? uint16_t{1208} : TAV_CODE_PAGE_ASCII;
    const uint32_t direct = tavAddString(0, direct_, &one, codePage);
    written(direct, tavAddString(0, buffered_, &other, codePage), "tavAddString");
  }

  /// Nodes as another writer encoded them, or bytes that are no nodes at all.
  void verbatim()
  {
    Bytes bytes;
    if (random_.oneIn(3))
    {
      bytes = randomBytes(random_.below(100));
    }
    else
    {
      for (uint64_t left = 1 + random_.below(3); left != 0; --left)
      {
        const Element node = u64(SQLM_ELM_NODE_NUMBER, random_.next(), wide());
        bytes.resize(bytes.size() + 16);
        const uint64_t used = tav::layout::encodeHeader(node.header, case_.swap, bytes.data() + bytes.size() - 16);
        bytes.resize(bytes.size() - 16 + used);
        bytes.insert(bytes.end(), node.payload.begin(), node.payload.end());
      }
    }
    bytes.reserve(1);
    const uint32_t kind = wide() ? TAV_HDR_64 : TAV_HDR_32;
    const uint32_t direct = tavAddStream(0, direct_, kind, bytes.data(), bytes.size());
    written(direct, tavAddStream(0, buffered_, kind, bytes.data(), bytes.size()), "tavAddStream");
  }

  void close(uint64_t options)
  {
    const uint32_t direct = tavCloseHeader(options, direct_);
    written(direct, tavCloseHeader(options, buffered_), options == 0 ? "closing" : "abandoning");
    const uint64_t end = direct_->streamBytes;
    std::erase_if(nodes_, [end](const WrittenNode& node) { return node.header.nodeOffset >= end; });
  }

  [[nodiscard]] bool inRing(const TAVHeader& header) const { return tav::layout::sizeOf(header) <= case_.ringBytes(); }

  void update()
  {
    if (nodes_.empty())
    {
      return;
    }
    WrittenNode& node = nodes_[random_.below(nodes_.size())];
    const uint64_t size = tav::layout::sizeOf(node.header);
    if (!node.updatable || node.header.nodeOffset + 16 + size > direct_->streamBytes)
    {
      return;
    }
    Bytes payload = randomBytes(size);
    payload.reserve(1);
    TAVHeaderData data{node.header, payload.data(), payload.size(), 0};
    const uint32_t buffered = tavUpdateElement(0, buffered_, &data);
    if (buffered == TAV_RC_DATA_TOO_LARGE && !inRing(node.header))
    {
      return; // neither way changes it
    }
    written(tavUpdateElement(0, direct_, &data), buffered, "tavUpdateElement");
  }

  /// Reads a node that was written before, or what an arbitrary place looks like as one.
  void readBack()
  {
    if (nodes_.empty())
    {
      return;
    }
    const TAVHeader& known = nodes_[random_.below(nodes_.size())].header;
    const bool arbitrary = random_.oneIn(4);
    const uint64_t offset = arbitrary ? random_.below(direct_->streamBytes + 20) : known.nodeOffset;
    const bool wideHere = arbitrary ? random_.oneIn(2) : tav::layout::is64(known);
    TAVHeaderData one{};
    TAVHeaderData other{};
    const uint32_t direct = tavReadNodeInt(0, direct_, offset, wideHere, &one);
    const uint32_t buffered = tavReadNodeInt(0, buffered_, offset, wideHere, &other);
    const uint64_t end = offset + tav::layout::headerLength(one.header.hdrType);
    const bool inside =
        direct == TAV_RC_OK && end + 8 <= direct_->streamBytes &&
        (tav::layout::isGroup(one.header) || tav::layout::sizeOf(one.header) + 8 <= direct_->streamBytes - end);
    if (!inside || (!wideHere && one.header.hdr32.type == TAV_TYPE_HEADER64))
    {
      return;
    }
    same(std::memcmp(&one.header, &other.header, sizeof one.header) == 0, "header read back at ", offset);
    if (tav::layout::isGroup(one.header))
    {
      return;
    }
    const uint64_t size = tav::layout::sizeOf(one.header);
    same(buffered == (inRing(one.header) ? TAV_RC_OK : TAV_RC_DATA_TOO_LARGE), "read back: ", nameOf(buffered));
    same(buffered != TAV_RC_OK || std::memcmp(one.pDataBuf, other.pDataBuf, size) == 0, "data read back at ", offset);
  }

  void pokeRing()
  {
    TAVCircularBuf& ring = *buffered_->pCircularBuf;
    const uint64_t length = direct_->streamBytes;
    switch (random_.below(4))
    {
    case 0: same(ring.reset() == TAV_RC_OK, "reset"); break;
    case 1: ring.reposition(random_.below(length + 100), 0, static_cast<uint8_t>(random_.below(256))); break;
    default:
      if (length > 8)
      {
        compareChunk(ring, block_, length - 7, random_); // the last padding may not have been written
      }
    }
  }

  void resetHandle()
  {
    if (!random_.oneIn(6))
    {
      return;
    }
    TAVResetParam param;
    const uint32_t direct = tavResetHandle(direct_, &param);
    written(direct, tavResetHandle(buffered_, &param), "tavResetHandle");
    nodes_.clear();
  }

  void compareStorage() const
  {
    const Bytes& stored = vector_.bytes;
    same(stored.size() <= highest_ + 2 * case_.pageBytes(), "the storage holds ", stored.size(), " bytes for ",
         highest_);
    const uint64_t common = std::min(stored.size(), block_.size());
    const auto unequal = std::mismatch(stored.begin(), stored.begin() + static_cast<ptrdiff_t>(common), block_.begin());
    same(unequal.first == stored.begin() + static_cast<ptrdiff_t>(common), "stored bytes differ at ",
         unequal.first - stored.begin(), " of ", length_);
    const auto isZero = [](uint8_t byte) { return byte == 0; };
    same(std::all_of(stored.begin() + static_cast<ptrdiff_t>(common), stored.end(), isZero), "bytes beyond the stream");
    same(std::all_of(block_.begin() + static_cast<ptrdiff_t>(common), block_.end(), isZero),
         "the storage ends early, at ", stored.size(), " of ", highest_);
  }

  const ScriptCase& case_;
  Random& random_;
  uint64_t budget_;
  Bytes block_;
  TAVSSMemory memory_;
  VectorStorage vector_;
  TAVHandle* direct_ = nullptr;
  TAVHandle* buffered_ = nullptr;
  bool root32_ = false;
  bool utf8_ = false;
  uint64_t highest_ = 0;
  uint64_t length_ = 0;
  std::vector<WrittenNode> nodes_;
};

} // namespace test
