/// @file tav.h
/// libtav: builds, stores, reads, navigates, searches, validates and prints hierarchical, self-describing binary
/// streams. Sizes are bytes and offsets count from the stream's first byte unless a comment says otherwise.
/// Every operation returns a code of codes.h, 0 for success.
#pragma once

#include <cstdint>
#include <cstdio>

#include "tav/elements.h"
#include "tav/kor.h"
#include "tav/types.h"

static_assert(sizeof(void*) == 8 || sizeof(void*) == 4, "addresses have 64 or 32 bits; offsets have 64 everywhere");

#if defined(TAV_STATIC)
#define TAV_API
#elif defined(TAV_BUILDING)
#define TAV_API KOR_DECL_EXPORT
#else
#define TAV_API KOR_DECL_IMPORT
#endif

/// @name Constants
/// @{
inline constexpr uint32_t TAV_STRUCT_VERSION = 0x09050000; ///< version word of handles and parameter objects

inline constexpr uint64_t TAV_OPT_READ = 0x1;           ///< open for reading
inline constexpr uint64_t TAV_OPT_WRITE = 0x2;          ///< open for writing
inline constexpr uint64_t TAV_OPT_UPDATE = 0x4;         ///< open for updating; needs direct memory
inline constexpr uint64_t TAV_OPT_NO_HDR_STACK = 0x8;   ///< derived: the handle has no header stack
inline constexpr uint64_t TAV_OPT_ROOT32 = 0x10;        ///< the stream's first node has a 32-bit header
inline constexpr uint64_t TAV_OPT_DIRECT = 0x100000000; ///< derived: the storage is addressed directly

inline constexpr uint8_t TAV_BYTE_ORDER_SWAPPED = 3; ///< `byteOrder` of a stream in the other byte order

inline constexpr uint16_t TAV_HDR_32 = 1; ///< `hdrType` of a TAVHeader32
inline constexpr uint16_t TAV_HDR_64 = 2; ///< `hdrType` of a TAVHeader64

inline constexpr uint64_t TAV_EYE_CATCHER = 0xC0DED5EEDDEC0DED; ///< first word of an eye/size pair
inline constexpr uint64_t TAV_SIZE_UNKNOWN = ~uint64_t{0};      ///< `size` of an open group with a 64-bit header
inline constexpr uint16_t TAV_CODE_PAGE_ASCII = 437;            ///< the only code page of an ASCII string

inline constexpr uint32_t TAV_STORAGE_FILE = 1;   ///< `kind` of TAVSSFile
inline constexpr uint32_t TAV_STORAGE_MEMORY = 2; ///< `kind` of TAVSSMemory

inline constexpr uint64_t TAV_ATTR_WRITABLE = 0x1;
inline constexpr uint64_t TAV_ATTR_READ_FORWARD = 0x2;
inline constexpr uint64_t TAV_ATTR_READ_BACKWARD = 0x4;
inline constexpr uint64_t TAV_ATTR_SEEK = 0x10;   ///< far jumps by `seek` instead of reading through
inline constexpr uint64_t TAV_ATTR_DIRECT = 0xC0; ///< both bits: `getMemory` offers the whole store

inline constexpr uint64_t TAV_PRINT_SUBTREE = 0x1;     ///< everything below the start node, too
inline constexpr uint64_t TAV_PRINT_HEADERS = 0x2;     ///< each node's header
inline constexpr uint64_t TAV_PRINT_DATA = 0x4;        ///< each node's data
inline constexpr uint64_t TAV_PRINT_DESCRIPTORS = 0x8; ///< with DATA: the lines of the node descriptor
inline constexpr uint64_t TAV_PRINT_BARE = 0x10;       ///< a node's body is its value alone
inline constexpr uint64_t TAV_PRINT_XML = 0x40;        ///< XML instead of text
inline constexpr uint64_t TAV_PRINT_ATTRIBUTES = 0x80; ///< with XML and SUBTREE: key elements as attributes
/// @}

/// @name Records
/// @{

/// A node's header as stored in the stream: 8 bytes. `size` counts the payload only.
struct TAVHeader32
{
  uint32_t size;
  uint16_t type;
  uint16_t elm;
};

/// The wide form of a node's header: 16 bytes.
struct TAVHeader64
{
  uint64_t size;
  uint32_t info; ///< TAV_INFO_ bits; the others are the caller's
  uint16_t type;
  uint16_t elm;
};

/// A header with its place in the stream.
struct TAVHeader
{
  union
  {
    TAVHeader32 hdr32;
    TAVHeader64 hdr64;
  };
  uint16_t hdrType;    ///< TAV_HDR_32 or TAV_HDR_64: which member is valid
  uint64_t nodeOffset; ///< of the header's first byte
};

