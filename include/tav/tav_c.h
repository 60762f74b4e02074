/// @file tav_c.h
/// libtav for C, and for all that calls C: recording, and reading files whose form nobody told. C99; exported by
/// libtav-inspect; also for C++.
///
/// Results are the codes of tav/codes.h, 0 for success. A null argument is TAV_RC_BAD_PARAM unless a comment says what
/// it means. Sizes are bytes, and offsets count from the file's first byte. A reader or a writer belongs to one thread
/// at a time; different ones are independent. Nothing throws, prints, ends the process or keeps global state.
///
/// A reader and a writer are their caller's, until tav_close, tav_finish or tav_discard. A node is a plain value that
/// the caller holds; it may be copied, holds nothing that has to be released, and is of use with its reader alone:
/// another one answers TAV_RC_BAD_PARAM. Texts that functions return are the library's.
#pragma once

#if defined(__cplusplus)
#include <cstddef>
#include <cstdint>
#else
#include <stddef.h>
#include <stdint.h>
#endif

#include "tav/codes.h"
#include "tav/decl.h"
#include "tav/elements.h"
#include "tav/types.h"

#if defined(TAV_INSPECT_BUILDING)
#define TAV_C_API KOR_DECL_EXPORT
#elif defined(TAV_STATIC)
#define TAV_C_API
#else
#define TAV_C_API KOR_DECL_IMPORT
#endif

