// tav_generate: writes random streams in a given form with the library, and says what is in them, so that tests of the
// program can compare what it finds with what was written.
//
//   tav_generate FILE [--seed N] [--nodes N] [--depth N] [--swap] [--align] [--root32] [--pairs] [--strings] [--utf8]
//                     [--mixed] [--open] [--unfinished] [--wild] [--zeros N]
//
// The description goes to standard output as JSON: the form, and one row a node in the order of the stream:
// [offset, header bytes, size, type, element, depth].
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <string>
#include <vector>

#include "support/randomTree.h"
#include "tav/dictionary.hpp"

namespace
{

struct Options
{
  std::string file;
  uint64_t seed = 1;
  uint64_t nodes = 40;
  uint64_t depth = 5;
  uint64_t zeros = 0; ///< bytes behind the stream
  test::Form form;
  bool pairs = false;      ///< some nodes end with an eye/size pair
  bool strings = false;    ///< UTF-8 strings by tavAddString: two uncounted bytes behind them
  bool utf8 = false;       ///< UTF-8 strings by tavAddElement
  bool mixed = false;      ///< 64-bit groups of 32-bit children
  bool open = false;       ///< some closed groups have an unknown size
  bool unfinished = false; ///< the innermost groups at the end are never closed
  bool wild = false;       ///< any element ids, types, sizes and info bits
};

struct Row
{
  uint64_t offset;
  bool wide;
  uint64_t size;
  uint16_t type;
  uint16_t elm;
  uint64_t depth;
};

class Generator
{
public:
  explicit Generator(const Options& options)
      : options_(options), random_(options.seed * 0x9E3779B97F4A7C15u + 1),
        writer_(options.form, 0x10000 + options.nodes * 128)
  {
    for (const auto& entry : tav::dictionary::entries())
    {
      if (entry.constant != "INVALID_ELEMENT" && entry.id < 65000)
      {
        names_.push_back(entry.id);
      }
    }
  }

  test::Bytes make()
  {
    openGroup(!options_.form.root32);
    while (rows_.size() < options_.nodes)
    {
      const bool wide = hasWideChildren();
      const uint64_t kind = below(10);
      if (kind < 2 && open_.size() < options_.depth)
      {
        openGroup(wide);
      }
      else if (kind == 2 && open_.size() > 1)
      {
        closeGroup();
      }
      else
      {
        addData(wide);
      }
    }
    const size_t left = options_.unfinished ? 1 + below(open_.size()) : 0;
    while (open_.size() > left)
    {
      closeGroup();
    }
    test::Bytes bytes = writer_.bytes();
    for (const size_t row : forgotten_)
    {
      std::fill_n(bytes.begin() + static_cast<ptrdiff_t>(rows_[row].offset), 8, uint8_t{0xFF});
      rows_[row].size = TAV_SIZE_UNKNOWN;
    }
    bytes.resize(bytes.size() + options_.zeros);
    return bytes;
  }

  void describe(std::ostream& out, uint64_t fileBytes) const
  {
    const auto& form = options_.form;
    const auto flag = [](bool value) { return value ? "true" : "false"; };
    out << "{\"swapped\": " << flag(form.swap) << ", \"aligned\": " << flag(form.align)
        << ", \"root\": " << (form.root32 ? 32 : 64) << ", \"pairs\": " << pairs_ << ", \"strings\": " << strings_
        << ", \"open\": " << forgotten_.size() + open_.size() << ", \"length\": " << fileBytes - options_.zeros
        << ", \"bytes\": " << fileBytes << ", \"nodes\": [";
    for (size_t i = 0; i < rows_.size(); ++i)
    {
      const Row& row = rows_[i];
      out << (i == 0 ? "\n" : ",\n") << "[" << row.offset << ", " << (row.wide ? 16 : 8) << ", " << row.size << ", "
          << row.type << ", " << row.elm << ", " << row.depth << "]";
    }
    out << "\n]}\n";
  }

private:
  struct OpenGroup
  {
    size_t row;
    bool wideChildren;
    bool pair;
  };

  uint64_t below(uint64_t bound) { return random_() % bound; }
  bool chance(uint64_t oneIn) { return below(oneIn) == 0; }
  bool hasWideChildren() const { return open_.back().wideChildren; }
  uint16_t element() { return options_.wild ? static_cast<uint16_t>(below(65000)) : names_[below(names_.size())]; }
  uint32_t info()
  {
    const uint32_t any =
        options_.wild ? static_cast<uint32_t>(random_()) & ~(TAV_INFO_EYE_SIZE | TAV_INFO_ALIGNED8) : 0;
    return any | (options_.pairs && chance(2) ? TAV_INFO_EYE_SIZE : 0);
  }

  void openGroup(bool wide)
  {
    const bool wideChildren = wide && !(options_.mixed && chance(3));
    const uint16_t type = wideChildren ? TAV_TYPE_HEADER64 : TAV_TYPE_HEADER32;
    const uint32_t bits = wide ? info() : 0;
    // One habit a file, as writers have it.
    const uint64_t size = options_.seed % 2 == 0 ? 0 : wide ? TAV_SIZE_UNKNOWN
                                                            : 0xFFFFFFFF;
    const uint16_t elm = element();
    test::Element group{
        wide ? test::header64(size, type, elm, bits) : test::header32(static_cast<uint32_t>(size), type, elm), {}};
    const uint64_t offset = writer_.length();
    writer_.add(group);
    rows_.push_back({offset, wide, size, type, elm, open_.size()});
    open_.push_back({rows_.size() - 1, wideChildren, (bits & TAV_INFO_EYE_SIZE) != 0});
  }

