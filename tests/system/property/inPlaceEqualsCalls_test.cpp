/// Steps that are compiled into the program do what the calls of the operations do, and leave the handle alike. The
/// same walk or script is taken by a program that never traced, one that traces, one that has traced before, and one
/// that turns its trace on and off. TAV_TEST_SEED=<seed> TAV_TEST_CASES=1 runs one case alone.
#include <algorithm>
#include <cstring>
#include <functional>
#include <memory>
#include <optional>
#include <sstream>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

#include "support/damage.h"
#include "support/environment.h"
#include "support/layerOptions.h"
#include "support/randomScript.h"
#include "support/randomTree.h"
#include "tav/tav.hpp"

namespace
{

/// The handle of a reader or writer that takes its steps in place still, which one that gave it away does not.
template<class Owner, auto Member>
struct State
{
  friend auto& stateOf(Owner& object) { return object.*Member; }
};
auto& stateOf(tav::Reader& reader);
auto& stateOf(tav::Writer& writer);
template struct State<tav::Reader, &tav::Reader::state_>;
template struct State<tav::Writer, &tav::Writer::state_>;

using namespace test;

constexpr uint64_t kDefaultCases = 400;

/// What a program has done with the trace.
enum class Program : uint8_t
{
  neverTraced,
  tracedBefore,
  traces,
  switches
};

/// A trace of which only counts that it runs: thousands of records a script would take most of the time to keep.
class RunningTrace
{
public:
  RunningTrace()
  {
    EXPECT_EQ(korTraceStart([](void*, const KORTraceRecord*) {}, nullptr), TAV_RC_OK);
  }
  ~RunningTrace() { korTraceStop(); }
  RunningTrace(const RunningTrace&) = delete;
  RunningTrace& operator=(const RunningTrace&) = delete;
};

/// The trace of a case: turned as the program does it before each step.
class Trace
{
public:
  Trace(Program program, uint64_t seed)
      : program_(program), random_(seed)
  {
    turn();
  }
  ~Trace() { set(Program::neverTraced); }
  Trace(const Trace&) = delete;
  Trace& operator=(const Trace&) = delete;

  void turn()
  {
    const auto any = random_.pick({Program::neverTraced, Program::tracedBefore, Program::traces});
    set(program_ == Program::switches ? any : program_);
  }

private:
  void set(Program now)
  {
    static KORTraceCB silent{};
    if ((now == Program::traces) != log_.has_value())
    {
      now == Program::traces ? static_cast<void>(log_.emplace()) : log_.reset();
    }
    if (now != Program::traces)
    {
      g_pWTCB = now == Program::neverTraced ? nullptr : &silent;
    }
  }

  Program program_;
  Random random_;
  std::optional<RunningTrace> log_;
};

/// What is seen, as a text that two programs can be compared by.
class Notes
{
public:
  template<class... Parts>
  void add(const Parts&... parts)
  {
    ((text_ << parts << ' '), ...);
    text_ << '\n';
  }

  /// The words of a handle; addresses as distances from where its bytes begin. A block that grows does so at one call
  /// or another.
  void addHandle(const TAVHandle& handle, bool grows = false)
  {
    const TAVCircularBuf* const ring = handle.pCircularBuf;
    const uint8_t* const base = ring != nullptr ? ring->pRing : handle.pDirectData;
    add("handle", handle.curOffset, handle.pDirectData == nullptr ? -1 : handle.pDirectData - base,
        grows ? 0 : handle.directDataSize, handle.streamBytes,
        handle.pHdrStack != nullptr ? handle.pHdrStack->count : 0);
    if (ring != nullptr)
    {
      add("ring", ring->head, ring->tail, ring->headOffset, int{ring->empty});
      for (uint64_t page = 0; page < ring->pageCount; ++page)
      {
        text_ << int{ring->pPageFlags[2 * page]};
      }
    }
  }

  void addHeader(const tav::HeaderView& node)
  {
    add(node.offset(), node.size(), node.type(), node.elm(), node.info(), static_cast<int>(node.width()));
  }

  void addBytes(const void* bytes, size_t size)
  {
    text_ << std::hex << std::hash<std::string_view>()({static_cast<const char*>(bytes), size}) << std::dec << '\n';
  }

