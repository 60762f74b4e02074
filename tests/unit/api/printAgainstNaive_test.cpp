// The printer against a second one: plain recursion over the tree that the stream was made from, into a string.
#include <algorithm>
#include <bit>
#include <cstdint>
#include <iterator>
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/elements.h"
#include "support/printing.h"
#include "support/streams.h"

namespace
{

using namespace test;

struct Tree
{
  bool wide = true;
  uint16_t type = TAV_TYPE_HEADER64;
  uint16_t elm = 20;
  uint32_t info = 0;
  Bytes payload; ///< as stored in the stream
  std::vector<Tree> children;
  uint64_t offset = 0;
  uint64_t size = 0;

  [[nodiscard]] bool group() const
  {
    return type <= 2;
  }
  [[nodiscard]] uint64_t dataOffset() const
  {
    return offset + (wide ? 16 : 8);
  }
};

struct Name
{
  uint16_t elm;
  const char* enumName;
  const char* tag;
};

constexpr Name kNames[] = {
    {20, "TAV_ELM_CMN_DOC_ROOT", "docRoot"},
    {13, "SQLM_ELM_DBASE", "dbase"},
    {45000, "SQLM_ELM_NODE", "node"},
    {60102, "TAV_ELM_CMN_HOST", "host"},
    {60109, "TAV_ELM_CMN_CPU", "cpu"},
    {60103, "TAV_ELM_CMN_HOST_NAME", "hostName"},
    {307, "SQLM_ELM_NODE_NUMBER", "node_number"},
    {321, "SQLM_ELM_DB_NAME", "db_name"},
    {60111, "TAV_ELM_CMN_CPU_ONLINE", "cpuOnline"},
    {64999, "Unknown Element", "Unknown Element"},
};

const Name& nameOf(uint16_t elm)
{
  return *std::find_if(std::begin(kNames), std::end(kNames), [&](const Name& name) { return name.elm == elm; });
}

std::string typeName(uint16_t type)
{
  static const char* const low[] = {"ASCII String", "Uint8", "Sint8", "Uint16", "Sint16",
                                    "Uint32", "Sint32", "Uint64", "Sint64"};
  static const char* const high[] = {"UTC Timestamp", "Binary", "UTF8 String", "Uint128", "Sint128"};
  if (type == 1 || type == 2)
  {
    return type == 1 ? "TAV_TYPE_HEADER32" : "TAV_TYPE_HEADER64";
  }
  if (type >= 50 && type <= 58)
  {
    return low[type - 50];
  }
  return type >= 100 && type <= 104 ? high[type - 100] : "Invalid header type";
}

/// Random trees. Few of their values cannot be printed, so that most trees print to their end.
class Grower
{
public:
  explicit Grower(uint64_t seed)
      : random_(seed) {}

  Tree root(bool root32)
  {
    Tree tree;
    tree.wide = !root32;
    tree.type = root32 || chance(4) ? 1 : 2;
    grow(tree, 0);
    return tree;
  }

  uint64_t below(uint64_t limit)
  {
    return random_() % limit;
  }

private:
  bool chance(uint64_t oneIn)
  {
    return below(oneIn) == 0;
  }

  void grow(Tree& tree, int depth)
  {
    for (uint64_t left = below(5); left != 0; --left)
    {
      Tree child;
      child.wide = tree.wide && tree.type == 2;
      child.elm = kNames[below(std::size(kNames))].elm;
      child.info = child.wide ? static_cast<uint32_t>(below(0x800)) : 0;
      if (depth < 4 && chance(2))
      {
        child.type = child.wide && !chance(3) ? 2 : 1;
        grow(child, depth + 1);
      }
      else
      {
        fill(child);
      }
      tree.children.push_back(std::move(child));
    }
  }

