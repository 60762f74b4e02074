/// @file tav.cppm
/// The C++ layer as a module: `import tav;` in place of `#include "tav/tav.hpp"`. It exports the classes and functions of
/// `tav::` and the constants of elements, types and codes; plain operations and macros come by `tav/tav.h` as before. A
/// program compiles it once, by its own compiler and options, and links libtav as ever:
/// `clang++ -std=c++20 --precompile tav.cppm`.
module;

#include "tav/tav.hpp"

export module tav;

export namespace tav
{
using tav::Access;
using tav::ByteOrder;
using tav::category;
using tav::ChildRange;
using tav::codeOf;
using tav::DescendantRange;
using tav::ElementId;
using tav::EndElements;
using tav::FileOptions;
using tav::FilePath;
using tav::FindRange;
using tav::Group;
using tav::GroupOptions;
using tav::HeaderView;
using tav::Index;
using tav::Interval;
using tav::kCodePageUtf8;
using tav::makeError;
using tav::Node;
using tav::NodeOptions;
using tav::OpenRoot;
using tav::OwnedNode;
using tav::Path;
using tav::PathFault;
using tav::PayloadView;
using tav::PrintOptions;
using tav::Readable;
using tav::Reader;
using tav::Recorder;
using tav::RecorderOptions;
using tav::RootRange;
using tav::Sint128;
using tav::StreamInteger;
using tav::StreamOptions;
using tav::Uint128;
using tav::Updater;
using tav::Utf8;
using tav::Utf8Text;
using tav::Width;
using tav::Writer;
} // namespace tav

#define TAV_ELEMENT(id, constant, enumName, tagName) export using ::constant;
#include "tav/elements.def"

#define TAV_EXPORT_CODE(name, value, sentence) export using ::name;
TAV_CODE_LIST(TAV_EXPORT_CODE)
#undef TAV_EXPORT_CODE

export using ::TAV_TYPE_ASCII_STRING;
export using ::TAV_TYPE_BINARY;
export using ::TAV_TYPE_BYTE;
export using ::TAV_TYPE_HEADER32;
export using ::TAV_TYPE_HEADER64;
export using ::TAV_TYPE_SINT128;
export using ::TAV_TYPE_SINT16;
export using ::TAV_TYPE_SINT32;
export using ::TAV_TYPE_SINT64;
export using ::TAV_TYPE_SINT8;
export using ::TAV_TYPE_UINT128;
export using ::TAV_TYPE_UINT16;
export using ::TAV_TYPE_UINT32;
export using ::TAV_TYPE_UINT64;
export using ::TAV_TYPE_UINT64_ARRAY;
export using ::TAV_TYPE_UINT8;
export using ::TAV_TYPE_UTC_TIMESTAMP;
export using ::TAV_TYPE_UTF8_STRING;

export using ::TAV_INFO_ALIGNED8;
export using ::TAV_INFO_EYE_SIZE;
export using ::TAV_INFO_KEY_MASK;
