/// @file kor.h
/// libkor: the portability layer under libtav. Memory, one-time start, thread ids, bounded print,
/// files, and the trace facility. Every operation returns a code of codes.h unless it says otherwise.
#pragma once

#include <cstdint>
#include <cstdio>

#include "tav/codes.h"
#include "tav/decl.h"

#if defined(KOR_STATIC)
#define KOR_API
#elif defined(KOR_BUILDING)
#define KOR_API KOR_DECL_EXPORT
#else
#define KOR_API KOR_DECL_IMPORT
#endif

#if defined(__GNUC__)
#define KOR_PRINTF_FORMAT(formatAt, firstAt) __attribute__((format(printf, formatAt, firstAt)))
#else
#define KOR_PRINTF_FORMAT(formatAt, firstAt)
#endif

/// Version word of every file parameter object.
inline constexpr uint32_t KOR_PARAM_VERSION = 0x09070000;

/// @name Memory
/// @{

/// `mode` of a plain block, as large as asked.
inline constexpr uint32_t KOR_MEM_PLAIN = 1;
/// `mode` of a reserved block: room for KOR_MEM_RESERVE bytes whatever was asked, untouched until used.
/// A larger request is refused with TAV_RC_NO_MEMORY. When `*pp` names a live reserved block on entry,
/// the new block becomes its companion and is released together with it.
inline constexpr uint32_t KOR_MEM_RESERVED = 0;
/// Bytes behind every reserved block: 4,000 entries of 32 bytes, the deepest nesting of a header stack.
inline constexpr uint64_t KOR_MEM_RESERVE = 128000;

extern "C" {
/// Allocates `size` bytes, aligned for any object.
///
/// @param[in,out] pp  receives the block, owned by the caller until `_korMemFree`; see KOR_MEM_RESERVED for
///                    what it means on entry. A failure leaves it null.
/// @param flags       must be 0
/// @param size        bytes; 0 gives a valid block of no bytes
/// @param mode        KOR_MEM_PLAIN or KOR_MEM_RESERVED
/// @param pFile,line  where the request comes from, for diagnostics; may be null and 0
/// @retval TAV_RC_BAD_PARAM  `pp` is null, flags not 0, or an unknown mode
/// @retval TAV_RC_NO_MEMORY  not enough memory, or a reserved block of more than KOR_MEM_RESERVE bytes
KOR_API uint32_t _korMemAlloc(void** pp, uint64_t flags, uint64_t size, uint32_t mode, const char* pFile,
                              uint32_t line);

/// Releases a block of `_korMemAlloc` with its companions and sets `*pp` to null; a null `*pp` is accepted.
/// @retval TAV_RC_BAD_PARAM  `pp` is null
KOR_API uint32_t _korMemFree(void** pp, uint64_t flags, uint64_t reserved, const char* pFile, uint32_t line);
}

/// `_korMemAlloc` under its plain name.
inline uint32_t korMemAlloc(void** pp, uint64_t flags, uint64_t size, uint32_t mode, const char* pFile, uint32_t line)
{
  return _korMemAlloc(pp, flags, size, mode, pFile, line);
}

/// `_korMemFree` under its plain name.
inline uint32_t korMemFree(void** pp, uint64_t flags, uint64_t reserved, const char* pFile, uint32_t line)
{
  return _korMemFree(pp, flags, reserved, pFile, line);
}
/// @}

/// @name Process and text
/// @{
extern "C" {
/// Starts the layer. Safe from any thread and harmless after the first call.
KOR_API uint32_t korOneTimeOnly(void);

/// The calling thread's id as the operating system numbers it; not a code.
KOR_API uint64_t korThreadID(void);

/// Nanoseconds of a clock that never goes back, from a start of its own: for times between two calls.
KOR_API int64_t korSteadyTime(void);

/// Formats into `pBuffer`, never past `bufferSize` bytes, and ends the text with NUL when bufferSize is not 0.
/// @retval TAV_RC_NO_MEMORY  the text does not fit: what fits is stored
/// @retval TAV_RC_BAD_PARAM  no buffer, no format, or one that fails: an empty text is stored where there is room
KOR_API uint32_t korSnprintf(char* pBuffer, uint64_t bufferSize, const char* pFormat, ...) KOR_PRINTF_FORMAT(3, 4);

/// The name of a code, such as "TAV_RC_BAD_PARAM" for 0x9000000C; "unknown code" for others. Never null.
KOR_API const char* korCodeName(uint32_t code);
}
/// @}

