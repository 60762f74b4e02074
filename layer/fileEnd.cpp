// Where a file's last stream ends, for a writer that goes on behind it.
#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "layer/fileBytes.h"
#include "layer/formSearch.h"
#include "layer/rootSearch.h"
#include "tav/cpp/append.hpp"

namespace tav::detail
{

namespace
{

struct Found
{
  std::string sentence{};
  StreamForm form{};
  uint64_t end = 0;
  std::vector<TAVHeader> open{};
};

/// Finds the end of a file's last stream. Roots are passed by their sizes: a header each. The last one is whole when
/// its end element is there, or when nothing but whole nodes stand in it; else it is walked, and the groups in it that
/// are whole are passed by their sizes, too.
class EndSearch
{
public:
  EndSearch(FileBytes& bytes, Found& found) noexcept
      : bytes_(bytes), found_(found)
  {
  }

  uint32_t run()
  {
    uint32_t rc = findContent();
    RootSearch<FileBytes> search(bytes_, found_.form);
    uint64_t at = 0;
    while (rc == TAV_RC_OK)
    {
      TAVHeader root;
      rc = search.next(at, root);
      if (rc != TAV_RC_OK)
      {
        return endAt(rc, at, root.nodeOffset);
      }
      bool whole = endOfGroup(root) < content_;
      rc = whole ? rc : endsWell(root, whole);
      at = whole ? endOfGroup(root) : at;
      if (rc == TAV_RC_OK && !whole)
      {
        rc = walk(root);
        at = found_.end;
      }
      if (rc != TAV_RC_OK || !found_.open.empty())
      {
        return rc;
      }
    }
    return rc;
  }

private:
  static constexpr uint64_t kMostCut = uint64_t{16} << 20U; ///< bytes of a node that a killed writer may have left
  static constexpr size_t kMostOpen = 4000;

  /// A group that is walked, where it says that it ends, and where the groups around it do at the latest.
  struct Level
  {
    TAVHeader group;
    uint64_t end;
    uint64_t limit;
  };

  uint32_t refuse(uint64_t offset, const char* why)
  {
    found_.sentence = "at " + offsetText(offset) + ' ' + why + "; tav recover makes a sound file of it";
    return TAV_RC_OUTSIDE_PARENT;
  }

  /// Where the zeros begin in which the file ends.
  uint32_t findContent()
  {
    constexpr uint64_t step = 4096;
    std::array<uint8_t, step> piece;
    uint32_t rc = TAV_RC_OK;
    uint64_t got = 0; // up to the last byte that is not zero
    for (content_ = bytes_.size(); rc == TAV_RC_OK && got == 0 && content_ != 0;)
    {
      const uint64_t length = std::min<uint64_t>(step, content_);
      rc = bytes_.read(content_ - length, piece.data(), length, got);
      rc = rc == TAV_RC_OK && got != length ? KOR_RC_IO_ERROR : rc;
      for (; got != 0 && piece[static_cast<size_t>(got - 1)] == 0; --got)
      {
      }
      content_ -= length - got;
    }
    return rc;
  }

  /// No further root: behind the last one stand zeros, or the first bytes of a header, or something else.
  uint32_t endAt(uint32_t rc, uint64_t at, uint64_t other)
  {
    found_.end = at;
    if (rc == TAV_RC_NO_MORE_CHILDREN)
    {
      return TAV_RC_OK;
    }
    const uint64_t header = found_.form.wide ? layout::kHeaderSize64 : layout::kHeaderSize32;
    if (rc == TAV_RC_BAD_CHILD_HDR && at != 0 && content_ - at >= header)
    {
      return refuse(other, "stands what is no stream of this form");
    }
    return rc == TAV_RC_BAD_CHILD_HDR && at != 0 ? TAV_RC_OK : rc;
  }

