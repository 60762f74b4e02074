#include "inspect/document/follower.h"

#include <algorithm>
#include <array>
#include <chrono>

#include "inspect/document/state.h"
#include "inspect/document/streamWalk.h"
#include "kor/fileWatch.h"
#include "tav/inspect/fileKind.hpp"
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

uint64_t behindHeader(const TAVHeader& header)
{
  return layout::addSaturated(header.nodeOffset, layout::headerLength(header.hdrType));
}

/// Behind what has to be there of a node before it can be told: a group's header, a data element's payload.
uint64_t neededEnd(const TAVHeader& header)
{
  return layout::addSaturated(behindHeader(header), layout::isGroup(header) ? 0 : layout::sizeOf(header));
}

} // namespace

bool Follower::open()
{
  try
  {
    file_ = ByteSource::open(path_, options_.ringBytes);
  }
  catch (const Error& error)
  {
    if (codeOf(error.code()) == KOR_RC_NO_SUCH_FILE)
    {
      return false; // it may come
    }
    throw;
  }
  beginAnew();
  return true;
}

void Follower::beginAnew()
{
  former_ = form_ ? form_ : former_;
  form_.reset();
  root_ = {};
  levels_.clear();
  reached_ = 0;
}

uint64_t Follower::goOn(bool quiet)
{
  quiet_ = quiet;
  count_ = 0;
  if (file_ == nullptr && !open())
  {
    return 0;
  }
  const auto& storage = static_cast<TAVSSFile&>(file_->storage());
  readOn();
  if (!storage.pFile->isAt(path_.c_str()))
  {
    readOn(); // what came before it lost its name
    if (open())
    {
      readOn();
    }
  }
  return count_;
}

void Follower::readOn()
{
  constexpr uint64_t ringBytes = uint64_t{1} << 20U;
  reader_.reset();
  now_ = file_->window(0, ringBytes);
  if (now_->size() < reached_ || !isSame())
  {
    beginAnew();
  }
  if (!form_ && !findForm())
  {
    return;
  }
  while (!stop_.stop_requested() && form_ && (levels_.empty() ? nextRoot() : nextChild()))
  {
  }
  reader_.reset();
}

/// A file that takes another one's place is in the same form more often than not, and at first it is short.
bool Follower::findForm()
{
  if (now_->size() == 0)
  {
    return false;
  }
  if (former_)
  {
    const Recognition again =
        recognise(*now_, {.swapped = former_->swapped, .root64 = former_->root64, .aligned = former_->aligned});
    if (again.isStream && !again.damagedStart)
    {
      form_ = again.form;
      return true;
    }
  }
  const Recognition found = recognise(*now_, choiceNow());
  if (found.isStream && !found.ambiguous() && !otherKindOf(*now_, found))
  {
    form_ = found.form;
  }
  return form_.has_value();
}

/// Of a few nodes, the last one cut, more than one padding can make sense: there the root's header says.
FormChoice Follower::choiceNow()
{
  constexpr uint64_t fewBytes = 4096;
  FormChoice choice = options_.form;
  const Form first = recognise(*now_, choice).form;
  TAVHeader root{};
  root.hdrType = TAV_HDR_64;
  if (!choice.aligned && first.root64 && now_->size() < fewBytes && readHeader(root, first.swapped, root))
  {
    choice.aligned = (layout::infoOf(root) & TAV_INFO_ALIGNED8) != 0;
  }
  return choice;
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

bool Follower::nextRoot()
{
  WalkStart start;
  Form form = *form_;
  if (root_.hdrType != 0)
  {
    start = {.offset = root_.nodeOffset, .wide = layout::is64(root_)};
    form.root64 = layout::is64(root_);
  }
  StreamWalk walk(
      *now_, form, [](const PassedOver&) {}, start);
  Event event;
  for (bool isPast = root_.hdrType == 0; walk.next(event);)
  {
    if (event.what != What::nodeBegin || event.depth != 0)
    {
      continue;
    }
    if (isPast)
    {
      const bool isOther = !(walk.form() == *form_);
      form_ = walk.form();
      reader_ = isOther ? nullptr : std::move(reader_);
      root_ = event.node.header;
      arrive(root_, {});
      return true;
    }
    isPast = true;
    walk.skip();
  }
  return false;
}

bool Follower::nextChild()
{
  Level& top = levels_.back();
  TAVHeaderData next{};
  TAVHeader reference = top.last;
  const bool isFirst = reference.hdrType == 0;
  const uint32_t rc =
      tavGetNextChild(0, reader().handle(), &top.group, isFirst ? nullptr : &reference, &next);
  const bool isThere = next.header.hdrType != 0 && neededEnd(next.header) <= now_->size();
  if (rc == TAV_RC_OK && isThere && !isBlank(next.header))
  {
    return takeChild(next.header);
  }
  if (rc == TAV_RC_NO_MORE_CHILDREN)
  {
    leave();
    return true;
  }
  return refresh() || !waits(rc == TAV_RC_DATA_TOO_LARGE && isThere);
}

/// A node was read where the next child of the innermost group would be. It is one unless the group was closed before.
bool Follower::takeChild(const TAVHeader& child)
{
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
bool Follower::waits(bool isLarge)
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
  if (layout::isSizeUnknown(group) || end > now_->size())
  {
    return true;
  }
  leave();
  return false;
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
    levels_.pop_back();
    levels_.empty() ? beginAnew() : void(levels_.back().last = before);
    return true;
  }
  const bool isOther = layout::sizeOf(header) != layout::sizeOf(top.group);
  top.group = header;
  return isOther;
}

void Follower::leave()
{
  const TAVHeader group = levels_.back().group;
  levels_.pop_back();
  if (levels_.empty())
  {
    root_ = group;
  }
  else
  {
    levels_.back().last = group;
  }
}

void Follower::arrive(const TAVHeader& node, const TAVHeader& before)
{
  ++count_;
  reached_ = std::max(reached_, behindHeader(node));
  if (layout::isGroup(node))
  {
    levels_.push_back({node, before, {}});
  }
  if (quiet_)
  {
    return;
  }
  std::error_code ec;
  const tav::Node read = reader().at(node.nodeOffset, layout::is64(node) ? Width::bits64 : Width::bits32, ec);
  if (ec)
  {
    const uint32_t code = codeOf(ec);
    throw Error(Problem{.file = path_,
                        .offset = node.nodeOffset,
                        .sentence = elementText(layout::elmOf(node)) + ": " + std::string(codeSentence(code)),
                        .code = code});
  }
  onNode_(read);
}

FollowEnd Document::follow(const std::function<void(const tav::Node&)>& onNode, const FollowOptions& options) const
{
  using Clock = std::chrono::steady_clock;
  constexpr std::chrono::milliseconds longestWait(100); // how long a stop, or what no watch says of, can take
  if (state_->path.empty())
  {
    throw Error(Problem{.file = state_->source->name(),
                        .sentence = "only a file that was opened by its path, from its first byte on, can be followed",
                        .code = TAV_RC_NOT_SUPPORTED});
  }
  kor::FileWatch watch(state_->path);
  Follower follower(state_->path, state_->options, onNode, options.stop);
  follower.goOn(!options.existing);
  auto last = Clock::now();
  while (!options.stop.stop_requested())
  {
    watch.wait(static_cast<uint32_t>(longestWait.count()));
    const uint64_t count = follower.goOn();
    const auto now = Clock::now();
    last = count != 0 ? now : last;
    if (options.timeout.count() != 0 && now - last >= options.timeout)
    {
      return FollowEnd::timedOut;
    }
  }
  return FollowEnd::stopped;
}

} // namespace tav::inspect
