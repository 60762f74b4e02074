/// @file append.hpp
/// Where a file's last stream ends, for a writer that goes on behind it.
#pragma once

#include <charconv>
#include <cstddef>
#include <cstdint>
#include <string>

#include "tav/cpp/file.hpp"
#include "tav/cpp/form.hpp"
#include "tav/cpp/stack.hpp"
#include "tav/cpp/storage.hpp"
#include "tav/cpp/writerState.hpp"

namespace tav::detail
{

/// What a writer finds that goes on in a file.
struct FileEnd
{
  FileOutcome outcome{};
  StreamForm form{};
  uint64_t end = 0;        ///< where the next node goes; what is behind is zeros, or a node that was cut
  Stack<TAVHeader> open{}; ///< groups that a killed writer left, the outermost first
};

/// Takes what was found.
struct EndTaker
{
  FileEnd& to;
  void (*take)(FileEnd& to, const StreamForm& form, uint64_t end, const char* sentence);
  void (*takeOpen)(FileEnd& to, const TAVHeader& group);
};

/// Looks at an open file: its form, and where its last stream ends. `given`: the form that the caller expects, or null.
TAV_API uint32_t findEnd(KORHFile& file, const StreamForm* given, const EndTaker& taker);

inline std::string offsetText(uint64_t offset)
{
  char digits[16];
  const std::to_chars_result end = std::to_chars(digits, digits + sizeof digits, offset, 16);
  return "0x" + std::string(digits, end.ptr);
}

inline StreamForm formOf(const StreamOptions& options) noexcept
{
  return {options.byteOrder == ByteOrder::swapped, options.root == Width::bits64, options.align8};
}

/// The same; `end` is 0 for a file that is to begin anew.
inline void findEnd(KORHFile& file, const StreamOptions* given, FileEnd& found)
{
  const StreamForm form = formOf(given != nullptr ? *given : StreamOptions{});
  const auto take = [](FileEnd& to, const StreamForm& is, uint64_t end, const char* sentence) {
    to.form = is;
    to.end = end;
    to.outcome.sentence = sentence;
  };
  const auto takeOpen = [](FileEnd& to, const TAVHeader& group) { to.open.push(group); };
  found.outcome.code = findEnd(file, given != nullptr ? &form : nullptr, EndTaker{found, take, takeOpen});
}

/// An open root of which nothing but the header is whole goes like a node that was cut: closed as an empty group it
/// would look as if the next root were in it.
inline void dropEmptyRoot(FileEnd& found)
{
  const bool isEmpty = found.open.size() == 1 &&
                       found.end == found.open[0].nodeOffset + layout::headerLength(found.open[0].hdrType);
  if (isEmpty)
  {
    found.end = found.open[0].nodeOffset;
    found.open.clear();
  }
}

/// Opens a file to go on behind its last stream. Nothing in it changes before all is known to be well; then it ends
/// where that stream does.
inline FileEnd openToAppend(const FilePath& path, const FileOptions& options, const StreamOptions* given,
                            Owner<TAVSSFile>& storage)
{
  FileEnd found;
  if (options.overwrite)
  {
    found.outcome = {TAV_RC_BAD_OPTIONS, "append and overwrite exclude each other"};
    return found;
  }
  found.outcome = openLocked(path, KOR_FILE_UPDATE | KOR_FILE_CREATE, options.lock, storage);
  if (found.outcome.code != TAV_RC_OK)
  {
    return found;
  }
  if (korIsDevice(path.c_str()))
  {
    found.outcome = {KOR_RC_NOT_SEEKABLE, "a device has no end to go on behind"};
    return found;
  }
  findEnd(*storage->pFile, given, found);
  storage->needSeek = 1;
  if (found.outcome.code == TAV_RC_OK && !found.open.empty() && options.openRoot == OpenRoot::refuse)
  {
    found.outcome = {TAV_RC_NOT_SUPPORTED, "the last root, at " + offsetText(found.open[0].nodeOffset) +
                                               ", was never closed, and the options refuse that"};
  }
  if (found.outcome.code == TAV_RC_OK && options.openRoot == OpenRoot::close)
  {
    dropEmptyRoot(found);
  }
  if (found.outcome.code == TAV_RC_OK)
  {
    uint64_t size = 0;
    found.outcome.code = storage->pFile->getSize(&size);
    if (found.outcome.code == TAV_RC_OK && size != found.end)
    {
      found.outcome.code = storage->pFile->setSize(found.end);
    }
  }
  return found;
}

/// Gives a new handle the place behind the last stream and the groups that are open there; closes all but `left` of
/// them.
inline uint32_t continueAt(TAVHandle& handle, const FileEnd& found, size_t left) noexcept
{
  handle.streamBytes = found.end;
  for (TAVHeader group : found.open)
  {
    if (const uint32_t rc = handle.pHdrStack->push(&group); rc != TAV_RC_OK)
    {
      return rc;
    }
  }
  for (size_t open = found.open.size(); open > left; --open)
  {
    if (const uint32_t rc = WriterState::endGroup(handle, 0); rc != TAV_RC_OK)
    {
      return causeOf(rc, &handle);
    }
  }
  return left < found.open.size() ? handle.pCircularBuf->reset() : TAV_RC_OK;
}

} // namespace tav::detail