  [[nodiscard]] std::string text() const { return text_.str(); }

private:
  std::ostringstream text_;
};

/// @name Reading
/// @{

struct Stream
{
  Bytes bytes;
  Form form;
};

/// A stream of any form, sound or damaged.
Stream pickStream(Random& random, uint64_t seed)
{
  const Tree tree = randomTree(seed, {.depth = 4, .width = 12, .payload = 40});
  Stream stream{bytesOfTree(tree), tree.form};
  Damage damage(stream.bytes, seed);
  switch (random.below(5))
  {
  case 0: damage.flipBits(); break;
  case 1: damage.setBytes(); break;
  case 2: stream.bytes.resize(random.below(stream.bytes.size()) + 1); break;
  default: break;
  }
  stream.form.buffered = random.oneIn(2);
  stream.form.pageBytes = random.pick<uint64_t>({8, 24, 64, 256, 4096});
  stream.form.ringBytes = stream.form.pageBytes * random.pick<uint64_t>({1, 2, 3, 7, 16});
  return stream;
}

/// A walk of one reader, which takes the same turns whatever the program does with its trace.
class Walker
{
public:
  Walker(const Stream& stream, Program program, uint64_t seed)
      : random_(seed), trace_(program, seed), bytes_(std::make_unique<uint8_t[]>(stream.bytes.size()))
  {
    std::memcpy(bytes_.get(), stream.bytes.data(), stream.bytes.size()); // a block that ends with its last byte
    const tav::StreamOptions options = layerOptions(stream.form, stream.form.ringBytes);
    std::error_code ec;
    if (stream.form.buffered)
    {
      storage_.emplace(stream.form.pageBytes, stream.bytes, VectorStorage::kReadOnly);
      reader_.emplace(*storage_, options, ec);
    }
    else
    {
      reader_.emplace(std::as_bytes(std::span(bytes_.get(), stream.bytes.size())), options, ec);
    }
    notes_.add("opened", tav::codeOf(ec));
  }

  std::string walk()
  {
    std::error_code ec;
    const tav::Node root = std::as_const(*reader_).root(ec);
    notes_.add("root", tav::codeOf(ec));
    if (!ec)
    {
      visit(root, 0);
    }
    return notes_.text();
  }

private:
  void visit(const tav::Node& group, unsigned depth)
  {
    const tav::EndElements ends = random_.oneIn(2) ? tav::EndElements::skip : tav::EndElements::show;
    std::error_code ec;
    if (random_.oneIn(3))
    {
      follow(group.descendants(ec, ends), depth);
    }
    else
    {
      follow(group.children(ec, ends), depth);
    }
    notes_.add("ended", tav::codeOf(ec));
    note();
  }

  template<class Range>
  void follow(Range range, unsigned depth)
  {
    for (const tav::Node& node : range)
    {
      if (--steps_ == 0)
      {
        return;
      }
      see(node);
      if (node.isGroup() && depth < 5 && random_.oneIn(2))
      {
        visit(node, depth + 1);
      }
      else if (random_.oneIn(12))
      {
        std::error_code ec;
        follow(node.siblings(ec), 6);
        notes_.add("siblings", tav::codeOf(ec));
      }
      trace_.turn();
      if (random_.oneIn(200))
      {
        static_cast<void>(reader_->handle()); // from here on every step is a call
      }
    }
  }

  void see(const tav::Node& node)
  {
    notes_.addHeader(node);
    note();
    if (random_.oneIn(2))
    {
      std::error_code ec;
      const tav::PayloadView payload = node.payload(ec);
      notes_.add("payload", payload.size(), tav::codeOf(ec));
      notes_.addBytes(payload.data(), payload.size());
      notes_.add(node.as<uint32_t>(ec), node.as<std::string_view>(ec), node.asNumber<uint64_t>(ec));
    }
  }

  void note() { notes_.addHandle(*stateOf(*reader_)->handle); }

  Random random_;
  Trace trace_;
  Notes notes_;
  std::unique_ptr<uint8_t[]> bytes_;
  std::optional<VectorStorage> storage_;
  std::optional<tav::Reader> reader_;
  unsigned steps_ = 400;
};
/// @}

/// @name Writing
/// @{

/// A script of one writer.
class Author
{
public:
  Author(Program program, uint64_t seed)
      : random_(seed), trace_(program, seed)
  {
    const tav::StreamOptions options{random_.oneIn(3) ? tav::ByteOrder::swapped : tav::ByteOrder::native,
                                     random_.oneIn(3), random_.oneIn(4) ? tav::Width::bits32 : tav::Width::bits64,
                                     random_.pick<uint64_t>({64, 128, 512, 0x10000})};
    std::error_code ec;
    switch (random_.below(3))
    {
    case 0: writer_.emplace(options, ec); break;
    case 1:
      block_.assign(1 + random_.below(2000), std::byte{0x5A});
      writer_.emplace(std::span(block_), options, ec);
      break;
    default:
      storage_.emplace(random_.pick<uint64_t>({8, 64, 512}));
      writer_.emplace(*storage_, options, ec);
    }
    notes_.add("opened", tav::codeOf(ec));
  }

  std::string write()
  {
    std::error_code ec;
    tav::Group root = writer_->group(1000, ec);
    notes_.add("root", tav::codeOf(ec));
    note();
    fill(root, 0);
    root.close(ec);
    notes_.add("closed", tav::codeOf(ec));
    writer_->finish(ec);
    notes_.add("finished", tav::codeOf(ec), writer_->size());
    const std::span<const std::byte> bytes = std::as_const(*writer_).bytes();
    // The padding behind the last node may lie past the block.
    notes_.addBytes(bytes.data(), block_.empty() ? bytes.size() : std::min(bytes.size(), block_.size()));
    notes_.addBytes(block_.data(), block_.size());
    if (storage_)
    {
      notes_.addBytes(storage_->bytes.data(), storage_->bytes.size());
    }
    return notes_.text();
  }

private:
  void fill(tav::Group& group, unsigned depth)
  {
    for (uint64_t count = random_.below(40); count != 0 && steps_ != 0; --count, --steps_)
    {
      if (depth < 4 && random_.oneIn(6))
      {
        nest(group, depth);
      }
      else
      {
        add(group);
      }
      note();
      trace_.turn();
    }
  }

