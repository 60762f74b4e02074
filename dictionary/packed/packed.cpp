/// @file packed.cpp
/// The dictionary of programs whose bytes are sent, in place of table.cpp and tagIndex.cpp: from elements.def the
/// compiler makes a text without what can be derived, of which the tables are made when somebody first asks.
#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <utility>

#include "dictionary/dictionary.h"
#include "dictionary/elementTable.h"
#include "dictionary/tagBuckets.h"

namespace tav::inside
{
namespace
{

constexpr char kLineEnd = '\n';
constexpr char kNameFollows = '|'; ///< behind a tag: an enum name of its own, not the derived one

/// What an enum name begins with that is derived from a tag.
constexpr std::string_view prefixOf(uint16_t id)
{
  constexpr uint16_t firstCommon = 60001;
  constexpr uint16_t documentRoot = 20;
  return id >= firstCommon || id == documentRoot ? "TAV_ELM_CMN_" : "SQLM_ELM_";
}

/// What follows the prefix in the enum name that nearly every element has: the tag in capitals, with a line below
/// between the words that capitals set apart in it.
struct Derived
{
  static constexpr size_t kMost = 128; ///< no constant comes out of a tag that needs more
  std::array<char, kMost> text{};
  size_t size = 0;

  constexpr explicit Derived(std::string_view tag)
  {
    char last = '_';
    for (const char character : tag)
    {
      if (character >= 'a' && character <= 'z')
      {
        text[size++] = static_cast<char>(character - 'a' + 'A');
      }
      else
      {
        const bool capital = character >= 'A' && character <= 'Z';
        if (capital && ((last >= 'a' && last <= 'z') || (last >= '0' && last <= '9')))
        {
          text[size++] = '_';
        }
        text[size++] = character;
      }
      last = character;
    }
  }

  constexpr std::string_view name() const { return {text.data(), size}; }
};

constexpr bool isDerived(const ListedElement& element)
{
  const std::string_view prefix = prefixOf(element.id);
  return element.enumName.starts_with(prefix) &&
         element.enumName.substr(prefix.size()) == Derived(element.tagName).name();
}

/// A constant for each element: a compiler takes only so many steps to find the value of one.
template<size_t Place>
constexpr bool kIsDerived = isDerived(kListedElements[Place]);

template<size_t... Place>
constexpr std::array<bool, kElementCount> areDerived(std::index_sequence<Place...> /*all*/)
{
  return {kIsDerived<Place>...};
}

constexpr std::array<bool, kElementCount> kDerived = areDerived(std::make_index_sequence<kElementCount>());

constexpr size_t kPackedBytes = [] {
  size_t bytes = kElementCount;
  for (size_t i = 0; i < kElementCount; ++i)
  {
    const ListedElement& element = kListedElements[i];
    const bool named = !element.tagName.empty() && !kDerived[i];
    bytes += element.tagName.size() + (named ? element.enumName.size() + 1 : 0);
  }
  return bytes;
}();

/// A line for each element in the order of the list: its tag, and its enum name where that is not derived. A
/// placeholder has an empty one.
constexpr std::array<char, kPackedBytes> kPacked = [] {
  std::array<char, kPackedBytes> packed{};
  auto* to = packed.begin();
  for (size_t i = 0; i < kElementCount; ++i)
  {
    const ListedElement& element = kListedElements[i];
    to = std::copy(element.tagName.begin(), element.tagName.end(), to);
    if (!element.tagName.empty() && !kDerived[i])
    {
      *to++ = kNameFollows;
      to = std::copy(element.enumName.begin(), element.enumName.end(), to);
    }
    *to++ = kLineEnd;
  }
  return packed;
}();

/// A list with these characters in its names could not be told apart.
constexpr bool namesAreOfOneLine()
{
  return std::all_of(kListedElements.begin(), kListedElements.end(), [](const ListedElement& element) {
    return element.tagName.find(kNameFollows) == std::string_view::npos &&
           element.tagName.find(kLineEnd) == std::string_view::npos &&
           element.enumName.find(kLineEnd) == std::string_view::npos;
  });
}

static_assert(namesAreOfOneLine());

ElementTable unpack()
{
  ElementTable table;
  std::string_view rest(kPacked.data(), kPacked.size());
  std::string name;
  for (const ElementBounds& bounds : kElementBounds)
  {
    for (uint64_t k = 0; k < bounds.count; ++k)
    {
      const auto id = static_cast<uint16_t>(bounds.firstId + k);
      const std::string_view line = rest.substr(0, rest.find(kLineEnd));
      rest.remove_prefix(line.size() + 1);
      const size_t mark = line.find(kNameFollows);
      const std::string_view tag = line.substr(0, mark);
      if (mark != std::string_view::npos)
      {
        table.put(id, line.substr(mark + 1), tag);
        continue;
      }
      name = prefixOf(id);
      name += Derived(tag).name();
      table.put(id, name, tag);
    }
  }
  return table;
}

struct Unpacked
{
  ElementTable table = unpack();
  ElementDirectory directory = directoryOver(table.entries.data());
  TagBuckets tags{[this](size_t place) {
    const std::string_view tag = tagAt(place);
    return tag == kPlaceholderTagName ? std::string_view() : tag;
  }};

  const char* tagAt(size_t place) const { return table.strings.data() + table.entries[place].tagNamePlace; }
};

const Unpacked& unpacked()
{
  static const Unpacked tables;
  return tables;
}

} // namespace

const TAVElementRange* elementDirectory()
{
  return unpacked().directory.data();
}

const TAVElementEntry& elementAt(size_t place)
{
  return unpacked().table.entries[place];
}

const char* enumNameOf(const TAVElementEntry& entry)
{
  return unpacked().table.strings.data() + entry.enumNamePlace;
}

const char* tagNameOf(const TAVElementEntry& entry)
{
  return unpacked().table.strings.data() + entry.tagNamePlace;
}

std::span<const uint16_t> placesTagged(std::string_view tag)
{
  return unpacked().tags.placesTagged(tag);
}

} // namespace tav::inside
