#include "tav/inspect/source.hpp"

#include <algorithm>

#include "inspect/walk/openedFile.h"
#include "tav/inspect/phrases.hpp"
#include "tav/inspect/problem.hpp"

namespace tav::inspect
{

namespace
{

/// What is in a storage from an offset on, for reading.
class StorageWindow : public TAVSideStorage
{
public:
  StorageWindow(TAVSideStorage& whole, uint64_t from)
      : TAVSideStorage(0, whole.attributes & (TAV_ATTR_READ_FORWARD | TAV_ATTR_SEEK)), whole_(whole), from_(from)
  {
    ioUnit = whole.ioUnit;
  }

  uint32_t seek(uint64_t offset, uint64_t hint) override { return whole_.seek(from_ + offset, hint); }
  uint32_t getPosition(uint64_t* position) override { return without(whole_.getPosition(position), position); }
  uint32_t getTotalSize(uint64_t* size) override { return without(whole_.getTotalSize(size), size); }
  uint32_t read(uint64_t wanted, void** data, uint64_t room, uint64_t* done, bool zeroCopy, bool backward) override
  {
    return backward ? TAV_RC_NOT_SUPPORTED : whole_.read(wanted, data, room, done, zeroCopy, false);
  }
  uint32_t write(const void*, uint64_t, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t getMemory(void**, uint64_t*) override { return TAV_RC_NOT_SUPPORTED; }
  uint32_t lock(uint32_t mode) override { return whole_.lock(mode); }
  uint32_t unlock() override { return whole_.unlock(); }

private:
  uint32_t without(uint32_t code, uint64_t* place) const
  {
    *place -= code == TAV_RC_OK ? from_ : 0;
    return code;
  }

  TAVSideStorage& whole_;
  uint64_t from_;
};

/// The file under a storage, for its holes. Null where there is none or, without type information, where nobody can
/// tell: then zeros are read as any other bytes.
KORHFile* fileUnder([[maybe_unused]] const TAVSideStorage& storage)
{
#if defined(__cpp_rtti)
  const auto* const file = dynamic_cast<const TAVSSFile*>(&storage);
  return file != nullptr ? file->pFile : nullptr;
#else
  return nullptr;
#endif
}

} // namespace

ByteSource::ByteSource(std::string name, std::unique_ptr<TAVSideStorage> storage, uint64_t ringBytes, uint64_t from,
                       std::shared_ptr<void> keep)
    : name_(std::move(name)), keep_(std::move(keep)), storage_(std::move(storage)), from_(from),
      maxPages_(static_cast<size_t>(std::max<uint64_t>(2, ringBytes / kPage)))
{
  uint32_t code = storage_->getStatus();
  if (code == TAV_RC_OK)
  {
    code = storage_->getTotalSize(&size_);
  }
  if (code != TAV_RC_OK)
  {
    failAt(name_, code);
  }
  file_ = fileUnder(*storage_);
  if (from_ != 0)
  {
    startAt();
  }
  inFile_ = from_;
}

void ByteSource::startAt()
{
  if (from_ >= size_)
  {
    throw Error(Problem{.file = name_,
                        .offset = from_,
                        .sentence = "lies behind the end of the file",
                        .remedy = Remedy::beginBefore});
  }
  name_ += " from " + hexOffset(from_);
  size_ -= from_;
  window_ = std::make_unique<StorageWindow>(*storage_, from_);
}

ByteSource::ByteSource(std::string name, std::span<const uint8_t> bytes)
    : name_(std::move(name)),
      // It takes bytes that can be written; a handle that reads leaves them alone.
      storage_(std::make_unique<TAVSSMemory>(const_cast<uint8_t*>(bytes.data()), bytes.size())),
      memory_(bytes), size_(bytes.size()), maxPages_(0)
{
}

ByteSource::~ByteSource() = default;

std::unique_ptr<ByteSource> ByteSource::open(const std::string& path, uint64_t ringBytes, uint64_t from)
{
  return std::make_unique<ByteSource>(path, openedFile(path), ringBytes, from);
}

std::unique_ptr<ByteSource> ByteSource::window(uint64_t from, uint64_t ringBytes)
{
  from = std::min(from, size_);
  std::unique_ptr<ByteSource> made;
  if (!memory_.empty())
  {
    made = std::make_unique<ByteSource>(name_, memory_.subspan(static_cast<size_t>(from)));
  }
  else
  {
    made = std::make_unique<ByteSource>(name_, std::make_unique<StorageWindow>(*storage_, from_ + from), ringBytes);
    made->file_ = file_;
    made->inFile_ = inFile_ + from;
  }
  made->dictionary_ = dictionary_;
  return made;
}

ByteSource::Page& ByteSource::slotFor(uint64_t number)
{
  size_t place = pages_.size();
  if (place < maxPages_)
  {
    pages_.emplace_back();
  }
  else
  {
    const auto oldest =
        std::min_element(pages_.begin(), pages_.end(), [](const Page& a, const Page& b) { return a.used < b.used; });
    place = static_cast<size_t>(oldest - pages_.begin());
    places_.erase(oldest->number);
  }
  places_[number] = place;
  pages_[place].number = number;
  return pages_[place];
}

void ByteSource::fetch(uint64_t number, uint64_t count)
{
  const uint64_t offset = number * kPage;
  const uint64_t wanted = std::min(count * kPage, size_ - offset);
  buffer_.resize(static_cast<size_t>(wanted));
  void* target = buffer_.data();
  uint64_t done = 0;
  uint32_t code = storage_->seek(from_ + offset, 1);
  if (code == TAV_RC_OK)
  {
    code = storage_->read(wanted, &target, wanted, &done, false, false);
  }
  ++readCalls_;
  bytesRead_ += done;
  if (code != TAV_RC_OK && code != TAV_RC_END_OF_STORAGE)
  {
    failAt(name_, code);
  }
  if (done < wanted)
  {
    failAt(name_, TAV_RC_END_OF_STORAGE, "the file became shorter while it was read");
  }
  for (uint64_t at = 0; at < wanted; at += kPage)
  {
    if (places_.contains(number + at / kPage))
    {
      continue;
    }
    Page& slot = slotFor(number + at / kPage);
    slot.used = ++clock_;
    const auto first = buffer_.begin() + static_cast<ptrdiff_t>(at);
    slot.bytes.assign(first, first + static_cast<ptrdiff_t>(std::min(kPage, wanted - at)));
  }
}

const ByteSource::Page& ByteSource::page(uint64_t number)
{
  auto found = places_.find(number);
  if (found == places_.end())
  {
    run_ = number == expected_ ? run_ + 1 : 0;
    // A single look reads one page; who goes straight on gets more at once, up to a quarter of what may be kept.
    const uint64_t ahead = std::min({run_ + 1, kLongRead / kPage, uint64_t{maxPages_} / 4 + 1});
    fetch(number, ahead);
    expected_ = number + ahead;
    if (run_ != 0 && told_)
    {
      told_(number * kPage);
    }
    found = places_.find(number);
  }
  last_ = found->second;
  Page& result = pages_[last_];
  result.used = ++clock_;
  return result;
}

std::span<const uint8_t> ByteSource::view(uint64_t offset)
{
  if (offset >= size_)
  {
    return {};
  }
  if (!memory_.empty())
  {
    return memory_.subspan(static_cast<size_t>(offset));
  }
  // Most looks are at the page of the one before: told here, without a call.
  const bool isSame = last_ < pages_.size() && pages_[last_].number == offset / kPage;
  const Page& found = isSame ? pages_[last_] : page(offset / kPage);
  if (isSame)
  {
    pages_[last_].used = ++clock_;
  }
  const auto at = static_cast<size_t>(offset % kPage);
  return {found.bytes.data() + at, found.bytes.size() - at};
}

uint64_t ByteSource::zerosUntil(uint64_t offset)
{
  if (offset >= size_)
  {
    return size_;
  }
  if (offset >= holeFrom_ && offset < holeTo_)
  {
    return holeTo_;
  }
  uint64_t found = 0;
  if (file_ == nullptr || file_->findData(inFile_ + offset, &found) != TAV_RC_OK || found <= inFile_ + offset)
  {
    return offset;
  }
  holeFrom_ = offset;
  holeTo_ = std::min(found - inFile_, size_);
  return holeTo_;
}

uint64_t ByteSource::zerosBefore(uint64_t end, uint64_t from)
{
  if (end <= from || zerosUntil(end - 1) < end)
  {
    return end;
  }
  // What is known of a place holds for all behind it.
  uint64_t known = end - 1;
  while (from < known)
  {
    const uint64_t between = from + (known - from) / 2;
    const bool isBlank = zerosUntil(between) >= end;
    known = isBlank ? between : known;
    from = isBlank ? from : between + 1;
  }
  return known;
}

uint64_t ByteSource::pastHole(uint64_t offset, std::span<const uint8_t> seen, uint64_t margin)
{
  const bool blank = std::all_of(seen.begin(), seen.end(), [](uint8_t byte) { return byte == 0; });
  const uint64_t zeros = blank ? zerosUntil(offset) : offset;
  return zeros > offset && zeros - offset > margin ? zeros - margin : offset;
}

size_t ByteSource::read(uint64_t offset, std::span<uint8_t> to)
{
  size_t done = 0;
  while (done < to.size())
  {
    const auto piece = view(offset + done);
    if (piece.empty())
    {
      break;
    }
    const size_t count = std::min(piece.size(), to.size() - done);
    std::copy_n(piece.begin(), count, to.begin() + static_cast<ptrdiff_t>(done));
    done += count;
  }
  return done;
}

} // namespace tav::inspect