  void fill(Tree& leaf)
  {
    static constexpr uint16_t printable[] = {50, 51, 52, 53, 54, 55, 56, 57, 58, 100, 101, 103, 105, 106};
    static constexpr uint16_t refused[] = {102, 104, 3, 77, 110};
    leaf.type = chance(40) ? refused[below(std::size(refused))] : printable[below(std::size(printable))];
    leaf.info |= leaf.wide && chance(4) ? TAV_INFO_EYE_SIZE : 0;
    leaf.payload.resize(chance(40) ? below(20) : usualSize(leaf.type));
    const bool large = chance(2);
    for (uint8_t& byte : leaf.payload)
    {
      byte = large ? static_cast<uint8_t>(random_()) : static_cast<uint8_t>(below(2) * below(0x60));
    }
  }

  uint64_t usualSize(uint16_t type)
  {
    const uint64_t exact = valueSizeOf(type);
    return exact != 0 ? exact : type == TAV_TYPE_UINT64_ARRAY ? 8 * below(4)
                                                              : below(30);
  }

  std::mt19937_64 random_;
};

/// Whether the stream's first byte of a number is its lowest.
bool isLittle(const Form& form)
{
  return (std::endian::native == std::endian::little) != form.swap;
}

/// Makes the stream of a tree and fills in offsets and sizes.
class Encoder
{
public:
  explicit Encoder(const Form& form)
      : form_(form) {}

  Bytes encode(Tree& tree)
  {
    append(tree);
    return bytes_;
  }

private:
  void append(Tree& tree)
  {
    tree.offset = bytes_.size();
    bytes_.resize(tree.dataOffset());
    if (tree.group())
    {
      for (Tree& child : tree.children)
      {
        append(child);
      }
      tree.size = bytes_.size() - tree.dataOffset();
    }
    else
    {
      tree.size = tree.payload.size();
      bytes_.insert(bytes_.end(), tree.payload.begin(), tree.payload.end());
      bytes_.resize(form_.align ? (bytes_.size() + 7) / 8 * 8 : bytes_.size());
      bytes_.resize(bytes_.size() + ((tree.info & TAV_INFO_EYE_SIZE) != 0 ? 16 : 0), uint8_t{0xEE});
    }
    uint64_t at = tree.offset;
    at = put(at, tree.size, tree.wide ? 8 : 4);
    at = tree.wide ? put(at, tree.info, 4) : at;
    at = put(at, tree.type, 2);
    put(at, tree.elm, 2);
  }

  uint64_t put(uint64_t at, uint64_t value, uint64_t width)
  {
    for (uint64_t i = 0; i < width; ++i)
    {
      bytes_[at + (isLittle(form_) ? i : width - 1 - i)] = static_cast<uint8_t>(value >> (8 * i));
    }
    return at + width;
  }

  Form form_;
  Bytes bytes_;
};

/// What ends a print early.
struct Stop
{
  uint32_t code;
};

class NaivePrinter
{
public:
  NaivePrinter(uint64_t options, const Form& form, const uint8_t* block, uint64_t blockSize)
      : options_(options), form_(form), block_(block), blockSize_(blockSize)
  {
  }

  Printed operator()(const Tree& start)
  {
    uint32_t code = TAV_RC_OK;
    try
    {
      print(start);
    }
    catch (const Stop& stop)
    {
      code = stop.code;
    }
    return printed(text_.empty() ? TAV_RC_NO_MEMORY : code, text_);
  }

private:
  [[nodiscard]] bool has(uint64_t option) const
  {
    return (options_ & option) != 0;
  }

  void print(const Tree& start)
  {
    text_ = has(0x40) ? "<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n" : "";
    const size_t before = text_.size();
    try
    {
      node(start, has(0x1), true, false);
    }
    catch (const Stop&)
    {
      if (text_.size() == before)
      {
        throw Stop{TAV_RC_NO_MEMORY};
      }
      throw;
    }
    if (text_.size() == before)
    {
      throw Stop{TAV_RC_NO_MEMORY};
    }
    if (!has(0x1))
    {
      return;
    }
    if (!start.group())
    {
      throw Stop{TAV_RC_BAD_PARAM};
    }
    below(start);
    node(start, false, false, true);
  }

  void below(const Tree& parent)
  {
    ++depth_;
    for (const Tree& child : parent.children)
    {
      if (!child.group())
      {
        node(child, true, true, true);
        continue;
      }
      if ((options_ & 0xC0) == 0xC0 && (child.elm == 13 || child.elm == 45000 || child.elm == 60102))
      {
        withKeys(child);
      }
      else
      {
        node(child, true, true, false);
      }
      below(child);
      node(child, false, false, true);
    }
    --depth_;
  }