  /// Whether a closed group that reaches the end of what is there is whole. Its end element says so; so does a last
  /// byte that is none of the zeros in a page's rest.
  uint32_t endsWell(const TAVHeader& group, bool& whole)
  {
    const uint64_t end = endOfGroup(group);
    whole = end == content_;
    if (end > bytes_.size() || !layout::hasEyeSize(group))
    {
      return TAV_RC_OK;
    }
    const bool wide = layout::hasChildren64(group);
    const uint64_t start = end - layout::endElementLength(wide);
    layout::EyeSizeBytes pair;
    TAVHeader element;
    bool there = false;
    uint64_t got = 0;
    uint32_t rc = readHeader(bytes_, found_.form, wide, start, element, there);
    rc = rc == TAV_RC_OK ? bytes_.read(end - pair.size(), pair.data(), pair.size(), got) : rc;
    const layout::EyeSize eye = layout::decodeEyeSize(pair, found_.form.swapped);
    const uint64_t size = layout::sizeOf(group);
    const uint64_t payload = size - std::min(size, layout::endElementLength(wide));
    whole = there && got == pair.size() && layout::elmOf(element) == TAV_ELM_CMN_END_HDR_EYE_SIZE &&
            eye.eye == TAV_EYE_CATCHER && eye.distance == layout::groupDistance(payload, wide);
    return rc;
  }

  /// Walks the nodes of the last root up to the end, or to where a writer was killed.
  uint32_t walk(const TAVHeader& root)
  {
    levels_.assign(1, Level{root, endOfGroup(root), endOfGroup(root)});
    uint64_t at = root.nodeOffset + layout::headerLength(root.hdrType);
    uint32_t rc = TAV_RC_OK;
    while (rc == TAV_RC_OK && !levels_.empty() && !isCut_)
    {
      if (at == levels_.back().end)
      {
        levels_.pop_back();
        continue;
      }
      rc = step(at);
    }
    found_.end = at;
    for (const Level& level : levels_)
    {
      found_.open.push_back(level.group);
    }
    return rc;
  }

  /// Over one node, or into a group.
  uint32_t step(uint64_t& at)
  {
    const bool wide = layout::hasChildren64(levels_.back().group);
    TAVHeader node;
    bool there = false;
    const uint32_t rc = readHeader(bytes_, found_.form, wide, at, node, there);
    const uint64_t header = layout::headerLength(node.hdrType);
    const bool isBlank = layout::typeOf(node) == 0;
    isCut_ = at >= content_ || !there || (isBlank && content_ - at < header);
    if (rc != TAV_RC_OK || isCut_)
    {
      return rc;
    }
    const bool isGroup = layout::isGroup(node);
    const bool isOpen = isGroup && layout::isSizeUnknown(node);
    const uint64_t end = isOpen ? at + header : layout::addSaturated(at, lengthOfNode(node, found_.form.aligned));
    if (isBlank || end > levels_.back().limit)
    {
      return refuse(at, "stands what is no node of its group");
    }
    return isGroup ? enter(node, at) : pass(node, end, at);
  }

  /// Past a data element, unless it is cut: then it goes on behind the end of the file, or its pair is not there.
  uint32_t pass(const TAVHeader& node, uint64_t end, uint64_t& at)
  {
    const bool endsGroup =
        layout::elmOf(node) == TAV_ELM_CMN_END_HDR_EYE_SIZE && layout::isSizeUnknown(levels_.back().group);
    if (endsGroup && levels_.size() == 1 && end >= content_)
    {
      isCut_ = true; // the root's size could not be written: it is closed once more, for readers to pass it
      return TAV_RC_OK;
    }
    if (end > bytes_.size())
    {
      isCut_ = true;
      return checkCut(at + layout::headerLength(node.hdrType));
    }
    if (end >= content_ && layout::hasEyeSize(node))
    {
      layout::EyeSizeBytes pair{};
      uint64_t got = 0;
      const uint32_t rc = bytes_.read(end - pair.size(), pair.data(), pair.size(), got);
      const layout::EyeSize eye = layout::decodeEyeSize(pair, found_.form.swapped);
      isCut_ = eye.eye != TAV_EYE_CATCHER || eye.distance != layout::dataDistance(layout::sizeOf(node));
      if (rc != TAV_RC_OK || isCut_)
      {
        return rc;
      }
    }
    at = end;
    if (endsGroup)
    {
      levels_.pop_back(); // its size could not be written
    }
    return TAV_RC_OK;
  }