/// A node: its header and where its payload is.
struct TAVHeaderData
{
  TAVHeader header;
  uint8_t* pDataBuf;      ///< payload; null for a group that was read
  uint64_t dataBufSize;   ///< bytes at pDataBuf; when writing, 0 means the header's size
  uint64_t dataBufOffset; ///< offset of pDataBuf in the payload; readers only
};

/// A range of stream bytes that a circular buffer hands out.
struct TAVCBUserArea
{
  uint64_t chunkOffset; ///< stream offset of the first byte
  uint8_t* pChunk;      ///< the bytes; when copying, the caller's destination
  uint64_t chunkLength; ///< bytes delivered
};

/// Where a printed subtree goes: the stream if there is one, else the buffer, else standard output.
struct TAVPrintParam
{
  uint64_t reserved;
  char* pBuffer;       ///< holds the last piece printed, NUL-terminated: print to a stream to get everything
  uint64_t bufferSize; ///< bytes with the NUL
  FILE* pStream;
};

/// The value of a "UTC Timestamp" node.
struct TAVTimeStamp
{
  uint64_t seconds; ///< since 1970-01-01 00:00:00
  uint16_t fractionA;
  uint16_t fractionB;
  uint16_t further;      ///< carried through unchanged
  int16_t offsetMinutes; ///< time zone, added to the seconds
};

/// A timestamp in calendar fields.
struct TAVDate
{
  uint16_t year, month, day, hour, minute, second, fractionA, fractionB, further;
};

/// One step of a path: a group's element id and, when not 0, the key in the low bits of its `info`.
struct TAVPathEntry
{
  uint16_t infoKey;
  uint32_t elm;
};

/// What tavFindLogicalGroup looks for.
struct TAVFindLogicalGroupParam
{
  uint64_t reserved; ///< not read
  const TAVPathEntry* pPath;
  uint32_t pathCount;
  const TAVPathEntry* pSecond; ///< not supported: leave null
  uint32_t secondCount;
};

static_assert(sizeof(TAVHeader32) == 8 && sizeof(TAVHeader64) == 16 && sizeof(TAVHeader) == 32);
static_assert(sizeof(TAVHeaderData) == 56 && sizeof(TAVTimeStamp) == 16 && sizeof(TAVDate) == 18);
/// @}

/// @name Storage
/// @{

/// A byte store with a cursor, under a handle. Derive from it to keep streams elsewhere: a handle and a circular
/// buffer use nothing but this interface. Used by one thread at a time. What it does for a handle must not call that
/// handle's operations: they are not made to be entered twice.
class TAV_API TAVSideStorage
{
public:
  /// Makes `offset` the cursor. The second word is for the storage to interpret; the circular buffer passes 1.
  virtual uint32_t seek(uint64_t offset, uint64_t hint) = 0;
  /// The cursor.
  virtual uint32_t getPosition(uint64_t* pPosition) = 0;
  /// The store's size.
  virtual uint32_t getTotalSize(uint64_t* pSize) = 0;
  /// Reads up to `wanted` bytes at the cursor and advances it; `backward`: the bytes before the cursor, and moves it
  /// back. `zeroCopy`: `*ppData` receives a pointer; otherwise `*ppData` is a buffer of `bufSize` bytes.
  /// The end of the store is TAV_RC_END_OF_STORAGE, together with the bytes that there were.
  virtual uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool zeroCopy,
                        bool backward) = 0;
  /// Writes at the cursor and advances it by `*pWritten`.
  virtual uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) = 0;
  /// The whole store as one block, when the attributes offer TAV_ATTR_DIRECT.
  virtual uint32_t getMemory(void** ppData, uint64_t* pSize) = 0;
  virtual uint32_t lock(uint32_t mode) = 0;
  virtual uint32_t unlock() = 0;
  virtual ~TAVSideStorage();

  TAVSideStorage(const TAVSideStorage&) = delete;
  TAVSideStorage& operator=(const TAVSideStorage&) = delete;

  /// 0 while the storage is usable; else why it is not.
  uint32_t getStatus() const;
  /// Whether all bits of `mask` are set in the attributes.
  bool hasAttributes(uint64_t mask) const;

  uint32_t kind;       ///< 0 for storages of others
  uint64_t attributes; ///< TAV_ATTR_ bits
  uint64_t ioUnit;     ///< preferred transfer unit, the circular buffer's page size; 0 means 65,536
  uint32_t status;     ///< see getStatus

