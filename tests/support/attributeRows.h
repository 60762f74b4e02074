/// One stream of nodes with all attributes that paths may ask for, and which nodes have them: the same for the layer
/// and for the inspection library.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "support/byteRows.h"
#include "support/pathRows.h"
#include "tav/layout.hpp"

namespace test
{

inline constexpr uint16_t kTagOfSeveral = 133; ///< its tag is that of 134, too
inline constexpr uint16_t kUntagged = 63999;
inline constexpr uint16_t kUnknownType = 999;
inline constexpr uint16_t kLatin1 = 819; ///< code page

/// Writes the children one after another, in numbers that are those of the nodes.
class AttributeStream
{
public:
  explicit AttributeStream(bool swap)
      : rows_(swap), swap_(swap) {}

  /// In stream order, the numbers being those of the nodes:
  ///
  ///   0 system { 1-8 timestamps: whole, too many milliseconds, too many microseconds, with something further, with
  ///              zones of a day and of just less than minus a hundred hours, too late for a calendar, with a zone of
  ///              minus a hundred hours; 9 a text in UTF-8, 10 one in another code page, 11 a text that XML cannot
  ///              hold, 12 bytes, 13 a number, 14 one of a wrong size, 15 one with a key, 16 two numbers, 17 one of
  ///              128 bits, 18 of an element without a name, 19 of one whose tag is that of another, 20 of an unknown
  ///              type, 21 a group { 22 a group with a 32-bit header {} }, 23 a text with a pair, 24 an open group
  ///              { 25 a number }, 26 a number }
  Bytes bytes()
  {
    addMoments();
    addTexts();
    addNumbers();
    addGroups();
    ByteRows root(swap_);
    root.h64(rows_.at(), 0, TAV_TYPE_HEADER64, TAV_ELM_CMN_SYSTEM).data(rows_.bytes);
    return root.bytes;
  }

private:
  ByteRows& node(uint64_t size, uint16_t type, uint16_t elm = TAV_ELM_CMN_HOST_NAME, uint32_t info = 0)
  {
    return rows_.h64(size, info, type, elm);
  }
  void addMoment(uint64_t seconds, uint16_t milliseconds, uint16_t microseconds, uint16_t further, int16_t offset)
  {
    node(16, TAV_TYPE_UTC_TIMESTAMP).number(seconds, 8).number(milliseconds, 2).number(microseconds, 2);
    rows_.number(further, 2).number(static_cast<uint16_t>(offset), 2);
  }
  void addMoments()
  {
    constexpr int16_t day = 24 * 60;
    constexpr int16_t hundredHours = 100 * 60;
    addMoment(1714557630, 123, 456, 0, 60);
    addMoment(1714557630, 1000, 456, 0, 0);
    addMoment(1714557630, 123, 1001, 0, 0);
    addMoment(1714557630, 123, 456, 7, 0);
    addMoment(1714557630, 123, 456, 0, day);
    addMoment(1714557630, 123, 456, 0, 1 - hundredHours);
    addMoment(UINT64_MAX, 123, 456, 0, 0);
    addMoment(1714557630, 123, 456, 0, -hundredHours);
  }
  void addTexts()
  {
    node(5, TAV_TYPE_UTF8_STRING).number(kCodePageOfUtf8, 2).data({'a', 'd', 'a'});
    node(5, TAV_TYPE_UTF8_STRING).number(kLatin1, 2).data({'a', 'd', 'a'});
    node(2, TAV_TYPE_ASCII_STRING).data({'a', 1});
    node(2, TAV_TYPE_BINARY).data({'a', 'b'});
  }
  void addNumbers()
  {
    node(4, TAV_TYPE_UINT32).number(1, 4);
    node(3, TAV_TYPE_UINT32).number(1, 3);
    node(4, TAV_TYPE_UINT32, TAV_ELM_CMN_HOST_NAME, 0x2A).number(1, 4);
    node(16, TAV_TYPE_UINT64_ARRAY).number(1, 8).number(2, 8);
    node(16, TAV_TYPE_UINT128).number(1, 8).number(2, 8);
    node(4, TAV_TYPE_UINT32, kUntagged).number(1, 4);
    node(4, TAV_TYPE_UINT32, kTagOfSeveral).number(1, 4);
    node(2, kUnknownType).data({'a', 'b'});
  }
  void addGroups()
  {
    node(8, TAV_TYPE_HEADER32, TAV_ELM_CMN_HOST);
    rows_.h32(0, TAV_TYPE_HEADER32, TAV_ELM_CMN_CPU);
    node(2, TAV_TYPE_ASCII_STRING, TAV_ELM_CMN_HOST_NAME, TAV_INFO_EYE_SIZE).data({'a', 'b'}).pair(18);
    node(TAV_SIZE_UNKNOWN, TAV_TYPE_HEADER64, TAV_ELM_CMN_OS, TAV_INFO_EYE_SIZE);
    node(4, TAV_TYPE_UINT32).number(1, 4).end64(tav::layout::groupDistance(20, true));
    node(4, TAV_TYPE_UINT32).number(1, 4);
  }

  static constexpr uint16_t kCodePageOfUtf8 = 1208;

  ByteRows rows_;
  bool swap_;
};

inline constexpr PathRow kAttributeRows[] = {
    {"//*[@seconds]", "2 3 4 7 8"},
    {"//*[@seconds='18446744073709551615']", "7"},
    {"//*[@fractionA='1000']", "2"},
    {"//*[@fractionB='1001']", "3"},
    {"//*[@further='7']", "4"},
    {"//*[@offsetMinutes]", "2 3 4 7 8"},
    {"//*[@offsetMinutes='-6000']", "8"},
    {"//*[@codePage]", "10"},
    {"//*[@codePage='819']", "10"},
    {"//*[@encoding='hex']", "11 12 14 20"},
    {"//*[@id]", "18 19"},
    {"//*[@id='63999']", "18"},
    {"//*[@name='SQLM_ELM_EVENT_STARTPIPEBLOCK']", "19"},
    {"//*[@name]", "19"},
    {"//*[@type='group32']", "21 22"},
    {"//*[@type='group64']", "0 24"},
    {"//*[@type='999']", "20"},
    {"//*[@type='UTC Timestamp']", "1 2 3 4 5 6 7 8"},
    {"//*[@header='64']", "0"},
    {"//*[@header]", "0"},
    {"//*[@info]", "15"},
    {"//*[@info='0x2a']", "15"},
    {"//*[@eyeSize='true']", "23 24"},
    {"//*[@size='unknown']", "24"},
    {"//*[@size]", "24"},
    {"//*[@extra]", ""},
};

} // namespace test