  /// Past a group that is whole, else to its first child.
  uint32_t enter(const TAVHeader& group, uint64_t& at)
  {
    const uint64_t end = endOfGroup(group);
    bool whole = end < content_;
    uint32_t rc = whole ? TAV_RC_OK : endsWell(group, whole);
    if (rc == TAV_RC_OK && !whole && levels_.size() == kMostOpen)
    {
      rc = refuse(at, "stand more open groups than can be");
    }
    if (rc == TAV_RC_OK && !whole)
    {
      levels_.push_back(Level{group, end, std::min<uint64_t>(end, levels_.back().limit)});
    }
    at = whole ? end : at + layout::headerLength(group.hdrType);
    return rc;
  }

  /// What is left of a node that goes on behind the end of the file will be dropped. It is none when nodes stand in it:
  /// then the size is wrong.
  uint32_t checkCut(uint64_t from)
  {
    if (content_ > from && content_ - from > kMostCut)
    {
      return refuse(from, "begins a node that goes on behind the end of the file, too large to be dropped");
    }
    for (uint64_t at = from; at < content_; ++at)
    {
      for (const bool wide : {true, false})
      {
        bool nodes = false;
        const uint32_t rc = isChain(at, wide, nodes);
        if (rc != TAV_RC_OK || nodes)
        {
          return rc != TAV_RC_OK ? rc : refuse(from, "begins a node with a size that is wrong");
        }
      }
    }
    return TAV_RC_OK;
  }

  /// Whether nodes of known types and elements follow one another from an offset on.
  uint32_t isChain(uint64_t at, bool wide, bool& nodes)
  {
    constexpr int enough = 3;
    nodes = false;
    for (int i = 0; i < enough; ++i)
    {
      TAVHeader node;
      bool there = false;
      const uint32_t rc = readHeader(bytes_, found_.form, wide, at, node, there);
      const uint16_t type = layout::typeOf(node);
      const bool isGroup = layout::isGroupType(type);
      const bool known = there && (isGroup || layout::typeInfo(type).known) && layout::elmOf(node) != 0;
      const uint64_t length = isGroup ? layout::headerLength(node.hdrType) : lengthOfNode(node, found_.form.aligned);
      if (rc != TAV_RC_OK || !known || layout::addSaturated(at, length) > bytes_.size())
      {
        return rc;
      }
      at += length;
      wide = isGroup ? layout::hasChildren64(node) : wide;
    }
    nodes = true;
    return TAV_RC_OK;
  }

  FileBytes& bytes_;
  Found& found_;
  uint64_t content_ = 0; ///< behind the last byte that is not zero
  bool isCut_ = false;
  std::vector<Level> levels_;
};

} // namespace

uint32_t findEnd(KORHFile& file, const StreamForm* given, const EndTaker& taker)
{
  Found found;
  FileBytes bytes(file);
  uint32_t rc = bytes.open();
  if (rc == TAV_RC_OK && bytes.size() == 0)
  {
    found.form = given != nullptr ? *given : StreamForm{};
  }
  else if (rc == TAV_RC_OK)
  {
    rc = FormSearch(bytes).run(given, found.form, found.sentence);
    rc = rc == TAV_RC_OK ? EndSearch(bytes, found).run() : rc;
  }
  taker.take(taker.to, found.form, found.end, found.sentence.c_str());
  for (const TAVHeader& group : found.open)
  {
    taker.takeOpen(taker.to, group);
  }
  return rc;
}

} // namespace tav::detail