protected:
  TAVSideStorage(); ///< kind 0, no attributes, an ioUnit of 65,536
  TAVSideStorage(uint32_t storageKind, uint64_t attributeBits);
};

/// A block of memory. A handle over it addresses the block directly.
class TAV_API TAVSSMemory : public TAVSideStorage
{
public:
  /// Allocates the block and owns it. `*rc` (may be null) and `status` tell whether it worked.
  TAVSSMemory(uint64_t size, uint32_t* rc);
  /// Wraps the caller's block, which must outlive the object. Nothing is checked.
  TAVSSMemory(void* block, uint64_t size);
  ~TAVSSMemory() override;

  uint32_t seek(uint64_t offset, uint64_t hint) override; ///< refuses the end of the block, too
  uint32_t getPosition(uint64_t* pPosition) override;
  uint32_t getTotalSize(uint64_t* pSize) override;
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool zeroCopy,
                bool backward) override;                                         ///< always forward
  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override; ///< all or nothing
  uint32_t getMemory(void** ppData, uint64_t* pSize) override;
  uint32_t lock(uint32_t mode) override; ///< not supported
  uint32_t unlock() override;            ///< not supported

  uint8_t* pBuffer;
  uint64_t bufferSize;
  uint8_t ownsBuffer;
  uint64_t position;
};

/// A file. A handle over it works through a circular buffer of pages of 1 MiB. Open with KOR_FILE_READ to read and
/// with KOR_FILE_UPDATE to write: a handle reads pages back while it writes, and a writable storage gets every page
/// that was held written back, also when the handle only reads. Of an existing file that is longer than the stream, the
/// old bytes stay behind it unless it is opened with KOR_FILE_TRUNCATE.
class TAV_API TAVSSFile : public TAVSideStorage
{
public:
  /// Opens the file. `*rc` and `status` tell whether it worked; both arguments are required.
  TAVSSFile(KORFileOpenParam* openParam, uint32_t* rc);
  ~TAVSSFile() override; ///< closes the file

  uint32_t seek(uint64_t offset, uint64_t hint) override;
  uint32_t getPosition(uint64_t* pPosition) override;
  uint32_t getTotalSize(uint64_t* pSize) override; ///< a pipe has none, and files that the system makes up have 0
  uint32_t read(uint64_t wanted, void** ppData, uint64_t bufSize, uint64_t* pRead, bool zeroCopy,
                bool backward) override; ///< a backward read fills the end of the buffer
  uint32_t write(const void* pData, uint64_t size, uint64_t* pWritten) override;
  uint32_t getMemory(void** ppData, uint64_t* pSize) override; ///< not supported
  uint32_t lock(uint32_t mode) override;                       ///< exclusive, refused at once when it is held
  uint32_t unlock() override;

  KORHFile* pFile;   ///< null when opening failed
  uint64_t position; ///< the cursor
  uint8_t needSeek;  ///< the file's own position may differ from the cursor
};

/// A ring of pages that caches a contiguous range of a storage's bytes, so that a stream larger than memory can be
/// written and read. Belongs to one handle. A data element larger than `ringSize` can be written, but neither read
/// back nor updated through it, and validation and printing end there.
class TAV_API TAVCircularBuf
{
public:
  /// Allocates a ring of about `size` bytes in pages of the storage's ioUnit; fewer pages when memory is short.
  TAVCircularBuf(TAVSideStorage* storage, uint64_t size, uint32_t* rc);
  ~TAVCircularBuf(); ///< writes what is pending; call reset() first to learn whether that works
  TAVCircularBuf(const TAVCircularBuf&) = delete;
  TAVCircularBuf& operator=(const TAVCircularBuf&) = delete;

  /// Writes `size` bytes at a stream offset. `direct`: bytes that are not cached go straight to the storage.
  /// TAV_RC_BAD_PARAM for a small one whose page could not be brought in: see takeWriteFailure.
  uint32_t write(uint64_t offset, const void* data, uint64_t size, bool direct);
  /// Why the last small write was refused: the code with which its page could not be brought in, for want of space for
  /// the page that has to make room, say. 0 when there is nothing to tell; asking forgets it. Leaves no trace record.
  uint32_t takeWriteFailure();

  /// Hands out up to `length` bytes that start (`backward`: end) at a stream offset. A chunk can be shorter than
  /// asked. Without `copy` the pointer leads into the ring and is valid until the next call.
  uint32_t getChunk(uint64_t offset, uint64_t length, TAVCBUserArea* area, bool backward, bool copy);

