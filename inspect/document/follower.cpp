#include "inspect/document/follower.h"

#include <algorithm>
#include <array>
#include <utility>

#include "inspect/document/state.h"
#include "inspect/walk/openedFile.h"
#include "tav/inspect/path.hpp"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

namespace
{

bool isBlank(const TAVHeader& header)
{
  return layout::sizeOf(header) == 0 && layout::typeOf(header) == 0 && layout::elmOf(header) == 0;
}

/// Whether two headers can be those of one node: its size is set when it is closed.
bool isSameNode(const TAVHeader& a, const TAVHeader& b)
{
  return layout::typeOf(a) == layout::typeOf(b) && layout::elmOf(a) == layout::elmOf(b) &&
         layout::infoOf(a) == layout::infoOf(b);
}

/// Behind what has to be there of a node before it can be told: a group's header, a data element's payload.
uint64_t neededEnd(const TAVHeader& header)
{
  return layout::addSaturated(Follower::behindHeader(header), layout::isGroup(header) ? 0 : layout::sizeOf(header));
}

} // namespace

uint64_t Follower::behindHeader(const TAVHeader& header)
{
  return layout::addSaturated(header.nodeOffset, layout::headerLength(header.hdrType));
}

bool Follower::open()
{
  std::unique_ptr<FollowedFile> file;
  try
  {
    file = openedFile<FollowedFile>(path_);
  }
  catch (const Error& error)
  {
    if (codeOf(error.code()) == KOR_RC_NO_SUCH_FILE)
    {
      if (!std::exchange(isMissing_, true))
      {
        tellChange(FileChange::missing);
      }
      return false; // it may come
    }
    throw;
  }
  endOpenRoot();
  now_.reset();
  file_ = std::make_unique<ByteSource>(path_, std::move(file), options_.ringBytes);
  followed_ = &static_cast<FollowedFile&>(file_->storage());
  file_->setDictionary(options_.dictionary);
  beginAnew();
  return true;
}

void Follower::beginAnew()
{
  former_ = form_ ? form_ : former_;
  form_.reset();
  formBefore_.reset();
  root_ = {};
  rootBefore_ = {};
  roots_.clear();
  levels_.clear();
  above_.clear();
  reached_ = 0;
}

uint64_t Follower::goOn(bool quiet, uint64_t most)
{
  quiet_ = quiet;
  count_ = 0;
  most_ = most;
  if (file_ == nullptr && !open())
  {
    return 0;
  }
  if (now_ == nullptr && std::exchange(isMissing_, false))
  {
    tellChange(FileChange::appeared);
  }
  readOn();
  if (count_ < most_ && !followed_->pFile->isAt(path_.c_str()))
  {
    goOver();
  }
  return count_;
}

/// The file that is open has lost its name.
void Follower::goOver()
{
  readOn(); // what came before
  if (count_ < most_ && open())
  {
    tellChange(std::exchange(isMissing_, false) ? FileChange::appeared : FileChange::replaced);
    readOn();
  }
}

/// The file is let go of: nothing more is to come of a root that is open in it.
void Follower::endOpenRoot()
{
  try
  {
    if (!levels_.empty())
    {
      hand(told_.rootEnd, above_.front(), {});
    }
  }
  catch (const std::system_error& error)
  {
    if (!isCutOff(error))
    {
      throw;
    }
    tellChange(FileChange::shortened);
  }
}

/// Whether all that an error says is that the file does not have any more what was told of it.
bool Follower::isCutOff(const std::system_error& error) const
{
  return followed_->isShort() && codeOf(error.code()) == TAV_RC_END_OF_STORAGE;
}

void Follower::tellChange(FileChange change)
{
  if (told_.change)
  {
    told_.change(change);
  }
}

void Follower::readOn()
{
  bool isCut = true;
  while (isCut)
  {
    try
    {
      readToEnd();
      isCut = followed_->isShort();
    }
    catch (const std::system_error& error)
    {
      if (!isCutOff(error))
      {
        throw;
      }
    }
    if (isCut)
    {
      tellChange(FileChange::shortened);
      beginAnew();
      isCut = goesOn();
    }
  }
  reader_.reset();
}

/// The file as it is now: what was told of it before need not be there.
void Follower::look()
{
  reader_.reset();
  const uint32_t code = followed_->look();
  if (code != TAV_RC_OK)
  {
    failAt(path_, code);
  }
  now_ = file_->window(0, kRingBytes);
}

/// Forgets what was read at this look: the file has changed meanwhile.
void Follower::readAgain()
{
  reader_.reset();
  now_ = file_->window(0, kRingBytes);
}

