// What documents are refused with: the place and the sentence.
#include <string>
#include <vector>

#include <gmock/gmock.h>

#include "inspect/streams.h"

using namespace tav::inspect;
using test::Bytes;
using test::bytesOfJson;

namespace
{

std::string refusal(const std::string& text)
{
  try
  {
    bytesOfJson(text);
  }
  catch (const Error& error)
  {
    return error.problem().path + ": " + error.problem().sentence;
  }
  return "(taken)";
}

struct Refused
{
  const char* text;
  const char* told; ///< path and sentence
};

/// A node in an array of nodes, with these properties.
std::string node(const std::string& properties)
{
  return "[{" + properties + "}]";
}

} // namespace

TEST(JsonRefusals, OfTheEnvelope)
{
  const std::vector<Refused> cases{
      {R"(7)", ": the document is an object or an array"},
      {R"({"tav": 2})", R"(/tav: this document is of another version: tav is "2", not 1)"},
      {R"({"tav": "1"})", R"(/tav: this document is of another version: tav is "1", not 1)"},
      {R"({"tav": 1, "form": 7})", "/form: form is an object"},
      {R"({"tav": 1, "nodes": 7})", "/nodes: nodes is an array of nodes"},
      {R"({"tav": {}})", "/tav: an object cannot stand here"},
      {R"({"tav": []})", "/tav: an array cannot stand here"},
      {R"({"nodes": [], "nodes": []})", "/nodes: the nodes are given twice"},
      {R"({"nodes": {}, "nodes": {}})", "/nodes: the nodes are given twice"},
      {R"({"nodes": [], "form": {}})", "/form: the form must stand before the nodes"},
      {R"({"form": {}, "form": {}})", "/form: the form is given twice"},
      {R"({"nodes": [], "cpuOnline": 1})", R"(/cpuOnline: the key "cpuOnline" is not known here)"},
      {R"({"lines": true} [])", ": an array cannot stand here"},
      {R"({"lines": 1})", "/lines: lines is true or false"},
      {R"([] [])", ": there is more behind the document"},
      {R"([7])", "/0: a node is an object"},
      {R"([[]])", "/0: an array cannot stand here"},
      {R"({"form": {"byteOrder": "middle"}})", "/form/byteOrder: byteOrder is little or big"},
      {R"({"form": {"byteOrder": 1}})", "/form/byteOrder: byteOrder is a text"},
      {R"({"form": {"root": 16}})", "/form/root: root is 32 or 64"},
      {R"({"form": {"root": "64"}})", "/form/root: root is 32 or 64"},
      {R"({"form": {"aligned": 1}})", "/form/aligned: aligned is true or false"},
      {R"({"form": {"colour": 1}})", R"(/form/colour: the key "colour" is not known here)"},
      {R"({"form": {"root": {}}})", "/form/root: an object cannot stand here"},
      {R"({"form": {"root": []}})", "/form/root: an array cannot stand here"},
  };
  for (const Refused& one : cases)
  {
    EXPECT_EQ(refusal(one.text), one.told) << one.text;
  }
}