  void nest(tav::Group& group, unsigned depth)
  {
    std::error_code ec;
    tav::Group inner =
        group.group(elm(), {random_.oneIn(4) ? tav::Width::bits32 : tav::Width::bits64, random_.oneIn(3)}, ec);
    notes_.add("group", tav::codeOf(ec));
    fill(inner, depth + 1);
    if (random_.oneIn(4))
    {
      inner.abandon(ec);
    }
    else if (random_.oneIn(2))
    {
      inner.close(ec);
    }
    notes_.add("ended", tav::codeOf(ec));
  }

  void add(tav::Group& group)
  {
    const tav::NodeOptions options{random_.oneIn(8), random_.oneIn(4) ? uint32_t{0x80000000} : 0,
                                   static_cast<uint16_t>(random_.oneIn(4) ? random_.below(0x900) : 0)};
    std::error_code ec;
    tav::HeaderView node;
    switch (random_.below(9))
    {
    case 0: node = group.add(elm(), static_cast<uint8_t>(random_.next()), options, ec); break;
    case 1: node = group.add(elm(), static_cast<uint32_t>(random_.next()), options, ec); break;
    case 2: node = group.add(elm(), static_cast<int64_t>(random_.next()), options, ec); break;
    case 3: node = group.add(elm(), TAVTimeStamp{random_.next(), 1, 2, 3, 4}, options, ec); break;
    case 4: node = group.add(elm(), text(), options, ec); break;
    case 5: node = group.add(elm(), std::as_bytes(std::span(text())), options, ec); break;
    case 6: node = group.add<TAV_TYPE_UINT8>(elm(), random_.below(300), options, ec); break;
    case 7: node = group.add<TAV_TYPE_SINT128>(elm(), -static_cast<int64_t>(random_.below(300)), options, ec); break;
    default: node = group.add(elm(), std::string_view(random_.oneIn(2) ? "\xC3\xA9" : "\xFF"), options, ec); break;
    }
    notes_.add("added", tav::codeOf(ec));
    notes_.addHeader(node);
  }

  tav::ElementId elm() { return random_.below(random_.oneIn(30) ? 70000 : 60000); }

  std::string_view text()
  {
    static const std::string letters(3000, 'x');
    return std::string_view(letters).substr(0, random_.oneIn(10) ? random_.below(3000) : random_.below(70));
  }

  void note()
  {
    if (const TAVHandle* const handle = stateOf(*writer_)->handle)
    {
      notes_.addHandle(*handle, block_.empty() && !storage_);
    }
  }

  Random random_;
  Trace trace_;
  Notes notes_;
  std::vector<std::byte> block_;
  std::optional<VectorStorage> storage_;
  std::optional<tav::Writer> writer_;
  unsigned steps_ = 150;
};
/// @}

/// The lines around the first difference.
std::string differenceOf(const std::string& one, const std::string& other)
{
  const size_t at = static_cast<size_t>(std::mismatch(one.begin(), one.end(), other.begin(), other.end()).first -
                                        one.begin());
  const size_t from = at > 300 ? at - 300 : 0;
  return "in place\n" + one.substr(from, 500) + "\nby calls\n" + other.substr(from, 500);
}

/// Runs `seen(program, seed)` for each kind of program; all must see the same.
template<class Seen>
void compare(const Seen& seen)
{
  const uint64_t seed = fromEnvironment("TAV_TEST_SEED", 1);
  const uint64_t count = fromEnvironment("TAV_TEST_CASES", kDefaultCases);
  int failed = 0;
  for (uint64_t one = seed; one < seed + count && failed < 3; ++one)
  {
    const std::string inPlace = seen(Program::neverTraced, one);
    for (const Program program : {Program::tracedBefore, Program::traces, Program::switches})
    {
      const std::string called = seen(program, one);
      if (called != inPlace)
      {
        ++failed;
        ADD_FAILURE() << "seed " << one << ", program " << static_cast<int>(program) << ": "
                      << differenceOf(inPlace, called);
      }
    }
  }
}

TEST(InPlaceEqualsCalls, ForWalks)
{
  compare([](Program program, uint64_t seed) {
    Random random(seed);
    const Stream stream = pickStream(random, seed);
    return Walker(stream, program, seed).walk();
  });
}

TEST(InPlaceEqualsCalls, ForWriting)
{
  compare([](Program program, uint64_t seed) { return Author(program, seed).write(); });
}

} // namespace