  void closeGroup()
  {
    const OpenGroup group = open_.back();
    if (options_.unfinished && !group.pair && group.row + 1 == rows_.size())
    {
      addData(group.wideChildren); // an empty group looks like one that was not closed
    }
    const uint64_t end = writer_.length();
    writer_.close();
    Row& row = rows_[group.row];
    row.size = writer_.length() - row.offset - (row.wide ? 16 : 8);
    if (group.pair)
    {
      rows_.push_back({end, group.wideChildren, 16, TAV_TYPE_BINARY, TAV_ELM_CMN_END_HDR_EYE_SIZE, open_.size()});
      ++pairs_;
      // Only a group inside one of unknown size, or the root, loses its size, as when a writer never came to close it.
      if (options_.open && (open_.size() == 1 || chance(2)))
      {
        forgotten_.push_back(group.row);
      }
    }
    open_.pop_back();
  }

  uint16_t dataType()
  {
    static constexpr uint16_t types[] = {50, 51, 52, 53, 54, 55, 56, 57, 58, 100, 101, 103, 104, 105, 106};
    if (options_.wild && chance(4))
    {
      return static_cast<uint16_t>(3 + below(65533));
    }
    if ((options_.utf8 || options_.strings) && chance(3))
    {
      return TAV_TYPE_UTF8_STRING;
    }
    return types[below(std::size(types))];
  }

  uint64_t sizeOf(uint16_t type)
  {
    const uint64_t exact = test::valueSizeOf(type);
    if (exact != 0)
    {
      return exact;
    }
    return type == TAV_TYPE_UINT64_ARRAY ? below(5) * 8 : type == TAV_TYPE_UTF8_STRING ? 2 + below(30)
                                                                                       : below(40);
  }

  void addData(bool wide)
  {
    const uint16_t type = dataType();
    const uint16_t elm = element();
    const uint32_t bits = wide ? info() : 0;
    const bool byString = type == TAV_TYPE_UTF8_STRING && options_.strings && !(options_.utf8 && chance(2));
    test::Bytes payload(sizeOf(type));
    for (uint8_t& byte : payload)
    {
      byte = type == 50 || type == 102 ? static_cast<uint8_t>('a' + below(26)) : static_cast<uint8_t>(random_());
    }
    if (type == TAV_TYPE_UTF8_STRING && !byString && payload.size() >= 2)
    {
      const test::Bytes codePage = test::bytesOfValue(uint16_t{1208}); // in host order: it is turned when it is written
      std::copy(codePage.begin(), codePage.end(), payload.begin());
    }
    const uint64_t offset = writer_.length();
    uint64_t size = payload.size();
    test::Element node = test::element(wide, type, elm, payload, bits);
    if (byString)
    {
      writer_.addString(node, 1208);
      size += 2;
      ++strings_;
    }
    else
    {
      node.payload.reserve(1); // a data element of size 0 still needs a pointer
      TAVHeaderData data = node.data();
      test::check(tavAddElement(0, writer_.handle(), &data), "tavAddElement");
    }
    pairs_ += (bits & TAV_INFO_EYE_SIZE) != 0 ? 1 : 0;
    rows_.push_back({offset, wide, size, type, elm, open_.size()});
  }

  Options options_;
  std::mt19937_64 random_;
  test::StreamWriter writer_;
  std::vector<uint16_t> names_;
  std::vector<Row> rows_;
  std::vector<OpenGroup> open_;
  std::vector<size_t> forgotten_;
  uint64_t pairs_ = 0;
  uint64_t strings_ = 0;
};

bool readOption(Options& options, const std::string& name, const char* value, bool& usedValue)
{
  const auto number = [&](uint64_t& field) {
    usedValue = true;
    field = value != nullptr ? std::strtoull(value, nullptr, 0) : 0;
    return value != nullptr;
  };
  const auto set = [](bool& field) { return field = true; };
  return name == "--seed"         ? number(options.seed)
         : name == "--nodes"      ? number(options.nodes)
         : name == "--depth"      ? number(options.depth)
         : name == "--zeros"      ? number(options.zeros)
         : name == "--swap"       ? set(options.form.swap)
         : name == "--align"      ? set(options.form.align)
         : name == "--root32"     ? set(options.form.root32)
         : name == "--pairs"      ? set(options.pairs)
         : name == "--strings"    ? set(options.strings)
         : name == "--utf8"       ? set(options.utf8)
         : name == "--mixed"      ? set(options.mixed)
         : name == "--open"       ? set(options.open)
         : name == "--unfinished" ? set(options.unfinished)
         : name == "--wild"       ? set(options.wild)
                                  : false;
}

} // namespace

int main(int argc, char** argv)
{
  Options options;
  for (int i = 1; i < argc; ++i)
  {
    const std::string name = argv[i];
    bool usedValue = false;
    if (!name.starts_with("--"))
    {
      options.file = name;
    }
    else if (!readOption(options, name, i + 1 < argc ? argv[i + 1] : nullptr, usedValue))
    {
      std::cerr << "tav_generate: unknown option " << name << "\n";
      return 2;
    }
    i += usedValue ? 1 : 0;
  }
  Generator generator(options);
  const test::Bytes bytes = generator.make();
  std::ofstream file(options.file, std::ios::binary);
  file.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
  if (!file.flush())
  {
    std::cerr << "tav_generate: cannot write " << options.file << "\n";
    return 2;
  }
  generator.describe(std::cout, bytes.size());
  return 0;
}
