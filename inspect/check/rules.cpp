#include "tav/inspect/rules.hpp"

#include <array>

namespace tav::inspect
{

namespace
{

constexpr bool kSwapped = !kor::isLittleEndian; ///< the examples are little-endian
constexpr Form k32{.swapped = kSwapped, .root64 = false};
constexpr Form k64{.swapped = kSwapped};
constexpr Form k32Padded{.swapped = kSwapped, .root64 = false, .aligned = true};
constexpr Form k64Padded{.swapped = kSwapped, .aligned = true};

constexpr std::array<Rule, static_cast<size_t>(RuleId::count)> kRules{{
    {RuleId::headerCut, "header-cut", false, TAV_RC_NO_MEMORY, "The file ends inside a header.",
     "The node cannot be read, and nothing tells how long it would have been. A writer that was stopped leaves this.",
     k32, "03000000 0100 1400 010000", 8},
    {RuleId::typeUnknown, "type-unknown", false, TAV_RC_BAD_HDR_TYPE,
     "A node has a type that the format does not know.",
     "Its payload has no meaning, and in a stream of the other byte order nobody knows how to reverse it.", k32,
     "12000000 0100 1400 01000000 E803 C7EA 07 01000000 3300 C7EA 07", 8},
    {RuleId::elementUnknown, "element-unknown", true, TAV_RC_OK,
     "A node has an element id that is not in the dictionary.",
     "It reads and prints, but without a name. Programs may use ids of their own, so this is no defect.", k32,
     "09000000 0100 1400 01000000 3300 5FEA 07", 8},
    {RuleId::sizeType, "size-type", false, TAV_RC_OUTSIDE_PARENT, "A node's size does not fit its type.",
     "A Uint32 has 4 bytes, a timestamp 16, a UTF-8 string at least the 2 of its code page. Readers take too few or "
     "too many.",
     k32, "0D000000 0100 1400 05000000 3700 C7EA 0102030405", 8},
    {RuleId::pastParent, "past-parent", false, TAV_RC_OUTSIDE_PARENT, "A node ends past the group around it.",
     "Two sizes contradict each other; what follows the group is read as part of it, or the other way round.", k32,
     "19000000 0100 1400 08000000 0100 1400 02000000 3500 C7EA 01000000 3300 C7EA 07", 16},
    {RuleId::pastFile, "past-file", false, TAV_RC_DATA_TOO_LARGE, "A node ends past the end of the file.",
     "The file was cut off, or the size is damaged. Told once for the outermost group that was cut.", k32,
     "0A000000 0100 1400 01000000 3300 C7EA 07", 0},
    {RuleId::groupType, "group-type", false, TAV_RC_BAD_CHILD_HDR,
     "A group with a 32-bit header announces children with 64-bit headers.",
     "No writer makes it; readers differ in which headers they expect inside.", k32,
     "09000000 0200 1400 01000000 3300 C7EA 07", 0},
    {RuleId::rootNoGroup, "root-no-group", false, TAV_RC_BAD_CHILD_HDR, "A node outside any group is a data element.",
     "A root has to be a group; the library refuses to write anything else.", k32, "01000000 3300 C7EA 07", 0},
    {RuleId::groupOpen, "group-open", false, TAV_RC_NOT_FOUND,
     "A group was never closed: its size is all ones, or 0 although it has children, and no end element ends it.",
     "Readers take all that follows for its children, or see none. A writer that was stopped leaves this.",
     k32, "FFFFFFFF 0100 1400 01000000 3300 C7EA 07", 0},
    {RuleId::sizeUnknown, "size-unknown", true, TAV_RC_OK, "A group's size is all ones; its end element ends it.",
     "It reads, but to step over it every byte has to be searched for the end element.", k64,
     "FFFFFFFFFFFFFFFF 00004000 0200 1400 1000000000000000 00000000 6500 E9FD ED0DECDDEED5DEC0 2000000000000000", 0},
    {RuleId::groupSize, "group-size", false, TAV_RC_OUTSIDE_PARENT, "A group's size is not the span of its children.",
     "Its end element or its last child says that it ends elsewhere. Stepping over the group leads between two nodes.",
     k64,
     "4100000000000000 00000000 0200 1400 2100000000000000 00004000 0200 1400 1000000000000000 00000000 6500 E9FD "
     "ED0DECDDEED5DEC0 2000000000000000 0100000000000000 00000000 3300 C7EA 07",
     16},
    {RuleId::endMissing, "end-missing", false, TAV_RC_NOT_FOUND,
     "A group announces an eye/size pair, but has no end element.", "It cannot be walked backwards.", k64,
     "1100000000000000 00004000 0200 1400 0100000000000000 00000000 3300 C7EA 07", 0},
    {RuleId::endForm, "end-form", false, TAV_RC_OUTSIDE_PARENT,
     "An end element is not 16 bytes of type 101 without info bits.", "Readers look for its pair at a fixed place.",
     k64, "2000000000000000 00004000 0200 1400 1000000000000000 00000000 6400 E9FD ED0DECDDEED5DEC0 2000000000000000",
     16},
    {RuleId::afterEnd, "after-end", false, TAV_RC_NO_MORE_CHILDREN, "A node follows a group's end element.",
     "Readers stop at the end element and never see it.", k32,
     "11000000 0100 1400 00000000 6500 E8FD 01000000 3300 C7EA 07", 16},
    {RuleId::pairMissing, "pair-missing", false, TAV_RC_NOT_FOUND,
     "A data element announces an eye/size pair that is not there.",
     "Readers step over 16 bytes too many, into the next nodes.", k64,
     "2200000000000000 00000000 0200 1400 0100000000000000 00004000 3300 C7EA 07 0100000000000000 00000000 3300 C7EA "
     "07",
     33},
    {RuleId::eyeDamaged, "eye-damaged", false, TAV_RC_NOT_FOUND, "The eye catcher of a pair is damaged.",
     "The stream cannot be walked backwards over it.", k64,
     "2100000000000000 00000000 0200 1400 0100000000000000 00004000 3300 C7EA 07 ED0DECDDEED5DEC1 1100000000000000",
     33},
    {RuleId::pairDistance, "pair-distance", false, TAV_RC_NOT_FOUND,
     "The distance of an eye/size pair is not the one that a writer gives.",
     "Walking backwards leads to a wrong place. Padding and the two uncounted bytes of a string do not count, and a "
     "64-bit group of 32-bit children "
     "has 8 less than the way: these distances are right.",
     k64,
     "2100000000000000 00000000 0200 1400 0100000000000000 00004000 3300 C7EA 07 ED0DECDDEED5DEC0 1200000000000000",
     33},
    {RuleId::pairOrder, "pair-order", false, TAV_RC_NOT_FOUND,
     "An eye/size pair is in the other byte order than the stream.",
     "Readers do not recognise it. Behind a string the pair is in the writer's own order, which is right.", k64,
     "2100000000000000 00000000 0200 1400 0100000000000000 00004000 3300 C7EA 07 C0DED5EEDDEC0DED 0000000000000011",
     33},
    {RuleId::alignFlag, "align-flag", true, TAV_RC_OK,
     "A 64-bit header does not say of padding what the rest of the stream does.",
     "Readers that trust the header alone look for the next node at another place.", k64Padded,
     "1800000000000000 00001000 0200 1400 0800000000000000 00000000 3900 C7EA 0700000000000000", 16},
    {RuleId::paddingMissing, "padding-missing", true, TAV_RC_OK,
     "The padding behind a payload is not there, or not inside the group.",
     "A writer does not write the bytes of the last padding, so that files may end without it.", k32Padded,
     "10000000 0100 1400 01000000 3300 C7EA 07", 17},
    {RuleId::paddingDirty, "padding-dirty", true, TAV_RC_OK, "The padding behind a payload is not zero.",
     "Harmless; it shows what the storage held before.", k32Padded,
     "10000000 0100 1400 01000000 3300 C7EA 07 00000000000001", 17},
    {RuleId::stringExtra, "string-extra", true, TAV_RC_OK, "Two bytes that no size counts stand behind a UTF-8 string.",
     "tavAddString writes them. Readers that step by the size alone are 2 bytes early.", k32,
     "16000000 0100 1400 03000000 6600 C7EA B804 61 0000 01000000 3300 C7EA 07", 19},
    {RuleId::utf8Invalid, "utf8-invalid", true, TAV_RC_OK, "A UTF-8 string holds bytes that are no UTF-8.",
     "Programs that trust the type may refuse it. Told at its first such byte.", k32,
     "0C000000 0100 1400 04000000 6600 C7EA B804 61FF", 19},
    {RuleId::stringNul, "string-nul", true, TAV_RC_OK, "A string holds a NUL.",
     "Programs that take it as a C string see the part before it. Told at the first one.", k32,
     "0B000000 0100 1400 03000000 3200 C7EA 610062", 17},
    {RuleId::stringHigh, "string-high", true, TAV_RC_OK, "An ASCII string holds a character beyond 127.",
     "What it means depends on the code page, 437 as a rule. Told at the first one.", k32,
     "0A000000 0100 1400 02000000 3200 C7EA 6184", 17},
    {RuleId::damaged, "damaged", false, TAV_RC_BAD_HDR_TYPE, "Bytes inside a group are no node.",
     "Whatever stood there is lost to readers, who cannot find the way across.", k32,
     "12000000 0100 1400 00000000 00000000 00 01000000 3300 C7EA 07", 8},
    {RuleId::behindStream, "behind-stream", false, TAV_RC_BAD_CHILD_HDR,
     "Bytes that are not zeros stand behind the stream.",
     "They belong to nothing. A file may be longer than its stream, but then it ends in zeros.", k32,
     "09000000 0100 1400 01000000 3300 C7EA 07 00FF", 17},
    {RuleId::zerosBetween, "zeros-between", true, TAV_RC_OK, "Zeros stand between a stream and what follows it.",
     "Several streams follow each other in a file as writers append them, and a writer fills its last page with zeros.",
     k32, "09000000 0100 1400 01000000 3300 C7EA 07 00*16 09000000 0100 1400 01000000 3300 C7EA 07", 17},
    {RuleId::zerosLong, "zeros-long", false, TAV_RC_END_OF_STORAGE,
     "More than two pages of zeros, 2 MiB, stand behind the stream.",
     "A writer leaves two pages at most; more tells that the end of the stream was lost.", k32,
     "09000000 0100 1400 01000000 3300 C7EA 07 00*2097153", 17},
    {RuleId::tooDeep, "too-deep", false, TAV_RC_NO_MEMORY, "Groups are nested more than 4,000 deep.",
     "The library neither walks nor validates it. Told for the first group that is too deep, once in a root.", k32,
     "(FFFFFFFF 0100 1400)*4001", 32000},
}};

} // namespace

std::span<const Rule> rules()
{
  return kRules;
}

const Rule& ruleOf(RuleId rule)
{
  return kRules[static_cast<size_t>(rule)];
}

const Rule* findRule(std::string_view id)
{
  for (const Rule& rule : kRules)
  {
    if (rule.id == id)
    {
      return &rule;
    }
  }
  return nullptr;
}

} // namespace tav::inspect
