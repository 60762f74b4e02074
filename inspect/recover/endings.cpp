#include "inspect/recover/endings.h"

#include <algorithm>
#include <array>
#include <cstring>

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr size_t kMostEndings = size_t{256} * 1024; ///< 6 MiB

bool readHeader(ByteSource& source, const Form& form, uint64_t offset, bool wide, TAVHeader& out)
{
  std::array<uint8_t, kHeaderSize64> bytes{};
  const size_t length = wide ? kHeaderSize64 : kHeaderSize32;
  if (offset > source.size() || source.read(offset, std::span(bytes).first(length)) != length)
  {
    return false;
  }
  decodeHeader(bytes.data(), wide, form.swapped, out);
  out.nodeOffset = offset;
  return true;
}

class EyeSearch
{
public:
  EyeSearch(ByteSource& source, const Form& form, uint64_t from)
      : source_(source), form_(form), from_(from)
  {
    const EyeSizeBytes pair = encodeEyeSize(0, form.swapped);
    std::copy_n(pair.begin(), eye_.size(), eye_.begin());
  }

  std::vector<Ending> run()
  {
    // What was read stays at hand for the look at what an eye catcher ends.
    constexpr size_t kWindow = ByteSource::kPage;
    std::vector<uint8_t> window(kWindow + kEyeLength - 1);
    for (uint64_t at = from_; at < source_.size();)
    {
      const size_t got = source_.read(at, window);
      const uint8_t* place = window.data();
      const uint8_t* const end = window.data() + got;
      while ((place = std::search(place, end, eye_.begin(), eye_.end())) != end)
      {
        take(at + static_cast<uint64_t>(place - window.data()));
        place += kEyeLength;
      }
      at = source_.pastHole(at + kWindow, window, kEyeLength - 1);
    }
    std::sort(found_.begin(), found_.end(), [](const Ending& a, const Ending& b) {
      return a.start != b.start ? a.start < b.start : a.end > b.end;
    });
    return std::move(found_);
  }

private:
  void take(uint64_t eye)
  {
    for (const bool wide : {true, false})
    {
      const uint64_t length = wide ? kHeaderSize64 : kHeaderSize32;
      Ending ending;
      if (eye >= length && readEnding(source_, form_, eye - length, wide, source_.size(), ending))
      {
        if (ending.start >= from_ && found_.size() < kMostEndings && !headerAgrees(source_, form_, ending))
        {
          found_.push_back(ending);
        }
        return;
      }
    }
  }

  ByteSource& source_;
  Form form_;
  uint64_t from_;
  std::array<uint8_t, kEyeLength> eye_{};
  std::vector<Ending> found_{};
};

} // namespace

bool readEnding(ByteSource& source, const Form& form, uint64_t offset, bool wide, uint64_t limit, Ending& out)
{
  TAVHeader header{};
  EyeSizeBytes bytes{};
  const uint64_t eye = offset + (wide ? kHeaderSize64 : kHeaderSize32);
  if (offset > limit || limit - offset < endElementLength(wide) || !readHeader(source, form, offset, wide, header) ||
      elmOf(header) != TAV_ELM_CMN_END_HDR_EYE_SIZE || typeOf(header) != TAV_TYPE_BINARY ||
      sizeOf(header) != kEyeSizeLength || source.read(eye, bytes) != bytes.size())
  {
    return false;
  }
  const EyeSize pair = decodeEyeSize(bytes, form.swapped);
  // The distance of a group of 32-bit children is 8 short.
  if (pair.eye != TAV_EYE_CATCHER || !nodeBefore(eye, addSaturated(pair.distance, wide ? 0 : 8), out.start) ||
      out.start + kHeaderSize64 > offset)
  {
    return false;
  }
  out.end = eye + kEyeSizeLength;
  out.wide = wide;
  return true;
}

bool headerAgrees(ByteSource& source, const Form& form, const Ending& ending)
{
  TAVHeader header{};
  return readHeader(source, form, ending.start, true, header) && isGroup(header) && hasEyeSize(header) &&
         hasChildren64(header) == ending.wide &&
         (isSizeUnknown(header) || addSaturated(ending.start + kHeaderSize64, sizeOf(header)) == ending.end);
}

std::vector<Ending> findEndings(ByteSource& source, const Form& form, uint64_t from)
{
  return form.root64 ? EyeSearch(source, form, from).run() : std::vector<Ending>{};
}

} // namespace tav::inspect