  /// Writes all pending pages and empties the ring.
  uint32_t reset();
  /// Resets, then caches `pages` pages from `offset` plus `adjustment` bytes on.
  uint32_t reposition(uint64_t offset, int8_t adjustment, uint8_t pages);
  /// Marks the pages of `[offset, offset + length]` as pending.
  uint32_t markPages(uint64_t offset, uint64_t length);
  /// Whether the byte at a stream offset is in the ring.
  bool isCached(uint64_t offset) const;

  uint32_t status;     ///< 0 when usable
  uint8_t* pRing;      ///< owned, ringSize bytes
  uint64_t ringSize;   ///< pageCount * pageSize
  uint64_t head;       ///< ring index of the first cached byte
  uint64_t tail;       ///< ring index of the last cached byte
  uint64_t headOffset; ///< stream offset of the byte at head
  uint64_t pageSize;
  uint64_t pageCount;
  uint8_t* pPageFlags;      ///< owned, two bytes a page; the first is 1 while the page is pending
  TAVSideStorage* pStorage; ///< not owned
  uint8_t storageWritable;
  uint8_t empty; ///< the ring caches nothing

private:
  /// What a fill is for: reading never makes pages behind the storage's end, writing does.
  enum class Purpose : uint8_t
  {
    read,
    write
  };
  struct Plan;
  struct Piece;
  uint32_t allocate();
  uint32_t cutBackward(uint64_t offset, uint64_t index, uint64_t length, TAVCBUserArea& area,
                       const uint8_t*& first) const;
  void deliver(TAVCBUserArea& area, const uint8_t* first, bool copy) const;
  uint32_t writeCached(uint64_t index, uint64_t offset, const uint8_t* data, uint64_t size, bool direct);
  uint32_t writeStraight(uint64_t offset, const uint8_t* data, uint64_t size);
  uint32_t seekStorage(uint64_t offset);

  uint32_t fill(uint64_t offset, uint64_t pages, bool backward, Purpose purpose);
  Plan startEmpty(uint64_t offset, uint64_t pages, bool backward);
  Plan planCached(uint64_t index, uint64_t pages, bool backward) const;
  Plan planUncached(uint64_t offset, uint64_t pages, bool backward) const;
  uint32_t jump(uint64_t offset, bool backward, Purpose purpose);
  uint32_t readUntilCached(uint64_t offset, Purpose purpose);
  uint32_t readPages(uint64_t pages, bool backward, uint64_t offset, Purpose purpose);
  uint32_t readPageForward(uint64_t offset, Purpose purpose, bool& full);
  uint32_t readPageBackward(uint64_t offset, bool& full);
  uint32_t makeRoom(uint64_t needed, uint64_t offset, bool fromTail, bool& kept);
  uint64_t nextIndex() const;
  uint32_t readStorage(uint64_t index, uint64_t wanted, uint64_t& got, bool& ended);
  void zeroPending(uint64_t index, uint64_t length);

  uint32_t releasePages(uint64_t pages, bool fromTail);
  Piece pieceAt(bool fromTail) const;
  uint32_t writePiece(const Piece& piece, bool& seekNeeded);
  void dropPiece(const Piece& piece, bool fromTail);

  uint64_t cachedCount() const;
  bool isEmpty() const;
  bool indexOf(uint64_t offset, uint64_t& index) const;
  uint32_t offsetOf(uint64_t value, uint64_t& offset) const;
  uint64_t pageOf(uint64_t index) const;

  uint32_t writeFailure_; ///< for takeWriteFailure
};
/// @}

/// The chain of open groups, the innermost on top. It holds 1,000 entries before it grows and 4,000 at the most.
class TAV_API TAVHdrStack
{
public:
  TAVHdrStack(); ///< a failed allocation leaves a capacity of 0; the first push reports it
  ~TAVHdrStack();
  TAVHdrStack(const TAVHdrStack&) = delete;
  TAVHdrStack& operator=(const TAVHdrStack&) = delete;

  /// Copies a header onto the stack. @retval TAV_RC_NO_MEMORY  no room for a further entry; nothing is stored
  uint32_t push(const TAVHeader* header);
  /// The innermost open group, owned by the stack; null when there is none.
  TAVHeader* top();
  /// Drops the top entry. @retval TAV_RC_NO_MEMORY  the stack is empty
  uint32_t pop();
  /// Drops the top entry and copies it to `*out`. @retval TAV_RC_NO_MEMORY  the stack is empty
  uint32_t pop(TAVHeader* out);

  TAVHeader* pEntries; ///< entry 0 is the outermost group
  uint32_t capacity;
  uint32_t count;

private:
  uint32_t grow(); ///< raises the capacity by one increment
};

