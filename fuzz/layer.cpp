/// The C++ layer: walks, paths, values, printing and updates over arbitrary bytes, and sequences of additions that are
/// read back.
#include <chrono>
#include <cstdio>
#include <deque>
#include <memory>
#include <system_error>
#include <vector>

#include "fuzz/input.h"
#include "tav/tav.hpp"

namespace
{

using fuzz::demand;

/// Failures are codes of the library.
void accept(const std::error_code& ec)
{
  demand(!ec || ec.category() == tav::category(), "an error of another category");
}

class Looker
{
public:
  Looker(const tav::Reader& reader, uint64_t size)
      : reader_(reader), most_(size / 8 + 1) {}

  void everything(const std::string& path, uint64_t offset)
  {
    std::error_code ec;
    const tav::Node root = reader_.root(ec);
    accept(ec);
    if (ec)
    {
      return;
    }
    uint64_t visits = 0;
    for (const tav::Node& node : root.descendants(ec, tav::EndElements::show))
    {
      demand(++visits <= most_, "a walk that does not end");
      look(node);
    }
    accept(ec);
    byPath(root, path);
    byOffset(offset);
    reader_.validate(ec);
    accept(ec);
    print(root);
  }

private:
  template<class T>
  void value(const tav::Node& node)
  {
    std::error_code ec;
    const T one = node.as<T>(ec);
    accept(ec);
    const tav::OwnedNode owned = node.copy(ec);
    if (ec)
    {
      return;
    }
    const T other = owned.as<T>(ec);
    accept(ec);
    demand(ec || same(one, other), "a copied node has another value");
  }
  template<class T>
  static bool same(const T& one, const T& other)
  {
    return one == other;
  }
  static bool same(const TAVTimeStamp& one, const TAVTimeStamp& other)
  {
    return one.seconds == other.seconds && one.fractionA == other.fractionA && one.fractionB == other.fractionB;
  }

  void look(const tav::Node& node)
  {
    std::error_code ec;
    uint64_t sum = 0;
    for (const std::byte byte : node.payload(ec)) sum += static_cast<uint8_t>(byte);
    accept(ec);
    sum_ = sum_ + sum + node.tag().size();
    value<std::string>(node);
    value<int16_t>(node);
    value<uint64_t>(node);
    value<tav::Utf8Text>(node);
    value<tav::Uint128>(node);
    value<std::vector<uint64_t>>(node);
    value<TAVTimeStamp>(node);
    value<std::chrono::sys_time<std::chrono::microseconds>>(node);
    static_cast<void>(node.asNumber<uint32_t>(ec));
    uint64_t back = 0;
    for (auto previous = node.previous(ec); previous; previous = previous->previous(ec))
    {
      demand(++back <= most_, "a walk back that does not end");
    }
    static_cast<void>(node.next(ec));
    accept(ec);
  }

  void byPath(const tav::Node& root, const std::string& path)
  {
    std::error_code ec;
    const auto first = reader_.path(path, ec);
    accept(ec);
    const bool failed = bool(ec);
    const auto all = reader_.all(path, ec);
    accept(ec);
    demand(failed || ec || first.has_value() == !all.empty(), "one path, two answers");
    demand(all.size() <= most_ * most_, "more matches than pairs of nodes");
    static_cast<void>(root.all("*/*", ec));
    accept(ec);
  }

  void byOffset(uint64_t offset)
  {
    std::error_code ec;
    static_cast<void>(reader_.endingAfter(offset, ec));
    accept(ec);
    for (const tav::Width width : {tav::Width::bits32, tav::Width::bits64})
    {
      const tav::Node node = reader_.at(offset, width, ec);
      accept(ec);
      if (!ec)
      {
        look(node);
      }
    }
  }

  void print(const tav::Node& root)
  {
    char* text = nullptr;
    size_t length = 0;
    FILE* const stream = open_memstream(&text, &length);
    std::error_code ec;
    tav::PrintOptions options;
    for (const bool xml : {false, true})
    {
      options.xml = options.attributes = xml;
      options.headers = options.descriptors = !xml;
      static_cast<void>(reader_.print(stream, root, options, ec));
      accept(ec);
    }
    std::fclose(stream);
    std::free(text);
  }