  void withKeys(const Tree& group)
  {
    line(std::string("<") + nameOf(group.elm).tag);
    for (const Tree& child : group.children)
    {
      if (child.elm == 307 || child.elm == 321 || child.elm == 60103)
      {
        text_ += std::string(" ") + nameOf(child.elm).tag + "=";
        value(child);
      }
    }
    text_ += ">\n";
    if (has(0x2))
    {
      node(group, false, true, true);
    }
  }

  void line(const std::string& what)
  {
    if (!has(0x40))
    {
      const std::string depth = std::to_string(depth_);
      text_ += std::string(depth.size() < 3 ? 3 - depth.size() : 0, ' ') + depth + "|";
    }
    text_ += std::string(3 * depth_, ' ') + what;
  }

  void node(const Tree& tree, bool open, bool body, bool close)
  {
    const bool xml = has(0x40);
    const std::string tag = nameOf(tree.elm).tag;
    if (open)
    {
      line(xml ? "<" + tag + (close && !has(0x2) ? ">" : ">\n") : nameOf(tree.elm).enumName + std::string("\n"));
      xml ? void() : line("{\n");
    }
    if (body)
    {
      has(0x10) ? value(tree) : decorated(tree);
    }
    if (close)
    {
      const std::string end = xml ? "</" + tag + ">\n" : "}\n";
      xml && !has(0x2) && (open || body) ? void(text_ += end) : line(end);
    }
  }

  void decorated(const Tree& tree)
  {
    const bool xml = has(0x40);
    if (has(0x2))
    {
      xml ? xmlHeader(tree) : textHeader(tree);
    }
    if (!has(0x4))
    {
      return;
    }
    if (has(0x8))
    {
      descriptors(tree);
    }
    const bool filled = !tree.group() && tree.size != 0;
    const bool wrapped = xml && (has(0x2) || has(0x8));
    if (wrapped || (!xml && filled))
    {
      line(xml ? "   <tavData>" : "   ");
    }
    if (filled)
    {
      value(tree);
    }
    if (wrapped || (!xml && filled))
    {
      text_ += xml ? "</tavData>\n" : "\n";
    }
  }

  void textHeader(const Tree& tree)
  {
    line("   TAVHeader\n");
    line("   {\n");
    line(tree.wide ? "      TAVHeader64\n" : "      TAVHeader32\n");
    line("      {\n");
    line("         size = " + std::to_string(tree.size) + "\n");
    if (tree.wide)
    {
      line("         info = " + hex(tree.info, 1) + "\n");
    }
    line("         type = " + std::to_string(tree.type) + " ( " + typeName(tree.type) + " )\n");
    line("         elm  = " + std::to_string(tree.elm) + " ( " + nameOf(tree.elm).enumName + " )\n");
    line("      }\n");
    line(tree.wide ? "      hdrType    = 2 ( TAV_TYPE_HEADER64 )\n" : "      hdrType    = 1 ( TAV_TYPE_HEADER32 )\n");
    line("      nodeOffset = " + std::to_string(tree.offset) + "\n");
    line("   }\n");
  }

  void xmlHeader(const Tree& tree)
  {
    line("   <tavHeader>\n");
    line(tree.wide ? "      <tavHeader64>\n" : "      <tavHeader32>\n");
    line("         <size>" + std::to_string(tree.size) + "</size>\n");
    if (tree.wide)
    {
      line("         <info>" + hex(tree.info, 1) + "</info>\n");
    }
    line("         <type>" + typeName(tree.type) + "</type>\n");
    line(std::string("         <elm>") + nameOf(tree.elm).enumName + "</elm>\n");
    line(tree.wide ? "      </tavHeader64>\n" : "      </tavHeader32>\n");
    line(std::string("      <hdrType>") + (tree.wide ? "TAV_TYPE_HEADER64" : "TAV_TYPE_HEADER32") + "</hdrType>\n");
    line("      <nodeOffset>" + std::to_string(tree.offset) + "</nodeOffset>\n");
    line("   </tavHeader>\n");
  }