/// How to open a handle.
class TAV_API TAVInitParam
{
public:
  TAVInitParam();
  TAVInitParam(TAVSideStorage* storage, uint64_t optionBits);
  TAVInitParam(TAVSideStorage* storage, uint64_t optionBits, uint64_t ringBytes, uint64_t auxBytes, uint8_t order,
               uint8_t align);
  ~TAVInitParam();
  uint32_t getVersion() const;

  uint32_t version;             ///< TAV_STRUCT_VERSION
  TAVSideStorage* pSideStorage; ///< not owned; must outlive the handle
  uint64_t options;             ///< exactly one of TAV_OPT_READ, _WRITE, _UPDATE; TAV_OPT_ROOT32 beside it. Never
                                ///< TAV_OPT_DIRECT: over a ring it is believed, and every call finds no block
  uint64_t circularBufSize;     ///< bytes of the ring over a storage without direct memory; 10 MiB
  uint64_t auxSize;             ///< carried, not used
  uint8_t byteOrder;            ///< TAV_BYTE_ORDER_SWAPPED: the stream is in the other byte order
  uint8_t alignMode;            ///< 1: payloads are padded to multiples of 8
};

/// How to reset a handle.
class TAV_API TAVResetParam
{
public:
  TAVResetParam();
  ~TAVResetParam();
  uint32_t getVersion() const;

  uint32_t version; ///< TAV_STRUCT_VERSION
  uint64_t options; ///< not used
};

/// One stream bound to one storage. Made by tavInitHandle; used by one thread at a time, and after a fork by one of the
/// two processes: over a file they share its position, but not the ring. A copy of the record is no handle: what
/// reading has found out lies behind it.
struct TAVHandle
{
  uint64_t initVersion;
  uint64_t version;
  uint64_t curOffset;           ///< direct: stream offset of the block's first byte. Else: offset of the last chunk
  uint8_t* pDirectData;         ///< direct: the block. Else: the chunk last fetched for a node's data
  uint64_t directDataSize;      ///< bytes at pDirectData
  uint64_t streamBytes;         ///< the write offset
  TAVCircularBuf* pCircularBuf; ///< owned; null over direct memory
  TAVSideStorage* pSideStorage; ///< not owned
  TAVHdrStack* pHdrStack;       ///< owned; null for a handle that only reads
  uint64_t options;
  uint8_t alignMode;
  uint8_t swapBytes;
};