/// @name Trace
/// @{

/// The trace control block. Tracing is on while `g_pWTCB` is not null and `enable` is not 0; both may be
/// switched at any time, the library reads them before every record. A step that began while tracing was off and that
/// calls nothing outside the library ends without records.
struct KORTraceCB
{
  uint32_t reserved[3];
  uint32_t enable;
};

/// What a trace record says.
enum KORTraceKind : uint32_t
{
  KOR_TRACE_ENTRY = 1, ///< a function was entered
  KOR_TRACE_EXIT = 2,  ///< a function returns `code`
  KOR_TRACE_VAR = 3,   ///< arguments or results, in `pItems`
  KOR_TRACE_ERROR = 4  ///< a failure with `code` at `point`
};

/// One dumped item: `length` bytes at `pData`. A text label is an item of its characters without a NUL.
struct KORTraceItem
{
  const void* pData;
  uint64_t length;
};

/// One trace record. It and all that it points to are valid during the call of the sink only.
struct KORTraceRecord
{
  KORTraceKind kind;
  uint32_t threadId; ///< low 32 bits of korThreadID()
  uint32_t probe;    ///< which function: the probe ids of tav/probes.h
  uint32_t point;    ///< where in the function; 0 for entry and exit records
  uint32_t code;     ///< of exit and error records
  const KORTraceItem* pItems;
  uint32_t itemCount;
};

/// Receives records. It may be called by several threads at a time and must not call back into the handle
/// that is being traced; it may start and stop traces. What it does itself is not traced: that would never end.
typedef void (*KORTraceSink)(void* context, const KORTraceRecord* record);

extern "C" {
/// Null until a trace was started for the first time.
KOR_API extern KORTraceCB* g_pWTCB;

/// Starts a trace: every record goes to `sink` with `context`. One sink at a time.
/// @retval TAV_RC_BAD_PARAM     `sink` is null
/// @retval KOR_RC_TRACE_ACTIVE  a trace is running already
KOR_API uint32_t korTraceStart(KORTraceSink sink, void* context);

/// Stops the trace. When it returns, no call of the sink is under way in another thread and none will follow,
/// so that `context` may go; called from inside a sink it does not wait for other threads.
/// @retval KOR_RC_TRACE_INACTIVE  no trace is running
KOR_API uint32_t korTraceStop(void);

/// A ready sink: one readable line a record. `context` is the `FILE*` to write to.
KOR_API void korTraceTextSink(void* context, const KORTraceRecord* record);

/// The hooks that traced functions call. `kind` is 3 for variables and 4 for errors; `count` items follow, each a
/// triple of `uint32_t` 0, `uint64_t` length and `const void*`.
KOR_API void _wtraceEntry(uint32_t threadId, uint32_t probe, uint32_t reserved, uint32_t level);
KOR_API void _wtraceExit(uint32_t threadId, uint32_t probe, const void* pResult, uint32_t reserved);
KOR_API void _wtraceVar(uint32_t threadId, uint32_t probe, uint32_t point, uint32_t kind, uint32_t count, ...);
KOR_API void _wtraceErrorVar(uint32_t threadId, uint32_t probe, uint32_t point, uint32_t kind, uint32_t reserved,
                             uint32_t count, ...);
}
/// @}

/// @name Files
/// @{
inline constexpr uint64_t KOR_FILE_READ = 0x1;        ///< open for reading
inline constexpr uint64_t KOR_FILE_WRITE = 0x2;       ///< open for writing
inline constexpr uint64_t KOR_FILE_UPDATE = 0x4;      ///< open for reading and writing
inline constexpr uint64_t KOR_FILE_CREATE = 0x100;    ///< create the file when it is missing
inline constexpr uint64_t KOR_FILE_TRUNCATE = 0x200;  ///< empty an existing file
inline constexpr uint64_t KOR_FILE_EXCLUSIVE = 0x400; ///< with CREATE: refuse an existing file