  void descriptors(const Tree& tree)
  {
    const uint8_t* const data = tree.group() ? nullptr : block_ + tree.dataOffset();
    const std::string pointer = hex(reinterpret_cast<uintptr_t>(data), 16);
    const std::string size = std::to_string(tree.group() ? 0 : blockSize_ - tree.dataOffset());
    const bool xml = has(0x40);
    line(xml ? "   <pDataBuf>" + pointer + "</pDataBuf>\n" : "   pDataBuf      = " + pointer + "\n");
    line(xml ? "   <dataBufSize>" + size + "</dataBufSize>\n" : "   dataBufSize   = " + size + "\n");
    line(xml ? "   <dataBufOffset>0</dataBufOffset>\n" : "   dataBufOffset = 0\n");
  }

  void value(const Tree& tree)
  {
    const Bytes& bytes = tree.payload;
    switch (tree.group() ? 0 : tree.type)
    {
    case 0: throw Stop{TAV_RC_BAD_PARAM};
    case 50: text_.append(bytes.begin(), std::find(bytes.begin(), bytes.end(), uint8_t{0})); break;
    case 51: text_ += hex(number(tree, 1), 2); break;
    case 52:
    case 105: text_ += static_cast<char>(number(tree, 1)); break;
    case 53: text_ += std::to_string(number(tree, 2)); break;
    case 54: text_ += std::to_string(static_cast<int16_t>(number(tree, 2))); break;
    case 55: text_ += std::to_string(number(tree, 4)); break;
    case 56: text_ += std::to_string(static_cast<int32_t>(number(tree, 4))); break;
    case 57: text_ += std::to_string(number(tree, 8)); break;
    case 58: text_ += std::to_string(static_cast<int64_t>(number(tree, 8))); break;
    case 100: timestamp(tree); break;
    case 101:
    case 103: hexadecimal(tree); break;
    case 106: array(tree); break;
    case 102: refuse(tree, 2); break;
    case 104: refuse(tree, 16); break;
    default: refuse(tree, 0);
    }
  }

  /// In the other byte order a value shorter than its unit is refused for its size.
  void refuse(const Tree& tree, uint64_t unit) const
  {
    throw Stop{form_.swap && tree.size < unit ? TAV_RC_OUTSIDE_PARENT : TAV_RC_NOT_SUPPORTED};
  }

  [[nodiscard]] uint64_t word(const Tree& tree, uint64_t at, uint64_t width) const
  {
    uint64_t result = 0;
    for (uint64_t i = 0; i < width; ++i)
    {
      result = result << 8U | tree.payload[at + (isLittle(form_) ? width - 1 - i : i)];
    }
    return result;
  }

  [[nodiscard]] uint64_t number(const Tree& tree, uint64_t width) const
  {
    if (tree.size != width)
    {
      throw Stop{TAV_RC_OUTSIDE_PARENT};
    }
    return word(tree, 0, width);
  }

  void hexadecimal(const Tree& tree)
  {
    Bytes bytes = tree.payload;
    if (tree.type == 103 && form_.swap)
    {
      if (bytes.size() < 16)
      {
        throw Stop{TAV_RC_OUTSIDE_PARENT};
      }
      std::reverse(bytes.begin(), bytes.begin() + 16);
    }
    for (const uint8_t byte : bytes)
    {
      text_ += hex(byte, 2);
    }
  }

  void array(const Tree& tree)
  {
    if (tree.size % 8 != 0)
    {
      throw Stop{TAV_RC_OUTSIDE_PARENT};
    }
    for (uint64_t at = 0; at < tree.size; at += 8)
    {
      text_ += std::to_string(word(tree, at, 8));
    }
  }