/// Whether a header is not yet what was read of the file before.
bool Follower::isNew(const TAVHeader& header) const
{
  std::array<uint8_t, layout::kHeaderSize64> bytes{};
  const auto length = static_cast<size_t>(layout::headerLength(header.hdrType));
  TAVHeader known = header;
  if (now_->read(header.nodeOffset, std::span(bytes).first(length)) == length)
  {
    layout::decodeHeader(bytes.data(), layout::is64(header), form_->swapped, known);
    known.nodeOffset = header.nodeOffset;
    return !isSameNode(known, header) || layout::sizeOf(known) != layout::sizeOf(header);
  }
  return true;
}

void Follower::reach(uint64_t end)
{
  reached_ = end;
  followed_->need(end);
}

void Follower::readToEnd()
{
  look();
  if (now_->size() < reached_ || (!isSame() && !goBack()))
  {
    tellChange(FileChange::shortened);
    beginAnew();
  }
  reach(reached_);
  if (!form_ && !findForm())
  {
    return;
  }
  while (goesOn() && form_ && (levels_.empty() ? nextRoot() : nextChild()))
  {
  }
}

/// A root that was taken back leaves the one before it in its place. False when that is gone, too.
bool Follower::goBack()
{
  root_ = std::exchange(rootBefore_, {});
  form_ = formBefore_;
  const bool isThere = root_.hdrType != 0 && form_ && isSame();
  if (isThere && !levels_.empty())
  {
    --roots_[layout::elmOf(levels_.front().group)];
    reach(behindHeader(root_));
    levels_.clear();
    above_.clear();
  }
  return isThere;
}

/// Whether the root is still there: a file can be emptied and filled again between two looks.
bool Follower::isSame()
{
  TAVHeader root{};
  return root_.hdrType == 0 || (readHeader(root_, form_->swapped, root) && isSameNode(root, root_));
}

/// Reads a header from the file as it is now.
bool Follower::readHeader(const TAVHeader& like, bool swapped, TAVHeader& header)
{
  std::array<uint8_t, layout::kHeaderSize64> bytes{};
  const uint64_t length = layout::headerLength(like.hdrType);
  void* to = bytes.data();
  uint64_t done = 0;
  TAVSideStorage& storage = file_->storage();
  if (storage.seek(like.nodeOffset, 0) != TAV_RC_OK)
  {
    return false;
  }
  static_cast<void>(storage.read(length, &to, length, &done, false, false));
  header = like;
  layout::decodeHeader(bytes.data(), layout::is64(header), swapped, header);
  return done == length;
}

tav::Reader& Follower::reader()
{
  if (reader_ == nullptr)
  {
    reader_ = std::make_unique<tav::Reader>(file_->storage(), streamOptions(*form_, options_.ringBytes));
  }
  return *reader_;
}

bool Follower::nextChild()
{
  Level& top = levels_.back();
  TAVHeaderData next{};
  TAVHeader reference = top.last;
  const bool isFirst = reference.hdrType == 0;
  const uint32_t rc =
      tavGetNextChild(0, reader().handle(), &top.group, isFirst ? nullptr : &reference, &next);
  const bool isThere = next.header.hdrType != 0 && neededEnd(next.header) <= followed_->end();
  if (rc == TAV_RC_OK && isThere && !isBlank(next.header))
  {
    return takeChild(next.header);
  }
  if (rc == TAV_RC_NO_MORE_CHILDREN)
  {
    leave();
    return true;
  }
  return refresh() || !waits(rc, rc == TAV_RC_DATA_TOO_LARGE && isThere);
}

/// A node was read where the next child of the innermost group would be. It is one unless the group was closed before.
bool Follower::takeChild(const TAVHeader& child)
{
  isReadAgain_ = false;
  if (layout::isSizeUnknown(levels_.back().group) && refresh())
  {
    return true;
  }
  Level& top = levels_.back();
  const TAVHeader before = std::exchange(top.last, child);
  if (!layout::isEndElement(layout::elmOf(child)))
  {
    arrive(child, before);
  }
  else if (layout::isSizeUnknown(top.group))
  {
    leave();
  }
  return true;
}

/// Whether there is nothing to do but wait for more bytes. Damage in a group that is there as a whole ends the group.
bool Follower::waits(uint32_t rc, bool isLarge)
{
  if (isLarge)
  {
    throw Error(Problem{.file = path_,
                        .offset = reached_,
                        .sentence = "a data element behind this place is larger than the ring",
                        .code = TAV_RC_DATA_TOO_LARGE});
  }
  const TAVHeader& group = levels_.back().group;
  const uint64_t end = layout::addSaturated(behindHeader(group), layout::sizeOf(group));
  if (layout::isSizeUnknown(group) || end > followed_->end())
  {
    return true;
  }
  if (!std::exchange(isReadAgain_, true))
  {
    // What is in it may have been read before it was written, and that it is closed after.
    readAgain();
    return false;
  }
  tellCut(levels_.back(), end, rc);
  leave();
  return false;
}