/// How to open a file.
struct KORFileOpenParam
{
  uint32_t version = KOR_PARAM_VERSION;
  const char* pPath = nullptr; ///< UTF-8
  uint64_t options = 0;        ///< one of READ, WRITE, UPDATE, or a union of them, with the bits beside them
  uint32_t permissions = 0666; ///< of a file that is created, less the process's mask; ignored on Windows
};

/// How much to read from the file's position.
struct KORFileReadParam
{
  uint32_t version = KOR_PARAM_VERSION;
  uint64_t length = 0; ///< bytes
};

/// What to write at the file's position.
struct KORFileWriteParam
{
  uint32_t version = KOR_PARAM_VERSION;
  const void* pData = nullptr;
  uint64_t length = 0; ///< bytes
};

/// Where to position the file.
struct KORFileSeekParam
{
  uint32_t version = KOR_PARAM_VERSION;
  uint64_t offset = 0; ///< bytes from the file's first byte
  uint32_t reserved[2] = {0, 0};
};

/// The lock to take. Word 1: 0 shared, 1 exclusive. Word 2: bit 0x2 refuse at once when another process holds the
/// lock (KOR_RC_LOCKED) instead of waiting.
struct KORFileLockParam
{
  uint32_t version = KOR_PARAM_VERSION;
  uint32_t word1 = 0;
  uint32_t word2 = 0;
};

/// A file of the operating system. Not shared between threads. Interrupted calls and short transfers are
/// handled inside: a transfer ends short only at the end of the file or with a failure.
class KOR_API KORHFile
{
public:
  KORHFile();
  ~KORHFile(); ///< closes the file when it is still open
  KORHFile(const KORHFile&) = delete;
  KORHFile& operator=(const KORHFile&) = delete;

  /// Opens a file. @retval KOR_RC_BUSY this object has a file open already
  uint32_t open(const KORFileOpenParam* pParam);
  /// Closes the file; a failure of the last delayed write comes up here. @retval KOR_RC_NOT_OPEN
  uint32_t close();
  /// Reads up to `length` bytes. At the end of the file: TAV_RC_END_OF_STORAGE with the bytes read so far in `*pDone`.
  /// After a failure the file is positioned where it was; one that cannot seek has lost the `*pDone` bytes read before
  /// it.
  uint32_t read(const KORFileReadParam* pParam, void* pBuffer, uint64_t* pDone);
  /// Writes all bytes, or fails with the number that got there in `*pDone`.
  uint32_t write(const KORFileWriteParam* pParam, uint64_t* pDone);
  /// Positions the file; `*pNewPosition` (may be null) receives the new position.
  uint32_t seek(const KORFileSeekParam* pParam, uint64_t* pNewPosition);
  /// Locks the file against the locks of other processes and other open files. Nobody is kept from reading it.
  uint32_t lock(const KORFileLockParam* pParam);
  /// Gives the lock back. @retval KOR_RC_NOT_LOCKED
  uint32_t unlock();
  /// The file's size in bytes.
  uint32_t getSize(uint64_t* pSize);
  /// Cuts the file to a size, or fills it up with zeros. The position stays.
  uint32_t setSize(uint64_t size);
  /// Returns when all that was written is on the device.
  uint32_t sync();
  /// As sync, but for what reading the bytes does not need: the time of the change, for instance.
  uint32_t syncData();
  /// Gives this file the mode of another open one, and its owner and group as far as the process may; without the
  /// owner the bits go that let a program run as him. Nothing on Windows, where rights come from the folder.
  uint32_t copyRights(const KORHFile& from);
  /// Whether a path (UTF-8) leads to this file: after waiting for a lock it may be another one's.
  bool isAt(const char* pPath) const;
  /// Renames a closed file to the path of this one, whose place it takes at once; this one is closed then, its lock
  /// held for as long as the system lets it. Without an open file it is a plain renaming that replaces. After a
  /// failure this file is as it was, but on Windows it is closed.
  uint32_t replaceBy(const char* pFrom, const char* pPath);