  void timestamp(const Tree& tree)
  {
    if (tree.size != 16)
    {
      throw Stop{TAV_RC_OUTSIDE_PARENT};
    }
    static const uint64_t starts[] = {0, 31, 59, 90, 120, 151, 181, 212, 243, 273, 304, 334, 365};
    const auto offset = static_cast<int16_t>(word(tree, 14, 2));
    const uint64_t t = word(tree, 0, 8) + static_cast<uint64_t>(int64_t{offset}) * 60;
    uint64_t days = t / 86400 + 731;
    days -= days / 1461 % 65536;
    const uint64_t year = 1968 + days / 365;
    uint64_t day = days % 365;
    const bool leap = (year % 4 == 0 && year % 100 != 0) || year % 400 == 0;
    day += leap && day <= 30 ? 1 : 0;
    uint64_t month = 0;
    while (day > starts[month])
    {
      ++month;
    }
    const uint64_t fraction = word(tree, 8, 2) / 1000 + word(tree, 10, 2);
    text_ += padded(static_cast<int64_t>(year % 65536), 4) + "-" + padded(static_cast<int64_t>(month), 2) + "-" +
             padded(static_cast<int64_t>(month == 0 ? 0 : day - starts[month - 1]), 2) + "-" +
             padded(static_cast<int64_t>(t / 3600 % 24), 2) + "." + padded(static_cast<int64_t>(t / 60 % 60), 2) + "." +
             padded(static_cast<int64_t>(t % 60), 2) + "." + padded(static_cast<int64_t>(fraction), 6) +
             padded(offset, 4);
  }

  static std::string padded(int64_t number, size_t width)
  {
    std::string digits = std::to_string(number < 0 ? -number : number);
    width -= number < 0 ? 1 : 0;
    digits.insert(0, digits.size() < width ? width - digits.size() : 0, '0');
    return number < 0 ? "-" + digits : digits;
  }

  static std::string hex(uint64_t number, size_t width)
  {
    std::string digits;
    for (; number != 0 || digits.size() < width; number /= 16)
    {
      digits.insert(digits.begin(), "0123456789ABCDEF"[number % 16]);
    }
    return digits;
  }

  uint64_t options_;
  Form form_;
  const uint8_t* block_;
  uint64_t blockSize_;
  std::string text_;
  size_t depth_ = 0;
};

const Tree& anyNode(const Tree& tree, Grower& grower)
{
  return tree.children.empty() || grower.below(3) == 0
             ? tree
             : anyNode(tree.children[grower.below(tree.children.size())], grower);
}

class RandomTrees : public ::testing::TestWithParam<Form>
{
protected:
  /// Prints a tree with every options value, and one of its nodes.
  static void compare(uint64_t seed)
  {
    Form form = GetParam();
    form.root32 = seed % 3 == 0;
    Grower grower(seed);
    Tree tree = grower.root(form.root32);
    const Bytes bytes = Encoder(form).encode(tree);
    StreamReader reader(bytes, form);
    const Tree& node = anyNode(tree, grower);
    for (uint64_t options = 0; options < 0x100; ++options)
    {
      if (form.buffered && (options & 0xC) == 0xC)
      {
        continue; // where data lie in a ring is the ring's business
      }
      NaivePrinter whole(options | 0x1, form, reader.handle()->pDirectData, bytes.size());
      ASSERT_EQ(printSubtree(options | 0x1, reader.handle()), whole(tree)) << "seed " << seed << " options " << options;
      TAVHeaderData start{};
      ASSERT_EQ(tavReadNodeInt(0, reader.handle(), node.offset, node.wide, &start), TAV_RC_OK);
      NaivePrinter part(options, form, reader.handle()->pDirectData, bytes.size());
      ASSERT_EQ(printSubtree(options, reader.handle(), &start), part(node))
          << "seed " << seed << " options " << options;
    }
  }
};

TEST_P(RandomTrees, PrintAsTheRulesSay)
{
  for (uint64_t seed = 1; seed <= 40 && !HasFatalFailure(); ++seed)
  {
    compare(seed);
  }
}

INSTANTIATE_TEST_SUITE_P(Over, RandomTrees,
                         ::testing::Values(Form{}, Form{.swap = true}, Form{.align = true},
                                           Form{.swap = true, .align = true}, Form{.buffered = true},
                                           Form{.buffered = true, .swap = true}, Form{.buffered = true, .align = true},
                                           Form{.buffered = true, .swap = true, .align = true}),
                         kFormName);

} // namespace
