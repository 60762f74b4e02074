#include "inspect/recover/endings.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cstring>
#include <utility>

#include "inspect/plan/partRun.h"
#include "inspect/walk/order.h"

namespace tav::inspect
{

using namespace tav::layout;

namespace
{

constexpr size_t kMostEndings = size_t{256} * 1024; ///< 6 MiB
constexpr size_t kWindow = ByteSource::kPage;
constexpr uint64_t kStretch = 64 * kWindow; ///< that a thread takes at a time

bool readHeader(ByteSource& source, const Form& form, uint64_t offset, bool wide, TAVHeader& out)
{
  std::array<uint8_t, kHeaderSize64> bytes{};
  const size_t length = wide ? kHeaderSize64 : kHeaderSize32;
  if (source.read(offset, std::span(bytes).first(length)) != length)
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
  /// Looks at the eye catchers that begin between `at` and `to`.
  EyeSearch(ByteSource& source, const Form& form, uint64_t from, uint64_t at, uint64_t to)
      : source_(source), form_(form), from_(from), at_(at), to_(to)
  {
    const EyeSizeBytes pair = encodeEyeSize(0, form.swapped);
    std::copy_n(pair.begin(), eye_.size(), eye_.begin());
  }

  std::vector<Ending> run()
  {
    // What was read stays at hand for the look at what an eye catcher ends.
    std::vector<uint8_t> window(kWindow + kEyeLength - 1);
    for (uint64_t at = at_; at < to_;)
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
  uint64_t at_;
  uint64_t to_;
  std::array<uint8_t, kEyeLength> eye_{};
  std::vector<Ending> found_{};
};

/// Stretch by stretch, as many as one thread would keep.
std::vector<Ending> findInStretches(ByteSource& source, const Form& form, uint64_t from, unsigned threads,
                                    size_t stretches)
{
  const auto search = [&](ByteSource& bytes, size_t i) {
    const uint64_t at = from + i * kStretch;
    return EyeSearch(bytes, form, from, at, std::min(at + kStretch, bytes.size())).run();
  };
  std::vector<std::vector<Ending>> each(stretches);
  std::vector<Ending> found;
  PartRun run(source, stretches, threads,
              [&](const std::atomic<bool>&, ByteSource& bytes, size_t i) { each[i] = search(bytes, i); });
  for (size_t i = 0; i < stretches && found.size() < kMostEndings; ++i)
  {
    const std::vector<Ending> some = run.await(i) ? std::exchange(each[i], {}) : search(run.source(), i);
    const size_t room = kMostEndings - found.size();
    found.insert(found.end(), some.begin(), some.begin() + static_cast<ptrdiff_t>(std::min(room, some.size())));
  }
  return found;
}

} // namespace

bool readEnding(ByteSource& source, const Form& form, uint64_t offset, bool wide, uint64_t limit, Ending& out)
{
  TAVHeader header{};
  EyeSizeBytes bytes{};
  const uint64_t eye = offset + (wide ? kHeaderSize64 : kHeaderSize32);
  if (limit < endElementLength(wide) || offset > limit - endElementLength(wide) ||
      !readHeader(source, form, offset, wide, header) || elmOf(header) != TAV_ELM_CMN_END_HDR_EYE_SIZE ||
      typeOf(header) != TAV_TYPE_BINARY || sizeOf(header) != kEyeSizeLength || source.read(eye, bytes) != bytes.size())
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

std::vector<Ending> findEndings(ByteSource& source, const Form& form, uint64_t from, unsigned threads)
{
  std::vector<Ending> found;
  if (!form.root64)
  {
    return found;
  }
  const uint64_t size = source.size();
  const auto stretches = static_cast<size_t>(unitsFor(size - std::min(from, size), kStretch));
  if (threads < 2 || stretches < 2)
  {
    found = EyeSearch(source, form, from, from, size).run();
  }
  else
  {
    found = findInStretches(source, form, from, threads, stretches);
  }
  putInOrder(found, [](const Ending& a, const Ending& b) {
    return a.start != b.start ? a.start < b.start : a.end > b.end;
  });
  return found;
}

} // namespace tav::inspect