extern "C" {

/// @name Handles
/// @{

/// Opens a handle over a storage.
///
/// @param[out] out  the handle, owned by the library until tavTermHandle; null after a failure
/// @param param     storage, mode, byte order, alignment; read during the call only
/// @retval TAV_RC_BAD_PARAM      null argument or storage, an unusable storage, not exactly one mode
/// @retval TAV_RC_NOT_SUPPORTED  TAV_OPT_UPDATE over a storage without direct memory
/// @retval TAV_RC_NO_MEMORY, TAV_RC_NO_HDR_STACK  an object could not be allocated
/// Codes of the storage come up unchanged. A failure leaves nothing allocated.
TAV_API uint32_t tavInitHandle(TAVHandle** out, TAVInitParam* param);

/// Closes a handle: writes what a circular buffer still holds, frees all that the handle owns, nulls `*inout`.
/// A failure of that last write is not reported here: over a file, call `pCircularBuf->reset()` first.
/// @retval TAV_RC_BAD_PARAM  `inout` or `*inout` is null
TAV_API uint32_t tavTermHandle(TAVHandle** inout);

/// Returns a handle to its state after tavInitHandle: offset 0, no open group, pending pages written.
/// Mode, byte order and alignment stay. @retval TAV_RC_BAD_PARAM  a null argument
TAV_API uint32_t tavResetHandle(TAVHandle* handle, TAVResetParam* resetParam);

/// The handle's storage and the stream's length so far (the write offset).
/// @retval TAV_RC_BAD_PARAM  a null argument
TAV_API uint32_t tavGetSideStorage(TAVHandle* handle, TAVSideStorage** outStorage, uint64_t* outBytes);
/// @}

/// @name Writing
/// After a failure the write offset is where it was, unless a comment says otherwise; bytes of the failed node that
/// were written already stay in the storage. Over direct memory the last byte of the block is never used.
/// @{

/// Appends a data element, or opens a group that stays open until tavCloseHeader.
///
/// @param options     must be 0
/// @param handle      opened for writing or updating
/// @param headerData  header and payload; `nodeOffset` receives the node's offset, and under alignment `info`
///                    of a 64-bit header receives TAV_INFO_ALIGNED8, which stays: clear it before the descriptor
///                    goes to a handle without alignment, or readers skip padding that is not there. A group needs
///                    no payload. The payload may be anywhere, in the descriptor or the handle, too; the descriptor
///                    must not lie in the block.
/// @retval TAV_RC_BAD_PARAM       null argument, null payload of a data element, unknown hdrType
/// @retval TAV_RC_WRONG_MODE      the handle is for reading
/// @retval TAV_RC_BAD_OPTIONS     options not 0
/// @retval TAV_RC_BAD_CHILD_HDR   the open group takes the other header form (one with a 32-bit header takes no 64-bit
///                                child, whatever its type), or a root is not a group
/// @retval TAV_RC_BAD_PAYLOAD     `dataBufSize` is smaller than the header's size
/// @retval TAV_RC_END_OF_STORAGE  the block is full
/// @retval TAV_RC_NO_MEMORY       more than 4,000 open groups: the group's header is written, but it is not open
/// @retval TAV_RC_NO_HDR_STACK    a group on a handle without a header stack: likewise
/// Codes of the storage come up unchanged.
TAV_API uint32_t tavAddElement(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData);

/// Appends a string. `type` is TAV_TYPE_ASCII_STRING with code page 437, or TAV_TYPE_UTF8_STRING with any.
///
/// A UTF-8 string has a surprising contract, kept for the streams that exist: 2 is added to the caller's `size`, and
/// that many bytes are taken from `pDataBuf`, so 2 bytes more than the text must be readable there; they follow the
/// node in the stream without being counted, and a walk seeks the next node 2 bytes early. To write UTF-8 that walks
/// well, give tavAddElement a payload that begins with the code page.
/// `nodeOffset` is not set. Codes as tavAddElement, and TAV_RC_BAD_PARAM for a size to which 2 cannot be added; neither
/// mode nor options are checked. A failure leaves the caller's `size` as it was.
TAV_API uint32_t tavAddString(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData, uint16_t codePage);

/// Appends nodes that are encoded already, byte for byte, under the open group.
///
/// @param hdrKind  TAV_HDR_32 or TAV_HDR_64: the header form of the nodes at `bytes`
/// @retval TAV_RC_BAD_CHILD_HDR  no group is open, or it takes the other header form
/// Other codes as tavAddElement. Nothing is swapped or padded.
TAV_API uint32_t tavAddStream(uint64_t options, TAVHandle* handle, uint32_t hdrKind, uint8_t* bytes, uint64_t length);

/// Encodes one header and its payload at `*position`, which moves past what was written. The step below
/// tavAddElement: no group is opened, nothing is checked against the open one.
TAV_API uint32_t tavWriteNodeInt(uint64_t options, TAVHandle* handle, TAVHeader* header, uint64_t* position,
                                 uint8_t* payload, uint64_t payloadLength);

/// Closes the innermost open group: writes its size and, when it has TAV_INFO_EYE_SIZE, appends its end element.
///
/// @param options  0 to close; 1 to abandon the group: the write offset goes back to its first byte
/// @retval TAV_RC_NOT_FOUND    no group is open
/// @retval TAV_RC_WRONG_MODE, TAV_RC_BAD_OPTIONS, TAV_RC_BAD_PARAM  misuse
/// Codes of the storage come up unchanged, but for one: a 64-bit group that was opened with TAV_SIZE_UNKNOWN and whose
/// size cannot be written stays of unknown size and gets its end element, whose code is the result.
/// A failure leaves the group open; its size may be written already. The same call gives the stream that would have
/// been when the cause is gone.
TAV_API uint32_t tavCloseHeader(uint64_t options, TAVHandle* handle);

/// Overwrites the payload of a data element in place. Size, type and element id must be those in the stream.
/// @retval TAV_RC_BAD_PARAM  null argument or payload, a group, or a header that differs from the stored one
/// @retval TAV_RC_WRONG_MODE, TAV_RC_BAD_OPTIONS  misuse
/// Codes of the reader come up unchanged; through a ring, an element larger than it gives TAV_RC_DATA_TOO_LARGE.
TAV_API uint32_t tavUpdateElement(uint64_t options, TAVHandle* handle, TAVHeaderData* headerData);
/// @}

/// @name Reading
/// A payload pointer leads into the stream and is not owned: over memory it lives as long as the block, over a
/// circular buffer until the next fetch through the handle.
/// @{

/// Reads the node at an offset.
///
/// @param options  ignored
/// @param is64     which header form is there; nothing in the stream says so
/// @param[out] out the node. Over direct memory `dataBufSize` is the whole rest of the block.
/// @retval TAV_RC_NO_MEMORY       the header does not lie in the block
/// @retval TAV_RC_DATA_TOO_LARGE  the data does not lie in the block, or is larger than the ring
/// Codes of the storage come up unchanged.
TAV_API uint32_t tavReadNodeInt(uint64_t options, TAVHandle* handle, uint64_t offset, bool is64, TAVHeaderData* out);

/// Finds the next eye catcher of either byte order.
///
/// @param start     offset where the scan begins
/// @param length    bytes to scan; 0: no limit
/// @param unused    has no effect
/// @param[out] foundOffset  of the eye catcher's first byte; 0 after a failure
/// @param[out] eyeSize      the word behind it, in host order; 0 after a failure
/// @param[out] swapped      whether the pair is in the other byte order
/// @retval TAV_RC_NOT_FOUND  none there. A byte that breaks a match is not tried again as the first of another.
/// Cost: the bytes up to the eye catcher, once.
TAV_API uint32_t tavFindEyeSizeComboInt(TAVHandle* handle, uint64_t start, uint64_t length, bool unused,
                                        uint64_t* foundOffset, uint64_t* eyeSize, bool* swapped);

/// Finds a node from an arbitrary offset: the one that ends at the next eye catcher.
///
/// @param options  0x1, 0x2: read the node at `index` itself, with a 64-bit or 32-bit header;
///                 0x4: the node right after the next eye/size pair
/// @param length   bytes to scan; 0: to the end
/// @retval TAV_RC_NOT_FOUND  no eye catcher, or no node that fits one
/// @retval TAV_RC_BAD_PARAM, TAV_RC_BAD_OPTIONS, TAV_RC_WRONG_MODE  misuse
/// Cost: the bytes up to the node's pair, and a header for each pair before that does not fit.
TAV_API uint32_t tavFindNodeFromIndex(uint64_t options, TAVHandle* handle, uint64_t index, uint64_t length,
                                      TAVHeaderData* out);

/// Steps to the first child of a group, or to the sibling after `refChild`.
///
/// @param options   must be 0
/// @param handle    opened with TAV_OPT_READ
/// @param parent    group to walk; null: the node at offset 0
/// @param refChild  child returned last; null: the first child
/// @param[out] out  the child; `refChild` or `parent` may be its own header, so that a walk needs one descriptor
/// @retval TAV_RC_NO_MORE_CHILDREN  the level has ended (not a failure)
/// @retval TAV_RC_NO_MEMORY         the end of a block, in a group that was never closed; over a storage its own code,
///                                  TAV_RC_END_OF_STORAGE
/// @retval TAV_RC_OUTSIDE_PARENT    the next child would start past its parent's end: damaged stream
/// @retval TAV_RC_NOT_SUPPORTED     `refChild` is a data element of unknown size
/// @retval TAV_RC_BAD_PARAM, TAV_RC_BAD_OPTIONS, TAV_RC_WRONG_MODE  misuse
/// Codes of tavReadNodeInt come up unchanged. A failure leaves `parent` and `refChild` untouched.
/// Cost: one header fetch; an open `refChild` is ended by a scan for its eye catcher. The handle remembers what scans
/// have shown until a walk begins anew with `parent` null, so that over a whole walk each byte is scanned once: of a
/// stream whose bytes change meanwhile, a pair that comes to stand before a known one is not seen until then.
TAV_API uint32_t tavGetNextChild(uint64_t options, TAVHandle* handle, TAVHeader* parent, TAVHeader* refChild,
                                 TAVHeaderData* out);

/// Steps back to the node whose eye/size pair ends where `ref` starts. Only nodes written with TAV_INFO_EYE_SIZE
/// can be reached, and not those whose pair does not count all that lies before it (padding, the extra bytes of
/// tavAddString, the header of a 64-bit group of type 1). `out` may be `ref`. A failure leaves the header of `ref`
/// untouched.
/// @retval TAV_RC_NOT_FOUND  no eye catcher in the handle's byte order is there
/// @retval TAV_RC_NO_MEMORY  the pair or the node would lie outside the stream
/// Cost: two header fetches.
TAV_API uint32_t tavGetPrevNode(uint64_t options, TAVHandle* handle, TAVHeaderData* ref, TAVHeaderData* out);
/// @}

/// @name Search and validation
/// @{

/// Looks through the children of a group for an element.
///
/// @param minDepth, maxDepth  levels below `parent` that count; 0 and 0: its direct children
/// @param infoKey   key in the low bits of `info`; 0: any. 32-bit headers never match another key.
/// @param resume    a node found before, to go on after it with the same `stack`; null: from the first child
/// @param stack     keeps the place between calls; null: a temporary one
/// @param[out] out  the node found
/// @retval TAV_RC_OK         found, or, with maxDepth above the current level, a group that does not match was
///                           entered: then `out` is untouched and the group is on top of `stack`
/// @retval TAV_RC_NOT_FOUND  no match, or the walk failed; the search never climbs out of a group it entered
/// A failure leaves `parent`, `resume` and `out` untouched, and on `stack` what was pushed before it. `parent` or
/// `resume` may be the header of `out`.
/// Cost: a step of tavGetNextChild for each node of the level up to the match.
TAV_API uint32_t tavFindElmInt(TAVHandle* handle, TAVHeader* parent, uint32_t minDepth, uint32_t maxDepth,
                               uint16_t infoKey, uint32_t elm, TAVHeader* resume, TAVHdrStack* stack,
                               TAVHeaderData* out);

/// Follows a path of groups below `parent`, one level an entry, and gives the first group in stream order whose
/// chain matches.
///
/// @warning A path whose first entry matches no group among the children of `parent` does not return. Do not call
/// it with a path that may miss: loop over tavFindElmInt level by level, or use the path search of tav.hpp, which
/// always ends.
/// @retval TAV_RC_NOT_FOUND      the path is empty
/// @retval TAV_RC_NO_MEMORY      the first entry matches, the whole path does not
/// @retval TAV_RC_OUTSIDE_PARENT damage leads to groups that were searched before, or gives many the same children
/// @retval TAV_RC_NOT_SUPPORTED  the second list is set, even if the path was found
/// A failure leaves `parent` and `out` untouched; `parent` may be the header of `out`.
/// Cost: the levels searched; in all no more than 16 times the stream and twice for each entry of the path, or 1 MiB.
TAV_API uint32_t tavFindLogicalGroup(uint64_t options, TAVHandle* handle, TAVHeader* parent,
                                     TAVFindLogicalGroupParam* param, TAVHeaderData* out);

/// Walks every node below a group and reports whether each can be reached and read.
/// @param options  bit 0 (containment) is refused here: see tavValidateSubtreeInt
/// @retval TAV_RC_BAD_PARAM  null argument, or bit 0 set
/// Codes of tavGetNextChild come up unchanged. 4,000 nested groups at the most: deeper gives TAV_RC_NO_MEMORY.
/// Cost: each header once, and each byte of open groups once more.
TAV_API uint32_t tavValidateHierarchy(uint64_t options, TAVHandle* handle, TAVHeader* header);

/// The walk of tavValidateHierarchy. With bit 0 of `options` every child must lie inside its parent, else
/// TAV_RC_OUTSIDE_PARENT; that check takes the parent's end without the length of its header, so it refuses some
/// sound streams: an empty last child, the last child of a 64-bit group of type 1, and every group that was never
/// closed unless it is at offset 0.
TAV_API uint32_t tavValidateSubtreeInt(uint64_t options, TAVHandle* handle, TAVHeader* header);
/// @}

/// @name Printing and conversion
/// @{

/// Prints a node, or a node and all below it, as indented text or as XML.
///
/// @param options  TAV_PRINT_ bits
/// @param start    the node; null with TAV_PRINT_SUBTREE: the stream's first node
/// @param param    where the output goes
/// @param[out] bytesPrinted  all characters produced
/// @retval TAV_RC_NO_MEMORY       nothing was printed, for whatever reason (misuse included)
/// @retval TAV_RC_NOT_SUPPORTED   a UTF-8 string, a Sint128 or an unknown type
/// @retval TAV_RC_OUTSIDE_PARENT  a value's size does not fit its type
/// Codes of the walk come up unchanged; what was printed before stays printed. XML is not escaped.
/// What a stream refuses does not count. A line-buffered stream gets every piece by itself, which is slower.
/// Cost: that of validation, and of the output: each line is indented by three characters a level, so that nested
/// groups make text that grows with the square of their number: 3,999 of them, 64 KB, 72 MB.
TAV_API uint32_t tavPrintSubtree(uint64_t options, TAVHandle* handle, TAVHeaderData* start, TAVPrintParam* param,
                                 uint64_t* bytesPrinted);

/// Breaks a timestamp into calendar fields by plain arithmetic that streams and their texts have always used, and that
/// is off by a day in some places: in February of leap years, and at the end of a year: 31 December gives the next
/// year with `month` and `day` left as they were, or 1 January when the next year is a leap year.
/// @retval TAV_RC_BAD_PARAM  `date` is null
TAV_API uint32_t tavTimeStampToDateInt(TAVTimeStamp timestamp, TAVDate* date);
/// @}
}