  const tav::Reader& reader_;
  uint64_t most_;
  volatile uint64_t sum_ = 0;
};

tav::StreamOptions optionsOf(const test::Form& form)
{
  tav::StreamOptions options;
  options.byteOrder = form.swap ? tav::ByteOrder::swapped : tav::ByteOrder::native;
  options.align8 = form.align;
  options.root = form.root32 ? tav::Width::bits32 : tav::Width::bits64;
  options.ringBytes = form.ringBytes;
  return options;
}

void update(const test::Form& form, std::span<std::byte> block, uint64_t offset)
{
  std::error_code ec;
  const tav::Reader reader(std::span<const std::byte>(block), optionsOf(form), ec);
  if (ec)
  {
    return;
  }
  const tav::Node node = reader.at(offset, tav::Width::bits64, ec);
  if (ec)
  {
    return;
  }
  tav::Updater updater(block, optionsOf(form), ec);
  accept(ec);
  if (ec)
  {
    return;
  }
  updater.update(node, uint32_t{7}, ec);
  accept(ec);
  updater.update(node, std::string_view("abc"), ec);
  accept(ec);
}

void read(fuzz::Input& input, const test::Form& form)
{
  const std::string path = input.text(24);
  const uint64_t offset = input.byte();
  const auto stream = input.rest();
  // Ends with its block, so that a step behind it is seen.
  const auto exact = std::make_unique<std::byte[]>(stream.size());
  std::copy_n(std::as_bytes(stream).begin(), stream.size(), exact.get());
  const std::span<std::byte> block(exact.get(), stream.size());
  std::error_code ec;
  test::VectorStorage storage(form.pageBytes, {stream.begin(), stream.end()}, test::VectorStorage::kReadOnly);
  storage.longestTransfer = form.longestTransfer;
  {
    const tav::Reader reader = form.buffered ? tav::Reader(storage, optionsOf(form), ec)
                                             : tav::Reader(std::span<const std::byte>(block), optionsOf(form), ec);
    accept(ec);
    if (!ec)
    {
      Looker(reader, stream.size()).everything(path, offset);
    }
  }
  if (!block.empty())
  {
    update(form, block, offset);
  }
}

/// What was added last at each depth, and what has to be read back.
class Adder
{
public:
  Adder(tav::Writer& writer, fuzz::Input& input)
      : writer_(writer), input_(input) {}

  void run(size_t steps)
  {
    for (size_t i = 0; i < steps && !input_.rest().empty(); ++i) step(input_.byte());
    while (!groups_.empty()) groups_.pop_back();
    std::error_code ec;
    writer_.finish(ec);
    accept(ec);
  }

  uint64_t added = 0; ///< nodes that are there in the end

private:
  struct Open
  {
    tav::Group group;
    uint64_t before; ///< nodes before it
  };

  void step(uint8_t choice)
  {
    std::error_code ec;
    if (groups_.empty())
    {
      if (added != 0)
      {
        return; // one root
      }
      groups_.push_back({writer_.group(TAV_ELM_CMN_SYSTEM, groupOptions(choice, true), ec), 0});
      accept(ec);
      added += ec ? 0 : 1;
      return;
    }
    tav::Group& top = groups_.back().group;
    const uint16_t elm = static_cast<uint16_t>(60100U + choice % 13U);
    const tav::GroupOptions options = groupOptions(choice, false);
    const uint64_t size = input_.byte();
    switch (choice % 9U)
    {
    case 0:
      if (groups_.size() == 40)
      {
        return;
      }
      groups_.push_back({top.group(elm, options, ec), added});
      break;
    case 1: top.add(elm, uint32_t(size), ec); break;
    case 2: top.add(elm, std::string(size, 'x'), ec); break;
    case 3: top.add(elm, tav::Utf8Text{std::string(size, 'y')}, ec); break;
    case 4: top.add(elm, std::vector<uint64_t>(size, 3), ec); break;
    case 5: top.add(elm, std::vector<std::byte>(size), ec); break;
    case 6:
      top.close(ec);
      accept(ec);
      groups_.pop_back();
      return;
    case 7:
      if (groups_.size() < 2)
      {
        return;
      }
      top.abandon(ec);
      accept(ec);
      added = ec ? added : groups_.back().before;
      groups_.pop_back();
      return;
    default: top.add(elm, tav::Uint128{size, 1}, ec); break;
    }
    accept(ec);
    added += ec ? 0 : 1;
  }

  static tav::GroupOptions groupOptions(uint8_t choice, bool root)
  {
    tav::GroupOptions options;
    options.children = choice >= 0xC0 && !root ? tav::Width::bits32 : tav::Width::bits64;
    options.eyeSize = (choice & 0x20U) != 0;
    return options;
  }

  tav::Writer& writer_;
  fuzz::Input& input_;
  std::deque<Open> groups_;
};

void write(fuzz::Input& input, test::Form form)
{
  form.root32 = false;
  test::VectorStorage storage(form.pageBytes);
  uint64_t added = 0;
  test::Bytes made;
  {
    std::error_code ec;
    tav::Writer writer = form.buffered ? tav::Writer(storage, optionsOf(form), ec) : tav::Writer(optionsOf(form), ec);
    accept(ec);
    if (ec)
    {
      return;
    }
    Adder adder(writer, input);
    adder.run(300);
    added = adder.added;
    const auto bytes = writer.bytes();
    if (!form.buffered)
      made.assign(reinterpret_cast<const uint8_t*>(bytes.data()),
                  reinterpret_cast<const uint8_t*>(bytes.data()) + bytes.size());
    else
      made = storage.bytes;
    made.resize(writer.size()); // the padding of the last node is not written
  }
  if (added == 0)
  {
    return;
  }
  const tav::Reader reader(std::as_bytes(std::span(made)), optionsOf(form));
  std::error_code ec;
  uint64_t seen = 1;
  for (const tav::Node& node : reader.root().descendants(ec))
  {
    ++seen;
    static_cast<void>(node.tag());
  }
  demand(!ec, "what was written cannot be walked");
  demand(seen == added, "nodes are missing, or more than were added");
  reader.validate();
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
  if (size > fuzz::kLargest)
  {
    return 0;
  }
  fuzz::Input input(data, size);
  const uint8_t choice = input.byte();
  const test::Form form = fuzz::takeForm(input);
  if (choice % 4U == 3)
    write(input, form);
  else
    read(input, form);
  return 0;
}