  /// The first place at or behind an offset where the file can hold something else than zeros: behind the hole of a
  /// sparse file, which reads as zeros and takes no room on the device. The file's size when nothing is behind; the
  /// offset itself where the system does not tell. The position stays.
  /// @retval KOR_RC_NOT_OPEN, TAV_RC_BAD_PARAM
  uint32_t findData(uint64_t offset, uint64_t* pFound) const;

private:
  friend class KORFileMapping;

  intptr_t native_; ///< descriptor or system handle; -1 when closed
  bool locked_;
};

/// A file as it stands, as memory that can only be read: nothing is copied, and it may be larger than memory is. It
/// shows what others write into the file, and has the size that the file had. On POSIX systems a program that reads
/// bytes which another one has cut off since ends by SIGBUS, and reading what the device cannot give does the same; on
/// Windows a mapped file can be neither cut nor replaced. Not shared between threads while it is mapped or unmapped.
class KOR_API KORFileMapping
{
public:
  KORFileMapping();
  ~KORFileMapping(); ///< unmaps
  KORFileMapping(const KORFileMapping&) = delete;
  KORFileMapping& operator=(const KORFileMapping&) = delete;

  /// Maps all of a file that is open for reading; it may be closed then. The system is told that a few places are
  /// looked at, and reads nothing ahead of them.
  /// @retval TAV_RC_NOT_SUPPORTED  no regular file, or one of size 0, as an empty one and those in /proc
  /// @retval TAV_RC_NO_MEMORY      there are no addresses for so many bytes
  /// @retval KOR_RC_BUSY           this object has a file already
  /// @retval KOR_RC_NOT_OPEN, and codes of the system
  uint32_t map(const KORHFile& file);
  /// Gives the addresses back.
  void unmap();
  /// Tells the system that the bytes are read one after another from now on: it reads ahead.
  void readAhead();

  /// The first byte; null while nothing is mapped.
  const void* bytes() const { return pBytes_; }
  uint64_t size() const { return size_; }

private:
  void* pBytes_;
  uint64_t size_;
};

extern "C" {
/// Returns when the name of a file that was made, renamed or removed is on the device, too: syncs the folder that the
/// file at `pPath` (UTF-8) lies in. Nothing where the system does that by itself, and on file systems that cannot.
KOR_API uint32_t korSyncFolderOf(const char* pPath);

/// The characters behind which the last part of a path can begin.
#if defined(_WIN32)
#define KOR_PATH_SEPARATORS "/\\:"
#else
#define KOR_PATH_SEPARATORS "/"
#endif

/// Whether a path (UTF-8) leads to something that is no file and no folder: a device, a pipe. Links are followed; false
/// for a path that leads nowhere.
KOR_API bool korIsDevice(const char* pPath);

/// Makes a path (UTF-8) absolute and follows the symbolic links at its end, also one that leads to nothing yet.
///
/// @param[out] pTarget     where it leads, with a NUL; touched after success only
/// @param      targetSize  bytes at `pTarget`
/// @param[out] pNameAt     where in `pTarget` the name behind the last folder starts
/// @retval TAV_RC_BAD_PARAM      a pointer is null
/// @retval TAV_RC_NO_MEMORY      the text does not fit, or there is no memory
/// @retval TAV_RC_NOT_SUPPORTED  a link in the system's own folders (/dev/stdout is one): what is behind it can be
///                               written to, and not replaced
KOR_API uint32_t korFollowLinks(const char* pPath, char* pTarget, uint64_t targetSize, uint64_t* pNameAt);

/// Removes a closed file, or a link itself, by its path (UTF-8).
/// @retval TAV_RC_BAD_PARAM      the path is null
/// @retval KOR_RC_NO_SUCH_FILE   there is none
KOR_API uint32_t korRemoveFile(const char* pPath);

/// Takes the name of an entry of a folder, in UTF-8; valid during the call.
typedef void (*KORFileNameVisit)(const char* pName, void* context);

/// Calls `visit` with the name of each entry of a folder (UTF-8), in no order, without "." and "..".
/// @retval TAV_RC_BAD_PARAM      the path or `visit` is null
/// @retval KOR_RC_NO_SUCH_FILE   there is no such folder
KOR_API uint32_t korListFolder(const char* pPath, KORFileNameVisit visit, void* context);
}
/// @}