/// Damage has ended a group that is there as a whole: what is behind its last sound child was passed over.
void Follower::tellCut(const Level& level, uint64_t end, uint32_t rc)
{
  const TAVHeader& last = level.last;
  const uint64_t from = last.hdrType == 0 ? behindHeader(level.group)
                                          : layout::addSaturated(behindHeader(last), layout::sizeOf(last));
  if (!told_.damage || quiet_ || from >= end)
  {
    return;
  }
  PassedOver passed{.offset = from, .length = end - from};
  passed.code = rc == TAV_RC_OK ? TAV_RC_BAD_HDR_TYPE : rc;
  passed.path = pathText({above_.back(), std::span(above_).first(above_.size() - 1), *now_, *form_}, PathStyle::brief);
  passed.reason = codeSentence(passed.code);
  passed.sentence = "passed over " + counted(passed.length, "byte") + ": " + passed.reason;
  told_.damage(passed);
}

/// Reads the innermost group's header again; true when it has changed: the group was closed, or taken back.
bool Follower::refresh()
{
  Level& top = levels_.back();
  TAVHeader header{};
  if (!readHeader(top.group, form_->swapped, header))
  {
    return false;
  }
  if (!isSameNode(header, top.group))
  {
    const TAVHeader before = top.before;
    const uint16_t elm = layout::elmOf(top.group);
    if (levels_.size() == 1)
    {
      look(); // in which the root is not any more
      if (!goBack())
      {
        beginAnew();
      }
      return true;
    }
    levels_.pop_back();
    above_.pop_back();
    levels_.back().last = before;
    --levels_.back().counts[elm];
    return true;
  }
  const bool isOther = layout::sizeOf(header) != layout::sizeOf(top.group);
  if (isOther)
  {
    readAgain();
  }
  top.group = header;
  return isOther;
}

void Follower::leave()
{
  isReadAgain_ = false;
  const TAVHeader group = levels_.back().group;
  levels_.pop_back();
  const Node node = above_.back();
  above_.pop_back();
  if (levels_.empty())
  {
    root_ = group;
    Node ended = nodeOf(group);
    ended.ordinal = node.ordinal;
    hand(told_.rootEnd, ended, {});
  }
  else
  {
    levels_.back().last = group;
  }
}

void Follower::arrive(const TAVHeader& header, const TAVHeader& before)
{
  ++count_;
  reach(std::max(reached_, neededEnd(header)));
  Node node = nodeOf(header);
  node.ordinal = ++(levels_.empty() ? roots_ : levels_.back().counts)[node.elm()];
  hand(told_.node, node, above_);
  if (node.isGroup())
  {
    levels_.push_back({.group = header, .before = before});
    above_.push_back(node);
  }
  if (onNode_ && !quiet_)
  {
    handRead(header);
  }
}

Node Follower::nodeOf(const TAVHeader& header) const
{
  Node node{.header = header, .depth = levels_.size(), .limit = neededEnd(header)};
  node.parentOffset = above_.empty() ? kNoOffset : above_.back().offset();
  if (node.isGroup() && layout::isSizeUnknown(header))
  {
    node.flags = kOpen;
    node.limit = now_->size();
  }
  else if (node.isGroup())
  {
    node.limit = layout::addSaturated(behindHeader(header), layout::sizeOf(header));
  }
  return node;
}

/// Bytes near the end may have been written since `now_` has read their page: there they are read anew. What a closed
/// group has stays while it is told.
void Follower::hand(const std::function<void(const Arrival&)>& to, const Node& node, std::span<const Node> above)
{
  constexpr uint64_t changing = uint64_t{1} << 20U;
  constexpr uint64_t ringBytes = uint64_t{64} * 1024;
  if (!to || quiet_)
  {
    return;
  }
  if (isNew(node.header))
  {
    now_ = file_->window(0, kRingBytes);
  }
  const bool isNearEnd = layout::addSaturated(node.limit, changing) > now_->size();
  const auto fresh = isNearEnd ? file_->window(0, ringBytes) : nullptr;
  followed_->need(std::max(reached_, node.has(kOpen) ? 0 : std::min(node.limit, followed_->end())));
  to({node, above, fresh != nullptr ? *fresh : *now_, *form_});
  reach(reached_);
}

void Follower::handRead(const TAVHeader& node)
{
  std::error_code ec;
  const tav::Node read = reader().at(node.nodeOffset, layout::is64(node) ? Width::bits64 : Width::bits32, ec);
  if (ec)
  {
    const uint32_t code = codeOf(ec);
    throw Error(Problem{.file = path_,
                        .offset = node.nodeOffset,
                        .sentence = elementText(layout::elmOf(node), options_.dictionary) + ": " +
                                    std::string(codeSentence(code)),
                        .code = code});
  }
  onNode_(read);
}

} // namespace tav::inspect