TEST(JsonRefusals, OfAHeader)
{
  const std::vector<Refused> cases{
      {R"("value": 1)", "/0: the node has no element"},
      {R"("element": 7, "value": 1)", "/0/element: element is a text"},
      {R"("element": "cpuOnlin", "value": 1)",
       R"(/0: no element has the name "cpuOnlin"; did you mean cpuOnline, cpuConfig?)"},
      {R"("element": "cpuOnline", "id": 1, "value": 1)", "/0/id: element and id do not agree: #60111 and #1"},
      {R"("id": 70000, "value": 1)", R"(/0/id: id: "70000" is no number that fits)"},
      {R"("id": -1, "value": 1)", R"(/0/id: id: "-1" is no number that fits)"},
      {R"("id": null, "value": 1)", "/0/id: id: null is no number that fits"},
      {R"("id": 1, "type": "Uint31", "value": 1)", R"(/0/type: there is no type "Uint31")"},
      {R"("id": 1, "header": 16, "value": 1)", "/0/header: header is 32 or 64"},
      {R"("id": 1, "header": 32, "eyeSize": true, "value": 1)",
       "/0: only 64-bit headers can announce an eye/size pair"},
      {R"("id": 1, "eyeSize": 1, "value": 1)", "/0/eyeSize: eyeSize is true or false"},
      {R"("id": 1, "header": 32, "size": 4294967296, "value": 1)",
       "/0: 4294967296 does not fit the size of a 32-bit header"},
      {R"("id": 1, "size": "much", "value": 1)", R"(/0/size: size: "much" is no number that fits)"},
      {R"("id": 1, "info": 4294967296, "value": 1)", R"(/0/info: info: "4294967296" is no number that fits)"},
      {R"("id": 1, "colour": 1)", R"(/0/colour: the key "colour" is not known here)"},
      {R"("id": 1, "type": "group64", "value": 1)", "/0: a group has children and no value"},
      {R"("id": 1, "type": "Uint32")", "/0: no value is no value for Uint32"},
      {R"("id": 1)", "/0: the node has neither a value nor children"},
      {R"("id": 1, "type": "Uint32", "children": [])", "/0/children: Uint32 has no children"},
      {R"("id": 1, "value": 1, "children": [])", "/0/children: a node has either a value or children"},
      {R"("id": 1, "children": [], "value": 1)", R"(/0/value: the key "value" has no place in a node with children)"},
      {R"("id": 1, "children": [], "children": [])", "/0/children: an array cannot stand here"},
      {R"("id": 1, "children": [], "header": 32)", "/0/header: the header of a group must stand before its children"},
      {R"("id": 1, "children": [], "type": "group32")", "/0: the type of a group must stand before its children"},
      {R"("id": 1, "children": [], "colour": 1)",
       R"(/0/colour: the key "colour" has no place in a node with children)"},
      {R"("id": 1, "children": [{"id": 2, "header": 32, "value": 1}])",
       "/0/children/0: the group around it has children with 64-bit headers"},
      {R"("id": 1, "colour": {})", "/0/colour: an object cannot stand here"},
      {R"("id": 1, "colour": [])", "/0/colour: an array cannot stand here"},
  };
  for (const Refused& one : cases)
  {
    EXPECT_EQ(refusal(node(one.text)), one.told) << one.text;
  }
}