#if defined(__cplusplus)
extern "C" {
#endif

typedef struct tav_reader tav_reader;
typedef struct tav_writer tav_writer;

/// How a stream is laid out. All zeros: a reader finds it out; a writer writes in this machine's byte order with a
/// 64-bit root header and no padding, and goes on in a file in the form that the file has; a form that is given at all
/// has to agree with that as a whole.
typedef struct tav_form
{
  uint8_t byte_order; ///< 1 little-endian, 2 big-endian
  uint8_t root_bits;  ///< of the first node's header: 32 or 64
  uint8_t aligned;    ///< whether payloads are padded to multiples of 8: 1 no, 2 yes
} tav_form;

/// A node of a reader.
typedef struct tav_node
{
  uint64_t offset; ///< of its header
  uint64_t size;   ///< of its payload; all ones in the width of the header for a group that was never closed
  uint32_t info;   ///< the flag bits of its header; 0 where that has 32 bits
  uint16_t type;   ///< TAV_TYPE_...
  uint16_t elm;    ///< TAV_ELM_...
  uint8_t header_bits;
  uint8_t is_group;
  /// As it is in the file, in the file's byte order. Over memory it lives as long as the bytes, over a file until
  /// the next call with the reader. Null for a group, and where it is larger than 10 MiB: tav_read.
  const uint8_t* payload;
  uint64_t payload_size; ///< of what is at `payload`
  uint64_t reserved[4];  ///< the library's
} tav_node;

/// @name Opening
/// @{

/// Opens a file. `path` is UTF-8. `form` says what is known of the form; null, or zeros: it is found out.
///
/// @param[out] out  the reader, the caller's until tav_close; null after a failure
/// @retval TAV_RC_NOT_FOUND  the file is no stream, an empty one included
/// @retval TAV_RC_BAD_PARAM  a value in `form` that is none, or several forms explain the bytes equally well
/// and the system's codes, as KOR_RC_NO_SUCH_FILE
TAV_C_API uint32_t tav_open_file(const char* path, const tav_form* form, tav_reader** out);

/// The same over bytes in memory, which have to outlive the reader.
TAV_C_API uint32_t tav_open_memory(const void* bytes, size_t size, const tav_form* form, tav_reader** out);

/// Ends a reader. Null is fine.
TAV_C_API void tav_close(tav_reader* reader);

/// The form of the file's first stream, no member 0.
TAV_C_API uint32_t tav_form_of(const tav_reader* reader, tav_form* out);

/// Reads names of own elements from a file, for paths and messages of this reader. A second file adds to the first.
///
/// @param path  UTF-8; a dictionary as docs/tav.md describes it
/// @retval TAV_RC_BAD_PARAM  it is no dictionary, or contradicts one that was read before: the message tells both
/// places and the system's codes. A failure leaves the names as they were.
TAV_C_API uint32_t tav_reader_dictionary(tav_reader* reader, const char* path);

/// The last failure in one line: file, offset, path and sentence. Empty when there was none. TAV_RC_NO_MORE_CHILDREN,
/// and TAV_RC_NOT_FOUND of a search, are answers and no failures. Valid until the next call with the reader; a null
/// reader has the empty text. Looking for the path can cost a walk up to the place.
TAV_C_API const char* tav_last_message(const tav_reader* reader);
/// @}

/// @name Walking
/// After a failure `out` is as it was. Elements that only end a group are passed over.
/// @{

/// The root behind another one: every stream in the file has one. `after` null: the first; it may be `out` itself.
/// @retval TAV_RC_NO_MORE_CHILDREN  there is none
/// @retval TAV_RC_OUTSIDE_PARENT, TAV_RC_DATA_TOO_LARGE ...  what is between is damaged
TAV_C_API uint32_t tav_next_root(tav_reader* reader, const tav_node* after, tav_node* out);

/// The first child of a group. TAV_RC_NO_MORE_CHILDREN where it has none; a data element has none.
TAV_C_API uint32_t tav_first_child(tav_reader* reader, const tav_node* group, tav_node* out);

/// The node behind another one in its group; it may be `out` itself. TAV_RC_NO_MORE_CHILDREN behind the last one, and
/// for a root.
TAV_C_API uint32_t tav_next_sibling(tav_reader* reader, const tav_node* node, tav_node* out);

/// The first node that a path leads to, from a node, or from the roots: `from` null, or a path that begins with a
/// slash.
/// @retval TAV_RC_NOT_FOUND  there is none
/// @retval TAV_RC_BAD_PARAM  the text is no path, or has a name that no element has
TAV_C_API uint32_t tav_find(tav_reader* reader, const tav_node* from, const char* path, tav_node* out);

/// Calls `visit` with every node that a path leads to, in stream order, and with `context`, until it returns something
/// else than 0. It may call the reader; the node is valid during the call, and may be copied. Stopped or not, the
/// answer is 0; TAV_RC_NOT_FOUND when it was never called. Damage on the way ends it with its code.
TAV_C_API uint32_t tav_find_each(tav_reader* reader, const tav_node* from, const char* path,
                                 int (*visit)(const tav_node* node, void* context), void* context);
/// @}

/// @name Values
/// TAV_RC_NOT_SUPPORTED for another type, a group included; TAV_RC_OUTSIDE_PARENT for a value that does not fit, and
/// for a payload of another size than the type's. A failure leaves the results as they were.
/// @{

/// A whole number of any type.
TAV_C_API uint32_t tav_get_u64(const tav_reader* reader, const tav_node* node, uint64_t* value);
TAV_C_API uint32_t tav_get_i64(const tav_reader* reader, const tav_node* node, int64_t* value);
TAV_C_API uint32_t tav_get_u128(const tav_reader* reader, const tav_node* node, uint64_t* high, uint64_t* low);

/// Nanoseconds since 1970 in UTC.
TAV_C_API uint32_t tav_get_time(const tav_reader* reader, const tav_node* node, int64_t* nanoseconds);

/// The text of either kind of string, without its code page and not terminated. It lives as the payload.
/// TAV_RC_DATA_TOO_LARGE where that is null: tav_read.
TAV_C_API uint32_t tav_get_text(const tav_reader* reader, const tav_node* node, const char** text, size_t* size);

/// The payload of any data element as in the file. It lives as the payload. TAV_RC_DATA_TOO_LARGE where that
/// is null.
TAV_C_API uint32_t tav_get_bytes(const tav_reader* reader, const tav_node* node, const void** bytes, size_t* size);

/// Copies a part of a data element's payload, of any size, from a place in it on. `size`: the room at `to`; then, how
/// many bytes were copied, which is less at the end of the payload and 0 behind it.
TAV_C_API uint32_t tav_read(tav_reader* reader, const tav_node* node, uint64_t from, void* to, size_t* size);
/// @}

/// @name Names
/// @{

/// The tag of an element; null for an id that no element has. It lives for ever.
TAV_C_API const char* tav_tag(uint16_t elm);

/// The id of a tag, an enum name, a constant or a number (`60103`, `#60103`); of several with one tag the first.
/// TAV_RC_NOT_FOUND where no element is called so.
TAV_C_API uint32_t tav_id(const char* name, uint16_t* elm);

/// The same with the names that tav_reader_dictionary has read; these live until it is called again, and with the
/// reader.
TAV_C_API const char* tav_reader_tag(const tav_reader* reader, uint16_t elm);
TAV_C_API uint32_t tav_reader_id(const tav_reader* reader, const char* name, uint16_t* elm);

/// The sentence of a code; "unknown code" for others. It lives for ever.
TAV_C_API const char* tav_message(uint32_t rc);
/// @}

/// @name Writing
/// Only the innermost open group takes nodes. A node's header has the width that its group asks for: groups have
/// children of their own width.
/// @{

TAV_CONSTANT uint32_t TAV_CREATE_APPEND = 1;    ///< go on behind the streams in the file; made where there is none
TAV_CONSTANT uint32_t TAV_CREATE_OVERWRITE = 2; ///< take the place of a file, which stays as it is until tav_finish

/// Makes a file. `path` is UTF-8; `form` may be null. `flags` 0: a file that exists is refused with KOR_RC_FILE_EXISTS;
/// else one of TAV_CREATE_APPEND and TAV_CREATE_OVERWRITE. A file that another writer has is refused with
/// KOR_RC_LOCKED.
///
/// @param[out] out  the writer, the caller's until tav_finish or tav_discard; null after a failure
/// @retval TAV_RC_BAD_PARAM    a value in `form` that is none
/// @retval TAV_RC_BAD_OPTIONS  other flags; a file to go on in that has another form
/// @retval TAV_RC_NOT_FOUND    a file to go on in that is no stream; a damaged one has the code of its damage
TAV_C_API uint32_t tav_create_file(const char* path, const tav_form* form, uint32_t flags, tav_writer** out);

/// A stream in memory, which grows.
TAV_C_API uint32_t tav_create_memory(const tav_form* form, tav_writer** out);

/// Opens a group in the innermost open one, or a root. `info`: the bits of its header, as TAV_INFO_EYE_SIZE.
TAV_C_API uint32_t tav_begin(tav_writer* writer, uint16_t elm, uint32_t info);

/// Closes the innermost group. TAV_RC_NOT_FOUND when none is open.
TAV_C_API uint32_t tav_end(tav_writer* writer);

/// Takes back the innermost group and all in it: the next node is written in its place.
TAV_C_API uint32_t tav_abandon(tav_writer* writer);

/// Appends a data element to the innermost group. TAV_RC_NOT_FOUND when none is open.
TAV_C_API uint32_t tav_add_u32(tav_writer* writer, uint16_t elm, uint32_t value);
TAV_C_API uint32_t tav_add_u64(tav_writer* writer, uint16_t elm, uint64_t value);
TAV_C_API uint32_t tav_add_i32(tav_writer* writer, uint16_t elm, int32_t value);
TAV_C_API uint32_t tav_add_i64(tav_writer* writer, uint16_t elm, int64_t value);
TAV_C_API uint32_t tav_add_u128(tav_writer* writer, uint16_t elm, uint64_t high, uint64_t low);

/// Text: an ASCII String where it is ASCII, else a UTF8 String. Other bytes: TAV_RC_BAD_PARAM.
TAV_C_API uint32_t tav_add_text(tav_writer* writer, uint16_t elm, const char* text, size_t size);
TAV_C_API uint32_t tav_add_bytes(tav_writer* writer, uint16_t elm, const void* bytes, size_t size);

/// A moment, to the microsecond. Before 1970: TAV_RC_OUTSIDE_PARENT.
TAV_C_API uint32_t tav_add_time(tav_writer* writer, uint16_t elm, int64_t nanoseconds);

/// Hands all nodes that were added so far to the system; tav_sync: brings them to the device. Nothing to do in memory.
TAV_C_API uint32_t tav_flush(tav_writer* writer);
TAV_C_API uint32_t tav_sync(tav_writer* writer);

/// The last failure of the writer in one line; empty when there was none. Valid until the next call with the writer; a
/// null writer has the empty text.
TAV_C_API const char* tav_writer_message(const tav_writer* writer);

/// Ends a stream and its writer, which is null then. With open groups TAV_RC_BAD_PARAM; after that and every other
/// failure the writer lives, and it can be tried again.
///
/// @param[out] bytes  of a stream in memory: its bytes, the caller's until tav_free; of a file: null, and the argument
///                    may be null
/// @param[out] size   how many; of a file likewise 0
TAV_C_API uint32_t tav_finish(tav_writer** writer, const void** bytes, size_t* size);

/// Releases the bytes of tav_finish. Null is fine.
TAV_C_API void tav_free(const void* bytes);

/// Drops a writer unfinished. What is in the file stays; one that was to be overwritten stays as it was. Null is fine.
TAV_C_API void tav_discard(tav_writer** writer);
/// @}

#if defined(__cplusplus)
}
#endif