TEST(JsonRefusals, OfAValue)
{
  const std::vector<Refused> cases{
      {R"("value": null)", "/0/value: no type holds null"},
      {R"("value": 1.5)", "/0/value: no type holds 1.5, only whole numbers"},
      {R"("value": 1, "value": 2)", "/0/value: the node has a value already"},
      {R"("value": 1, "bytes": "00")", "/0/bytes: the node has a value already"},
      {R"("bytes": "00", "bytes": "00")", "/0/bytes: the node has a value already"},
      {R"("bytes": "0")", R"(/0/bytes: bytes: bytes are given in hexadecimal, as "00ff")"},
      {R"("bytes": "0g")", R"(/0/bytes: bytes: bytes are given in hexadecimal, as "00ff")"},
      {R"("bytes": 1)", R"(/0/bytes: bytes: bytes are given in hexadecimal, as "00ff")"},
      {R"("bytes": ["00", "0g"])", R"(/0/bytes/1: bytes are given in hexadecimal, as "00ff")"},
      {R"("bytes": ["00", -1])", R"(/0/bytes/1: zeros: "-1" is no number that fits)"},
      {R"("value": ["a", 1])", "/0/value/1: texts and numbers do not go together in one value"},
      {R"("value": [1, "a"])", R"(/0/value/1: value: "a" is no number that fits)"},
      {R"("value": [18446744073709551616])", R"(/0/value/0: value: "18446744073709551616" is no number that fits)"},
      {R"("value": [-1])", R"(/0/value/0: value: "-1" is no number that fits)"},
      {R"("type": "Uint8", "value": 256)", R"(/0: "256" is no value for Uint8: whole numbers from 0 to 255 are)"},
      {R"("type": "Sint8", "value": -129)", R"(/0: "-129" is no value for Sint8: whole numbers from -128 to 127 are)"},
      {R"("type": "Uint16", "value": "-1")", R"(/0: "-1" is no value for Uint16: whole numbers from 0 to 65535 are)"},
      {R"("type": "Sint16", "value": 32768)",
       R"(/0: "32768" is no value for Sint16: whole numbers from -32768 to 32767 are)"},
      {R"("type": "Uint32", "value": 4294967296)",
       R"(/0: "4294967296" is no value for Uint32: whole numbers from 0 to 4294967295 are)"},
      {R"("type": "Sint32", "value": "one")",
       R"(/0: "one" is no value for Sint32: whole numbers from -2147483648 to 2147483647 are)"},
      {R"("type": "Uint64", "value": 18446744073709551616)",
       R"(/0: "18446744073709551616" is no value for Uint64: whole numbers from 0 to 18446744073709551615 are)"},
      {R"("type": "Sint64", "value": 9223372036854775808)",
       R"(/0: "9223372036854775808" is no value for Sint64: whole numbers from )"
       "-9223372036854775808 to 9223372036854775807 are"},
      {R"("type": "Byte", "value": 256)", R"(/0: "256" is no value for Byte: whole numbers from 0 to 255 are)"},
      {R"("type": "Uint128", "value": -1)", R"(/0: "-1" is no value for Uint128)"},
      {R"("type": "Sint128", "value": 170141183460469231731687303715884105728)",
       R"(/0: "170141183460469231731687303715884105728" is no value for Sint128)"},
      {R"("value": 340282366920938463463374607431768211456)",
       R"(/0: "340282366920938463463374607431768211456" is no value for Uint128)"},
      {R"("type": "UTC Timestamp", "value": "2023-02-29T00:00:00Z")",
       R"(/0: "2023-02-29T00:00:00Z" is no date that a timestamp holds; 2024-02-29T10:30:00.123456+01:00 is)"},
      {R"("type": "UTC Timestamp", "value": 1)", "/0: a number is no value for UTC Timestamp"},
      {R"("type": "Uint64 array", "value": 1)", "/0: a number is no value for Uint64 array"},
      {R"("type": "ASCII String", "value": 1)", "/0: a number is no value for ASCII String"},
      {R"("type": "Uint32", "value": [1])", "/0: an array of numbers is no value for Uint32"},
      {R"("value": {"seconds": -1})", R"(/0/value/seconds: seconds: "-1" is no number that fits)"},
      {R"("value": {"fractionA": 65536})", R"(/0/value/fractionA: fractionA: "65536" is no number that fits)"},
      {R"("value": {"offsetMinutes": 32768})",
       R"(/0/value/offsetMinutes: offsetMinutes: "32768" is no number that fits)"},
      {R"("value": {"month": 1})", R"(/0/value/month: the key "month" is not known in a date)"},
      {R"("value": {"seconds": {}})", "/0/value/seconds: an object cannot stand here"},
      {R"("value": {"seconds": []})", "/0/value/seconds: an array cannot stand here"},
      {R"("codePage": 65536, "value": "a")", R"(/0/codePage: codePage: "65536" is no number that fits)"},
      {R"("padding": "0")", R"(/0/padding: padding: bytes are given in hexadecimal, as "00ff")"},
  };
  for (const Refused& one : cases)
  {
    EXPECT_EQ(refusal(node("\"id\": 1, " + std::string(one.text))), one.told) << one.text;
  }
}

TEST(JsonRefusals, OfTheShortWayAndOfLines)
{
  const std::vector<Refused> cases{
      {R"({"system": {"cpuOnlin": 1}})",
       R"(/system/cpuOnlin: no element has the name "cpuOnlin"; did you mean cpuOnline, cpuConfig?)"},
      {R"({"system": {"$colour": 1}})", R"(/system/$colour: the key "colour" is not known here)"},
      {R"({"system": {"$value": 1, "cpuOnline": 1}})", "/system/cpuOnline: a node has either a value or children"},
      {R"({"system": {"$type": "Uint32", "cpuOnline": 1}})", "/system/cpuOnline: Uint32 has no children"},
      {R"({"system": {"cpuOnline": 1, "$value": 1}})",
       R"(/system/$value: the key "value" has no place in a node with children)"},
      {R"({"system": {"cpuOnline": [[1]]}})", "/system/cpuOnline/0: an array cannot stand here"},
      {R"({"system": {"cpuOnline": [null]}})", "/system/cpuOnline/0: no type holds null"},
      {R"({"a/b~c": 1})", R"(/a~1b~0c: no element has the name "a/b~c")"},
      {"{\"lines\": true}\n{\"id\": 1, \"depth\": 1, \"value\": 1}",
       ": depth 1 is more than one below the line before"},
      {"{\"lines\": true}\n{\"id\": 1, \"depth\": 0, \"value\": 1}\n{\"id\": 1, \"depth\": 1, \"value\": 1}",
       ": depth 1 is more than one below the line before"},
      {"{\"lines\": true}\n7", ": the document is an object or an array"},
  };
  for (const Refused& one : cases)
  {
    EXPECT_EQ(refusal(one.text), one.told) << one.text;
  }
}
